// `faultbox pinfile check` and `faultbox pinfile show`: load a pin file the
// way a system opens it and tell the user what it holds and what is wrong.
#include <nlohmann/json.hpp>

#include <cstdio>
#include <memory>
#include <string>

#include "Cli.h"
#include "config/kr40/QFCKR40HardwareInfo.h"
#include "config/kr60/QFCKR60HardwareInfo.h"
#include "platform/QFCReporter.h"

namespace faultbox::cli {
namespace {

struct PinfileOptions {
  std::string file;
  int ecuVersion = 1;
  bool additional = false;
  bool json = false;
};

struct Loaded {
  HRESULT result = FAULTBOX_OK;
  std::int32_t platform = 0;
  std::unique_ptr<QFCAbstractHardwareInfo> info;  // none when the board type was not found
};

// Board type first (with a KR40 description, as a system does), then the
// description of that platform loads the file.
Loaded Load(const std::string& path, int ecuVersion, bool additional) {
  Loaded out;
  QFCKR40HardwareInfo probe(path, ecuVersion, nullptr);
  out.result = probe.DetectBoardType(out.platform);
  if (out.result != FAULTBOX_OK) return out;
  if (out.platform == fptKR60Platform) {
    out.info = std::make_unique<QFCKR60HardwareInfo>(path, ecuVersion, nullptr);
  } else {
    out.info = std::make_unique<QFCKR40HardwareInfo>(path, ecuVersion, nullptr);
  }
  out.result = out.info->LoadPinFile(additional);
  return out;
}

const char* PlatformName(std::int32_t platform) {
  switch (platform) {
    case fptKR40Platform:
      return "KR40";
    case fptKR60Platform:
      return "KR60";
    default:
      return "unknown";
  }
}

std::string BoardType(const Loaded& l) {
  std::string board;
  if (l.info && l.info->GetFormatTable() && l.info->GetFormatValue("BoardType", board) != FAULTBOX_OK) board.clear();
  return board;
}

std::string Join(const std::vector<std::string>& items, const char* separator) {
  std::string out;
  for (const auto& item : items) {
    if (!out.empty()) out += separator;
    out += item;
  }
  return out;
}

std::string JoinNumbers(const std::vector<std::uint32_t>& numbers) {
  std::string out;
  for (std::uint32_t n : numbers) {
    if (!out.empty()) out += ",";
    out += std::to_string(n);
  }
  return out;
}

std::string Hex(std::uint32_t value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%X", value);
  return text;
}

void PrintSummary(const std::string& path, const Loaded& l) {
  std::printf("pin file: %s\n", path.c_str());
  std::printf("board type: %s\n", BoardType(l).c_str());
  std::printf("platform: %d (%s)\n", static_cast<int>(l.platform), PlatformName(l.platform));
  if (!l.info) return;
  std::printf("ECUs: %d\n", l.info->GetEcuCount());
  std::printf("pins: %zu\n", l.info->GetPinCount());
  std::printf("columns: %s\n", Join(l.info->GetColumnNames(), ", ").c_str());
  std::printf("comment:\n");
  std::string comment = l.info->GetComment();
  for (std::size_t pos = 0; pos < comment.size();) {
    std::size_t end = comment.find("\r\n", pos);
    if (end == std::string::npos) end = comment.size();
    std::printf("  %s\n", comment.substr(pos, end - pos).c_str());
    pos = end + 2;
  }
  if (!l.info->GetAdditionalFiles().empty()) {
    std::printf("additional files: %s\n", Join(l.info->GetAdditionalFiles(), ", ").c_str());
  }
}

HRESULT Check(const PinfileOptions& o) {
  Loaded main = Load(o.file, o.ecuVersion, o.additional);
  PrintSummary(o.file, main);
  HRESULT result = main.result;
  // A main pin file brings its additional files: they are checked the way
  // the system opens them, each on its own and for the same platform.
  if (result == FAULTBOX_OK && !o.additional) {
    for (const std::string& name : main.info->GetAdditionalFiles()) {
      const std::string path = main.info->ResolveAdditionalFile(name);
      std::printf("\n");
      Loaded extra = Load(path, o.ecuVersion, true);
      PrintSummary(path, extra);
      if (extra.result != FAULTBOX_OK) {
        result = extra.result;
        break;
      }
      if (extra.platform != main.platform) {
        TheReporter().ReportInternal(86, name);
        result = E_FAULTBOX_CONSISTENCY_CHECK;
        break;
      }
    }
  }
  std::printf("result: %s\n", ResultCodeText(result).c_str());
  return result;
}

nlohmann::ordered_json PinJson(QFCAbstractPin& pin) {
  nlohmann::ordered_json values = nlohmann::ordered_json::object();
  for (const auto& [column, value] : pin.GetValues()) values[std::string(column)] = value;
  std::vector<std::string> classes;
  pin.ReadFailureClasses(classes);
  return {{"name", pin.PinName()},
          {"module_address", pin.GetModuleAddress()},
          {"channels", pin.GetModuleChannels()},
          {"failure_classes", classes},
          {"values", values}};
}

HRESULT Show(const PinfileOptions& o) {
  Loaded l = Load(o.file, o.ecuVersion, o.additional);
  if (o.json) {
    nlohmann::ordered_json doc = {{"board_type", BoardType(l)},
                                  {"platform", l.platform},
                                  {"result", ResultCodeText(l.result)},
                                  {"comment", l.info ? l.info->GetComment() : std::string()},
                                  {"columns", l.info ? l.info->GetColumnNames() : std::vector<std::string>()},
                                  {"ecus", nlohmann::ordered_json::array()}};
    for (int e = 0; l.info && e < l.info->GetEcuCount(); ++e) {
      QFCECU* ecu = l.info->GetEcu(e);
      nlohmann::ordered_json pins = nlohmann::ordered_json::array();
      for (int p = 0; p < ecu->GetPinCount(); ++p) pins.push_back(PinJson(*ecu->GetPin(p)));
      doc["ecus"].push_back({{"name", ecu->GetName()}, {"pins", pins}});
    }
    // Values come from files and may hold any bytes; replace what is not UTF-8.
    const std::string text = doc.dump(2, ' ', false, nlohmann::json::error_handler_t::replace);
    std::printf("%s\n", text.c_str());
    return l.result;
  }
  std::printf("board type: %s\n", BoardType(l).c_str());
  std::printf("platform: %d (%s)\n", static_cast<int>(l.platform), PlatformName(l.platform));
  for (int e = 0; l.info && e < l.info->GetEcuCount(); ++e) {
    QFCECU* ecu = l.info->GetEcu(e);
    std::printf("ECU %s (%d pins)\n", ecu->GetName().c_str(), ecu->GetPinCount());
    for (int p = 0; p < ecu->GetPinCount(); ++p) {
      QFCAbstractPin& pin = *ecu->GetPin(p);
      std::vector<std::string> classes;
      pin.ReadFailureClasses(classes);
      std::printf("  %s: module %s, channels %s, failure classes %s\n", pin.PinName().c_str(),
                  Hex(pin.GetModuleAddress()).c_str(), JoinNumbers(pin.GetModuleChannels()).c_str(),
                  Join(classes, " ").c_str());
      std::string values;
      for (const auto& [column, value] : pin.GetValues()) {
        if (!values.empty()) values += "; ";
        values.append(column).append("=").append(value);
      }
      std::printf("    %s\n", values.c_str());
    }
  }
  std::printf("result: %s\n", ResultCodeText(l.result).c_str());
  return l.result;
}

void AddCommonOptions(CLI::App* cmd, PinfileOptions& o) {
  cmd->add_option("FILE", o.file, "The pin file (its name ends in csv)")->required();
  cmd->add_option("--ecu-version", o.ecuVersion,
                  "ECU version n: selects the columns pin_name(n), ecu_name(n), faults_ecu(n)")
      ->capture_default_str();
  cmd->add_flag("--additional", o.additional,
                "Read FILE as an additional pin file (only BoardType required in its format block)");
}

}  // namespace

void RegisterPinfileCommands(CLI::App& app, Context& ctx) {
  auto* group = app.add_subcommand("pinfile", "Check a pin file or show the pins it describes");
  group->require_subcommand(1);
  auto options = std::make_shared<PinfileOptions>();

  auto* check = group->add_subcommand("check", "Load a pin file as a system would and report every problem");
  AddCommonOptions(check, *options);
  check->callback([&ctx, options] { ctx.result = Check(*options); });

  auto* show = group->add_subcommand("show", "List the ECUs and pins of a pin file");
  AddCommonOptions(show, *options);
  show->add_flag("--json", options->json, "Print one JSON object");
  show->callback([&ctx, options] { ctx.result = Show(*options); });
}

}  // namespace faultbox::cli

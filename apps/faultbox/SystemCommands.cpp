// `faultbox system`: open a failure simulation system from a pin file as a
// document would, and show everything the system knows about the bench.
#include <nlohmann/json.hpp>

#include <cstdio>
#include <memory>
#include <string>

#include "Cli.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCECU.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox::cli {
namespace {

struct InfoOptions {
  std::string pinFile;
  int ecuVersion = 1;
  bool json = false;
};

const char* const kLoadAddressKeys[] = {"FIULoadAddress", "RSIMLoadAddress", "OffsetLoadAddress"};

std::string Hex(std::uint32_t value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%X", value);
  return text;
}

const char* PlatformName(std::int32_t platform) {
  return platform == fptKR40Platform ? "KR40 family" : platform == fptKR60Platform ? "KR60" : "unknown";
}

// The board type as the pin file writes it; the system keeps it only for the KR40 family.
std::string BoardType(const QFCSystem& system) { return system.GetPinFileBoardType(); }

std::string Join(const std::vector<std::string>& list) {
  std::string out;
  for (const std::string& item : list) out += (out.empty() ? "" : ", ") + item;
  return out;
}

struct LoadAddress {
  const char* key;
  HRESULT result;
  std::uint32_t address;
};

// Only a KR60 system has load modules; asking a KR40-family one would only report that it has none.
std::vector<LoadAddress> ReadLoadAddresses(const QFCSystem& system) {
  std::vector<LoadAddress> out;
  if (system.GetPlatformType() != fptKR60Platform) return out;
  for (const char* key : kLoadAddressKeys) {
    LoadAddress entry{key, FAULTBOX_OK, 0};
    entry.result = system.GetLoadAddress(key, entry.address);
    out.push_back(entry);
  }
  return out;
}

nlohmann::json InterfaceJson(const QFCSystem& system) {
  std::int32_t deviceType = -1, value1 = -1, value2 = -1;
  // It always answers; the values stay -1 for a system without a platform.
  (void)system.GetInterfaceParameter(deviceType, value1, value2);
  nlohmann::json out = {{"device_type", deviceType}, {"value1", value1}, {"value2", value2}};
  if (system.GetPlatformType() == fptKR40Platform) {
    out["port_name"] = system.GetSerialSettings().portName;
  } else if (system.GetPlatformType() == fptKR60Platform) {
    std::uint32_t first = 0, second = 0;
    system.GetBusTiming(first, second);
    out["bus_timing"] = {first, second};
  }
  return out;
}

void PrintJson(const QFCSystem* system, HRESULT result) {
  nlohmann::json out = {{"result", ResultCodeText(result)}};
  if (system != nullptr) {
    QFCAbstractObjectData::PropertyTable properties;
    system->GetProperties(properties);
    out["name"] = system->GetName();
    out["pin_file"] = system->GetPinFilePath();
    out["properties"] = properties;
    out["platform"] = system->GetPlatformType();
    out["board_type"] = BoardType(*system);
    out["potentials"] = system->GetPotentialNames();
    nlohmann::json addresses = nlohmann::json::object();
    for (const LoadAddress& entry : ReadLoadAddresses(*system)) {
      addresses[entry.key] = Succeeded(entry.result)
                                 ? nlohmann::json{{"address", entry.address}}
                                 : nlohmann::json{{"result", ResultCodeText(entry.result)}};
    }
    out["load_addresses"] = addresses;
    out["additional_files"] = system->GetAdditionalPinFiles();
    nlohmann::json ecus = nlohmann::json::array();
    for (const QFCECU* ecu : system->GetECUs())
      ecus.push_back({{"name", ecu->GetName()}, {"pins", ecu->GetPinCount()}, {"enabled", ecu->IsEnabled()}});
    out["ecus"] = ecus;
    nlohmann::json classes = {{"file", system->GetFailureClassFile()},
                              {"path", system->GetFailureClassPathUsed()}};
    if (const QFCAbstractFailureClasses* fc = system->GetFailureClasses()) {
      classes["version"] = fc->GetVersion();
      classes["count"] = fc->GetCount();
    }
    out["failure_classes"] = classes;
    out["interface"] = InterfaceJson(*system);
  }
  // Texts from files may hold any bytes; replace what is not UTF-8 rather than fail.
  std::printf("%s\n", out.dump(2, ' ', false, nlohmann::json::error_handler_t::replace).c_str());
}

void PrintText(const QFCSystem* system, HRESULT result) {
  if (system != nullptr) {
    std::printf("system: %s\n", system->GetName().c_str());
    std::printf("platform: %d (%s)\n", system->GetPlatformType(), PlatformName(system->GetPlatformType()));
    std::printf("board type: %s\n", BoardType(*system).c_str());

    QFCAbstractObjectData::PropertyTable properties;
    system->GetProperties(properties);
    std::printf("properties:\n");
    for (const auto& [label, value] : properties) std::printf("  %s: %s\n", label.c_str(), value.c_str());

    if (system->GetPlatformType() == fptKR60Platform) {
      std::printf("potentials: %s\n", Join(system->GetPotentialNames()).c_str());
      std::printf("load addresses:\n");
      for (const LoadAddress& entry : ReadLoadAddresses(*system)) {
        const std::string value = Succeeded(entry.result)
                                      ? Hex(entry.address)
                                      : "not readable (" + ResultCodeText(entry.result) + ")";
        std::printf("  %s: %s\n", entry.key, value.c_str());
      }
    }
    const auto& additional = system->GetAdditionalPinFiles();
    std::printf("additional pin files: %s\n", additional.empty() ? "none" : Join(additional).c_str());

    std::printf("ECUs: %d\n", system->GetECUCount());
    for (const QFCECU* ecu : system->GetECUs()) {
      std::printf("  %s: %d pin%s%s\n", ecu->GetName().c_str(), ecu->GetPinCount(),
                  ecu->GetPinCount() == 1 ? "" : "s", ecu->IsEnabled() ? "" : " (disabled)");
    }

    std::printf("failure class file: %s\n", system->GetFailureClassFile().c_str());
    if (system->GetFailureClassPathUsed() != system->GetFailureClassFile())
      std::printf("  read from: %s\n", system->GetFailureClassPathUsed().c_str());
    if (const QFCAbstractFailureClasses* fc = system->GetFailureClasses())
      std::printf("  version: %s, %d classes\n", fc->GetVersion().c_str(), fc->GetCount());

    std::int32_t deviceType = -1, value1 = -1, value2 = -1;
    // It always answers; the values stay -1 for a system without a platform.
    (void)system->GetInterfaceParameter(deviceType, value1, value2);
    if (system->GetPlatformType() == fptKR40Platform) {
      std::printf("interface: serial port %s (device type %d, port %d)\n",
                  system->GetSerialSettings().portName.c_str(), deviceType, value1);
    } else {
      std::uint32_t first = 0, second = 0;
      system->GetBusTiming(first, second);
      std::printf("interface: CAN device type %d, board %d, channel %d, bus timing %s %s\n", deviceType,
                  value1, value2, Hex(first).c_str(), Hex(second).c_str());
    }
  }
  std::printf("result: %s\n", ResultCodeText(result).c_str());
}

}  // namespace

void RegisterSystemCommands(CLI::App& app, Context& ctx) {
  auto* group = app.add_subcommand("system", "Open failure simulation systems from pin files");
  group->require_subcommand(1);

  auto options = std::make_shared<InfoOptions>();
  auto* info =
      group->add_subcommand("info", "Open a system from a pin file and show what it knows about the bench");
  info->add_option("PINFILE", options->pinFile, "The system's pin file")->required();
  info->add_option("--ecu-version", options->ecuVersion, "ECU version: selects the pin file's column set")
      ->capture_default_str();
  info->add_flag("--json", options->json, "Print one JSON object instead of text");
  info->callback([&ctx, options] {
    QFCSystemAdmin admin;
    QFCSystem* system = nullptr;
    ctx.result = admin.Open(options->pinFile, options->ecuVersion, {}, {}, system);
    std::fflush(stderr);
    if (options->json)
      PrintJson(system, ctx.result);
    else
      PrintText(system, ctx.result);
    std::fflush(stdout);
  });
}

}  // namespace faultbox::cli

// `faultbox doc` and `faultbox ecu`: create a document, show what it holds,
// enable and disable ECUs; and the loading and saving that every editing
// command shares.
#include <nlohmann/json.hpp>

#include <cstdio>
#include <memory>
#include <string>

#include "Cli.h"
#include "config/QFCECU.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/FileHelper.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox::cli {

CLI::Option* AddPinOption(CLI::App* command, std::vector<PinName>& pins, const std::string& help) {
  // Exactly two values per --pin, so that positionals after it stay positionals
  // and names may hold any character, spaces and leading dashes included.
  return command->add_option("--pin", pins, help)
      ->type_name("ECU PIN")
      ->expected(1)
      ->allow_extra_args(false)
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
}

std::unique_ptr<QFCFaultboxDoc> OpenDocument(QFCSystemAdmin& admin, const std::string& path) {
  auto doc = std::make_unique<QFCFaultboxDoc>(admin, QFCFaultboxDoc::PlatformOfPath(path));
  if (!doc->OnOpenDocument(path)) return nullptr;
  return doc;
}

HRESULT EditDocument(const std::string& path, const DocumentChange& change) {
  QFCSystemAdmin admin;
  std::unique_ptr<QFCFaultboxDoc> doc = OpenDocument(admin, path);
  HRESULT result = E_FAULTBOX_CANN_NOT_OPEN_FILE;
  std::string done;
  if (doc) {
    result = change(*doc, done);
    if (Succeeded(result) && !doc->OnSaveDocument(doc->GetPathName())) result = E_FAULTBOX;
  }
  std::fflush(stderr);
  if (Succeeded(result)) {
    if (!done.empty()) std::printf("%s\n", done.c_str());
    std::printf("saved %s\n", doc->GetPathName().c_str());
  } else {
    // What the change ran into, such as the interlock's reason for a pin.
    if (!done.empty()) std::printf("%s\n", done.c_str());
    std::printf("%s was not changed: %s\n", path.c_str(), ResultCodeText(result).c_str());
  }
  std::fflush(stdout);
  return result;
}

namespace {

const char* PlatformWord(std::int32_t platform) {
  return platform == 1 ? "KR40 family" : platform == 2 ? "KR60" : "no platform";
}

// ---- doc new ----

struct NewOptions {
  std::string pinFile;
  int ecuVersion = 1;
  std::string author;
  std::string description;
  std::string out;
};

HRESULT NewDocument(const NewOptions& o) {
  // A new document never replaces a file: that file may hold a bench's patterns.
  if (QFCFileHelper::Exists(o.out)) {
    TheReporter().ReportError(kMsgCannotWriteFile, o.out, "it exists already; a new document does not replace it");
    return E_FAULTBOX;
  }
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, QFCFaultboxDoc::PlatformOfPath(o.out));
  if (!doc.OnNewDocument(o.pinFile, o.ecuVersion, o.author, o.description) || !doc.OnSaveDocument(o.out))
    return E_FAULTBOX;
  const QFCSystem& system = *doc.GetSystem();
  std::size_t pins = 0;
  for (const QFCECU* ecu : system.GetECUs()) pins += static_cast<std::size_t>(ecu->GetPinCount());
  std::fflush(stderr);
  std::printf("created %s: %s bench on %s, %d ECUs, %zu pins\n", doc.GetPathName().c_str(),
              PlatformWord(system.GetPlatformType()), system.GetPinFilePath().c_str(), system.GetECUCount(),
              pins);
  return FAULTBOX_OK;
}

// ---- doc show ----

nlohmann::ordered_json FolderJson(const QFCFailurePatternNode& folder) {
  nlohmann::ordered_json patterns = nlohmann::ordered_json::array();
  for (int i = 0; i < folder.GetPatternCount(); ++i) patterns.push_back(folder.GetPatternAt(i)->GetName());
  nlohmann::ordered_json children = nlohmann::ordered_json::array();
  for (int i = 0; i < folder.GetChildCount(); ++i) children.push_back(FolderJson(*folder.GetChildAt(i)));
  return {{"name", folder.GetName()}, {"patterns", patterns}, {"children", children}};
}

nlohmann::ordered_json DocumentJson(const QFCSystem& system) {
  nlohmann::ordered_json ecus = nlohmann::ordered_json::array();
  for (const QFCECU* ecu : system.GetECUs()) {
    nlohmann::ordered_json pins = nlohmann::ordered_json::array();
    for (int i = 0; i < ecu->GetPinCount(); ++i) pins.push_back(ecu->GetPin(i)->PinName());
    ecus.push_back({{"name", ecu->GetName()}, {"enabled", ecu->IsEnabled()}, {"pins", pins}});
  }
  nlohmann::ordered_json patterns = nlohmann::ordered_json::array();
  const QFCFailurePatterns& collection = *system.GetFailurePatterns();
  for (int i = 0; i < collection.GetCount(); ++i) {
    const QFCAbstractFailurePattern& pattern = *collection.GetAt(i);
    nlohmann::ordered_json pins = nlohmann::ordered_json::array();
    for (const auto& pin : pattern.GetPins()->GetList()) {
      pins.push_back({{"ecu", pin->GetEcuName()},
                      {"pin", pin->GetPinName()},
                      {"pin_config", pin->GetPinConfig()},
                      {"failure_class_id", pin->GetFailureClassId()},
                      {"relay_vector", pin->GetRelayVectorIndex()},
                      {"can_be_activated", pin->CanBeActivated()}});
    }
    patterns.push_back({{"name", pattern.GetName()}, {"pins", pins}});
  }
  return {{"name", system.GetName()},
          {"platform", system.GetPlatformType()},
          {"board_type", system.GetPinFileBoardType()},
          {"pin_file", system.GetPinFilePath()},
          {"ecus", ecus},
          {"patterns", patterns},
          {"folders", FolderJson(*system.GetRootFolder())}};
}

void PrintFolder(const QFCFailurePatternNode& folder, int depth) {
  std::string patterns;
  for (int i = 0; i < folder.GetPatternCount(); ++i)
    patterns += (i == 0 ? "" : ", ") + folder.GetPatternAt(i)->GetName();
  std::printf("%*s%s: %s\n", 2 * depth, "", folder.GetName().c_str(),
              patterns.empty() ? "-" : patterns.c_str());
  for (int i = 0; i < folder.GetChildCount(); ++i) PrintFolder(*folder.GetChildAt(i), depth + 1);
}

void PrintDocument(const QFCSystem& system) {
  std::printf("system: %s\n", system.GetName().c_str());
  std::printf("platform: %d (%s), board type %s\n", system.GetPlatformType(),
              PlatformWord(system.GetPlatformType()), system.GetPinFileBoardType().c_str());
  std::printf("pin file: %s\n", system.GetPinFilePath().c_str());
  if (!system.GetAuthor().empty()) std::printf("author: %s\n", system.GetAuthor().c_str());
  if (!system.GetDescription().empty()) std::printf("description: %s\n", system.GetDescription().c_str());
  std::printf("ECUs: %d\n", system.GetECUCount());
  for (const QFCECU* ecu : system.GetECUs()) {
    std::string pins;
    for (int i = 0; i < ecu->GetPinCount(); ++i) pins += (i == 0 ? "" : ", ") + ecu->GetPin(i)->PinName();
    std::printf("  %s (%s): %s\n", ecu->GetName().c_str(), ecu->IsEnabled() ? "enabled" : "disabled",
                pins.c_str());
  }
  const QFCFailurePatterns& collection = *system.GetFailurePatterns();
  std::printf("patterns: %d\n", collection.GetCount());
  for (int i = 0; i < collection.GetCount(); ++i) {
    const QFCAbstractFailurePattern& pattern = *collection.GetAt(i);
    std::printf("  %s: %d pin%s\n", pattern.GetName().c_str(), pattern.GetPinCount(),
                pattern.GetPinCount() == 1 ? "" : "s");
    for (const auto& pin : pattern.GetPins()->GetList()) {
      std::string config;
      for (std::uint32_t entry : pin->GetPinConfig()) config += std::to_string(entry);
      std::string choice = "no failure class";
      if (pin->GetFailureClassId() >= 0)
        choice = "failure class " + std::to_string(pin->GetFailureClassId()) + ", relay vector " +
                 std::to_string(pin->GetRelayVectorIndex());
      std::printf("    %s %s: PinConfig %s, %s, %s\n", pin->GetEcuName().c_str(), pin->GetPinName().c_str(),
                  config.c_str(), choice.c_str(),
                  pin->CanBeActivated() ? "can be activated" : "cannot be activated");
    }
  }
  std::printf("folders:\n");
  PrintFolder(*system.GetRootFolder(), 1);
}

HRESULT ShowDocument(const std::string& path, bool json) {
  QFCSystemAdmin admin;
  std::unique_ptr<QFCFaultboxDoc> doc = OpenDocument(admin, path);
  std::fflush(stderr);
  if (!doc) return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  if (json)
    // Texts from files may hold any bytes; replace what is not UTF-8 rather than fail.
    std::printf("%s\n", DocumentJson(*doc->GetSystem())
                            .dump(2, ' ', false, nlohmann::json::error_handler_t::replace)
                            .c_str());
  else
    PrintDocument(*doc->GetSystem());
  std::fflush(stdout);
  return FAULTBOX_OK;
}

// ---- ecu enable / disable ----

HRESULT EnableEcu(QFCFaultboxDoc& doc, const std::string& name, bool enable, std::string& done) {
  // Additional pin files may list the ECU again; the document stores the
  // state by name, so every ECU of that name takes it.
  int count = 0;
  for (QFCECU* ecu : doc.GetSystem()->GetECUs()) {
    if (ecu->GetName() != name) continue;
    // A refusal (read-only document, activated pattern) holds for every one
    // of them, so it comes at the first, before anything changed.
    if (!ecu->SetEnabled(enable, false)) return E_FAULTBOX;
    ++count;
  }
  if (count == 0) {
    TheReporter().ReportError(kMsgNoSuchEcu, name);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  done = "ECU " + name + (enable ? " enabled" : " disabled");
  if (count > 1) done += " (in " + std::to_string(count) + " pin files)";
  return FAULTBOX_OK;
}

}  // namespace

void RegisterDocCommands(CLI::App& app, Context& ctx) {
  auto* doc =
      app.add_subcommand("doc", "Create documents (.fsa for KR60, .fss for the KR40 family) and show them");
  doc->require_subcommand(1);

  auto created = std::make_shared<NewOptions>();
  auto* create = doc->add_subcommand("new", "Create a document for a bench from its pin file");
  create->add_option("--pin-file", created->pinFile, "The bench's pin file")->required();
  create->add_option("--ecu-version", created->ecuVersion, "ECU version: selects the pin file's column set")
      ->capture_default_str();
  create->add_option("--author", created->author, "Author of the document");
  create->add_option("--description", created->description, "Description of the bench");
  create->add_option("OUT", created->out, "The new document: NAME.fsa (KR60) or NAME.fss (KR40, KR80)")
      ->required();
  create->callback([&ctx, created] { ctx.result = NewDocument(*created); });

  auto shown = std::make_shared<std::pair<std::string, bool>>();
  auto* show = doc->add_subcommand("show", "Show the system, ECUs, patterns and folders of a document");
  show->add_option("DOC", shown->first, "The document")->required();
  show->add_flag("--json", shown->second, "Print one JSON object instead of text");
  show->callback([&ctx, shown] { ctx.result = ShowDocument(shown->first, shown->second); });

  auto* ecu = app.add_subcommand("ecu", "Enable or disable an ECU of a document");
  ecu->require_subcommand(1);
  for (const bool enable : {false, true}) {
    auto names = std::make_shared<std::pair<std::string, std::string>>();
    auto* command = ecu->add_subcommand(enable ? "enable" : "disable",
                                        enable ? "Enable an ECU: its pins take part in activations again"
                                               : "Disable an ECU: its pins are left out of activations");
    command->add_option("DOC", names->first, "The document")->required();
    command->add_option("ECU", names->second, "The ECU's name as the pin file writes it")->required();
    command->callback([&ctx, names, enable] {
      ctx.result = EditDocument(names->first, [&](QFCFaultboxDoc& document, std::string& done) {
        return EnableEcu(document, names->second, enable, done);
      });
    });
  }
}

}  // namespace faultbox::cli

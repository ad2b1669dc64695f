// `faultbox pattern`: build the failure patterns of a document. Every command
// loads the document, changes it with the model's own operations (so the
// safety interlock and the read-only rule apply) and saves it atomically.
#include <algorithm>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "Cli.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"

namespace faultbox::cli {
namespace {

constexpr int kMsgNameInUse = 87;
constexpr int kMsgClassNotSet = 125;
constexpr int kMsgPatternActivated = 127;

}  // namespace

QFCAbstractFailurePattern* FindPattern(QFCFaultboxDoc& doc, const std::string& name) {
  QFCAbstractFailurePattern* pattern = doc.GetSystem()->FindPattern(name);
  if (pattern == nullptr) TheReporter().ReportError(kMsgNoSuchPattern, name, doc.GetPathName());
  return pattern;
}

bool FindPatternPins(QFCAbstractFailurePattern& pattern, const std::vector<PinName>& names,
                     std::vector<QFCAbstractFailurePatternPin*>& pins) {
  bool all = true;
  for (const PinName& name : names) {
    QFCAbstractFailurePatternPin* pin = pattern.GetPins()->FindPin(name.second, name.first);
    if (pin == nullptr) {
      TheReporter().ReportError(kMsgPinNotInPattern, name.second, name.first);
      all = false;
    }
    pins.push_back(pin);
  }
  return all;
}

namespace {

// The folder of that name below `folder`, its own children first; nullptr
// when there is none.
QFCFailurePatternNode* FindFolder(QFCFailurePatternNode& folder, const std::string& name) {
  for (int i = 0; i < folder.GetChildCount(); ++i)
    if (folder.GetChildAt(i)->GetName() == name) return folder.GetChildAt(i);
  for (int i = 0; i < folder.GetChildCount(); ++i)
    if (QFCFailurePatternNode* found = FindFolder(*folder.GetChildAt(i), name)) return found;
  return nullptr;
}

HRESULT Create(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCSystem& system = *doc.GetSystem();
  // The model notes a name in use only as a class 0 note; here it is the
  // reason the command fails.
  if (!o.name.empty() && system.FindPattern(o.name) != nullptr) {
    TheReporter().ReportError(kMsgNameInUse);
    return E_FAULTBOX_NAME_NOT_UNIQUE;
  }
  QFCAbstractFailurePattern* pattern = nullptr;
  if (HRESULT result = system.CreatePattern(o.name, pattern); result != FAULTBOX_OK) return result;
  done = "created pattern " + pattern->GetName();
  if (o.folder.empty()) return FAULTBOX_OK;
  QFCFailurePatternNode* folder = FindFolder(*system.GetRootFolder(), o.folder);
  if (folder == nullptr) folder = system.GetRootFolder()->CreateChild(o.folder);
  if (folder == nullptr || !folder->AddPattern(pattern)) return E_FAULTBOX;
  system.SetModified();
  done += " in folder " + o.folder;
  return FAULTBOX_OK;
}

HRESULT Delete(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  if (FindPattern(doc, o.name) == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  if (!doc.GetSystem()->RemovePattern(o.name)) return E_FAULTBOX;
  done = "deleted pattern " + o.name;
  return FAULTBOX_OK;
}

HRESULT Rename(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  if (!doc.GetSystem()->RenamePattern(pattern, o.newName)) return E_FAULTBOX;
  done = "renamed pattern " + o.name + " to " + o.newName;
  return FAULTBOX_OK;
}

HRESULT Reset(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  // Reset itself answers only how the interlock fared afterwards; its
  // refusals are asked first so that they are not taken for success.
  if (pattern->IsAnyPinActivated()) {
    TheReporter().ReportError(kMsgPatternActivated);
    return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
  }
  if (!pattern->CheckWritable()) return E_FAULTBOX;
  pattern->Reset();
  done = "pattern " + o.name + ": every PinConfig entry switched off";
  return FAULTBOX_OK;
}

HRESULT AddPins(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  std::vector<QFCAbstractPin*> pins;
  bool all = true;
  for (const PinName& name : o.pins) {
    QFCAbstractPin* pin = doc.GetSystem()->FindPin(name.first, name.second);
    if (pin == nullptr) {
      TheReporter().ReportError(kMsgNoSuchPin, name.second, name.first);
      all = false;
    }
    pins.push_back(pin);
  }
  if (!all) return E_FAULTBOX_INVALID_PARAMETER;
  const int before = pattern->GetPinCount();
  if (!pattern->AddPins(pins)) return E_FAULTBOX;
  done = "pattern " + o.name + ": " + std::to_string(pattern->GetPinCount() - before) + " pin(s) added, " +
         std::to_string(pattern->GetPinCount()) + " in all";
  return FAULTBOX_OK;
}

HRESULT RemovePins(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  std::vector<QFCAbstractFailurePatternPin*> pins;
  if (!FindPatternPins(*pattern, o.pins, pins)) return E_FAULTBOX_INVALID_PARAMETER;
  const int before = pattern->GetPinCount();
  if (!pattern->RemovePins(pins)) return E_FAULTBOX;
  done = "pattern " + o.name + ": " + std::to_string(before - pattern->GetPinCount()) + " pin(s) removed, " +
         std::to_string(pattern->GetPinCount()) + " left";
  return FAULTBOX_OK;
}

// How the interlock left a pin, for the line that tells what a command did.
std::string Outcome(const QFCAbstractFailurePatternPin& pin) {
  std::string config;
  for (std::uint32_t entry : pin.GetPinConfig()) config += std::to_string(entry);
  std::string out = pin.GetEcuName() + " " + pin.GetPinName() + ": PinConfig " + config + ", ";
  if (pin.GetFailureClassId() < 0) {
    out += "no failure class";
    const std::string reason = pin.GetRefusalReason();
    return reason.empty() ? out : out + ": " + reason;
  }
  return out + "failure class " + std::to_string(pin.GetFailureClassId()) + ", relay vector " +
         std::to_string(pin.GetRelayVectorIndex());
}

// A change to one pin may change the classes of others (the pattern's
// external hardware cleared): each of them gets its line too.
class OtherPinsWatch {
 public:
  explicit OtherPinsWatch(const QFCAbstractFailurePattern& pattern) {
    for (const auto& pin : pattern.GetPins()->GetList())
      before_.push_back({pin.get(), pin->GetFailureClassId(), pin->GetRelayVectorIndex()});
  }
  void Tell(const std::vector<QFCAbstractFailurePatternPin*>& named, std::string& done) const {
    for (const Held& held : before_) {
      if (std::find(named.begin(), named.end(), held.pin) != named.end()) continue;
      if (held.pin->GetFailureClassId() == held.id && held.pin->GetRelayVectorIndex() == held.vector)
        continue;
      done += (done.empty() ? "" : "\n") + ("changed with it: " + Outcome(*held.pin));
    }
  }

 private:
  struct Held {
    const QFCAbstractFailurePatternPin* pin;
    std::int32_t id;
    std::int32_t vector;
  };
  std::vector<Held> before_;
};

}  // namespace

HRESULT ConfigurePatternPins(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  std::vector<QFCAbstractFailurePatternPin*> pins;
  if (!FindPatternPins(*pattern, o.pins, pins)) return E_FAULTBOX_INVALID_PARAMETER;
  const OtherPinsWatch others(*pattern);
  for (QFCAbstractFailurePatternPin* pin : pins) {
    // An activated pin refuses the change without a message of its own.
    if (!pin->SetPinConfig(o.entry, static_cast<std::uint32_t>(o.value), true)) {
      if (pin->IsActivated()) TheReporter().ReportError(kMsgPatternActivated);
      return E_FAULTBOX;
    }
    done += (done.empty() ? "" : "\n") + Outcome(*pin);
    // An entry switched on that leaves the pin without a class would be left
    // out of every activation: refused, as a failure class choice is.
    if (o.value == 1 && pin->GetFailureClassId() < 0) {
      TheReporter().ReportError(kMsgClassNotSet);
      return E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED;
    }
  }
  others.Tell(pins, done);
  return FAULTBOX_OK;
}

HRESULT SetPatternPinClass(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done) {
  QFCAbstractFailurePattern* pattern = FindPattern(doc, o.name);
  if (pattern == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
  std::vector<QFCAbstractFailurePatternPin*> pins;
  if (!FindPatternPins(*pattern, o.pins, pins)) return E_FAULTBOX_INVALID_PARAMETER;
  const OtherPinsWatch others(*pattern);
  for (QFCAbstractFailurePatternPin* pin : pins) {
    // The user's explicit choice: the interlock treats the pin first and
    // exempts it from the exclusive-entry rule while the choice is applied.
    pin->SetExplicitChoice(true);
    const HRESULT result = pattern->SetFailureClass(pin, o.classId, o.relayVector);
    pin->SetExplicitChoice(false);
    // A refused class is explained by what the interlock left the pin with.
    done += (done.empty() ? "" : "\n") + Outcome(*pin);
    if (result != FAULTBOX_OK) return result;
  }
  others.Tell(pins, done);
  return FAULTBOX_OK;
}

namespace {

using Change = HRESULT (*)(QFCFaultboxDoc&, const PatternOptions&, std::string&);

struct PatternCommand {
  const char* name;
  const char* help;
  Change change;
};

}  // namespace

void RegisterPatternCommands(CLI::App& app, Context& ctx) {
  auto* group = app.add_subcommand("pattern", "Build the failure patterns of a document");
  group->require_subcommand(1);

  const PatternCommand commands[] = {
      {"create", "Create a pattern (in a folder, made when missing)", Create},
      {"delete", "Delete a pattern", Delete},
      {"rename", "Rename a pattern", Rename},
      {"reset", "Switch off every PinConfig entry of a pattern's pins", Reset},
      {"add-pins", "Add pins to a pattern", AddPins},
      {"remove-pins", "Remove pins from a pattern", RemovePins},
      {"config", "Set a PinConfig entry (0 to 4) of pattern pins to 0 or 1", ConfigurePatternPins},
      {"set-class", "Give pattern pins a failure class and relay vector of your choice", SetPatternPinClass},
  };
  for (const PatternCommand& entry : commands) {
    auto o = std::make_shared<PatternOptions>();
    const std::string name = entry.name;
    auto* command = group->add_subcommand(name, entry.help);
    command->add_option("DOC", o->doc, "The document")->required();
    command->add_option("NAME", o->name, "The pattern's name")->required();
    if (name == "create") command->add_option("--folder", o->folder, "The folder to list the pattern in");
    if (name == "rename") command->add_option("NEWNAME", o->newName, "The pattern's new name")->required();
    if (name == "add-pins" || name == "remove-pins" || name == "config" || name == "set-class")
      AddPinOption(command, o->pins, "A pin, named by its ECU and pin name (repeatable)")->required();
    if (name == "config") {
      command->add_option("ENTRY", o->entry, "The PinConfig entry")->required()->check(CLI::Range(0, 4));
      command->add_option("VALUE", o->value, "1 switches the entry on, 0 off")
          ->required()
          ->check(CLI::Range(0, 1));
    }
    if (name == "set-class") {
      command->add_option("ID", o->classId, "The failure class ID")->required();
      command->add_option("VECTOR", o->relayVector, "The relay vector of the class, counted from 0")
          ->capture_default_str();
    }
    const Change change = entry.change;
    command->callback([&ctx, o, change] {
      ctx.result =
          EditDocument(o->doc, [&](QFCFaultboxDoc& doc, std::string& done) { return change(doc, *o, done); });
    });
  }
}

}  // namespace faultbox::cli

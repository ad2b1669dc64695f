// Shared pieces of the command line program: the context every command runs
// in and the registration of command groups.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {
class QFCAbstractFailurePattern;
class QFCAbstractFailurePatternPin;
class QFCFaultboxDoc;
class QFCSystemAdmin;
}  // namespace faultbox

namespace faultbox::cli {

struct Context {
  // The outcome of the command that ran; decides the exit status.
  HRESULT result = FAULTBOX_OK;
  bool json = false;  // --messages=json
};

// Each command group adds its subcommands and their callbacks here. A callback
// sets ctx.result; exit status is 0 for FAULTBOX_OK, 1 for any failure code.
using Registrar = void (*)(CLI::App& app, Context& ctx);

void RegisterMessageCommands(CLI::App& app, Context& ctx);
void RegisterPinfileCommands(CLI::App& app, Context& ctx);
void RegisterFcdCommands(CLI::App& app, Context& ctx);
void RegisterSystemCommands(CLI::App& app, Context& ctx);
void RegisterDocCommands(CLI::App& app, Context& ctx);
void RegisterPatternCommands(CLI::App& app, Context& ctx);
void RegisterHardwareCommands(CLI::App& app, Context& ctx);

// A pin as the command line names it: ECU name, then pin name.
using PinName = std::pair<std::string, std::string>;
// Adds the repeatable option "--pin ECU PIN" that collects into `pins`.
CLI::Option* AddPinOption(CLI::App* command, std::vector<PinName>& pins, const std::string& help);

// The document at `path`, loaded into `admin` with every message reported;
// nullptr when it cannot be loaded (nothing is left behind in `admin`).
std::unique_ptr<QFCFaultboxDoc> OpenDocument(QFCSystemAdmin& admin, const std::string& path);

// Loads the document, lets `change` apply one change with the model's own
// operations and, when it succeeds, saves the document atomically in place.
// `change` describes what it did in `done` (a line per pin or item) for
// standard output.
// Answers the change's result, or the failure of loading or saving.
using DocumentChange = std::function<HRESULT(QFCFaultboxDoc& doc, std::string& done)>;
HRESULT EditDocument(const std::string& path, const DocumentChange& change);

// What the pattern commands name; the rest is per command.
struct PatternOptions {
  std::string doc;
  std::string name;
  std::string newName;
  std::string folder;
  std::vector<PinName> pins;
  int entry = 0;
  int value = 0;
  int classId = 0;
  int relayVector = 0;
};

// The document's pattern of that name; nullptr (message 920) when there is none.
QFCAbstractFailurePattern* FindPattern(QFCFaultboxDoc& doc, const std::string& name);
// The pattern's pins for the names given; false (with a message per missing
// pin) when one is not in the pattern, so that nothing is changed half-way.
bool FindPatternPins(QFCAbstractFailurePattern& pattern, const std::vector<PinName>& names,
                     std::vector<QFCAbstractFailurePatternPin*>& pins);
// `pattern config` and `pattern set-class` on a loaded document, without
// saving it; `done` gets a line per pin.
HRESULT ConfigurePatternPins(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done);
HRESULT SetPatternPinClass(QFCFaultboxDoc& doc, const PatternOptions& o, std::string& done);

// Front-end message numbers (outside the component's own range).
constexpr int kMsgCannotReadFile = 901;
constexpr int kMsgUnknownMessage = 902;
constexpr int kMsgCannotWriteFile = 912;
constexpr int kMsgNoSuchPattern = 920;
constexpr int kMsgNoSuchPin = 921;
constexpr int kMsgPinNotInPattern = 922;
constexpr int kMsgNoSuchEcu = 923;

}  // namespace faultbox::cli

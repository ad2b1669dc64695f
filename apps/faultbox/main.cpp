// The faultbox command line program: global options, the message sinks of
// the terminal, and the command groups.
#include <nlohmann/json.hpp>

#include <cstdio>
#include <iostream>
#include <vector>

#include "Cli.h"
#include "platform/QFCReporter.h"
#include "platform/Settings.h"

namespace faultbox::cli {
namespace {

const char* ClassWord(int errorClass, int number) {
  switch (errorClass) {
    case 3:
      return "error";
    case 2:
      return "warning";
    case 1:
      return "info";
    default:
      return number == QFCReporter::kInternalFault ? "internal" : "note";
  }
}

// How much the terminal shows: errors (internal faults among them) always,
// warnings unless --quiet, information and notes only with --verbose.
enum class Verbosity { kQuiet, kNormal, kVerbose };

class TextSink : public MessageSink {
 public:
  explicit TextSink(const Verbosity& verbosity) : verbosity_(verbosity) {}
  void Display(const ErrorRecord& r, bool) override {
    const bool error = r.errorClass == 3 || r.number == QFCReporter::kInternalFault;
    const bool shown =
        error || (r.errorClass == 2 && verbosity_ != Verbosity::kQuiet) || verbosity_ == Verbosity::kVerbose;
    if (shown) {
      Print(r);
    } else if (r.errorClass == 0 && r.number != kSeparator && held_.size() < kHeld) {
      held_.push_back(r);
    }
  }
  // Some notes carry the detail of a failure (a failure class file's read
  // error, a pin file's wrong name): a command that failed shows them after all.
  void ShowHeldNotes() {
    for (const ErrorRecord& r : held_) Print(r);
    held_.clear();
  }

 private:
  static constexpr int kSeparator = 154;
  static constexpr std::size_t kHeld = 100;
  static void Print(const ErrorRecord& r) {
    std::fprintf(stderr, "%s %d: %s\n", ClassWord(r.errorClass, r.number), r.number, r.Text().c_str());
    std::fflush(stderr);
  }
  const Verbosity& verbosity_;
  std::vector<ErrorRecord> held_;
};

class JsonSink : public MessageSink {
 public:
  void Display(const ErrorRecord& r, bool show) override {
    nlohmann::json line = {{"number", r.number},
                           {"class", r.errorClass},
                           {"texts", {r.first, r.second}},
                           {"show", show},
                           {"text", r.Text()}};
    // Texts from files may hold any bytes; replace what is not UTF-8 rather than fail.
    std::string out = line.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
    std::fprintf(stderr, "%s\n", out.c_str());
    std::fflush(stderr);
  }
};

constexpr Registrar kRegistrars[] = {
    RegisterMessageCommands,
    RegisterPinfileCommands,
    RegisterFcdCommands,
    RegisterSystemCommands,
    RegisterDocCommands,
    RegisterPatternCommands,
    RegisterHardwareCommands,
};

}  // namespace
}  // namespace faultbox::cli

int main(int argc, char** argv) {
  using namespace faultbox;
  using namespace faultbox::cli;

  CLI::App app{"faultbox: drive failure insertion hardware of HIL test benches"};
  app.set_version_flag("--version", std::string("faultbox ") + FAULTBOX_VERSION_TEXT);
  app.require_subcommand(1);
  app.fallthrough();

  Context ctx;
  std::string messages = "text";
  std::string configFile;
  app.add_option("--messages", messages, "How reported messages are printed on stderr")
      ->check(CLI::IsMember({"text", "json"}))
      ->capture_default_str();
  app.add_option("--config", configFile, "Settings file to use instead of the default one");
  bool verbose = false;
  bool quiet = false;
  auto* verboseFlag =
      app.add_flag("--verbose,-v", verbose, "Print information and notes too, not only warnings and errors");
  app.add_flag("--quiet,-q", quiet, "Print errors only")->excludes(verboseFlag);

  for (Registrar reg : kRegistrars) reg(app, ctx);

  // Settings and sinks must be in place before a command's callback runs.
  Verbosity verbosity = Verbosity::kNormal;
  // JSON lines go to programs, which filter for themselves: they get every message.
  TextSink textSink(verbosity);
  JsonSink jsonSink;
  app.parse_complete_callback([&] {
    verbosity = quiet ? Verbosity::kQuiet : verbose ? Verbosity::kVerbose : Verbosity::kNormal;
    if (!configFile.empty()) Settings::SetPathOverride(configFile);
    ctx.json = messages == "json";
    TheReporter().StartReporting();
    TheReporter().Module()->AddSink(ctx.json ? static_cast<MessageSink*>(&jsonSink) : &textSink);
  });

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    int code = app.exit(e);
    return code == 0 ? 0 : 2;
  }
  // Anything still on the stack (reported without being shown) is shown now.
  if (TheReporter().Module()) {
    TheReporter().ErrorAdapter().DisplayAllErrors(0, false);
    TheReporter().StopReporting();
  }
  if (!Succeeded(ctx.result) && verbosity == Verbosity::kNormal) textSink.ShowHeldNotes();
  return Succeeded(ctx.result) ? 0 : 1;
}

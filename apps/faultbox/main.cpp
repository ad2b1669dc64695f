// The faultbox command line program: global options, the message sinks of
// the terminal, and the command groups.
#include <nlohmann/json.hpp>

#include <cstdio>
#include <iostream>

#include "Cli.h"
#include "host/QFCFaultboxApp.h"
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
      return number == QFCFaultboxApp::kInternalFault ? "internal" : "note";
  }
}

class TextSink : public MessageSink {
 public:
  void Display(const ErrorRecord& r, bool) override {
    std::fprintf(stderr, "%s %d: %s\n", ClassWord(r.errorClass, r.number), r.number, r.Text().c_str());
    std::fflush(stderr);
  }
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

  for (Registrar reg : kRegistrars) reg(app, ctx);

  // Settings and sinks must be in place before a command's callback runs.
  TextSink textSink;
  JsonSink jsonSink;
  app.parse_complete_callback([&] {
    if (!configFile.empty()) Settings::SetPathOverride(configFile);
    ctx.json = messages == "json";
    TheApp().StartReporting();
    TheApp().Module()->AddSink(ctx.json ? static_cast<MessageSink*>(&jsonSink) : &textSink);
  });

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    int code = app.exit(e);
    return code == 0 ? 0 : 2;
  }
  // Anything still on the stack (reported without being shown) is shown now.
  if (TheApp().Module()) {
    TheApp().ErrorAdapter().DisplayAllErrors(0, false);
    TheApp().StopReporting();
  }
  return Succeeded(ctx.result) ? 0 : 1;
}

// Shared pieces of the command line program: the context every command runs
// in and the registration of command groups.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <string>

#include "host/ResultCodes.h"

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

// Front-end message numbers (outside the component's own range).
constexpr int kMsgCannotReadFile = 901;
constexpr int kMsgUnknownMessage = 902;
constexpr int kMsgCannotWriteFile = 912;

}  // namespace faultbox::cli

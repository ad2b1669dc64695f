// `faultbox messages`: the text of message numbers, so that a user can look up
// what a reported number means.
#include <cstdio>
#include <vector>

#include "Cli.h"
#include "platform/QFCReporter.h"
#include "platform/MessageTable.h"

namespace faultbox::cli {

void RegisterMessageCommands(CLI::App& app, Context& ctx) {
  auto* cmd = app.add_subcommand("messages", "Print the texts of message numbers (all when none are given)");
  auto numbers = std::make_shared<std::vector<int>>();
  cmd->add_option("NUMBER", *numbers, "Message numbers to explain");
  cmd->callback([&ctx, numbers] {
    std::vector<int> list = numbers->empty() ? KnownMessageNumbers() : *numbers;
    for (int number : list) {
      const char* text = MessageText(number);
      if (!text) {
        TheReporter().ReportError(kMsgUnknownMessage, std::to_string(number));
        ctx.result = E_FAULTBOX_INVALID_PARAMETER;
        continue;
      }
      std::printf("%4d  %s\n", number, text);
    }
  });
}

}  // namespace faultbox::cli

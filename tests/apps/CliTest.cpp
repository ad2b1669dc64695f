// The command line program's global behaviour: options, exit statuses and
// the two forms of printed messages.
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <sstream>

#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::RunFaultbox;

TEST(CliTest, HelpVersionAndBadUsage) {
  auto help = RunFaultbox({"--help"});
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find("--messages"), std::string::npos);
  auto version = RunFaultbox({"--version"});
  EXPECT_EQ(version.exitCode, 0);
  EXPECT_NE(version.out.find("faultbox "), std::string::npos);
  EXPECT_EQ(RunFaultbox({"--no-such-option"}).exitCode, 2);
  EXPECT_EQ(RunFaultbox({}).exitCode, 2);
  EXPECT_EQ(RunFaultbox({"--messages=xml", "messages", "35"}).exitCode, 2);
}

TEST(CliTest, MessagesInTextForm) {
  auto ok = RunFaultbox({"messages", "47"});
  EXPECT_EQ(ok.exitCode, 0);
  EXPECT_NE(ok.out.find("47"), std::string::npos);
  EXPECT_TRUE(ok.err.empty());

  auto bad = RunFaultbox({"messages", "7"});
  EXPECT_EQ(bad.exitCode, 1);
  EXPECT_EQ(bad.err.rfind("error 902: ", 0), 0u) << bad.err;
}

TEST(CliTest, MessagesInJsonFormAreOneObjectPerLine) {
  auto r = RunFaultbox({"--messages=json", "messages", "7", "8"});
  EXPECT_EQ(r.exitCode, 1);
  std::istringstream lines(r.err);
  std::string line;
  int count = 0;
  while (std::getline(lines, line)) {
    auto j = nlohmann::json::parse(line);
    EXPECT_EQ(j["number"], 902);
    EXPECT_EQ(j["class"], 3);
    ASSERT_EQ(j["texts"].size(), 2u);
    EXPECT_EQ(j["texts"][0], count == 0 ? "7" : "8");
    EXPECT_TRUE(j["show"].is_boolean());
    EXPECT_NE(j["text"].get<std::string>().find(count == 0 ? "7" : "8"), std::string::npos);
    ++count;
  }
  EXPECT_EQ(count, 2);
}

// The terminal shows errors and warnings; --verbose adds information and
// notes, --quiet leaves errors only; JSON lines carry every message.
TEST(CliTest, VerbosityChoosesTheClassesPrinted) {
  test::TempDir dir;
  std::string pins = test::ReadText(FAULTBOX_SOURCE_DIR "/data/kr40_bench.csv");
  pins.insert(pins.find("/FormatEnd"), "Author;\r\n");  // a key without a value: warning 38
  const std::string file = dir.Write("bench.csv", pins);
  const struct {
    std::vector<std::string> options;
    bool warning, information, note;
  } cases[] = {
      {{}, true, false, false},
      {{"--verbose"}, true, true, true},
      {{"-q"}, false, false, false},
      {{"--messages=json", "--quiet"}, true, true, true},
  };
  for (const auto& c : cases) {
    std::vector<std::string> args = c.options;
    args.insert(args.end(), {"pinfile", "check", file});
    const test::ProcessResult r = RunFaultbox(args);
    SCOPED_TRACE(r.err);
    EXPECT_EQ(r.exitCode, 0);
    const bool json = r.err.rfind("{", 0) == 0;
    EXPECT_EQ(r.err.find(json ? "\"number\":38" : "warning 38") != std::string::npos, c.warning);
    EXPECT_EQ(r.err.find(json ? "\"number\":152" : "info 152") != std::string::npos, c.information);
    EXPECT_EQ(r.err.find(json ? "\"number\":154" : "note 154") != std::string::npos, c.note);
  }
  // A command that failed shows the notes that carry the detail, too.
  const test::ProcessResult failed = RunFaultbox({"pinfile", "check", dir.Write("bench.txt", pins)});
  EXPECT_EQ(failed.exitCode, 1);
  EXPECT_NE(failed.err.find("note 72: "), std::string::npos) << failed.err;
  // Errors are printed even with --quiet.
  EXPECT_EQ(RunFaultbox({"--quiet", "messages", "7"}).err.rfind("error 902: ", 0), 0u);
  EXPECT_EQ(RunFaultbox({"--quiet", "--verbose", "messages", "47"}).exitCode, 2);
}

}  // namespace
}  // namespace faultbox

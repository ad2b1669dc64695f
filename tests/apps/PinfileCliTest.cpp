// `faultbox pinfile check` and `show` through the real program: the sample
// files, a broken file's message numbers, and the JSON form.
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <sstream>

#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::RunFaultbox;

std::string Sample(const std::string& name) {
  return std::string(FAULTBOX_SOURCE_DIR) + "/data/" + name;
}

std::string LastLine(const std::string& out) {
  std::string text = out;
  while (!text.empty() && text.back() == '\n') text.pop_back();
  const auto pos = text.rfind('\n');
  return pos == std::string::npos ? text : text.substr(pos + 1);
}

std::vector<nlohmann::json> JsonMessages(const std::string& err) {
  std::vector<nlohmann::json> out;
  std::istringstream lines(err);
  for (std::string line; std::getline(lines, line);) out.push_back(nlohmann::json::parse(line));
  return out;
}

TEST(PinfileCliTest, SamplesCheckOk) {
  struct Case {
    const char* file;
    std::vector<std::string> args;
    const char* board;
  };
  const Case cases[] = {
      {"kr40_bench.csv", {}, "board type: KR40"},
      {"kr80_bench.csv", {}, "board type: KR80"},
      {"kr60_bench.csv", {}, "board type: KR60"},
      {"kr60_additional.csv", {"--additional"}, "board type: KR60"},
  };
  for (const Case& c : cases) {
    std::vector<std::string> args = {"pinfile", "check", Sample(c.file)};
    args.insert(args.end(), c.args.begin(), c.args.end());
    auto r = RunFaultbox(args);
    EXPECT_EQ(r.exitCode, 0) << c.file << "\n" << r.err;
    EXPECT_EQ(LastLine(r.out), "result: FAULTBOX_OK (0x00000000)") << c.file;
    EXPECT_NE(r.out.find(c.board), std::string::npos) << r.out;
    EXPECT_EQ(r.err.find("error "), std::string::npos) << r.err;
  }
  // The main KR60 file brings its additional file into the check.
  auto r = RunFaultbox({"pinfile", "check", Sample("kr60_bench.csv")});
  EXPECT_NE(r.out.find("kr60_additional.csv\nboard type: KR60"), std::string::npos) << r.out;
}

TEST(PinfileCliTest, LfOnlyFileNamesEveryTag) {
  std::string text = test::ReadText(Sample("kr40_bench.csv"));
  std::string lf;
  for (char c : text) {
    if (c != '\r') lf.push_back(c);
  }
  test::TempDir dir;
  auto r = RunFaultbox({"--messages=json", "pinfile", "check", dir.Write("lf.csv", lf)});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_EQ(LastLine(r.out), "result: E_FAULTBOX_TAG_NOT_FOUND (0x80040404)");
  std::vector<std::string> tags;
  for (const auto& m : JsonMessages(r.err)) {
    if (m["number"] == 47) {
      EXPECT_EQ(m["class"], 3);
      EXPECT_EQ(m["texts"][1], "lf.csv");
      tags.push_back(m["texts"][0]);
    }
  }
  EXPECT_EQ(tags, (std::vector<std::string>{"/Comment", "/CommentEnd", "/Format", "/FormatEnd", "/Signallist",
                                            "/SignallistEnd"}));
}

TEST(PinfileCliTest, BrokenFilesNameTheirMessages) {
  const std::string good = test::ReadText(Sample("kr60_bench.csv"));
  struct Case {
    std::string from;
    std::string to;
    std::vector<std::string> args;
    std::vector<int> numbers;  // must all appear
    const char* result;
  };
  const Case cases[] = {
      {"A13;ECM", "A12;ECM", {}, {114, 146}, "result: E_FAULTBOX_CONSISTENCY_CHECK (0x80040406)"},
      {"Potential0;", "Potentail0;", {}, {50}, "result: E_FAULTBOX_CONSISTENCY_CHECK (0x80040406)"},
      {"BoardType;KR60",
       "BoardType;kr60",
       {},
       {49},
       "result: E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED (0x80040409)"},
      {"", "", {"--ecu-version", "2"}, {39}, "result: E_FAULTBOX_HEADER_COL_NOT_FOUND (0x80040405)"},
      {"AdditionalFiles;kr60_additional.csv",
       "AdditionalFiles;missing.csv",
       {},
       {46, 35},
       "result: E_FAULTBOX_CANN_NOT_OPEN_FILE (0x80040400)"},
  };
  for (const Case& c : cases) {
    std::string text = good;
    if (!c.from.empty()) text.replace(text.find(c.from), c.from.size(), c.to);
    test::TempDir dir;
    std::vector<std::string> args = {"--messages=json", "pinfile", "check", dir.Write("bench.csv", text)};
    args.insert(args.end(), c.args.begin(), c.args.end());
    auto r = RunFaultbox(args);
    EXPECT_EQ(r.exitCode, 1) << c.to;
    EXPECT_EQ(LastLine(r.out), c.result) << c.to;
    std::vector<int> numbers;
    for (const auto& m : JsonMessages(r.err)) numbers.push_back(m["number"]);
    for (int n : c.numbers) EXPECT_NE(std::find(numbers.begin(), numbers.end(), n), numbers.end()) << n;
  }
}

TEST(PinfileCliTest, AdditionalFileOfAnotherPlatform) {
  test::TempDir dir;
  std::string main = test::ReadText(Sample("kr40_bench.csv"));
  main.replace(main.find("AdditionalFiles;none"), 20, "AdditionalFiles;sub\\other.csv");
  dir.Write("sub/other.csv", test::ReadText(Sample("kr60_additional.csv")));
  auto r = RunFaultbox({"--messages=json", "pinfile", "check", dir.Write("main.csv", main)});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_EQ(LastLine(r.out), "result: E_FAULTBOX_CONSISTENCY_CHECK (0x80040406)");
  bool found = false;
  for (const auto& m : JsonMessages(r.err)) {
    if (m["number"] == 86) found = m["texts"][0] == "sub\\other.csv";
  }
  EXPECT_TRUE(found) << r.err;
}

TEST(PinfileCliTest, ShowJson) {
  auto r = RunFaultbox({"pinfile", "show", Sample("kr60_bench.csv"), "--json"});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  auto j = nlohmann::json::parse(r.out);
  for (const char* key : {"board_type", "platform", "result", "comment", "columns", "ecus"}) {
    EXPECT_TRUE(j.contains(key)) << key;
  }
  EXPECT_EQ(j["board_type"], "KR60");
  EXPECT_EQ(j["platform"], 2);
  EXPECT_EQ(j["result"], "FAULTBOX_OK (0x00000000)");
  ASSERT_EQ(j["ecus"].size(), 3u);
  EXPECT_EQ(j["ecus"][0]["name"], "ECM");
  EXPECT_EQ(j["ecus"][1]["name"], "ABS_ESP");
  EXPECT_EQ(j["ecus"][2]["name"], "EPS");
  const auto& pin = j["ecus"][0]["pins"][2];
  for (const char* key : {"name", "module_address", "channels", "failure_classes", "values"}) {
    EXPECT_TRUE(pin.contains(key)) << key;
  }
  EXPECT_EQ(pin["name"], "B04");
  EXPECT_EQ(pin["module_address"], 0x011);
  EXPECT_EQ(pin["channels"], nlohmann::json::parse("[3,4]"));
  EXPECT_EQ(pin["failure_classes"], nlohmann::json::parse(R"(["1","2","4","8","9"])"));
  EXPECT_EQ(pin["values"]["signal"], "INJECTOR_1");
  EXPECT_FALSE(pin["values"].contains("not defined"));

  auto kr40 = RunFaultbox({"pinfile", "show", Sample("kr40_bench.csv"), "--json"});
  auto k = nlohmann::json::parse(kr40.out);
  EXPECT_EQ(k["ecus"][2]["pins"][3]["module_address"], 0x12);
  EXPECT_EQ(k["ecus"][2]["pins"][3]["channels"], nlohmann::json::parse("[10]"));
}

TEST(PinfileCliTest, ShowText) {
  auto r = RunFaultbox({"pinfile", "show", Sample("kr80_bench.csv")});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_NE(r.out.find("ECU ECM (6 pins)"), std::string::npos) << r.out;
  EXPECT_NE(r.out.find("  K12: module 0x20, channels 1, failure classes 1 2 3"), std::string::npos) << r.out;
  EXPECT_EQ(LastLine(r.out), "result: FAULTBOX_OK (0x00000000)");
  EXPECT_EQ(RunFaultbox({"pinfile", "show"}).exitCode, 2);
}

}  // namespace
}  // namespace faultbox

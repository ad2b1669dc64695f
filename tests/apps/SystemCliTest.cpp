// `faultbox system info` on the sample benches and on broken pin files.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <ostream>

#include <sstream>

#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::RunFaultbox;
using test::TempDir;

// The sample failure class files the build makes, and a settings file of the test's own.
std::vector<std::string> Environment(const TempDir& dir) {
  return {"NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik", "FAULTBOX_CONFIG=" + dir.File("faultbox.ini")};
}

std::string Sample(const std::string& name) {
  return FAULTBOX_SOURCE_DIR "/data/" + name;
}

struct SampleCase {
  const char* file;
  int platform;
  const char* boardType;
  const char* defaultFile;  // the failure class file "none" chose
  std::size_t additionalFiles;
};

// Test names and failures show the case's name, not its bytes.
void PrintTo(const SampleCase& c, std::ostream* os) {
  *os << c.file;
}

class SystemInfoSampleTest : public ::testing::TestWithParam<SampleCase> {};

TEST_P(SystemInfoSampleTest, OpensAndShowsTheBench) {
  const SampleCase& c = GetParam();
  TempDir dir;
  auto text = RunFaultbox({"system", "info", Sample(c.file)}, {}, Environment(dir));
  EXPECT_EQ(text.exitCode, 0) << text.err;
  EXPECT_NE(text.out.find("result: FAULTBOX_OK"), std::string::npos) << text.out;
  EXPECT_NE(text.out.find("platform: " + std::to_string(c.platform)), std::string::npos) << text.out;
  EXPECT_EQ(text.err.find("error "), std::string::npos) << text.err;

  auto json = RunFaultbox({"system", "info", Sample(c.file), "--json"}, {}, Environment(dir));
  ASSERT_EQ(json.exitCode, 0) << json.err;
  const auto j = nlohmann::json::parse(json.out);
  EXPECT_EQ(j["name"], "System 1");
  EXPECT_EQ(j["platform"], c.platform);
  EXPECT_EQ(j["board_type"], c.boardType);
  EXPECT_EQ(j["additional_files"].size(), c.additionalFiles);
  EXPECT_FALSE(j["ecus"].empty());
  for (const auto& ecu : j["ecus"]) EXPECT_GT(ecu["pins"].get<int>(), 0) << ecu;
  EXPECT_GT(j["failure_classes"]["count"].get<int>(), 0);
  const std::string file = j["failure_classes"]["file"];
  if (c.defaultFile) {
    EXPECT_NE(file.find(c.defaultFile), std::string::npos) << file;
  }
  if (c.platform == 2) {
    EXPECT_EQ(j["potentials"].size(), 5u);
    EXPECT_EQ(j["load_addresses"].size(), 3u);
    EXPECT_EQ(j["interface"]["device_type"], 1);
    EXPECT_EQ(j["interface"]["bus_timing"], nlohmann::json::array({0x47, 0x14}));
  } else {
    EXPECT_EQ(j["interface"]["port_name"], "COM1");
    EXPECT_EQ(j["interface"]["device_type"], 200);
  }
}

const SampleCase kSamples[] = {
    {"kr40_bench.csv", 1, "KR40", "FailureClassesKR40.fcd", 0},
    {"kr80_bench.csv", 1, "KR80", "FailureClassesKR80.fcd", 0},
    {"kr60_bench.csv", 2, "KR60", "FailureClassesKR60.fcd", 1},
};

INSTANTIATE_TEST_SUITE_P(Samples, SystemInfoSampleTest, ::testing::ValuesIn(kSamples), [](const auto& info) {
  std::string name = info.param.file;
  return name.substr(0, name.find('.'));
});

TEST(SystemCliTest, BrokenPinFileNamesItsMessages) {
  TempDir dir;
  // The sample KR60 bench with its first potential repeated.
  std::string text = test::ReadText(Sample("kr60_bench.csv"));
  ASSERT_FALSE(text.empty());
  const std::size_t at = text.find("Potential1");
  ASSERT_NE(at, std::string::npos);
  const std::size_t value = text.find(';', at) + 1;
  const std::size_t end = text.find_first_of(";\r", value);
  const std::size_t first = text.find(';', text.find("Potential0")) + 1;
  const std::string name = text.substr(first, text.find_first_of(";\r", first) - first);
  text.replace(value, end - value, name);
  // Its additional file lies beside the original.
  std::string additional = test::ReadText(Sample("kr60_additional.csv"));
  dir.Write("kr60_additional.csv", additional);
  const std::string path = dir.Write("twice.csv", text);

  auto r = RunFaultbox({"--messages=json", "system", "info", path}, {}, Environment(dir));
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_NE(r.out.find("result: E_FAULTBOX_CONSISTENCY_CHECK (0x80040406)"), std::string::npos) << r.out;
  bool found = false;
  std::istringstream lines(r.err);
  for (std::string line; std::getline(lines, line);) {
    auto j = nlohmann::json::parse(line);
    if (j["number"] == 128) {
      found = true;
      EXPECT_EQ(j["texts"][0], name);
    }
  }
  EXPECT_TRUE(found) << r.err;
}

TEST(SystemCliTest, MissingFilesAndFailureClasses) {
  TempDir dir;
  auto missing = RunFaultbox({"system", "info", dir.File("absent.csv")}, {}, Environment(dir));
  EXPECT_EQ(missing.exitCode, 1);
  EXPECT_NE(missing.err.find("error 46: "), std::string::npos) << missing.err;
  EXPECT_NE(missing.out.find("result: E_FAULTBOX_CANN_NOT_OPEN_FILE"), std::string::npos) << missing.out;

  // Without NORVIK_ROOT the default failure class file cannot be found.
  auto noRoot = RunFaultbox({"system", "info", Sample("kr40_bench.csv"), "--json"}, {},
                            {"NORVIK_ROOT=", "FAULTBOX_CONFIG=" + dir.File("faultbox.ini")});
  EXPECT_EQ(noRoot.exitCode, 1);
  EXPECT_NE(noRoot.err.find("warning 158: "), std::string::npos) << noRoot.err;
  EXPECT_NE(noRoot.err.find("error 80: "), std::string::npos) << noRoot.err;
  EXPECT_EQ(nlohmann::json::parse(noRoot.out)["result"], "E_FAULTBOX_CANN_NOT_OPEN_FILE (0x80040400)");

  EXPECT_EQ(RunFaultbox({"system", "info"}, {}, Environment(dir)).exitCode, 2);
}

}  // namespace
}  // namespace faultbox

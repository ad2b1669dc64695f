// `faultbox fcd build` and `faultbox fcd show`: the exact bytes of a built
// failure class file, the round trip through `show --json`, and failures.
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::RunFaultbox;
using test::TempDir;
using Bytes = std::vector<std::uint8_t>;

struct ByteWriter {
  Bytes bytes;
  void U16(std::uint16_t v) {
    bytes.push_back(static_cast<std::uint8_t>(v));
    bytes.push_back(static_cast<std::uint8_t>(v >> 8));
  }
  void U32(std::uint32_t v) {
    U16(static_cast<std::uint16_t>(v));
    U16(static_cast<std::uint16_t>(v >> 16));
  }
  // Texts below 255 bytes: one length byte, no terminator.
  void Text(const std::string& s) {
    bytes.push_back(static_cast<std::uint8_t>(s.size()));
    bytes.insert(bytes.end(), s.begin(), s.end());
  }
  void Raw(const std::string& s) { bytes.insert(bytes.end(), s.begin(), s.end()); }
};

Bytes FileBytes(const std::string& path) {
  const std::string text = test::ReadText(path);
  return Bytes(text.begin(), text.end());
}

TEST(FcdCliTest, BuildWritesTheFileLayoutByteForByte) {
  TempDir dir;
  const std::string source = dir.Write("two.json", R"({
    "version": "V1",
    "platform": "KR40",
    "classes": [
      {"id": 7, "name": "Open", "description": "D", "limitation": "L", "format": "F", "useLimit": 1,
       "storedValues": [1, -1, 3], "selected": 0,
       "relayVectors": [{"positions": [[1, 1, 2], [2, 0, 0]]}]},
      {"id": 8, "name": "Gnd", "relayVectors": [{"size": 2, "on": [1], "steps": {"1": [3, 4]}}]}
    ]})");
  const std::string output = dir.File("two.fcd");
  auto r = RunFaultbox({"fcd", "build", source, output});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_TRUE(r.err.empty()) << r.err;

  ByteWriter e;
  e.Text("Failure Class Generation Version 1.0");
  e.Text("V1");
  e.U32(1);  // platform
  e.U32(2);  // classes
  // First class: new-class tag, schema 1, the class name with its 16-bit length.
  e.U16(0xFFFF);
  e.U16(1);
  e.U16(19);
  e.Raw("QFCKR40FailureClass");
  e.Text("L");
  e.Text("F");
  e.Text("D");
  e.U32(0);  // selected
  e.U32(1);
  e.U32(0xFFFFFFFF);
  e.U32(3);
  e.U32(1);  // use limit
  e.Text("Open");
  e.U32(7);
  e.U32(1);  // possibilities
  e.U32(2);  // positions: first, second, state each
  e.U32(1), e.U32(2), e.U32(1);
  e.U32(0), e.U32(0), e.U32(2);
  // Second class of the same type: the class's index (1) with the class bit.
  e.U16(0x8001);
  e.Text("");
  e.Text("");
  e.Text("");
  e.U32(0xFFFFFFFF);  // none selected
  e.U32(0), e.U32(0), e.U32(0);
  e.U32(0);
  e.Text("Gnd");
  e.U32(8);
  e.U32(1);
  e.U32(2);
  e.U32(0), e.U32(0), e.U32(2);
  e.U32(3), e.U32(4), e.U32(1);
  EXPECT_EQ(FileBytes(output), e.bytes);

  auto show = RunFaultbox({"fcd", "show", output});
  EXPECT_EQ(show.exitCode, 0) << show.err;
  EXPECT_NE(show.out.find("Class 7: Open"), std::string::npos) << show.out;
  EXPECT_NE(show.out.find("1 (3/4)"), std::string::npos) << show.out;
}

TEST(FcdCliTest, ShowJsonRoundTripsThroughBuild) {
  TempDir dir;
  for (const char* sample : {"kr40", "kr80", "kr60"}) {
    SCOPED_TRACE(sample);
    const std::string first = dir.File(std::string(sample) + ".fcd");
    const std::string second = dir.File(std::string(sample) + "-again.fcd");
    auto built =
        RunFaultbox({"fcd", "build",
                     std::string(FAULTBOX_SOURCE_DIR) + "/data/failure-classes/" + sample + ".json", first});
    ASSERT_EQ(built.exitCode, 0) << built.err;
    auto shown = RunFaultbox({"fcd", "show", "--json", first});
    ASSERT_EQ(shown.exitCode, 0) << shown.err;
    const std::string json = dir.Write(std::string(sample) + "-shown.json", shown.out);
    auto rebuilt = RunFaultbox({"fcd", "build", json, second});
    ASSERT_EQ(rebuilt.exitCode, 0) << rebuilt.err;
    EXPECT_EQ(FileBytes(first), FileBytes(second));
  }
}

TEST(FcdCliTest, DefaultFileAndFailures) {
  TempDir dir;
  const std::string folder = dir.Path() + "/Cockpit/Users/AllUsers";
  std::filesystem::create_directories(folder);
  const std::string kr80 = folder + "/FailureClassesKR80.fcd";
  ASSERT_EQ(RunFaultbox(
                {"fcd", "build", std::string(FAULTBOX_SOURCE_DIR) + "/data/failure-classes/kr80.json", kr80})
                .exitCode,
            0);
  const std::vector<std::string> env = {"NORVIK_ROOT=" + dir.Path()};

  auto byDefault = RunFaultbox({"--messages=json", "fcd", "show", "none", "--board", "KR80"}, "", env);
  EXPECT_EQ(byDefault.exitCode, 0) << byDefault.err;
  EXPECT_NE(byDefault.out.find("Version: KR80 sample set 1.0"), std::string::npos) << byDefault.out;
  EXPECT_NE(byDefault.err.find("\"number\":157"), std::string::npos) << byDefault.err;

  struct Case {
    std::vector<std::string> args;
    int exitCode;
    std::string message;  // on stderr
  };
  const Case cases[] = {
      {{"fcd", "show", "none"}, 2, "--board"},
      {{"fcd", "show", kr80, "--board", "KR60"}, 1, "error 168:"},
      {{"fcd", "show", "none", "--board", "KR60"}, 1, "error 80:"},
      {{"fcd", "show", "None", "--board", "KR80"}, 1, "error 80: The failure class file None "},
      {{"fcd", "show", kr80, "--board", "KR90"}, 2, "KR90"},
      {{"fcd", "build", dir.File("missing.json"), dir.File("x.fcd")}, 1, "error 901:"},
      {{"fcd", "build", dir.Write("bad.json", "{\"version\": \"1\"}"), dir.File("x.fcd")}, 1, "error 911:"},
      {{"fcd", "build", dir.Write("syntax.json", "{"), dir.File("x.fcd")}, 1, "error 910:"},
      {{"fcd", "build", std::string(FAULTBOX_SOURCE_DIR) + "/data/failure-classes/kr40.json",
        dir.File("no/such/folder/x.fcd")},
       1,
       "error 912:"},
      {{"fcd"}, 2, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.args.back());
    auto r = RunFaultbox(c.args, "", env);
    EXPECT_EQ(r.exitCode, c.exitCode) << r.err;
    EXPECT_NE(r.err.find(c.message), std::string::npos) << r.err;
  }
  EXPECT_FALSE(std::filesystem::exists(dir.File("x.fcd")));
}

}  // namespace
}  // namespace faultbox

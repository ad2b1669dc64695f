// The document commands of the real faultbox program: a document built step
// by step from the sample benches (new, patterns, pins, classes, ECUs, show),
// and the refusals that must leave the file as it was.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <nlohmann/json.hpp>

#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::ProcessResult;
using test::ReadText;
using test::RunFaultbox;
using test::TempDir;

class DocCliTest : public ::testing::Test {
 protected:
  // The sample pin files copied into the test's folder, so that the document
  // stores them relative to itself.
  std::string CopySample(const std::string& name) {
    const std::string to = dir_.File(name);
    std::filesystem::copy_file(FAULTBOX_SOURCE_DIR "/data/" + name, to);
    return to;
  }
  ProcessResult Run(const std::vector<std::string>& args) {
    return RunFaultbox(
        args, {},
        {"NORVIK_ROOT=" FAULTBOX_BINARY_DIR "/data/norvik", "FAULTBOX_CONFIG=" + dir_.File("x.ini")});
  }
  // Runs a command that must succeed; the failure shows what it printed.
  void Ok(const std::vector<std::string>& args) {
    const ProcessResult r = Run(args);
    EXPECT_EQ(r.exitCode, 0) << args[0] << " " << args[1] << "\n" << r.out << r.err;
    EXPECT_NE(r.out.find("saved " + dir_.File("")), std::string::npos) << r.out;
  }
  // Runs a command that must fail with `message` and leave the document alone.
  void Refused(const std::vector<std::string>& args, const std::string& document,
               const std::string& message) {
    const std::string before = ReadText(document);
    const ProcessResult r = Run(args);
    EXPECT_EQ(r.exitCode, 1) << r.out << r.err;
    EXPECT_NE(r.err.find(message), std::string::npos) << r.err;
    EXPECT_NE(r.out.find("was not changed"), std::string::npos) << r.out;
    EXPECT_EQ(ReadText(document), before);
  }
  nlohmann::json Show(const std::string& document) {
    const ProcessResult r = Run({"doc", "show", document, "--json"});
    EXPECT_EQ(r.exitCode, 0) << r.err;
    return nlohmann::json::parse(r.out);
  }

  TempDir dir_;
};

TEST_F(DocCliTest, BuildsAKR40DocumentStepByStep) {
  const std::string pins = CopySample("kr40_bench.csv");
  const std::string doc = dir_.File("body bench.fss");
  const ProcessResult created = Run(
      {"--verbose", "doc", "new", "--pin-file", pins, "--author", "Tess", "--description", "bench 2", doc});
  ASSERT_EQ(created.exitCode, 0) << created.err;
  EXPECT_NE(created.out.find("created " + doc), std::string::npos) << created.out;
  EXPECT_NE(created.err.find("info 115"), std::string::npos) << created.err;

  Ok({"pattern", "create", doc, "Door test", "--folder", "Doors"});
  Ok({"pattern", "create", doc, "Spare"});
  Ok({"pattern", "add-pins", doc, "Door test", "--pin", "BCM", "X1.1", "--pin", "DCU_FL", "X1.3"});
  Ok({"pattern", "set-class", doc, "Door test", "--pin", "BCM", "X1.1", "3", "1"});
  Ok({"pattern", "config", doc, "Door test", "--pin", "DCU_FL", "X1.3", "1", "1"});
  Ok({"ecu", "disable", doc, "SEAT_CTRL"});

  const nlohmann::json j = Show(doc);
  EXPECT_EQ(j["name"], doc);
  EXPECT_EQ(j["platform"], 1);
  EXPECT_EQ(j["board_type"], "KR40");
  EXPECT_EQ(j["pin_file"], pins);
  ASSERT_EQ(j["ecus"].size(), 3u);
  EXPECT_EQ(j["ecus"][0]["name"], "BCM");
  EXPECT_EQ(j["ecus"][0]["enabled"], true);
  EXPECT_EQ(j["ecus"][0]["pins"][0], "X1.1");
  EXPECT_EQ(j["ecus"][2]["name"], "SEAT_CTRL");
  EXPECT_EQ(j["ecus"][2]["enabled"], false);
  ASSERT_EQ(j["patterns"].size(), 2u);
  const nlohmann::json& pattern = j["patterns"][0];
  EXPECT_EQ(pattern["name"], "Door test");
  ASSERT_EQ(pattern["pins"].size(), 2u);
  const nlohmann::json& chosen = pattern["pins"][0];
  EXPECT_EQ(chosen["ecu"], "BCM");
  EXPECT_EQ(chosen["pin"], "X1.1");
  // Entries 0 and 2 switched on by the class; the interlock marks what no class allows besides (2).
  EXPECT_EQ(chosen["pin_config"], nlohmann::json::array({1, 2, 1, 2, 2}));
  EXPECT_EQ(chosen["failure_class_id"], 3);
  EXPECT_EQ(chosen["relay_vector"], 1);
  EXPECT_EQ(chosen["can_be_activated"], true);
  EXPECT_EQ(pattern["pins"][1]["pin_config"][1], 1);
  EXPECT_EQ(j["patterns"][1]["pins"].size(), 0u);
  EXPECT_EQ(j["folders"]["name"], "Failure patterns");
  ASSERT_EQ(j["folders"]["children"].size(), 1u);
  EXPECT_EQ(j["folders"]["children"][0]["name"], "Doors");
  EXPECT_EQ(j["folders"]["children"][0]["patterns"], nlohmann::json::array({"Door test"}));

  // The plain form says the same in words.
  const ProcessResult text = Run({"doc", "show", doc});
  EXPECT_EQ(text.exitCode, 0);
  EXPECT_NE(text.out.find("BCM X1.1: PinConfig 12122, failure class 3, relay vector 1"), std::string::npos)
      << text.out;
  EXPECT_NE(text.out.find("SEAT_CTRL (disabled)"), std::string::npos) << text.out;

  // A setting that leaves a pin without a class says why, for that pin.
  const ProcessResult refused = Run({"pattern", "config", doc, "Door test", "--pin", "DCU_FL", "X1.3", "2", "1"});
  EXPECT_NE(refused.out.find("DCU_FL X1.3: PinConfig 21122, no failure class: No relay vector of the pin's "
                             "failure classes allows the PinConfig entries that are switched on."),
            std::string::npos)
      << refused.out;
  Run({"pattern", "config", doc, "Door test", "--pin", "DCU_FL", "X1.3", "2", "0"});

  Ok({"pattern", "remove-pins", doc, "Door test", "--pin", "DCU_FL", "X1.3"});
  Ok({"pattern", "reset", doc, "Door test"});
  Ok({"pattern", "rename", doc, "Door test", "Door"});
  Ok({"pattern", "delete", doc, "Spare"});
  Ok({"ecu", "enable", doc, "SEAT_CTRL"});
  const nlohmann::json after = Show(doc);
  ASSERT_EQ(after["patterns"].size(), 1u);
  EXPECT_EQ(after["patterns"][0]["name"], "Door");
  EXPECT_EQ(after["patterns"][0]["pins"].size(), 1u);
  for (const auto& entry : after["patterns"][0]["pins"][0]["pin_config"]) EXPECT_NE(entry, 1);
  EXPECT_EQ(after["folders"]["children"][0]["patterns"], nlohmann::json::array({"Door"}));
  EXPECT_EQ(after["ecus"][2]["enabled"], true);
}

TEST_F(DocCliTest, RefusalsLeaveTheDocumentAsItWas) {
  const std::string pins = CopySample("kr40_bench.csv");
  const std::string doc = dir_.File("bench.fss");
  ASSERT_EQ(Run({"doc", "new", "--pin-file", pins, doc}).exitCode, 0);
  Ok({"pattern", "create", doc, "A"});

  struct Case {
    std::vector<std::string> args;
    const char* message;
  } cases[] = {
      {{"pattern", "create", doc, "A"}, "error 87"},                                // name in use
      {{"pattern", "delete", doc, "B"}, "error 920"},                               // no such pattern
      {{"pattern", "add-pins", doc, "A", "--pin", "BCM", "X9"}, "error 921"},       // no such pin
      {{"pattern", "add-pins", doc, "A", "--pin", "bcm", "X1.1"}, "error 921"},     // names regard case
      {{"pattern", "remove-pins", doc, "A", "--pin", "BCM", "X1.1"}, "error 922"},  // not in the pattern
      {{"ecu", "disable", doc, "NOPE"}, "error 923"},
  };
  for (const Case& c : cases) Refused(c.args, doc, c.message);

  // A pin that the pattern holds cannot take a class its pin file line does not name.
  Ok({"pattern", "add-pins", doc, "A", "--pin", "DCU_FL", "X1.3"});
  Refused({"pattern", "set-class", doc, "A", "--pin", "DCU_FL", "X1.3", "1"}, doc, "error 130");
  // Entries 0 and 1 of X1.1 make class 2; with entry 2 too no class fits, and
  // a pin without a class would never be activated.
  Ok({"pattern", "add-pins", doc, "A", "--pin", "BCM", "X1.1"});
  for (const char* entry : {"0", "1"})
    Ok({"pattern", "config", doc, "A", "--pin", "BCM", "X1.1", entry, "1"});
  Refused({"pattern", "config", doc, "A", "--pin", "BCM", "X1.1", "2", "1"}, doc, "error 125");

  // A write-protected document refuses every change and stays as it is.
  ASSERT_EQ(::chmod(doc.c_str(), 0444), 0);
  Refused({"pattern", "create", doc, "C"}, doc, "error 118");
  Refused({"pattern", "reset", doc, "A"}, doc, "error 118");
  ::chmod(doc.c_str(), 0644);

  // A new document never replaces an existing file.
  const std::string before = ReadText(doc);
  const ProcessResult again = Run({"doc", "new", "--pin-file", pins, doc});
  EXPECT_EQ(again.exitCode, 1);
  EXPECT_NE(again.err.find("error 912"), std::string::npos) << again.err;
  EXPECT_EQ(ReadText(doc), before);

  // A KR40 pin file does not make a KR60 document.
  const ProcessResult wrongKind = Run({"doc", "new", "--pin-file", pins, dir_.File("bench.fsa")});
  EXPECT_EQ(wrongKind.exitCode, 1);
  EXPECT_NE(wrongKind.err.find("error 49"), std::string::npos) << wrongKind.err;
  EXPECT_FALSE(std::filesystem::exists(dir_.File("bench.fsa")));
}

TEST_F(DocCliTest, KR60DocumentWithAdditionalPinFile) {
  const std::string pins = CopySample("kr60_bench.csv");
  // The additional pin file lists the ECU "ECM" of the main one again.
  std::string additional = ReadText(CopySample("kr60_additional.csv"));
  additional.insert(additional.find("/SignallistEnd"), "D01;ECM;1;1;0_2_2;4;EXTRA;-;-\r\n");
  dir_.Write("kr60_additional.csv", additional);
  const std::string doc = dir_.File("chassis.fsa");
  ASSERT_EQ(Run({"doc", "new", "--pin-file", pins, doc}).exitCode, 0);
  Ok({"pattern", "create", doc, "Crank"});
  Ok({"pattern", "add-pins", doc, "Crank", "--pin", "ECM", "A12", "--pin", "AIRBAG", "S1"});
  const nlohmann::json j = Show(doc);
  EXPECT_EQ(j["platform"], 2);
  EXPECT_EQ(j["board_type"], "KR60");
  ASSERT_EQ(j["patterns"].size(), 1u);
  EXPECT_EQ(j["patterns"][0]["pins"].size(), 2u);
  EXPECT_EQ(j["patterns"][0]["pins"][1]["ecu"], "AIRBAG");

  // Disabling "ECM" disables it in both pin files, and the document stays
  // the same through every later load and save.
  const ProcessResult disabled = Run({"ecu", "disable", doc, "ECM"});
  EXPECT_NE(disabled.out.find("ECU ECM disabled (in 2 pin files)"), std::string::npos) << disabled.out;
  const std::string saved = ReadText(doc);
  int ecms = 0;
  const nlohmann::json shown = Show(doc);
  for (const auto& ecu : shown["ecus"]) {
    if (ecu["name"] != "ECM") continue;
    EXPECT_EQ(ecu["enabled"], false);
    ++ecms;
  }
  EXPECT_EQ(ecms, 2);
  Ok({"pattern", "reset", doc, "Crank"});
  EXPECT_EQ(ReadText(doc), saved);
}

// A document written on Windows may name its pin file in another case than
// the file on disk has: the stored folder and the document's folder are
// searched without regard to case, and message 64 names the file used.
TEST_F(DocCliTest, PinFileNamedInAnotherCase) {
  const struct {
    const char* name;
    const char* movedTo;  // where the pin file is found afterwards
  } cases[] = {
      {"FileName", "Pins/kr40_bench.CSV"},
      {"FolderAndFileName", "pins/KR40_BENCH.csv"},
      {"BesideTheDocument", "Kr40_Bench.csv"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    std::filesystem::remove_all(dir_.File("Pins"));
    std::filesystem::remove_all(dir_.File("pins"));
    std::filesystem::create_directory(dir_.File("Pins"));
    std::filesystem::copy_file(FAULTBOX_SOURCE_DIR "/data/kr40_bench.csv", dir_.File("Pins/kr40_bench.csv"));
    const std::string doc = dir_.File(std::string(c.name) + ".fss");
    ASSERT_EQ(Run({"doc", "new", "--pin-file", dir_.File("Pins/kr40_bench.csv"), doc}).exitCode, 0);
    const std::string used = dir_.File(c.movedTo);
    std::filesystem::create_directories(std::filesystem::path(used).parent_path());
    std::filesystem::rename(dir_.File("Pins/kr40_bench.csv"), used);
    if (std::string(c.movedTo).rfind("pins/", 0) == 0) std::filesystem::remove_all(dir_.File("Pins"));

    const ProcessResult shown = Run({"doc", "show", doc});
    EXPECT_EQ(shown.exitCode, 0) << shown.err;
    EXPECT_NE(shown.err.find("warning 64: The pin file " + used + " is used instead of " +
                             dir_.File("Pins/kr40_bench.csv")),
              std::string::npos)
        << shown.err;
    std::filesystem::remove(used);
  }
}

}  // namespace
}  // namespace faultbox

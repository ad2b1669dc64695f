// A bench in a temporary folder for the system tests: pin files written as
// text, failure class files written through the library's writer, and a
// settings file and NORVIK_ROOT of its own.
#pragma once

#include <cstdlib>
#include <string>
#include <vector>

#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "platform/QFCReporter.h"
#include "platform/UserMode.h"
#include "platform/Settings.h"
#include "support/RunProcess.h"

namespace faultbox::test {

// The text of a pin file: the three blocks, CR LF line ends.
struct PinFile {
  std::vector<std::string> format;
  std::string header;
  std::vector<std::string> pins;

  static PinFile KR40(const std::string& board = "KR40", const std::string& classes = "kr40.fcd") {
    PinFile p;
    p.format = {"BoardType;" + board, "AdditionalFiles;none", "FaultClassFile;" + classes};
    p.header = "pin_name(1);ecu_name(1);faults_ecu(1);fiu_module_id;fiu_module_channel";
    p.pins = {"P1;Engine;1,2;7F;1", "P2;Engine;3;10;2", "P1;Brake;1;5;3"};
    return p;
  }
  static PinFile KR60(const std::string& classes = "kr60.fcd") {
    PinFile p;
    p.format = {"BoardType;KR60",
                "AdditionalFiles;none",
                "FaultClassFile;" + classes,
                "Potential0;UBATT",
                "Potential1;GND",
                "Potential2;none",
                "Potential3;none",
                "Potential4;U5V",
                "OffsetCANAddress;none",
                "OffsetLoadAddress;7E0",
                "OffsetPowerSwitchAddress;none",
                "FIULoadAddress;2_15_7",
                "RSIMLoadAddress;none",
                "FIUCANAddress;none",
                "RSIMCANAddress(1);none",
                "RSIMCANAddress(2);none"};
    p.header =
        "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_channel";
    p.pins = {"P1;Engine;1;1;0_1_2;3", "P2;Engine;2;1;0_1_2;4", "P1;Gearbox;1;1;0_1_3;0"};
    return p;
  }
  // An additional pin file needs only its board type.
  static PinFile Additional(const std::string& board, std::vector<std::string> pins) {
    PinFile p = board == "KR60" ? KR60() : KR40(board);
    p.format = {"BoardType;" + board};
    p.pins = std::move(pins);
    return p;
  }

  // Replaces the value of a format key (or removes the line when `value` is null).
  PinFile& Set(const std::string& key, const char* value) {
    for (auto it = format.begin(); it != format.end(); ++it) {
      if (it->compare(0, key.size() + 1, key + ";") != 0) continue;
      if (value)
        *it = key + ";" + value;
      else
        format.erase(it);
      return *this;
    }
    if (value) format.push_back(key + ";" + value);
    return *this;
  }

  std::string Text() const {
    const std::string eol = "\r\n";
    std::string out = "/Comment" + eol + "Bench of the system tests" + eol + "/CommentEnd" + eol;
    out += "/Format" + eol;
    for (const auto& line : format) out += line + eol;
    out += "/FormatEnd" + eol + "/Signallist" + eol + "columns" + eol + header + eol + eol + eol + eol;
    for (const auto& line : pins) out += line + eol;
    return out + "/SignallistEnd" + eol;
  }
};

// The bytes of a failure class file of the platform with `count` classes 1 ... count.
inline std::string FailureClassFile(std::int32_t platform, int count = 3,
                                    const std::string& version = "1.0") {
  auto classes = QFCAbstractFailureClasses::Create(platform);
  classes->SetVersion(version);
  for (int id = 1; id <= count; ++id) {
    QFCAbstractFailureClass& fc = classes->AddFailureClass();
    fc.SetId(id);
    fc.SetName("Class " + std::to_string(id));
    fc.AddPossibility();
  }
  const std::vector<std::uint8_t> bytes = StoreFailureClasses(*classes);
  return std::string(bytes.begin(), bytes.end());
}

// A temporary bench: its own settings file (empty until written) and
// NORVIK_ROOT pointing into the folder, both put back afterwards.
class Bench {
 public:
  Bench() {
    Settings::SetPathOverride(dir_.File("faultbox.ini"));
    ResetUserMode();
    if (const char* root = std::getenv("NORVIK_ROOT")) savedRoot_ = root, hadRoot_ = true;
    ::setenv("NORVIK_ROOT", dir_.File("norvik").c_str(), 1);
  }
  ~Bench() {
    Settings::SetPathOverride("");
    ResetUserMode();
    if (hadRoot_)
      ::setenv("NORVIK_ROOT", savedRoot_.c_str(), 1);
    else
      ::unsetenv("NORVIK_ROOT");
  }
  Bench(const Bench&) = delete;
  Bench& operator=(const Bench&) = delete;

  // Writes the pin file and the failure class files its samples name.
  std::string Write(const std::string& name, const PinFile& pinFile) const {
    dir_.Write("kr40.fcd", FailureClassFile(1));
    dir_.Write("kr60.fcd", FailureClassFile(2));
    return dir_.Write(name, pinFile.Text());
  }
  std::string WriteFile(const std::string& name, const std::string& content) const {
    return dir_.Write(name, content);
  }
  // The default failure class file below NORVIK_ROOT.
  std::string WriteDefault(const std::string& fileName, std::int32_t platform,
                           const std::string& version) const {
    return dir_.Write("norvik/Cockpit/Users/AllUsers/" + fileName, FailureClassFile(platform, 2, version));
  }
  void SetSetting(const std::string& key, const std::string& value) const {
    Settings::SetString(Settings::kComponentSection, key, value);
  }
  std::string File(const std::string& name) const { return dir_.File(name); }

 private:
  TempDir dir_;
  std::string savedRoot_;
  bool hadRoot_ = false;
};

}  // namespace faultbox::test

// A KR60 system opened from a pin file written by the test (potentials
// UBATT, GND, none, none, U5V unless the test says otherwise), with failure
// classes made in memory and a pattern collection whose patterns are real
// KR60 patterns.
#pragma once

#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include "patterns/PatternTestBench.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"

namespace faultbox::test {

// One KR60 pin line: name, ECU, failure class entries, load module, channels.
struct KR60PinLine {
  std::string pin;
  std::string ecu;
  std::string classes;
  std::string module = "0_1_2";
  std::string channels = "3";
};

// The KR60 name of Vector.
inline QFTPossibility KR60Vector(const std::string& states, const std::vector<std::size_t>& on = {},
                                 std::uint32_t rest = kRelayOff) {
  return Vector(states, on, rest);
}

// The KR60 name of Config.
inline std::string PinConfigText(const QFCAbstractFailurePatternPin* pin) {
  return Config(pin);
}

class KR60Bench : public SystemPatternBench<QFCFailurePatterns, QFCKR60FailurePattern> {
 public:
  // `format` replaces values of the pin file's format block ("OffsetLoadAddress", "10").
  explicit KR60Bench(const std::vector<KR60PinLine>& lines,
                     const std::vector<std::pair<std::string, std::string>>& format = {})
      : SystemPatternBench("kr60.csv", PinFileOf(lines, format), "KR60 bench") {}

 private:
  static PinFile PinFileOf(const std::vector<KR60PinLine>& lines,
                           const std::vector<std::pair<std::string, std::string>>& format) {
    PinFile file = PinFile::KR60();
    for (const auto& [key, value] : format) file.Set(key, value.c_str());
    file.pins.clear();
    for (const auto& l : lines) {
      // As many channels required as the pin lists.
      const auto required = std::count(l.channels.begin(), l.channels.end(), ',') + 1;
      file.pins.push_back(l.pin + ";" + l.ecu + ";" + l.classes + ";" + std::to_string(required) + ";" +
                          l.module + ";" + l.channels);
    }
    return file;
  }
};

}  // namespace faultbox::test

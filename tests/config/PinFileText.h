// Builds pin file texts for the tests: the three blocks with CR LF line ends,
// a valid KR40 or KR60 format block, and pin lines given as fields.
#pragma once

#include <string>
#include <vector>

#include "support/MessageCapture.h"

namespace faultbox::test {

struct PinFileText {
  std::vector<std::string> comment = {"Test bench;rack 1"};
  std::vector<std::string> format;
  std::string header;
  std::vector<std::string> pins;
  std::string preamble;  // lines before the first block, ignored by the reader
  bool commentOnOneLine = false;
  std::string formatTag = "/Format;";
  std::string signallistTag = "/Signallist;";
  std::string eol = "\r\n";

  static PinFileText KR40(const std::string& board = "KR40") {
    PinFileText t;
    t.format = {"BoardType;" + board, "AdditionalFiles;none", "FaultClassFile;none"};
    t.header = "pin_name(1);ecu_name(1);faults_ecu(1);fiu_module_id;fiu_module_channel;signal";
    return t;
  }
  static PinFileText KR60() {
    PinFileText t;
    t.format = {"BoardType;KR60",
                "AdditionalFiles;none",
                "FaultClassFile;none",
                "Potential0;UBATT",
                "Potential1;GND",
                "Potential2;U5V",
                "Potential3;none",
                "Potential4;none",
                "OffsetCANAddress;none",
                "OffsetLoadAddress;10",
                "OffsetPowerSwitchAddress;none",
                "FIULoadAddress;0_15_1",
                "RSIMLoadAddress;0_15_2",
                "FIUCANAddress;none",
                "RSIMCANAddress(1);none",
                "RSIMCANAddress(2);none"};
    t.header =
        "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_channel";
    return t;
  }

  std::string Build() const {
    std::string out = preamble.empty() ? std::string() : preamble + eol;
    if (commentOnOneLine) {
      out += "/Comment;/CommentEnd;" + eol;
    } else {
      out += "/Comment;" + eol;
      for (const auto& l : comment) out += l + eol;
      out += "/CommentEnd;" + eol;
    }
    out += formatTag + eol;
    for (const auto& l : format) out += l + eol;
    out +=
        "/FormatEnd;" + eol + signallistTag + eol + "line two" + eol + header + eol + ";" + eol + eol + eol;
    for (const auto& l : pins) out += l + eol;
    out += "/SignallistEnd;" + eol;
    return out;
  }
};

// The numbers reported, without the load's progress lines (152, 153, 154)
// and the end-of-file notes (76) that every missing tag brings.
inline std::vector<int> ProblemNumbers(const MessageCapture& cap) {
  std::vector<int> out;
  for (const auto& r : cap.records) {
    if (r.number != 152 && r.number != 153 && r.number != 154 && r.number != 76) out.push_back(r.number);
  }
  return out;
}

}  // namespace faultbox::test

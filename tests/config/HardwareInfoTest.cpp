// Loading pin files through the hardware descriptions: tags, format block,
// comment, header and pin lines, with the messages each failure reports.
#include <gtest/gtest.h>

#include <functional>
#include <memory>

#include "config/PinFileText.h"
#include "config/QFCKR40HardwareInfo.h"
#include "config/QFCKR60HardwareInfo.h"
#include "support/MessageCapture.h"
#include "support/RunProcess.h"

namespace faultbox {
namespace {

using test::MessageCapture;
using test::PinFileText;
using test::ProblemNumbers;

const char* kKR40Pins[] = {"P1;ECU_A;1,2;7F;1;SIG1", "P2;ECU_A;3;0x10;10;SIG2", "P1;ECU_B;1;5;2;SIG3"};
const char* kKR60Pins[] = {"P1;ECU_A;1,2;1;2_15_7;3", "P2;ECU_A;3(1,2),5;2;0_1_2;1,2"};

std::unique_ptr<QFCAbstractHardwareInfo> MakeInfo(bool kr60, const std::string& path, int n = 1) {
  if (kr60) return std::make_unique<QFCKR60HardwareInfo>(path, n, nullptr);
  return std::make_unique<QFCKR40HardwareInfo>(path, n, nullptr);
}

struct LoadCase {
  const char* name;
  bool kr60;
  std::function<void(PinFileText&)> edit;
  HRESULT result;
  std::vector<int> messages;  // ProblemNumbers, in order
  bool additional = false;
};

class LoadTest : public ::testing::TestWithParam<LoadCase> {};

TEST_P(LoadTest, ReportsAndResult) {
  const LoadCase& c = GetParam();
  PinFileText text = c.kr60 ? PinFileText::KR60() : PinFileText::KR40();
  if (c.kr60) {
    text.pins.assign(std::begin(kKR60Pins), std::end(kKR60Pins));
  } else {
    text.pins.assign(std::begin(kKR40Pins), std::end(kKR40Pins));
  }
  c.edit(text);
  test::TempDir dir;
  auto info = MakeInfo(c.kr60, dir.Write("bench.csv", text.Build()));
  MessageCapture cap;
  const HRESULT hr = info->LoadPinFile(c.additional);
  EXPECT_EQ(hr, c.result) << ResultCodeText(hr);
  EXPECT_EQ(ProblemNumbers(cap), c.messages);
}

const LoadCase kLoadCases[] = {
    {"GoodKR40", false, [](PinFileText&) {}, FAULTBOX_OK, {}},
    {"GoodKR60", true, [](PinFileText&) {}, FAULTBOX_OK, {}},
    {"LfOnlyLosesEveryTag",
     false,
     [](PinFileText& t) {
       t.preamble = "Pin file of bench 3;;";
       t.eol = "\n";
     },
     E_FAULTBOX_TAG_NOT_FOUND,
     {47, 47, 47, 47, 47, 47}},
    // Only a tag at the very start of the file survives LF-only line ends.
    {"LfOnlyStartingWithTag",
     false,
     [](PinFileText& t) { t.eol = "\n"; },
     E_FAULTBOX_TAG_NOT_FOUND,
     {47, 47, 47, 47, 47}},
    {"CommentTagsShareALine", false, [](PinFileText& t) { t.commentOnOneLine = true; }, FAULTBOX_OK, {}},
    {"FormatTagsOnOneLine",
     false,
     [](PinFileText& t) { t.formatTag = "/Format;/FormatEnd;"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {144}},
    {"CommentEndBeforeComment",
     false,
     [](PinFileText& t) { t.preamble = "/CommentEnd"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {144}},
    {"EndTagWithoutSemicolon",
     false,
     [](PinFileText& t) { t.format.push_back("/FormatEnd"); },
     FAULTBOX_OK,
     {}},
    {"KeyWithoutValue", false, [](PinFileText& t) { t.format.push_back("Author;  "); }, FAULTBOX_OK, {38}},
    {"MissingBoardType",
     false,
     [](PinFileText& t) { t.format.erase(t.format.begin()); },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {50}},
    {"MissingFaultClassFile",
     false,
     [](PinFileText& t) { t.format.pop_back(); },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {50}},
    {"AdditionalNeedsOnlyBoardType",
     true,
     [](PinFileText& t) { t.format = {"BoardType;KR60"}; },
     FAULTBOX_OK,
     {},
     true},
    {"KR60WithoutPotential0",
     true,
     [](PinFileText& t) { t.format.erase(t.format.begin() + 3); },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {50}},
    {"OffsetLowerCaseHex",
     true,
     [](PinFileText& t) { t.format[8] = "OffsetCANAddress;0x7e0"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {34, 134}},
    {"OffsetUpperCaseHexAndNONE",
     true,
     [](PinFileText& t) {
       t.format[8] = "OffsetCANAddress;0x7E0";
       t.format[10] = "OffsetPowerSwitchAddress;NONE";
     },
     FAULTBOX_OK,
     {}},
    {"LoadAddressCabinet10",
     true,
     [](PinFileText& t) { t.format[11] = "FIULoadAddress;10_0_1"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {34, 34, 134}},
    {"HeaderGap",
     false,
     [](PinFileText& t) { t.header = "pin_name(1);ecu_name(1);;faults_ecu(1)"; },
     E_FAULTBOX_INVALID_PARAMETER,
     {112}},
    {"TrailingEmptyHeaderFields", false, [](PinFileText& t) { t.header += ";;"; }, FAULTBOX_OK, {}},
    {"MissingPinNameColumn",
     false,
     [](PinFileText& t) { t.header.replace(0, 11, "pin"); },
     E_FAULTBOX_HEADER_COL_NOT_FOUND,
     {39}},
    {"KR60MissingLoadColumn",
     true,
     [](PinFileText& t) { t.header.replace(t.header.find("load_module_id"), 14, "module"); },
     E_FAULTBOX_HEADER_COL_NOT_FOUND,
     {39}},
    {"ShortPinLine",
     false,
     [](PinFileText& t) { t.pins[1] = "P2;ECU_A;3;10;10"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {147, 148, 146}},
    {"LongPinLineIsFine", false, [](PinFileText& t) { t.pins[1] += ";extra;more"; }, FAULTBOX_OK, {}},
    {"EmptyField",
     false,
     [](PinFileText& t) { t.pins[2] = "P3;ECU_B; ;5;2;S"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {111, 146}},
    {"UnusedLinesAreSkipped",
     false,
     [](PinFileText& t) {
       t.pins.insert(t.pins.begin(), "-;-;-;-;-;-");
       t.pins.push_back("#;ECU_C;1;1;1;S");
     },
     FAULTBOX_OK,
     {}},
    {"DuplicatePinInEcu",
     false,
     [](PinFileText& t) { t.pins.push_back("P2;ECU_A;1;1;1;S"); },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {114, 146}},
    {"DuplicateColumn",
     false,
     [](PinFileText& t) {
       t.header += ";signal";
       for (auto& p : t.pins) p += ";x";
     },
     E_FAULTBOX_INVALID_PARAMETER,
     {40, 147, 146}},
    {"RepeatableColumn",
     false,
     [](PinFileText& t) {
       t.header += ";comment;comment";
       for (auto& p : t.pins) p += ";a;b";
     },
     FAULTBOX_OK,
     {}},
    {"BadModuleId",
     false,
     [](PinFileText& t) { t.pins[0] = "P1;ECU_A;1;80;1;S"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {37, 35, 146}},
    {"KR60BadFailureClassOnlyWarns",
     true,
     [](PinFileText& t) { t.pins[0] = "P1;ECU_A;x;1;2_15_7;3"; },
     FAULTBOX_OK,
     {37}},
    // The tag line holds "/Format" followed by a blank but no field equal to
    // it: the block has no readable fields.
    {"FormatTagWithoutExactField",
     false,
     [](PinFileText& t) { t.formatTag = "/Format block;"; },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {50}},
    {"SignallistTooShortForHeader",
     false,
     [](PinFileText& t) {
       t.signallistTag = "/Signallist;\r\n/SignallistEnd;";
       t.pins.clear();
     },
     E_FAULTBOX_CONSISTENCY_CHECK,
     {35}},
};

INSTANTIATE_TEST_SUITE_P(PinFiles, LoadTest, ::testing::ValuesIn(kLoadCases),
                         [](const auto& info) { return std::string(info.param.name); });

// A loaded file for the focused tests below.
struct Loaded {
  test::TempDir dir;
  std::unique_ptr<QFCAbstractHardwareInfo> info;
  HRESULT result = E_FAIL;
  MessageCapture cap;

  Loaded(bool kr60, const std::string& text, bool additional = false, int n = 1) {
    info = MakeInfo(kr60, dir.Write("bench.csv", text), n);
    cap.Clear();
    result = info->LoadPinFile(additional);
  }
};

TEST(HardwareInfoTest, EcusKeepFirstAppearanceAndPinOrder) {
  PinFileText t = PinFileText::KR40();
  t.pins = {"P1;ZETA;1;1;1;S", "P1;ALPHA;1;1;1;S", "P2;ZETA;2;1;2;S", "P0;MID;3;2;1;S", "P3;ZETA;1;1;3;S"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  ASSERT_EQ(l.info->GetEcuCount(), 3);
  EXPECT_EQ(l.info->GetEcu(0)->GetName(), "ZETA");
  EXPECT_EQ(l.info->GetEcu(1)->GetName(), "ALPHA");
  EXPECT_EQ(l.info->GetEcu(2)->GetName(), "MID");
  EXPECT_EQ(l.info->GetEcu(3), nullptr);
  QFCECU* zeta = l.info->FindEcu("ZETA");
  ASSERT_EQ(zeta->GetPinCount(), 3);
  EXPECT_EQ(zeta->GetPin(2)->PinName(), "P3");
  EXPECT_EQ(zeta->GetPin(2)->GetEcu(), zeta);
  EXPECT_EQ(zeta->GetPin(-1), nullptr);
  EXPECT_EQ(l.info->GetPinCount(), 5u);
  EXPECT_EQ(l.info->FindEcu("zeta"), nullptr);  // ECU names compare exactly
}

TEST(HardwareInfoTest, ProgressMessagesFrameAGoodLoad) {
  PinFileText t = PinFileText::KR40();
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  EXPECT_EQ(l.cap.Numbers(), (std::vector<int>{154, 152, 153, 154}));
  EXPECT_EQ(l.cap.records[0].errorClass, 0);
  EXPECT_EQ(l.cap.records[1].errorClass, 1);
  EXPECT_EQ(l.cap.records[1].first, l.info->GetPinFilePath());
}

TEST(HardwareInfoTest, MessageTextsOfLoadFailures) {
  {
    PinFileText t = PinFileText::KR40();
    t.preamble = "Bench;";
    t.eol = "\n";
    Loaded l(false, t.Build());
    ASSERT_EQ(l.cap.Count(47), 6);
    const char* tags[] = {"/Comment",   "/CommentEnd", "/Format",
                          "/FormatEnd", "/Signallist", "/SignallistEnd"};
    int i = 0;
    for (const auto& r : l.cap.records) {
      if (r.number != 47) continue;
      EXPECT_EQ(r.errorClass, 3);
      EXPECT_EQ(r.first, tags[i++]);
      EXPECT_EQ(r.second, "bench.csv");
    }
    EXPECT_EQ(l.cap.Find(76)->errorClass, 0);
  }
  {
    PinFileText t = PinFileText::KR40();
    t.pins = {"P1;ECU_A;1;1;1;S", "P2;ECU_A;1;1;1", "P3;ECU_A;1;1;1;S"};
    Loaded l(false, t.Build());
    EXPECT_EQ(l.cap.Find(147)->first, "5");
    EXPECT_EQ(l.cap.Find(146)->first, "8");  // the second pin line is line 8 of the block
    EXPECT_EQ(l.info->GetPinCount(), 1u);    // pins before the bad line stay
  }
  {
    PinFileText t = PinFileText::KR40();
    t.pins = {"P1;ECU_A;1;1;1;S", "P1;ECU_A;2;1;2;S"};
    Loaded l(false, t.Build());
    const auto* r = l.cap.Find(114);
    ASSERT_NE(r, nullptr);
    EXPECT_EQ(r->first, "P1");
    EXPECT_EQ(r->second, "Value: P1, pin name: P1, ECU name: ECU_A, File name: bench.csv");
  }
  {
    PinFileText t = PinFileText::KR40();
    t.header = "pin_name(1);ecu_name(1);;;faults_ecu(1)";
    Loaded l(false, t.Build());
    EXPECT_EQ(l.cap.Find(112)->first, "4");
    EXPECT_EQ(l.cap.Find(112)->second, "bench.csv");
  }
  {
    PinFileText t = PinFileText::KR60();
    t.header = "pin_name(1);ecu_name(1);faults_ecu(1);load_module_id;load_module_channel";
    Loaded l(true, t.Build());
    EXPECT_EQ(l.cap.Find(39)->first, "load_channels_required");
    EXPECT_EQ(l.cap.Find(39)->second, "bench.csv");
  }
  {
    PinFileText t = PinFileText::KR60();
    t.format[11] = "FIULoadAddress;10_0_1";
    Loaded l(true, t.Build());
    ASSERT_EQ(l.cap.Count(34), 2);
    EXPECT_EQ(l.cap.records[2].errorClass, 0);
    EXPECT_EQ(l.cap.records[2].first, "cabinet");
    EXPECT_EQ(l.cap.records[2].second, "10_0_1");
    EXPECT_EQ(l.cap.records[3].errorClass, 3);
    EXPECT_EQ(l.cap.records[3].first, "FIULoadAddress");
    EXPECT_EQ(l.cap.records[3].second, "10_0_1");
    EXPECT_EQ(l.cap.Find(134)->first, "bench.csv");
  }
}

TEST(HardwareInfoTest, FormatBlockKeysAndValues) {
  PinFileText t = PinFileText::KR40();
  t.format.push_back("  BoardType  ;  KR80  ");  // a later line replaces the earlier value
  t.format.push_back(";orphan value");
  t.format.push_back(";");
  t.format.push_back("AdditionalFiles;more.csv,sub\\other.csv, spaced.csv");
  t.format.push_back("Author;\"J. Doe\"");
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  std::string value;
  EXPECT_EQ(l.info->GetFormatValue("boardtype", value), FAULTBOX_OK);
  EXPECT_EQ(value, "KR80");
  EXPECT_EQ(l.info->GetPlatformFromBoardType(), fptKR40Platform);
  EXPECT_EQ(l.info->GetFormatValue("", value), FAULTBOX_OK);
  EXPECT_EQ(value, "orphan value");
  EXPECT_EQ(l.info->GetFormatValue("AUTHOR", value), FAULTBOX_OK);
  EXPECT_EQ(value, "J. Doe\"");  // only the quote next to the ";" goes
  EXPECT_EQ(l.info->GetFormatValue("Missing", value), E_FAULTBOX_CONSISTENCY_CHECK);
  EXPECT_EQ(l.info->GetAdditionalFiles(),
            (std::vector<std::string>{"more.csv", "sub\\other.csv", " spaced.csv"}));
  const auto* r = l.cap.Find(48);
  ASSERT_NE(r, nullptr);
  EXPECT_EQ(r->first, "3");
  EXPECT_EQ(r->second, "3");
  EXPECT_EQ(l.info->ResolveAdditionalFile("sub\\other.csv"), l.dir.Path() + "/sub/other.csv");
  EXPECT_EQ(l.info->ResolveAdditionalFile("/abs/Other.csv"), "/abs/Other.csv");
}

TEST(HardwareInfoTest, CommentBlock) {
  PinFileText t = PinFileText::KR40();
  t.comment = {"Bench 7;;rack A;  ", ";;;", "", "second line"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  EXPECT_EQ(l.info->GetComment(), "Bench 7  rack A\r\nsecond line\r\n");

  // "/Comment;/CommentEnd" without a closing ";" holds only the start tag:
  // the comment runs to the next line that holds the end tag.
  PinFileText u = PinFileText::KR40();
  u.comment.clear();
  std::string text = u.Build();
  text.replace(0, std::string("/Comment;\r\n/CommentEnd;").size(),
               "/Comment;/CommentEnd\r\nkept\r\n/CommentEnd");
  Loaded m(false, text);
  ASSERT_EQ(m.result, FAULTBOX_OK);
  EXPECT_EQ(m.info->GetComment(), "kept\r\n");
}

TEST(HardwareInfoTest, SignallistInThirdColumn) {
  PinFileText t = PinFileText::KR40();
  t.signallistTag = "x;y;/Signallist;";
  t.header = "ignored;also;" + t.header;
  t.pins = {"a;;P1;ECU_A;1;1;1;S"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  EXPECT_EQ(l.info->GetColumnNames().front(), "pin_name(1)");
  EXPECT_EQ(l.info->FindEcu("ECU_A")->GetPin(0)->PinName(), "P1");
}

TEST(HardwareInfoTest, EcuVersionSelectsColumns) {
  PinFileText t = PinFileText::KR40();
  t.header =
      "pin_name(1);pin_name(2);ecu_name(2);faults_ecu(2);fiu_module_id;fiu_module_channel;ecu_name(1);"
      "faults_ecu(1)";
  t.pins = {"A1;B1;ECU2;1;1;1;ECU1;-"};
  Loaded v1(false, t.Build(), false, 1);
  EXPECT_EQ(v1.result, FAULTBOX_OK);
  EXPECT_EQ(v1.info->GetEcuCount(), 0);  // failure classes "-": not used in version 1
  Loaded v2(false, t.Build(), false, 2);
  ASSERT_EQ(v2.result, FAULTBOX_OK);
  ASSERT_NE(v2.info->FindEcu("ECU2"), nullptr);
  EXPECT_EQ(v2.info->FindEcu("ECU2")->GetPin(0)->PinName(), "B1");
  Loaded v3(false, t.Build(), false, 3);
  EXPECT_EQ(v3.result, E_FAULTBOX_HEADER_COL_NOT_FOUND);
  EXPECT_EQ(v3.cap.Find(39)->first, "pin_name(3)");
}

TEST(HardwareInfoTest, NotDefinedColumnIsSkipped) {
  PinFileText t = PinFileText::KR40();
  t.header += ";Not Defined";
  t.pins = {"P1;ECU_A;1;1;1;S;whatever"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  EXPECT_FALSE(l.info->GetEcu(0)->GetPin(0)->GetValues().Contains("not defined"));
  EXPECT_EQ(l.info->GetColumnNames().back(), "not defined");
}

TEST(HardwareInfoTest, OpenFailures) {
  test::TempDir dir;
  struct Case {
    std::string path;
    std::vector<int> numbers;
  };
  const Case cases[] = {
      {dir.File("missing.csv"), {46, 46, 35}},
      {dir.Write("bench.txt", "x"), {72, 46, 35}},
      {dir.Write("empty.csv", ""), {73, 46, 35}},
  };
  for (const Case& c : cases) {
    QFCKR40HardwareInfo info(c.path, 1, nullptr);
    MessageCapture cap;
    EXPECT_EQ(info.LoadPinFile(false), E_FAULTBOX_CANN_NOT_OPEN_FILE) << c.path;
    EXPECT_EQ(cap.Numbers(), c.numbers) << c.path;
    EXPECT_EQ(cap.records[1].errorClass, 3);
    EXPECT_EQ(cap.records[2].first, "738");
    std::int32_t platform = 0;
    cap.Clear();
    EXPECT_EQ(info.DetectBoardType(platform), E_FAULTBOX_CANN_NOT_OPEN_FILE);
    EXPECT_EQ(cap.records.back().first, "740");
  }
}

TEST(HardwareInfoTest, DetectBoardType) {
  struct Case {
    const char* board;
    HRESULT result;
    std::int32_t platform;
  };
  const Case cases[] = {
      {"KR40", FAULTBOX_OK, 1},
      {"KR040", FAULTBOX_OK, 1},
      {"KR80", FAULTBOX_OK, 1},
      {"KR080", FAULTBOX_OK, 1},
      {"KR60", FAULTBOX_OK, 2},
      {"KR060", FAULTBOX_OK, 2},
      {"kr60", E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED, 0},
      {"KR70", E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED, 0},
  };
  for (const Case& c : cases) {
    // Only the board type is needed: the format block of an additional file is enough.
    PinFileText t = PinFileText::KR40();
    t.format = {std::string("BoardType;") + c.board};
    test::TempDir dir;
    QFCKR40HardwareInfo info(dir.Write("b.csv", t.Build()), 1, nullptr);
    MessageCapture cap;
    std::int32_t platform = 0;
    EXPECT_EQ(info.DetectBoardType(platform), c.result) << c.board;
    EXPECT_EQ(platform, c.platform) << c.board;
    if (c.result != FAULTBOX_OK) {
      ASSERT_NE(cap.Find(49), nullptr);
      EXPECT_EQ(cap.Find(49)->errorClass, 3);
      EXPECT_EQ(cap.Find(49)->first, c.board);
      cap.Clear();
      EXPECT_EQ(info.GetPlatformFromBoardType(), 0);
      EXPECT_EQ(cap.Find(49)->errorClass, 2);
    }
  }
}

TEST(HardwareInfoTest, PotentialsAndLoadModules) {
  Loaded l(true, PinFileText::KR60().Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  std::string name;
  EXPECT_EQ(l.info->GetPotential(1, name), FAULTBOX_OK);
  EXPECT_EQ(name, "GND");
  l.cap.Clear();
  EXPECT_EQ(l.info->GetPotential(5, name), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(l.cap.Find(35)->first, "54");
  EXPECT_EQ(l.info->GetFIULoadModule(), "0_15_1");
  EXPECT_EQ(l.info->GetRSIMLoadModule(), "0_15_2");

  QFCKR40HardwareInfo fresh("x.csv", 1, nullptr);
  l.cap.Clear();
  EXPECT_EQ(fresh.GetFormatValue("BoardType", name), E_FAULTBOX_CONSISTENCY_CHECK);
  EXPECT_EQ(l.cap.Find(35)->first, "51");
}

TEST(HardwareInfoTest, SecondLoadAddsToEcus) {
  PinFileText t = PinFileText::KR40();
  t.pins = {"P1;ECU_A;1;1;1;S"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  // The same pins again collide with the ones already held.
  EXPECT_EQ(l.info->LoadPinFile(false), E_FAULTBOX_CONSISTENCY_CHECK);
  EXPECT_EQ(l.info->GetPinCount(), 1u);
}

}  // namespace
}  // namespace faultbox

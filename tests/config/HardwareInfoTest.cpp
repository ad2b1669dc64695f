// Loading pin files through the hardware descriptions: tags, format block,
// comment, header and pin lines, with the messages each failure reports.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <memory>

#include "config/PinFileText.h"
#include "config/kr40/QFCKR40HardwareInfo.h"
#include "config/kr60/QFCKR60HardwareInfo.h"
#include "support/MessageCapture.h"
#include "support/RunProcess.h"

namespace faultbox {
namespace {

using test::MessageCapture;
using test::PinFileText;
using test::ProblemNumbers;

const std::vector<std::string> kKR40Pins = {"P1;ECU_A;1,2;7F;1;SIG1", "P2;ECU_A;3;0x10;10;SIG2",
                                            "P1;ECU_B;1;5;2;SIG3"};
const std::vector<std::string> kKR60Pins = {"P1;ECU_A;1,2;1;2_15_7;3", "P2;ECU_A;3(1,2),5;2;0_1_2;1,2"};

std::unique_ptr<QFCAbstractHardwareInfo> MakeInfo(bool kr60, const std::string& path, int n = 1) {
  if (kr60) return std::make_unique<QFCKR60HardwareInfo>(path, n, nullptr);
  return std::make_unique<QFCKR40HardwareInfo>(path, n, nullptr);
}

const char kBench[] = "bench.csv";
const HRESULT kCheck = E_FAULTBOX_CONSISTENCY_CHECK;
using Edit = std::function<void(PinFileText&)>;

// A message that must be among those reported; -1 and null leave a part unchecked.
struct Said {
  int number;
  int errorClass;
  const char* first;
  const char* second;
};

bool Reported(const MessageCapture& cap, const Said& s) {
  return std::any_of(cap.records.begin(), cap.records.end(), [&](const ErrorRecord& r) {
    return r.number == s.number && (s.errorClass < 0 || r.errorClass == s.errorClass) &&
           (!s.first || r.first == s.first) && (!s.second || r.second == s.second);
  });
}

struct LoadCase {
  const char* name;
  bool kr60;
  Edit edit;
  HRESULT result;
  std::vector<int> messages;  // ProblemNumbers, in order
  std::vector<Said> said = {};
  int pins = -1;  // pins held afterwards, when checked
  bool additional = false;
};

class LoadTest : public ::testing::TestWithParam<LoadCase> {};

TEST_P(LoadTest, ReportsAndResult) {
  const LoadCase& c = GetParam();
  PinFileText text = c.kr60 ? PinFileText::KR60() : PinFileText::KR40();
  text.pins = c.kr60 ? kKR60Pins : kKR40Pins;
  c.edit(text);
  test::TempDir dir;
  auto info = MakeInfo(c.kr60, dir.Write("bench.csv", text.Build()));
  MessageCapture cap;
  const HRESULT hr = info->LoadPinFile(c.additional);
  EXPECT_EQ(hr, c.result) << ResultCodeText(hr);
  EXPECT_EQ(ProblemNumbers(cap), c.messages);
  for (const Said& s : c.said) EXPECT_TRUE(Reported(cap, s)) << s.number << " " << (s.first ? s.first : "");
  if (c.pins >= 0) {
    EXPECT_EQ(info->GetPinCount(), static_cast<std::size_t>(c.pins));
  }
}

// Edits of the good file.
const Edit kAsIs = [](PinFileText&) {};
Edit Format(std::size_t line, std::string text) {
  return [=](PinFileText& t) { t.format[line] = text; };
}
Edit AddFormat(std::string text) {
  return [=](PinFileText& t) { t.format.push_back(text); };
}
Edit Header(std::string text) {
  return [=](PinFileText& t) { t.header = text; };
}
Edit Pin(std::size_t line, std::string text) {
  return [=](PinFileText& t) { t.pins[line] = text; };
}
Edit AddColumns(std::string header, std::string values) {
  return [=](PinFileText& t) {
    t.header += header;
    for (auto& p : t.pins) p += values;
  };
}

// clang-format off
const LoadCase kLoadCases[] = {
    {"GoodKR40", false, kAsIs, FAULTBOX_OK, {}, {}, 3},
    {"GoodKR60", true, kAsIs, FAULTBOX_OK, {}, {}, 2},
    {"LfOnlyLosesEveryTag", false, [](auto& t) { t.preamble = "Pin file of bench 3;;"; t.eol = "\n"; },
     E_FAULTBOX_TAG_NOT_FOUND, {47, 47, 47, 47, 47, 47},
     {{47, 3, "/Comment", kBench}, {76, 0, nullptr, nullptr}}},
    // Only a tag at the very start of the file survives LF-only line ends.
    {"LfOnlyStartingWithTag", false, [](auto& t) { t.eol = "\n"; }, E_FAULTBOX_TAG_NOT_FOUND,
     {47, 47, 47, 47, 47}},
    {"CommentTagsShareALine", false, [](auto& t) { t.commentOnOneLine = true; }, FAULTBOX_OK, {}},
    {"FormatTagsOnOneLine", false, [](auto& t) { t.formatTag = "/Format;/FormatEnd;"; }, kCheck, {144}},
    // "/Format" followed by a blank but no field equal to it: no readable fields.
    {"FormatTagWithoutExactField", false, [](auto& t) { t.formatTag = "/Format block;"; }, kCheck, {50}},
    {"EndTagWithoutSemicolon", false, AddFormat("/FormatEnd"), FAULTBOX_OK, {}},
    {"KeyWithoutValue", false, AddFormat("Author;  "), FAULTBOX_OK, {38}},
    {"MissingBoardType", false, [](auto& t) { t.format.erase(t.format.begin()); }, kCheck, {50}},
    {"AdditionalNeedsOnlyBoardType", true, [](auto& t) { t.format = {"BoardType;KR60"}; }, FAULTBOX_OK,
     {}, {}, -1, true},
    {"KR60WithoutPotential0", true, [](auto& t) { t.format.erase(t.format.begin() + 3); }, kCheck, {50}},
    {"OffsetLowerCaseHex", true, Format(8, "OffsetCANAddress;0x7e0"), kCheck, {34, 134}},
    {"OffsetUpperCaseHexAndNONE", true,
     [](auto& t) { t.format[8] = "OffsetCANAddress;0x7E0"; t.format[10] = "OffsetPowerSwitchAddress;NONE"; },
     FAULTBOX_OK, {}},
    {"LoadAddressCabinet10", true, Format(11, "FIULoadAddress;10_0_1"), kCheck, {34, 34, 134},
     {{34, 0, "cabinet", "10_0_1"}, {34, 3, "FIULoadAddress", "10_0_1"}, {134, -1, kBench, nullptr}}},
    // The message names the last empty column before the named one.
    {"HeaderGap", false, Header("pin_name(1);ecu_name(1);;;faults_ecu(1)"), E_FAULTBOX_INVALID_PARAMETER,
     {112}, {{112, -1, "4", kBench}}},
    {"TrailingEmptyHeaderFields", false, AddColumns(";;", ""), FAULTBOX_OK, {}},
    {"KR60MissingLoadColumn", true,
     Header("pin_name(1);ecu_name(1);faults_ecu(1);load_module_id;load_module_channel"),
     E_FAULTBOX_HEADER_COL_NOT_FOUND, {39}, {{39, -1, "load_channels_required", kBench}}},
    {"DuplicateColumn", false, AddColumns(";signal", ";x"), E_FAULTBOX_INVALID_PARAMETER, {40, 147, 146}},
    {"RepeatableColumn", false, AddColumns(";comment;comment", ";a;b"), FAULTBOX_OK, {}},
    // The line number counts from the block's start; pins before the bad line stay.
    {"ShortPinLine", false, Pin(1, "P2;ECU_A;3;10;10"), kCheck, {147, 148, 146},
     {{147, -1, "5", nullptr}, {146, -1, "8", nullptr}}, 1},
    {"LongPinLineIsFine", false, [](auto& t) { t.pins[1] += ";extra;more"; }, FAULTBOX_OK, {}},
    {"EmptyField", false, Pin(2, "P3;ECU_B; ;5;2;S"), kCheck, {111, 146}},
    {"UnusedLinesAreSkipped", false,
     [](auto& t) { t.pins.insert(t.pins.begin(), "-;-;-;-;-;-"); t.pins.push_back("#;ECU_C;1;1;1;S"); },
     FAULTBOX_OK, {}, {}, 3},
    {"DuplicatePinInEcu", false, [](auto& t) { t.pins.push_back("P2;ECU_A;1;1;1;S"); }, kCheck,
     {114, 146}, {{114, -1, "P2", "Value: P2, pin name: P2, ECU name: ECU_A, File name: bench.csv"}}},
    // A pin that fails its own checks fails the load.
    {"BadModuleId", false, Pin(0, "P1;ECU_A;1;80;1;S"), kCheck, {37, 35, 146}},
    // Values that benches' pin files hold are reported, and the file loads.
    {"KR40EmptyFailureClassEntries", false,
     [](auto& t) { t.pins[0] = "P1;ECU_A;1,,2;7F;1;S"; t.pins[1] = "P2;ECU_A;1,2,;1;2;S"; }, FAULTBOX_OK, {},
     {}, 3},
    {"KR60ReportedValuesStillLoad", true,
     [](auto& t) {
       t.pins.push_back("P3;ECU_A;4,x,5;1;0_1_2;4");    // the entries before "x" stay
       t.pins.push_back("P4;ECU_A;1;two;0_1_2;5");      // dropped as not used
       t.pins.push_back("P5;ECU_A;1,,2;1;0_1_2;6,x");   // the channel read makes up the count
       t.pins.push_back("P6;ECU_A;1,2,;1;0_1_2;7");
     },
     FAULTBOX_OK, {37, 37, 37, 37},
     {{37, 3, "faults_ecu", nullptr}, {37, 3, "load_channels_required", nullptr},
      {37, 3, "load_module_channel", nullptr}},
     5},
    {"SignallistTooShortForHeader", false,
     [](auto& t) { t.signallistTag = "/Signallist;\r\n/SignallistEnd;"; t.pins.clear(); }, kCheck, {35}},
};
// clang-format on

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
  // Progress lines frame a good load.
  EXPECT_EQ(l.cap.Numbers(), (std::vector<int>{154, 152, 153, 154}));
  EXPECT_EQ(l.cap.records[1].errorClass, 1);
  EXPECT_EQ(l.cap.records[1].first, l.info->GetPinFilePath());
  std::vector<std::string> ecus;
  for (int i = 0; i < l.info->GetEcuCount(); ++i) ecus.push_back(l.info->GetEcu(i)->GetName());
  EXPECT_EQ(ecus, (std::vector<std::string>{"ZETA", "ALPHA", "MID"}));
  EXPECT_EQ(l.info->GetEcu(3), nullptr);
  QFCECU* zeta = l.info->FindEcu("ZETA");
  ASSERT_EQ(zeta->GetPinCount(), 3);
  EXPECT_EQ(zeta->GetPin(2)->PinName(), "P3");
  EXPECT_EQ(zeta->GetPin(2)->GetEcu(), zeta);
  EXPECT_EQ(zeta->GetPin(-1), nullptr);
  EXPECT_EQ(l.info->FindEcu("zeta"), nullptr);  // ECU names compare exactly
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
  auto valueOf = [&](const char* key) {
    std::string value;
    return l.info->GetFormatValue(key, value) == FAULTBOX_OK ? value : "(refused)";
  };
  EXPECT_EQ(valueOf("boardtype"), "KR80");
  EXPECT_EQ(l.info->GetPlatformFromBoardType(), fptKR40Platform);
  EXPECT_EQ(valueOf(""), "orphan value");
  EXPECT_EQ(valueOf("AUTHOR"), "J. Doe\"");  // only the quote next to the ";" goes
  EXPECT_EQ(valueOf("Missing"), "(refused)");
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
}

// A signal list tag in the third column moves the header and pin fields with
// it; a "Not Defined" column is read but holds no value.
TEST(HardwareInfoTest, HeaderColumns) {
  PinFileText t = PinFileText::KR40();
  t.signallistTag = "x;y;/Signallist;";
  t.header = "ignored;also;" + t.header + ";Not Defined";
  t.pins = {"a;;P1;ECU_A;1;1;1;S;whatever"};
  Loaded l(false, t.Build());
  ASSERT_EQ(l.result, FAULTBOX_OK);
  EXPECT_EQ(l.info->GetColumnNames().front(), "pin_name(1)");
  EXPECT_EQ(l.info->GetColumnNames().back(), "not defined");
  const QFCAbstractPin* pin = l.info->FindEcu("ECU_A")->GetPin(0);
  EXPECT_EQ(pin->PinName(), "P1");
  EXPECT_FALSE(pin->GetValues().Contains("not defined"));
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
    std::int32_t platform = 0;
    EXPECT_EQ(info.DetectBoardType(platform), E_FAULTBOX_CANN_NOT_OPEN_FILE);
  }
}

TEST(HardwareInfoTest, DetectBoardType) {
  const std::pair<const char*, std::int32_t> cases[] = {{"KR40", 1}, {"KR040", 1}, {"KR80", 1}, {"KR080", 1},
                                                        {"KR60", 2}, {"KR060", 2}, {"kr60", 0}, {"KR70", 0}};
  for (const auto& [board, expected] : cases) {
    SCOPED_TRACE(board);
    // Only the board type is needed: the format block of an additional file is enough.
    PinFileText t = PinFileText::KR40();
    t.format = {std::string("BoardType;") + board};
    test::TempDir dir;
    QFCKR40HardwareInfo info(dir.Write("b.csv", t.Build()), 1, nullptr);
    MessageCapture cap;
    std::int32_t platform = 0;
    EXPECT_EQ(info.DetectBoardType(platform), expected ? FAULTBOX_OK : E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED);
    EXPECT_EQ(platform, expected);
    if (expected != 0) continue;
    EXPECT_TRUE(Reported(cap, {49, 3, board, nullptr}));
    cap.Clear();
    EXPECT_EQ(info.GetPlatformFromBoardType(), 0);
    EXPECT_TRUE(Reported(cap, {49, 2, nullptr, nullptr}));
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
  EXPECT_EQ(l.cap.Numbers(), std::vector<int>{35});
  // Nothing loaded yet: no value, no crash.
  EXPECT_EQ(QFCKR40HardwareInfo("x.csv", 1, nullptr).GetFormatValue("BoardType", name), kCheck);
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

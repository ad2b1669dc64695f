// The serial bytes of KR40 and KR80 patterns, byte for byte: both protocols
// in both directions, the pins that are left out, module and relay order,
// and the reset bytes.
#include <gtest/gtest.h>

#include <ostream>

#include "patterns/kr40/QFCSerielleMessageBuilder.h"
#include "patterns/PatternTestBench.h"

namespace faultbox {
namespace {

using test::MessageCapture;
using test::PatternBench;
using test::PinLine;

// One byte as the builder should make it.
struct Byte {
  std::uint32_t value;
  std::int32_t kind;
  std::uint32_t module;
  bool addressByte = false;
  bool answerExpected = false;
  bool operator==(const Byte&) const = default;
};

void PrintTo(const Byte& b, std::ostream* os) {
  *os << std::hex << "0x" << b.value << std::dec << " kind " << b.kind << " module " << b.module
      << (b.addressByte ? " address" : "") << (b.answerExpected ? " answer" : "");
}

constexpr std::int32_t kSel = QFCSerielleMessage::kKindModuleSelection;
constexpr std::int32_t kState = QFCSerielleMessage::kKindState;
constexpr std::int32_t kRelay = QFCSerielleMessage::kKindRelay;
constexpr std::int32_t kExec = QFCSerielleMessage::kKindExecute;

std::vector<Byte> Bytes(const QFCMessageList& messages) {
  std::vector<Byte> out;
  for (const auto& m : messages) {
    const auto* s = dynamic_cast<const QFCSerielleMessage*>(m.get());
    if (s == nullptr) {
      ADD_FAILURE() << "not a serial message";
      continue;
    }
    out.push_back(
        {s->GetValue(), s->GetKind(), s->GetModuleAddress(), s->IsAddressByte(), s->IsAnswerExpected()});
  }
  return out;
}

// A pin of the case: the PinConfig entries switched on (which give it its
// failure class through the interlock), and its flags.
struct PinSetup {
  std::vector<int> entriesOn;
  bool selected = true;
  bool activated = false;
};

struct BuildCase {
  const char* name;
  std::string board;
  std::vector<PinLine> lines;
  std::vector<PinSetup> pins;  // in line order
  bool activate;
  std::vector<Byte> bytes;
  std::vector<int> messages = {};  // reported message numbers
};

void PrintTo(const BuildCase& c, std::ostream* os) {
  *os << c.name;
}

class BuildTest : public ::testing::TestWithParam<BuildCase> {};

TEST_P(BuildTest, Bytes) {
  const BuildCase& c = GetParam();
  PatternBench bench(c.lines, c.board);
  bench.patterns().scripted = false;
  // Class n switches entry n-1: entries 0 to 2 pick classes 1 to 3.
  bench.AddClass(1, {"10000"});
  bench.AddClass(2, {"01000"});
  bench.AddClass(3, {"00100", "10100"});
  std::vector<QFCAbstractPin*> pins;
  for (const auto& line : c.lines) pins.push_back(bench.Pin(line.ecu, line.pin));
  auto* pattern = bench.CreateWith(pins);
  ASSERT_EQ(pattern->GetPinCount(), static_cast<int>(c.pins.size()));
  for (std::size_t i = 0; i < c.pins.size(); ++i) {
    auto* pin = pattern->GetPinAt(static_cast<int>(i));
    for (int entry : c.pins[i].entriesOn) pin->SetPinConfig(entry, 1, false);
    pin->SetSelected(c.pins[i].selected);
    pin->SetActivated(c.pins[i].activated);
  }

  MessageCapture cap;
  QFCMessageList messages;
  messages.push_back(std::make_unique<QFCSerielleMessage>());  // emptied first
  ASSERT_TRUE(pattern->BuildMessages(messages, c.activate));
  EXPECT_EQ(Bytes(messages), c.bytes);
  EXPECT_EQ(cap.Numbers(), c.messages);
}

// Module 5, relay 3: the pin file's fiu_module_id and fiu_module_channel.
const PinLine kRelay3{"P1", "Engine", "1,2,3", "5", "3"};

const BuildCase kBuildCases[] = {
    // State 2 is PinConfig entry 1; answers 0xC5 and 0xE5 are the sums
    // 0x40+0x85 and 0x62+0x83.
    {"ProtocolAActivates",
     "KR40",
     {kRelay3},
     {{{1}}},
     true,
     {{0x40, kSel, 5},
      {0x85, kSel, 5, true, true},
      {0x62, kState, 5},
      {0x83, kRelay, 5, false, true},
      {0x51, kExec, 0}}},
    {"ProtocolADeactivates",
     "KR40",
     {kRelay3},
     {{{1}, false, true}},
     false,
     {{0x40, kSel, 5},
      {0x85, kSel, 5, true, true},
      {0x60, kState, 5},
      {0x83, kRelay, 5, false, true},
      {0x51, kExec, 0}}},
    // Protocol B carries the failure class (2) instead of the entries.
    {"ProtocolBActivates",
     "KR80",
     {kRelay3},
     {{{1}}},
     true,
     {{0x05, kSel, 5}, {0xD1, kState, 5}, {0x9F, kExec, 0}}},
    {"ProtocolBDeactivates",
     "KR080",
     {kRelay3},
     {{{1}, false, true}},
     false,
     {{0x05, kSel, 5}, {0x91, kState, 5}, {0x9F, kExec, 0}}},
    // Entries 0 and 2 on: state bits 0b00101.
    {"ProtocolAStateIsEntryBits",
     "KR40",
     {{"P1", "Engine", "3", "7F", "10"}},
     {{{0, 2}}},
     true,
     {{0x40, kSel, 0x7F},
      {0xFF, kSel, 0x7F, true, true},
      {0x65, kState, 0x7F},
      {0x8A, kRelay, 0x7F, false, true},
      {0x51, kExec, 0}}},
    // Relays of one module go newest first; modules in the order pins first name them.
    {"RelaysNewestFirstModulesInPinOrder",
     "KR80",
     {{"P1", "Engine", "1", "9", "2"}, {"P2", "Engine", "2", "4", "1"}, {"P3", "Engine", "3", "9", "6"}},
     {{{0}}, {{1}}, {{2}}},
     true,
     {{0x09, kSel, 9},
      {0xF4, kState, 9},
      {0xB0, kState, 9},
      {0x04, kSel, 4},
      {0xCF, kState, 4},
      {0x9F, kExec, 0}}},
    {"NothingSelectedNoBytes", "KR40", {kRelay3}, {{{1}, false}}, true, {}},
    {"ActivatedPinsNotSentAgain", "KR40", {kRelay3}, {{{1}, true, true}}, true, {}},
    {"DeactivatingSendsOnlyActivatedPins",
     "KR80",
     {kRelay3, {"P2", "Engine", "1", "6", "1"}},
     {{{1}}, {{0}, false, true}},
     false,
     {{0x06, kSel, 6}, {0x8F, kState, 6}, {0x9F, kExec, 0}}},
    // Selected but without a failure class: the interlock did not clear it.
    {"NoFailureClassNotSent", "KR40", {kRelay3}, {{{}}}, true, {}},
    {"ActivatedWithoutClassReported", "KR40", {kRelay3}, {{{}, false, true}}, false, {}, {131}},
};

INSTANTIATE_TEST_SUITE_P(Cases, BuildTest, ::testing::ValuesIn(kBuildCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(SerialMessageBuilder, LeftOutPinsAreDeselectedWithTheirNames) {
  PatternBench bench({{"P1", "Engine", "1", "0", "1"}});
  bench.patterns().scripted = false;
  bench.AddClass(1, {"10000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* zero = pattern->GetPinAt(0);
  zero->SetPinConfig(0, 1, false);
  zero->SetSelected(true);
  MessageCapture cap;
  QFCMessageList messages;
  ASSERT_TRUE(pattern->BuildMessages(messages, true));
  EXPECT_TRUE(messages.empty());
  ASSERT_NE(cap.Find(109), nullptr);
  EXPECT_EQ(cap.Find(109)->errorClass, 2);
  EXPECT_EQ(cap.Find(109)->first, "0x0");
  EXPECT_EQ(cap.Find(109)->second, "P1");
  // Not marked as switched by a successful activation.
  EXPECT_FALSE(zero->IsSelected());
}

// Module addresses above 127 and relays outside 1 to 10 do not come from a
// checked pin file; the byte rules still hold for them.
TEST(SerialMessageBuilder, ModuleDataBytes) {
  std::vector<std::unique_ptr<QFCSerielleMessageData>> modules;
  modules.push_back(std::make_unique<QFCSerielleMessageData>(200));
  EXPECT_TRUE(modules[0]->SetRelayState(3, 2));
  QFCMessageList messages;
  QFCSerielleMessageBuilder::AppendModuleBytes(modules, QFCSerielleMessageBuilder::Protocol::kA, true,
                                               messages);
  EXPECT_EQ(Bytes(messages), (std::vector<Byte>{{0x40, kSel, 200},
                                                {0xC8, kSel, 200, true, true},
                                                {0x62, kState, 200},
                                                {0x83, kRelay, 200, false, true},
                                                {0x51, kExec, 0}}));

  // Relays 0 and 11 are not stored: a module without relays sends nothing,
  // and without any module there is no execute byte either.
  std::vector<std::unique_ptr<QFCSerielleMessageData>> none;
  none.push_back(std::make_unique<QFCSerielleMessageData>(5));
  EXPECT_FALSE(none[0]->SetRelayState(0, 1));
  EXPECT_FALSE(none[0]->SetRelayState(11, 1));
  for (auto protocol : {QFCSerielleMessageBuilder::Protocol::kA, QFCSerielleMessageBuilder::Protocol::kB}) {
    messages.clear();
    QFCSerielleMessageBuilder::AppendModuleBytes(none, protocol, true, messages);
    EXPECT_TRUE(messages.empty());
  }

  // Protocol B states other than 1 to 3 carry no state bits.
  modules[0] = std::make_unique<QFCSerielleMessageData>(5);
  modules[0]->SetRelayState(1, 7);
  messages.clear();
  QFCSerielleMessageBuilder::AppendModuleBytes(modules, QFCSerielleMessageBuilder::Protocol::kB, true,
                                               messages);
  EXPECT_EQ(Bytes(messages), (std::vector<Byte>{{0x05, kSel, 5}, {0x0F, kState, 5}, {0x9F, kExec, 0}}));
}

TEST(SerialMessageBuilder, RelayStoredAgainKeepsItsPlace) {
  QFCSerielleMessageData data(5);
  data.SetRelayState(3, 1);
  data.SetRelayState(5, 1);
  data.SetRelayState(3, 2);
  data.SetRelayState(10, 3);
  using RS = QFCSerielleMessageData::RelayState;
  EXPECT_EQ(data.GetRelayStates(), (std::vector<RS>{{10, 3}, {5, 1}, {3, 2}}));
}

TEST(SerialMessageBuilder, ResetBytes) {
  for (const char* board : {"KR40", "KR040", "KR80", "KR080"}) {
    SCOPED_TRACE(board);
    PatternBench bench({kRelay3}, board);
    const bool b = std::string(board).find('8') != std::string::npos;
    QFCSerielleMessageBuilder builder(nullptr, bench.system());
    QFCMessageList messages;
    EXPECT_FALSE(builder.BuildResetMessages(1, messages));
    EXPECT_TRUE(messages.empty());
    ASSERT_TRUE(builder.BuildResetMessages(QFCSerielleMessageBuilder::kResetSelector, messages));
    const std::vector<Byte> bytes = Bytes(messages);
    ASSERT_EQ(bytes.size(), b ? 129u : 257u);
    EXPECT_EQ(bytes[0], (Byte{b ? 0x9Eu : 0x49u, QFCSerielleMessage::kKindReset, 0}));
    for (std::uint32_t a = 0; a < 128; ++a) {
      if (b) {
        EXPECT_EQ(bytes[1 + a], (Byte{a, kSel, a}));
      } else {
        EXPECT_EQ(bytes[1 + 2 * a], (Byte{0x40, kSel, a}));
        EXPECT_EQ(bytes[2 + 2 * a], (Byte{a | 0x80, kSel, a, true, true}));
      }
    }
  }
}

TEST(SerialMessageBuilder, OnlyForTheKR40Family) {
  test::Bench files;
  QFCSystem kr60("KR60", files.Write("kr60.csv", test::PinFile::KR60()), 1, "", "");
  ASSERT_EQ(kr60.OpenFromPinFile(), FAULTBOX_OK);
  QFCSerielleMessageBuilder resets(nullptr, &kr60);
  QFCMessageList messages;
  EXPECT_TRUE(resets.BuildResetMessages(QFCSerielleMessageBuilder::kResetSelector, messages));
  EXPECT_TRUE(messages.empty());

  PatternBench bench({kRelay3});
  bench.patterns().scripted = false;
  bench.AddClass(2, {"01000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  pattern->GetPinAt(0)->SetPinConfig(1, 1, false);
  pattern->GetPinAt(0)->SetSelected(true);
  QFCSerielleMessageBuilder builder(static_cast<QFCKR40FailurePattern*>(pattern), &kr60);
  messages.push_back(std::make_unique<QFCSerielleMessage>());
  EXPECT_FALSE(builder.BuildMessages(messages, true));
  EXPECT_TRUE(messages.empty());
  EXPECT_TRUE(builder.GetModuleData().empty());
}

}  // namespace
}  // namespace faultbox

// The KR60 pattern: the resistor value and RSIM word, the external hardware
// setters and their guards, a failure class choice turned into settings, the
// requirement positions of the external hardware, the pin's module and relay
// states, and the stored form of the external hardware.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <array>
#include <cstdint>
#include <ostream>
#include <utility>

#include "patterns/KR60PatternBench.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"
#include "platform/MessageTable.h"

namespace faultbox {
namespace {

using test::KR60Bench;
using test::KR60Vector;
using test::MessageCapture;
using test::PinConfigText;

using Bytes = std::vector<std::uint8_t>;

constexpr std::int32_t kResistor = QFCExternHardware::kResistor;
constexpr std::int32_t kMeasurement = QFCExternHardware::kMeasurement;
constexpr std::int32_t kSource = QFCExternHardware::kSource;

// Every setting of the external hardware, for comparing whole states.
struct HardwareState {
  int resistorPotential = 5;
  int measurementPotential = 5;
  std::pair<int, int> resistor{0, 0};
  std::pair<int, int> measurement{0, 0};
  std::array<int, 4> channels{};
  std::pair<int, int> source{0, 0};
  int value = 0;
  bool operator==(const HardwareState&) const = default;
};

std::ostream& operator<<(std::ostream& os, const HardwareState& s) {
  os << "pot " << s.resistorPotential << "/" << s.measurementPotential << " R(" << s.resistor.first << ","
     << s.resistor.second << ") M(" << s.measurement.first << "," << s.measurement.second << ") ch";
  for (int c : s.channels) os << " " << c;
  return os << " S(" << s.source.first << "," << s.source.second << ") value " << s.value;
}

HardwareState State(const QFCKR60FailurePattern* pattern) {
  HardwareState s;
  const QFCExternHardwareAdmin* hw = pattern->GetExternHardwareAdmin();
  s.resistorPotential = hw->GetPotentialChoiceIndex(kResistor);
  s.measurementPotential = hw->GetPotentialChoiceIndex(kMeasurement);
  std::int32_t a = 0, b = 0;
  pattern->GetConnection(kResistor, 0, a, b);
  s.resistor = {a, b};
  pattern->GetConnection(kMeasurement, 0, a, b);
  s.measurement = {a, b};
  for (int c = 1; c <= 4; ++c) {
    pattern->GetConnection(kMeasurement, c, a, b);
    s.channels[static_cast<std::size_t>(c - 1)] = a;
  }
  pattern->GetConnection(kSource, 0, a, b);
  s.source = {a, b};
  s.value = pattern->GetResistorValue();
  return s;
}

// The positions from 5 on that the external hardware sets.
std::vector<std::size_t> ExternalPositions(const QFCKR60FailurePattern* pattern) {
  std::vector<std::uint32_t> vector(43, 7);
  EXPECT_TRUE(pattern->BuildExternalRequirement(vector));
  std::vector<std::size_t> on;
  for (std::size_t k = 5; k < vector.size(); ++k) {
    EXPECT_LE(vector[k], 1u) << "position " << k;
    if (vector[k] == 1) on.push_back(k);
  }
  // Positions 0 to 4 are the pin's: left alone.
  for (std::size_t k = 0; k < 5; ++k) EXPECT_EQ(vector[k], 7u);
  return on;
}

// ---- resistor value and RSIM word ----

TEST(KR60Resistor, RangeIsZeroTo131071) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  auto* pattern = bench.Create();
  struct Case {
    std::int32_t value;
    HRESULT result;
    std::int32_t held;  // the value afterwards
  };
  const Case cases[] = {{131071, FAULTBOX_OK, 131071},
                        {131072, E_FAULTBOX_INVALID_PARAMETER, 131071},
                        {-1, E_FAULTBOX_INVALID_PARAMETER, 131071},
                        {0, FAULTBOX_OK, 0},
                        {INT32_MIN, E_FAULTBOX_INVALID_PARAMETER, 0}};
  for (const Case& c : cases) {
    MessageCapture cap;
    EXPECT_EQ(pattern->SetResistorValue(c.value), c.result) << c.value;
    EXPECT_EQ(pattern->GetResistorValue(), c.held) << c.value;
    if (c.result == FAULTBOX_OK) {
      EXPECT_EQ(cap.Count(100), 0);
    } else {
      ASSERT_EQ(cap.Numbers(), std::vector<int>{100}) << c.value;
      EXPECT_EQ(cap.records[0].errorClass, 2);
      EXPECT_EQ(cap.records[0].first, std::to_string(c.value));
    }
  }
}

TEST(KR60Resistor, RsimRelayWord) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  auto* pattern = bench.Create();
  const std::pair<std::int32_t, std::uint64_t> cases[] = {
      {0, 0x00000000FFF9FFFEull},  {1, 0x00000000FFF9FFFFull},  {2, 0x00000000FFF5FFE2ull},
      {31, 0x00000000FFF5FFFFull}, {32, 0x00000000FFFC0020ull}, {131071, 0x00000000FFFDFFFFull}};
  for (const auto& [value, expected] : cases) {
    ASSERT_EQ(pattern->SetResistorValue(value), FAULTBOX_OK);
    // The word's old content, upper half included, plays no part.
    std::uint64_t word = 0xABCDEF0123456789ull;
    EXPECT_TRUE(pattern->GetRsimRelayState(true, word));
    EXPECT_EQ(word, expected) << value;
    EXPECT_TRUE(pattern->GetRsimRelayState(false, word));
    EXPECT_EQ(word, 0x00000000FFFFFFFFull);
  }
}

// ---- guards of the setters ----

TEST(KR60Setters, ActivatedPinFreezesTheExternalHardware) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  bench.AddClass(1, {KR60Vector("0", {}, kRelayAny)});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  ASSERT_TRUE(pattern->Connect(kResistor, -1, 2, 3));
  ASSERT_TRUE(pattern->SetPotentialChoice("GND", kResistor));
  ASSERT_EQ(pattern->SetResistorValue(40), FAULTBOX_OK);
  const HardwareState before = State(pattern);
  pattern->GetPinAt(0)->SetActivated(true);

  MessageCapture cap;
  EXPECT_FALSE(pattern->Connect(kSource, -1, 4, 5));
  EXPECT_FALSE(pattern->Connect(QFCExternHardware::kEmpty, -1, 2, 3));
  EXPECT_FALSE(pattern->SetPotentialChoice("U5V", kMeasurement));
  EXPECT_EQ(pattern->SetResistorValue(41), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);
  EXPECT_EQ(cap.Count(127), 1);
  pattern->ResetExternalHardware();
  EXPECT_FALSE(pattern->Reset());
  EXPECT_EQ(State(pattern), before);
}

TEST(KR60Setters, ReadOnlyDocumentRefusesEveryChange) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  auto* pattern = bench.Create();
  ASSERT_TRUE(pattern->Connect(kResistor, -1, 2, 3));
  const HardwareState before = State(pattern);
  const std::string document = bench.files().WriteFile("bench.fsa", "x");
  bench.system()->SetDocumentPath(document);
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);

  MessageCapture cap;
  EXPECT_FALSE(pattern->Connect(kSource, -1, 4, 5));
  EXPECT_FALSE(pattern->SetPotentialChoice("GND", kResistor));
  EXPECT_EQ(pattern->SetResistorValue(5), E_FAULTBOX);
  EXPECT_EQ(cap.Count(118), 3);
  EXPECT_EQ(cap.records[0].first, bench.system()->GetName());
  pattern->ResetExternalHardware();
  EXPECT_EQ(State(pattern), before);
}

// What Connect lets through: the resistor, measurement and source on matrix
// endpoints 2 to 5, channels on 1 to 5; everything else leaves the hardware
// as it was.
TEST(KR60Setters, ConnectKeepsToMatrixEndpoints) {
  struct Case {
    const char* name;
    std::int32_t type, channel, a, b;
    bool result;
  };
  const Case cases[] = {
      {"ResistorBetween", kResistor, -1, 2, 3, true},
      {"SourceOneSidedA", kSource, -1, 6, 5, true},
      {"SourceOneSidedB", kSource, -1, 7, 4, true},
      {"ChannelOnOne", kMeasurement, 2, 1, 0, true},
      {"ChannelOnFive", kMeasurement, 4, 5, 0, true},
      {"ResistorOnOne", kResistor, -1, 1, 3, false},
      {"SourceBOnOne", kSource, -1, 6, 1, false},
      {"EndpointSix", kResistor, -1, 2, 6, false},
      {"NegativeEndpoint", kMeasurement, -1, -2, 3, false},
      {"ChannelFive", kMeasurement, 5, 1, 0, false},
      {"ChannelOneSided", kMeasurement, 1, 6, 2, false},
      {"PotentialItem", QFCExternHardware::kPotential, -1, 2, 3, false},
      {"UnknownType", 9, -1, 2, 3, false},
  };
  for (const Case& c : cases) {
    KR60Bench bench({{"P1", "Engine", "1"}});
    auto* pattern = bench.Create();
    const HardwareState before = State(pattern);
    MessageCapture cap;
    EXPECT_EQ(pattern->Connect(c.type, c.channel, c.a, c.b), c.result) << c.name;
    EXPECT_EQ(State(pattern) == before, !c.result) << c.name;
    // A kept setting never breaks the interlock's requirement.
    EXPECT_EQ(cap.Count(35), 0) << c.name;
  }
}

TEST(KR60Setters, ResetClearsPinConfigsAndExternalHardware) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  bench.AddClass(1, {KR60Vector("1", {}, kRelayAny)});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  ASSERT_TRUE(pin->SetPinConfig(0, 1, false));
  ASSERT_TRUE(pattern->Connect(kMeasurement, -1, 2, 3));
  ASSERT_TRUE(pattern->Connect(kMeasurement, 1, 1, 0));
  ASSERT_TRUE(pattern->SetPotentialChoice("U5V", kMeasurement));
  ASSERT_TRUE(pattern->SetPotentialChoice("UBATT", kResistor));
  ASSERT_EQ(pattern->SetResistorValue(99), FAULTBOX_OK);
  ASSERT_EQ(pin->GetFailureClassId(), 1);

  EXPECT_TRUE(pattern->Reset());
  EXPECT_EQ(State(pattern), HardwareState{});
  EXPECT_EQ(PinConfigText(pin), "00000");
  EXPECT_EQ(pin->GetFailureClassId(), -1);  // the class needs entry 0 on
  EXPECT_EQ(pattern->GetPotentialChoice(kResistor), ResourceString(8905));
}

// ---- a failure class choice ----

struct ChoiceCase {
  const char* name;
  std::vector<std::size_t> on;  // positions the relay vector needs on
  std::string config;           // PinConfig afterwards
  HardwareState hardware;       // the external hardware afterwards
  HRESULT result;
};

class ChoiceTest : public ::testing::TestWithParam<ChoiceCase> {};

TEST_P(ChoiceTest, TranslatesRelayVectorIntoSettings) {
  const ChoiceCase& c = GetParam();
  KR60Bench bench({{"P1", "Engine", "1"}});
  bench.AddClass(1, {KR60Vector("", c.on)});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  // Left-overs of an earlier choice must not survive the new one.
  ASSERT_TRUE(pattern->Connect(kSource, -1, 3, 4));
  ASSERT_TRUE(pattern->SetPotentialChoice("GND", kMeasurement));
  auto* pin = pattern->GetPinAt(0);
  ASSERT_TRUE(pin->SetPinConfig(4, 1, false));

  MessageCapture cap;
  pin->SetExplicitChoice(true);
  EXPECT_EQ(pattern->SetFailureClass(pin, 1, 0), c.result);
  pin->SetExplicitChoice(false);
  EXPECT_EQ(PinConfigText(pin), c.config);
  EXPECT_EQ(State(pattern), c.hardware);
  std::int32_t id = -1, index = -1;
  EXPECT_EQ(pin->GetAdjustedFailureClass(id, index) != nullptr, c.result == FAULTBOX_OK);
  EXPECT_EQ(pin->CanBeActivated(), c.result == FAULTBOX_OK);
  EXPECT_EQ(cap.Count(125), c.result == FAULTBOX_OK ? 0 : 1);
  EXPECT_EQ(cap.Count(35), 0);
}

INSTANTIATE_TEST_SUITE_P(
    KR60Pattern, ChoiceTest,
    ::testing::Values(
        ChoiceCase{"EntryZeroAndResistorA", {0, 10}, "12222", {.resistor = {2, 0}}, FAULTBOX_OK},
        ChoiceCase{"PotentialsAndSourceOnTwo",
                   {6, 18, 14, 15},
                   "22222",
                   {.resistorPotential = 1, .measurementPotential = 2, .source = {2, 2}},
                   FAULTBOX_OK},
        ChoiceCase{"MeasurementAndChannels",
                   {1, 3, 23, 24, 33, 36},
                   "21212",
                   {.measurement = {3, 3}, .channels = {1, 0, 0, 1}},
                   FAULTBOX_OK},
        ChoiceCase{"EveryItemOnFourAndFive",
                   {27, 30, 31, 38, 39, 42},
                   "22222",
                   {.resistor = {4, 5}, .measurement = {5, 4}, .source = {4, 5}},
                   FAULTBOX_OK},
        // The settings exist, but a channel without its measurement leads
        // nowhere: no relay vector of the class fits them.
        ChoiceCase{"ChannelWithoutMeasurement",
                   {33},
                   "22222",
                   {.channels = {1, 0, 0, 0}},
                   E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED}),
    [](const auto& info) { return info.param.name; });

TEST(KR60Choice, RefusalsLeaveEverythingAlone) {
  KR60Bench bench({{"P1", "Engine", "1"}, {"P2", "Engine", "2"}});
  bench.AddClass(1, {KR60Vector("1", {10}, kRelayAny)});
  bench.AddClass(2, {KR60Vector("1", {}, kRelayAny)});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")});
  auto* pin = pattern->GetPinAt(0);
  ASSERT_TRUE(pattern->Connect(kSource, -1, 3, 4));
  const HardwareState before = State(pattern);
  struct Case {
    std::int32_t id, index;
    HRESULT result;
    int message;
  };
  const Case cases[] = {{2, 0, E_FAULTBOX, 130},
                        {1, 1, E_FAULTBOX_INVALID_PARAMETER, 150},
                        {1, -1, E_FAULTBOX_INVALID_PARAMETER, 150}};
  for (const Case& c : cases) {
    MessageCapture cap;
    EXPECT_EQ(pattern->SetFailureClass(pin, c.id, c.index), c.result);
    EXPECT_EQ(cap.Count(c.message), 1);
    EXPECT_EQ(State(pattern), before);
  }
  pattern->GetPinAt(1)->SetActivated(true);
  MessageCapture cap;
  EXPECT_EQ(pattern->SetFailureClass(pin, 1, 0), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);
  EXPECT_EQ(cap.Count(127), 1);
  EXPECT_EQ(State(pattern), before);
}

// ---- requirement positions of the external hardware ----

struct RequirementCase {
  const char* name;
  void (*setup)(QFCKR60FailurePattern*);
  std::vector<std::size_t> on;
};

class RequirementTest : public ::testing::TestWithParam<RequirementCase> {};

TEST_P(RequirementTest, SettingsGiveTheirPositions) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  auto* pattern = bench.Create();
  GetParam().setup(pattern);
  EXPECT_EQ(ExternalPositions(pattern), GetParam().on);
}

INSTANTIATE_TEST_SUITE_P(
    KR60Pattern, RequirementTest,
    ::testing::Values(RequirementCase{"Nothing", [](QFCKR60FailurePattern*) {}, {}},
                      RequirementCase{"Potentials",
                                      [](QFCKR60FailurePattern* p) {
                                        p->SetPotentialChoice("GND", kResistor);
                                        p->SetPotentialChoice("U5V", kMeasurement);
                                      },
                                      {6, 20}},
                      // "none" is no potential, even where the pin file names a potential so.
                      RequirementCase{"NoneIsNoPotential",
                                      [](QFCKR60FailurePattern* p) {
                                        p->SetPotentialChoice("GND", kResistor);
                                        p->SetPotentialChoice("none", kResistor);
                                      },
                                      {}},
                      RequirementCase{"ResistorThreeFour",
                                      [](QFCKR60FailurePattern* p) { p->Connect(kResistor, -1, 3, 4); },
                                      {21, 28}},
                      RequirementCase{"MeasurementAndChannels",
                                      [](QFCKR60FailurePattern* p) {
                                        p->Connect(kMeasurement, -1, 2, 5);
                                        p->Connect(kMeasurement, 2, 1, 0);
                                        p->Connect(kMeasurement, 3, 4, 0);
                                      },
                                      {12, 29, 34, 40}},
                      RequirementCase{"ChannelsWithoutMeasurement",
                                      [](QFCKR60FailurePattern* p) {
                                        p->Connect(kMeasurement, 1, 1, 0);
                                        p->Connect(kMeasurement, -1, 6, 3);
                                      },
                                      {}},
                      RequirementCase{"SourceFiveTwo",
                                      [](QFCKR60FailurePattern* p) { p->Connect(kSource, -1, 5, 2); },
                                      {15, 41}},
                      RequirementCase{"HalfConnectedResistor",
                                      [](QFCKR60FailurePattern* p) { p->Connect(kResistor, -1, 7, 3); },
                                      {22}}),
    [](const auto& info) { return info.param.name; });

// ---- the pin ----

TEST(KR60Pin, ModuleAddressAndChannels) {
  KR60Bench bench({{"P1", "Engine", "1", "1_2_10", "3,1"},
                   {"P2", "Engine", "1", "9_15_15", "0"},
                   {"P3", "Engine", "1", "0_0_0", "9"}});
  auto* pattern = bench.CreateWith(bench.AllPins());
  struct Case {
    std::uint32_t address;
    std::vector<std::uint32_t> channels;
  };
  const Case cases[] = {{0x12A, {1, 3}}, {0x9FF, {0}}, {0x000, {9}}};
  for (int i = 0; i < 3; ++i) {
    auto* pin = pattern->GetPinAt(i);
    std::uint32_t address = 0xDEAD;
    EXPECT_TRUE(pin->GetModuleAddress(address));
    EXPECT_EQ(address, cases[i].address);
    std::vector<std::uint32_t> channels{77};
    EXPECT_TRUE(pin->GetModuleChannels(channels));
    EXPECT_EQ(channels, cases[i].channels);
  }
}

TEST(KR60Pin, RelayStates) {
  KR60Bench bench({{"P1", "Engine", "1"}});
  bench.AddClass(1, {KR60Vector("1", {11, 42}, kRelayAny)});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = dynamic_cast<QFCKR60FailurePatternPin*>(pattern->GetPinAt(0));
  ASSERT_NE(pin, nullptr);

  // Without a class, only the PinConfig positions answer.
  std::uint32_t value = 9;
  EXPECT_TRUE(pin->GetRelayState(0, value));
  EXPECT_EQ(value, 0u);
  value = 9;
  EXPECT_FALSE(pin->GetRelayState(11, value));
  EXPECT_EQ(value, 9u);

  ASSERT_EQ(pattern->SetFailureClass(pin, 1, 0), FAULTBOX_OK);
  const std::pair<int, std::uint32_t> cases[] = {{0, 1}, {1, 0}, {5, 0}, {11, 1}, {12, 0}, {42, 1}, {60, 0}};
  for (const auto& [position, expected] : cases) {
    value = 9;
    EXPECT_TRUE(pin->GetRelayState(position, value)) << position;
    EXPECT_EQ(value, expected) << position;
  }
  MessageCapture cap;
  EXPECT_FALSE(pin->GetRelayState(-1, value));
  EXPECT_EQ(cap.Count(35), 1);
}

// ---- stored form ----

// Two patterns: Alpha with every item of the external hardware in use, two
// items on the same pair of endpoints and a half-connected one; Beta as new.
// The class of Alpha's first pin needs exactly these settings.
Bytes BuildAndSave(KR60Bench& bench) {
  auto* alpha = bench.CreateWith(bench.AllPins(), "Alpha");
  bench.Create("Beta");
  EXPECT_TRUE(alpha->SetPotentialChoice("U5V", kResistor));
  EXPECT_TRUE(alpha->SetPotentialChoice("GND", kMeasurement));
  EXPECT_TRUE(alpha->Connect(kResistor, -1, 6, 2));
  EXPECT_TRUE(alpha->Connect(kResistor, -1, 7, 2));
  EXPECT_TRUE(alpha->Connect(kMeasurement, -1, 6, 2));
  EXPECT_TRUE(alpha->Connect(kMeasurement, -1, 7, 2));
  EXPECT_TRUE(alpha->Connect(kMeasurement, 1, 1, 0));
  EXPECT_TRUE(alpha->Connect(kMeasurement, 3, 5, 0));
  EXPECT_TRUE(alpha->Connect(kSource, -1, 7, 5));
  EXPECT_EQ(alpha->SetResistorValue(0x1ABCD), FAULTBOX_OK);
  EXPECT_TRUE(alpha->GetPinAt(0)->SetPinConfig(0, 1, false));
  return bench.Save();
}

HardwareState AlphaState() {
  HardwareState s;
  s.resistorPotential = 4;
  s.measurementPotential = 1;
  s.resistor = {2, 2};
  s.measurement = {2, 2};
  s.channels = {1, 0, 5, 0};
  s.source = {0, 5};
  s.value = 0x1ABCD;
  return s;
}

// The seventeen values of a pattern's external hardware end its record.
constexpr std::size_t kPlatformPartBytes = 17 * 4;

std::int32_t ValueAt(const Bytes& bytes, std::size_t offset) {
  std::uint32_t v = 0;
  for (int i = 3; i >= 0; --i) v = (v << 8) | bytes[offset + static_cast<std::size_t>(i)];
  return static_cast<std::int32_t>(v);
}

void SetValueAt(Bytes& bytes, std::size_t offset, std::int32_t value) {
  const auto v = static_cast<std::uint32_t>(value);
  for (std::size_t i = 0; i < 4; ++i) bytes[offset + i] = static_cast<std::uint8_t>(v >> (8 * i));
}

TEST(KR60Storage, RoundTripReproducesEverySettingAndTheBytes) {
  KR60Bench bench({{"P1", "Engine", "1"}, {"P2", "Gearbox", "1"}});
  bench.AddClass(1, {KR60Vector("1", {9, 10, 11, 12, 13, 17, 33, 39, 42})});
  const Bytes first = BuildAndSave(bench);
  ASSERT_EQ(State(dynamic_cast<QFCKR60FailurePattern*>(bench.patterns().GetAt(0))), AlphaState());
  ASSERT_EQ(bench.patterns().GetAt(0)->GetPinAt(0)->GetFailureClassId(), 1);

  // Beta's part is last: a new pattern's settings.
  const std::vector<std::int32_t> newPattern = {5, 5, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0};
  for (std::size_t i = 0; i < newPattern.size(); ++i)
    EXPECT_EQ(ValueAt(first, first.size() - kPlatformPartBytes + 4 * i), newPattern[i]) << i;

  MessageCapture cap;
  bench.Load(first);
  EXPECT_TRUE(cap.records.empty());
  ASSERT_EQ(bench.patterns().GetCount(), 2);
  auto* alpha = dynamic_cast<QFCKR60FailurePattern*>(bench.patterns().GetAt(0));
  auto* beta = dynamic_cast<QFCKR60FailurePattern*>(bench.patterns().GetAt(1));
  ASSERT_NE(alpha, nullptr);
  ASSERT_NE(beta, nullptr);
  EXPECT_EQ(State(alpha), AlphaState());
  EXPECT_EQ(State(beta), HardwareState{});
  EXPECT_TRUE(alpha->IsInterlockEnabled());
  // The classes are derived again from the loaded settings.
  EXPECT_EQ(PinConfigText(alpha->GetPinAt(0)), "12222");
  EXPECT_EQ(alpha->GetPinAt(0)->GetFailureClassId(), 1);
  EXPECT_TRUE(alpha->GetPinAt(0)->CanBeActivated());
  EXPECT_EQ(alpha->GetPinAt(1)->GetFailureClassId(), -1);

  EXPECT_EQ(bench.Save(), first);
}

TEST(KR60Storage, WriteProtectedDocumentLoadsItsSettings) {
  KR60Bench bench({{"P1", "Engine", "1"}, {"P2", "Gearbox", "1"}});
  const Bytes saved = BuildAndSave(bench);
  const std::string document = bench.files().WriteFile("bench.fsa", "x");
  bench.system()->SetDocumentPath(document);
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);
  MessageCapture cap;
  bench.Load(saved);
  EXPECT_EQ(cap.Count(118), 0);
  EXPECT_EQ(State(dynamic_cast<QFCKR60FailurePattern*>(bench.patterns().GetAt(0))), AlphaState());
}

// Values that no setting can have make the file damaged: the load ends with
// an archive exception and an internal fault, never with a pattern that no
// check can judge.
TEST(KR60Storage, ImpossibleValuesEndTheLoad) {
  struct Case {
    const char* name;
    std::size_t value;  // which of Alpha's seventeen values
    std::int32_t content;
  };
  const Case cases[] = {
      {"ResistorPotentialSix", 0, 6},
      {"MeasurementPotentialMinusOne", 1, -1},
      {"ResistorOnOne", 2, 1},
      {"ResistorBeyondMatrix", 3, 6},
      {"ResistorValueTooLarge", 4, 0x20000},
      {"NegativeResistorValue", 4, -1},
      {"MeasurementOnOne", 6, 1},
      {"ChannelBeyondMatrix", 7, 6},
      {"NegativeChannel", 13, -3},
      {"SourceBeyondMatrix", 16, 9},
  };
  KR60Bench bench({{"P1", "Engine", "1"}, {"P2", "Gearbox", "1"}});
  Bytes saved = BuildAndSave(bench);
  bench.patterns().RemovePattern("Beta");
  saved = bench.Save();
  const std::size_t part = saved.size() - kPlatformPartBytes;
  for (const Case& c : cases) {
    Bytes damaged = saved;
    SetValueAt(damaged, part + 4 * c.value, c.content);
    bench.DropCollection();
    bench.MakeCollection();
    MessageCapture cap;
    Archive ar(damaged);
    EXPECT_THROW(bench.patterns().Serialize(ar), ArchiveException) << c.name;
    EXPECT_EQ(cap.Count(35), 1) << c.name;
  }
  // The meaningless second value of a channel is not judged.
  Bytes odd = saved;
  SetValueAt(odd, part + 4 * 8, 12345);
  MessageCapture cap;
  bench.Load(odd);
  EXPECT_TRUE(cap.records.empty());
  EXPECT_EQ(bench.Save(), saved);
}

// A pin lost from the pin file stays in the pattern as a KR60 placeholder;
// the external hardware loads all the same.
TEST(KR60Storage, LostPinBecomesAPlaceholder) {
  Bytes saved;
  {
    KR60Bench original({{"P1", "Engine", "1"}, {"P2", "Gearbox", "1", "0_1_3", "0,1"}});
    saved = BuildAndSave(original);
  }
  KR60Bench bench({{"P1", "Engine", "1"}});
  MessageCapture cap;
  bench.Load(saved);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{140});
  auto* alpha = dynamic_cast<QFCKR60FailurePattern*>(bench.patterns().FindPattern("Alpha"));
  ASSERT_NE(alpha, nullptr);
  ASSERT_EQ(alpha->GetPinCount(), 2);
  auto* lost = alpha->GetPinAt(1);
  EXPECT_FALSE(lost->IsFromPinFile());
  std::uint32_t address = 0;
  EXPECT_TRUE(lost->GetModuleAddress(address));
  EXPECT_EQ(address, 0x013u);
  std::vector<std::uint32_t> channels;
  EXPECT_TRUE(lost->GetModuleChannels(channels));
  EXPECT_EQ(channels, (std::vector<std::uint32_t>{0, 1}));
  EXPECT_EQ(State(alpha), AlphaState());
  EXPECT_EQ(bench.Save(), saved);
}

}  // namespace
}  // namespace faultbox

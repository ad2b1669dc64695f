// The pattern model: pins, names, the activation sequence with its refusals,
// the read-only rule, and the KR40 pattern's failure class choice.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <functional>

#include "patterns/PatternTestBench.h"
#include "platform/MessageTable.h"

namespace faultbox {
namespace {

using test::Config;
using test::MessageCapture;
using test::PatternBench;
using test::PinLine;

std::vector<PinLine> ThreePins() {
  return {
      {"P1", "Engine", "1", "10", "1"}, {"P2", "Engine", "1", "11", "2"}, {"P1", "Brake", "1", "12", "3"}};
}

// The three pins in pin file order, whatever order the system keeps its ECUs in.
std::vector<QFCAbstractPin*> InOrder(const PatternBench& bench) {
  return {bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2"), bench.Pin("Brake", "P1")};
}

TEST(PatternPins, AddingAPinTwiceGivesTheExistingPatternPin) {
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000"});
  auto* pattern = bench.Create();
  QFCAbstractFailurePatternPin* first = nullptr;
  QFCAbstractFailurePatternPin* again = nullptr;
  ASSERT_TRUE(pattern->GetPins()->AddPin(bench.Pin("Engine", "P1"), first, false));
  ASSERT_TRUE(pattern->GetPins()->AddPin(bench.Pin("Engine", "P1"), again, false));
  EXPECT_EQ(first, again);
  // Same pin name in another ECU is another pin.
  EXPECT_TRUE(
      pattern->AddPins({bench.Pin("Engine", "P1"), bench.Pin("Brake", "P1"), bench.Pin("Brake", "P1")}));
  EXPECT_EQ(pattern->GetPinCount(), 2);
  EXPECT_EQ(pattern->GetPins()->FindPin("P1", "Brake"), pattern->GetPinAt(1));
  EXPECT_EQ(pattern->GetPins()->FindPin("p1", "Brake"), nullptr);  // names compare exactly
}

TEST(PatternPins, RemovingKeepsActivatedPinsAndOrder) {
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000"});
  auto* pattern = bench.CreateWith(InOrder(bench));
  auto* p1 = pattern->GetPinAt(0);
  auto* p2 = pattern->GetPinAt(1);
  auto* p3 = pattern->GetPinAt(2);
  p2->SetActivated(true);
  MessageCapture cap;
  EXPECT_TRUE(pattern->RemovePins({p1, p2}));
  ASSERT_EQ(cap.Count(45), 1);
  EXPECT_EQ(cap.Find(45)->errorClass, 2);
  EXPECT_EQ(cap.Find(45)->first, "P2");
  ASSERT_EQ(pattern->GetPinCount(), 2);
  EXPECT_EQ(pattern->GetPinAt(0), p2);
  EXPECT_EQ(pattern->GetPinAt(1), p3);
  // The removed pin can come back, as a new pattern pin at the end.
  EXPECT_TRUE(pattern->AddPins({bench.Pin("Engine", "P1")}));
  EXPECT_EQ(pattern->GetPinAt(2)->GetPinName(), "P1");
}

TEST(PatternPins, NoAdjustedClassIsSilent) {
  PatternBench bench(ThreePins());
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});  // class 1 unknown: none
  MessageCapture cap;
  std::int32_t id = 5, index = 5;
  EXPECT_EQ(pattern->GetPinAt(0)->GetAdjustedFailureClass(id, index), nullptr);
  EXPECT_EQ(id, 5);
  EXPECT_TRUE(cap.Numbers().empty());
}

TEST(PatternNames, DefaultNamesCountFromOneAndFillGaps) {
  PatternBench bench(ThreePins());
  auto name = [](int n) { return ResourceText(6769, {std::to_string(n)}); };
  EXPECT_EQ(bench.Create()->GetName(), name(1));
  EXPECT_EQ(bench.Create()->GetName(), name(2));
  EXPECT_EQ(bench.Create()->GetName(), name(3));
  EXPECT_TRUE(bench.patterns().RemovePattern(name(2)));
  EXPECT_EQ(bench.Create()->GetName(), name(2));
  EXPECT_EQ(bench.Create()->GetName(), name(4));
}

TEST(PatternNames, DuplicatesAreRefusedWith87) {
  PatternBench bench(ThreePins());
  auto* a = bench.Create("Alpha");
  bench.Create("Beta");
  MessageCapture cap;

  QFCAbstractFailurePattern* out = a;
  EXPECT_EQ(bench.patterns().CreatePattern(out, "Alpha"), E_FAULTBOX_NAME_NOT_UNIQUE);
  EXPECT_EQ(out, nullptr);
  ASSERT_EQ(cap.Count(87), 1);
  EXPECT_EQ(cap.Find(87)->errorClass, 0);

  cap.Clear();
  EXPECT_FALSE(bench.patterns().RenamePattern(a, "Alpha"));  // its own name too
  EXPECT_FALSE(bench.patterns().RenamePattern(a, "Beta"));
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{87, 87}));
  EXPECT_EQ(a->GetName(), "Alpha");

  EXPECT_TRUE(bench.patterns().RenamePattern(a, "alpha"));  // names compare exactly
  EXPECT_EQ(bench.patterns().FindPattern("alpha"), a);
  EXPECT_EQ(bench.patterns().FindPattern("Alpha"), nullptr);
}

// ---- activation ----

struct ActivationCase {
  const char* name;
  std::function<void(PatternBench&, QFCAbstractFailurePattern*)> arrange;
  bool activate;
  HRESULT result;
  std::vector<int> numbers;  // messages after 164/166
  int builds;
  int transfers;
  std::vector<bool> activatedAfter;  // per pin
};

class ActivationTest : public ::testing::TestWithParam<ActivationCase> {};

TEST_P(ActivationTest, FollowsTheTenSteps) {
  const ActivationCase& c = GetParam();
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000"});
  auto* pattern = bench.CreateWith(InOrder(bench), "Target");
  pattern->SelectAllPins(true);
  c.arrange(bench, pattern);
  MessageCapture cap;
  EXPECT_EQ(pattern->ActivatePattern(c.activate), c.result);
  ASSERT_FALSE(cap.records.empty());
  EXPECT_EQ(cap.records.front().number, c.activate ? 164 : 166);
  EXPECT_EQ(cap.records.front().errorClass, 1);
  EXPECT_EQ(cap.records.front().first, "Target");
  std::vector<int> rest = cap.Numbers();
  rest.erase(rest.begin());
  EXPECT_EQ(rest, c.numbers);
  EXPECT_EQ(bench.patterns().log.builds, c.builds);
  EXPECT_EQ(bench.patterns().log.transfers, c.transfers);
  std::vector<bool> activated;
  for (int i = 0; i < pattern->GetPinCount(); ++i) activated.push_back(pattern->GetPinAt(i)->IsActivated());
  EXPECT_EQ(activated, c.activatedAfter);
}

void Connect(PatternBench& bench, QFCAbstractFailurePattern*) {
  bench.Connect();
}

INSTANTIATE_TEST_SUITE_P(
    Activation, ActivationTest,
    ::testing::Values(
        ActivationCase{"DeactivateNothingActivatedUnconnected",
                       [](auto&, auto*) {},
                       false,
                       FAULTBOX_OK,
                       {},
                       0,
                       0,
                       {false, false, false}},
        ActivationCase{"NotConnected",
                       [](auto&, auto*) {},
                       true,
                       E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE,
                       {120},
                       0,
                       0,
                       {false, false, false}},
        ActivationCase{"OtherPatternActive",
                       [](PatternBench& b, QFCAbstractFailurePattern*) {
                         b.Connect();
                         auto* other = b.CreateWith({b.Pin("Engine", "P1")}, "Other");
                         other->GetPinAt(0)->SetActivated(true);
                       },
                       true,
                       E_FAULTBOX,
                       {97},
                       0,
                       0,
                       {false, false, false}},
        ActivationCase{"NothingSelected",
                       [](PatternBench& b, QFCAbstractFailurePattern* p) {
                         b.Connect();
                         p->SelectAllPins(false);
                       },
                       true,
                       E_FAULTBOX,
                       {89},
                       0,
                       0,
                       {false, false, false}},
        ActivationCase{"NoPinCanBeActivated",
                       [](PatternBench& b, QFCAbstractFailurePattern* p) {
                         b.Connect();
                         for (int i = 0; i < 3; ++i) p->GetPinAt(i)->SetCanBeActivated(false);
                       },
                       true,
                       E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED,
                       {90},
                       0,
                       0,
                       {false, false, false}},
        ActivationCase{"BuildFails",
                       [](PatternBench& b, QFCAbstractFailurePattern*) {
                         b.Connect();
                         b.patterns().log.buildResult = false;
                       },
                       true,
                       E_FAULTBOX_MESSAGE_BUILD,
                       {51},
                       1,
                       0,
                       {false, false, false}},
        ActivationCase{"TransferFailsResetsEveryPattern",
                       [](PatternBench& b, QFCAbstractFailurePattern* p) {
                         b.Connect();
                         p->GetPinAt(1)->SetActivated(true);  // an earlier activation of this pattern
                         b.patterns().log.transferResult = E_FAULTBOX_TIME_OUT;
                       },
                       true,
                       E_FAULTBOX_TIME_OUT,
                       {},
                       1,
                       1,
                       {false, false, false}},
        ActivationCase{
            "ActivatesSelectedReadyPins", Connect, true, FAULTBOX_OK, {}, 1, 1, {true, true, true}},
        // Not ready: its module did not answer, or its ECU is disabled. Both are deselected and stay off.
        ActivationCase{"SkipsPinsThatAreNotReady",
                       [](PatternBench& b, QFCAbstractFailurePattern*) {
                         b.Connect();
                         b.system()->GetRespondingModules().erase(0x11);
                         b.Pin("Brake", "P1")->GetEcu()->SetEnabled(false, true);
                       },
                       true,
                       FAULTBOX_OK,
                       {},
                       1,
                       1,
                       {true, false, false}},
        ActivationCase{"DeactivatesSelectedPins",
                       [](PatternBench& b, QFCAbstractFailurePattern* p) {
                         b.Connect();
                         for (int i = 0; i < 3; ++i) p->GetPinAt(i)->SetActivated(true);
                         p->GetPinAt(2)->SetSelected(false);
                       },
                       false,
                       FAULTBOX_OK,
                       {},
                       1,
                       1,
                       {false, false, true}}),
    [](const auto& info) { return info.param.name; });

TEST(Activation, RefusalNamesTheActivePattern) {
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000"});
  bench.Connect();
  auto* a = bench.CreateWith({bench.Pin("Engine", "P1")}, "Pattern A");
  auto* b = bench.CreateWith({bench.Pin("Engine", "P2")}, "Pattern B");
  a->SelectAllPins(true);
  b->SelectAllPins(true);
  ASSERT_EQ(a->ActivatePattern(true), FAULTBOX_OK);
  MessageCapture cap;
  EXPECT_EQ(b->ActivatePattern(true), E_FAULTBOX);
  ASSERT_NE(cap.Find(97), nullptr);
  EXPECT_EQ(cap.Find(97)->first, "Pattern A");
  // The active pattern itself may send again, and deactivate.
  EXPECT_EQ(a->ActivatePattern(false), FAULTBOX_OK);
  EXPECT_EQ(b->ActivatePattern(true), FAULTBOX_OK);
  QFCAbstractFailurePattern* active = nullptr;
  EXPECT_TRUE(bench.patterns().GetActivatedPattern(active));
  EXPECT_EQ(active, b);
}

TEST(Activation, FailedTransferRunsTheSystemsHardwareReset) {
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000"});
  bench.Connect();
  int resets = 0;
  bench.patterns().SetHardwareReset([&] {
    ++resets;
    bench.patterns().ClearActivatedFlags();
    return FAULTBOX_OK;
  });
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  pattern->SelectAllPins(true);
  bench.patterns().log.transferResult = E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING;
  EXPECT_EQ(pattern->ActivatePattern(true), E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING);
  EXPECT_EQ(resets, 1);
}

// ---- read-only documents ----

TEST(ReadOnly, ChangesAreRefusedWith118) {
  PatternBench bench(ThreePins());
  bench.AddClass(1, {"00000", "01000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  const std::string document = bench.files().WriteFile("bench.fss", "x");
  bench.system()->SetDocumentPath(document);
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);

  MessageCapture cap;
  EXPECT_FALSE(pattern->AddPins({bench.Pin("Engine", "P2")}));
  EXPECT_FALSE(pattern->RemovePins({pin}));
  EXPECT_FALSE(pin->SetPinConfig(1, 1, true));
  EXPECT_FALSE(pin->ClearPinConfig());
  EXPECT_FALSE(pattern->Reset());
  EXPECT_EQ(pattern->SetFailureClass(pin, 1, 1), E_FAULTBOX);
  EXPECT_EQ(cap.Numbers(), std::vector<int>(6, 118));
  EXPECT_EQ(cap.Find(118)->first, "Bench");
  EXPECT_EQ(pattern->GetPinCount(), 1);
  EXPECT_EQ(Config(pin), "00000");
}

// ---- the KR40 failure class choice ----

struct ChoiceCase {
  const char* name;
  std::int32_t id;
  std::int32_t index;
  bool activateOther;
  HRESULT result;
  std::vector<int> numbers;
};

class ChoiceRefusalTest : public ::testing::TestWithParam<ChoiceCase> {};

TEST_P(ChoiceRefusalTest, RefusesWithItsMessage) {
  const ChoiceCase& c = GetParam();
  PatternBench bench({{"P1", "Engine", "1,2,7"}, {"P2", "Engine", "1"}});
  bench.AddClass(1, {"00000", "01000"});
  bench.AddClass(2, {"00000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")});
  if (c.activateOther) pattern->GetPinAt(1)->SetActivated(true);
  const std::string before = Config(pattern->GetPinAt(0));
  MessageCapture cap;
  EXPECT_EQ(pattern->SetFailureClass(pattern->GetPinAt(0), c.id, c.index), c.result);
  EXPECT_EQ(cap.Numbers(), c.numbers);
  EXPECT_EQ(Config(pattern->GetPinAt(0)), before);
}

INSTANTIATE_TEST_SUITE_P(
    KR40, ChoiceRefusalTest,
    ::testing::Values(
        ChoiceCase{"PatternActivated", 1, 1, true, E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, {127}},
        ChoiceCase{"NotDefinedForPin", 3, 0, false, E_FAULTBOX, {130}},
        ChoiceCase{"UnknownToSystem", 7, 0, false, E_FAULTBOX, {126}},
        ChoiceCase{"IndexTooHigh", 1, 2, false, E_FAULTBOX_INVALID_PARAMETER, {150}},
        ChoiceCase{"IndexNegative", 1, -1, false, E_FAULTBOX_INVALID_PARAMETER, {150}}),
    [](const auto& info) { return info.param.name; });

// Records the pin's PinConfig at every view update the interlock runs cause.
struct ConfigRecorder : QFCObjectObserver {
  explicit ConfigRecorder(QFCAbstractFailurePatternPin* pin) : pin(pin) {}
  void OnUpdate(QFCAbstractObjectData*, int hint, void* extra) override {
    if (hint == QFCAbstractFailurePattern::kHintPinChanged && extra == pin) seen.push_back(Config(pin));
  }
  QFCAbstractFailurePatternPin* pin;
  std::vector<std::string> seen;
};

TEST(KR40Choice, OnPositionsAreSwitchedOneByOneWithAnInterlockRunEach) {
  PatternBench bench({{"P1", "Engine", "1,7"}});
  bench.AddClass(1, {"02020"});  // forbids both entries the choice switches on
  bench.AddClass(7, {"21212", "01010"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  ASSERT_EQ(pin->GetFailureClassId(), 1);
  pin->SetPinConfigs({1, 0, 0, 0, 0});  // cleared by the choice

  ConfigRecorder recorder(pin);
  pattern->AddObserver(&recorder);
  EXPECT_EQ(pattern->SetFailureClass(pin, 7, 1), FAULTBOX_OK);
  pattern->RemoveObserver(&recorder);
  // The first run sees entry 1 alone (which no vector of class 7 fits), the
  // second both entries.
  EXPECT_EQ(recorder.seen, (std::vector<std::string>{"01000", "01010"}));
  EXPECT_EQ(pin->GetFailureClassId(), 7);
  EXPECT_EQ(pin->GetRelayVectorIndex(), 0);  // the first vector that fits the settings
}

TEST(KR40Choice, VectorWithoutOnPositionsOnlyClearsPinConfig) {
  PatternBench bench({{"P1", "Engine", "1,2"}});
  bench.AddClass(1, {"10000"});
  bench.AddClass(2, {"00000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  ASSERT_TRUE(pin->SetPinConfig(0, 1, true));
  ASSERT_EQ(pin->GetFailureClassId(), 1);
  ConfigRecorder recorder(pin);
  pattern->AddObserver(&recorder);
  EXPECT_EQ(pattern->SetFailureClass(pin, 2, 0), FAULTBOX_OK);
  pattern->RemoveObserver(&recorder);
  EXPECT_TRUE(recorder.seen.empty());
  EXPECT_EQ(Config(pin), "00000");
  EXPECT_EQ(pin->GetFailureClassId(), 1);  // no interlock run: the class stays
}

// A KR80 board takes classes 1 to 3 only: the interlock leaves a pin
// without a class after a choice of class 4, and the choice fails.
TEST(KR40Choice, AChoiceTheInterlockLeavesWithoutAClassFails) {
  PatternBench bench({{"P1", "Engine", "1,4"}}, "KR80");
  bench.AddClass(1, {"10000"});
  bench.AddClass(4, {"00010"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  MessageCapture cap;
  EXPECT_EQ(pattern->SetFailureClass(pin, 4, 0), E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{125});
  EXPECT_EQ(pin->GetFailureClassId(), -1);
}

TEST(KR40Pin, PinConfigValuesAndModuleData) {
  PatternBench bench({{"P1", "Engine", "1", "7F", "10"}});
  bench.AddClass(1, {"00000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  MessageCapture cap;
  EXPECT_TRUE(pin->IsPinConfigAllowed(4, 1));
  EXPECT_TRUE(pin->IsPinConfigAllowed(0, 0x100));  // low 8 bits count
  EXPECT_FALSE(pin->IsPinConfigAllowed(5, 1));
  EXPECT_FALSE(pin->IsPinConfigAllowed(0, 2));
  EXPECT_FALSE(pin->SetPinConfig(-1, 1, true));
  EXPECT_EQ(cap.Count(35), 3);
  std::uint32_t address = 0;
  std::vector<std::uint32_t> channels;
  EXPECT_TRUE(pin->GetModuleAddress(address));
  EXPECT_EQ(address, 0x7Fu);
  EXPECT_TRUE(pin->GetModuleChannels(channels));
  EXPECT_EQ(channels, std::vector<std::uint32_t>{10});
}

}  // namespace
}  // namespace faultbox

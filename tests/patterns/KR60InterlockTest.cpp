// The KR60 interlock: the exclusive-entry rule for PinConfig entries 0, 1
// and 3 while external hardware is in use (first pin wins, a holder keeps its
// class, an explicit choice wins), activated pins, and the service mode's
// single-pin check without the rule.
#include <gtest/gtest.h>

#include "patterns/KR60PatternBench.h"
#include "patterns/kr60/QFCKR60FailurePatternSafetyInterlock.h"
#include "platform/MessageTable.h"
#include "platform/UserMode.h"

namespace faultbox {
namespace {

using test::KR60Bench;
using test::KR60Vector;
using test::MessageCapture;

constexpr std::int32_t kResistor = QFCExternHardware::kResistor;
constexpr std::size_t kResistorOnUbatt = 5;  // requirement position of potential 0 for the resistor

// Two pins that define class 1 (entry `entry` on, the resistor on potential
// UBATT) and, unless told otherwise, class 2 (the same entry, no resistor
// potential).
class ExclusiveBench {
 public:
  explicit ExclusiveBench(int entry, const std::string& p2Classes = "1,2")
      : bench({{"P1", "Engine", "1,2"}, {"P2", "Engine", p2Classes}}), entry(entry) {
    std::string states(5, '0');
    states[static_cast<std::size_t>(entry)] = '1';
    QFTPossibility withPotential = KR60Vector(states, {kResistorOnUbatt}, kRelayAny);
    QFTPossibility withoutPotential = KR60Vector(states, {}, kRelayAny);
    withoutPotential.Set(kResistorOnUbatt, kRelayOff, 0, 0);
    class1 = &bench.AddClass(1, {withPotential});
    bench.AddClass(2, {withoutPotential});
    pattern = bench.CreateWith(bench.AllPins());
    p1 = pattern->GetPinAt(0);
    p2 = pattern->GetPinAt(1);
  }

  void UseExternalHardware() { ASSERT_TRUE(pattern->SetPotentialChoice("UBATT", kResistor)); }
  // Switches the entry on without running the interlock.
  void EntryOnSilently(QFCAbstractFailurePatternPin* pin) {
    auto config = pin->GetPinConfig();
    config[static_cast<std::size_t>(entry)] = 1;
    pin->SetPinConfigs(config);
  }
  void ChooseExplicitly(QFCAbstractFailurePatternPin* pin) {
    pin->SetExplicitChoice(true);
    EXPECT_EQ(pattern->SetFailureClass(pin, 1, 0), FAULTBOX_OK);
    pin->SetExplicitChoice(false);
  }

  KR60Bench bench;
  int entry;
  QFCAbstractFailureClass* class1 = nullptr;
  QFCKR60FailurePattern* pattern = nullptr;
  QFCAbstractFailurePatternPin* p1 = nullptr;
  QFCAbstractFailurePatternPin* p2 = nullptr;
};

enum class Scenario {
  kBothSwitchedThenFullCheck,  // neither holds a class; one full check
  kSecondHoldsFirstSwitches,   // P2 holds its class when P1's entry goes on
  kSecondChosenExplicitly,     // P1 holds its class; P2's class is chosen from the menu
  kWithoutExternalHardware,
};

struct ExclusiveCase {
  const char* name;
  int entry;
  Scenario scenario;
  std::int32_t p1Class;  // -1: refused
  std::int32_t p2Class;
};

class ExclusiveEntryTest : public ::testing::TestWithParam<ExclusiveCase> {};

TEST_P(ExclusiveEntryTest, DecidesWhichPinGetsItsClass) {
  const ExclusiveCase& c = GetParam();
  // A pin chosen explicitly that could hold no class while its settings
  // are applied one by one: only the explicit pass lets it win.
  ExclusiveBench b(c.entry, c.scenario == Scenario::kSecondChosenExplicitly ? "1" : "1,2");
  MessageCapture cap;
  switch (c.scenario) {
    case Scenario::kBothSwitchedThenFullCheck:
      b.UseExternalHardware();
      b.EntryOnSilently(b.p1);
      b.EntryOnSilently(b.p2);
      EXPECT_TRUE(b.pattern->GetInterlock()->CheckAll());
      break;
    case Scenario::kSecondHoldsFirstSwitches:
      b.UseExternalHardware();
      ASSERT_TRUE(b.p2->SetPinConfig(c.entry, 1, false));
      ASSERT_EQ(b.p2->GetFailureClassId(), 1);
      ASSERT_TRUE(b.p1->SetPinConfig(c.entry, 1, false));
      break;
    case Scenario::kSecondChosenExplicitly:
      b.UseExternalHardware();
      ASSERT_TRUE(b.p1->SetPinConfig(c.entry, 1, false));
      ASSERT_EQ(b.p1->GetFailureClassId(), 1);
      b.ChooseExplicitly(b.p2);
      break;
    case Scenario::kWithoutExternalHardware:
      ASSERT_TRUE(b.p1->SetPinConfig(c.entry, 1, false));
      ASSERT_TRUE(b.p2->SetPinConfig(c.entry, 1, false));
      break;
  }
  // The outcome is stable: another full check changes nothing.
  for (int round = 0; round < 2; ++round) {
    if (round == 1) {
      EXPECT_TRUE(b.pattern->GetInterlock()->CheckAll());
    }
    int holders = 0;
    for (auto [pin, expected] : {std::pair{b.p1, c.p1Class}, std::pair{b.p2, c.p2Class}}) {
      SCOPED_TRACE(pin->GetPinName() + " round " + std::to_string(round));
      EXPECT_EQ(pin->GetFailureClassId(), expected);
      EXPECT_EQ(pin->CanBeActivated(), expected != -1);
      if (expected == -1) {
        EXPECT_EQ(pin->GetFailureClassText(), ResourceString(6766));
      }
      if (expected == 1) ++holders;
    }
    // A refused pin holds no use of the class.
    EXPECT_EQ(b.class1->GetUseCount(), holders);
  }
  EXPECT_EQ(cap.Count(35), 0);
}

INSTANTIATE_TEST_SUITE_P(
    KR60Interlock, ExclusiveEntryTest,
    ::testing::Values(
        ExclusiveCase{"Entry0FirstInOrderWins", 0, Scenario::kBothSwitchedThenFullCheck, 1, -1},
        ExclusiveCase{"Entry1FirstInOrderWins", 1, Scenario::kBothSwitchedThenFullCheck, 1, -1},
        ExclusiveCase{"Entry3FirstInOrderWins", 3, Scenario::kBothSwitchedThenFullCheck, 1, -1},
        // Entries 2 and 4 do not lead onto the shared lines.
        ExclusiveCase{"Entry2Shared", 2, Scenario::kBothSwitchedThenFullCheck, 1, 1},
        ExclusiveCase{"Entry4Shared", 4, Scenario::kBothSwitchedThenFullCheck, 1, 1},
        ExclusiveCase{"Entry0HolderKeepsIt", 0, Scenario::kSecondHoldsFirstSwitches, -1, 1},
        ExclusiveCase{"Entry3HolderKeepsIt", 3, Scenario::kSecondHoldsFirstSwitches, -1, 1},
        ExclusiveCase{"Entry0ExplicitChoiceWins", 0, Scenario::kSecondChosenExplicitly, -1, 1},
        ExclusiveCase{"Entry1ExplicitChoiceWins", 1, Scenario::kSecondChosenExplicitly, -1, 1},
        ExclusiveCase{"Entry0WithoutExternalHardware", 0, Scenario::kWithoutExternalHardware, 2, 2},
        ExclusiveCase{"Entry3WithoutExternalHardware", 3, Scenario::kWithoutExternalHardware, 2, 2}),
    [](const auto& info) { return info.param.name; });

TEST(KR60Interlock, RefusedPinGetsItsClassWhenTheHolderLetsGo) {
  ExclusiveBench b(1);
  b.UseExternalHardware();
  ASSERT_TRUE(b.p1->SetPinConfig(1, 1, false));
  ASSERT_TRUE(b.p2->SetPinConfig(1, 1, false));
  ASSERT_EQ(b.p2->GetFailureClassId(), -1);
  ASSERT_TRUE(b.p1->SetPinConfig(1, 0, false));
  EXPECT_EQ(b.p1->GetFailureClassId(), -1);
  EXPECT_EQ(b.p2->GetFailureClassId(), 1);
  EXPECT_TRUE(b.p2->CanBeActivated());
}

TEST(KR60Interlock, ActivatedPinKeepsItsClass) {
  ExclusiveBench b(0);
  b.UseExternalHardware();
  ASSERT_TRUE(b.p2->SetPinConfig(0, 1, false));
  ASSERT_EQ(b.p2->GetFailureClassId(), 1);
  b.p2->SetActivated(true);
  // P1 comes first in the pattern, but P2's class is on the hardware.
  b.EntryOnSilently(b.p1);
  EXPECT_TRUE(b.pattern->GetInterlock()->CheckAll());
  EXPECT_EQ(b.p1->GetFailureClassId(), -1);
  EXPECT_EQ(b.p2->GetFailureClassId(), 1);
  EXPECT_EQ(b.class1->GetUseCount(), 1);
}

// In the service mode a pin change checks that pin alone, and the
// exclusive-entry rule is off.
TEST(KR60Interlock, ServiceModeChecksOnePinWithoutTheRule) {
  ExclusiveBench b(0);
  b.bench.files().SetSetting("UserMode", kServiceModeCode);
  ResetUserMode();
  b.UseExternalHardware();
  ASSERT_TRUE(b.p1->SetPinConfig(0, 1, false));
  ASSERT_TRUE(b.p2->SetPinConfig(0, 1, false));
  EXPECT_EQ(b.p1->GetFailureClassId(), 1);
  EXPECT_EQ(b.p2->GetFailureClassId(), 1);

  // P1's entry goes off behind the interlock's back; a change of P2 leaves P1 alone.
  b.p1->SetPinConfigs({0, 0, 0, 0, 0});
  ASSERT_TRUE(b.p2->SetPinConfig(2, 1, false));
  EXPECT_EQ(b.p1->GetFailureClassId(), 1);
  EXPECT_EQ(test::PinConfigText(b.p2), "10100");
}

}  // namespace
}  // namespace faultbox

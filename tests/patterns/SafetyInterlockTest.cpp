// The safety interlock of the KR40 family: which entries stay available,
// which class and relay vector a pin gets, use limits across patterns, the
// KR80 restriction, activated pins and the service mode's single-pin check.
#include <gtest/gtest.h>

#include "patterns/PatternTestBench.h"
#include "patterns/kr40/QFCKR40FailurePatternSafetyInterlock.h"
#include "platform/UserMode.h"

namespace faultbox {
namespace {

using test::Config;
using test::PatternBench;
using test::PinLine;

struct ClassDef {
  std::int32_t id;
  std::vector<std::string> vectors;
};

struct DeriveCase {
  const char* name;
  std::string board;
  std::string pinClasses;         // the pin's failure class entries
  std::vector<ClassDef> classes;  // the system's failure classes
  std::vector<int> switchedOn;    // entries the user switches on, in order
  std::string config;             // PinConfig afterwards
  std::int32_t classId;           // -1: no class
  std::int32_t vectorIndex;
};

class DeriveTest : public ::testing::TestWithParam<DeriveCase> {};

TEST_P(DeriveTest, DerivesPinConfigAndClass) {
  const DeriveCase& c = GetParam();
  PatternBench bench({{"P1", "Engine", c.pinClasses}}, c.board);
  for (const auto& def : c.classes) bench.AddClass(def.id, def.vectors);
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1")});
  auto* pin = pattern->GetPinAt(0);
  for (int entry : c.switchedOn) pin->SetPinConfig(entry, 1, true);

  EXPECT_EQ(Config(pin), c.config);
  std::int32_t id = -1, index = -1;
  const bool held = pin->GetAdjustedFailureClass(id, index) != nullptr;
  EXPECT_EQ(held, c.classId != -1);
  EXPECT_EQ(pin->CanBeActivated(), held);
  if (held) {
    EXPECT_EQ(id, c.classId);
    EXPECT_EQ(index, c.vectorIndex);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Interlock, DeriveTest,
    ::testing::Values(
        // Entry 4 is forbidden by both candidates, the others by at most one.
        DeriveCase{
            "ForbiddenByAllIsTwo", "KR40", "1,2", {{1, {"00122"}}, {2, {"01202"}}}, {}, "00002", -1, -1},
        // Switching entry 2 on leaves class 1 only; it fits and forbids 3 and 4.
        DeriveCase{"SwitchOnNarrows", "KR40", "1,2", {{1, {"00122"}}, {2, {"01202"}}}, {2}, "00122", 1, 0},
        // Switched on anyway although every candidate forbids it: no class, every off entry 2.
        DeriveCase{"NoCandidateAllTwo", "KR40", "1", {{1, {"00122"}}}, {4}, "22221", -1, -1},
        // A pin whose classes the system does not know has no candidate at all.
        DeriveCase{"UnknownClassesAllTwo", "KR40", "8,9", {{1, {"00000"}}}, {}, "22222", -1, -1},
        // The first fitting relay vector of the first fitting class wins, in collection order.
        DeriveCase{"FirstFittingVector",
                   "KR40",
                   "2,1",
                   {{1, {"10000", "01000"}}, {2, {"01000"}}},
                   {1},
                   "01000",
                   1,
                   1},
        DeriveCase{"NothingOnFitsDontCare", "KR40", "3", {{3, {"02000"}}}, {}, "02000", 3, 0},
        // KR80 boards switch classes 1 to 3 only.
        DeriveCase{"KR80HighIdsNever", "KR80", "4,5", {{4, {"00000"}}, {5, {"00000"}}}, {}, "22222", -1, -1},
        DeriveCase{"KR80LowIdKept", "KR80", "5,2", {{2, {"00000"}}, {5, {"00000"}}}, {}, "00000", 2, 0},
        DeriveCase{"KR080SameRule", "KR080", "4", {{4, {"00000"}}}, {}, "22222", -1, -1},
        DeriveCase{"KR40HighIdsFine", "KR40", "4", {{4, {"00000"}}}, {}, "00000", 4, 0}),
    [](const auto& info) { return info.param.name; });

// A class with a use limit of 1 goes to the first fitting pin, across
// patterns, and comes free when its holder leaves.
TEST(InterlockUses, LimitOfOneGoesToFirstPinUntilReleased) {
  PatternBench bench({{"P1", "Engine", "1"}, {"P2", "Engine", "1"}, {"P3", "Engine", "1"}});
  auto& limited = bench.AddClass(1, {"00000"}, 1);
  auto* first = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")}, "First");
  auto* p1 = first->GetPinAt(0);
  auto* p2 = first->GetPinAt(1);
  EXPECT_EQ(p1->GetFailureClassId(), 1);
  EXPECT_EQ(p2->GetFailureClassId(), -1);
  EXPECT_FALSE(p2->CanBeActivated());
  EXPECT_EQ(limited.GetUseCount(), 1);

  // Checking again does not hand the use on.
  first->GetInterlock()->CheckAll();
  EXPECT_EQ(p1->GetFailureClassId(), 1);
  EXPECT_EQ(p2->GetFailureClassId(), -1);
  EXPECT_EQ(limited.GetUseCount(), 1);

  auto* second = bench.CreateWith({bench.Pin("Engine", "P3")}, "Second");
  EXPECT_EQ(second->GetPinAt(0)->GetFailureClassId(), -1);

  // The holder leaves its pattern: the next check gives the class to P2.
  EXPECT_TRUE(first->RemovePins({p1}));
  EXPECT_EQ(p2->GetFailureClassId(), 1);
  EXPECT_EQ(limited.GetUseCount(), 1);

  // Deleting the pattern gives its use back as well.
  EXPECT_TRUE(bench.patterns().RemovePattern("First"));
  EXPECT_EQ(limited.GetUseCount(), 0);
  second->GetInterlock()->CheckAll();
  EXPECT_EQ(second->GetPinAt(0)->GetFailureClassId(), 1);
  EXPECT_EQ(limited.GetUseCount(), 1);
}

TEST(InterlockActivated, ActivatedPinKeepsClassThroughEveryCheck) {
  PatternBench bench({{"P1", "Engine", "1,2"}, {"P2", "Engine", "1"}});
  bench.AddClass(1, {"00000"}, 1);
  bench.AddClass(2, {"01000"});
  auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")});
  auto* p1 = pattern->GetPinAt(0);
  ASSERT_EQ(p1->GetFailureClassId(), 1);
  p1->SetActivated(true);
  // Settings that would give another class if the pin were checked.
  p1->SetPinConfigs({0, 1, 0, 0, 0});

  test::MessageCapture cap;
  EXPECT_FALSE(p1->SetPinConfig(2, 1, true));  // refused: activated
  pattern->GetInterlock()->CheckAll();
  pattern->GetInterlock()->CheckPin(p1);
  pattern->GetPinAt(1)->SetPinConfig(0, 1, true);
  EXPECT_TRUE(pattern->Reset());  // changes nothing, still runs the interlock

  EXPECT_EQ(p1->GetFailureClassId(), 1);
  EXPECT_EQ(p1->GetRelayVectorIndex(), 0);
  EXPECT_EQ(Config(p1), "01000");
  EXPECT_TRUE(p1->CanBeActivated());
  // Its use stays taken: the other pin cannot have the class.
  EXPECT_EQ(pattern->GetPinAt(1)->GetFailureClassId(), -1);
  EXPECT_TRUE(cap.Numbers().empty());
}

// In the hidden service mode a PinConfig change checks its own pin only.
TEST(InterlockServiceMode, PinChangeChecksOnlyThatPin) {
  for (bool service : {false, true}) {
    SCOPED_TRACE(service ? "service mode" : "standard mode");
    PatternBench bench({{"P1", "Engine", "1"}, {"P2", "Engine", "1"}});
    if (service) bench.files().SetSetting("UserMode", kServiceModeCode);
    ResetUserMode();
    bench.AddClass(1, {"00002"});
    auto* pattern = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")});
    auto* p1 = pattern->GetPinAt(0);
    p1->SetPinConfigs({0, 0, 0, 0, 0});  // behind the interlock's back
    pattern->GetPinAt(1)->SetPinConfig(0, 1, true);
    EXPECT_EQ(Config(p1), service ? "00000" : "00002");
    EXPECT_EQ(Config(pattern->GetPinAt(1)), "10002");
  }
}

}  // namespace
}  // namespace faultbox

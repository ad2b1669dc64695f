// A failure class's relay vectors, their matching against requirement
// vectors, step numbers, use counting and the collection's lookups.
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <vector>

#include "config/kr40/QFCKR40FailureClasses.h"
#include "config/kr60/QFCKR60FailureClasses.h"

namespace faultbox {
namespace {

using States = std::vector<std::uint32_t>;

// A vector of `size` positions, off unless named.
QFTPossibility Vector(std::vector<std::size_t> on, std::vector<std::size_t> any = {},
                      std::size_t size = kRelayPositions) {
  QFTPossibility p(size, kRelayOff);
  for (std::size_t k : on) p.Set(k, kRelayOn, 0, 0);
  for (std::size_t k : any) p.Set(k, kRelayAny, 0, 0);
  return p;
}

// A 43-position requirement vector with the named positions on.
States Required(std::vector<std::size_t> on, std::size_t size = kRelayPositions) {
  States s(size, 0);
  for (std::size_t k : on) s[k] = 1;
  return s;
}

TEST(FailureClassTest, MatchesStates) {
  struct Case {
    const char* what;
    QFTPossibility stored;
    States given;
    bool match;
  };
  const Case cases[] = {
      {"needed on and on", Vector({0, 10}), Required({0, 10}), true},
      {"needed on but off", Vector({0, 10}), Required({0}), false},
      {"needed off but on", Vector({0}), Required({0, 5}), false},
      {"any accepts on", Vector({0}, {5}), Required({0, 5}), true},
      {"any accepts off", Vector({0}, {5}), Required({0}), true},
      // A vector shorter than the requirement: missing positions do not matter.
      {"short vector, on within", Vector({1}, {}, 3), Required({1, 30}), true},
      {"short vector, off within", Vector({}, {}, 3), Required({1}), false},
      {"empty vector", QFTPossibility(0, 0), Required({0, 42}), true},
      // Longer than the requirement: the extra positions are not judged, but
      // the common ones still are (a length difference is no free pass).
      {"long vector, common positions judged", Vector({0, 50}, {}, 60), Required({}), false},
      {"shorter requirement still judged", Vector({7}), Required({}, 5), true},
      {"shorter requirement refuses its positions", Vector({2}), Required({}, 5), false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    QFCKR60FailureClass fc;
    fc.AddPossibility(c.stored);
    EXPECT_EQ(fc.MatchesStates(0, c.given), c.match);
  }
}

TEST(FailureClassTest, InvalidIndexesAreRefusedEverywhere) {
  QFCKR40FailureClass c;
  c.AddPossibility(Vector({0}));
  std::uint64_t mask = 77;
  for (int index : {-1, 1, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()}) {
    SCOPED_TRACE(index);
    EXPECT_FALSE(c.HasPossibility(index));
    EXPECT_EQ(c.GetPossibility(index), nullptr);
    EXPECT_FALSE(c.GetRelayMask(index, mask));
    EXPECT_EQ(mask, 77u);
    EXPECT_FALSE(c.MatchesStates(index, Required({0})));
    EXPECT_FALSE(c.FindNumber(index, 0, kGroupLoad, true));
    EXPECT_TRUE(c.GetNumbers(index, 0, true).empty());
  }
  EXPECT_TRUE(c.HasPossibility(0));
  EXPECT_FALSE(c.SetSelectedPossibility(1));
  EXPECT_FALSE(c.SetSelectedPossibility(-2));
  EXPECT_TRUE(c.SetSelectedPossibility(0));
  EXPECT_TRUE(c.SetSelectedPossibility(-1));
}

TEST(FailureClassTest, RelayMaskHasBitsBelow64Only) {
  QFCKR60FailureClass c;
  c.AddPossibility(Vector({0, 5, 42}));
  QFTPossibility wide = Vector({3, 63, 64, 70}, {1}, 80);
  wide.Set(2, 7, 0, 0);  // a state no source writes: not on
  c.AddPossibility(wide);
  std::uint64_t mask = 0;
  ASSERT_TRUE(c.GetRelayMask(0, mask));
  EXPECT_EQ(mask, (1ull << 0) | (1ull << 5) | (1ull << 42));
  ASSERT_TRUE(c.GetRelayMask(1, mask));
  EXPECT_EQ(mask, (1ull << 3) | (1ull << 63));
}

TEST(FailureClassTest, StepNumbersByGroup) {
  QFCKR60FailureClass c;
  EXPECT_EQ(c.GetMaxNumber(kGroupLoad, true), -2);  // no possibilities
  QFTPossibility p = Vector({0, 2, 10});
  p.Set(2, kRelayOn, 1, 2);
  p.Set(0, kRelayOn, 3, 1);
  p.Set(10, kRelayOn, 2, 5);
  p.Set(42, kRelayOff, 4, 0);
  c.AddPossibility(p);
  c.AddPossibility(Vector({}, {}, 2));              // positions 2 to 42 missing: 0
  EXPECT_EQ(c.GetMaxNumber(kGroupLoad, true), -1);  // none selected

  ASSERT_TRUE(c.SetSelectedPossibility(0));
  struct Case {
    int group;
    bool first;
    std::int32_t max;
  };
  for (const Case& k : {Case{kGroupLoad, true, 3}, Case{kGroupLoad, false, 2}, Case{kGroupExternal, true, 4},
                        Case{kGroupExternal, false, 5}, Case{0, true, 4}, Case{7, false, 5}}) {
    SCOPED_TRACE(testing::Message() << "group " << k.group << " first " << k.first);
    EXPECT_EQ(c.GetMaxNumber(k.group, k.first), k.max);
  }
  EXPECT_EQ(c.GetNumbers(0, kGroupLoad, true), (States{0, 1, 3}));
  EXPECT_EQ(c.GetNumbers(0, kGroupExternal, false), (States{0, 5}));

  EXPECT_TRUE(c.FindNumber(0, 3, kGroupLoad, true));
  EXPECT_FALSE(c.FindNumber(0, 3, kGroupExternal, true));
  EXPECT_TRUE(c.FindNumber(0, 5, kGroupExternal, false));
  EXPECT_FALSE(c.FindNumber(0, 5, kGroupExternal, true));
  EXPECT_FALSE(c.FindNumber(0, 0, 0, true));  // only the two groups are searched
  // Missing positions read as 0.
  EXPECT_TRUE(c.FindNumber(1, 0, kGroupExternal, true));
  EXPECT_FALSE(c.FindNumber(1, 1, kGroupExternal, true));

  // A number above the signed range does not read as "none".
  QFTPossibility big = Vector({0});
  big.Set(0, kRelayOn, 0xFFFFFFFFu, 0);
  c.AddPossibility(big);
  ASSERT_TRUE(c.SetSelectedPossibility(2));
  EXPECT_EQ(c.GetMaxNumber(kGroupLoad, true), std::numeric_limits<std::int32_t>::max());
}

TEST(FailureClassTest, UseLimitOneAllowsOneUseUntilReleased) {
  QFCKR40FailureClass c;
  c.SetUseLimit(1);
  EXPECT_TRUE(c.TryUse());
  EXPECT_FALSE(c.CanUse());
  EXPECT_FALSE(c.TryUse());
  c.ReleaseUse();
  EXPECT_TRUE(c.TryUse());
  c.ReleaseUse();
  c.ReleaseUse();  // never below 0
  EXPECT_EQ(c.GetUseCount(), 0);
  c.SetUseLimit(0);  // no limit
  for (int i = 0; i < 5; ++i) EXPECT_TRUE(c.TryUse());
}

TEST(FailureClassTest, RemovingAndMovingTheSelectedPossibility) {
  QFCKR60FailureClass c;
  for (std::size_t k : {0, 1, 2}) c.AddPossibility(Vector({k}));
  EXPECT_FALSE(c.RemoveSelectedPossibility());  // none selected
  ASSERT_TRUE(c.SetSelectedPossibility(0));
  EXPECT_FALSE(c.MoveSelectedPossibilityEarlier());
  EXPECT_TRUE(c.MoveSelectedPossibilityLater());
  EXPECT_EQ(c.GetSelectedPossibility(), 1);
  EXPECT_EQ(c.GetPossibility(0)->RelayMask(), 1u << 1);
  EXPECT_EQ(c.GetPossibility(1)->RelayMask(), 1u << 0);
  EXPECT_TRUE(c.MoveSelectedPossibilityLater());
  EXPECT_FALSE(c.MoveSelectedPossibilityLater());
  EXPECT_TRUE(c.MoveSelectedPossibilityEarlier());

  // The selection stays on its index while that names a possibility, and
  // becomes none when it would point past the end.
  EXPECT_TRUE(c.RemoveSelectedPossibility());
  EXPECT_EQ(c.GetSelectedPossibility(), 1);
  EXPECT_TRUE(c.RemoveSelectedPossibility());
  EXPECT_EQ(c.GetPossibilityCount(), 1);
  EXPECT_EQ(c.GetSelectedPossibility(), -1);
}

TEST(FailureClassesTest, FindByIdGivesTheFirstInFileOrder) {
  QFCKR60FailureClasses classes;
  for (auto [id, name] : {std::pair{4, "first"}, {9, "other"}, {4, "second"}}) {
    QFCAbstractFailureClass& c = classes.AddFailureClass();
    c.SetId(id);
    c.SetName(name);
  }
  ASSERT_NE(classes.FindById(4), nullptr);
  EXPECT_EQ(classes.FindById(4)->GetName(), "first");
  EXPECT_EQ(classes.FindById(9)->GetName(), "other");
  EXPECT_EQ(classes.FindById(5), nullptr);
  EXPECT_EQ(classes.GetAt(3), nullptr);
}

TEST(FailureClassesTest, FindByStates) {
  QFCKR60FailureClasses classes;
  QFCAbstractFailureClass& a = classes.AddFailureClass();
  a.SetId(1);
  a.AddPossibility(Vector({0}));
  a.AddPossibility(Vector({0}, {2}));
  QFCAbstractFailureClass& b = classes.AddFailureClass();
  b.SetId(2);
  b.AddPossibility(Vector({1}));
  QFCAbstractFailureClass& dup = classes.AddFailureClass();
  dup.SetId(1);
  dup.AddPossibility(Vector({0}));
  QFCAbstractFailureClass& empty = classes.AddFailureClass();
  empty.SetId(3);

  using Found = std::vector<QFTFoundFailureClass>;
  struct Case {
    const char* what;
    States states;
    Found candidates;
    Found expected;
  };
  const Case cases[] = {
      {"every matching vector of every class with the ID", Required({0}), {{1, 7}}, {{1, 0}, {1, 1}, {1, 0}}},
      {"a candidate named twice adds nothing", Required({0}), {{1, 0}, {1, 1}}, {{1, 0}, {1, 1}, {1, 0}}},
      {"position 2 on needs the vector that does not care", Required({0, 2}), {{1, 0}}, {{1, 1}}},
      {"other class", Required({1}), {{2, 0}, {1, 0}}, {{2, 0}}},
      {"no candidate", Required({0}), {}, {}},
      {"class without vectors", Required({}), {{3, 0}}, {}},
      {"nothing fits", Required({0, 1}), {{1, 0}, {2, 0}}, {}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    Found found = {{99, 99}};
    classes.FindByStates(c.states, c.candidates, found);
    EXPECT_EQ(found, c.expected);
  }

  // A class whose uses are taken is passed over; the duplicate still answers.
  a.SetUseLimit(1);
  ASSERT_TRUE(a.TryUse());
  Found found;
  classes.FindByStates(Required({0}), {{1, 0}}, found);
  EXPECT_EQ(found, (Found{{1, 0}}));
  classes.ResetAllUses();
  EXPECT_EQ(a.GetUseCount(), 0);
  classes.FindByStates(Required({0}), {{1, 0}}, found);
  EXPECT_EQ(found.size(), 3u);
}

}  // namespace
}  // namespace faultbox

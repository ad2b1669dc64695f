// The administration of the open systems: default names, lookup without
// regard to case, renaming, removal and the same-HIL question.
#include <gtest/gtest.h>

#include <ostream>

#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using test::Bench;
using test::MessageCapture;
using test::PinFile;

QFCSystem* OpenIn(QFCSystemAdmin& admin, const std::string& path) {
  QFCSystem* system = nullptr;
  EXPECT_EQ(admin.Open(path, 1, "", "", system), FAULTBOX_OK);
  return system;
}

TEST(SystemAdminTest, DefaultNamesFillTheFirstGap) {
  Bench bench;
  const std::string path = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  std::vector<std::string> names;
  for (int i = 0; i < 3; ++i) names.push_back(OpenIn(admin, path)->GetName());
  EXPECT_EQ(names, (std::vector<std::string>{"System 1", "System 2", "System 3"}));

  EXPECT_TRUE(admin.Rename(admin.GetAt(1), "Bench"));
  EXPECT_EQ(OpenIn(admin, path)->GetName(), "System 2");
  // A name in other case is taken, too.
  ASSERT_TRUE(admin.Rename(admin.GetAt(3), "SYSTEM 2"));
  EXPECT_EQ(OpenIn(admin, path)->GetName(), "System 4");
  EXPECT_EQ(admin.GetCount(), 5);
}

TEST(SystemAdminTest, FailedOpenLeavesNothingBehind) {
  Bench bench;
  QFCSystemAdmin admin;
  QFCSystem* system = OpenIn(admin, bench.Write("bench.csv", PinFile::KR40()));
  MessageCapture cap;
  EXPECT_EQ(
      admin.Open(bench.Write("broken.csv", PinFile::KR60().Set("Potential1", "UBATT")), 1, "", "", system),
      E_FAULTBOX_CONSISTENCY_CHECK);
  EXPECT_EQ(system, nullptr);
  EXPECT_EQ(cap.Count(128), 1);
  EXPECT_EQ(admin.GetCount(), 1);
  // The name the failed system had is free again.
  EXPECT_EQ(admin.GetDefaultName(), "System 2");
}

TEST(SystemAdminTest, LookupRenameAndRemove) {
  Bench bench;
  const std::string path = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  QFCSystem* first = OpenIn(admin, path);
  QFCSystem* second = OpenIn(admin, path);
  QFCSystem* third = OpenIn(admin, path);
  ASSERT_TRUE(admin.Rename(first, "Bench"));

  EXPECT_EQ(admin.FindByName("BENCH"), first);
  EXPECT_EQ(admin.FindByName("bench"), first);
  EXPECT_EQ(admin.FindByName("Bench 2"), nullptr);
  EXPECT_TRUE(admin.IsNameUsed("system 2"));
  EXPECT_FALSE(admin.IsNameUsed("system 2", second));
  EXPECT_EQ(admin.GetAt(-1), nullptr);
  EXPECT_EQ(admin.GetAt(admin.GetCount()), nullptr);
  EXPECT_EQ(admin.GetAt(2), third);

  MessageCapture cap;
  EXPECT_FALSE(admin.Rename(second, "BENCH"));
  ASSERT_EQ(cap.Numbers(), std::vector<int>{88});
  EXPECT_EQ(cap.records[0].first, "BENCH");
  EXPECT_EQ(second->GetName(), "System 2");
  // A system may change the case of its own name.
  EXPECT_TRUE(admin.Rename(first, "BENCH"));
  EXPECT_EQ(first->GetName(), "BENCH");
  cap.Clear();
  EXPECT_FALSE(admin.Rename(nullptr, "Other"));
  EXPECT_EQ(cap.Numbers(), std::vector<int>{35});

  cap.Clear();
  admin.Remove("system 2");
  ASSERT_EQ(cap.Numbers(), std::vector<int>{117});
  EXPECT_EQ(cap.records[0].errorClass, 1);
  EXPECT_EQ(cap.records[0].first, "System 2");
  ASSERT_EQ(admin.GetCount(), 2);
  EXPECT_EQ(admin.GetAt(0), first);
  EXPECT_EQ(admin.GetAt(1), third);
  cap.Clear();
  admin.Remove("nothing of that name");
  EXPECT_TRUE(cap.records.empty());
  EXPECT_EQ(admin.GetCount(), 2);
}

struct HilCase {
  const char* name;
  const char* firstFiu;   // FIULoadAddress of the asking KR60 system (nullptr: a KR40 system asks)
  const char* secondFiu;  // of the other system (nullptr: a KR40 system)
  bool otherConnected;
  bool sameHil;
};

// Test names and failures show the case's name, not its bytes.
void PrintTo(const HilCase& c, std::ostream* os) {
  *os << c.name;
}

class SameHilTest : public ::testing::TestWithParam<HilCase> {};

TEST_P(SameHilTest, FindsTheConnectedOther) {
  const HilCase& c = GetParam();
  Bench bench;
  auto pinFile = [](const char* fiu) {
    return fiu ? PinFile::KR60().Set("FIULoadAddress", fiu) : PinFile::KR40();
  };
  QFCSystemAdmin admin;
  QFCSystem* asking = OpenIn(admin, bench.Write("a.csv", pinFile(c.firstFiu)));
  QFCSystem* other = OpenIn(admin, bench.Write("b.csv", pinFile(c.secondFiu)));
  ASSERT_NE(asking, nullptr);
  ASSERT_NE(other, nullptr);
  other->SetConnectedFlag(c.otherConnected);
  EXPECT_EQ(admin.FindOtherSystemOnSameHil(asking), c.sameHil ? other : nullptr);
  // Never itself, even when connected.
  asking->SetConnectedFlag(true);
  other->SetConnectedFlag(false);
  EXPECT_EQ(admin.FindOtherSystemOnSameHil(asking), nullptr);
}

const HilCase kHilCases[] = {
    {"EqualFiuAddresses", "2_15_7", "2_15_7", true, true},
    {"OtherNotConnected", "2_15_7", "2_15_7", false, false},
    {"OtherAddress", "2_15_7", "2_15_8", true, false},
    // Neither can be read: both count as 0.
    {"BothUnreadable", "none", "NONE", true, true},
    {"OneUnreadable", "none", "0_0_1", true, false},
    {"KR40NeverConflicts", nullptr, nullptr, true, false},
    {"KR60BesideKR40", "0_0_0", nullptr, true, false},
};

INSTANTIATE_TEST_SUITE_P(Cases, SameHilTest, ::testing::ValuesIn(kHilCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(SystemAdminTest, ConnectedSystemsInOrderOfCreation) {
  Bench bench;
  const std::string path = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  std::vector<QFCSystem*> systems;
  for (int i = 0; i < 4; ++i) systems.push_back(OpenIn(admin, path));
  systems[3]->SetConnectedFlag(true);
  systems[1]->SetConnectedFlag(true);
  std::vector<QFCSystem*> connected = {nullptr};
  admin.GetConnectedSystems(connected);
  EXPECT_EQ(connected, (std::vector<QFCSystem*>{nullptr, systems[1], systems[3]}));
  MessageCapture cap;
  EXPECT_EQ(admin.FindOtherSystemOnSameHil(nullptr), nullptr);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{35});
}

}  // namespace
}  // namespace faultbox

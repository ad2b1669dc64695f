// The external hardware items: potentials, connections and their checks.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "config/QFCExternHardwareAdmin.h"
#include "platform/MessageTable.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using test::MessageCapture;

// Two potentials named "none" (not fitted), as pin files allow.
const std::vector<std::string> kPotentials = {"UBATT", "GND", "none", "none", "U5V"};
const std::string kNoPotential = ResourceString(8905);

struct Endpoints {
  std::int32_t a, b;
  bool operator==(const Endpoints&) const = default;
};

Endpoints Connection(const QFCExternHardwareAdmin& admin, std::int32_t type, std::int32_t channel = 0) {
  Endpoints e{-1, -1};
  EXPECT_TRUE(admin.GetConnection(type, channel, e.a, e.b)) << "type " << type << " channel " << channel;
  return e;
}

TEST(ExternHardwareTest, NewAdminFromSystemListsFiveFreeItems) {
  test::Bench bench;
  MessageCapture cap;
  QFCSystem system("Bench", bench.Write("bench.csv", test::PinFile::KR60()), 1, "Tester", "Rig");
  ASSERT_EQ(system.OpenFromPinFile(), FAULTBOX_OK);
  cap.Clear();
  QFCExternHardwareAdmin admin;
  ASSERT_EQ(admin.Create(system.GetPotentialNames()), FAULTBOX_OK);

  std::vector<std::int32_t> types;
  for (const auto& item : admin.GetItems()) types.push_back(item->GetType());
  EXPECT_EQ(types, (std::vector<std::int32_t>{1, 0, 2, 3, 4}));
  EXPECT_EQ(admin.GetItems()[1]->GetKindText(), kNoPotential);

  std::vector<std::string> names;
  admin.GetPotentialNames(names);
  EXPECT_EQ(names, (std::vector<std::string>{"UBATT", "GND", "none", "none", "U5V", kNoPotential}));
  std::vector<std::int32_t> free;
  admin.GetFreeTypes(free);
  EXPECT_EQ(free, (std::vector<std::int32_t>{0, 2, 3, 4}));
  for (std::int32_t kind : {2, 3}) {
    EXPECT_EQ(admin.GetPotentialChoice(kind), kNoPotential);
    EXPECT_EQ(admin.GetPotentialChoiceIndex(kind), 5);
  }
  EXPECT_TRUE(cap.records.empty());
}

TEST(ExternHardwareTest, UncreatedAdminRefusesAndReports) {
  MessageCapture cap;
  QFCExternHardwareAdmin admin;
  EXPECT_TRUE(admin.GetItems().empty());
  // Nothing created: no item to connect, no potentials to choose from.
  EXPECT_FALSE(admin.Connect(2, -1, 3, 4));
  EXPECT_FALSE(admin.SetPotentialChoice("none", 2));
  EXPECT_EQ(admin.GetPotentialChoice(2), "");

  ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
  EXPECT_FALSE(admin.IsConnected(1));  // the potential item has no connection
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{35, 35, 35}));
}

TEST(ExternHardwareTest, PotentialChoices) {
  struct Case {
    std::string name;
    std::int32_t kind;
    bool ok;
    std::string choice;  // afterwards, of `kind` (or of the resistor for another kind)
    int index;
  };
  const Case cases[] = {
      {"none", 2, true, kNoPotential, 5},
      {"GND", 3, true, "GND", 1},
      {kNoPotential, 2, true, kNoPotential, 5},
      {"Unknown", 2, false, "U5V", 4},
      {"u5v", 3, false, "U5V", 4},  // exact names only
      {"GND", 4, false, "U5V", 4},  // only resistor and measurement
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name + " kind " + std::to_string(c.kind));
    QFCExternHardwareAdmin admin;
    ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
    ASSERT_TRUE(admin.SetPotentialChoice("U5V", 2));
    ASSERT_TRUE(admin.SetPotentialChoice("U5V", 3));
    EXPECT_EQ(admin.SetPotentialChoice(c.name, c.kind), c.ok);
    const std::int32_t kind = c.kind == 4 ? 2 : c.kind;
    EXPECT_EQ(admin.GetPotentialChoice(kind), c.choice);
    EXPECT_EQ(admin.GetPotentialChoiceIndex(kind), c.index);
  }
}

TEST(ExternHardwareTest, ChoiceByIndexKeepsEquallyNamedPotentialsApart) {
  QFCExternHardwareAdmin admin;
  ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
  EXPECT_TRUE(admin.SetPotentialChoiceByIndex(3, 3));
  EXPECT_EQ(admin.GetPotentialChoice(3), "none");
  EXPECT_EQ(admin.GetPotentialChoiceIndex(3), 3);
  EXPECT_EQ(admin.FindPotentialIndex("none"), 2);  // the name alone would give the first
  for (int bad : {-1, 6}) EXPECT_FALSE(admin.SetPotentialChoiceByIndex(bad, 3));
  EXPECT_FALSE(admin.SetPotentialChoiceByIndex(0, 1));
  EXPECT_EQ(admin.GetPotentialChoiceIndex(3), 3);
  EXPECT_EQ(admin.FindPotentialIndex(kNoPotential), 5);
  EXPECT_EQ(admin.FindPotentialIndex("gnd"), -1);
}

TEST(ExternHardwareTest, ConnectSequences) {
  struct Step {
    std::int32_t type, channel, a, b;
    bool ok;
  };
  struct Case {
    const char* what;
    std::vector<Step> steps;
    Endpoints resistor, measurement, source;
  };
  const Case cases[] = {
      {"reverse pair is freed", {{3, -1, 9, 3, true}, {2, -1, 3, 9, true}}, {3, 9}, {0, 0}, {0, 0}},
      {"same pair is freed", {{4, -1, 1, 2, true}, {2, -1, 1, 2, true}}, {1, 2}, {0, 0}, {0, 0}},
      {"6 sets endpoint A only", {{2, -1, 6, 2, true}}, {2, 0}, {0, 0}, {0, 0}},
      {"7 sets endpoint B only", {{4, -1, 7, 3, true}}, {0, 0}, {0, 0}, {0, 3}},
      {"6 then 7 completes", {{3, -1, 6, 2, true}, {3, -1, 7, 5, true}}, {0, 0}, {2, 5}, {0, 0}},
      {"6 on a set endpoint A", {{2, -1, 6, 2, true}, {2, -1, 6, 4, false}}, {2, 0}, {0, 0}, {0, 0}},
      {"connected item refuses", {{4, -1, 1, 2, true}, {4, -1, 3, 4, false}}, {0, 0}, {0, 0}, {1, 2}},
      {"empty item accepts", {{0, -1, 3, 4, true}}, {0, 0}, {0, 0}, {0, 0}},
      {"channel leaves the item", {{3, 2, 1, 2, true}}, {0, 0}, {0, 0}, {0, 0}},
      {"channel 5 is the item", {{3, 5, 1, 4, true}}, {0, 0}, {1, 4}, {0, 0}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    QFCExternHardwareAdmin admin;
    ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
    for (const Step& s : c.steps) EXPECT_EQ(admin.Connect(s.type, s.channel, s.a, s.b), s.ok);
    EXPECT_EQ(Connection(admin, 2), c.resistor);
    EXPECT_EQ(Connection(admin, 3), c.measurement);
    EXPECT_EQ(Connection(admin, 4), c.source);
    EXPECT_EQ(admin.IsConnected(2), c.resistor.a != 0 && c.resistor.b != 0);
  }

  // The endpoint lookup is ordered; the freed item is free again.
  QFCExternHardwareAdmin admin;
  ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
  ASSERT_TRUE(admin.Connect(3, -1, 9, 3));
  ASSERT_TRUE(admin.Connect(2, -1, 3, 9));
  EXPECT_EQ(admin.GetTypeAt(3, 9), 2);
  EXPECT_EQ(admin.GetTypeAt(9, 3), 0);
  std::vector<std::int32_t> free;
  admin.GetFreeTypes(free);
  EXPECT_EQ(free, (std::vector<std::int32_t>{0, 3, 4}));
}

TEST(ExternHardwareTest, ChannelsAndDisconnectAll) {
  QFCExternHardwareAdmin admin;
  ASSERT_EQ(admin.Create(kPotentials), FAULTBOX_OK);
  ASSERT_TRUE(admin.Connect(3, -1, 2, 3));
  for (int channel = 1; channel <= 4; ++channel) ASSERT_TRUE(admin.Connect(3, channel, 1, 2));
  ASSERT_TRUE(admin.Connect(4, -1, 4, 5));
  EXPECT_EQ(Connection(admin, 3, 4), (Endpoints{1, 0}));
  std::int32_t a = 7, b = 7;
  EXPECT_FALSE(admin.GetConnection(3, 5, a, b));
  EXPECT_FALSE(admin.GetConnection(1, 0, a, b));

  admin.DisconnectAll();
  for (int channel = 0; channel <= 4; ++channel) EXPECT_EQ(Connection(admin, 3, channel), (Endpoints{0, 0}));
  EXPECT_EQ(Connection(admin, 4), (Endpoints{0, 0}));
}

}  // namespace
}  // namespace faultbox

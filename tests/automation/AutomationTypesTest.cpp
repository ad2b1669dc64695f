// Conversion of variant arguments and the published enumerations.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <set>
#include <string>

#include "automation/AutomationTypes.h"

namespace faultbox {
namespace {

class Dummy : public QFCAutomationObject {
 public:
  bool IsAttached() const override { return true; }
};

TEST(AutomationTypesTest, VariantToInt32) {
  struct Case {
    const char* name;
    Variant value;
    bool converts;
    std::int32_t expected;
  } cases[] = {
      {"omitted", Variant{}, false, 0},
      {"true is -1", Variant{true}, true, -1},
      {"false", Variant{false}, true, 0},
      {"number", Variant{std::int64_t{42}}, true, 42},
      {"lowest", Variant{std::int64_t{std::numeric_limits<std::int32_t>::min()}}, true,
       std::numeric_limits<std::int32_t>::min()},
      {"above range", Variant{std::int64_t{1} << 31}, false, 0},
      {"below range", Variant{-(std::int64_t{1} << 31) - 1}, false, 0},
      {"half rounds to even down", Variant{2.5}, true, 2},
      {"half rounds to even up", Variant{3.5}, true, 4},
      {"fraction", Variant{-1.4}, true, -1},
      {"not a number", Variant{std::nan("")}, false, 0},
      {"infinite", Variant{std::numeric_limits<double>::infinity()}, false, 0},
      {"real out of range", Variant{3e9}, false, 0},
      {"decimal text", Variant{std::string(" 17 ")}, true, 17},
      {"signed text", Variant{std::string("+5")}, true, 5},
      {"negative text", Variant{std::string("-5")}, true, -5},
      {"text with letters", Variant{std::string("5a")}, false, 0},
      {"empty text", Variant{std::string()}, false, 0},
      {"text out of range", Variant{std::string("2147483648")}, false, 0},
      {"object", Variant{std::shared_ptr<QFCAutomationObject>(std::make_shared<Dummy>())}, false, 0},
      {"array", Variant{QFTObjectArray{}}, false, 0},
  };
  for (const Case& c : cases) {
    std::int32_t out = 7;
    EXPECT_EQ(VariantToInt32(c.value, out), c.converts) << c.name;
    if (c.converts) {
      EXPECT_EQ(out, c.expected) << c.name;
    }
  }
}

TEST(AutomationTypesTest, EnumerationsCarryEveryConstant) {
  std::set<std::string> names;
  for (const QFTEnumeration& e : AutomationEnumerations()) {
    names.insert(e.name);
    for (const QFTNamedConstant& c : e.constants) {
      ASSERT_NE(c.name, nullptr) << e.name;
      EXPECT_NE(std::string(c.name), "") << e.name << " " << c.value;
      if (std::string(e.name) == "FaultboxErrors") {
        EXPECT_EQ(ResultCodeName(c.value), std::string(c.name));
        EXPECT_NE(std::string(c.help), "") << c.name;
      }
    }
  }
  EXPECT_EQ(names, (std::set<std::string>{"FSPlatformType", "FSDeviceType", "FSFailurePattern",
                                          "FSDeviceConstant", "FaultboxErrors"}));
  for (const QFTEnumeration& e : AutomationEnumerations())
    if (std::string(e.name) == "FaultboxErrors") {
      EXPECT_EQ(e.constants.size(), 28u);
    }
}

}  // namespace
}  // namespace faultbox

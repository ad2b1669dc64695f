// Number texts, module addresses and the case-insensitive list helpers.
#include "config/QFCFSHelper.h"

#include <gtest/gtest.h>

#include "support/MessageCapture.h"

namespace faultbox {
namespace {

using test::MessageCapture;

TEST(FSHelperTest, StringToNumber) {
  struct Case {
    const char* text;
    int base;
    bool ok;
    std::uint32_t value;
  };
  const Case cases[] = {
      {"42", 10, true, 42},
      {"  42 ", 10, true, 42},
      {"", 10, true, 0},
      {"+7", 10, true, 7},
      {"12@3", 10, true, 12},  // conversion stops at the first other character
      {"4 2", 10, false, 0},
      {"-1", 10, false, 0},
      {"1e3", 10, false, 0},
      {"1.5", 10, false, 0},
      {"3(1)", 10, false, 0},
      {"\xD6", 10, false, 0},
      {"4294967295", 10, true, 4294967295u},
      {"4294967296", 10, false, 0},  // overflow fails instead of wrapping
      {"7F", 16, true, 0x7F},
      {"0x7F", 16, true, 0x7F},
      {"7f", 16, false, 0},
      {"0X7F", 16, false, 0},
      {"128", 16, true, 0x128},
      {"FFFFFFFF", 16, true, 0xFFFFFFFFu},
      {"100000000", 16, false, 0},
      {"0x", 16, true, 0},
      {"G1", 16, false, 0},
      {"12", 8, false, 0},
  };
  for (const Case& c : cases) {
    std::uint32_t value = 12345;
    EXPECT_EQ(QFCFSHelper::StringToNumber(c.text, value, c.base), c.ok) << c.text << " base " << c.base;
    if (c.ok) {
      EXPECT_EQ(value, c.value) << c.text;
    }
  }
}

TEST(FSHelperTest, StringToNumberStrict) {
  struct Case {
    const char* text;
    int base;
    bool ok;
    std::uint32_t value;
  };
  const Case cases[] = {
      {"42", 10, true, 42},   {"0", 10, true, 0},     {"x1", 10, false, 0}, {"1_2", 10, false, 0},
      {"0x1f", 16, true, 31}, {"ab", 16, true, 0xAB}, {"-3", 10, false, 0}, {"99999999999", 10, false, 0},
      {"12", 2, false, 0},    {"0", 16, true, 0},
  };
  for (const Case& c : cases) {
    std::uint32_t value = 12345;
    EXPECT_EQ(QFCFSHelper::StringToNumberStrict(c.text, value, c.base), c.ok) << c.text;
    EXPECT_EQ(value, c.ok ? c.value : 12345u) << c.text;
  }
}

TEST(FSHelperTest, ParseModuleAddress) {
  struct Case {
    const char* text;
    bool ok;
    std::uint32_t address;
    int message;        // 0 for none
    const char* first;  // its first text
  };
  const Case cases[] = {
      {"2_15_7", true, 0x2F7, 0, ""},      {"9_15_15", true, 0x9FF, 0, ""},
      {"3", true, 0x300, 0, ""},           {"3_4", true, 0x340, 0, ""},
      {" 1 _ 2 _ 3 ", true, 0x123, 0, ""}, {"10_0_0", false, 0, 34, "cabinet"},
      {"0_16_0", false, 0, 34, "rack"},    {"0_0_16", false, 0, 34, "slot"},
      {"0_x_0", false, 0, 34, "rack"},     {"1_2_3_4", false, 0, 34, "1_2_3_4"},
      {"none", false, 0, 35, "656"},       {"-", false, 0, 35, "656"},
      {"#", false, 0, 35, "656"},
  };
  for (const Case& c : cases) {
    MessageCapture cap;
    std::uint32_t cabinet = 0, rack = 0, slot = 0;
    EXPECT_EQ(QFCFSHelper::ParseModuleAddress(c.text, cabinet, rack, slot), c.ok) << c.text;
    if (c.ok) {
      EXPECT_EQ(QFCFSHelper::ModuleAddress(cabinet, rack, slot), c.address) << c.text;
      EXPECT_TRUE(cap.records.empty());
      continue;
    }
    ASSERT_EQ(cap.records.size(), 1u) << c.text;
    EXPECT_EQ(cap.records[0].number, c.message);
    EXPECT_EQ(cap.records[0].errorClass, 0);
    EXPECT_EQ(cap.records[0].first, c.first);
    if (c.message == 34 && std::string(c.first) != c.text) {
      EXPECT_EQ(cap.records[0].second, c.text);
    }
    cap.Clear();
    EXPECT_FALSE(QFCFSHelper::ParseModuleAddress(c.text, cabinet, rack, slot, false));
    EXPECT_TRUE(cap.records.empty());
  }
}

TEST(FSHelperTest, TextLists) {
  std::vector<std::string> list = {"beta", "Alpha", "BETA", "gamma", "alpha"};
  QFCFSHelper::SortNoCase(list);
  EXPECT_EQ(list, (std::vector<std::string>{"Alpha", "alpha", "beta", "BETA", "gamma"}));
  QFCFSHelper::RemoveDuplicatesNoCase(list);
  EXPECT_EQ(list, (std::vector<std::string>{"Alpha", "beta", "gamma"}));
  EXPECT_TRUE(QFCFSHelper::EqualNoCase("BoardType", "boardtype"));
  EXPECT_FALSE(QFCFSHelper::EqualNoCase("Board", "Boards"));
  EXPECT_EQ(QFCFSHelper::ToBitString(0x5, 0x80000000u), "1" + std::string(60, '0') + "101");
  EXPECT_EQ(QFCFSHelper::Split("a;;b;", ';').size(), 4u);
}

}  // namespace
}  // namespace faultbox

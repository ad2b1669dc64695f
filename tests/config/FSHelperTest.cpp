// Number texts, module addresses and the case-insensitive list helpers.
#include "config/QFCFSHelper.h"

#include <gtest/gtest.h>

#include <optional>

#include "support/MessageCapture.h"

namespace faultbox {
namespace {

using test::MessageCapture;

// The lenient reading (pin file values) and the strict one side by side: the
// rows where they differ are the ones that matter. Conversion stops at the
// first other character; a minus sign or an overflow fails instead of wrapping.
TEST(FSHelperTest, StringToNumberLenientAndStrict) {
  struct Case {
    const char* text;
    int base;
    std::optional<std::uint32_t> lenient, strict;
  };
  const std::optional<std::uint32_t> kNo;  // refused
  const Case cases[] = {
      {"42", 10, 42, 42},        {"  42 ", 10, 42, 42},      {"", 10, 0, 0},
      {"+7", 10, 7, 7},          {"12@3", 10, 12, 12},       {"4 2", 10, kNo, 4},
      {"-1", 10, kNo, kNo},      {"1e3", 10, kNo, 1},        {"3(1)", 10, kNo, kNo},
      {"x1", 10, kNo, kNo},      {"\xD6", 10, kNo, 0},       {"7F", 16, 0x7F, 0x7F},
      {"0x7F", 16, 0x7F, 0x7F},  {"7f", 16, kNo, 0x7F},      {"0X7F", 16, kNo, kNo},
      {"128", 16, 0x128, 0x128}, {"FFFFFFFF", 16, ~0u, ~0u}, {"100000000", 16, kNo, kNo},
      {"0x", 16, 0, 0},          {"G1", 16, kNo, kNo},       {"12", 8, kNo, kNo},
  };
  auto check = [](const Case& c) {
    SCOPED_TRACE(testing::Message() << '"' << c.text << "\" base " << c.base);
    std::uint32_t value = 12345;
    EXPECT_EQ(QFCFSHelper::StringToNumber(c.text, value, c.base), c.lenient.has_value());
    EXPECT_EQ(value, c.lenient.value_or(value));
    value = 12345;
    EXPECT_EQ(QFCFSHelper::StringToNumberStrict(c.text, value, c.base), c.strict.has_value());
    EXPECT_EQ(value, c.strict.value_or(12345u));
  };
  for (const Case& c : cases) check(c);
  check({"4294967295", 10, ~0u, ~0u});
  check({"4294967296", 10, kNo, kNo});
}

TEST(FSHelperTest, ParseModuleAddress) {
  struct Case {
    const char* text;
    std::uint32_t address;  // 0: refused
    int message;
    const char* first;  // its first text
  };
  const Case cases[] = {
      {"2_15_7", 0x2F7, 0, ""},      {"9_15_15", 0x9FF, 0, ""},     {"3", 0x300, 0, ""},
      {"3_4", 0x340, 0, ""},         {" 1 _ 2 _ 3 ", 0x123, 0, ""}, {"10_0_0", 0, 34, "cabinet"},
      {"0_16_0", 0, 34, "rack"},     {"0_0_16", 0, 34, "slot"},     {"0_x_0", 0, 34, "rack"},
      {"1_2_3_4", 0, 34, "1_2_3_4"}, {"none", 0, 35, "656"},        {"#", 0, 35, "656"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    MessageCapture cap;
    std::uint32_t cabinet = 0, rack = 0, slot = 0;
    EXPECT_EQ(QFCFSHelper::ParseModuleAddress(c.text, cabinet, rack, slot), c.address != 0);
    if (c.address != 0) {
      EXPECT_EQ(QFCFSHelper::ModuleAddress(cabinet, rack, slot), c.address);
      EXPECT_TRUE(cap.records.empty());
      continue;
    }
    ASSERT_EQ(cap.records.size(), 1u);
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
  EXPECT_FALSE(QFCFSHelper::EqualNoCase("Board", "Boards"));
  EXPECT_EQ(QFCFSHelper::ToBitString(0x5, 0x80000000u), "1" + std::string(60, '0') + "101");
  EXPECT_EQ(QFCFSHelper::Split("a;;b;", ';').size(), 4u);
}

}  // namespace
}  // namespace faultbox

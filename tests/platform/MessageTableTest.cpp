// Completeness of the message and string tables, and how inserted texts are
// put into a message.
#include "platform/MessageTable.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>
#include <vector>

namespace faultbox {
namespace {

// Every message number the component raises.
const std::vector<int> kRaisedMessages = {
    34,  35,  37,  38,  39,  40,  41,  42,  43,  45,  46,  47,  48,  49,  50,  51,  54,  55,  57,  58,
    59,  60,  61,  62,  63,  64,  65,  66,  67,  69,  72,  73,  75,  76,  80,  81,  82,  83,  84,  85,  86,
    87,  88,  89,  90,  91,  92,  93,  94,  97,  98,  99,  100, 101, 103, 105, 107, 108, 109, 110, 111,
    112, 113, 114, 115, 116, 117, 118, 119, 120, 125, 126, 127, 128, 129, 130, 131, 132, 133, 134, 135,
    136, 140, 142, 143, 144, 145, 146, 147, 148, 149, 150, 151, 152, 153, 154, 155, 156, 157, 158, 161,
    162, 164, 165, 166, 167, 168, 169, 170, 171, 172, 173, 174, 175, 176, 177, 178, 179, 183,
    190,
    // the front ends' own
    901, 902, 910, 911, 912,
    920, 921, 922, 923,
    930, 931, 932, 933, 934,
    940, 941, 942, 943, 944, 945};

// Every resource string the component loads by number.
const std::vector<int> kUsedStrings = {6701, 6704, 6706, 6707, 6709, 6711, 6712, 6713, 6714, 6715, 6716, 6717,
                                       6718, 6719, 6720, 6721, 6722, 6723, 6724, 6725, 6726, 6727, 6728, 6729,
                                       6731, 6732, 6733, 6735, 6740, 6742, 6745, 6747, 6748, 6749, 6750, 6752,
                                       6761, 6762, 6764, 6766, 6767, 6768, 6769, 6770, 6771, 6772, 6773, 6774,
                                       6775, 6776, 6777, 6778, 6779, 6780, 6781, 6782, 6783, 6784, 6785, 6786,
                                       6787, 6788, 6789, 6790, 6793, 6795, 6797, 6799, 8905, 8906, 8907, 8910,
                                       8911, 8912, 8917, 8918, 8919, 8920, 8921, 8922, 8923, 8926, 8927, 8928,
                                       40026};

// The printf conversions of a string, in order ("sdd" for "%s ... %d ... %d").
std::string Conversions(const char* text) {
  std::string out;
  for (const char* p = std::strchr(text, '%'); p != nullptr; p = std::strchr(p + 1, '%')) out += p[1];
  return out;
}

TEST(MessageTableTest, EveryRaisedMessageHasText) {
  for (int number : kRaisedMessages) {
    const char* text = MessageText(number);
    ASSERT_NE(text, nullptr) << "message " << number;
    EXPECT_GT(std::strlen(text), 0u) << "message " << number;
  }
  // A number in the table that nobody raises is as suspect as a missing one.
  EXPECT_EQ(KnownMessageNumbers(), kRaisedMessages);
}

TEST(MessageTableTest, EveryUsedStringHasText) {
  for (int id : kUsedStrings) {
    const char* text = ResourceString(id);
    ASSERT_NE(text, nullptr) << "string " << id;
    EXPECT_GT(std::strlen(text), 0u) << "string " << id;
  }
  EXPECT_EQ(KnownResourceStringIds(), kUsedStrings);
}

TEST(MessageTableTest, MessagesUseOnlyNumberedPlaceholders) {
  for (int number : KnownMessageNumbers()) {
    for (char c : Conversions(MessageText(number))) EXPECT_TRUE(c == '1' || c == '2') << "message " << number;
  }
}

// Callers hand these strings to printf-style formatting: a conversion that
// does not match the arguments would read garbage or crash.
TEST(MessageTableTest, StringFormatsMatchTheirArguments) {
  const std::map<int, std::string> formats = {{6704, "s"}, {6715, "s"}, {6716, "s"}, {6729, "ss"}, {6740, "ss"},
                                              {6769, "d"}, {6779, "s"}, {6782, "s"}, {6784, "s"}, {6786, "s"},
                                              {6788, "sdd"}, {6789, "ss"}, {6790, "s"}, {6799, "d"}, {8911, "ds"},
                                              {8923, "d"}, {40026, "sdd"}};
  for (int id : KnownResourceStringIds()) {
    auto it = formats.find(id);
    EXPECT_EQ(Conversions(ResourceString(id)), it == formats.end() ? "" : it->second) << "string " << id;
  }
}

TEST(MessageTableTest, DocumentTypeStringsCarryTheirExtension) {
  EXPECT_NE(std::string(ResourceString(6701)).find("\n.fsa\n"), std::string::npos);
  EXPECT_NE(std::string(ResourceString(6752)).find("\n.fss\n"), std::string::npos);
  EXPECT_STRNE(ResourceString(8905), "none");
}

TEST(MessageTableTest, FormatMessageInsertsTexts) {
  struct Case {
    int number;
    const char* first;
    const char* second;
    const char* expected;
  };
  const Case cases[] = {
      {150, "7", "3", "Failure class 7 has no relay vector 3."},
      // Inserted texts are not scanned for placeholders again.
      {150, "%2", "x", "Failure class %2 has no relay vector x."},
      // A bracketed placeholder vanishes with an empty text.
      {126, "", "", "The failure class was not found in the system's failure class file."},
      {126, "5(2)", "", "The failure class was not found in the system's failure class file (5(2))."},
      // A text without a place in the message is appended, not dropped.
      {110, "extra", "", "Hardware reset finished. [extra]"},
      {999, "a", "b", "Message 999: a b"},
      {999, "", "b", "Message 999: b"},
      {0, "", "", "Message 0"},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(FormatMessage(c.number, c.first, c.second), c.expected) << "message " << c.number;
  }
}

TEST(MessageTableTest, UnknownNumbersHaveNoText) {
  for (int number : {-1, 0, 36, 184, 6701}) EXPECT_EQ(MessageText(number), nullptr) << number;
  for (int id : {-1, 0, 35, 6700, 6730, 99999}) EXPECT_EQ(ResourceString(id), nullptr) << id;
}

}  // namespace
}  // namespace faultbox

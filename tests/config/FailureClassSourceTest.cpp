// The readable source form of failure class sets: its forms, its checks with
// the place of every refused value, the written form read back, and the
// sample sets shipped in data/.
#include <gtest/gtest.h>

#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "config/FailureClassLoader.h"
#include "config/FailureClassSource.h"
#include "config/kr60/QFCKR60FailureClasses.h"
#include "support/MessageCapture.h"
#include "support/RunProcess.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::MessageCapture;

std::string Source(const std::string& classes, const std::string& platform = "\"KR60\"") {
  return "{\"version\": \"1\", \"platform\": " + platform + ", \"classes\": [" + classes + "]}";
}

std::unique_ptr<QFCAbstractFailureClasses> Parse(const std::string& text) {
  std::unique_ptr<QFCAbstractFailureClasses> out;
  EXPECT_EQ(ParseFailureClassSource(text, "src.json", &out), FAULTBOX_OK) << text;
  return out;
}

TEST(FailureClassSourceTest, CompactAndFullFormsDescribeTheSameVector) {
  auto classes = Parse(Source(R"(
    {"id": 3, "name": "n", "description": "d", "limitation": "l", "format": "f", "useLimit": 2,
     "storedValues": [1, -2, 2147483647], "selected": 1,
     "relayVectors": [
       {"on": [0, 10], "any": [5], "steps": {"0": [1, 2], "42": [0, 3]}},
       {"size": 4, "default": "any", "on": [1], "off": [3]},
       {"positions": [[0, 0, 0], ["on", 2, 1], [2, 0, 0], [1, 0, 0]]},
       {"size": 0}
     ]})"));
  ASSERT_NE(classes, nullptr);
  EXPECT_EQ(classes->GetPlatform(), kFailureClassPlatformKR60);
  EXPECT_EQ(classes->GetVersion(), "1");
  const QFCAbstractFailureClass& c = *classes->GetAt(0);
  EXPECT_EQ(std::tuple(c.GetId(), c.GetName(), c.GetDescription(), c.GetLimitation(), c.GetFormat()),
            std::tuple(3, "n", "d", "l", "f"));
  EXPECT_EQ(std::tuple(c.GetUseLimit(), c.GetStoredValue(1), c.GetStoredValue(2), c.GetSelectedPossibility()),
            std::tuple(2, -2, 2147483647, 1));
  ASSERT_EQ(c.GetPossibilityCount(), 4);

  QFTPossibility first(43, kRelayOff);
  first.Set(0, kRelayOn, 1, 2);
  first.Set(10, kRelayOn, 0, 0);
  first.Set(5, kRelayAny, 0, 0);
  first.Set(42, kRelayOff, 0, 3);
  EXPECT_EQ(*c.GetPossibility(0), first);

  QFTPossibility second(4, kRelayAny);
  second.Set(1, kRelayOn, 0, 0);
  second.Set(3, kRelayOff, 0, 0);
  EXPECT_EQ(*c.GetPossibility(1), second);
  QFTPossibility third = second;
  third.Set(1, kRelayOn, 2, 1);
  third.Set(2, kRelayOff, 0, 0);
  third.Set(3, kRelayOn, 0, 0);
  EXPECT_EQ(*c.GetPossibility(2), third);
  EXPECT_EQ(c.GetPossibility(3)->Size(), 0u);

  // Defaults, board type names and comments.
  auto plain =
      Parse("// a set\n" + Source(R"({"id": -5, "name": "x", "relayVectors": [{}]} /* one */)", "\"KR080\""));
  ASSERT_NE(plain, nullptr);
  EXPECT_EQ(plain->GetPlatform(), kFailureClassPlatformKR40);
  const QFCAbstractFailureClass& p = *plain->GetAt(0);
  EXPECT_STREQ(p.GetClassName(), "QFCKR40FailureClass");
  EXPECT_EQ(p.GetId(), -5);
  EXPECT_EQ(p.GetUseLimit(), 0);
  EXPECT_EQ(p.GetSelectedPossibility(), -1);
  EXPECT_EQ(*p.GetPossibility(0), QFTPossibility());
}

TEST(FailureClassSourceTest, RefusedValuesNameTheirPlace) {
  struct Case {
    std::string text;
    std::string where;  // the message's first text
    std::string what;   // part of its second text
  };
  const std::string top = "src.json";
  const std::string cls = "src.json: class 4 \"Short\"";
  auto one = [](const std::string& fields) {
    return Source(R"({"id": 4, "name": "Short", )" + fields + "}");
  };
  const Case cases[] = {
      {"[]", top, "must be a JSON object"},
      {R"({"version": "1", "classes": []})", top, "\"platform\" is missing"},
      {R"({"version": "1", "platform": 2})", top, "\"classes\" is missing"},
      {Source("", "\"KR61\""), top, "\"platform\" must be"},
      {R"({"version": 1, "platform": 2, "classes": []})", top, "\"version\" must be a text"},
      {R"({"version": "1", "platform": 2, "classes": [], "Classes": []})", top, "unknown key \"Classes\""},
      {R"({"version": "1", "platform": 2, "encoding": "cp1252", "classes": []})", top, "\"encoding\""},
      {Source("7"), "src.json: class entry 1", "must be a JSON object"},
      {Source(R"({"name": "x"})"), "src.json: class entry 1", "\"id\" is missing"},
      {Source(R"({"id": 2147483648, "name": "x"})"), "src.json: class entry 1",
       "\"id\" must be a whole number"},
      {Source(R"({"id": 1})"), "src.json: class 1", "\"name\" is missing"},
      {Source(R"({"id": 4, "name": "a"}, {"id": 4, "name": "b"})"), "src.json: class 4 \"b\"",
       "ID 4 is already given to class entry 1 \"a\""},
      {one(R"("useLimit": -1)"), cls, "\"useLimit\""},
      {one(R"("storedValues": [1, 2])"), cls, "three whole numbers"},
      {one(R"("storedValues": [1, 2, "3"])"), cls, "stored value 3"},
      {one(R"("selected": 1, "relayVectors": [{}])"), cls, "from -1 to 0"},
      {one(R"("relayVectors": {})"), cls, "must be a list"},
      {one(R"("relayVectors": [[1]])"), cls + ", relay vector 0", "must be a JSON object"},
      {one(R"("relayVectors": [{"On": [1]}])"), cls + ", relay vector 0", "unknown key \"On\""},
      {one(R"("relayVectors": [{}, {"on": [43]}])"), cls + ", relay vector 1", "from 0 to 42, not 43"},
      {one(R"("relayVectors": [{"on": [3], "any": [3]}])"), cls + ", relay vector 0, position 3",
       "named in \"on\" and in \"any\""},
      {one(R"("relayVectors": [{"size": 1025}])"), cls + ", relay vector 0", "\"size\""},
      {one(R"("relayVectors": [{"size": 0, "on": [0]}])"), cls + ", relay vector 0", "has no positions"},
      {one(R"("relayVectors": [{"default": "half"}])"), cls + ", relay vector 0", "\"default\""},
      {one(R"("relayVectors": [{"steps": {"12": [1]}}])"), cls + ", relay vector 0, position 12",
       "[first, second]"},
      {one(R"("relayVectors": [{"steps": {"12": [-1, 1]}}])"), cls + ", relay vector 0, position 12",
       "first number"},
      {one(R"("relayVectors": [{"steps": {"+1": [1, 1]}}])"), cls + ", relay vector 0", "\"+1\""},
      {one(R"("relayVectors": [{"positions": [[0, 0, 0], [3, 0, 0]]}])"),
       cls + ", relay vector 0, position 1", "relay state"},
      {one(R"("relayVectors": [{"positions": [[0, 0]]}])"), cls + ", relay vector 0, position 0",
       "[state, first, second]"},
      {one(R"("relayVectors": [{"positions": [], "on": [1]}])"), cls + ", relay vector 0",
       "beside \"positions\""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    MessageCapture cap;
    std::unique_ptr<QFCAbstractFailureClasses> out = QFCAbstractFailureClasses::Create(2);
    EXPECT_EQ(ParseFailureClassSource(c.text, "src.json", &out), E_FAULTBOX_CONSISTENCY_CHECK);
    EXPECT_EQ(out, nullptr);
    const ErrorRecord* r = cap.Find(kMsgFailureClassSourceValue);
    ASSERT_NE(r, nullptr) << (cap.records.empty() ? "" : cap.records[0].Text());
    EXPECT_EQ(r->errorClass, 3);
    EXPECT_EQ(r->first, c.where);
    EXPECT_NE(r->second.find(c.what), std::string::npos) << r->second;
  }
}

TEST(FailureClassSourceTest, EveryProblemIsReportedUpToABound) {
  std::string vectors;
  for (int i = 0; i < 30; ++i) vectors += std::string(i ? "," : "") + R"({"on": [50], "any": [60]})";
  MessageCapture cap;
  EXPECT_EQ(ParseFailureClassSource(Source(R"({"id": 1, "name": "x", "relayVectors": [)" + vectors + "]}"),
                                    "s", nullptr),
            E_FAULTBOX_CONSISTENCY_CHECK);
  EXPECT_EQ(cap.Count(kMsgFailureClassSourceValue), 51);  // 50 and one that says more were found
}

TEST(FailureClassSourceTest, TextThatIsNoJson) {
  for (const char* text : {"", "{", "{\"version\": \"1\",}", "{} {}", "\xFF"}) {
    SCOPED_TRACE(text);
    MessageCapture cap;
    EXPECT_EQ(ParseFailureClassSource(text, "src.json", nullptr), E_FAULTBOX_CONSISTENCY_CHECK);
    ASSERT_EQ(cap.Numbers(), std::vector<int>{kMsgFailureClassSourceSyntax});
    EXPECT_EQ(cap.records[0].first, "src.json");
    EXPECT_NE(cap.records[0].second.find("line 1"), std::string::npos) << cap.records[0].second;
  }
}

TEST(FailureClassSourceTest, WrittenSourceReadsBackToTheSameFile) {
  QFCKR60FailureClasses classes;
  classes.SetVersion("V\xE4");  // single-byte text from a file written elsewhere
  QFCAbstractFailureClass& a = classes.AddFailureClass();
  a.SetId(1);
  a.SetName("Kurzschlu\xDF");
  a.SetDescription(std::string("with\0zero", 9));
  a.SetUseLimit(3);
  a.SetStoredValue(0, -9);
  QFTPossibility mostlyAny(43, kRelayAny);
  mostlyAny.Set(7, kRelayOn, 4, 5);
  mostlyAny.Set(8, kRelayOff, 0, 0);
  a.AddPossibility(mostlyAny);
  a.AddPossibility(QFTPossibility(3, kRelayOn));
  a.AddPossibility(QFTPossibility(0, 0));
  a.SetSelectedPossibility(2);
  QFCAbstractFailureClass& b = classes.AddFailureClass();
  b.SetId(2);
  b.SetName("plain");

  const std::string text = FailureClassSourceText(classes);
  EXPECT_NE(text.find("\"encoding\": \"latin-1\""), std::string::npos) << text;
  EXPECT_NE(text.find("Kurzschlu\xC3\x9F"), std::string::npos) << text;
  EXPECT_NE(text.find("\"default\": \"any\""), std::string::npos) << text;
  auto back = Parse(text);
  ASSERT_NE(back, nullptr);
  EXPECT_EQ(StoreFailureClasses(*back), StoreFailureClasses(classes));
  EXPECT_EQ(FailureClassSourceText(*back), text);

  // UTF-8 texts stay as they are; a latin-1 source refuses what latin-1 cannot write.
  a.SetName("Kurzschlu\xC3\x9F \xE2\x82\xAC");
  classes.SetVersion("1");
  const std::string utf8 = FailureClassSourceText(classes);
  EXPECT_EQ(utf8.find("encoding"), std::string::npos);
  EXPECT_EQ(StoreFailureClasses(*Parse(utf8)), StoreFailureClasses(classes));
  MessageCapture cap;
  std::string latin = utf8;
  latin.replace(latin.find("\"platform\""), 0, "\"encoding\": \"latin-1\", ");
  EXPECT_EQ(ParseFailureClassSource(latin, "s", nullptr), E_FAULTBOX_CONSISTENCY_CHECK);
  ASSERT_NE(cap.Find(kMsgFailureClassSourceValue), nullptr);
  EXPECT_NE(cap.Find(kMsgFailureClassSourceValue)->second.find("U+20AC"), std::string::npos);

  // Values a source cannot name are written in full and refused on reading.
  classes.GetAt(1)->AddPossibility(QFTPossibility(2, 7));
  const std::string odd = FailureClassSourceText(classes);
  EXPECT_NE(odd.find("\"positions\": [\n"), std::string::npos) << odd;
  EXPECT_EQ(ParseFailureClassSource(odd, "s", nullptr), E_FAULTBOX_CONSISTENCY_CHECK);
}

// The shipped samples: the ID ranges the sample pin files name and realistic
// relay vectors (the command line tests round-trip them).
TEST(FailureClassSourceTest, SampleSets) {
  struct Case {
    const char* file;
    std::int32_t platform;
    std::set<std::int32_t> ids;
  };
  const Case cases[] = {
      {"kr40.json", 1, {1, 2, 3, 4, 5, 6}},
      {"kr80.json", 1, {1, 2, 3}},
      {"kr60.json", 2, {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.file);
    const std::string path = std::string(FAULTBOX_SOURCE_DIR) + "/data/failure-classes/" + c.file;
    auto classes = Parse(test::ReadText(path));
    ASSERT_NE(classes, nullptr);
    EXPECT_EQ(classes->GetPlatform(), c.platform);
    std::set<std::int32_t> ids;
    bool severalVectors = false;
    bool severalSteps = false;
    bool usesExternal = false;
    for (int i = 0; i < classes->GetCount(); ++i) {
      const QFCAbstractFailureClass& fc = *classes->GetAt(i);
      ids.insert(fc.GetId());
      severalVectors |= fc.GetPossibilityCount() > 1;
      for (int j = 0; j < fc.GetPossibilityCount(); ++j) {
        EXPECT_EQ(fc.GetPossibility(j)->Size(), kRelayPositions);
        std::uint64_t mask = 0;
        ASSERT_TRUE(fc.GetRelayMask(j, mask));
        EXPECT_NE(mask & 0x1F, 0u) << "every sample vector switches a relay of the pin";
        EXPECT_TRUE(c.platform != 1 || mask >> 5 == 0) << "KR40 boards have positions 0 to 4 only";
        usesExternal |= (mask >> 5) != 0;
        severalSteps |= fc.GetNumbers(j, 0, true).size() > 1;
      }
    }
    EXPECT_EQ(ids, c.ids);
    EXPECT_EQ(classes->GetCount(), static_cast<int>(c.ids.size()));
    EXPECT_TRUE(severalVectors);
    EXPECT_EQ(severalSteps && usesExternal, c.platform == 2);
  }
}

}  // namespace
}  // namespace faultbox

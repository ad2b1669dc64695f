// The failure class file: writing and reading back, damaged and foreign
// files, and loading with the default paths below NORVIK_ROOT.
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "config/FailureClassLoader.h"
#include "config/FailureClassSource.h"
#include "config/kr40/QFCKR40FailureClasses.h"
#include "config/kr60/QFCKR60FailureClasses.h"
#include "platform/Archive.h"
#include "support/MessageCapture.h"
#include "support/RunProcess.h"

namespace faultbox {
namespace {

using Bytes = std::vector<std::uint8_t>;
using test::MessageCapture;
using test::TempDir;

constexpr const char* kEndOfFileText = "Reached end of file while reading an object";

// A collection with a bit of everything: several texts, stored values, use
// limits, selections, vectors of several lengths and step numbers.
std::unique_ptr<QFCAbstractFailureClasses> Sample(std::int32_t platform) {
  auto classes = QFCAbstractFailureClasses::Create(platform);
  classes->SetVersion("Set 2.1");
  for (int i = 0; i < 3; ++i) {
    QFCAbstractFailureClass& c = classes->AddFailureClass();
    c.SetId(10 + i);
    c.SetName("Class " + std::to_string(i));
    c.SetDescription(i == 1 ? std::string(300, 'd') : "Description");
    c.SetLimitation(i == 2 ? "" : "Limitation");
    c.SetFormat("F" + std::to_string(i));
    c.SetUseLimit(i);
    for (int v = 0; v < 3; ++v) c.SetStoredValue(v, (i + 1) * (v - 1) * 1000);
    for (int p = 0; p <= i; ++p) {
      QFTPossibility vector(p == 2 ? 5 : kRelayPositions, kRelayOff);
      vector.Set(static_cast<std::size_t>(p), kRelayOn, static_cast<std::uint32_t>(p + 1), 2);
      vector.Set(4, kRelayAny, 0, 3);
      c.AddPossibility(vector);
    }
    c.SetSelectedPossibility(i - 1);
    c.TryUse();
  }
  return classes;
}

constexpr const char* kKR40 = "QFCKR40FailureClass";
constexpr const char* kKR60 = "QFCKR60FailureClass";

// Writes files by hand, for files our writer never produces.
struct FileBuilder {
  Archive ar;
  FileBuilder(std::int32_t platform, std::uint32_t classCount) {
    ar.WriteString(QFCAbstractFailureClasses::kFileHeader);
    ar.WriteString("v");
    ar.WriteI32(platform);
    ar.WriteU32(classCount);
  }
  // A class record up to its possibility count.
  FileBuilder& Head(const char* className, std::uint32_t possibilities, std::int32_t selected = -1,
                    std::int32_t id = 1, std::uint16_t schema = 1) {
    ar.WriteObjectStart(className, schema);
    for (int i = 0; i < 3; ++i) ar.WriteString("");
    ar.WriteI32(selected);
    for (int i = 0; i < 4; ++i) ar.WriteI32(0);
    ar.WriteString("n");
    ar.WriteI32(id);
    ar.WriteU32(possibilities);
    return *this;
  }
  FileBuilder& Positions(std::vector<std::uint32_t> states) {
    ar.WriteU32(static_cast<std::uint32_t>(states.size()));
    for (std::uint32_t s : states) {
      ar.WriteU32(0);
      ar.WriteU32(0);
      ar.WriteU32(s);
    }
    return *this;
  }
  FileBuilder& U16(std::uint16_t value) {
    ar.WriteU16(value);
    return *this;
  }
  FileBuilder& U32(std::uint32_t value, int times = 1) {
    for (int i = 0; i < times; ++i) ar.WriteU32(value);
    return *this;
  }
  Bytes Data() const { return ar.Data(); }
};

std::optional<ArchiveCause> CauseOf(const Bytes& bytes, std::int32_t platform) {
  try {
    ReadFailureClasses(bytes, platform);
  } catch (const ArchiveException& e) {
    return e.Cause();
  }
  return std::nullopt;
}

TEST(FailureClassFileTest, WriteAndReadBackGivesTheSameClassesWithUsesAtZero) {
  for (std::int32_t platform : {kFailureClassPlatformKR40, kFailureClassPlatformKR60}) {
    SCOPED_TRACE(platform);
    auto written = Sample(platform);
    const Bytes bytes = StoreFailureClasses(*written);
    for (std::int32_t asPlatform : {platform, 0}) {
      auto read = ReadFailureClasses(bytes, asPlatform);
      ASSERT_NE(read, nullptr);
      // The source form names every stored value, independently of the binary writer.
      EXPECT_EQ(FailureClassSourceText(*read), FailureClassSourceText(*written));
      for (int i = 0; i < read->GetCount(); ++i) {
        EXPECT_STREQ(read->GetAt(i)->GetClassName(), written->GetAt(i)->GetClassName());
        EXPECT_EQ(read->GetAt(i)->GetUseCount(), 0);
      }
      EXPECT_EQ(StoreFailureClasses(*read), bytes);
    }
  }
}

TEST(FailureClassFileTest, EveryTruncationIsAnEndOfFile) {
  const Bytes bytes = StoreFailureClasses(*Sample(kFailureClassPlatformKR60));
  for (std::size_t size = 0; size < bytes.size(); ++size) {
    SCOPED_TRACE(size);
    const Bytes part(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(size));
    EXPECT_EQ(CauseOf(part, kFailureClassPlatformKR60), ArchiveCause::kEndOfFile);
    EXPECT_EQ(CauseOf(part, 0), ArchiveCause::kEndOfFile);
  }
}

TEST(FailureClassFileTest, ReadingMends) {
  // Both class types in one file; a selection past the list and a negative
  // one read as none; a short vector reads its missing positions as 0.
  FileBuilder f(kFailureClassPlatformKR40, 4);
  f.Head(kKR60, 1, 1, 1).Positions({1, 2, 0}).Head(kKR40, 0, -7, 2).Head(kKR60, 1, 0, 3).Positions({});
  f.Head(kKR40, 3, 2, 4).Positions({2}).Positions({2}).Positions({2});

  auto classes = ReadFailureClasses(f.Data(), kFailureClassPlatformKR40);
  ASSERT_EQ(classes->GetCount(), 4);
  EXPECT_STREQ(classes->GetAt(0)->GetClassName(), kKR60);
  EXPECT_STREQ(classes->GetAt(1)->GetClassName(), kKR40);
  std::vector<int> selected;
  for (int i = 0; i < 4; ++i) selected.push_back(classes->GetAt(i)->GetSelectedPossibility());
  EXPECT_EQ(selected, (std::vector<int>{-1, -1, 0, 2}));
  const QFTPossibility& shortVector = *classes->GetAt(0)->GetPossibility(0);
  EXPECT_EQ(shortVector.Size(), 3u);
  EXPECT_EQ(shortVector.RelayState(42), 0u);
  EXPECT_EQ(shortVector.FirstNumber(42), 0u);
  EXPECT_TRUE(classes->GetAt(0)->MatchesStates(0, std::vector<std::uint32_t>{1, 0, 1, 1, 0}));
  EXPECT_FALSE(classes->GetAt(0)->MatchesStates(0, std::vector<std::uint32_t>{0}));
  EXPECT_EQ(classes->GetAt(2)->GetPossibility(0)->Size(), 0u);
}

TEST(FailureClassFileTest, DamagedFilesAreRefusedWithTheirCause) {
  struct Case {
    const char* what;
    Bytes bytes;
    ArchiveCause cause;
  };
  const Case cases[] = {
      // Counts larger than the file can hold.
      {"class count", FileBuilder(2, 0xFFFFFFFFu).Data(), ArchiveCause::kEndOfFile},
      {"possibility count", FileBuilder(2, 1).Head(kKR60, 0x40000000u).Data(), ArchiveCause::kEndOfFile},
      {"position count", FileBuilder(2, 1).Head(kKR60, 1).U32(0x20000000u).U32(0, 30).Data(),
       ArchiveCause::kEndOfFile},
      {"foreign class", FileBuilder(2, 1).Head("QFCOtherClass", 0).Data(), ArchiveCause::kBadClass},
      {"other schema", FileBuilder(2, 1).Head(kKR60, 0, -1, 1, 2).Data(), ArchiveCause::kBadSchema},
      // A class index that was never given.
      {"unknown class index", FileBuilder(2, 1).U16(0x8005).U32(0, 10).Data(), ArchiveCause::kBadIndex},
      // A reference to the first object instead of a new one.
      {"object reference", FileBuilder(2, 2).Head(kKR60, 0).U16(0x0002).U32(0, 10).Data(),
       ArchiveCause::kBadClass},
  };
  for (const Case& c : cases) EXPECT_EQ(CauseOf(c.bytes, 2), c.cause) << c.what;
}

// Sets or clears NORVIK_ROOT for one test and restores it afterwards.
class RootVariable {
 public:
  explicit RootVariable(const char* value) {
    if (const char* old = std::getenv(kFailureClassRootVariable)) old_ = old;
    Set(value);
  }
  ~RootVariable() { Set(old_ ? old_->c_str() : nullptr); }
  static void Set(const char* value) {
    value ? setenv(kFailureClassRootVariable, value, 1) : unsetenv(kFailureClassRootVariable);
  }

 private:
  std::optional<std::string> old_;
};

std::string WriteFile(const TempDir& dir, const std::string& name, const Bytes& bytes) {
  return dir.Write(name, std::string(bytes.begin(), bytes.end()));
}

TEST(FailureClassLoaderTest, ResultsAndMessages) {
  TempDir dir;
  const Bytes kr60 = StoreFailureClasses(*Sample(kFailureClassPlatformKR60));
  const Bytes kr40 = StoreFailureClasses(*Sample(kFailureClassPlatformKR40));
  const std::string good = WriteFile(dir, "good.fcd", kr60);
  const std::string foreign = WriteFile(dir, "kr40.fcd", kr40);
  const std::string truncated = WriteFile(dir, "short.fcd", Bytes(kr60.begin(), kr60.end() - 1));
  const std::string empty = WriteFile(dir, "empty.fcd", {});

  struct Case {
    const char* what;
    std::string file;
    std::int32_t platform;
    HRESULT result;
    int message;  // 0: none
    int messageClass;
    std::string first;
    std::string second;
  };
  const Case cases[] = {
      {"good", good, 2, FAULTBOX_OK, 0, 0, "", ""},
      {"any platform", foreign, 0, FAULTBOX_OK, 0, 0, "", ""},
      {"other platform", foreign, 2, E_FAULTBOX_CONSISTENCY_CHECK, 168, 3, foreign, ""},
      {"other platform, other way", good, 1, E_FAULTBOX_CONSISTENCY_CHECK, 168, 3, good, ""},
      {"truncated", truncated, 2, E_FAULTBOX_CANN_NOT_OPEN_FILE, 81, 0, kEndOfFileText, truncated},
      {"empty", empty, 0, E_FAULTBOX_CANN_NOT_OPEN_FILE, 81, 0, kEndOfFileText, empty},
      {"missing", dir.File("missing.fcd"), 2, E_FAULTBOX_CANN_NOT_OPEN_FILE, 80, 3, dir.File("missing.fcd"),
       ""},
      {"folder", dir.Path(), 2, E_FAULTBOX_CANN_NOT_OPEN_FILE, 80, 3, dir.Path(), ""},
      {"device", "/dev/zero", 2, E_FAULTBOX_CANN_NOT_OPEN_FILE, 80, 3, "/dev/zero", ""},
      {"backslashes", dir.Path() + "\\good.fcd", 2, FAULTBOX_OK, 0, 0, "", ""},
      {"no system platform", good, 3, E_FAULTBOX_CANN_NOT_OPEN_FILE, 35, 0, "304", ""},
      {"\"None\" is a file name, not the default", "None", 2, E_FAULTBOX_CANN_NOT_OPEN_FILE, 80, 3, "None",
       ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    MessageCapture cap;
    std::unique_ptr<QFCAbstractFailureClasses> out = QFCAbstractFailureClasses::Create(2);
    std::string used;
    EXPECT_EQ(LoadFailureClasses(c.file, c.platform, "", &out, &used), c.result);
    EXPECT_EQ(used, c.file);
    // Only a completely read collection of the right platform is handed out.
    EXPECT_EQ(out != nullptr, c.result == FAULTBOX_OK);
    if (c.message == 0) {
      EXPECT_TRUE(cap.records.empty()) << cap.records.front().Text();
      continue;
    }
    ASSERT_EQ(cap.records.size(), 1u);
    EXPECT_EQ(cap.records[0].number, c.message);
    EXPECT_EQ(cap.records[0].errorClass, c.messageClass);
    EXPECT_EQ(cap.records[0].first, c.first);
    EXPECT_EQ(cap.records[0].second, c.second);
  }
}

TEST(FailureClassLoaderTest, DefaultFilesBelowNorvikRoot) {
  TempDir dir;
  const std::string folder = dir.Path() + "/Cockpit/Users/AllUsers";
  std::filesystem::create_directories(folder);
  for (const char* board : {"KR40", "KR80", "KR60"}) {
    auto classes = Sample(board == std::string("KR60") ? 2 : 1);
    classes->SetVersion(board);
    WriteFile(dir, std::string("Cockpit/Users/AllUsers/FailureClasses") + board + ".fcd",
              StoreFailureClasses(*classes));
  }
  RootVariable root(dir.Path().c_str());

  struct Case {
    std::int32_t platform;
    const char* board;
    const char* file;
  };
  const Case cases[] = {
      {2, "KR60", "KR60"}, {2, "KR80", "KR60"},  {1, "KR80", "KR80"}, {1, "KR080", "KR80"},
      {1, "KR40", "KR40"}, {1, "KR040", "KR40"}, {1, "kr80", "KR40"},  // board types compare exactly
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.board);
    MessageCapture cap;
    std::unique_ptr<QFCAbstractFailureClasses> out;
    std::string used;
    ASSERT_EQ(LoadFailureClasses("none", c.platform, c.board, &out, &used), FAULTBOX_OK);
    const std::string expected = dir.Path() + "/Cockpit/Users/AllUsers/FailureClasses" + c.file + ".fcd";
    EXPECT_EQ(used, expected);
    EXPECT_EQ(out->GetVersion(), c.file);
    ASSERT_EQ(cap.records.size(), 1u);
    EXPECT_EQ(cap.records[0].number, 157);
    EXPECT_EQ(cap.records[0].errorClass, 0);
    EXPECT_EQ(cap.records[0].first, expected);
  }
}

TEST(FailureClassLoaderTest, UnsetOrEmptyRootWarnsAndFailsToOpen) {
  // Even a good file called "none" in the working folder is not taken.
  TempDir dir;
  const Bytes kr60 = StoreFailureClasses(*Sample(kFailureClassPlatformKR60));
  WriteFile(dir, "none", kr60);
  const std::filesystem::path previous = std::filesystem::current_path();
  std::filesystem::current_path(dir.Path());
  for (const char* value : {static_cast<const char*>(nullptr), ""}) {
    SCOPED_TRACE(value ? "empty" : "unset");
    RootVariable root(value);
    MessageCapture cap;
    std::unique_ptr<QFCAbstractFailureClasses> out;
    std::string used;
    EXPECT_EQ(LoadFailureClasses("none", 2, "KR60", &out, &used), E_FAULTBOX_CANN_NOT_OPEN_FILE);
    EXPECT_EQ(used, "none");
    EXPECT_EQ(cap.Numbers(), (std::vector<int>{158, 80}));
    EXPECT_EQ(cap.records[0].errorClass, 2);
    EXPECT_EQ(cap.records[1].first, "none");
  }
  std::filesystem::current_path(previous);
}

}  // namespace
}  // namespace faultbox

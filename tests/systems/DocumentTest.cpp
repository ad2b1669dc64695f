// Documents: the stored bytes element by element, save-load-save on both
// platforms, the refusals of opening and saving, the pin file search, and a
// damaged file cut at every byte.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstring>
#include <filesystem>
#include <fstream>

#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "platform/AtomicFile.h"
#include "platform/MessageTable.h"
#include "support/MessageCapture.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"
#include "systems/SystemTestBench.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using test::Bench;
using test::MessageCapture;
using test::PinFile;
using Bytes = std::vector<std::uint8_t>;

Bytes ReadBytes(const std::string& path) {
  auto bytes = ReadWholeFile(path);
  EXPECT_TRUE(bytes.has_value()) << path;
  return bytes ? *bytes : Bytes{};
}

void WriteBytes(const std::string& path, const Bytes& bytes) {
  std::ofstream(path, std::ios::binary)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

// Reads the file elements as the layout defines them, independently of Archive.
class LayoutReader {
 public:
  explicit LayoutReader(const Bytes& bytes) : bytes_(bytes) {}
  std::uint32_t Number() {
    std::uint32_t v = 0;
    for (int i = 0; i < 4; ++i) v |= static_cast<std::uint32_t>(Byte()) << (8 * i);
    return v;
  }
  std::uint8_t Byte() {
    if (pos_ >= bytes_.size()) {
      ADD_FAILURE() << "read past the end";
      return 0;
    }
    return bytes_[pos_++];
  }
  std::string Text() {
    std::size_t length = Byte();
    if (length == 0xFF) {
      length = Byte();
      length |= static_cast<std::size_t>(Byte()) << 8;
      if (length == 0xFFFF) length = Number();
    }
    std::string out;
    for (std::size_t i = 0; i < length; ++i) out += static_cast<char>(Byte());
    return out;
  }
  bool AtEnd() const { return pos_ == bytes_.size(); }

 private:
  const Bytes& bytes_;
  std::size_t pos_ = 0;
};

// A document of the bench's pin file, saved as `name` beside it.
struct SavedDoc {
  QFCSystemAdmin admin;
  std::unique_ptr<QFCFaultboxDoc> doc;
  std::string path;
};

std::unique_ptr<QFCFaultboxDoc> NewDoc(QFCSystemAdmin& admin, const std::string& pinFile,
                                       std::int32_t platform) {
  auto doc = std::make_unique<QFCFaultboxDoc>(admin, platform);
  EXPECT_TRUE(doc->OnNewDocument(pinFile, 1, "Tester", "Rig 7"));
  return doc;
}

TEST(DocumentTest, KindFollowsTheExtension) {
  struct Case {
    const char* path;
    std::int32_t platform;
  } cases[] = {{"/a/b.fss", 1},     {"b.FSA", 2},    {"c:\\x\\y.fsa", 2},
               {"/a/b.fsa.bak", 0}, {"/a.fss/b", 0}, {"", 0}};
  for (const Case& c : cases) EXPECT_EQ(QFCFaultboxDoc::PlatformOfPath(c.path), c.platform) << c.path;
}

// Every element of a small document in the order of the layout: a disabled
// ECU, an empty pattern listed in a folder, and the closing version text.
TEST(DocumentTest, SavedBytesFollowTheLayout) {
  Bench bench;
  const std::string pinFile = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  auto doc = NewDoc(admin, pinFile, 1);
  QFCSystem* system = doc->GetSystem();
  ASSERT_TRUE(system->FindECU("Brake")->SetEnabled(false, false));
  QFCAbstractFailurePattern* pattern = nullptr;
  ASSERT_EQ(system->CreatePattern("Alpha", pattern), FAULTBOX_OK);
  system->GetRootFolder()->CreateChild("Group")->AddPattern(pattern);
  const std::string path = bench.File("doc.fss");
  ASSERT_TRUE(doc->OnSaveDocument(path));
  EXPECT_EQ(system->GetName(), path);
  EXPECT_FALSE(doc->IsModified());

  const Bytes bytes = ReadBytes(path);
  LayoutReader r(bytes);
  EXPECT_EQ(r.Number(), 1u);                            // 1 file version
  EXPECT_EQ(r.Text(), "doc.fss");                       // 2 name, relative to the document
  EXPECT_EQ(r.Text(), "Tester");                        // 3 author
  EXPECT_EQ(r.Text(), "Rig 7");                         // 4 description
  EXPECT_EQ(r.Text(), "bench.csv");                     // 5 pin file, relative to the document
  EXPECT_EQ(r.Number(), 1u);                            // 6 ECU version
  EXPECT_EQ(r.Text(), "kr40.fcd");                      // 7 property part: failure class file,
  for (int i = 0; i < 3; ++i) EXPECT_EQ(r.Text(), "");  // the three spare texts,
  const std::uint32_t columns = r.Number();             // visible pin properties,
  EXPECT_EQ(columns, system->GetVisiblePinProperties().size());
  for (const auto& [column, flag] : system->GetVisiblePinProperties()) {
    EXPECT_EQ(r.Text(), column);
    EXPECT_EQ(r.Number(), static_cast<std::uint32_t>(flag));
  }
  EXPECT_EQ(r.Number(), 1u);    // platform,
  EXPECT_EQ(r.Text(), "COM1");  // port name,
  EXPECT_EQ(r.Number(), 1u);    // port number,
  EXPECT_EQ(r.Number(), 200u);  // device type
  EXPECT_EQ(r.Number(), 1u);    // 8 disabled ECUs
  EXPECT_EQ(r.Text(), "Brake");
  EXPECT_EQ(r.Number(), 1u);  // 9 patterns: view flag, name, pins
  EXPECT_EQ(r.Number(), 0u);
  EXPECT_EQ(r.Text(), "Alpha");
  EXPECT_EQ(r.Number(), 0u);
  EXPECT_EQ(r.Text(), ResourceString(6768));  // 10 root folder: name,
  EXPECT_EQ(r.Number(), 1u);                  // one child: its name, then its record
  EXPECT_EQ(r.Text(), "Group");
  EXPECT_EQ(r.Text(), "Group");
  EXPECT_EQ(r.Number(), 0u);
  EXPECT_EQ(r.Number(), 1u);
  EXPECT_EQ(r.Text(), "Alpha");
  EXPECT_EQ(r.Number(), 0u);                                       // the root's own references
  EXPECT_EQ(r.Text(), "** Failure Simulation File Version 1 **");  // 11
  EXPECT_TRUE(r.AtEnd());
}

// Builds a KR40 document with patterns, PinConfig, chosen classes, folders,
// a disabled ECU and other interface settings.
void BuildKR40(QFCSystem& system) {
  QFCAbstractFailurePattern* alpha = nullptr;
  QFCAbstractFailurePattern* beta = nullptr;
  ASSERT_EQ(system.CreatePattern("Alpha", alpha), FAULTBOX_OK);
  ASSERT_EQ(system.CreatePattern("Beta", beta), FAULTBOX_OK);
  ASSERT_TRUE(alpha->AddPins({system.FindPin("Engine", "P1"), system.FindPin("Engine", "P2")}));
  ASSERT_TRUE(beta->AddPins({system.FindPin("Brake", "P1")}));
  ASSERT_TRUE(alpha->GetPinAt(1)->SetPinConfig(3, 1, true));
  ASSERT_TRUE(system.FindECU("Brake")->SetEnabled(false, false));
  ASSERT_EQ(system.SetInterfaceParameter(200, 3, 0), FAULTBOX_OK);
  auto* group = system.GetRootFolder()->CreateChild("Group");
  group->AddPattern(alpha);
  group->CreateChild("Sub")->AddPattern(beta);
  system.GetRootFolder()->AddPattern(beta);
}

// A KR60 pattern with pins and its external hardware set.
void BuildKR60(QFCSystem& system) {
  QFCAbstractFailurePattern* pattern = nullptr;
  ASSERT_EQ(system.CreatePattern("Short", pattern), FAULTBOX_OK);
  ASSERT_TRUE(pattern->AddPins({system.FindPin("Engine", "P1"), system.FindPin("Gearbox", "P1")}));
  ASSERT_TRUE(pattern->GetPinAt(0)->SetPinConfig(1, 1, true));
  auto* kr60 = dynamic_cast<QFCKR60FailurePattern*>(pattern);
  ASSERT_NE(kr60, nullptr);
  ASSERT_EQ(kr60->SetResistorValue(4711), FAULTBOX_OK);
  ASSERT_TRUE(kr60->SetPotentialChoice("UBATT", QFCKR60FailurePattern::kKindResistor));
  ASSERT_TRUE(kr60->SetPotentialChoice("GND", QFCKR60FailurePattern::kKindMeasurement));
  ASSERT_EQ(system.SetInterfaceParameter(4, 2, 3), FAULTBOX_OK);
  system.GetRootFolder()->AddPattern(pattern);
}

struct RoundTripCase {
  const char* name;
  std::int32_t platform;
  void (*build)(QFCSystem&);
};

class DocumentRoundTripTest : public ::testing::TestWithParam<RoundTripCase> {};

TEST_P(DocumentRoundTripTest, SaveLoadSaveGivesTheSameBytes) {
  const RoundTripCase& c = GetParam();
  Bench bench;
  const std::string pinFile = bench.Write("bench.csv", c.platform == 1 ? PinFile::KR40() : PinFile::KR60());
  const std::string path = bench.File(std::string("doc") + QFCFaultboxDoc::ExtensionOfPlatform(c.platform));
  Bytes first;
  {
    QFCSystemAdmin admin;
    auto doc = NewDoc(admin, pinFile, c.platform);
    c.build(*doc->GetSystem());
    ASSERT_FALSE(::testing::Test::HasFatalFailure());
    ASSERT_TRUE(doc->OnSaveDocument(path));
    first = ReadBytes(path);
  }
  MessageCapture cap;
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, c.platform);
  ASSERT_TRUE(doc.OnOpenDocument(path));
  EXPECT_EQ(cap.Numbers().front(), 155);
  EXPECT_EQ(cap.Numbers().back(), 156);
  EXPECT_EQ(cap.Count(116), 1);
  EXPECT_FALSE(doc.IsModified());
  EXPECT_EQ(doc.GetTitle(), path);
  EXPECT_EQ(admin.GetCount(), 1);
  ASSERT_TRUE(doc.OnSaveDocument(path));
  EXPECT_EQ(ReadBytes(path), first);
  const std::string end = QFCFaultboxDoc::VersionText();
  ASSERT_GE(first.size(), end.size());
  EXPECT_EQ(std::string(first.end() - static_cast<std::ptrdiff_t>(end.size()), first.end()), end);
}

INSTANTIATE_TEST_SUITE_P(Platforms, DocumentRoundTripTest,
                         ::testing::Values(RoundTripCase{"KR40", 1, BuildKR40},
                                           RoundTripCase{"KR60", 2, BuildKR60}),
                         [](const auto& info) { return std::string(info.param.name); });

// A saved KR40 document on the bench: the starting point of the refusals.
class SavedDocumentTest : public ::testing::Test {
 protected:
  void SetUp() override {
    pinFile_ = bench_.Write("bench.csv", PinFile::KR40());
    path_ = bench_.File("doc.fss");
    QFCSystemAdmin admin;
    auto doc = NewDoc(admin, pinFile_, 1);
    BuildKR40(*doc->GetSystem());
    ASSERT_TRUE(doc->OnSaveDocument(path_));
    bytes_ = ReadBytes(path_);
  }

  Bench bench_;
  std::string pinFile_;
  std::string path_;
  Bytes bytes_;
};

TEST_F(SavedDocumentTest, NewerFileVersionIsRefusedAndLeavesNoSystem) {
  Bytes newer = bytes_;
  newer[0] = 2;
  WriteBytes(path_, newer);
  MessageCapture cap;
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, 1);
  EXPECT_FALSE(doc.OnOpenDocument(path_));
  const ErrorRecord* refused = cap.Find(179);
  ASSERT_NE(refused, nullptr);
  EXPECT_EQ(refused->first, path_);
  EXPECT_EQ(refused->second, "2");
  EXPECT_EQ(cap.Count(178), 1);
  EXPECT_EQ(admin.GetCount(), 0);
  EXPECT_EQ(doc.GetSystem(), nullptr);
}

TEST_F(SavedDocumentTest, OpeningAnOpenDocumentAgainOpensNothing) {
  QFCSystemAdmin admin;
  QFCFaultboxDoc first(admin, 1);
  ASSERT_TRUE(first.OnOpenDocument(path_));
  QFCFaultboxDoc second(admin, 1);
  // The same file named another way is the same document.
  EXPECT_FALSE(second.OnOpenDocument(bench_.File("./x/../doc.fss")));
  EXPECT_EQ(second.GetAlreadyOpenSystem(), first.GetSystem());
  EXPECT_EQ(second.GetSystem(), nullptr);
  EXPECT_EQ(admin.GetCount(), 1);
}

TEST_F(SavedDocumentTest, SavingUnderAnotherOpenDocumentsPathFails) {
  QFCSystemAdmin admin;
  QFCFaultboxDoc open(admin, 1);
  ASSERT_TRUE(open.OnOpenDocument(path_));
  auto other = NewDoc(admin, pinFile_, 1);
  const std::string name = other->GetTitle();
  MessageCapture cap;
  EXPECT_FALSE(other->OnSaveDocument(path_));
  ASSERT_NE(cap.Find(88), nullptr);
  EXPECT_EQ(cap.Find(88)->first, path_);
  EXPECT_EQ(other->GetTitle(), name);
  EXPECT_EQ(ReadBytes(path_), bytes_);
}

TEST_F(SavedDocumentTest, WriteProtectedFileIsNotReplaced) {
  ASSERT_EQ(::chmod(path_.c_str(), 0444), 0);
  MessageCapture cap;
  QFCSystemAdmin admin;
  auto doc = NewDoc(admin, pinFile_, 1);
  EXPECT_FALSE(doc->OnSaveDocument(path_));
  ASSERT_NE(cap.Find(118), nullptr);
  EXPECT_EQ(cap.Find(118)->first, path_);
  EXPECT_EQ(ReadBytes(path_), bytes_);
  // Opened, the document refuses every change with the same message.
  QFCFaultboxDoc opened(admin, 1);
  ASSERT_TRUE(opened.OnOpenDocument(path_));
  cap.Clear();
  QFCAbstractFailurePattern* pattern = nullptr;
  EXPECT_NE(opened.GetSystem()->CreatePattern("Gamma", pattern), FAULTBOX_OK);
  EXPECT_FALSE(opened.GetSystem()->RemovePattern("Alpha"));
  EXPECT_EQ(cap.Count(118), 2);
  ::chmod(path_.c_str(), 0644);
}

TEST_F(SavedDocumentTest, FailedWriteKeepsTheOldNameAndNoFile) {
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, 1);
  ASSERT_TRUE(doc.OnOpenDocument(path_));
  MessageCapture cap;
  const std::string nowhere = bench_.File("missing/folder/doc.fss");
  EXPECT_FALSE(doc.OnSaveDocument(nowhere));
  EXPECT_EQ(cap.Count(178), 1);
  EXPECT_EQ(doc.GetTitle(), path_);
  EXPECT_EQ(doc.GetPathName(), path_);
  EXPECT_FALSE(std::filesystem::exists(nowhere));
  // A name of the other kind would never open again as what it holds.
  EXPECT_FALSE(doc.OnSaveDocument(bench_.File("doc.fsa")));
  EXPECT_EQ(cap.Count(49), 1);
}

TEST_F(SavedDocumentTest, KR60DocumentWithKR40PinFileIsRefused) {
  const std::string fsa = bench_.File("doc.fsa");
  WriteBytes(fsa, bytes_);
  MessageCapture cap;
  QFCSystemAdmin admin;
  QFCFaultboxDoc loaded(admin, 2);
  EXPECT_FALSE(loaded.OnOpenDocument(fsa));
  ASSERT_NE(cap.Find(49), nullptr);
  EXPECT_EQ(cap.Find(49)->first, "KR60");
  EXPECT_EQ(admin.GetCount(), 0);

  cap.Clear();
  QFCFaultboxDoc created(admin, 2);
  EXPECT_FALSE(created.OnNewDocument(pinFile_, 1, "", ""));
  ASSERT_NE(cap.Find(49), nullptr);
  EXPECT_EQ(cap.Find(49)->first, "KR60");
  EXPECT_EQ(admin.GetCount(), 0);

  // A file of no document kind is not even read.
  cap.Clear();
  QFCFaultboxDoc noKind(admin, QFCFaultboxDoc::PlatformOfPath(pinFile_));
  EXPECT_FALSE(noKind.OnOpenDocument(pinFile_));
  EXPECT_EQ(cap.Count(49), 1);
  EXPECT_EQ(cap.Count(179), 0);
  EXPECT_EQ(admin.GetCount(), 0);
}

TEST_F(SavedDocumentTest, ClosingIsRefusedWhileAPatternIsActivated) {
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, 1);
  ASSERT_TRUE(doc.OnOpenDocument(path_));
  QFCAbstractFailurePatternPin* pin = doc.GetSystem()->FindPattern("Alpha")->GetPinAt(0);
  pin->SetActivated(true);
  MessageCapture cap;
  EXPECT_FALSE(doc.OnCloseDocument());
  EXPECT_EQ(cap.Count(85), 1);
  EXPECT_FALSE(doc.GetSystem()->RemovePattern("Alpha"));  // its relays would stay switched
  EXPECT_EQ(cap.Count(127), 1);
  EXPECT_EQ(admin.GetCount(), 1);
  pin->SetActivated(false);
  EXPECT_TRUE(doc.OnCloseDocument());
  EXPECT_EQ(cap.Count(117), 1);
  EXPECT_EQ(admin.GetCount(), 0);
  EXPECT_EQ(doc.GetSystem(), nullptr);
}

// Where the pin file is looked for when it is not where the document says,
// and what the document tells about it.
TEST_F(SavedDocumentTest, PinFileIsLookedForBesideTheDocument) {
  // The document moves to another folder; its pin file is copied beside it.
  const std::string moved = bench_.File("moved/doc.fss");
  std::filesystem::create_directories(bench_.File("moved"));
  WriteBytes(moved, bytes_);
  std::filesystem::copy_file(pinFile_, bench_.File("moved/bench.csv"));
  std::filesystem::copy_file(bench_.File("kr40.fcd"), bench_.File("moved/kr40.fcd"));
  MessageCapture cap;
  {
    // Relative to the document: the copy beside it is the pin file, no search.
    QFCSystemAdmin admin;
    QFCFaultboxDoc doc(admin, 1);
    ASSERT_TRUE(doc.OnOpenDocument(moved));
    EXPECT_EQ(doc.GetSystem()->GetPinFilePath(), bench_.File("moved/bench.csv"));
    EXPECT_EQ(cap.Count(46) + cap.Count(64), 0);
    EXPECT_FALSE(doc.IsModified());
  }
  {
    // A stored path that names nothing (written on Windows, with '\') is
    // looked for by its file name in the document's folder.
    Bytes windows = bytes_;
    const std::string stored = "bench.csv", foreign = "C:\\r\\bench.csv";
    auto at = std::search(windows.begin(), windows.end(), stored.begin(), stored.end());
    ASSERT_NE(at, windows.end());
    ASSERT_EQ(*(at - 1), stored.size());
    *(at - 1) = static_cast<std::uint8_t>(foreign.size());
    at = windows.erase(at, at + static_cast<std::ptrdiff_t>(stored.size()));
    windows.insert(at, foreign.begin(), foreign.end());
    WriteBytes(moved, windows);
    cap.Clear();
    QFCSystemAdmin admin;
    QFCFaultboxDoc doc(admin, 1);
    ASSERT_TRUE(doc.OnOpenDocument(moved));
    EXPECT_EQ(cap.Count(46), 1);
    EXPECT_EQ(cap.Count(64), 1);
    EXPECT_TRUE(doc.IsChangedOnLoad());
    EXPECT_TRUE(doc.IsModified());
    EXPECT_EQ(doc.GetSystem()->GetPinFilePath(), bench_.File("moved/bench.csv"));
  }
  {
    // Nowhere to be found: every place tried is named, and nothing stays open.
    std::filesystem::remove(bench_.File("moved/bench.csv"));
    cap.Clear();
    QFCSystemAdmin admin;
    QFCFaultboxDoc doc(admin, 1);
    EXPECT_FALSE(doc.OnOpenDocument(moved));
    EXPECT_EQ(cap.Count(46), 2);
    EXPECT_EQ(cap.Count(83), 1);
    EXPECT_EQ(cap.Count(178), 1);
    EXPECT_EQ(admin.GetCount(), 0);
  }
  {
    // A replacement given by the caller wins over the stored path.
    cap.Clear();
    QFCSystemAdmin admin;
    QFCFaultboxDoc doc(admin, 1);
    doc.SetPinFileReplacement(pinFile_);
    ASSERT_TRUE(doc.OnOpenDocument(moved));
    EXPECT_EQ(cap.Count(64), 1);
    EXPECT_TRUE(doc.GetPinFileReplacement().empty());
    EXPECT_TRUE(doc.IsModified());
  }
}

TEST_F(SavedDocumentTest, WriteProtectedPinFileIsUsable) {
  ASSERT_EQ(::chmod(pinFile_.c_str(), 0444), 0);
  QFCSystemAdmin admin;
  QFCFaultboxDoc doc(admin, 1);
  EXPECT_TRUE(doc.OnOpenDocument(path_));
  EXPECT_FALSE(doc.GetSystem()->IsReadOnly());
  ::chmod(pinFile_.c_str(), 0644);
}

// A file cut short at any byte fails cleanly (before the closing text, which
// loading does not read) and never leaves a system behind.
TEST_F(SavedDocumentTest, TruncatedFileFailsAtEveryByte) {
  const std::size_t body = bytes_.size() - QFCFaultboxDoc::VersionText().size() - 1;
  MessageCapture cap;
  QFCSystemAdmin admin;
  for (std::size_t size = 0; size < body; ++size) {
    QFCFaultboxDoc doc(admin, 1);
    EXPECT_FALSE(
        doc.OpenFromBytes(path_, Bytes(bytes_.begin(), bytes_.begin() + static_cast<std::ptrdiff_t>(size))))
        << size;
    ASSERT_EQ(admin.GetCount(), 0) << size;
  }
  EXPECT_EQ(cap.Count(178), static_cast<int>(body));
}

// A pin file in a tree that shares only "/" with the document stays absolute:
// moving the document alone must not lose it.
TEST(DocumentPathTest, UnrelatedTreesStayAbsolute) {
  Bench bench;
  const std::string pinFile = FAULTBOX_SOURCE_DIR "/data/kr40_bench.csv";
  const std::string docPath = bench.File("doc.fss");
  const auto first = [](const std::string& p) { return p.substr(0, p.find('/', 1)); };
  if (first(pinFile) == first(docPath)) GTEST_SKIP() << "source and temporary folder share a tree";
  ::setenv("NORVIK_ROOT", FAULTBOX_BINARY_DIR "/data/norvik", 1);
  QFCSystemAdmin admin;
  auto doc = NewDoc(admin, pinFile, 1);
  ASSERT_TRUE(doc->OnSaveDocument(docPath));
  const Bytes bytes = ReadBytes(docPath);
  LayoutReader r(bytes);
  r.Number();
  EXPECT_EQ(r.Text(), "doc.fss");
  r.Text();
  r.Text();
  EXPECT_EQ(r.Text(), pinFile);
}

}  // namespace
}  // namespace faultbox

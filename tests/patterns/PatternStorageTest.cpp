// The stored forms of patterns and folders: a round trip that reproduces
// everything and saves again to the same bytes, lost pins kept as
// placeholders, folder records and their limits, and damaged input.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "patterns/PatternTestBench.h"
#include "platform/MessageTable.h"
#include "platform/Archive.h"

namespace faultbox {
namespace {

using test::Config;
using test::MessageCapture;
using test::PatternBench;
using test::PinLine;

using Bytes = std::vector<std::uint8_t>;

std::vector<PinLine> Lines() {
  return {
      {"P1", "Engine", "1,2", "10", "1"}, {"P2", "Engine", "2", "11", "2"}, {"P1", "Brake", "1", "12", "3"}};
}

void AddClasses(PatternBench& bench) {
  bench.AddClass(1, {"00000", "10000"});
  bench.AddClass(2, {"01200"});
}

Bytes Save(PatternBench& bench) {
  Archive ar;
  bench.patterns().Serialize(ar);
  bench.root().Serialize(ar);
  return ar.Data();
}

// Loads into a fresh collection and root, as a freshly opened system has.
void Load(PatternBench& bench, const Bytes& bytes) {
  bench.DropCollection();
  bench.classes()->ResetAllUses();
  bench.MakeCollection();
  Archive ar(bytes);
  bench.patterns().Serialize(ar);
  bench.root().Serialize(ar);
  EXPECT_EQ(ar.Remaining(), 0u);
}

// Alpha (Engine P1 with entry 0 on, Engine P2 with entry 1 on), Beta (Brake
// P1), and folders: root → Group (Alpha, Beta, Alpha) → Sub (Beta); root →
// Empty; root itself lists Beta.
Bytes BuildAndSave(PatternBench& bench) {
  auto* alpha = bench.CreateWith({bench.Pin("Engine", "P1"), bench.Pin("Engine", "P2")}, "Alpha");
  auto* beta = bench.CreateWith({bench.Pin("Brake", "P1")}, "Beta");
  EXPECT_TRUE(alpha->GetPinAt(0)->SetPinConfig(0, 1, true));
  EXPECT_TRUE(alpha->GetPinAt(1)->SetPinConfig(1, 1, true));
  alpha->SetViewOpen(true);
  auto* group = bench.root().CreateChild("Group");
  group->AddPattern(alpha);
  group->AddPattern(beta);
  group->AddPattern(alpha);
  group->CreateChild("Sub")->AddPattern(beta);
  bench.root().CreateChild("Empty");
  bench.root().AddPattern(beta);
  return Save(bench);
}

TEST(PatternStorage, RoundTripReproducesPatternsFoldersAndBytes) {
  PatternBench bench(Lines());
  AddClasses(bench);
  const Bytes first = BuildAndSave(bench);

  MessageCapture cap;
  Load(bench, first);
  EXPECT_TRUE(cap.Numbers().empty());
  auto& patterns = bench.patterns();
  ASSERT_EQ(patterns.GetCount(), 2);
  auto* alpha = patterns.GetAt(0);
  auto* beta = patterns.GetAt(1);
  EXPECT_EQ(alpha->GetName(), "Alpha");
  EXPECT_EQ(beta->GetName(), "Beta");
  EXPECT_EQ(alpha->GetViewFlag(), 1);
  EXPECT_EQ(beta->GetViewFlag(), 0);
  ASSERT_EQ(alpha->GetPinCount(), 2);
  EXPECT_EQ(alpha->GetPinAt(0)->GetPin(), bench.Pin("Engine", "P1"));
  EXPECT_EQ(alpha->GetPinAt(1)->GetPin(), bench.Pin("Engine", "P2"));
  EXPECT_EQ(beta->GetPinAt(0)->GetPin(), bench.Pin("Brake", "P1"));
  // PinConfig is stored; the classes are derived again.
  EXPECT_EQ(Config(alpha->GetPinAt(0)), "10000");
  EXPECT_EQ(alpha->GetPinAt(0)->GetFailureClassId(), 1);
  EXPECT_EQ(alpha->GetPinAt(0)->GetRelayVectorIndex(), 0);  // "don't care" fits an entry that is on
  EXPECT_EQ(Config(alpha->GetPinAt(1)), "01200");
  EXPECT_EQ(alpha->GetPinAt(1)->GetFailureClassId(), 2);
  EXPECT_EQ(beta->GetPinAt(0)->GetFailureClassId(), 1);

  auto& root = bench.root();
  ASSERT_EQ(root.GetChildCount(), 2);
  auto* group = root.GetChildAt(0);
  EXPECT_EQ(group->GetName(), "Group");
  ASSERT_EQ(group->GetPatternCount(), 3);
  EXPECT_EQ(group->GetPatternAt(0), alpha);
  EXPECT_EQ(group->GetPatternAt(1), beta);
  EXPECT_EQ(group->GetPatternAt(2), alpha);
  ASSERT_EQ(group->GetChildCount(), 1);
  EXPECT_EQ(group->GetChildAt(0)->GetName(), "Sub");
  EXPECT_EQ(group->GetChildAt(0)->GetPatternAt(0), beta);
  EXPECT_EQ(root.GetChildAt(1)->GetName(), "Empty");
  EXPECT_EQ(root.GetPatternCount(), 1);

  // The loaded view flag reopens the view once.
  std::vector<std::string> opened;
  patterns.SetViewOpener([&](QFCAbstractFailurePattern& p) {
    opened.push_back(p.GetName());
    p.SetViewOpen(true);
  });
  patterns.OpenSavedViews();
  patterns.OpenSavedViews();
  EXPECT_EQ(opened, std::vector<std::string>{"Alpha"});
  EXPECT_EQ(alpha->GetViewFlag(), -1);

  EXPECT_EQ(Save(bench), first);
}

TEST(PatternStorage, LostPinsAreReportedOnceAndKept) {
  Bytes saved;
  {
    PatternBench original(Lines());
    AddClasses(original);
    saved = BuildAndSave(original);
  }
  // The pin file lost Engine P2 and the whole Brake ECU.
  PatternBench bench({{"P1", "Engine", "1,2", "10", "1"}});
  AddClasses(bench);
  MessageCapture cap;
  Load(bench, saved);
  ASSERT_EQ(cap.Numbers(), (std::vector<int>{140, 140}));
  EXPECT_EQ(cap.records[0].errorClass, 2);
  EXPECT_EQ(cap.records[0].first, "Pin name: P2,ECU name: Engine");
  EXPECT_EQ(cap.records[1].first, "Pin name: P1,ECU name: Brake");
  EXPECT_TRUE(bench.patterns().HasLoadChanges());
  EXPECT_EQ(bench.patterns().GetLostPinsOnLoad(), 2);

  auto* alpha = bench.patterns().FindPattern("Alpha");
  auto* beta = bench.patterns().FindPattern("Beta");
  ASSERT_EQ(alpha->GetPinCount(), 2);
  ASSERT_EQ(beta->GetPinCount(), 1);
  auto* lost = alpha->GetPinAt(1);
  EXPECT_TRUE(alpha->GetPinAt(0)->IsFromPinFile());
  EXPECT_FALSE(lost->IsFromPinFile());
  EXPECT_EQ(lost->GetPinName(), "P2");
  EXPECT_EQ(lost->GetEcuName(), "Engine");
  EXPECT_EQ(Config(lost), "01200");  // stored values, untouched by the interlock
  EXPECT_EQ(lost->GetFailureClassId(), -1);
  EXPECT_FALSE(lost->CanBeActivated());

  cap.Clear();
  EXPECT_EQ(alpha->SetFailureClass(lost, 2, 0), E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{149});
  EXPECT_EQ(cap.records[0].first, "P2");
  EXPECT_EQ(cap.records[0].second, "Engine");

  // Saved again, the placeholders keep their pins' records: the next load
  // finds the same lost pins and the bytes stay the same.
  const Bytes second = Save(bench);
  cap.Clear();
  Load(bench, second);
  EXPECT_EQ(cap.Count(140), 2);
  EXPECT_EQ(Save(bench), second);
}

// Loading restores what was saved: a write-protected document opens.
TEST(PatternStorage, WriteProtectedDocumentLoads) {
  PatternBench bench(Lines());
  AddClasses(bench);
  const Bytes saved = BuildAndSave(bench);
  const std::string document = bench.files().WriteFile("bench.fss", "x");
  bench.system()->SetDocumentPath(document);
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);
  MessageCapture cap;
  Load(bench, saved);
  EXPECT_EQ(cap.Count(118), 0);
  ASSERT_EQ(bench.patterns().GetCount(), 2);
  EXPECT_EQ(Config(bench.patterns().GetAt(0)->GetPinAt(0)), "10000");
  EXPECT_EQ(bench.patterns().GetAt(0)->GetPinAt(0)->GetFailureClassId(), 1);
}

TEST(PatternStorage, PatternThatCannotBeCreatedEndsTheLoad) {
  PatternBench bench(Lines());
  AddClasses(bench);
  const Bytes saved = BuildAndSave(bench);
  bench.DropCollection();
  bench.MakeCollection();
  bench.patterns().refuse = true;
  MessageCapture cap;
  Archive ar(saved);
  EXPECT_THROW(bench.patterns().Serialize(ar), ArchiveException);
  EXPECT_EQ(cap.Count(94), 1);
}

TEST(PatternStorage, EveryTruncationIsAnArchiveException) {
  PatternBench bench(Lines());
  AddClasses(bench);
  const Bytes saved = BuildAndSave(bench);
  MessageCapture cap;  // keeps the lost-pin reports of cut names quiet
  for (std::size_t cut = 0; cut < saved.size(); ++cut) {
    SCOPED_TRACE(cut);
    Bytes part(saved.begin(), saved.begin() + static_cast<std::ptrdiff_t>(cut));
    bench.DropCollection();
    bench.classes()->ResetAllUses();
    bench.MakeCollection();
    Archive ar(part);
    EXPECT_THROW(
        {
          bench.patterns().Serialize(ar);
          bench.root().Serialize(ar);
        },
        ArchiveException);
  }
}

TEST(PatternFolders, ChildNamesAreStoredTwice) {
  PatternBench bench(Lines());
  bench.root().SetName("ignored");
  bench.root().CreateChild("A");
  bench.root().CreateChild("B");
  Archive ar;
  bench.root().Serialize(ar);

  Archive expected;
  expected.WriteString(ResourceText(6768));
  expected.WriteU32(2);
  for (const char* name : {"A", "B"}) {
    expected.WriteString(name);
    expected.WriteString(name);
    expected.WriteU32(0);
    expected.WriteU32(0);
  }
  expected.WriteU32(0);
  EXPECT_EQ(ar.Data(), expected.Data());
}

TEST(PatternFolders, RootNameAndDroppedReferencesOnLoad) {
  PatternBench bench(Lines());
  bench.Create("Known");
  Archive stored;
  stored.WriteString("Stored root name");
  stored.WriteU32(0);
  stored.WriteU32(3);
  stored.WriteString("Gone");
  stored.WriteString("Known");
  stored.WriteString("known");
  Archive ar(stored.Data());
  bench.root().Serialize(ar);
  EXPECT_EQ(bench.root().GetName(), ResourceText(6768));
  ASSERT_EQ(bench.root().GetPatternCount(), 1);
  EXPECT_EQ(bench.root().GetPatternAt(0)->GetName(), "Known");
}

// A chain of `depth` nested folder records.
Bytes Chain(int depth) {
  Archive ar;
  for (int level = 1; level <= depth; ++level) {
    ar.WriteString("F");
    ar.WriteU32(level < depth ? 1 : 0);
    if (level < depth) ar.WriteString("F");
  }
  for (int level = 1; level <= depth; ++level) ar.WriteU32(0);
  return ar.Data();
}

TEST(PatternFolders, NestingIsLimitedTo64Levels) {
  PatternBench bench(Lines());
  {
    Archive ar(Chain(QFCFailurePatternNode::kMaxDepth));
    EXPECT_NO_THROW(bench.root().Serialize(ar));
  }
  {
    Archive ar(Chain(QFCFailurePatternNode::kMaxDepth + 1));
    EXPECT_THROW(bench.root().Serialize(ar), ArchiveException);
  }
  // No deeper tree can be built, so every saved tree loads again.
  QFCFailurePatternNode* node = &bench.root();
  while (QFCFailurePatternNode* child = node->CreateChild("F")) node = child;
  EXPECT_EQ(node->GetDepth(), QFCFailurePatternNode::kMaxDepth);
}

TEST(PatternFolders, DeletingAPatternDropsEveryReference) {
  PatternBench bench(Lines());
  auto* a = bench.Create("A");
  auto* b = bench.Create("B");
  bench.root().AddPattern(a);
  bench.root().AddPattern(b);
  bench.root().AddPattern(a);
  bench.root().CreateChild("X")->CreateChild("Y")->AddPattern(a);
  EXPECT_FALSE(bench.root().AddPattern(nullptr));
  EXPECT_TRUE(bench.patterns().RemovePattern("A"));
  ASSERT_EQ(bench.root().GetPatternCount(), 1);
  EXPECT_EQ(bench.root().GetPatternAt(0), b);
  EXPECT_EQ(bench.root().GetChildAt(0)->GetChildAt(0)->GetPatternCount(), 0);
  EXPECT_FALSE(bench.root().RemovePatternRef(a));
}

}  // namespace
}  // namespace faultbox

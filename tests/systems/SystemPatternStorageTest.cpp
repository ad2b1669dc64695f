// A system's document part with its patterns and folders: a save that loads
// into a freshly opened system and saves again to the same bytes, pins that
// left the pin file marking the system changed, and deactivating everything.
#include <gtest/gtest.h>

#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using test::Bench;
using test::MessageCapture;
using test::PinFile;
using Bytes = std::vector<std::uint8_t>;

QFCSystem* OpenIn(QFCSystemAdmin& admin, const std::string& path) {
  QFCSystem* system = nullptr;
  EXPECT_EQ(admin.Open(path, 1, "", "", system), FAULTBOX_OK);
  return system;
}

QFCAbstractPin* PinOf(QFCSystem& system, const std::string& ecu, const std::string& pin) {
  for (int i = 0; i < system.GetECUCount(); ++i)
    if (system.GetECU(i)->GetName() == ecu) return system.GetECU(i)->FindPin(pin);
  return nullptr;
}

Bytes Save(QFCSystem& system) {
  Archive ar;
  system.Serialize(ar);
  return ar.Data();
}

// Loads into a fresh system opened from the same pin file, as a document does.
QFCSystem* Reload(QFCSystemAdmin& admin, const std::string& path, const Bytes& bytes) {
  QFCSystem* system = OpenIn(admin, path);
  Archive ar(bytes);
  system->Serialize(ar);
  EXPECT_EQ(ar.Remaining(), 0u);
  return system;
}

TEST(SystemPatternStorageTest, PatternsAndFoldersRoundTripToTheSameBytes) {
  Bench bench;
  const std::string path = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  QFCSystem* system = OpenIn(admin, path);
  QFCFailurePatterns* patterns = system->GetFailurePatterns();
  QFCAbstractFailurePattern* alpha = nullptr;
  QFCAbstractFailurePattern* beta = nullptr;
  ASSERT_EQ(patterns->CreatePattern(alpha, "Alpha"), FAULTBOX_OK);
  ASSERT_EQ(patterns->CreatePattern(beta, "Beta"), FAULTBOX_OK);
  ASSERT_TRUE(alpha->AddPins({PinOf(*system, "Engine", "P1"), PinOf(*system, "Engine", "P2")}));
  ASSERT_TRUE(beta->AddPins({PinOf(*system, "Brake", "P1")}));
  alpha->GetPinAt(0)->SetPinConfig(0, 1, true);
  auto* group = system->GetRootFolder()->CreateChild("Group");
  group->AddPattern(alpha);
  group->CreateChild("Sub")->AddPattern(beta);
  system->GetECU(1)->SetEnabled(false, true);
  const Bytes first = Save(*system);

  MessageCapture cap;
  QFCSystem* loaded = Reload(admin, path, first);
  EXPECT_FALSE(loaded->IsChanged());
  ASSERT_EQ(loaded->GetFailurePatterns()->GetCount(), 2);
  EXPECT_EQ(loaded->GetFailurePatterns()->GetAt(0)->GetPinCount(), 2);
  EXPECT_EQ(Save(*loaded), first);
}

TEST(SystemPatternStorageTest, PinsThatLeftThePinFileMarkTheSystemChanged) {
  Bench bench;
  const std::string path = bench.Write("bench.csv", PinFile::KR40());
  QFCSystemAdmin admin;
  QFCSystem* system = OpenIn(admin, path);
  QFCAbstractFailurePattern* alpha = nullptr;
  ASSERT_EQ(system->GetFailurePatterns()->CreatePattern(alpha, "Alpha"), FAULTBOX_OK);
  ASSERT_TRUE(alpha->AddPins({PinOf(*system, "Brake", "P1")}));
  const Bytes saved = Save(*system);

  PinFile shorter = PinFile::KR40();
  shorter.pins.pop_back();  // Brake P1 leaves the pin file
  bench.Write("bench.csv", shorter);
  MessageCapture cap;
  QFCSystem* loaded = Reload(admin, path, saved);
  EXPECT_EQ(cap.Count(140), 1);
  EXPECT_TRUE(loaded->IsChanged());
  EXPECT_EQ(loaded->GetFailurePatterns()->GetAt(0)->GetPinCount(), 1);  // kept as a placeholder
}

TEST(SystemPatternStorageTest, DeactivateAllWithoutConnectionKeepsThePatternActivated) {
  Bench bench;
  QFCSystemAdmin admin;
  QFCSystem* system = OpenIn(admin, bench.Write("bench.csv", PinFile::KR40()));
  QFCAbstractFailurePattern* alpha = nullptr;
  ASSERT_EQ(system->GetFailurePatterns()->CreatePattern(alpha, "Alpha"), FAULTBOX_OK);
  ASSERT_TRUE(alpha->AddPins({PinOf(*system, "Engine", "P1")}));
  alpha->GetPinAt(0)->SetActivated(true);
  EXPECT_TRUE(system->IsPatternActivated());

  MessageCapture cap;
  EXPECT_NE(admin.DeactivateAll(), FAULTBOX_OK);
  EXPECT_TRUE(system->IsPatternActivated());  // nothing could be sent
  EXPECT_EQ(cap.Count(120), 1);
  EXPECT_FALSE(alpha->GetPinAt(0)->IsSelected());
}

}  // namespace
}  // namespace faultbox

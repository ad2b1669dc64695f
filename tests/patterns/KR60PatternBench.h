// A KR60 system opened from a pin file written by the test (potentials
// UBATT, GND, none, none, U5V), with failure classes made in memory and a
// pattern collection whose patterns are real KR60 patterns.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "patterns/QFCKR60FailurePattern.h"
#include "platform/Archive.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"

namespace faultbox::test {

// One KR60 pin line: name, ECU, failure class entries, load module, channels.
struct KR60PinLine {
  std::string pin;
  std::string ecu;
  std::string classes;
  std::string module = "0_1_2";
  std::string channels = "3";
};

// A relay vector of 43 positions: `states` gives the first positions
// ("10200"), `on` further positions that must be on, everything else `rest`.
inline QFTPossibility KR60Vector(const std::string& states, const std::vector<std::size_t>& on = {},
                                 std::uint32_t rest = kRelayOff) {
  QFTPossibility p(kRelayPositions, rest);
  for (std::size_t k = 0; k < states.size(); ++k) p.Set(k, static_cast<std::uint32_t>(states[k] - '0'), 0, 0);
  for (std::size_t k : on) p.Set(k, kRelayOn, 0, 0);
  return p;
}

// PinConfig as a text ("10202") for short assertions.
inline std::string PinConfigText(const QFCAbstractFailurePatternPin* pin) {
  std::string out;
  for (std::uint32_t e : pin->GetPinConfig()) out += static_cast<char>('0' + e);
  return out;
}

class KR60Bench {
 public:
  explicit KR60Bench(const std::vector<KR60PinLine>& lines) {
    PinFile file = PinFile::KR60();
    file.pins.clear();
    for (const auto& l : lines) {
      // As many channels required as the pin lists.
      const auto required = std::count(l.channels.begin(), l.channels.end(), ',') + 1;
      file.pins.push_back(l.pin + ";" + l.ecu + ";" + l.classes + ";" + std::to_string(required) + ";" +
                          l.module + ";" + l.channels);
    }
    path_ = bench_.Write("kr60.csv", file);
    system_ = std::make_unique<QFCSystem>("KR60 bench", path_, 1, "Tester", "Rig");
    EXPECT_EQ(system_->OpenFromPinFile(), FAULTBOX_OK);
    classes()->RemoveAll();
    MakeCollection();
  }
  ~KR60Bench() { DropCollection(); }

  QFCSystem* system() const { return system_.get(); }
  QFCAbstractFailureClasses* classes() const { return system_->GetFailureClasses(); }
  QFCFailurePatterns& patterns() { return *patterns_; }
  const Bench& files() const { return bench_; }

  void MakeCollection() {
    DropCollection();
    patterns_ = std::make_unique<QFCFailurePatterns>(system_.get());
    root_ = std::make_unique<QFCFailurePatternNode>(system_.get(), patterns_.get());
    patterns_->SetRootFolder(root_.get());
  }
  void DropCollection() {
    root_.reset();
    patterns_.reset();
  }

  QFCAbstractFailureClass& AddClass(std::int32_t id, std::vector<QFTPossibility> vectors,
                                    std::int32_t limit = 0) {
    QFCAbstractFailureClass& fc = classes()->AddFailureClass();
    fc.SetId(id);
    fc.SetName("Class " + std::to_string(id));
    fc.SetUseLimit(limit);
    for (auto& v : vectors) fc.AddPossibility(std::move(v));
    return fc;
  }

  QFCAbstractPin* Pin(const std::string& ecu, const std::string& pin) const {
    for (QFCECU* e : system_->GetECUs())
      if (e->GetName() == ecu)
        if (QFCAbstractPin* p = e->FindPin(pin)) return p;
    ADD_FAILURE() << "no pin " << ecu << "/" << pin;
    return nullptr;
  }
  // Every pin of the system, in pin file order.
  std::vector<QFCAbstractPin*> AllPins() const {
    std::vector<QFCAbstractPin*> out;
    for (QFCECU* e : system_->GetECUs())
      for (int i = 0; i < e->GetPinCount(); ++i) out.push_back(e->GetPin(i));
    return out;
  }

  QFCKR60FailurePattern* Create(const std::string& name = "") {
    QFCAbstractFailurePattern* pattern = nullptr;
    EXPECT_EQ(patterns_->CreatePattern(pattern, name), FAULTBOX_OK);
    auto* kr60 = dynamic_cast<QFCKR60FailurePattern*>(pattern);
    EXPECT_NE(kr60, nullptr);
    return kr60;
  }
  QFCKR60FailurePattern* CreateWith(const std::vector<QFCAbstractPin*>& pins, const std::string& name = "") {
    QFCKR60FailurePattern* pattern = Create(name);
    EXPECT_TRUE(pattern->AddPins(pins));
    return pattern;
  }

  std::vector<std::uint8_t> Save() {
    Archive ar;
    patterns_->Serialize(ar);
    return ar.Data();
  }
  // Into a fresh collection, as a freshly opened system has.
  void Load(const std::vector<std::uint8_t>& bytes) {
    DropCollection();
    classes()->ResetAllUses();
    MakeCollection();
    Archive ar(bytes);
    patterns_->Serialize(ar);
    EXPECT_EQ(ar.Remaining(), 0u);
  }

 private:
  Bench bench_;
  std::string path_;
  std::unique_ptr<QFCSystem> system_;
  std::unique_ptr<QFCFailurePatterns> patterns_;
  std::unique_ptr<QFCFailurePatternNode> root_;
};

}  // namespace faultbox::test

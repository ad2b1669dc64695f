// A system opened from a pin file written by the test, with failure classes
// made in memory, a pattern collection and root folder of its own; and for
// the KR40 family stand-ins for the hardware: a transfer interface that
// connects at once and patterns whose message building and sending are
// scripted.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "platform/Archive.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"

namespace faultbox::test {

class TestTransferInterface : public QFCAbstractTransferInterface {
 public:
  using QFCAbstractTransferInterface::QFCAbstractTransferInterface;
  HRESULT Connect(bool connect, std::int32_t, std::int32_t) override {
    connected_ = connect;
    return FAULTBOX_OK;
  }
};

// What the scripted patterns did, shared by all patterns of one collection.
struct TransferLog {
  int builds = 0;
  int transfers = 0;
  bool buildResult = true;
  HRESULT transferResult = FAULTBOX_OK;
  std::vector<std::string> selectedAtTransfer;  // pin names selected when sending
};

class ScriptedKR40Pattern : public QFCKR40FailurePattern {
 public:
  ScriptedKR40Pattern(std::string name, QFCSystem* system, TransferLog* log)
      : QFCKR40FailurePattern(std::move(name), system), log_(log) {}
  bool BuildMessages(QFCMessageList& messages, bool) override {
    ++log_->builds;
    messages.push_back(std::make_unique<QFCAbstractMessage>());
    return log_->buildResult;
  }
  HRESULT TransferMessages(QFCMessageList&, bool) override {
    ++log_->transfers;
    log_->selectedAtTransfer.clear();
    for (const auto& pin : GetPins()->GetList())
      if (pin->IsSelected()) log_->selectedAtTransfer.push_back(pin->GetPinName());
    return log_->transferResult;
  }

 private:
  TransferLog* log_;
};

class ScriptedPatterns : public QFCFailurePatterns {
 public:
  explicit ScriptedPatterns(QFCSystem* system) : QFCFailurePatterns(system) {}
  TransferLog log;
  bool scripted = true;
  bool refuse = false;  // no pattern can be made

 protected:
  std::unique_ptr<QFCAbstractFailurePattern> NewPattern(std::int32_t platformType,
                                                        const std::string& name) override {
    if (refuse) return nullptr;
    if (!scripted) return QFCFailurePatterns::NewPattern(platformType, name);
    return std::make_unique<ScriptedKR40Pattern>(name, GetSystem(), &log);
  }
};

// One pin line: name, ECU, failure class entries, module id (hex), channel.
struct PinLine {
  std::string pin;
  std::string ecu;
  std::string classes;
  std::string module = "10";
  std::string channel = "1";
};

// A relay vector of 43 positions: `states` gives the first positions
// ("21100"), `on` further positions that must be on, everything else `rest`
// (off unless said: the positions of the external hardware).
inline QFTPossibility Vector(const std::string& states, const std::vector<std::size_t>& on = {},
                             std::uint32_t rest = kRelayOff) {
  QFTPossibility p(kRelayPositions, rest);
  for (std::size_t k = 0; k < states.size(); ++k) p.Set(k, static_cast<std::uint32_t>(states[k] - '0'), 0, 0);
  for (std::size_t k : on) p.Set(k, kRelayOn, 0, 0);
  return p;
}

// What every pattern bench has: a system opened from the pin file `file`
// written as `fileName`, its failure classes emptied, and a fresh collection
// of `Patterns` whose patterns are `Pattern`s.
template <class Patterns, class Pattern>
class SystemPatternBench {
 public:
  SystemPatternBench(const std::string& fileName, const PinFile& file, const std::string& systemName) {
    path_ = bench_.Write(fileName, file);
    system_ = std::make_unique<QFCSystem>(systemName, path_, 1, "Tester", "Rig");
    const HRESULT opened = system_->OpenFromPinFile();
    EXPECT_EQ(opened, FAULTBOX_OK);
    classes()->RemoveAll();
    MakeCollection();
  }
  ~SystemPatternBench() { DropCollection(); }

  QFCSystem* system() const { return system_.get(); }
  QFCAbstractFailureClasses* classes() const { return system_->GetFailureClasses(); }
  Patterns& patterns() { return *patterns_; }
  QFCFailurePatternNode& root() { return *root_; }
  const std::string& pinFilePath() const { return path_; }
  const Bench& files() const { return bench_; }

  // A fresh, empty collection and root folder, as a freshly opened system has.
  void MakeCollection() {
    DropCollection();
    patterns_ = std::make_unique<Patterns>(system_.get());
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

  Pattern* Create(const std::string& name = "") {
    QFCAbstractFailurePattern* pattern = nullptr;
    EXPECT_EQ(patterns_->CreatePattern(pattern, name), FAULTBOX_OK);
    if constexpr (std::is_same_v<Pattern, QFCAbstractFailurePattern>) {
      return pattern;
    } else {
      auto* own = dynamic_cast<Pattern*>(pattern);
      EXPECT_NE(own, nullptr);
      return own;
    }
  }
  // A pattern holding the pins, in the order given.
  Pattern* CreateWith(const std::vector<QFCAbstractPin*>& pins, const std::string& name = "") {
    Pattern* pattern = Create(name);
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
  std::unique_ptr<Patterns> patterns_;
  std::unique_ptr<QFCFailurePatternNode> root_;
};

// A KR40-family system whose patterns are scripted.
class PatternBench : public SystemPatternBench<ScriptedPatterns, QFCAbstractFailurePattern> {
 public:
  explicit PatternBench(const std::vector<PinLine>& lines, const std::string& board = "KR40")
      : SystemPatternBench("bench.csv", PinFileOf(lines, board), "Bench") {}

  // Relay vectors as the states of positions 0 to 4 ("21100").
  QFCAbstractFailureClass& AddClass(std::int32_t id, const std::vector<std::string>& vectors,
                                    std::int32_t limit = 0) {
    std::vector<QFTPossibility> possibilities;
    for (const auto& v : vectors) possibilities.push_back(Vector(v));
    return SystemPatternBench::AddClass(id, std::move(possibilities), limit);
  }

  // Connects a stand-in transfer interface and lets every module answer.
  void Connect() {
    system()->AddTransferInterface(std::make_unique<TestTransferInterface>(system()));
    system()->GetTransferInterface()->Connect(true, 0, 0);
    for (QFCAbstractPin* p : AllPins())
      system()->GetRespondingModules().insert(static_cast<std::uint16_t>(p->GetModuleAddress()));
  }

 private:
  static PinFile PinFileOf(const std::vector<PinLine>& lines, const std::string& board) {
    PinFile file = PinFile::KR40(board);
    file.pins.clear();
    for (const auto& l : lines)
      file.pins.push_back(l.pin + ";" + l.ecu + ";" + l.classes + ";" + l.module + ";" + l.channel);
    return file;
  }
};

// PinConfig as a text ("10202") for short assertions.
inline std::string Config(const QFCAbstractFailurePatternPin* pin) {
  std::string out;
  for (std::uint32_t e : pin->GetPinConfig()) out += static_cast<char>('0' + e);
  return out;
}

}  // namespace faultbox::test

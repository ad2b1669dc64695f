// The pins of one failure pattern, in insertion order, and the placeholder
// pins that stand in for pins lost from the pin file.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace faultbox {

class Archive;
class QFCAbstractFailurePattern;
class QFCAbstractFailurePatternPin;
class QFCAbstractPin;

class QFCFailurePatternPins {
 public:
  explicit QFCFailurePatternPins(QFCAbstractFailurePattern* pattern);
  ~QFCFailurePatternPins();
  QFCFailurePatternPins(const QFCFailurePatternPins&) = delete;
  QFCFailurePatternPins& operator=(const QFCFailurePatternPins&) = delete;

  // Adds a pattern pin for `pin` unless the pattern holds it already; either
  // way `out` is the pattern pin. Runs the interlock when asked.
  bool AddPin(QFCAbstractPin* pin, QFCAbstractFailurePatternPin*& out, bool runInterlock);
  // The first pattern pin, in list order, whose names are byte-for-byte equal.
  QFCAbstractFailurePatternPin* FindPin(std::string_view pinName, std::string_view ecuName) const;
  // Takes the listed pattern pins out and destroys them; activated pins stay
  // (message 45, class 2). Pins that held a failure class give back its use.
  bool RemovePins(const std::vector<QFCAbstractFailurePatternPin*>& pins);
  // Destroys every pattern pin and placeholder without giving back uses.
  void RemoveAll();
  // Gives back the uses of the failure classes the pins hold.
  void ReleaseFailureClasses();

  QFCAbstractFailurePatternPin* GetAt(int index) const;
  int GetCount() const { return static_cast<int>(pins_.size()); }
  const std::vector<std::unique_ptr<QFCAbstractFailurePatternPin>>& GetList() const { return pins_; }
  bool Contains(const QFCAbstractFailurePatternPin* pin) const;

  // The pin collection record: count, then per pattern pin its names and
  // record. Loading finds each pin in the system's ECUs or makes a
  // placeholder for it (message 140); `lostPins` counts those.
  void Serialize(Archive& ar, int& lostPins);

 private:
  static std::string Key(std::string_view pinName, std::string_view ecuName);
  void RebuildIndex() const;
  QFCAbstractPin* FindSystemPin(const std::string& pinName, const std::string& ecuName) const;

  QFCAbstractFailurePattern* pattern_;
  std::vector<std::unique_ptr<QFCAbstractFailurePatternPin>> pins_;
  std::vector<std::unique_ptr<QFCAbstractPin>> placeholders_;
  // Names to the first pattern pin of those names, so that adding thousands
  // of pins does not compare every pin with every other. Placeholder pins get
  // their names only after they were added, so the index is rebuilt lazily
  // after loading and removal.
  mutable std::unordered_map<std::string, QFCAbstractFailurePatternPin*> index_;
  mutable bool indexDirty_ = false;
};

}  // namespace faultbox

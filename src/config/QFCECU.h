// An ECU: the named group of pins that share an ECU name, in pin file order,
// with a name index so that a pin is found without walking the list.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "config/QFCAbstractObjectData.h"
#include "config/QFCAbstractPin.h"

namespace faultbox {

class QFCECU : public QFCAbstractObjectData {
 public:
  QFCECU(std::string name, QFCAbstractObjectData* system);
  ~QFCECU() override;

  // Takes the pin and makes this its ECU. Callers check HasPin first: pin
  // names are unique within an ECU. The index knows a pin by the name it had
  // when it was added.
  void AddPin(std::unique_ptr<QFCAbstractPin> pin);
  // AddPin unless the ECU holds a pin of that name already (one lookup
  // instead of two; the loader calls it for every pin line). On refusal the
  // pin stays with the caller.
  bool AddPinIfNew(std::unique_ptr<QFCAbstractPin>& pin);
  bool HasPin(std::string_view pinName) const { return FindPin(pinName) != nullptr; }
  QFCAbstractPin* FindPin(std::string_view pinName) const;
  int GetPinCount() const { return static_cast<int>(pins_.size()); }
  // nullptr outside 0 ... count-1.
  QFCAbstractPin* GetPin(int index) const;
  // True for an ECU without pins.
  bool AreAllPinsPresent() const;

  bool IsEnabled() const { return enabled_; }
  // Refused (false) with message 136 while read-only (unless quiet) and with
  // message 132 when disabling while a pattern is activated.
  bool SetEnabled(bool enabled, bool quiet);

  std::string GetDisplayText() const override { return GetName(); }

 private:
  // The pin-name index: open addressing over (hash, pin), at most half full.
  // Flat slots keep a lookup to about one cache miss, which is what decides
  // the load time of an ECU with a hundred thousand pins.
  struct Slot {
    std::size_t hash = 0;
    QFCAbstractPin* pin = nullptr;
  };
  QFCAbstractPin* Lookup(std::string_view name, std::size_t hash) const;
  void Insert(std::size_t hash, QFCAbstractPin* pin);

  bool enabled_ = true;
  std::vector<std::unique_ptr<QFCAbstractPin>> pins_;
  std::vector<Slot> slots_;
};

}  // namespace faultbox

// The external hardware of one KR60 failure pattern: a fixed list of five
// items (potential, empty item, resistor, measurement, source) addressed by
// item type, the potential choices of the resistor and the measurement, and
// the resistor value.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/QFCExternHardware.h"
#include "platform/ResultCodes.h"

namespace faultbox {

class Archive;

class QFCExternHardwareAdmin {
 public:
  // Endpoint values of Connect's `a` that set one endpoint of a free item to `b`.
  static constexpr std::int32_t kSetEndpointA = 6;
  static constexpr std::int32_t kSetEndpointB = 7;
  // "none" as a potential choice means no potential.
  static constexpr const char* kNoPotentialName = "none";

  QFCExternHardwareAdmin() = default;
  ~QFCExternHardwareAdmin() = default;
  QFCExternHardwareAdmin(const QFCExternHardwareAdmin&) = delete;
  QFCExternHardwareAdmin& operator=(const QFCExternHardwareAdmin&) = delete;

  // Replaces the list with the five items named after the system's five
  // potentials; both potential choices become no potential.
  [[nodiscard]] HRESULT Create(const std::vector<std::string>& potentials);
  void Clear() { items_.clear(); }

  const std::vector<std::unique_ptr<QFCExternHardware>>& GetItems() const { return items_; }
  std::int32_t GetCurrentItem() const { return currentItem_; }
  void SetCurrentItem(std::int32_t index) { currentItem_ = index; }

  // ---- potentials ----
  // The five potential names followed by the text for no potential.
  void GetPotentialNames(std::vector<std::string>& names) const;
  // Kind 2 (resistor) or 3 (measurement). "none" chooses no potential; any
  // other name must be one of the six, else nothing changes (false).
  bool SetPotentialChoice(const std::string& name, std::int32_t kind);
  // Index 0 to 4 chooses that potential, 5 no potential; false otherwise.
  bool SetPotentialChoiceByIndex(int index, std::int32_t kind);
  // The chosen name; "" for another kind.
  std::string GetPotentialChoice(std::int32_t kind) const;
  // The chosen index 0 to 5; -1 for another kind. Unlike FindPotentialIndex
  // of the chosen name this tells apart potentials of equal name.
  int GetPotentialChoiceIndex(std::int32_t kind) const;
  // 0 to 5, or -1 when no potential has exactly that name.
  int FindPotentialIndex(const std::string& name) const;

  // ---- connections ----
  // First frees every item connected between a and b (either way round),
  // then connects the items of `type`: the measurement with `channel` 1 to 4
  // puts `a` on that channel; otherwise a = 6 (7) puts `b` on a free endpoint
  // A (B), and any other `a` connects a free item between a and b. The result
  // is that of the last item of `type`; an item already connected gives false.
  bool Connect(std::int32_t type, std::int32_t channel, std::int32_t a, std::int32_t b);
  // Type 2 or 4: the item's endpoints. Type 3: the measurement's endpoints for
  // a channel up to 0, the channel's endpoint in `a` (and 0 in `b`) for
  // channel 1 to 4, false above 4. Other types: false.
  bool GetConnection(std::int32_t type, std::int32_t channel, std::int32_t& a, std::int32_t& b) const;
  // Type 2, 3 or 4: both endpoints set. Another type is an internal fault.
  bool IsConnected(std::int32_t type) const;
  // The types of the empty item, resistor, measurement and source that are
  // free, in list order.
  void GetFreeTypes(std::vector<std::int32_t>& types) const;
  // The type of the first item connected from a to b (in this order), or 0.
  std::int32_t GetTypeAt(std::int32_t a, std::int32_t b) const;
  // The item type behind a position of the free-item choice: 0 → 2, 2 → 3, 3 → 4, else 0.
  static std::int32_t TypeOfIndex(int index);
  // Frees every item and every measurement channel.
  void DisconnectAll();

  // The resistor's value; range checks are the pattern's.
  std::int32_t GetResistorValue() const { return resistorValue_; }
  void SetResistorValue(std::int32_t value) { resistorValue_ = value; }

  // The pattern stores the settings itself; the list has no stored form.
  void Serialize(Archive&) {}

 private:
  QFCExternHardware* FindItem(std::int32_t type) const;
  // The potential item, or nullptr with an internal fault at `place`.
  QFCExternHardwarePot* PotentialItem(int place) const;

  std::vector<std::unique_ptr<QFCExternHardware>> items_;
  std::int32_t currentItem_ = 0;
  std::int32_t resistorValue_ = 0;
};

}  // namespace faultbox

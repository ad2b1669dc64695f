// The failure pattern of the CAN platform KR60: besides the pins' load channel
// relays it owns the pattern's external hardware (potentials, resistor,
// measurement input, source) and the resistor simulation value, turns a
// failure class choice into those settings, and describes them to the
// interlock as positions 5 to 42 of the requirement vector.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/QFCExternHardwareAdmin.h"
#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

class QFCKR60FailurePattern : public QFCAbstractFailurePattern {
 public:
  // The resistor simulation takes values 0 to 0x1FFFF.
  static constexpr std::int32_t kMaxResistorValue = 0x1FFFF;
  // Kinds of a potential choice, and the external hardware entries that
  // IsEntryUsedByOtherPin asks about (PinConfig entry 0, 1 and 3).
  static constexpr std::int32_t kKindResistor = QFCExternHardware::kResistor;
  static constexpr std::int32_t kKindMeasurement = QFCExternHardware::kMeasurement;
  static constexpr int kEntryZero = 2;
  static constexpr int kEntryOne = 3;
  static constexpr int kEntryThree = 4;

  QFCKR60FailurePattern(std::string name, QFCSystem* system);
  ~QFCKR60FailurePattern() override;

  // ---- platform operations ----
  // Creates the interlock and the external hardware (both potentials "no
  // potential", nothing connected, resistor value 0).
  [[nodiscard]] HRESULT Initialize() override;
  // Clears every PinConfig and the external hardware; false (nothing changes)
  // while a pin is activated or when the document is read-only.
  bool Reset() override;
  // Translates the relay vector's on positions into PinConfig entries and
  // external hardware settings, then lets the interlock derive the class.
  // E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED (message 125) when the interlock
  // does not give the pin a class from those settings.
  [[nodiscard]] HRESULT SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                          std::int32_t relayVectorIndex) override;
  std::unique_ptr<QFCAbstractPin> CreatePlaceholderPin() override;
  std::unique_ptr<QFCAbstractFailurePatternPin> CreatePatternPin() override;
  void ReleaseParts() override;
  // The CAN frames that switch the pins taking part, from a message builder
  // made for the one build (QFCKR60FailurePatternMessages.cpp).
  bool BuildMessages(QFCMessageList& messages, bool activate) override;
  // Destroys every frame of the list.
  void FreeMessages(QFCMessageList& messages) override;
  // Sends the frames step by step over the system's CAN transfer interface
  // (QFCKR60FailurePatternTransfer.cpp): each relay frame awaited alone, then
  // the step's commits by module type, RSIM, LOAD, FIU when activating and
  // FIU, LOAD, RSIM when deactivating, each awaited from the modules of its
  // type that got relay frames in the step. The first failure ends it.
  [[nodiscard]] HRESULT TransferMessages(QFCMessageList& messages, bool activate) override;

  // The pattern record, then the external hardware settings; afterwards the
  // interlock derives every pin's class again.
  void Serialize(Archive& ar) override;

  // ---- external hardware: guarded setters ----
  // Each refuses a read-only document (message 118) and a pattern with an
  // activated pin, and runs the interlock after a change.
  // 0 to 131071, else message 100 and E_FAULTBOX_INVALID_PARAMETER.
  [[nodiscard]] HRESULT SetResistorValue(std::int32_t value);
  // "none" or one of the potential names; kind 2 (resistor) or 3 (measurement).
  bool SetPotentialChoice(const std::string& name, std::int32_t kind);
  // Connects the resistor (2), measurement (3) or source (4) between matrix
  // endpoints a and b (2 to 5; a = 6 or 7 sets only endpoint A or B to b);
  // measurement channel 1 to 4 gets endpoint a (1 to 5); type 0 frees
  // whatever is between a and b. Gives the interlock's result after a change;
  // false when nothing was connected or the values name no matrix setting.
  bool Connect(std::int32_t type, std::int32_t channel, std::int32_t a, std::int32_t b);
  // Both potential choices "no potential" and every item disconnected; not
  // while a pin is activated or the document is read-only.
  void ResetExternalHardware();

  // ---- external hardware: reading ----
  // -1 without external hardware.
  std::int32_t GetResistorValue() const;
  // "" on failure.
  std::string GetPotentialChoice(std::int32_t kind) const;
  // 0 to 5, or -1.
  int FindPotentialIndex(const std::string& name) const;
  bool GetConnection(std::int32_t type, std::int32_t channel, std::int32_t& a, std::int32_t& b) const;
  // Items of type 2, 3 or 4 with both endpoints set.
  bool IsExternHardwareConnected(std::int32_t type) const;
  // For the message builder and the views; changes go through the setters above.
  const QFCExternHardwareAdmin* GetExternHardwareAdmin() const { return externHardware_.get(); }

  // Positions 5 to 42 of `vector` (at least 43 positions) from the external
  // hardware; positions 0 to 4 stay as they are. False for settings that no
  // position describes.
  bool BuildExternalRequirement(std::vector<std::uint32_t>& vector) const;
  // The RSIM relay word: 0x00000000FFFFFFFF without the resistor, else the
  // resistor value's bits with the range relays cleared. False (word
  // unchanged) for a resistor value out of range.
  bool GetRsimRelayState(bool withResistor, std::uint64_t& word) const;

  // The exclusive-entry rule's question: does another pin of the pattern that
  // holds a failure class have PinConfig entry 0 (`entry` 2), 1 (3) or 3 (4) on?
  bool IsEntryUsedByOtherPin(const QFCAbstractFailurePatternPin* pin, int entry) const;
  // False when a pin from the pin file is activated but not selected.
  bool AreAllActivatedPinsSelected() const;

 private:
  // The setters' guards: writable, external hardware present, nothing activated.
  bool CanChangeExternHardware(int place) const;
  // Loads the stored settings into the external hardware; ArchiveException
  // for values no setting can have.
  void LoadExternHardware(Archive& ar);
  void StoreExternHardware(Archive& ar) const;

  std::unique_ptr<QFCExternHardwareAdmin> externHardware_;
};

}  // namespace faultbox

// A pin as one failure pattern holds it: the pin it stands for, its PinConfig,
// selection and activation, and the failure class the interlock gave it.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractObjectData.h"
#include "platform/ResultCodes.h"

namespace faultbox {

class QFCAbstractFailureClass;
class QFCAbstractFailurePattern;
class QFCAbstractPin;

class QFCAbstractFailurePatternPin : public QFCAbstractObjectData {
 public:
  static constexpr int kPinConfigEntries = 5;
  using PinConfig = std::array<std::uint32_t, kPinConfigEntries>;
  // PinConfig entry values.
  static constexpr std::uint32_t kEntryOff = 0;
  static constexpr std::uint32_t kEntryOn = 1;           // switched on by the user
  static constexpr std::uint32_t kEntryUnavailable = 2;  // every candidate forbids it

  explicit QFCAbstractFailurePatternPin(QFCAbstractFailurePattern* pattern);
  ~QFCAbstractFailurePatternPin() override;

  // ---- platform operations ----
  // The pin's own failure class entries (pin file) name the ID.
  virtual bool HasDefinedFailureClass(std::int32_t failureClassId);
  // Takes the first record of the list: stores it, takes a use of the class
  // and sets the failure class text.
  virtual bool SetFailureClass(const std::vector<QFTFoundFailureClass>& found);
  // The class and relay vector the interlock gave the pin, or nullptr
  // (silently when it has none).
  virtual QFCAbstractFailureClass* GetAdjustedFailureClass(std::int32_t& failureClassId,
                                                           std::int32_t& relayVectorIndex);
  virtual void ResetFailureClass();
  virtual bool GetModuleAddress(std::uint32_t& number) const;
  virtual bool GetModuleChannels(std::vector<std::uint32_t>& channels) const;
  virtual bool IsPinConfigAllowed(int index, std::uint32_t value) const;

  // ---- the pin ----
  QFCAbstractPin* GetPin() const { return pin_; }
  void SetPin(QFCAbstractPin* pin) { pin_ = pin; }
  QFCAbstractFailurePattern* GetPattern() const { return pattern_; }
  // From the referenced pin; "" and an internal fault without one.
  std::string GetPinName() const;
  std::string GetEcuName() const;
  // The pin belongs to the current pin file (placeholders do not).
  bool IsFromPinFile() const;
  int GetDefinedFailureClassCount() const;
  [[nodiscard]] HRESULT GetDefinedFailureClassId(int index, std::int32_t& failureClassId) const;
  // The system's classes that the pin's entries name, in entry order.
  bool GetDefinedFailureClasses(std::vector<QFCAbstractFailureClass*>& classes) const;
  // Can be activated, its ECU is there and enabled, it is from the pin file
  // and its module answered the last reset.
  bool IsReadyForActivation() const;
  // Why an activation would leave the pin out now, in words for the user;
  // "" when it is ready.
  std::string GetNotReadyReason() const;

  // ---- flags ----
  bool IsSelected() const { return selected_; }
  void SetSelected(bool selected) { selected_ = selected; }
  bool IsActivated() const { return activated_; }
  void SetActivated(bool activated) { activated_ = activated; }
  bool CanBeActivated() const { return canBeActivated_; }
  void SetCanBeActivated(bool can) { canBeActivated_ = can; }
  bool IsExplicitChoice() const { return explicitChoice_; }
  void SetExplicitChoice(bool explicitChoice) { explicitChoice_ = explicitChoice; }

  // ---- PinConfig ----
  const PinConfig& GetPinConfig() const { return pinConfig_; }
  void GetPinConfig(std::uint32_t& e0, std::uint32_t& e1, std::uint32_t& e2, std::uint32_t& e3,
                    std::uint32_t& e4) const;
  // Stores all five entries without running the interlock.
  void SetPinConfigs(const PinConfig& entries) { pinConfig_ = entries; }
  // One entry switched by the user; runs the interlock for this pin.
  bool SetPinConfig(int index, std::uint32_t value, bool updateViews);
  bool ClearPinConfig();

  // ---- failure class ----
  std::int32_t GetFailureClassId() const { return failureClassId_; }
  std::int32_t GetRelayVectorIndex() const { return relayVectorIndex_; }
  const std::string& GetFailureClassText() const { return failureClassText_; }
  void SetFailureClassText(std::string text) { failureClassText_ = std::move(text); }
  // Why the interlock left the pin without a failure class at its last check.
  enum class Refusal : std::uint8_t {
    kNone,              // it holds one, or was not checked
    kNoneDefined,       // the pin file defines no failure class for it
    kNoneInFile,        // none of them is in the failure class file
    kEntriesForbidden,  // every relay vector forbids an entry switched on
    kBoard,             // the board cannot switch the pin's classes (KR80)
    kUsedUp,            // a fitting class is used as often as its limit allows
    kNothingFits,       // no relay vector fits the requirement
    kSharedEntry,       // the KR60 exclusive-entry rule
  };
  void SetRefusal(Refusal refusal, std::int32_t failureClassId = -1) {
    refusal_ = refusal;
    refusalClassId_ = failureClassId;
  }
  Refusal GetRefusal() const { return refusal_; }
  // The same in words for the user; "" while the pin holds a class.
  std::string GetRefusalReason() const;
  // Gives back the use of the class the pin holds and forgets the class:
  // for a pin that leaves its pattern.
  void ReleaseFailureClass();

 protected:
  // The system's failure classes, or nullptr.
  QFCAbstractFailureClasses* FailureClasses() const;

 private:
  QFCAbstractPin* pin_ = nullptr;
  QFCAbstractFailurePattern* pattern_;
  std::int32_t failureClassId_ = -1;
  std::int32_t relayVectorIndex_ = -1;
  std::string failureClassText_;
  Refusal refusal_ = Refusal::kNone;
  std::int32_t refusalClassId_ = -1;
  bool selected_ = false;
  bool activated_ = false;
  bool canBeActivated_ = false;
  bool explicitChoice_ = false;
  PinConfig pinConfig_{};
};

}  // namespace faultbox

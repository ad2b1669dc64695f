// The platform-independent failure pattern: a named set of pattern pins of one
// system, their selection, PinConfig and failure classes, the interlock that
// derives the classes, and the shared activation sequence.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCAbstractObjectData.h"
#include "platform/ResultCodes.h"
#include "comm/QFCAbstractMessage.h"

namespace faultbox {

class Archive;
class QFCAbstractFailureClass;
class QFCAbstractFailureClasses;
class QFCAbstractFailurePatternPin;
class QFCAbstractFailurePatternSafetyInterlock;
class QFCAbstractPin;
class QFCFailurePatternPins;
class QFCFailurePatterns;
class QFCSystem;

class QFCAbstractFailurePattern : public QFCAbstractObjectData {
 public:
  // Hints the pattern's observers receive.
  enum UpdateHint : int {
    kHintChanged = 10,     // pins, PinConfig or failure classes changed
    kHintPinChanged = 11,  // one pin changed; `extra` is the pattern pin
    kHintActivation = 12,  // activated flags changed
    kHintRenamed = 13,
    kHintObjectGone = 14,  // the pattern is being destroyed
  };
  // What the shared part of Reset did; the platforms decide on it.
  enum class ResetOutcome { kDone, kPinActivated, kReadOnly };

  QFCAbstractFailurePattern(std::string name, QFCSystem* system);
  ~QFCAbstractFailurePattern() override;

  // ---- platform operations ----
  virtual bool Reset();
  // Runs the interlock after a change of `pin` (nullptr: of the pattern).
  virtual bool OnPinChanged(QFCAbstractFailurePatternPin* pin);
  [[nodiscard]] virtual HRESULT Initialize();
  // A fresh pin of the platform that stands in for a pin lost from the pin file.
  virtual std::unique_ptr<QFCAbstractPin> CreatePlaceholderPin();
  // Gives the pin the failure class and relay vector by translating them into
  // the pin's settings and letting the interlock derive the class again.
  [[nodiscard]] virtual HRESULT SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                                  std::int32_t relayVectorIndex);
  // Positions 0 to 4 of `vector` become 1 where the pin's PinConfig entry is 1, else 0.
  virtual bool FillRequirementVector(const QFCAbstractFailurePatternPin* pin,
                                     std::vector<std::uint32_t>& vector);
  // Destroys the interlock, the pins and the platform's other owned objects.
  virtual void ReleaseParts();
  virtual void FreeMessages(QFCMessageList& messages);
  [[nodiscard]] virtual HRESULT TransferMessages(QFCMessageList& messages, bool activate);
  virtual bool BuildMessages(QFCMessageList& messages, bool activate);
  // A new pattern pin of the platform (not yet holding a pin).
  virtual std::unique_ptr<QFCAbstractFailurePatternPin> CreatePatternPin();
  // Whether the system lets the pin take the class. No system rule exists yet,
  // so every class that the pin defines is allowed.
  virtual bool IsFailureClassAllowed(const QFCAbstractFailurePatternPin* pin,
                                     std::int32_t failureClassId) const;

  // The pattern record: view flag, name, pins. Platforms add their part.
  void Serialize(Archive& ar) override;

  // ---- pins ----
  QFCFailurePatternPins* GetPins() const { return pins_.get(); }
  int GetPinCount() const;
  // nullptr and message 43 (class 0) outside 0 ... count-1.
  QFCAbstractFailurePatternPin* GetPinAt(int index) const;
  bool AddPins(const std::vector<QFCAbstractPin*>& pins);
  bool RemovePins(const std::vector<QFCAbstractFailurePatternPin*>& pins);
  void SelectAllPins(bool select);
  void ResetPinConfigs(const std::vector<QFCAbstractFailurePatternPin*>& pins);
  bool ClearAllPinConfigs();

  // ---- activation ----
  [[nodiscard]] HRESULT ActivatePattern(bool activate);
  bool IsAnyPinActivated() const;
  int CountSelectedPins() const;
  bool CanAnyPinBeActivated() const;
  void ClearActivatedFlags();

  // ---- interlock ----
  QFCAbstractFailurePatternSafetyInterlock* GetInterlock() const { return interlock_.get(); }
  bool IsInterlockEnabled() const { return interlockEnabled_; }
  void SetInterlockEnabled(bool enabled) { interlockEnabled_ = enabled; }

  // ---- system ----
  QFCSystem* GetOwnerSystem() const { return system_; }
  // The failure classes of the owning system, or nullptr.
  QFCAbstractFailureClasses* GetFailureClasses() const;
  QFCFailurePatterns* GetCollection() const { return collection_; }
  void SetCollection(QFCFailurePatterns* collection) { collection_ = collection; }
  // The hidden service mode (user mode 2): single-pin checks, no exclusive-entry rule.
  static bool IsServiceMode();

  // Stores the name and marks the document modified.
  void SetName(std::string name);
  // Tells the views of the system and of each of its patterns.
  void UpdateViews(int hint = kHintChanged, void* extra = nullptr);

  // ---- the pattern view ----
  // Set by the front end while a view of this pattern is open.
  void SetViewOpen(bool open) { viewOpen_ = open; }
  bool IsViewOpen() const { return viewOpen_; }
  // 1 or 0 as stored, -1 once the view was reopened after loading.
  std::int32_t GetViewFlag() const { return viewFlag_; }
  // After loading: has the front end reopen the view when one was open at saving.
  void OpenSavedView();

  // Message 118 naming the system when the document is read-only; true when writable.
  bool CheckWritable() const;

 protected:
  // The shared part of Reset.
  ResetOutcome ResetBase();
  // Steps 1 to 9 of choosing a failure class for a pin, shared by the
  // platforms: the refusals with their messages, then the chosen relay
  // vector's mask.
  [[nodiscard]] HRESULT CheckFailureClassChoice(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                                  std::int32_t relayVectorIndex, std::uint64_t& mask);
  // After a failed transfer: the system's hardware reset, so that no relay stays switched.
  void ResetHardwareAfterFailure();
  // The system's transfer interface once it is connected; else nullptr with
  // the failure reported and its code in `result`: an internal fault at
  // `placeMissing` when the system has none, message 120 when it is not
  // connected.
  QFCAbstractTransferInterface* ConnectedTransferInterface(int placeMissing, HRESULT& result) const;
  // The same as the platform's own kind of interface; one of another kind is
  // an internal fault at `placeWrongKind`.
  template <class Interface>
  Interface* ConnectedTransferInterface(int placeMissing, int placeWrongKind, HRESULT& result) const {
    QFCAbstractTransferInterface* transfer = ConnectedTransferInterface(placeMissing, result);
    if (transfer == nullptr) return nullptr;
    auto* own = dynamic_cast<Interface*>(transfer);
    if (own == nullptr) result = InternalFault(placeWrongKind);
    return own;
  }
  // An internal fault at `place`, for a part that is missing or not of the
  // kind it should be; gives E_FAULTBOX_NULL_POINTER.
  [[nodiscard]] static HRESULT InternalFault(int place);

  std::unique_ptr<QFCFailurePatternPins> pins_;
  std::unique_ptr<QFCAbstractFailurePatternSafetyInterlock> interlock_;

 private:
  QFCSystem* system_;
  QFCFailurePatterns* collection_ = nullptr;
  bool interlockEnabled_ = true;
  bool viewOpen_ = false;
  std::int32_t viewFlag_ = 0;
};

}  // namespace faultbox

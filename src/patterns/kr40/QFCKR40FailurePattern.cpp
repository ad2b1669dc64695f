// The KR40 family's pattern: its parts, Reset, the translation of a failure
// class choice into PinConfig entries, and the sending of its serial bytes.
#include "patterns/kr40/QFCKR40FailurePattern.h"

#include "patterns/kr40/QFCSerielleMessageBuilder.h"
#include "comm/QFCSerielleTransferInterface.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/kr40/QFCKR40Pin.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr40/QFCKR40FailurePatternPin.h"
#include "patterns/kr40/QFCKR40FailurePatternSafetyInterlock.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgTimeOut = 69;
constexpr int kMsgClassNotSet = 125;
constexpr int kMsgNotAnswered = 174;

constexpr int kPlaceNoBuilder = 6611;
constexpr int kPlaceNoTransferInterface = 6612;
constexpr int kPlaceNotSerial = 6613;
constexpr int kPlaceNotSerialMessage = 6614;

}  // namespace

QFCKR40FailurePattern::QFCKR40FailurePattern(std::string name, QFCSystem* system)
    : QFCAbstractFailurePattern(std::move(name), system) {}

QFCKR40FailurePattern::~QFCKR40FailurePattern() = default;

HRESULT QFCKR40FailurePattern::Initialize() {
  ReleaseParts();
  if (HRESULT result = QFCAbstractFailurePattern::Initialize(); result != FAULTBOX_OK) return result;
  interlock_ = std::make_unique<QFCKR40FailurePatternSafetyInterlock>(this);
  builder_ = std::make_unique<QFCSerielleMessageBuilder>(this, GetOwnerSystem());
  return FAULTBOX_OK;
}

void QFCKR40FailurePattern::ReleaseParts() {
  QFCAbstractFailurePattern::ReleaseParts();
  builder_.reset();
}

bool QFCKR40FailurePattern::BuildMessages(QFCMessageList& messages, bool activate) {
  if (!builder_) {
    TheReporter().ReportInternalFault(kPlaceNoBuilder);
    return false;
  }
  return builder_->BuildMessages(messages, activate);
}

HRESULT QFCKR40FailurePattern::TransferMessages(QFCMessageList& messages, bool) {
  HRESULT result = FAULTBOX_OK;
  auto* serial = ConnectedTransferInterface<QFCSerielleTransferInterface>(kPlaceNoTransferInterface,
                                                                          kPlaceNotSerial, result);
  if (serial == nullptr) return result;
  // A byte left over from before would be taken for an answer.
  serial->FlushReceiveQueue();

  // The bytes sent since the last answer: an answer is their checksum.
  QFCSerielleMessageMap unanswered;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const auto* message = dynamic_cast<const QFCSerielleMessage*>(messages[i].get());
    if (message == nullptr) return InternalFault(kPlaceNotSerialMessage);
    if ((result = serial->SendByte(message)) != FAULTBOX_OK) return result;
    unanswered[static_cast<std::int32_t>(i)] = message;
    if (!message->ExpectsAnswer()) continue;
    result = serial->WaitForAnswers(unanswered);
    unanswered.clear();
    if (result == E_FAULTBOX_TIME_OUT) TheReporter().ReportError(kMsgTimeOut);
    if (result != FAULTBOX_OK) {
      TheReporter().ReportWarning(kMsgNotAnswered, ModuleAddressText(message->GetModuleAddress()));
      return result;
    }
  }
  return result;
}

bool QFCKR40FailurePattern::Reset() {
  // A read-only document refuses; an activated pin only keeps its settings,
  // and the interlock still runs.
  if (ResetBase() == ResetOutcome::kReadOnly) return false;
  return OnPinChanged(nullptr);
}

HRESULT QFCKR40FailurePattern::SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                                               std::int32_t relayVectorIndex) {
  std::uint64_t mask = 0;
  if (HRESULT result = CheckFailureClassChoice(pin, failureClassId, relayVectorIndex, mask);
      result != FAULTBOX_OK)
    return result;
  pin->SetPinConfigs({0, 0, 0, 0, 0});
  // One entry at a time, as the user would switch them: each switch runs the
  // interlock, which judges the entries switched so far.
  for (int position = 0; position < QFCAbstractFailurePatternPin::kPinConfigEntries; ++position)
    if ((mask >> position) & 1u) pin->SetPinConfig(position, QFCAbstractFailurePatternPin::kEntryOn, false);
  // The interlock may judge the entries otherwise than the class does; a pin
  // it leaves without a class would be left out of every activation.
  std::int32_t id = -1;
  std::int32_t index = -1;
  if (pin->GetAdjustedFailureClass(id, index) == nullptr) {
    TheReporter().ReportError(kMsgClassNotSet);
    return E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED;
  }
  return FAULTBOX_OK;
}

std::unique_ptr<QFCAbstractPin> QFCKR40FailurePattern::CreatePlaceholderPin() {
  QFCSystem* system = GetOwnerSystem();
  return std::make_unique<QFCKR40Pin>(system ? system->GetPlatformType() : fptKR40Platform, system);
}

std::unique_ptr<QFCAbstractFailurePatternPin> QFCKR40FailurePattern::CreatePatternPin() {
  return std::make_unique<QFCKR40FailurePatternPin>(this);
}

void QFCKR40FailurePattern::Serialize(Archive& ar) {
  QFCAbstractFailurePattern::Serialize(ar);
  // Nothing of the platform is stored; the classes are derived, never stored.
  SetInterlockEnabled(true);
  if (interlock_) interlock_->CheckAll();
}

}  // namespace faultbox

// Connecting a system to its hardware, resetting the hardware and learning
// which modules answer; the pins of modules that stay silent are unavailable.
#include <chrono>
#include <cstdio>
#include <limits>
#include <set>
#include <thread>

#include "comm/QFCCANTransferInterface.h"
#include "comm/QFCSerielleTransferInterface.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "config/QFCFSHelper.h"
#include "patterns/QFCFailurePatterns.h"
#include "patterns/kr40/QFCSerielleMessageBuilder.h"
#include "patterns/kr60/QFCCANMessageBuilder.h"
#include "platform/QFCReporter.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox {

namespace {

constexpr int kMsgUnsupportedPlatform = 49;
constexpr int kMsgDisconnectWhileActivated = 85;
constexpr int kMsgResetFinished = 110;
constexpr int kMsgFiuLoadSilent = 113;
constexpr int kMsgNotConnected = 120;
constexpr int kMsgOtherSystemOnSameHil = 145;
constexpr int kMsgRsimLoadSilent = 162;
constexpr int kMsgResetNotAcknowledged = 942;
constexpr int kMsgNoModuleAnswered = 943;

// Places named by internal faults of this file.
constexpr int kPlaceInterfaceNotOfPlatform = 5010;
constexpr int kPlaceResetNotCAN = 5011;
constexpr int kPlaceResetNotSerial = 5012;
constexpr int kPlaceLoadAddressUnreadable = 5013;
constexpr int kPlaceNoHardwareInfo = 5014;

bool InterfaceFitsPlatform(QFCAbstractTransferInterface* transfer, std::int32_t platform) {
  if (platform == fptKR40Platform) return dynamic_cast<QFCSerielleTransferInterface*>(transfer) != nullptr;
  return dynamic_cast<QFCCANTransferInterface*>(transfer) != nullptr;
}

// A module's answer to a frame of this system: answer direction and the
// system's offset. Other benches on the same bus (another offset) and the
// requests of other senders say nothing about this system's modules.
bool IsAnswerOfOwnModule(std::uint32_t identifier, std::uint32_t offset) {
  return (identifier & QFCCANMessage::kDirectionMask) == QFCCANMessage::kDirectionAnswer &&
         ((identifier >> QFCCANMessage::kOffsetShift) & QFCCANMessage::kOffsetBits) ==
             (offset & QFCCANMessage::kOffsetBits) &&
         (identifier & QFCCANMessage::kAddressMask) != 0;
}

// A module that did not answer: its bytes went unheard or it is not fitted.
bool IsSilence(HRESULT result) {
  return result == E_FAULTBOX_TIME_OUT || result == E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING;
}

std::string HexAddress(std::uint32_t address) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%x", address);
  return text;
}

// Enters every module of the system that answered the reset into
// `answered`, and into `reset` those that acknowledged it. Any other answer
// (a refusal, or one that cannot be read) means the module kept its relays:
// it is named, and the result is E_FAIL for a refusal, else
// E_FAULTBOX_RECEIVE_MESSAGE.
[[nodiscard]] HRESULT TakeResetAnswers(const QFCCANReceivedMap& received, std::uint32_t offset,
                         std::set<std::uint16_t>& answered, std::set<std::uint16_t>& reset) {
  HRESULT result = FAULTBOX_OK;
  for (const auto& [identifier, message] : received) {
    if (!IsAnswerOfOwnModule(identifier, offset) || message == nullptr) continue;
    const auto address = static_cast<std::uint16_t>(identifier & QFCCANMessage::kAddressMask);
    answered.insert(address);
    const QFCCANMessage::AnswerStatus status = message->EvaluateAnswer();
    if (status == QFCCANMessage::AnswerStatus::kAccepted) {
      reset.insert(address);
      continue;
    }
    char data[24];
    std::snprintf(data, sizeof data, "0x%016llX", static_cast<unsigned long long>(message->GetData()));
    const char* type = (identifier & QFCCANMessage::kTypeCodeMask) == QFCCANMessage::kTypeCodeFIU    ? "FIU "
                       : (identifier & QFCCANMessage::kTypeCodeMask) == QFCCANMessage::kTypeCodeRSIM ? "RSIM "
                       : (identifier & QFCCANMessage::kTypeCodeMask) == QFCCANMessage::kTypeCodeLOAD ? "LOAD "
                                                                                                     : "";
    TheReporter().ReportError(kMsgResetNotAcknowledged, type + HexAddress(address), data);
    if (result == FAULTBOX_OK || status == QFCCANMessage::AnswerStatus::kRefused)
      result = status == QFCCANMessage::AnswerStatus::kRefused ? E_FAIL : E_FAULTBOX_RECEIVE_MESSAGE;
  }
  return result;
}

}  // namespace

std::int32_t QFCSystem::GetResetCollectionWait() {
  return QFCFSHelper::ReadCountSetting(Settings::kHardwareSection, kResetCollectionWaitKey,
                                       kDefaultResetCollectionWait);
}

// ---- connection ----

HRESULT QFCSystem::SetConnection(bool connect, bool report) {
  if (admin_ != nullptr) {
    if (const QFCSystem* other = admin_->FindOtherSystemOnSameHil(this)) {
      if (report) TheReporter().ReportError(kMsgOtherSystemOnSameHil, other->GetName());
      return E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED;
    }
  }
  if (connect) {
    // Connecting again would reset the hardware under an activated pattern.
    if (connected_) return FAULTBOX_OK;
  } else {
    QFCAbstractFailurePattern* activated = nullptr;
    if (HasActivatedPattern(activated)) {
      if (report) TheReporter().ReportError(kMsgDisconnectWhileActivated, GetName());
      return E_FAULTBOX_DISCONNECT;
    }
  }
  QFCAbstractTransferInterface* transfer = GetTransferInterface();
  if (transfer == nullptr) {
    if (report) TheReporter().ReportError(kMsgNotConnected);
    return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
  }

  HRESULT result = FAULTBOX_OK;
  if (platformType_ != fptKR40Platform && platformType_ != fptKR60Platform) {
    TheReporter().ReportError(kMsgUnsupportedPlatform, std::to_string(platformType_));
    result = E_FAULTBOX;
  } else if (!InterfaceFitsPlatform(transfer, platformType_)) {
    TheReporter().ReportInternalFault(kPlaceInterfaceNotOfPlatform);
    result = E_FAULTBOX_NULL_POINTER;
  } else {
    result = transfer->Connect(connect, 0, 0);
    if (result == FAULTBOX_OK && connect) {
      connected_ = true;
      // A bench that answers badly is reported by the reset; the connection stands.
      (void)ResetHardware();
      if (report) UpdateViews(kUpdateConnection);
      return result;
    }
  }
  // A disconnect, or a connect that failed: nothing of the hardware is known.
  EnterDisconnectedState();
  if (report) UpdateViews(kUpdateConnection);
  return result;
}

void QFCSystem::EnterDisconnectedState() {
  connected_ = false;
  respondingModules_.clear();
  UpdatePinAvailability();
}

void QFCSystem::UpdatePinAvailability() {
  for (QFCECU* ecu : ecus_) {
    if (ecu == nullptr) continue;
    for (int i = 0; i < ecu->GetPinCount(); ++i) {
      QFCAbstractPin* pin = ecu->GetPin(i);
      if (pin == nullptr) continue;
      const std::uint32_t address = pin->GetModuleAddress();
      // An address beyond 16 bits names no module that could have answered.
      const bool available = address <= std::numeric_limits<std::uint16_t>::max() &&
                             respondingModules_.count(static_cast<std::uint16_t>(address)) != 0;
      pin->SetPresent(available);
    }
  }
}

// ---- hardware reset ----

HRESULT QFCSystem::ResetHardware() {
  respondingModules_.clear();
  if (!connected_) return lastResetResult_ = E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
  bool completed = false;
  HRESULT result = FAULTBOX_OK;
  if (platformType_ == fptKR60Platform) {
    result = ResetKR60Hardware(completed);
  } else if (platformType_ == fptKR40Platform) {
    result = ResetKR40Hardware(completed);
  } else {
    TheReporter().ReportError(kMsgUnsupportedPlatform, std::to_string(platformType_));
    return lastResetResult_ = E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  }
  if (completed) {
    // The relays are all off: no pattern holds the hardware any more.
    patterns_->ClearActivatedFlags();
    TheReporter().ReportInfo(kMsgResetFinished);
  }
  lastResetResult_ = result;
  // The map was emptied even when a send failed: the pins must not claim
  // modules that nobody has heard since.
  UpdatePinAvailability();
  UpdateViews(kUpdateReset);
  return result;
}

HRESULT QFCSystem::ResetKR60Hardware(bool& completed) {
  completed = false;
  auto* can = dynamic_cast<QFCCANTransferInterface*>(GetTransferInterface());
  if (can == nullptr) {
    TheReporter().ReportInternalFault(kPlaceResetNotCAN);
    return E_FAULTBOX_NULL_POINTER;
  }
  // An offset that cannot be read (reported) leaves 0: the reset still goes out.
  std::uint32_t offset = 0;
  if (GetLoadAddress("OffsetLoadAddress", offset) != FAULTBOX_OK) offset = 0;

  QFCMessageList messages;
  for (std::uint32_t type : {kModuleLOAD, kModuleFIU, kModuleRSIM})
    QFCCANMessageBuilder::BuildResetMessages(QFCCANMessageBuilder::kResetSelector, type, messages, offset);
  for (std::size_t i = 0; i < messages.size(); ++i) {
    // Frames left from earlier exchanges would pass for answers to this reset.
    const HRESULT sent =
        can->SendMessage(dynamic_cast<const QFCCANMessage*>(messages[i].get()), kPlaceResetNotCAN, i == 0);
    messages[i].reset();
    if (sent != FAULTBOX_OK) return sent;
  }

  // The modules answer a reset in no particular order and without a count
  // known beforehand: they are given a fixed time, then heard all at once.
  std::this_thread::sleep_for(std::chrono::milliseconds(GetResetCollectionWait()));
  QFCCANReceivedMap received;
  HRESULT result = can->Receive(received);
  HRESULT acknowledged = FAULTBOX_OK;
  std::set<std::uint16_t> answered;
  if (result == FAULTBOX_OK) {
    acknowledged = TakeResetAnswers(received, offset, answered, respondingModules_);
    received.clear();

    const QFCAbstractHardwareInfo* info = hardwareInfos_.empty() ? nullptr : hardwareInfos_.front().get();
    if (info == nullptr) {
      TheReporter().ReportInternalFault(kPlaceNoHardwareInfo);
    } else {
      const struct {
        std::string text;
        const char* key;
        int message;
      } loadModules[] = {{info->GetFIULoadModule(), "FIULoadAddress", kMsgFiuLoadSilent},
                         {info->GetRSIMLoadModule(), "RSIMLoadAddress", kMsgRsimLoadSilent}};
      for (const auto& module : loadModules) {
        if (IsModuleNotFitted(module.text)) continue;
        std::uint32_t address = 0;
        result = GetLoadAddress(module.key, address);
        if (result != FAULTBOX_OK) {
          TheReporter().ReportInternalFault(kPlaceLoadAddressUnreadable);
          break;
        }
        // One that answered without acknowledging was named already.
        if (address > std::numeric_limits<std::uint16_t>::max() ||
            answered.count(static_cast<std::uint16_t>(address)) == 0)
          TheReporter().ReportError(module.message, HexAddress(address));
      }
    }
  }
  // A bench that is off, or another bus, looks the same: a reset that
  // nobody heard must not pass for one that switched everything off.
  if (answered.empty()) TheReporter().ReportWarning(kMsgNoModuleAnswered, GetName());
  // A module that kept its relays leaves the patterns as they are.
  completed = acknowledged == FAULTBOX_OK;
  return acknowledged != FAULTBOX_OK ? acknowledged : result;
}

HRESULT QFCSystem::ResetKR40Hardware(bool& completed) {
  completed = false;
  auto* serial = dynamic_cast<QFCSerielleTransferInterface*>(GetTransferInterface());
  if (serial == nullptr) {
    TheReporter().ReportInternalFault(kPlaceResetNotSerial);
    return E_FAULTBOX_NULL_POINTER;
  }
  QFCMessageList messages;
  QFCSerielleMessageBuilder builder(nullptr, this);
  builder.BuildResetMessages(QFCSerielleMessageBuilder::kResetSelector, messages);
  // Protocol B has no answers: every address the reset selects counts.
  const bool answers =
      QFCSerielleMessageBuilder::ProtocolOf(boardType_) == QFCSerielleMessageBuilder::Protocol::kA;

  // A byte left over from before would be taken for an answer.
  serial->FlushReceiveQueue();
  HRESULT result = FAULTBOX_OK;
  bool anyAnswer = false;
  // An answer is the checksum of every byte sent since the previous answer
  // point, so the wait is for all of them, not for the selecting byte alone.
  QFCSerielleMessageMap unanswered;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const auto* message = dynamic_cast<const QFCSerielleMessage*>(messages[i].get());
    if (message == nullptr) {
      TheReporter().ReportInternalFault(kPlaceResetNotSerial);
      return E_FAULTBOX_NULL_POINTER;
    }
    if (HRESULT sent = serial->SendByte(message); sent != FAULTBOX_OK) return sent;
    const auto address = static_cast<std::uint16_t>(message->GetModuleAddress());
    if (!answers) {
      respondingModules_.insert(address);
      continue;
    }
    unanswered[static_cast<std::int32_t>(i)] = message;
    if (!message->ExpectsAnswer()) continue;
    const HRESULT heard = serial->WaitForAnswers(unanswered);
    unanswered.clear();
    if (heard == FAULTBOX_OK) {
      respondingModules_.insert(address);
      anyAnswer = true;
    } else if (!IsSilence(heard)) {
      // The line itself failed; what the modules make of it is unknown.
      result = heard;
    }
  }
  // Most addresses are not fitted and stay silent; only a bench where no
  // module answered at all is a failed exchange.
  if (answers && !anyAnswer && result == FAULTBOX_OK) result = E_FAULTBOX_TIME_OUT;
  completed = true;
  return result;
}

}  // namespace faultbox

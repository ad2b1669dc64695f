// The CAN transfer interface: connecting and disconnecting the channel,
// sending frames, reading the receive queue and checking the modules' answers.
#include "comm/QFCCANTransferInterface.h"
#include "platform/MessageTable.h"

#include <algorithm>
#include <cinttypes>
#include <cstdio>
#include <iterator>
#include <set>

#include "platform/QFCReporter.h"
#include "platform/Settings.h"

namespace faultbox {

namespace {

constexpr int kMsgNotConnected = 54;
constexpr int kMsgNotReleased = 55;
constexpr int kMsgChannelNotOpened = 58;
constexpr int kMsgInitialisedElsewhere = 59;
constexpr int kMsgBusTimingNotSet = 60;
constexpr int kMsgChannelNotSetUp = 61;
constexpr int kMsgConnected = 62;
constexpr int kMsgNothingSent = 65;
constexpr int kMsgReceived = 81;
constexpr int kMsgAnswerInvalid = 101;
constexpr int kMsgDisconnected = 103;
constexpr int kMsgQueueEmpty = 105;
constexpr int kMsgAnswerRefused = 107;
constexpr int kMsgNoAnswer = 108;
constexpr int kMsgLayerNotCreated = 133;
constexpr int kMsgWrongBitRate = 177;
constexpr int kMsgAccessLayer = 190;

constexpr int kPlaceNoMessage = 7201;
constexpr int kPlaceNoEvent = 7202;
constexpr int kPlaceReadQueue = 7203;
constexpr int kPlaceNoExpected = 7204;
constexpr int kPlaceWrongAnswer = 7205;

// The channel description format: name, board, channel.
constexpr int kStringChannelDescription = 40026;

// The access layer's own account of a failed operation.
void ReportLayerFailure(CanResult result) {
  TheReporter().ReportError(kMsgAccessLayer, CanAccess::LastErrorText(), CanResultText(result));
}

std::string Hex(const char* format, std::uint64_t value) {
  char text[24];
  std::snprintf(text, sizeof text, format, value);
  return text;
}

}  // namespace

QFCCANTransferInterface::QFCCANTransferInterface(QFITransferOwner* owner) : QFCAbstractTransferInterface(owner) {
  const CanResult result = CanAccess::Create(&instance_);
  instanceCreated_ = result == CanResult::kOk;
  if (!instanceCreated_) TheReporter().ReportError(kMsgLayerNotCreated, std::to_string(static_cast<int>(result)));
}

QFCCANTransferInterface::~QFCCANTransferInterface() {
  // A destructor cannot pass a failure on; disconnecting reports its own.
  if (connected_) (void)Connect(false, 0, 0);
  if (instanceCreated_) CanAccess::Release(instance_);
}

std::string QFCCANTransferInterface::GetDeviceTypeName(std::uint32_t deviceType) {
  static const char* const kNames[] = {"CAN undefined",    "Vector CANCardX",     "Virtual Vector CANCardX",
                                       "Softing CAN-AC-2", "Peak CAN-USB module", "PS CAN Virtual"};
  if (deviceType < std::size(kNames)) return kNames[deviceType];
  return "CAN device type " + std::to_string(deviceType);
}

std::string QFCCANTransferInterface::GetReceiveEventName() const {
  return receiveEvent_ ? receiveEvent_->Name() : std::string();
}

QFTCANInterfaceSettings QFCCANTransferInterface::ConfiguredChannel() const {
  const QFITransferOwner* system = GetOwnerSystem();
  return system ? system->GetCANSettings() : QFTCANInterfaceSettings{};
}

std::string QFCCANTransferInterface::OwnerName() const {
  const QFITransferOwner* system = GetOwnerSystem();
  return system ? system->GetName() : std::string();
}

// ---------------------------------------------------------------- connecting

HRESULT QFCCANTransferInterface::Connect(bool connect, std::int32_t acceptanceCode,
                                         std::int32_t acceptanceMask) {
  if (!connect) return connected_ ? Disconnect() : FAULTBOX_OK;
  if (connected_) return FAULTBOX_OK;

  acceptanceCode_ = static_cast<std::uint32_t>(acceptanceCode);
  acceptanceMask_ = static_cast<std::uint32_t>(acceptanceMask);
  // Read once per connect: a pass of an answer wait must not read a file.
  reportReceived_ = Settings::GetString(Settings::kComponentSection, "Info").value_or("") == "1";

  receiveEvent_ = NamedEvent::CreateFirstFree(kCanReceiveEventFormat);
  if (!receiveEvent_ || !SetUpChannel()) {
    ReleaseChannel();
    TheReporter().ReportError(kMsgChannelNotSetUp);
    return E_FAIL;
  }
  if (const CanResult result = CanAccess::ActivateChannel(channel_); result != CanResult::kOk) {
    ReportLayerFailure(result);
    TheReporter().ReportError(kMsgChannelNotOpened);
    ReleaseChannel();
    TheReporter().ReportError(kMsgChannelNotSetUp);
    return E_FAIL;
  }
  connected_ = true;
  TheReporter().ReportInfo(kMsgConnected);
  return FAULTBOX_OK;
}

bool QFCCANTransferInterface::FindConfiguredChannel(const QFTCANInterfaceSettings& configured) {
  std::vector<QFTCANInterfaceSettings> available;
  std::uint32_t count = 0;
  if (GetAvailableChannels(available, count) != FAULTBOX_OK || count == 0) {
    TheReporter().ReportError(kMsgChannelNotOpened);
    return false;
  }
  for (const QFTCANInterfaceSettings& channel : available) {
    if (channel.deviceType != configured.deviceType || channel.firstParameter != configured.firstParameter ||
        channel.secondParameter != configured.secondParameter)
      continue;
    QFITransferOwner* system = GetOwnerSystem();
    QFTCANInterfaceSettings updated = configured;
    std::copy(std::begin(channel.furtherValues), std::end(channel.furtherValues), updated.furtherValues);
    // The values are only carried along; a write-protected document keeps
    // its old ones rather than refusing the connect.
    if (system && !system->IsReadOnly() &&
        !std::equal(std::begin(updated.furtherValues), std::end(updated.furtherValues),
                    std::begin(configured.furtherValues)))
      system->SetCANSettings(&updated);
    break;
  }
  return true;
}

bool QFCCANTransferInterface::SetUpChannel() {
  const QFTCANInterfaceSettings configured = ConfiguredChannel();
  const QFITransferOwner* owner = GetOwnerSystem();
  const std::string route = owner ? owner->GetHardwareRoute() : std::string();
  // A system tied to its own bench never looks at the channel table.
  if (route.empty() && !FindConfiguredChannel(configured)) return false;

  CanResult result = route.empty()
                         ? CanAccess::RegisterInterface(configured.deviceType, configured.firstParameter,
                                                        configured.secondParameter, &channel_)
                         : CanAccess::RegisterInterfaceTarget(route, &channel_);
  if (result != CanResult::kOk) {
    ReportLayerFailure(result);
    TheReporter().ReportError(kMsgChannelNotOpened);
    return false;
  }
  registered_ = true;

  initAccess_ = 0;
  if ((result = CanAccess::InitInterface(channel_, 2, kQueueSize, &initAccess_)) != CanResult::kOk) {
    ReportLayerFailure(result);
    return false;
  }
  if (initAccess_ == 1) {
    std::uint32_t busTiming0 = kDefaultCanBusTiming0;
    std::uint32_t busTiming1 = kDefaultCanBusTiming1;
    if (const QFITransferOwner* system = GetOwnerSystem()) system->GetBusTiming(busTiming0, busTiming1);
    if ((result = CanAccess::SetBusTimingRegister(channel_, busTiming0, busTiming1)) != CanResult::kOk) {
      ReportLayerFailure(result);
      TheReporter().ReportError(kMsgBusTimingNotSet, OwnerName());
      return false;
    }
  } else {
    // Someone else set the bus up: it is used as it is, but only at the
    // modules' bit rate.
    TheReporter().ReportWarning(kMsgInitialisedElsewhere, OwnerName());
    CanBaudrateInfo info;
    if ((result = CanAccess::GetCurrentBaudrate(channel_, &info)) != CanResult::kOk) {
      ReportLayerFailure(result);
      return false;
    }
    if (info.bitRate != kRequiredBitRate) {
      TheReporter().ReportError(kMsgWrongBitRate, std::to_string(info.bitRate));
      return false;
    }
  }
  if ((result = CanAccess::SetAcceptance(channel_, kStandardAcceptance, kStandardAcceptance, acceptanceCode_,
                                         acceptanceMask_)) != CanResult::kOk ||
      (result = CanAccess::SetEventNotification(channel_, receiveEvent_, 1)) != CanResult::kOk) {
    ReportLayerFailure(result);
    return false;
  }
  channelDescription_ = ResourceText(
      kStringChannelDescription,
      {GetDeviceTypeName(configured.deviceType), std::to_string(configured.firstParameter),
       std::to_string(configured.secondParameter)});
  return true;
}

void QFCCANTransferInterface::ReleaseChannel() {
  if (registered_) CanAccess::UnRegisterInterface(channel_);
  registered_ = false;
  channel_ = 0;
  receiveEvent_.reset();
}

HRESULT QFCCANTransferInterface::Disconnect() {
  connected_ = false;
  receiveEvent_.reset();
  HRESULT outcome = FAULTBOX_OK;
  if (const CanResult result = CanAccess::DeactivateChannel(channel_); result != CanResult::kOk) {
    ReportLayerFailure(result);
    TheReporter().ReportError(kMsgChannelNotOpened);
    outcome = E_FAIL;
  }
  // Released even when it could not be deactivated: a channel kept
  // registered would hold the bus for nobody.
  const CanResult result = CanAccess::UnRegisterInterface(channel_);
  registered_ = false;
  channel_ = 0;
  if (result != CanResult::kOk) {
    ReportLayerFailure(result);
    TheReporter().ReportError(kMsgNotReleased);
    return E_FAIL;
  }
  if (outcome == FAULTBOX_OK) TheReporter().ReportInfo(kMsgDisconnected);
  return outcome;
}

HRESULT QFCCANTransferInterface::GetAvailableChannels(std::vector<QFTCANInterfaceSettings>& channels,
                                                      std::uint32_t& count) {
  channels.clear();
  count = 0;
  std::uint32_t available = 0;
  CanResult result = CanAccess::GetAvailableChannels(&available, nullptr);
  if (result == CanResult::kOk && available > 0) {
    channels.resize(available);
    result = CanAccess::GetAvailableChannels(&available, channels.data());
  }
  if (result != CanResult::kOk) {
    ReportLayerFailure(result);
    channels.clear();
    return E_FAIL;
  }
  // A channel may have gone between the two calls.
  channels.resize(available);
  count = available;
  return FAULTBOX_OK;
}

// ---------------------------------------------------------------- sending and receiving

void QFCCANTransferInterface::FlushReceiveQueue() {
  if (!registered_) return;
  // The signal of a dropped frame would otherwise wake the next wait for nothing.
  if (receiveEvent_) receiveEvent_->Reset();
  if (const CanResult result = CanAccess::FlushReceiveQueue(channel_); result != CanResult::kOk)
    ReportLayerFailure(result);
}

HRESULT QFCCANTransferInterface::SendMessage(const QFCCANMessage* message, std::int32_t errorContext,
                                             bool flushFirst) {
  if (message == nullptr) {
    TheReporter().ReportInternalFault(errorContext != 0 ? errorContext : kPlaceNoMessage);
    return E_FAULTBOX_NULL_POINTER;
  }
  if (!connected_) {
    TheReporter().ReportError(kMsgNotConnected);
    return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
  }
  if (flushFirst) FlushReceiveQueue();

  CanFrameRecord frame;
  frame.frameType = kCanFrameData;
  frame.flags = kCanFlagExtended;
  frame.identifier = message->GetIdentifier();
  frame.length = QFCCANMessage::kDataBytes;
  const auto bytes = message->GetDataBytes();
  std::copy(bytes.begin(), bytes.end(), frame.data);
  frame.options = 4;
  if (const CanResult result = CanAccess::TransmitMessage(channel_, frame); result != CanResult::kOk) {
    // The frame never reached the bus: the module will not answer, and
    // whoever sent it must know.
    ReportLayerFailure(result);
    return E_FAULTBOX_MSG_WAS_NOT_TRANSMITED;
  }
  return FAULTBOX_OK;
}

HRESULT QFCCANTransferInterface::Receive(QFCCANReceivedMap& received) {
  received.clear();
  if (!receiveEvent_ || !registered_) {
    TheReporter().ReportInternalFault(kPlaceNoEvent);
    return E_FAIL;
  }
  if (receiveEvent_->Wait(kPassDuration) == NamedEvent::WaitResult::kTimedOut) return E_FAULTBOX_TIME_OUT;
  // Every frame queued so far is read below; a signal it set after the
  // wait would only wake the next wait for an empty queue.
  receiveEvent_->Reset();

  frames_.resize(kReceiveRoom);
  std::uint32_t count = kReceiveRoom;
  if (const CanResult result = CanAccess::ReadReceiveQueue(channel_, frames_.data(), &count);
      result != CanResult::kOk) {
    ReportLayerFailure(result);
    TheReporter().ReportInternalFault(kPlaceReadQueue);
    return E_FAIL;
  }
  // More may wait in the queue: the next read must not wait for a new frame.
  if (count == kReceiveRoom) receiveEvent_->Set();
  if (count == 0) TheReporter().ReportInternal(kMsgQueueEmpty);

  int data = 0, error = 0, busStatus = 0, remote = 0, unknown = 0;
  for (std::uint32_t i = 0; i < count; ++i) {
    const CanFrameRecord& frame = frames_[i];
    switch (frame.frameType) {
      case kCanFrameData:
        ++data;
        received[frame.identifier] = QFCCANMessage::FromFrame(frame.identifier, frame.data, frame.length);
        break;
      case kCanFrameError:
        ++error;
        break;
      case kCanFrameBusStatus:
        ++busStatus;
        break;
      case kCanFrameRemote:
        ++remote;
        break;
      default:
        ++unknown;
        break;
    }
  }
  if (reportReceived_) {
    char text[200];
    std::snprintf(
        text, sizeof text,
        "Received Messages: %i (Data msg: %i, Error msg: %i, BUS status Msg: %i, Remote msg: %i, Unknow "
        "msg: %i)",
        static_cast<int>(count), data, error, busStatus, remote, unknown);
    TheReporter().ReportInternal(kMsgReceived, text);
  }
  return FAULTBOX_OK;
}

// ---------------------------------------------------------------- answers

HRESULT QFCCANTransferInterface::EvaluateAnswer(const QFCCANMessage& answer,
                                                const QFCCANMessage& expected) const {
  if (answer.GetIdentifier() != expected.GetAnswerIdentifier()) {
    TheReporter().ReportInternalFault(kPlaceWrongAnswer);
    return E_FAULTBOX_RECEIVE_MESSAGE;
  }
  const std::uint64_t masked = answer.GetData() & QFCCANMessage::kAnswerMask;
  switch (answer.EvaluateAnswer()) {
    case QFCCANMessage::AnswerStatus::kAccepted:
      return FAULTBOX_OK;
    case QFCCANMessage::AnswerStatus::kRefused:
      TheReporter().ReportError(kMsgAnswerRefused, Hex("0x%" PRIx64, answer.GetModuleAddress()),
                           Hex("0x%" PRIx64, masked));
      return E_FAIL;
    case QFCCANMessage::AnswerStatus::kInvalid:
      break;
  }
  TheReporter().ReportError(kMsgAnswerInvalid, Hex("0x%" PRIx64, answer.GetModuleAddress()),
                       Hex("0x%" PRIx64, masked));
  return E_FAULTBOX_RECEIVE_MESSAGE;
}

HRESULT QFCCANTransferInterface::WaitForAnswers(const QFCCANExpectedMap& expected) {
  if (expected.empty()) {
    TheReporter().ReportInternal(kMsgNothingSent);
    return E_FAULTBOX_MSG_WAS_NOT_TRANSMITED;
  }
  for (const auto& entry : expected) {
    if (entry.second == nullptr) {
      TheReporter().ReportInternalFault(kPlaceNoExpected);
      return E_FAULTBOX_EVALUATE_MESSAGE;
    }
  }

  std::set<std::uint32_t> unanswered;
  for (const auto& entry : expected) unanswered.insert(entry.first);
  const std::int32_t passes = GetAnswerTimeout();
  // No pass at all hears nothing, as a silent bus does.
  bool lastPassTimedOut = true;
  QFCCANReceivedMap received;
  for (std::int32_t pass = 0; pass < passes; ++pass) {
    const HRESULT result = Receive(received);
    if (result != FAULTBOX_OK && result != E_FAULTBOX_TIME_OUT) return result;
    lastPassTimedOut = result == E_FAULTBOX_TIME_OUT;
    for (auto it = unanswered.begin(); it != unanswered.end() && !received.empty();) {
      const QFCCANMessage& request = *expected.at(*it);
      const auto answer = received.find(request.GetAnswerIdentifier());
      if (answer == received.end()) {
        ++it;
        continue;
      }
      if (const HRESULT evaluation = EvaluateAnswer(*answer->second, request); evaluation != FAULTBOX_OK)
        return evaluation;
      it = unanswered.erase(it);
    }
    if (unanswered.empty()) return FAULTBOX_OK;
  }
  if (lastPassTimedOut) return E_FAULTBOX_TIME_OUT;
  for (std::uint32_t request : unanswered)
    TheReporter().ReportError(kMsgNoAnswer, Hex("%" PRIX64, expected.at(request)->GetModuleAddress()));
  return E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING;
}

}  // namespace faultbox

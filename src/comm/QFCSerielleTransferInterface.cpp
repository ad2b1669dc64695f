// The serial transfer interface: connecting, sending bytes and waiting for
// the modules' checksum answers.
#include "comm/QFCSerielleTransferInterface.h"

#include <array>

#include "platform/QFCReporter.h"

namespace faultbox {

namespace {

constexpr int kMsgNotConnected = 54;
constexpr int kMsgConnected = 62;
constexpr int kMsgNothingSent = 65;
constexpr int kMsgDisconnected = 103;
constexpr int kMsgSetupFailed = 171;
constexpr int kMsgSettingsFailed = 172;
constexpr int kMsgCannotOpen = 173;

constexpr int kPlaceSetup = 7651;
constexpr int kPlaceNoMessage = 7652;
constexpr int kPlaceWrite = 7654;
constexpr int kPlaceQuery = 7655;
constexpr int kPlaceRead = 7656;
constexpr int kPlaceNoSentMessage = 7657;
constexpr int kPlaceWaitRead = 7658;
constexpr int kPlaceWaitPort = 7659;

using Clock = std::chrono::steady_clock;

}  // namespace

QFCSerielleTransferInterface::QFCSerielleTransferInterface(QFITransferOwner* owner)
    : QFCAbstractTransferInterface(owner) {}

QFCSerielleTransferInterface::~QFCSerielleTransferInterface() {
  // A destructor cannot pass a failure on; disconnecting reports its own.
  if (connected_) (void)Connect(false, 0, 0);
}

std::string QFCSerielleTransferInterface::GetPortName() const {
  const QFITransferOwner* system = GetOwnerSystem();
  return system ? system->GetSerialSettings().portName : std::string();
}

void QFCSerielleTransferInterface::ReportPortFault(int place) const {
  TheReporter().ReportInternal(QFCReporter::kInternalFault, std::to_string(place), port_.DescribeLastError());
}

HRESULT QFCSerielleTransferInterface::Connect(bool connect, std::int32_t, std::int32_t) {
  if (!connect) {
    if (!connected_ && !port_.IsOpen()) return FAULTBOX_OK;
    port_.Close();
    connected_ = false;
    TheReporter().ReportInfo(kMsgDisconnected);
    return FAULTBOX_OK;
  }
  if (connected_) return FAULTBOX_OK;

  const std::string portName = GetPortName();
  const QFITransferOwner* system = GetOwnerSystem();
  switch (port_.Open(portName, system ? system->GetHardwareRoute() : std::string())) {
    case SerialPort::Status::kOk:
      connected_ = true;
      TheReporter().ReportInfo(kMsgConnected);
      return FAULTBOX_OK;
    case SerialPort::Status::kNoDevice:
    case SerialPort::Status::kOpenFailed:
    case SerialPort::Status::kBusy:
    case SerialPort::Status::kNotATerminal:
      TheReporter().ReportError(kMsgCannotOpen, portName, port_.DescribeLastError());
      return E_FAULTBOX_CONNECT;
    case SerialPort::Status::kSettingsFailed:
      TheReporter().ReportError(kMsgSettingsFailed, port_.DescribeLastError());
      [[fallthrough]];
    default:
      // The port was closed again by the failed open.
      ReportPortFault(kPlaceSetup);
      TheReporter().ReportError(kMsgSetupFailed, portName);
      return E_FAULTBOX_CONNECT;
  }
}

void QFCSerielleTransferInterface::FlushReceiveQueue() {
  if (port_.IsOpen()) port_.Purge(true, false);
}

HRESULT QFCSerielleTransferInterface::SendByte(const QFCSerielleMessage* message) {
  if (message == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoMessage);
    return E_FAULTBOX_NULL_POINTER;
  }
  if (!port_.IsOpen()) {
    TheReporter().ReportError(kMsgNotConnected);
    return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
  }
  // Every write waits until its byte is out, so no earlier byte is left to
  // purge; a purge would even drop bytes a simulated device has not read yet.
  if (port_.WriteByte(message->GetByte()) != SerialPort::Status::kOk) {
    ReportPortFault(kPlaceWrite);
    return E_FAULTBOX_MSG_WAS_NOT_TRANSMITED;
  }
  return FAULTBOX_OK;
}

HRESULT QFCSerielleTransferInterface::ReadBytes(QFCSerielleReceivedMap& received) {
  received.clear();
  if (!port_.IsOpen()) return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
  std::size_t available = 0;
  if (port_.BytesAvailable(available) != SerialPort::Status::kOk) {
    ReportPortFault(kPlaceQuery);
    return E_FAULTBOX_RECEIVE_MESSAGE;
  }
  if (available == 0) return E_FAULTBOX_TIME_OUT;
  std::array<std::uint8_t, kReadLimit> buffer;
  std::size_t count = 0;
  if (port_.Read(buffer.data(), std::min(available, buffer.size()), count) != SerialPort::Status::kOk) {
    ReportPortFault(kPlaceRead);
    return E_FAULTBOX_RECEIVE_MESSAGE;
  }
  // A read that found less than announced leaves the rest in the port for
  // the next look; nothing read is dropped here.
  for (std::size_t i = 0; i < count; ++i)
    received[static_cast<std::int32_t>(i)] =
        std::make_unique<QFCSerielleMessage>(QFCSerielleMessage::kKindNew, 0, buffer[i]);
  return FAULTBOX_OK;
}

HRESULT QFCSerielleTransferInterface::WaitForAnswers(const QFCSerielleMessageMap& sent) {
  if (sent.empty()) {
    TheReporter().ReportInternal(kMsgNothingSent);
    return E_FAULTBOX_MSG_WAS_NOT_TRANSMITED;
  }
  std::uint8_t expected = 0;
  for (const auto& [index, message] : sent) {
    if (message == nullptr) {
      TheReporter().ReportInternalFault(kPlaceNoSentMessage);
      return E_FAULTBOX_NULL_POINTER;
    }
    expected = static_cast<std::uint8_t>(expected + message->GetByte());
  }
  const std::int32_t passes = GetAnswerTimeout();
  if (passes < 1) return E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING;

  // Pass k ends kPassDuration × (k+1) after the start, so that the whole
  // wait keeps its length however late the system wakes a single pass.
  const auto start = Clock::now();
  bool bytesCame = false;
  for (std::int32_t pass = 0; pass < passes; ++pass) {
    bool readable = false;
    if (port_.WaitReadable(start + kPassDuration * (pass + 1), readable) != SerialPort::Status::kOk) {
      if (!port_.IsOpen()) return E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE;
      ReportPortFault(kPlaceWaitPort);
      return E_FAULTBOX_RECEIVE_MESSAGE;
    }
    QFCSerielleReceivedMap received;
    const HRESULT result = ReadBytes(received);
    if (result == E_FAULTBOX_TIME_OUT) continue;
    if (result != FAULTBOX_OK) {
      TheReporter().ReportInternalFault(kPlaceWaitRead);
      return result;
    }
    bytesCame = true;
    for (const auto& [position, byte] : received)
      if (byte->GetByte() == expected) return FAULTBOX_OK;
  }
  // Bytes that came without the answer came from a module that answered
  // wrongly, whenever in the wait they came.
  return bytesCame ? E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING : E_FAULTBOX_TIME_OUT;
}

void QFCSerielleTransferInterface::ListPorts(std::vector<std::int32_t>& numbers) {
  numbers.clear();
  for (int n = 0; n < kListedPorts; ++n)
    if (SerialPort::CanOpen("COM" + std::to_string(n))) numbers.push_back(n);
}

}  // namespace faultbox

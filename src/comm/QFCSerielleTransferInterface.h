// The transfer interface of a KR40-family system: reaches the hardware over
// the serial port of the system's interface settings, one byte at a time,
// and checks the checksum bytes the modules answer.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "comm/QFCSerielleMessage.h"
#include "platform/SerialPort.h"

namespace faultbox {

class QFCSerielleTransferInterface : public QFCAbstractTransferInterface {
 public:
  // One pass of an answer wait waits this long on the port: the default 1000
  // passes give a module about 20 ms to answer (two bytes on the line take
  // about 2 ms), and a reset of all 128 addresses, most of them silent, still
  // ends within a few seconds.
  static constexpr std::chrono::microseconds kPassDuration{20};
  // Never more than this many bytes in one read.
  static constexpr std::size_t kReadLimit = 4096;
  // ListPorts tries COM0 to COM99.
  static constexpr int kListedPorts = 100;

  explicit QFCSerielleTransferInterface(QFITransferOwner* owner = nullptr);
  // Disconnects first when connected.
  ~QFCSerielleTransferInterface() override;

  // Connecting opens the port named in the owner system's serial settings
  // (messages 173, 172 and 171 tell why it failed; E_FAULTBOX_CONNECT), and
  // reports message 62 on success. Disconnecting closes it and reports
  // message 103. Connecting a connected interface and disconnecting one that
  // is not connected do nothing. The two parameters are not used.
  [[nodiscard]] HRESULT Connect(bool connect, std::int32_t first, std::int32_t second) override;
  // Drops the bytes the port holds that nobody has asked for.
  void FlushReceiveQueue() override;

  // Writes the message's byte and returns once it has left the port.
  // E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE (message 54) when the port is not
  // open, E_FAULTBOX_MSG_WAS_NOT_TRANSMITED when the write fails,
  // E_FAULTBOX_NULL_POINTER without a message.
  [[nodiscard]] HRESULT SendByte(const QFCSerielleMessage* message);
  // Moves the bytes the port holds (at most kReadLimit) into `received`,
  // which is emptied first, under their positions 0, 1, 2, ...
  // E_FAULTBOX_TIME_OUT when the port holds none.
  [[nodiscard]] HRESULT ReadBytes(QFCSerielleReceivedMap& received);
  // Waits for the answer to the sent bytes: their sum modulo 256. Up to
  // "Timeout" passes of kPassDuration each (see GetAnswerTimeout); the wait
  // ends as soon as a byte read equals the answer. FAULTBOX_OK when it came;
  // E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING when bytes came but not the
  // answer, and at once without reading when "Timeout" is below 1;
  // E_FAULTBOX_TIME_OUT when nothing came. An empty map is message 65 and
  // E_FAULTBOX_MSG_WAS_NOT_TRANSMITED.
  [[nodiscard]] HRESULT WaitForAnswers(const QFCSerielleMessageMap& sent);

  // The numbers n of the ports "COMn", n from 0 to 99, that can be opened now.
  static void ListPorts(std::vector<std::int32_t>& numbers);

  // The port name the interface connects to: the owner system's setting.
  std::string GetPortName() const;

 private:
  // Message 35 for the place, with the port's last failure as detail.
  void ReportPortFault(int place) const;

  SerialPort port_;
};

}  // namespace faultbox

// The transfer interface of a KR60 system: opens the CAN channel of the
// system's interface settings through the CAN access layer, sends the
// modules' frames, and collects and checks the answers they send back.
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "comm/QFCCANMessage.h"
#include "platform/CanAccess.h"
#include "platform/InterfaceSettings.h"

namespace faultbox {

// Sent messages whose answers are awaited, under their request identifiers.
// The messages are not owned.
using QFCCANExpectedMap = std::map<std::uint32_t, const QFCCANMessage*>;
// Frames taken off the bus, under their identifiers.
using QFCCANReceivedMap = std::map<std::uint32_t, std::unique_ptr<QFCCANMessage>>;

class QFCCANTransferInterface : public QFCAbstractTransferInterface {
 public:
  // One pass of an answer wait waits this long for the receive event; an
  // answer that is there already ends the wait at once.
  static constexpr std::chrono::milliseconds kPassDuration{30};
  // Frames taken off the receive queue in one read.
  static constexpr std::uint32_t kReceiveRoom = 4096;
  // The receive queue's room asked for when the channel is initialised.
  static constexpr std::uint32_t kQueueSize = 0x8000;
  // The bit rate of every KR60 bench.
  static constexpr std::uint32_t kRequiredBitRate = 125000;
  // Masks of the acceptance filter for 11-bit identifiers: the modules only
  // use 29-bit ones.
  static constexpr std::uint32_t kStandardAcceptance = 0xFFFF;

  // Creates the access layer instance; a failure is reported (message 133)
  // and leaves an interface that never connects.
  explicit QFCCANTransferInterface(QFITransferOwner* owner = nullptr);
  // Disconnects first when connected.
  ~QFCCANTransferInterface() override;

  // Connecting opens the channel that the owner system's CAN settings name
  // (device type, board, channel; without an owner 1, 1, 1) and puts it on
  // the bus: a receive event under the first free name
  // "FS_CAN_RECEIVE_EVENT_<n>", the bus timing of the system's settings when
  // this interface is the first on the bus, otherwise a check that the bus
  // runs at 125000 bit/s (message 59, then 177 when it does not), the
  // acceptance filter (the two parameters, for 29-bit identifiers) and the
  // event notification. Message 62 on success. Any step that fails reports
  // why, releases what was set up and ends with message 61 and E_FAIL.
  // Disconnecting takes the channel off the bus and releases it (message
  // 103); a channel that cannot be deactivated is released all the same
  // (message 58, E_FAIL), one that cannot be released gives message 55 and
  // E_FAIL. Either way the interface is disconnected afterwards.
  [[nodiscard]] HRESULT Connect(bool connect, std::int32_t acceptanceCode, std::int32_t acceptanceMask) override;
  // Drops the frames received so far (and the signal they left).
  void FlushReceiveQueue() override;

  // Sends one frame: 29-bit identifier and the 8 data bytes of the message.
  // `flushFirst` drops the frames received before, so that an old frame is
  // never taken for the answer to this one. E_FAULTBOX_NULL_POINTER (message
  // 35 naming `errorContext`, or this interface's own place when it is 0)
  // without a message; E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE (message 54) when
  // not connected; E_FAULTBOX_MSG_WAS_NOT_TRANSMITED when the access layer
  // refuses the frame (its reason is reported with message 190).
  [[nodiscard]] HRESULT SendMessage(const QFCCANMessage* message, std::int32_t errorContext = 0, bool flushFirst = false);

  // Waits up to kPassDuration for frames, then moves every frame the receive
  // queue holds (at most kReceiveRoom) into `received`, which is emptied
  // first: data frames under their identifiers (a later frame with the same
  // identifier replaces the earlier one); other frames are only counted.
  // E_FAULTBOX_TIME_OUT when nothing arrived, E_FAIL when the queue cannot be
  // read or the interface is not connected. With the setting "Info" = "1" at
  // connecting, every read is summed up in message 81.
  [[nodiscard]] HRESULT Receive(QFCCANReceivedMap& received);

  // Waits until every message of `expected` is answered by its module (the
  // request identifier with direction 01), up to "Timeout" passes of
  // Receive. An answer counts once, in whichever pass it came. FAULTBOX_OK
  // when all answered. An answer that is refused (byte 2 = 0x14) ends the
  // wait at once with E_FAIL (message 107); one that cannot be evaluated
  // with E_FAULTBOX_RECEIVE_MESSAGE (message 101). When the passes run out:
  // E_FAULTBOX_TIME_OUT if the last pass heard nothing, else message 108 for
  // every module still silent and E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING.
  // An empty map is message 65 and E_FAULTBOX_MSG_WAS_NOT_TRANSMITED, a null
  // message in it E_FAULTBOX_EVALUATE_MESSAGE.
  [[nodiscard]] HRESULT WaitForAnswers(const QFCCANExpectedMap& expected);

  // The channel descriptions of every channel the access layer can open now,
  // in its order; `count` is their number. E_FAIL (both empty) when the layer
  // cannot list them.
  [[nodiscard]] HRESULT GetAvailableChannels(std::vector<QFTCANInterfaceSettings>& channels, std::uint32_t& count);

  // "Vector CANCardX" and the other names of the device types 0 to 5.
  static std::string GetDeviceTypeName(std::uint32_t deviceType);
  // The channel connected last, for display: "Vector CANCardX (board 1,
  // channel 1)"; empty before the first connect.
  const std::string& GetChannelDescription() const { return channelDescription_; }
  // The name of the receive event while connected, else "".
  std::string GetReceiveEventName() const;

 private:
  // Step 3 of connecting: open, initialise and set up the channel. False
  // after reporting what failed; the channel is released then.
  bool SetUpChannel();
  // Finds the configured channel among the available ones and copies their
  // further values into the system's settings. False when none is available.
  bool FindConfiguredChannel(const QFTCANInterfaceSettings& configured);
  [[nodiscard]] HRESULT Disconnect();
  // Unregisters the channel (if registered) and drops the receive event.
  void ReleaseChannel();
  [[nodiscard]] HRESULT EvaluateAnswer(const QFCCANMessage& answer, const QFCCANMessage& expected) const;
  // The settings the channel is opened with.
  QFTCANInterfaceSettings ConfiguredChannel() const;
  std::string OwnerName() const;

  std::uint32_t instance_ = 0;
  bool instanceCreated_ = false;
  CanHandle channel_ = 0;
  bool registered_ = false;
  std::shared_ptr<NamedEvent> receiveEvent_;
  std::string channelDescription_;
  std::uint32_t acceptanceCode_ = 0;
  std::uint32_t acceptanceMask_ = 0;
  std::uint32_t initAccess_ = 0;
  bool reportReceived_ = false;  // the "Info" setting at connecting
  std::vector<CanFrameRecord> frames_;
};

}  // namespace faultbox

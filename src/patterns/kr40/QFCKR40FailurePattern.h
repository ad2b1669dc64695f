// The failure pattern of the serial KR40 family (KR40 and KR80 boards): a
// pin's failure is its PinConfig and failure class alone, without external
// hardware.
#pragma once

#include <memory>

#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

class QFCSerielleMessageBuilder;

class QFCKR40FailurePattern : public QFCAbstractFailurePattern {
 public:
  QFCKR40FailurePattern(std::string name, QFCSystem* system);
  ~QFCKR40FailurePattern() override;

  [[nodiscard]] HRESULT Initialize() override;
  // Clears every PinConfig unless a pin is activated, then runs the
  // interlock; false when the document is read-only.
  bool Reset() override;
  // Translates the relay vector's on positions 0 to 4 into PinConfig entries,
  // one by one, each with its own interlock run.
  [[nodiscard]] HRESULT SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                          std::int32_t relayVectorIndex) override;
  std::unique_ptr<QFCAbstractPin> CreatePlaceholderPin() override;
  std::unique_ptr<QFCAbstractFailurePatternPin> CreatePatternPin() override;
  // The base's parts, then the message builder.
  void ReleaseParts() override;

  // The serial bytes that switch the taking-part pins on or off.
  bool BuildMessages(QFCMessageList& messages, bool activate) override;
  // Sends the bytes one by one in list order over the system's serial
  // interface; after each byte that expects an answer, waits for the
  // checksum of the bytes sent since the previous answer. The first wait
  // that fails ends the transfer (message 174, and 69 for a time-out) with
  // its code: the bytes after it are not sent. A failure here lets the
  // activation reset the hardware (the collection's hardware reset).
  [[nodiscard]] HRESULT TransferMessages(QFCMessageList& messages, bool activate) override;


  // The pattern record; afterwards the interlock derives every pin's class again.
  void Serialize(Archive& ar) override;

 private:
  std::unique_ptr<QFCSerielleMessageBuilder> builder_;
};

}  // namespace faultbox

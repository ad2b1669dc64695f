// The failure pattern of the serial KR40 family (KR40 and KR80 boards): a
// pin's failure is its PinConfig and failure class alone, without external
// hardware.
#pragma once

#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

class QFCKR40FailurePattern : public QFCAbstractFailurePattern {
 public:
  QFCKR40FailurePattern(std::string name, QFCSystem* system)
      : QFCAbstractFailurePattern(std::move(name), system) {}

  HRESULT Initialize() override;
  // Clears every PinConfig unless a pin is activated, then runs the
  // interlock; false when the document is read-only.
  bool Reset() override;
  // Translates the relay vector's on positions 0 to 4 into PinConfig entries,
  // one by one, each with its own interlock run.
  HRESULT SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                          std::int32_t relayVectorIndex) override;
  std::unique_ptr<QFCAbstractPin> CreatePlaceholderPin() override;
  std::unique_ptr<QFCAbstractFailurePatternPin> CreatePatternPin() override;

  // The pattern record; afterwards the interlock derives every pin's class again.
  void Serialize(Archive& ar) override;
};

}  // namespace faultbox

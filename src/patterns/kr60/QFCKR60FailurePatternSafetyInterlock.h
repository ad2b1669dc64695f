// The safety interlock of the KR60 platform: the shared rules, the pattern's
// external hardware as part of every pin's requirement, and the
// exclusive-entry rule that keeps two pins from sharing PinConfig entry 0, 1
// or 3 while external hardware is in use.
#pragma once

#include <string>

#include "patterns/QFCAbstractFailurePatternSafetyInterlock.h"

namespace faultbox {

class QFCKR60FailurePattern;

class QFCKR60FailurePatternSafetyInterlock : public QFCAbstractFailurePatternSafetyInterlock {
 public:
  explicit QFCKR60FailurePatternSafetyInterlock(QFCKR60FailurePattern* pattern);

  // In the service mode one pin on its own; otherwise the whole pattern,
  // since the exclusive-entry rule ties the pins together.
  bool CheckPin(QFCAbstractFailurePatternPin* pin) override;
  // One requirement from the external hardware for every pin; pins chosen
  // explicitly first, then all pins in pattern order.
  bool CheckAll() override;
  QFCAbstractFailurePattern* GetPattern() const override;

  // The failure class text of a pin the exclusive-entry rule refused.
  const std::string& GetMessageText() const { return messageText_; }

 protected:
  bool IsPlatformPin(const QFCAbstractFailurePatternPin* pin) const override;
  bool FillExternalRequirement(std::vector<std::uint32_t>& requirement) override;
  // The exclusive-entry rule; a pin whose class is being chosen explicitly is
  // never refused by it.
  bool IsRefusedByPlatformRule(QFCAbstractFailurePatternPin* pin,
                               const std::vector<std::uint32_t>& requirement) override;

 private:
  QFCKR60FailurePattern* pattern_;
  std::string messageText_;
  // Reused from check to check: a full check should not allocate.
  std::vector<std::uint32_t> requirement_;
};

}  // namespace faultbox

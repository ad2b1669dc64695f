// The safety interlock of the KR40 family: the shared rules, plus the KR80
// board's restriction to failure classes 1, 2 and 3.
#pragma once

#include "patterns/QFCAbstractFailurePatternSafetyInterlock.h"

namespace faultbox {

class QFCKR40FailurePattern;

class QFCKR40FailurePatternSafetyInterlock : public QFCAbstractFailurePatternSafetyInterlock {
 public:
  explicit QFCKR40FailurePatternSafetyInterlock(QFCKR40FailurePattern* pattern) : pattern_(pattern) {}

  bool CheckPin(QFCAbstractFailurePatternPin* pin) override;
  bool CheckAll() override;
  QFCAbstractFailurePattern* GetPattern() const override;

 protected:
  bool IsPlatformPin(const QFCAbstractFailurePatternPin* pin) const override;
  void FilterCandidates(std::vector<QFTFoundFailureClass>& candidates) const override;

 private:
  // A KR80 board switches only failure classes 1, 2 and 3.
  bool IsKR80Board() const;

  QFCKR40FailurePattern* pattern_;
};

}  // namespace faultbox

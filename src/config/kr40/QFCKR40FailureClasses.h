// The failure class collection of the KR40 platform family: it makes
// KR40 failure classes and starts as platform type 1.
#pragma once

#include <memory>

#include "config/QFCAbstractFailureClasses.h"
#include "config/kr40/QFCKR40FailureClass.h"

namespace faultbox {

class QFCKR40FailureClasses : public QFCAbstractFailureClasses {
 public:
  QFCKR40FailureClasses() : QFCAbstractFailureClasses(kFailureClassPlatformKR40) {}
  std::unique_ptr<QFCAbstractFailureClass> CreateFailureClass() const override {
    return std::make_unique<QFCKR40FailureClass>();
  }
};

}  // namespace faultbox

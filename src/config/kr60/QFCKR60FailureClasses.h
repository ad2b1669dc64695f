// The failure class collection of the KR60 platform: it makes
// KR60 failure classes and starts as platform type 2.
#pragma once

#include <memory>

#include "config/QFCAbstractFailureClasses.h"
#include "config/kr60/QFCKR60FailureClass.h"

namespace faultbox {

class QFCKR60FailureClasses : public QFCAbstractFailureClasses {
 public:
  QFCKR60FailureClasses() : QFCAbstractFailureClasses(kFailureClassPlatformKR60) {}
  std::unique_ptr<QFCAbstractFailureClass> CreateFailureClass() const override {
    return std::make_unique<QFCKR60FailureClass>();
  }
};

}  // namespace faultbox

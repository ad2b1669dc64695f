// The failure class of the KR60 platform: a failure class stored
// under its own class name.
#pragma once

#include "config/QFCAbstractFailureClass.h"

namespace faultbox {

class QFCKR60FailureClass : public QFCAbstractFailureClass {
 public:
  static constexpr const char* kClassName = "QFCKR60FailureClass";

  QFCKR60FailureClass() = default;
  const char* GetClassName() const override { return kClassName; }
};

}  // namespace faultbox

// The failure class of the KR40 platform family: a failure class stored
// under its own class name.
#pragma once

#include "config/QFCAbstractFailureClass.h"

namespace faultbox {

class QFCKR40FailureClass : public QFCAbstractFailureClass {
 public:
  static constexpr const char* kClassName = "QFCKR40FailureClass";

  QFCKR40FailureClass() = default;
  const char* GetClassName() const override { return kClassName; }
};

}  // namespace faultbox

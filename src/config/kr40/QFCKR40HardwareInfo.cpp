// Format keys and pins of KR40-family pin files.
#include "config/kr40/QFCKR40HardwareInfo.h"

#include "config/kr40/QFCKR40Pin.h"

namespace faultbox {

HRESULT QFCKR40HardwareInfo::EvaluateFormat(bool additional) {
  if (!RequireKey("BoardType")) return E_FAULTBOX_CONSISTENCY_CHECK;
  if (!additional && (!RequireKey("AdditionalFiles") || !RequireKey("FaultClassFile"))) {
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  return FAULTBOX_OK;
}

std::unique_ptr<QFCAbstractPin> QFCKR40HardwareInfo::CreatePin() {
  return std::make_unique<QFCKR40Pin>(PinPlatform(), GetOwner());
}

}  // namespace faultbox

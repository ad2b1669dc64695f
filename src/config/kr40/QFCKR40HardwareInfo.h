// The hardware description of a KR40-family pin file (board types KR40,
// KR040, KR80, KR080): the keys it requires and its pins.
#pragma once

#include "config/QFCAbstractHardwareInfo.h"

namespace faultbox {

class QFCKR40HardwareInfo : public QFCAbstractHardwareInfo {
 public:
  QFCKR40HardwareInfo(const std::string& pinFilePath, std::int32_t ecuVersion, QFCAbstractObjectData* system)
      : QFCAbstractHardwareInfo("Faultbox.Component_KR40", pinFilePath, ecuVersion, system) {}

  // "BoardType"; for a main pin file also "AdditionalFiles" and "FaultClassFile".
  [[nodiscard]] HRESULT EvaluateFormat(bool additional) override;
  std::unique_ptr<QFCAbstractPin> CreatePin() override;
};

}  // namespace faultbox

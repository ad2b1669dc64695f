// The hardware description of a KR60 pin file: potentials, address offsets
// and module addresses in the format block, load columns in the header.
#pragma once

#include "config/QFCAbstractHardwareInfo.h"

namespace faultbox {

class QFCKR60HardwareInfo : public QFCAbstractHardwareInfo {
 public:
  QFCKR60HardwareInfo(const std::string& pinFilePath, std::int32_t ecuVersion, QFCAbstractObjectData* system)
      : QFCAbstractHardwareInfo("Faultbox.Component_KR60", pinFilePath, ecuVersion, system) {}

  // The common columns, then "load_channels_required", "load_module_id" and
  // "load_module_channel".
  [[nodiscard]] HRESULT CheckMandatoryColumns() override;
  // "BoardType"; for a main pin file also the five potentials, the three
  // offsets (hexadecimal or "none"), the five module addresses
  // (cabinet_rack_slot or "none"), "AdditionalFiles" and "FaultClassFile".
  [[nodiscard]] HRESULT EvaluateFormat(bool additional) override;
  std::unique_ptr<QFCAbstractPin> CreatePin() override;
};

}  // namespace faultbox

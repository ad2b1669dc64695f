// Format keys, load columns and pins of KR60 pin files.
#include "config/kr60/QFCKR60HardwareInfo.h"

#include <algorithm>

#include "config/QFCFSHelper.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/QFCReporter.h"

namespace faultbox {

HRESULT QFCKR60HardwareInfo::CheckMandatoryColumns() {
  if (HRESULT hr = CheckCommonColumns(); hr != FAULTBOX_OK) return hr;
  const std::vector<std::string> columns = GetColumnNames();
  for (const char* column : {"load_channels_required", "load_module_id", "load_module_channel"}) {
    if (std::find(columns.begin(), columns.end(), column) == columns.end()) {
      TheReporter().ReportError(39, column, GetFileName());
      return E_FAULTBOX_HEADER_COL_NOT_FOUND;
    }
  }
  return FAULTBOX_OK;
}

HRESULT QFCKR60HardwareInfo::EvaluateFormat(bool additional) {
  if (!RequireKey("BoardType")) return E_FAULTBOX_CONSISTENCY_CHECK;
  if (additional) return FAULTBOX_OK;

  for (const char* key : {"Potential0", "Potential1", "Potential2", "Potential3", "Potential4"}) {
    if (!RequireKey(key)) return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  auto refuse = [this](const char* key, const std::string& value) {
    TheReporter().ReportError(34, key, value);
    TheReporter().ReportError(134, GetFileName());
    return E_FAULTBOX_CONSISTENCY_CHECK;
  };
  for (const char* key : {"OffsetCANAddress", "OffsetLoadAddress", "OffsetPowerSwitchAddress"}) {
    if (!RequireKey(key)) return E_FAULTBOX_CONSISTENCY_CHECK;
    std::string value;
    (void)GetFormatValue(key, value);  // RequireKey has just found it
    const std::string_view trimmed = QFCFSHelper::Trim(value);
    std::uint32_t number = 0;
    if (!QFCFSHelper::EqualNoCase(trimmed, "none") && !QFCFSHelper::StringToNumber(trimmed, number, 16)) {
      return refuse(key, value);
    }
  }
  for (const char* key :
       {"FIULoadAddress", "RSIMLoadAddress", "FIUCANAddress", "RSIMCANAddress(1)", "RSIMCANAddress(2)"}) {
    if (!RequireKey(key)) return E_FAULTBOX_CONSISTENCY_CHECK;
    std::string value;
    (void)GetFormatValue(key, value);  // RequireKey has just found it
    const std::string_view trimmed = QFCFSHelper::Trim(value);
    std::uint32_t cabinet = 0, rack = 0, slot = 0;
    if (!QFCFSHelper::EqualNoCase(trimmed, "none") &&
        !QFCFSHelper::ParseModuleAddress(trimmed, cabinet, rack, slot)) {
      return refuse(key, value);
    }
  }
  if (!RequireKey("AdditionalFiles") || !RequireKey("FaultClassFile")) return E_FAULTBOX_CONSISTENCY_CHECK;
  return FAULTBOX_OK;
}

std::unique_ptr<QFCAbstractPin> QFCKR60HardwareInfo::CreatePin() {
  return std::make_unique<QFCKR60Pin>(PinPlatform(), GetOwner());
}

}  // namespace faultbox

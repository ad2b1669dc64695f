// Conversion of variant arguments and the published enumerations.
#include "automation/AutomationTypes.h"

#include <charconv>
#include <cmath>
#include <limits>

#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCFSHelper.h"
#include "systems/QFCSystemProperty.h"

namespace faultbox {

namespace {

bool InRange(std::int64_t value) {
  return value >= std::numeric_limits<std::int32_t>::min() &&
         value <= std::numeric_limits<std::int32_t>::max();
}

bool TextToInt32(const std::string& raw, std::int32_t& out) {
  const std::string_view text = QFCFSHelper::Trim(raw);
  const char* first = text.data();
  const char* last = first + text.size();
  if (first != last && *first == '+') ++first;
  std::int64_t value = 0;
  const auto [end, error] = std::from_chars(first, last, value, 10);
  if (error != std::errc() || end != last || first == last || !InRange(value)) return false;
  out = static_cast<std::int32_t>(value);
  return true;
}

constexpr QFTNamedConstant kPlatformTypes[] = {
    {"fptKR40Platform", fptKR40Platform, "Norvik platform KR40,KR20"},
    {"fptKR60Platform", fptKR60Platform, "Norvik platform KR60"},
};
constexpr QFTNamedConstant kDeviceTypes[] = {
    {"fdtCAN_IF_VI_CAN_CARD_X", fdtCAN_IF_VI_CAN_CARD_X, "The Vector informatik CANCardX Card"},
    {"fdtCAN_IF_LINKBOX_USB", fdtCAN_IF_LINKBOX_USB, "The Norvik LinkBox USB Card"},
    {"fdtRS232_IF_PORT", fdtRS232_IF_PORT, "The RS232 Port"},
};
constexpr QFTNamedConstant kFailurePatternStates[] = {
    {"ffpDeactivated", ffpDeactivated, ""},
    {"ffpActivated", ffpActivated, ""},
};
constexpr QFTNamedConstant kDeviceConstants[] = {
    {"fdcDisconnected", fdcDisconnected, "The disconnected state"},
    {"fdcConnected", fdcConnected, "The connected state"},
};
// In the order the error enumeration lists them; names and descriptions come
// from the result code table.
constexpr HRESULT kErrorCodes[] = {
    FAULTBOX_OK,
    E_FAULTBOX,
    E_FAULTBOX_NULL_POINTER,
    E_FAULTBOX_INVALID_PARAMETER,
    E_FAULTBOX_CANN_NOT_OPEN_FILE,
    E_FAULTBOX_FILE_IS_NOT_OPENED,
    E_FAULTBOX_NAME_NOT_UNIQUE,
    E_FAULTBOX_INITIALIZE,
    E_FAULTBOX_TAG_NOT_FOUND,
    E_FAULTBOX_HEADER_COL_NOT_FOUND,
    E_FAULTBOX_CONSISTENCY_CHECK,
    W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION,
    E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE,
    E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED,
    E_FAULTBOX_MSG_WAS_NOT_TRANSMITED,
    E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING,
    E_FAULTBOX_RECEIVE_MESSAGE,
    E_FAULTBOX_CONNECT,
    E_FAULTBOX_DISCONNECT,
    E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED,
    E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE,
    E_FAULTBOX_MESSAGE_BUILD,
    E_FAULTBOX_TIME_OUT,
    E_FAULTBOX_EVALUATE_MESSAGE,
    E_FAULTBOX_ACTIVATE_FAILURE_PATTERN,
    E_FAULTBOX_DEACTIVATE_FAILURE_PATTERN,
    E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED,
    E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED,
};

std::vector<QFTNamedConstant> MakeErrorConstants() {
  std::vector<QFTNamedConstant> out;
  for (HRESULT code : kErrorCodes) out.push_back({ResultCodeName(code), code, ResultCodeDescription(code)});
  return out;
}

}  // namespace

bool VariantToInt32(const Variant& value, std::int32_t& out) {
  if (const bool* flag = std::get_if<bool>(&value)) {
    out = *flag ? VARIANT_TRUE : VARIANT_FALSE;
    return true;
  }
  if (const std::int64_t* number = std::get_if<std::int64_t>(&value)) {
    if (!InRange(*number)) return false;
    out = static_cast<std::int32_t>(*number);
    return true;
  }
  if (const double* real = std::get_if<double>(&value)) {
    if (!std::isfinite(*real)) return false;
    // Rounds half to even under the default rounding mode.
    const double rounded = std::nearbyint(*real);
    if (rounded < std::numeric_limits<std::int32_t>::min() ||
        rounded > std::numeric_limits<std::int32_t>::max())
      return false;
    out = static_cast<std::int32_t>(rounded);
    return true;
  }
  if (const std::string* text = std::get_if<std::string>(&value)) return TextToInt32(*text, out);
  return false;
}

std::span<const QFTEnumeration> AutomationEnumerations() {
  static const std::vector<QFTNamedConstant> errors = MakeErrorConstants();
  static const QFTEnumeration enumerations[] = {
      {"FSPlatformType", kPlatformTypes},
      {"FSDeviceType", kDeviceTypes},
      {"FSFailurePattern", kFailurePatternStates},
      {"FSDeviceConstant", kDeviceConstants},
      {"FaultboxErrors", errors},
  };
  return enumerations;
}

}  // namespace faultbox

// The value types of the automation object model: the small variant that
// stands for an automation argument, boolean results, and the enumerations
// with their names, so that a scripting binding can publish them as they are.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <variant>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {

// Every wrapper handed to a caller; a variant argument may carry one.
class QFCAutomationObject {
 public:
  virtual ~QFCAutomationObject() = default;
  // False once the model object behind the wrapper has gone away.
  virtual bool IsAttached() const = 0;
};

using QFTObjectArray = std::vector<std::shared_ptr<QFCAutomationObject>>;

// An argument as a script passes it. std::monostate is an omitted argument.
// Arrays only ever carry objects (the pins of Activate and Deactivate).
using Variant = std::variant<std::monostate, bool, std::int64_t, double, std::string,
                             std::shared_ptr<QFCAutomationObject>, QFTObjectArray>;

inline bool IsMissing(const Variant& value) {
  return std::holds_alternative<std::monostate>(value);
}

// Converts as the automation conversion to a 32-bit integer does: true is -1,
// a number must lie in range (a fraction rounds half to even), a text must
// be a decimal number. Nothing else converts, an omitted value included.
bool VariantToInt32(const Variant& value, std::int32_t& out);

// Boolean results.
using VARIANT_BOOL = std::int16_t;
constexpr VARIANT_BOOL VARIANT_TRUE = -1;
constexpr VARIANT_BOOL VARIANT_FALSE = 0;
constexpr VARIANT_BOOL ToVariantBool(bool value) {
  return value ? VARIANT_TRUE : VARIANT_FALSE;
}

// FSFailurePattern and FSDeviceConstant; FSPlatformType (fptKR40Platform,
// fptKR60Platform) and FSDeviceType (fdt...) are the model's own constants.
constexpr std::int32_t ffpDeactivated = 0;
constexpr std::int32_t ffpActivated = 1;
constexpr std::int32_t fdcDisconnected = 0;
constexpr std::int32_t fdcConnected = 1;

struct QFTNamedConstant {
  const char* name;
  std::int32_t value;
  const char* help;
};

struct QFTEnumeration {
  const char* name;
  std::span<const QFTNamedConstant> constants;
};

// FSPlatformType, FSDeviceType, FSFailurePattern, FSDeviceConstant and
// FaultboxErrors with every constant, value and help text.
std::span<const QFTEnumeration> AutomationEnumerations();

}  // namespace faultbox

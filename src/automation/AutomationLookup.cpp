// Index look-up of the collection wrappers.
#include "automation/AutomationLookup.h"

#include "automation/QFCAutomationCall.h"
#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

namespace {
constexpr int kTextNoIndex = 6713;
}

std::string AutomationText(int id, std::initializer_list<std::string_view> args) {
  return QFCAbstractFailurePattern::ResourceText(id, args);
}

HRESULT ResolveIndex(const Variant& index, int count,
                     const std::function<int(const std::string&)>& findByName, int notFoundText,
                     int& position) {
  position = -1;
  if (const std::string* name = std::get_if<std::string>(&index)) {
    position = findByName(*name);
  } else {
    std::int32_t number = 0;
    if (!VariantToInt32(index, number))
      return RaiseError(E_FAULTBOX_INVALID_PARAMETER, AutomationText(kTextNoIndex));
    position = number;
  }
  if (position < 0 || position >= count) {
    position = -1;
    if (notFoundText == 0) return E_FAULTBOX_INVALID_PARAMETER;
    return RaiseError(E_FAULTBOX_INVALID_PARAMETER, AutomationText(notFoundText));
  }
  return FAULTBOX_OK;
}

}  // namespace faultbox

// Index look-up of the collection wrappers.
#include "automation/AutomationLookup.h"
#include "platform/MessageTable.h"

#include "automation/QFCAutomationCall.h"
#include "patterns/QFCAbstractFailurePattern.h"

namespace faultbox {

namespace {
constexpr int kTextNoIndex = 6713;
}

std::string AutomationText(int id, std::initializer_list<std::string_view> args) {
  return ResourceText(id, args);
}

[[nodiscard]] HRESULT ResolveIndex(const Variant& index, int count,
                     const std::function<int(const std::string&)>& findByName, int notFoundText,
                     int& position, const std::string& ecuName) {
  position = -1;
  std::string lookedFor;
  if (const std::string* name = std::get_if<std::string>(&index)) {
    position = findByName(*name);
    lookedFor = "\"" + *name + "\"";
    if (!ecuName.empty()) lookedFor += " of ECU \"" + ecuName + "\"";
  } else {
    std::int32_t number = 0;
    if (!VariantToInt32(index, number))
      return RaiseError(E_FAULTBOX_INVALID_PARAMETER, AutomationText(kTextNoIndex));
    position = number;
    lookedFor = std::to_string(number) + (count > 0 ? " (positions 0 to " + std::to_string(count - 1) + ")"
                                                    : " (the collection is empty)");
  }
  if (position < 0 || position >= count) {
    position = -1;
    // The text says what was not found; the script's own index says where to look.
    std::string text = AutomationText(notFoundText);
    if (!text.empty() && text.back() == '.') text.pop_back();
    return RaiseError(E_FAULTBOX_INVALID_PARAMETER, text + ": " + lookedFor + ".");
  }
  return FAULTBOX_OK;
}

}  // namespace faultbox

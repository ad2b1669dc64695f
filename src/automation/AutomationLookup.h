// Index look-up shared by the collection wrappers.
#pragma once

#include <functional>
#include <string>

#include "automation/AutomationTypes.h"

namespace faultbox {

// An Index holding a text selects by name (`findByName` answers the position
// or -1); any other Index selects by position 0 ... count-1 once it converts
// to a 32-bit number. An Index that does not convert fails with resource
// string 6713, one that selects nothing with `notFoundText` followed by the
// name (and `ecuName`, when given) or position looked for; both as
// E_FAULTBOX_INVALID_PARAMETER.
[[nodiscard]] HRESULT ResolveIndex(const Variant& index, int count,
                     const std::function<int(const std::string&)>& findByName, int notFoundText,
                     int& position, const std::string& ecuName = {});

// The resource string `id` with its placeholders filled in order.
std::string AutomationText(int id, std::initializer_list<std::string_view> args = {});

}  // namespace faultbox

// The failure patterns of a system, as scripts see them.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCFaultboxComEnumVariant.h"
#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCBaseFailurePatternImpl;
class QFCSystem;

// Reaches the collection through its system.
class QFCFailurePatternsImpl : public QFCOwnerProvider<QFCSystem>,
                               public std::enable_shared_from_this<QFCFailurePatternsImpl> {
 public:
  explicit QFCFailurePatternsImpl(QFCSystem* owner) : QFCOwnerProvider(owner) {}

  // By name (exactly) or position; resource strings 6713, 6717. The pattern
  // comes as its KR40 or KR60 wrapper.
  [[nodiscard]] HRESULT Item(const Variant& index, std::shared_ptr<QFCBaseFailurePatternImpl>& failurePattern);
  [[nodiscard]] HRESULT get_Count(std::int32_t& count);
  [[nodiscard]] HRESULT get_Names(std::vector<std::string>& names);
  // nullptr and success when no pattern is activated.
  [[nodiscard]] HRESULT get_ActivatedFailurePattern(std::shared_ptr<QFCBaseFailurePatternImpl>& pattern);
  [[nodiscard]] HRESULT get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum);

  // Extension of the model: a new, empty pattern; an empty name takes the
  // first free default name. Refused for a name in use (message 87) and on a
  // write-protected document (message 118).
  [[nodiscard]] HRESULT Add(const std::string& name, std::shared_ptr<QFCBaseFailurePatternImpl>& failurePattern);
  // Extension of the model: removes the pattern that Index selects (as Item
  // does). E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED for an activated pattern,
  // E_FAULTBOX when the document refuses the change.
  [[nodiscard]] HRESULT Remove(const Variant& index);

  // For the enumerator.
  int LiveCount() const;
  std::shared_ptr<QFCAutomationObject> LiveAt(int index) const;
};

}  // namespace faultbox

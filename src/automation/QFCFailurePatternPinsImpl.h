// The pins of a failure pattern, as scripts see them.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCFaultboxComEnumVariant.h"
#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCAbstractFailurePattern;
class QFCBaseFailurePatternPinImpl;

// Reaches the pins through their pattern.
class QFCFailurePatternPinsImpl : public QFCOwnerProvider<QFCAbstractFailurePattern>,
                                  public std::enable_shared_from_this<QFCFailurePatternPinsImpl> {
 public:
  explicit QFCFailurePatternPinsImpl(QFCAbstractFailurePattern* owner) : QFCOwnerProvider(owner) {}

  // By pin name (exactly; the first such pin of `ecuName`, or of any ECU when
  // it is empty) or by position.
  [[nodiscard]] HRESULT Item(const Variant& index, const std::string& ecuName,
               std::shared_ptr<QFCBaseFailurePatternPinImpl>& failurePatternPin);
  [[nodiscard]] HRESULT Item(const Variant& index, std::shared_ptr<QFCBaseFailurePatternPinImpl>& failurePatternPin) {
    return Item(index, {}, failurePatternPin);
  }
  [[nodiscard]] HRESULT get_Count(std::int32_t& count);
  // (ECU name, pin name) of every pin, in pattern order.
  [[nodiscard]] HRESULT get_Names(std::vector<std::array<std::string, 2>>& names);
  [[nodiscard]] HRESULT get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum);

  // Extension of the model: adds the system's pin `pinName` of ECU `ecuName`
  // (names exact, as Item takes them) and gives its pattern pin; a pin the
  // pattern holds already is given as it is. E_FAULTBOX_INVALID_PARAMETER for
  // a pin the system does not have, E_FAULTBOX when the document refuses.
  [[nodiscard]] HRESULT Add(const std::string& pinName, const std::string& ecuName,
              std::shared_ptr<QFCBaseFailurePatternPinImpl>& failurePatternPin);
  // Extension of the model: removes the pin that Index (and `ecuName`)
  // select as Item does. An activated pin stays: E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED.
  [[nodiscard]] HRESULT Remove(const Variant& index, const std::string& ecuName = {});

  // For the enumerator.
  int LiveCount() const;
  std::shared_ptr<QFCAutomationObject> LiveAt(int index) const;
};

}  // namespace faultbox

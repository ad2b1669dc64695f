// A pin of a failure pattern as scripts see it, with the KR40 and KR60
// wrappers that add the module address of their platform.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCAbstractFailurePatternPin;
class QFCFailureClassImpl;

class QFCBaseFailurePatternPinImpl : public QFCOwnerProvider<QFCAbstractFailurePatternPin> {
 public:
  // The pattern pin's one wrapper, made on first use as the wrapper of its
  // platform; nullptr for a pin of neither platform.
  static std::shared_ptr<QFCBaseFailurePatternPinImpl> Of(QFCAbstractFailurePatternPin& pin);
  // The pin holds a failure class and relay vector.
  static bool HasConfiguredClass(const QFCAbstractFailurePatternPin& pin);

  [[nodiscard]] HRESULT get_Name(std::string& name);
  [[nodiscard]] HRESULT get_EcuName(std::string& ecuName);
  // E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED for a pin without a failure class.
  [[nodiscard]] HRESULT Select();
  [[nodiscard]] HRESULT Deselect();
  [[nodiscard]] HRESULT IsSelected(VARIANT_BOOL& isSelected);
  [[nodiscard]] HRESULT IsActivated(VARIANT_BOOL& isActivated);
  [[nodiscard]] HRESULT CanBeActivated(VARIANT_BOOL& canActivate);
  // nullptr and success for a pin without a failure class.
  [[nodiscard]] HRESULT get_AdjustedFailureClass(std::shared_ptr<QFCFailureClassImpl>& failureClass);
  // This pin alone: every other pin of the pattern is deselected.
  [[nodiscard]] HRESULT Activate();
  [[nodiscard]] HRESULT Deactivate();
  // An omitted relay vector is the class's first (0).
  [[nodiscard]] HRESULT SetFailureClass(std::int32_t failureClassId, const Variant& relayVector = {});
  [[nodiscard]] HRESULT get_DefinedFailureClasses(std::vector<std::int32_t>& definedFailureClasses);
  [[nodiscard]] HRESULT get_ModuleChannel(std::vector<std::int32_t>& channels);
  [[nodiscard]] HRESULT get_PinConfig(std::vector<std::int32_t>& pinConfig);
  // ID 0 and relay vector -1 when the pin has no failure class.
  [[nodiscard]] HRESULT get_AdjustedFailureClassID(std::int32_t& id, std::int32_t& relayVector);
  // E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, changing nothing, for an activated pin.
  [[nodiscard]] HRESULT Reset();
  // Extension: why the safety interlock left the pin without a failure class
  // at its last check; "" while the pin holds one.
  [[nodiscard]] HRESULT get_RefusalReason(std::string& reason);

 protected:
  explicit QFCBaseFailurePatternPinImpl(QFCAbstractFailurePatternPin* owner) : QFCOwnerProvider(owner) {}

 private:
  [[nodiscard]] HRESULT Switch(bool activate);
};

class QFCFailurePatternKR40PinImpl : public QFCBaseFailurePatternPinImpl {
 public:
  explicit QFCFailurePatternKR40PinImpl(QFCAbstractFailurePatternPin* owner)
      : QFCBaseFailurePatternPinImpl(owner) {}
  // The FIU module number of the pin.
  [[nodiscard]] HRESULT get_ModuleAddress(std::int32_t& address);
};

class QFCFailurePatternKR60PinImpl : public QFCBaseFailurePatternPinImpl {
 public:
  explicit QFCFailurePatternKR60PinImpl(QFCAbstractFailurePatternPin* owner)
      : QFCBaseFailurePatternPinImpl(owner) {}
  // Cabinet, rack and slot of the pin's load module.
  [[nodiscard]] HRESULT get_ModuleAddress(std::int32_t& cabinet, std::int32_t& rack, std::int32_t& slot);
};

}  // namespace faultbox

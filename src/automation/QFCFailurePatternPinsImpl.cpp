// The pattern pin collection wrapper.
#include "automation/QFCFailurePatternPinsImpl.h"

#include "automation/AutomationLookup.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kTextNoPin = 6718;
constexpr int kTextNoSystemPin = 6729;

[[nodiscard]] HRESULT Resolve(const QFCFailurePatternPins& pins, const Variant& index, const std::string& ecuName,
                QFCAbstractFailurePatternPin*& pin) {
  pin = nullptr;
  auto byName = [&](const std::string& name) {
    for (int i = 0; i < pins.GetCount(); ++i) {
      const QFCAbstractFailurePatternPin* candidate = pins.GetAt(i);
      if (candidate->GetPin() == nullptr) continue;
      if (candidate->GetPinName() == name && (ecuName.empty() || candidate->GetEcuName() == ecuName))
        return i;
    }
    return -1;
  };
  int position = -1;
  if (HRESULT hr = ResolveIndex(index, pins.GetCount(), byName, kTextNoPin, position, ecuName); Failed(hr))
    return hr;
  pin = pins.GetAt(position);
  return pin ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
}

[[nodiscard]] HRESULT WrapperOf(QFCAbstractFailurePatternPin* pin, std::shared_ptr<QFCBaseFailurePatternPinImpl>& wrapper) {
  wrapper = pin ? QFCBaseFailurePatternPinImpl::Of(*pin) : nullptr;
  return wrapper ? FAULTBOX_OK : E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
}

}  // namespace

HRESULT QFCFailurePatternPinsImpl::Item(const Variant& index, const std::string& ecuName,
                                        std::shared_ptr<QFCBaseFailurePatternPinImpl>& failurePatternPin) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    failurePatternPin.reset();
    QFCAbstractFailurePatternPin* pin = nullptr;
    if (HRESULT hr = Resolve(*pattern.GetPins(), index, ecuName, pin); Failed(hr)) return hr;
    return WrapperOf(pin, failurePatternPin);
  });
}

HRESULT QFCFailurePatternPinsImpl::get_Count(std::int32_t& count) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    count = pattern.GetPinCount();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternPinsImpl::get_Names(std::vector<std::array<std::string, 2>>& names) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    names.clear();
    for (const auto& pin : pattern.GetPins()->GetList()) {
      // A pin the pin file lost still has its names; one without a pin has none to give.
      if (pin->GetPin() == nullptr)
        names.push_back({"", ""});
      else
        names.push_back({pin->GetEcuName(), pin->GetPinName()});
    }
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternPinsImpl::get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum) {
  return Call([&](QFCAbstractFailurePattern&) {
    newEnum = std::make_shared<QFCFaultboxComEnumVariant<QFCFailurePatternPinsImpl>>(shared_from_this());
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternPinsImpl::Add(const std::string& pinName, const std::string& ecuName,
                                       std::shared_ptr<QFCBaseFailurePatternPinImpl>& failurePatternPin) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    failurePatternPin.reset();
    QFCSystem* system = pattern.GetOwnerSystem();
    QFCAbstractPin* pin = system ? system->FindPin(ecuName, pinName) : nullptr;
    if (pin == nullptr)
      return RaiseError(E_FAULTBOX_INVALID_PARAMETER, AutomationText(kTextNoSystemPin, {pinName, ecuName}));
    if (!pattern.AddPins({pin})) return E_FAULTBOX;
    return WrapperOf(pattern.GetPins()->FindPin(pinName, ecuName), failurePatternPin);
  });
}

HRESULT QFCFailurePatternPinsImpl::Remove(const Variant& index, const std::string& ecuName) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    QFCAbstractFailurePatternPin* pin = nullptr;
    if (HRESULT hr = Resolve(*pattern.GetPins(), index, ecuName, pin); Failed(hr)) return hr;
    const bool activated = pin->IsActivated();
    // The pin is destroyed by the removal unless it is activated.
    const bool removed = pattern.RemovePins({pin});
    if (activated) return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
    return removed ? FAULTBOX_OK : E_FAULTBOX;
  });
}

int QFCFailurePatternPinsImpl::LiveCount() const {
  return GetOwner() ? GetOwner()->GetPinCount() : 0;
}

std::shared_ptr<QFCAutomationObject> QFCFailurePatternPinsImpl::LiveAt(int index) const {
  QFCAbstractFailurePatternPin* pin = GetOwner() ? GetOwner()->GetPins()->GetAt(index) : nullptr;
  if (pin == nullptr) return nullptr;
  return QFCBaseFailurePatternPinImpl::Of(*pin);
}

}  // namespace faultbox

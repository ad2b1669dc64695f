// The pattern pin wrappers.
#include "automation/QFCFailurePatternPinImpl.h"

#include "automation/AutomationLookup.h"
#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCInterfaceProvider.h"
#include "automation/QFCSystemImpl.h"
#include "config/QFCAbstractPin.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/kr40/QFCKR40FailurePatternPin.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgActivated = 165;
constexpr int kMsgDeactivated = 167;
constexpr int kTextPinWithoutClass = 6740;

// Pattern pins always belong to a pattern and stand for a pin; one that does
// not cannot be used.
bool Usable(const QFCAbstractFailurePatternPin& pin) {
  return pin.GetPattern() != nullptr && pin.GetPin() != nullptr;
}

}  // namespace

std::shared_ptr<QFCBaseFailurePatternPinImpl> QFCBaseFailurePatternPinImpl::Of(
    QFCAbstractFailurePatternPin& pin) {
  return QFCInterfaceProvider<QFCBaseFailurePatternPinImpl, QFCAbstractFailurePatternPin>::Of(
      pin, [](QFCAbstractFailurePatternPin& p) -> std::shared_ptr<QFCBaseFailurePatternPinImpl> {
        if (dynamic_cast<QFCKR60FailurePatternPin*>(&p))
          return std::make_shared<QFCFailurePatternKR60PinImpl>(&p);
        if (dynamic_cast<QFCKR40FailurePatternPin*>(&p))
          return std::make_shared<QFCFailurePatternKR40PinImpl>(&p);
        return nullptr;
      });
}

bool QFCBaseFailurePatternPinImpl::HasConfiguredClass(const QFCAbstractFailurePatternPin& pin) {
  return pin.GetFailureClassId() != -1 && pin.GetRelayVectorIndex() != -1;
}

HRESULT QFCBaseFailurePatternPinImpl::get_Name(std::string& name) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    name = pin.GetPinName();
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_EcuName(std::string& ecuName) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    ecuName = pin.GetEcuName();
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::Select() {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    if (!HasConfiguredClass(pin)) return E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED;
    pin.SetSelected(true);
    pin.GetPattern()->UpdateViews(QFCAbstractFailurePattern::kHintPinChanged, &pin);
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::Deselect() {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    pin.SetSelected(false);
    pin.GetPattern()->UpdateViews(QFCAbstractFailurePattern::kHintPinChanged, &pin);
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::IsSelected(VARIANT_BOOL& isSelected) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    isSelected = ToVariantBool(pin.IsSelected());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::IsActivated(VARIANT_BOOL& isActivated) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    isActivated = ToVariantBool(pin.IsActivated());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::CanBeActivated(VARIANT_BOOL& canActivate) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    canActivate = ToVariantBool(pin.CanBeActivated());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_AdjustedFailureClass(
    std::shared_ptr<QFCFailureClassImpl>& failureClass) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    failureClass.reset();
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    if (!HasConfiguredClass(pin)) return FAULTBOX_OK;
    std::int32_t id = 0;
    std::int32_t relayVector = -1;
    QFCAbstractFailureClass* adjusted = pin.GetAdjustedFailureClass(id, relayVector);
    QFCSystem* system = pin.GetPattern()->GetOwnerSystem();
    if (adjusted == nullptr || system == nullptr) return FAULTBOX_OK;
    failureClass = QFCSystemImpl::Of(*system)->ClassWrapper(*system, adjusted);
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_RefusalReason(std::string& reason) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    reason = pin.GetRefusalReason();
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::Activate() {
  return Switch(true);
}

HRESULT QFCBaseFailurePatternPinImpl::Deactivate() {
  return Switch(false);
}

HRESULT QFCBaseFailurePatternPinImpl::Switch(bool activate) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    QFCAbstractFailurePattern& pattern = *pin.GetPattern();
    // As the pattern's Activate with this pin: a pin without a class would
    // be left out, and the call would succeed with nothing switched.
    if (activate && !pin.IsActivated() && !HasConfiguredClass(pin))
      return RaiseError(E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED,
                        AutomationText(kTextPinWithoutClass, {pin.GetPinName(), pin.GetEcuName()}));
    pattern.SelectAllPins(false);
    pin.SetSelected(true);
    const HRESULT result = pattern.ActivatePattern(activate);
    if (result == FAULTBOX_OK)
      TheReporter().ReportInfo(activate ? kMsgActivated : kMsgDeactivated, pattern.GetName());
    return result;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::SetFailureClass(std::int32_t failureClassId,
                                                      const Variant& relayVector) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    std::int32_t index = 0;
    if (!IsMissing(relayVector) && !VariantToInt32(relayVector, index)) return E_FAULTBOX_INVALID_PARAMETER;
    return pin.GetPattern()->SetFailureClass(&pin, failureClassId, index);
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_DefinedFailureClasses(
    std::vector<std::int32_t>& definedFailureClasses) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    definedFailureClasses.clear();
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    for (int i = 0; i < pin.GetDefinedFailureClassCount(); ++i) {
      std::int32_t id = 0;
      if (HRESULT hr = pin.GetDefinedFailureClassId(i, id); Failed(hr)) return hr;
      definedFailureClasses.push_back(id);
    }
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_ModuleChannel(std::vector<std::int32_t>& channels) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    channels.clear();
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    std::vector<std::uint32_t> read;
    if (!pin.GetModuleChannels(read)) return E_FAULTBOX;
    channels.assign(read.begin(), read.end());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_PinConfig(std::vector<std::int32_t>& pinConfig) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    const auto& entries = pin.GetPinConfig();
    pinConfig.assign(entries.begin(), entries.end());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::get_AdjustedFailureClassID(std::int32_t& id,
                                                                 std::int32_t& relayVector) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    id = 0;
    relayVector = -1;
    if (!Usable(pin) || !HasConfiguredClass(pin)) return FAULTBOX_OK;
    std::int32_t adjustedId = 0;
    std::int32_t adjustedVector = -1;
    if (pin.GetAdjustedFailureClass(adjustedId, adjustedVector) != nullptr) {
      id = adjustedId;
      relayVector = adjustedVector;
    }
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternPinImpl::Reset() {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    if (pin.IsActivated()) return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
    QFCAbstractFailurePattern& pattern = *pin.GetPattern();
    if (!pattern.CheckWritable()) return E_FAULTBOX;
    pattern.ResetPinConfigs({&pin});
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternKR40PinImpl::get_ModuleAddress(std::int32_t& address) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    if (!Usable(pin)) return E_FAULTBOX_NULL_POINTER;
    std::uint32_t number = 0;
    if (!pin.GetModuleAddress(number)) return E_FAULTBOX;
    address = static_cast<std::int32_t>(number);
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternKR60PinImpl::get_ModuleAddress(std::int32_t& cabinet, std::int32_t& rack,
                                                        std::int32_t& slot) {
  return Call([&](QFCAbstractFailurePatternPin& pin) {
    const auto* kr60 = dynamic_cast<const QFCKR60Pin*>(pin.GetPin());
    if (kr60 == nullptr) return E_FAULTBOX_NULL_POINTER;
    std::uint32_t parts[3] = {0, 0, 0};
    if (kr60->GetLoadModuleId(parts[0], parts[1], parts[2]) != QFCAbstractPin::kPresent) return E_FAULTBOX;
    cabinet = static_cast<std::int32_t>(parts[0]);
    rack = static_cast<std::int32_t>(parts[1]);
    slot = static_cast<std::int32_t>(parts[2]);
    return FAULTBOX_OK;
  });
}

}  // namespace faultbox

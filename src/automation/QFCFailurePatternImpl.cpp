// The pattern wrappers: activation with and without a pin list, reset, and
// the relay states of KR60 patterns.
#include "automation/QFCFailurePatternImpl.h"

#include <cinttypes>
#include <cstdio>
#include <vector>

#include "automation/AutomationLookup.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "automation/QFCFailurePatternPinsImpl.h"
#include "automation/QFCInterfaceProvider.h"
#include "patterns/kr60/QFCCANMessageBuilder.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"

namespace faultbox {

namespace {

constexpr int kMsgActivated = 165;
constexpr int kMsgDeactivated = 167;
constexpr int kTextPinWithoutClass = 6740;

std::string HexText(std::uint64_t value) {
  char text[24];
  std::snprintf(text, sizeof text, "0x%" PRIX64, value);
  return text;
}

QFCKR60FailurePattern* AsKR60(QFCAbstractFailurePattern& pattern) {
  return dynamic_cast<QFCKR60FailurePattern*>(&pattern);
}

}  // namespace

std::shared_ptr<QFCBaseFailurePatternImpl> QFCBaseFailurePatternImpl::Of(QFCAbstractFailurePattern& pattern) {
  return QFCInterfaceProvider<QFCBaseFailurePatternImpl, QFCAbstractFailurePattern>::Of(
      pattern, [](QFCAbstractFailurePattern& p) -> std::shared_ptr<QFCBaseFailurePatternImpl> {
        if (dynamic_cast<QFCKR60FailurePattern*>(&p)) return std::make_shared<QFCFailurePatternKR60Impl>(&p);
        if (dynamic_cast<QFCKR40FailurePattern*>(&p)) return std::make_shared<QFCFailurePatternKR40Impl>(&p);
        return nullptr;
      });
}

void QFCBaseFailurePatternImpl::Detach() {
  QFCOwnerProvider::Detach();
  if (pins_) pins_->Detach();
}

HRESULT QFCBaseFailurePatternImpl::get_Pins(std::shared_ptr<QFCFailurePatternPinsImpl>& failurePatternPins) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    if (!pins_) pins_ = std::make_shared<QFCFailurePatternPinsImpl>(&pattern);
    failurePatternPins = pins_;
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternImpl::get_Name(std::string& name) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    name = pattern.GetName();
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternImpl::IsActivated(VARIANT_BOOL& isActivated) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    isActivated = ToVariantBool(pattern.IsAnyPinActivated());
    return FAULTBOX_OK;
  });
}

HRESULT QFCBaseFailurePatternImpl::Activate(const Variant& pins) {
  return Switch(pins, true);
}

HRESULT QFCBaseFailurePatternImpl::Deactivate(const Variant& pins) {
  return Switch(pins, false);
}

HRESULT QFCBaseFailurePatternImpl::Switch(const Variant& pins, bool activate) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    const bool whole = IsMissing(pins);
    std::vector<QFCAbstractFailurePatternPin*> chosen;
    if (!whole) {
      const QFTObjectArray* array = std::get_if<QFTObjectArray>(&pins);
      if (array == nullptr) return E_FAULTBOX_INVALID_PARAMETER;
      for (const auto& element : *array) {
        const auto* wrapper = dynamic_cast<const QFCBaseFailurePatternPinImpl*>(element.get());
        QFCAbstractFailurePatternPin* pin = wrapper ? wrapper->GetOwner() : nullptr;
        if (pin == nullptr || pin->GetPattern() != &pattern || !pattern.GetPins()->Contains(pin))
          return E_FAULTBOX_INVALID_PARAMETER;
        if (pin->IsActivated() == activate) continue;
        if (activate && !QFCBaseFailurePatternPinImpl::HasConfiguredClass(*pin))
          return RaiseError(E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED,
                            AutomationText(kTextPinWithoutClass, {pin->GetPinName(), pin->GetEcuName()}));
        chosen.push_back(pin);
      }
    }
    pattern.SelectAllPins(false);
    if (whole) pattern.SelectAllPins(true);
    for (QFCAbstractFailurePatternPin* pin : chosen) pin->SetSelected(true);
    const HRESULT result = pattern.ActivatePattern(activate);
    if (result == FAULTBOX_OK)
      TheReporter().ReportInfo(activate ? kMsgActivated : kMsgDeactivated, pattern.GetName());
    return result;
  });
}

HRESULT QFCBaseFailurePatternImpl::Reset() {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    if (pattern.IsAnyPinActivated()) return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
    return pattern.Reset() ? FAULTBOX_OK : E_FAULTBOX;
  });
}

// ---- KR60 ----

HRESULT QFCFailurePatternKR60Impl::get_FIURelayState(std::string& state) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    std::uint64_t vector = QFCCANMessageBuilder::kAllRelaysOff;
    for (const auto& listed : pattern.GetPins()->GetList()) {
      auto* pin = dynamic_cast<QFCKR60FailurePatternPin*>(listed.get());
      if (pin == nullptr || !QFCBaseFailurePatternPinImpl::HasConfiguredClass(*pin)) continue;
      for (std::size_t position = QFCCANMessageBuilder::kFirstFiuPosition;
           position < QFCCANMessageBuilder::kPositions; ++position) {
        std::uint32_t relay = 0;
        if (pin->GetRelayState(static_cast<int>(position), relay) && relay == 1)
          QFCCANMessageBuilder::WriteFiuRelay(vector, position, relay);
      }
    }
    state = HexText(vector);
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternKR60Impl::get_RsimRelayState(std::string& state) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    QFCKR60FailurePattern* kr60 = AsKR60(pattern);
    if (kr60 == nullptr) return E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
    std::uint64_t word = 0;
    if (!kr60->GetRsimRelayState(kr60->IsExternHardwareConnected(QFCKR60FailurePattern::kKindResistor), word))
      return E_FAULTBOX;
    state = HexText(word);
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternKR60Impl::get_ResistorValue(std::int32_t& value) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    QFCKR60FailurePattern* kr60 = AsKR60(pattern);
    if (kr60 == nullptr) return E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
    value = kr60->GetResistorValue();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternKR60Impl::put_ResistorValue(std::int32_t value) {
  return Call([&](QFCAbstractFailurePattern& pattern) {
    QFCKR60FailurePattern* kr60 = AsKR60(pattern);
    if (kr60 == nullptr) return E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
    return kr60->SetResistorValue(value);
  });
}

}  // namespace faultbox

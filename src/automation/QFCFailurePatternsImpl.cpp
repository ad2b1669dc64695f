// The pattern collection wrapper.
#include "automation/QFCFailurePatternsImpl.h"

#include "automation/AutomationLookup.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFailurePatternImpl.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCFailurePatterns.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kTextPatternNameUsed = 6716;
constexpr int kTextNoPattern = 6717;

[[nodiscard]] HRESULT Resolve(const QFCFailurePatterns& patterns, const Variant& index,
                QFCAbstractFailurePattern*& pattern) {
  pattern = nullptr;
  auto byName = [&](const std::string& name) { return patterns.IndexOf(patterns.FindPattern(name)); };
  int position = -1;
  if (HRESULT hr = ResolveIndex(index, patterns.GetCount(), byName, kTextNoPattern, position); Failed(hr))
    return hr;
  pattern = patterns.GetAt(position);
  return pattern ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
}

}  // namespace

HRESULT QFCFailurePatternsImpl::Item(const Variant& index,
                                     std::shared_ptr<QFCBaseFailurePatternImpl>& failurePattern) {
  return Call([&](QFCSystem& system) {
    failurePattern.reset();
    QFCAbstractFailurePattern* pattern = nullptr;
    if (HRESULT hr = Resolve(*system.GetFailurePatterns(), index, pattern); Failed(hr)) return hr;
    failurePattern = QFCBaseFailurePatternImpl::Of(*pattern);
    return failurePattern ? FAULTBOX_OK : E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  });
}

HRESULT QFCFailurePatternsImpl::get_Count(std::int32_t& count) {
  return Call([&](QFCSystem& system) {
    count = system.GetFailurePatterns()->GetCount();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternsImpl::get_Names(std::vector<std::string>& names) {
  return Call([&](QFCSystem& system) {
    names.clear();
    const QFCFailurePatterns& patterns = *system.GetFailurePatterns();
    for (int i = 0; i < patterns.GetCount(); ++i) names.push_back(patterns.GetAt(i)->GetName());
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternsImpl::get_ActivatedFailurePattern(
    std::shared_ptr<QFCBaseFailurePatternImpl>& pattern) {
  return Call([&](QFCSystem& system) {
    pattern.reset();
    QFCAbstractFailurePattern* activated = nullptr;
    if (!system.GetFailurePatterns()->GetActivatedPattern(activated) || activated == nullptr)
      return FAULTBOX_OK;
    pattern = QFCBaseFailurePatternImpl::Of(*activated);
    return pattern ? FAULTBOX_OK : E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  });
}

HRESULT QFCFailurePatternsImpl::get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum) {
  return Call([&](QFCSystem&) {
    newEnum = std::make_shared<QFCFaultboxComEnumVariant<QFCFailurePatternsImpl>>(shared_from_this());
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailurePatternsImpl::Add(const std::string& name,
                                    std::shared_ptr<QFCBaseFailurePatternImpl>& failurePattern) {
  return Call([&](QFCSystem& system) {
    failurePattern.reset();
    QFCAbstractFailurePattern* created = nullptr;
    if (HRESULT hr = system.CreatePattern(name, created); Failed(hr)) {
      // The code's own text speaks of systems; this name belongs to a pattern.
      if (hr == E_FAULTBOX_NAME_NOT_UNIQUE)
        return RaiseError(hr, AutomationText(kTextPatternNameUsed, {name}));
      return hr;
    }
    if (created == nullptr) return E_FAULTBOX;
    failurePattern = QFCBaseFailurePatternImpl::Of(*created);
    return failurePattern ? FAULTBOX_OK : E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  });
}

HRESULT QFCFailurePatternsImpl::Remove(const Variant& index) {
  return Call([&](QFCSystem& system) {
    QFCAbstractFailurePattern* pattern = nullptr;
    if (HRESULT hr = Resolve(*system.GetFailurePatterns(), index, pattern); Failed(hr)) return hr;
    const bool activated = pattern->IsAnyPinActivated();
    // The name is copied: the removal destroys the pattern that holds it.
    const std::string name = pattern->GetName();
    if (system.RemovePattern(name)) return FAULTBOX_OK;
    return activated ? E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED : E_FAULTBOX;
  });
}

int QFCFailurePatternsImpl::LiveCount() const {
  return GetOwner() ? GetOwner()->GetFailurePatterns()->GetCount() : 0;
}

std::shared_ptr<QFCAutomationObject> QFCFailurePatternsImpl::LiveAt(int index) const {
  QFCAbstractFailurePattern* pattern = GetOwner() ? GetOwner()->GetFailurePatterns()->GetAt(index) : nullptr;
  if (pattern == nullptr) return nullptr;
  return QFCBaseFailurePatternImpl::Of(*pattern);
}

}  // namespace faultbox

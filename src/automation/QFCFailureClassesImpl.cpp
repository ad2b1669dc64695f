// The failure class collection and failure class wrappers.
#include "automation/QFCFailureClassesImpl.h"

#include "automation/AutomationLookup.h"
#include "automation/QFCSystemImpl.h"
#include "config/QFCAbstractFailureClasses.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kTextNoClass = 6728;

QFCAbstractFailureClasses* ClassesOf(const QFCSystem* system) {
  return system ? system->GetFailureClasses() : nullptr;
}

bool Holds(const QFCAbstractFailureClasses* classes, const QFCAbstractFailureClass* failureClass) {
  for (int i = 0; classes != nullptr && i < classes->GetCount(); ++i)
    if (classes->GetAt(i) == failureClass) return true;
  return false;
}

}  // namespace

// ---- collection ----

HRESULT QFCFailureClassesImpl::Item(const Variant& index,
                                    std::shared_ptr<QFCFailureClassImpl>& failureClass) {
  return Call([&](QFCSystem& system) {
    failureClass.reset();
    QFCAbstractFailureClasses* classes = ClassesOf(&system);
    if (classes == nullptr) return E_FAULTBOX_NULL_POINTER;
    auto byName = [&](const std::string& name) {
      for (int i = 0; i < classes->GetCount(); ++i)
        if (classes->GetAt(i)->GetName() == name) return i;
      return -1;
    };
    int position = -1;
    if (HRESULT hr = ResolveIndex(index, classes->GetCount(), byName, kTextNoClass, position); Failed(hr))
      return hr;
    failureClass = QFCSystemImpl::Of(system)->ClassWrapper(system, classes->GetAt(position));
    return failureClass ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
  });
}

HRESULT QFCFailureClassesImpl::get_Count(std::int32_t& count) {
  return Call([&](QFCSystem& system) {
    const QFCAbstractFailureClasses* classes = ClassesOf(&system);
    count = classes ? classes->GetCount() : 0;
    return classes ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
  });
}

HRESULT QFCFailureClassesImpl::get_Names(std::vector<std::string>& names) {
  return Call([&](QFCSystem& system) {
    names.clear();
    const QFCAbstractFailureClasses* classes = ClassesOf(&system);
    if (classes == nullptr) return E_FAULTBOX_NULL_POINTER;
    for (int i = 0; i < classes->GetCount(); ++i) names.push_back(classes->GetAt(i)->GetName());
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassesImpl::get_Version(std::string& version) {
  return Call([&](QFCSystem& system) {
    const QFCAbstractFailureClasses* classes = ClassesOf(&system);
    if (classes == nullptr) return E_FAULTBOX_NULL_POINTER;
    version = classes->GetVersion();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassesImpl::get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum) {
  return Call([&](QFCSystem&) {
    newEnum = std::make_shared<QFCFaultboxComEnumVariant<QFCFailureClassesImpl>>(shared_from_this());
    return FAULTBOX_OK;
  });
}

int QFCFailureClassesImpl::LiveCount() const {
  const QFCAbstractFailureClasses* classes = ClassesOf(GetOwner());
  return classes ? classes->GetCount() : 0;
}

std::shared_ptr<QFCAutomationObject> QFCFailureClassesImpl::LiveAt(int index) const {
  QFCSystem* system = GetOwner();
  QFCAbstractFailureClasses* classes = ClassesOf(system);
  if (classes == nullptr) return nullptr;
  return QFCSystemImpl::Of(*system)->ClassWrapper(*system, classes->GetAt(index));
}

// ---- one class ----

bool QFCFailureClassImpl::IsAttached() const {
  return GetOwner() != nullptr && Holds(ClassesOf(system_), GetOwner());
}

void QFCFailureClassImpl::Detach() {
  system_ = nullptr;
  QFCOwnerProvider::Detach();
}

template <class Body>
HRESULT QFCFailureClassImpl::Read(Body&& body) {
  // A class that left the collection is gone for good, even if another
  // class later takes its place in memory.
  if (GetOwner() != nullptr && !IsAttached()) Detach();
  return Call(std::forward<Body>(body));
}

HRESULT QFCFailureClassImpl::get_Name(std::string& name) {
  return Read([&](QFCAbstractFailureClass& c) {
    name = c.GetName();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassImpl::get_Description(std::string& description) {
  return Read([&](QFCAbstractFailureClass& c) {
    description = c.GetDescription();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassImpl::get_Limitation(std::string& limitation) {
  return Read([&](QFCAbstractFailureClass& c) {
    limitation = c.GetLimitation();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassImpl::get_Format(std::string& format) {
  return Read([&](QFCAbstractFailureClass& c) {
    format = c.GetFormat();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassImpl::get_ID(std::int32_t& id) {
  return Read([&](QFCAbstractFailureClass& c) {
    id = c.GetId();
    return FAULTBOX_OK;
  });
}

HRESULT QFCFailureClassImpl::get_RelayVectorSize(std::int32_t& size) {
  return Read([&](QFCAbstractFailureClass& c) {
    size = c.GetPossibilityCount();
    return FAULTBOX_OK;
  });
}

}  // namespace faultbox

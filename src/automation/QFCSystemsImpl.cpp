// Look-up, opening and closing of the systems of scripts.
#include "automation/QFCSystemsImpl.h"

#include "automation/AutomationLookup.h"
#include "automation/QFCOpenDocuments.h"
#include "automation/QFCSystemImpl.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {
constexpr int kTextNoSystem = 6714;
}

std::shared_ptr<QFCSystemImpl> QFCSystemsImpl::WrapperAt(QFCOpenDocuments& documents, int index) const {
  QFCSystem* system = documents.GetAdmin().GetAt(index);
  if (system == nullptr) return nullptr;
  std::shared_ptr<QFCSystemImpl> wrapper = QFCSystemImpl::Of(*system);
  wrapper->SetDocuments(&documents);
  return wrapper;
}

HRESULT QFCSystemsImpl::Item(const Variant& index, std::shared_ptr<QFCSystemImpl>& system) {
  return Call([&](QFCOpenDocuments& documents) {
    system.reset();
    const QFCSystemAdmin& admin = documents.GetAdmin();
    int position = -1;
    auto byName = [&](const std::string& name) {
      const QFCSystem* found = admin.FindByName(name);
      for (int i = 0; found != nullptr && i < admin.GetCount(); ++i)
        if (admin.GetAt(i) == found) return i;
      return -1;
    };
    if (HRESULT hr = ResolveIndex(index, admin.GetCount(), byName, kTextNoSystem, position); Failed(hr))
      return hr;
    system = WrapperAt(documents, position);
    return system ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
  });
}

HRESULT QFCSystemsImpl::get_Count(std::int32_t& count) {
  return Call([&](QFCOpenDocuments& documents) {
    count = documents.GetAdmin().GetCount();
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemsImpl::get_Names(std::vector<std::string>& names) {
  return Call([&](QFCOpenDocuments& documents) {
    names.clear();
    const QFCSystemAdmin& admin = documents.GetAdmin();
    for (int i = 0; i < admin.GetCount(); ++i) names.push_back(admin.GetAt(i)->GetName());
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemsImpl::Open(const std::string& fileName, const std::string& pinFile,
                             std::shared_ptr<QFCSystemImpl>& system) {
  return Call([&](QFCOpenDocuments& documents) {
    system.reset();
    QFCSystem* opened = nullptr;
    if (HRESULT hr = documents.Open(fileName, pinFile, opened); Failed(hr)) return hr;
    system = QFCSystemImpl::Of(*opened);
    system->SetDocuments(&documents);
    return FAULTBOX_OK;
  });
}

HRESULT QFCSystemsImpl::CloseAll() {
  return Call([&](QFCOpenDocuments& documents) { return documents.CloseAll(); });
}

HRESULT QFCSystemsImpl::get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum) {
  return Call([&](QFCOpenDocuments&) {
    newEnum = std::make_shared<QFCFaultboxComEnumVariant<QFCSystemsImpl>>(shared_from_this());
    return FAULTBOX_OK;
  });
}

int QFCSystemsImpl::LiveCount() const {
  return GetOwner() ? GetOwner()->GetAdmin().GetCount() : 0;
}

std::shared_ptr<QFCAutomationObject> QFCSystemsImpl::LiveAt(int index) const {
  return GetOwner() ? WrapperAt(*GetOwner(), index) : nullptr;
}

}  // namespace faultbox

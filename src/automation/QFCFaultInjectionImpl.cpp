// The root object and the hardware choice of scripts.
#include "automation/QFCFaultInjectionImpl.h"

#include "automation/QFCOpenDocuments.h"
#include "automation/QFCSystemsImpl.h"
#include "platform/QFCReporter.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {
QFTScriptHardware& ScriptHardware() {
  static QFTScriptHardware hardware;
  return hardware;
}
}  // namespace

std::shared_ptr<QFCFaultInjectionImpl> QFCFaultInjectionImpl::Create() {
  if (TheReporter().Module() == nullptr) TheReporter().StartReporting();
  auto documents = std::make_unique<QFCOpenDocuments>();
  return std::shared_ptr<QFCFaultInjectionImpl>(new QFCFaultInjectionImpl(std::move(documents)));
}

QFCFaultInjectionImpl::QFCFaultInjectionImpl(std::unique_ptr<QFCOpenDocuments> documents)
    : QFCOwnerProvider(documents.get()), documents_(std::move(documents)) {}

QFCFaultInjectionImpl::~QFCFaultInjectionImpl() {
  Detach();
  documents_.reset();
}

HRESULT QFCFaultInjectionImpl::get_Name(std::string& name) {
  return Call([&](QFCOpenDocuments&) {
    name = kComponentName;
    return FAULTBOX_OK;
  });
}

HRESULT QFCFaultInjectionImpl::get_Systems(std::shared_ptr<QFCSystemsImpl>& systems) {
  return Call([&](QFCOpenDocuments& documents) {
    systems = documents.GetWrapper();
    return systems ? FAULTBOX_OK : E_FAULTBOX_NULL_POINTER;
  });
}

HRESULT QFCFaultInjectionImpl::get_ConnectedSystem(std::vector<std::string>& names) {
  return Call([&](QFCOpenDocuments& documents) {
    names.clear();
    std::vector<QFCSystem*> connected;
    documents.GetAdmin().GetConnectedSystems(connected);
    for (const QFCSystem* system : connected) names.push_back(system->GetName());
    return FAULTBOX_OK;
  });
}

HRESULT QFCFaultInjectionImpl::SelectHardware(const std::string& choice) {
  return Call([&](QFCOpenDocuments&) {
    const QFTScriptHardware& hardware = ScriptHardware();
    return hardware.select ? hardware.select(choice) : E_NOTIMPL;
  });
}

void QFCFaultInjectionImpl::SetScriptHardware(QFTScriptHardware hardware) {
  ScriptHardware() = std::move(hardware);
}

const QFTScriptHardware& QFCFaultInjectionImpl::GetScriptHardware() {
  return ScriptHardware();
}

}  // namespace faultbox

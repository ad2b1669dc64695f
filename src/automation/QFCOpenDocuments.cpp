// Opening, closing and saving the documents of scripts.
#include "automation/QFCOpenDocuments.h"

#include <algorithm>

#include "automation/AutomationLookup.h"
#include "automation/QFCAutomationCall.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemsImpl.h"
#include "platform/QFCReporter.h"
#include "platform/FileHelper.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {
constexpr int kMsgFileMissing = 46;
constexpr int kMsgOpenWithOtherPinFile = 66;
constexpr int kTextCannotOpen = 6715;
}  // namespace

QFCOpenDocuments::QFCOpenDocuments() = default;

QFCOpenDocuments::~QFCOpenDocuments() {
  if (wrapper_) wrapper_->Detach();
  documents_.clear();
}

std::shared_ptr<QFCSystemsImpl> QFCOpenDocuments::GetWrapper() {
  if (!wrapper_) wrapper_ = std::make_shared<QFCSystemsImpl>(this);
  return wrapper_;
}

HRESULT QFCOpenDocuments::Open(const std::string& fileName, const std::string& pinFile, QFCSystem*& system) {
  system = nullptr;
  for (const std::string* path : {&fileName, &pinFile}) {
    if (path == &pinFile && pinFile.empty()) continue;
    if (!QFCFileHelper::Exists(*path) || QFCFileHelper::IsDirectory(*path)) {
      TheReporter().ReportError(kMsgFileMissing, *path);
      return RaiseError(E_FAULTBOX_CANN_NOT_OPEN_FILE, AutomationText(kTextCannotOpen, {*path}));
    }
  }
  auto document = std::make_unique<QFCFaultboxDoc>(admin_, QFCFaultboxDoc::PlatformOfPath(fileName));
  if (!pinFile.empty()) document->SetPinFileReplacement(pinFile);
  if (!document->OnOpenDocument(fileName)) {
    // Open already: the script works on that system, as a second copy
    // of the document cannot exist.
    if (QFCSystem* open = document->GetAlreadyOpenSystem();
        open != nullptr && FindDocument(open) != nullptr) {
      // The open system stays on its pin file: going on with it would leave
      // the script on a wiring it did not ask for.
      if (!pinFile.empty() &&
          !QFCFileHelper::SameFile(open->GetPinFilePath(), QFCFileHelper::GetAbsolutePath(pinFile, {}))) {
        TheReporter().ReportError(kMsgOpenWithOtherPinFile, open->GetName(), open->GetPinFilePath());
        return E_FAULTBOX_INVALID_PARAMETER;
      }
      system = open;
      return FAULTBOX_OK;
    }
    std::string description = AutomationText(kTextCannotOpen, {fileName});
    if (std::string reasons = ReasonsReportedInCall(); !reasons.empty()) description += " " + reasons;
    return RaiseError(E_FAULTBOX_FILE_IS_NOT_OPENED, std::move(description));
  }
  QFCSystem* opened = document->GetSystem();
  if (const auto& prepare = QFCFaultInjectionImpl::GetScriptHardware().systemOpened) {
    // A system without the hardware the script chose must not reach another.
    if (const HRESULT prepared = prepare(*opened); Failed(prepared)) {
      document->OnCloseDocument();
      return prepared;
    }
  }
  system = opened;
  documents_.push_back(std::move(document));
  return FAULTBOX_OK;
}

QFCFaultboxDoc* QFCOpenDocuments::FindDocument(const QFCSystem* system) const {
  if (system == nullptr) return nullptr;
  for (const auto& document : documents_)
    if (document->GetSystem() == system) return document.get();
  return nullptr;
}

HRESULT QFCOpenDocuments::Close(const QFCSystem* system) {
  const auto it = std::find_if(documents_.begin(), documents_.end(), [&](const auto& document) {
    return system && document->GetSystem() == system;
  });
  if (it == documents_.end()) return E_FAULTBOX;
  if (!(*it)->OnCloseDocument()) return E_FAULTBOX;
  documents_.erase(it);
  return FAULTBOX_OK;
}

HRESULT QFCOpenDocuments::CloseAll() {
  HRESULT result = FAULTBOX_OK;
  // Every document that can be closed is, even behind one that stays.
  for (auto it = documents_.begin(); it != documents_.end();) {
    if ((*it)->OnCloseDocument()) {
      it = documents_.erase(it);
    } else {
      result = E_FAULTBOX;
      ++it;
    }
  }
  return result;
}

HRESULT QFCOpenDocuments::Save(const QFCSystem* system) {
  QFCFaultboxDoc* document = FindDocument(system);
  if (document == nullptr) return E_FAULTBOX;
  return document->OnSaveDocument(document->GetPathName()) ? FAULTBOX_OK : E_FAULTBOX;
}

}  // namespace faultbox

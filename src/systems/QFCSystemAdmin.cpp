// Names, lookup and removal of the open systems.
#include "systems/QFCSystemAdmin.h"

#include "patterns/QFCAbstractFailurePattern.h"

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "platform/FileHelper.h"
#include "platform/MessageTable.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgNameUsed = 88;
constexpr int kMsgSystemClosed = 117;
constexpr int kDefaultNameFormat = 6799;

constexpr int kPlaceRenameInvalid = 5201;
constexpr int kPlaceSameHilInvalid = 5202;

// The resource format with its one integer placeholder filled in. Formatted
// by hand: the format comes from a table, never from printf's format argument.
std::string FormatDefaultName(int number) {
  const char* format = ResourceString(kDefaultNameFormat);
  std::string text = format ? format : "System %d";
  for (const char* placeholder : {"%d", "%i"}) {
    if (std::size_t at = text.find(placeholder); at != std::string::npos)
      return text.replace(at, 2, std::to_string(number));
  }
  return text + " " + std::to_string(number);
}

// A saved system is named after its document's path, and two documents are
// one when they are one file: Linux file names regard case, so "Bench.fsa"
// and "bench.fsa" may be two documents, and a link to a document is that
// document. Other names (the default names of unsaved systems) compare
// without regard to case.
bool SameName(std::string_view a, std::string_view b) {
  if (!a.empty() && !b.empty() && a.front() == '/' && b.front() == '/')
    return QFCFileHelper::SameFile(std::string(a), std::string(b));
  return QFCFSHelper::EqualNoCase(a, b);
}

}  // namespace

QFCSystemAdmin::QFCSystemAdmin() = default;

QFCSystemAdmin::~QFCSystemAdmin() = default;

std::string QFCSystemAdmin::GetDefaultName() const {
  // Among count + 1 numbers one is always free.
  const int last = GetCount() + 1;
  for (int number = 1; number < last; ++number) {
    std::string name = FormatDefaultName(number);
    if (!IsNameUsed(name)) return name;
  }
  return FormatDefaultName(last);
}

HRESULT QFCSystemAdmin::Open(const std::string& pinFile, std::int32_t ecuVersion, const std::string& author,
                             const std::string& description, QFCSystem*& system) {
  system = nullptr;
  auto created = std::make_unique<QFCSystem>(GetDefaultName(), pinFile, ecuVersion, author, description);
  created->SetAdministration(this);
  if (HRESULT result = created->OpenFromPinFile(); result != FAULTBOX_OK) return result;
  system = created.get();
  systems_.push_back(std::move(created));
  system->UpdateViews();
  return FAULTBOX_OK;
}

QFCSystem* QFCSystemAdmin::FindByName(std::string_view name) const {
  for (const auto& system : systems_)
    if (SameName(system->GetName(), name)) return system.get();
  return nullptr;
}

bool QFCSystemAdmin::IsNameUsed(std::string_view name, const QFCSystem* ignore) const {
  for (const auto& system : systems_)
    if (system.get() != ignore && SameName(system->GetName(), name)) return true;
  return false;
}

QFCSystem* QFCSystemAdmin::GetAt(int index) const {
  if (index < 0 || index >= GetCount()) return nullptr;
  return systems_[static_cast<std::size_t>(index)].get();
}

void QFCSystemAdmin::Remove(const std::string& name) {
  for (auto it = systems_.begin(); it != systems_.end(); ++it) {
    if (!SameName((*it)->GetName(), name)) continue;
    TheReporter().ReportInfo(kMsgSystemClosed, (*it)->GetName());
    // Destroying the system disconnects it without reports.
    systems_.erase(it);
    return;
  }
}

void QFCSystemAdmin::Discard(const QFCSystem* system) {
  for (auto it = systems_.begin(); it != systems_.end(); ++it) {
    if (it->get() != system) continue;
    systems_.erase(it);
    return;
  }
}

bool QFCSystemAdmin::Rename(QFCSystem* system, const std::string& newName) {
  if (system == nullptr) {
    TheReporter().ReportInternalFault(kPlaceRenameInvalid);
    return false;
  }
  if (IsNameUsed(newName, system)) {
    TheReporter().ReportError(kMsgNameUsed, newName);
    return false;
  }
  system->SetName(newName);
  return true;
}

QFCSystem* QFCSystemAdmin::FindOtherSystemOnSameHil(const QFCSystem* system) const {
  if (system == nullptr) {
    TheReporter().ReportInternalFault(kPlaceSameHilInvalid);
    return nullptr;
  }
  if (system->GetPlatformType() == 1) return nullptr;
  bool ownRead = false;
  std::uint32_t own = 0;
  for (const auto& other : systems_) {
    if (other.get() == system || !other->IsConnected()) continue;
    if (!ownRead) {
      if (Failed(system->GetLoadAddress("FIULoadAddress", own))) own = 0;
      ownRead = true;
    }
    std::uint32_t theirs = 0;
    if (Failed(other->GetLoadAddress("FIULoadAddress", theirs))) theirs = 0;
    if (own == theirs && other->GetPlatformType() == system->GetPlatformType()) return other.get();
  }
  return nullptr;
}

void QFCSystemAdmin::GetConnectedSystems(std::vector<QFCSystem*>& systems) const {
  for (const auto& system : systems_)
    if (system->IsConnected()) systems.push_back(system.get());
}

HRESULT QFCSystemAdmin::DeactivateAll() {
  HRESULT first = FAULTBOX_OK;
  for (const auto& system : systems_) {
    QFCAbstractFailurePattern* pattern = nullptr;
    if (!system->HasActivatedPattern(pattern) || pattern == nullptr) continue;
    pattern->SelectAllPins(true);
    const HRESULT result = pattern->ActivatePattern(false);
    pattern->SelectAllPins(false);
    if (result != FAULTBOX_OK && first == FAULTBOX_OK) first = result;
  }
  return first;
}

}  // namespace faultbox

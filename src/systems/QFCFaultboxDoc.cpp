// The life of a document (new, open, save, close), the search for its pin
// file, and the file layout that stores its system.
#include "systems/QFCFaultboxDoc.h"

#include <sys/stat.h>
#include <unistd.h>

#include "config/QFCAbstractHardwareInfo.h"
#include "config/kr40/QFCKR40HardwareInfo.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"
#include "platform/AtomicFile.h"
#include "platform/FileHelper.h"
#include "platform/MessageTable.h"
#include "platform/Text.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace faultbox {

namespace {

constexpr int kMsgFileUnusable = 46;
constexpr int kMsgWrongBoardType = 49;
constexpr int kMsgOtherPinFile = 64;
constexpr int kMsgCannotOpenSystem = 83;
constexpr int kMsgInconsistentPinFile = 84;
constexpr int kMsgActivatedPattern = 85;
constexpr int kMsgDocumentCreated = 115;
constexpr int kMsgSystemLoaded = 116;
constexpr int kMsgReadOnly = 118;
constexpr int kMsgDifferentFromPinFile = 143;
constexpr int kMsgLoadingStarts = 155;
constexpr int kMsgLoadingEnded = 156;
constexpr int kMsgSaveLoadFailed = 178;
constexpr int kMsgNewerVersion = 179;

constexpr int kShown = 1;

constexpr int kTemplateKR60 = 6701;
constexpr int kTemplateKR40 = 6752;
// The filter extension is the fifth newline-separated field of a template text.
constexpr int kExtensionField = 4;

constexpr int kPlaceNoSystemAfterCreate = 5101;
constexpr int kPlaceOpenFailed = 5102;
constexpr int kPlaceSecondSystem = 5103;
constexpr int kPlaceNoSystemToSave = 5104;

std::string TemplateField(int id, int field) {
  const char* text = ResourceString(id);
  if (text == nullptr) return {};
  std::string_view rest = text;
  for (int i = 0; i < field; ++i) {
    const std::size_t next = rest.find('\n');
    if (next == std::string_view::npos) return {};
    rest.remove_prefix(next + 1);
  }
  return std::string(rest.substr(0, rest.find('\n')));
}

// What a save or a relative path is taken against: the path as the kernel
// sees it, independent of the working folder of a later run.
std::string Absolute(const std::string& path) {
  return QFCFileHelper::GetAbsolutePath(path, std::string());
}

// A pin file that can be read is usable, write-protected or not.
bool IsUsable(const std::string& path) {
  if (path.empty()) return false;
  const std::string native = QFCFileHelper::ToNative(path);
  struct stat st {};
  return ::stat(native.c_str(), &st) == 0 && S_ISREG(st.st_mode) && ::access(native.c_str(), R_OK) == 0;
}

// The board types message 49 names as fitting the document kind.
std::string ExpectedBoardTypes(std::int32_t platform) {
  if (platform == fptKR40Platform) return "KR40 or KR80";
  if (platform == fptKR60Platform) return "KR60";
  return std::to_string(platform);
}

}  // namespace

std::string QFCFaultboxDoc::VersionText() {
  return "** Failure Simulation File Version " + std::to_string(kFileVersion) + " **";
}

std::string QFCFaultboxDoc::ExtensionOfPlatform(std::int32_t platform) {
  if (platform == fptKR40Platform) return TemplateField(kTemplateKR40, kExtensionField);
  if (platform == fptKR60Platform) return TemplateField(kTemplateKR60, kExtensionField);
  return {};
}

std::int32_t QFCFaultboxDoc::PlatformOfPath(const std::string& path) {
  const std::string name = QFCFileHelper::FileName(path);
  const std::size_t dot = name.rfind('.');
  if (dot == std::string::npos) return 0;
  const std::string_view extension = std::string_view(name).substr(dot);
  for (std::int32_t platform : {fptKR40Platform, fptKR60Platform})
    if (EqualsNoCase(extension, ExtensionOfPlatform(platform))) return platform;
  return 0;
}

QFCFaultboxDoc::QFCFaultboxDoc(QFCSystemAdmin& admin, std::int32_t platform)
    : admin_(admin), platform_(platform) {}

QFCFaultboxDoc::~QFCFaultboxDoc() {
  DiscardSystem();
}

void QFCFaultboxDoc::DiscardSystem() {
  if (system_ == nullptr) return;
  admin_.Discard(system_);
  system_ = nullptr;
}

std::string QFCFaultboxDoc::GetTitle() const {
  return system_ ? system_->GetName() : std::string();
}

bool QFCFaultboxDoc::IsModified() const {
  return system_ != nullptr && system_->IsModified();
}

// ---- new and open ----

bool QFCFaultboxDoc::OnNewDocument(const std::string& pinFile, std::int32_t ecuVersion,
                                   const std::string& author, const std::string& description) {
  // A new document has no folder of its own to look for its pin file in.
  archivePath_.clear();
  if (CreateSystem(pinFile, ecuVersion, author, description) != FAULTBOX_OK) return false;
  TheReporter().ReportInfo(kMsgDocumentCreated, system_->GetName());
  system_->SetModified();
  return true;
}

bool QFCFaultboxDoc::OnOpenDocument(const std::string& path) {
  const std::string full = Absolute(path);
  // The check comes before reading, as a FIFO or a device must not block the open.
  std::string error;
  struct stat st {};
  const std::string native = QFCFileHelper::ToNative(full);
  if (::stat(native.c_str(), &st) == 0 && !S_ISREG(st.st_mode)) {
    TheReporter().ReportInfo(kMsgLoadingStarts);
    ReportSaveLoadException(full, "not a regular file: " + full);
    return false;
  }
  const auto bytes = ReadWholeFile(native, &error);
  if (!bytes) {
    TheReporter().ReportInfo(kMsgLoadingStarts);
    ReportSaveLoadException(full, error);
    return false;
  }
  return Load(full, *bytes);
}

bool QFCFaultboxDoc::OpenFromBytes(const std::string& path, const std::vector<std::uint8_t>& bytes) {
  return Load(Absolute(path), bytes);
}

bool QFCFaultboxDoc::Load(const std::string& path, const std::vector<std::uint8_t>& bytes) {
  TheReporter().ReportInfo(kMsgLoadingStarts);
  alreadyOpen_ = nullptr;
  if (system_ != nullptr) {
    // One document, one system: a second load would orphan the first.
    TheReporter().ReportInternalFault(kPlaceSecondSystem);
    return false;
  }
  // A file of no document kind is not read at all: its first bytes would
  // only be taken for a file version.
  if (platform_ != fptKR40Platform && platform_ != fptKR60Platform) {
    TheReporter().ReportError(kMsgWrongBoardType, path, {}, kShown);
    return false;
  }
  if (!pinFileReplacement_.empty()) changedOnLoad_ = true;
  if (QFCSystem* open = admin_.FindByName(path)) {
    // The document is open already: show that one instead of a second copy.
    alreadyOpen_ = open;
    open->UpdateViews();
    return false;
  }

  archivePath_ = path;
  try {
    Archive ar(bytes);
    Serialize(ar);
  } catch (const ArchiveException& e) {
    DiscardSystem();
    ReportSaveLoadException(path, e);
    return false;
  }
  if (!loaded_ || system_ == nullptr) {
    DiscardSystem();
    return false;
  }
  pathName_ = path;
  system_->SetDocumentPath(path);
  system_->GetFailurePatterns()->OpenSavedViews();
  // Loading itself marks the system modified at every step; what counts is
  // whether the file no longer says what the system now holds.
  system_->ClearModified();
  if (changedOnLoad_) system_->SetModified();
  TheReporter().ReportInfo(kMsgLoadingEnded);
  return true;
}

// ---- the file ----

void QFCFaultboxDoc::Serialize(Archive& ar) {
  loaded_ = false;
  if (ar.IsStoring())
    Store(ar);
  else
    LoadFrom(ar);
  loaded_ = true;
}

void QFCFaultboxDoc::Store(Archive& ar) {
  if (system_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoSystemToSave);
    throw ArchiveException(ArchiveCause::kGeneric, "no system to store");
  }
  ar.WriteU32(kFileVersion);
  ar.WriteString(QFCFileHelper::GetRelativePath(system_->GetName(), archivePath_));
  ar.WriteString(system_->GetAuthor());
  ar.WriteString(system_->GetDescription());
  ar.WriteString(QFCFileHelper::GetRelativePath(system_->GetPinFilePath(), archivePath_));
  ar.WriteI32(system_->GetECUVersion());
  system_->Serialize(ar);
  ar.WriteString(VersionText());
}

void QFCFaultboxDoc::LoadFrom(Archive& ar) {
  const std::uint32_t version = ar.ReadU32();
  if (version > kFileVersion) {
    TheReporter().ReportError(kMsgNewerVersion, archivePath_, std::to_string(version), kShown);
    throw ArchiveException(ArchiveCause::kGeneric, "file version " + std::to_string(version));
  }
  // The stored name is the document's own path at saving; the document's
  // path now is what counts.
  ar.ReadString();
  const std::string author = ar.ReadString();
  const std::string description = ar.ReadString();
  // Relative to the document; the case stays as written, since Linux file
  // names regard it.
  const std::string pinFile = QFCFileHelper::GetAbsolutePath(ar.ReadString(), archivePath_);
  const std::int32_t ecuVersion = ar.ReadI32();

  if (HRESULT result = CreateSystem(pinFile, ecuVersion, author, description); result != FAULTBOX_OK) {
    // The reasons have been reported; the load ends here.
    throw ArchiveException(ArchiveCause::kGeneric, "no system for the pin file " + pinFile);
  }
  if (system_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoSystemAfterCreate);
    throw ArchiveException(ArchiveCause::kGeneric, "no system");
  }

  system_->Serialize(ar);
  if (system_->IsChanged()) {
    TheReporter().ReportWarning(kMsgDifferentFromPinFile, {}, {}, kShown);
    changedOnLoad_ = true;
  }
  system_->SetName(archivePath_);
  TheReporter().ReportInfo(kMsgSystemLoaded, system_->GetName());
  system_->UpdateViews();
}

std::vector<std::uint8_t> QFCFaultboxDoc::StoreToBytes(const std::string& path) {
  archivePath_ = Absolute(path);
  Archive ar;
  Serialize(ar);
  return ar.Data();
}

// ---- save and close ----

bool QFCFaultboxDoc::OnSaveDocument(const std::string& path) {
  const std::string full = Absolute(path);
  if (system_ == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoSystemToSave);
    return false;
  }
  // A file of the other kind could never be opened again as what it holds.
  if (PlatformOfPath(full) != platform_) {
    TheReporter().ReportError(kMsgWrongBoardType, full, {}, kShown);
    return false;
  }
  if (QFCFileHelper::Exists(full) && QFCFileHelper::IsWriteProtected(full)) {
    TheReporter().ReportError(kMsgReadOnly, full);
    return false;
  }
  const std::string oldName = system_->GetName();
  if (!admin_.Rename(system_, full)) return false;

  std::vector<std::uint8_t> bytes;
  std::string error;
  bool written = false;
  try {
    bytes = StoreToBytes(full);
    written = WriteFileAtomic(QFCFileHelper::ToNative(full), bytes, &error);
    if (!written) ReportSaveLoadException(full, error);
  } catch (const ArchiveException& e) {
    ReportSaveLoadException(full, e);
  }
  if (!written) {
    // The file on disk is still the old one: so is the name that points to it.
    system_->SetName(oldName);
    return false;
  }
  pathName_ = full;
  system_->SetDocumentPath(full);
  system_->ClearModified();
  return true;
}

bool QFCFaultboxDoc::OnCloseDocument() {
  if (system_ == nullptr) return true;
  QFCAbstractFailurePattern* activated = nullptr;
  if (system_->HasActivatedPattern(activated)) {
    TheReporter().ReportError(kMsgActivatedPattern, system_->GetName(), {}, kShown);
    return false;
  }
  const std::string name = system_->GetName();
  system_ = nullptr;
  admin_.Remove(name);
  pathName_.clear();
  return true;
}

void QFCFaultboxDoc::ReportSaveLoadException(const std::string& path, const ArchiveException& e) {
  // The cause's text with what the reader found, where it says more.
  std::string cause = e.what();
  if (cause.empty()) cause = ArchiveException::CauseText(ArchiveCause::kGeneric);
  ReportSaveLoadException(path, cause + " in " + path);
}

void QFCFaultboxDoc::ReportSaveLoadException(const std::string& path, const std::string& fileError) {
  TheReporter().ReportError(kMsgSaveLoadFailed, fileError + "\n" + path, {}, kShown);
}

// ---- the system ----

std::string QFCFaultboxDoc::FindPinFile(const std::string& pinFile) {
  std::string path = pinFile;
  if (!pinFileReplacement_.empty()) {
    const std::string replacement = Absolute(pinFileReplacement_);
    TheReporter().ReportWarning(kMsgOtherPinFile, replacement, path);
    path = replacement;
    pinFileReplacement_.clear();
    changedOnLoad_ = true;
  }
  if (IsUsable(path)) return path;
  TheReporter().ReportError(kMsgFileUnusable, path);

  auto use = [&](const std::string& found) {
    TheReporter().ReportWarning(kMsgOtherPinFile, found, path);
    changedOnLoad_ = true;
    return found;
  };
  // A document written on Windows may name the pin file in another case than
  // the file on disk has.
  if (const std::string found = QFCFileHelper::FindIgnoringCase(path); !found.empty() && IsUsable(found))
    return use(found);
  // A bench folder copied or moved as a whole keeps the pin file beside the document.
  const std::string folder = QFCFileHelper::Folder(archivePath_);
  const std::string candidate = folder.empty() ? std::string() : folder + QFCFileHelper::FileName(path);
  if (!candidate.empty() && candidate != QFCFileHelper::ToNative(path)) {
    if (const std::string found = QFCFileHelper::FindIgnoringCase(candidate);
        !found.empty() && IsUsable(found))
      return use(found);
    // Nobody can be asked for the file: name every place that was tried.
    TheReporter().ReportError(kMsgFileUnusable, candidate);
  }
  return {};
}

void QFCFaultboxDoc::ReportOpenFailure(HRESULT result) {
  if (result == E_FAULTBOX_CANN_NOT_OPEN_FILE || result == E_FAULTBOX_NAME_NOT_UNIQUE ||
      result == E_FAULTBOX_TAG_NOT_FOUND || result == E_FAULTBOX_FILE_IS_NOT_OPENED) {
    TheReporter().ReportError(kMsgCannotOpenSystem);
  } else if (result == E_FAULTBOX_HEADER_COL_NOT_FOUND || result == E_FAULTBOX_CONSISTENCY_CHECK ||
             result == E_FAULTBOX_INVALID_PARAMETER || result == E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED) {
    TheReporter().ReportError(kMsgInconsistentPinFile);
  } else {
    TheReporter().ReportInternalFault(kPlaceOpenFailed);
  }
}

HRESULT QFCFaultboxDoc::CreateSystem(const std::string& pinFile, std::int32_t ecuVersion,
                                     const std::string& author, const std::string& description) {
  if (system_ != nullptr) {
    TheReporter().ReportInternalFault(kPlaceSecondSystem);
    return E_FAULTBOX;
  }
  // A document of no kind can hold no system; saying so before any file is
  // read spares the user the messages of a pin file that is not the problem.
  if (platform_ != fptKR40Platform && platform_ != fptKR60Platform) {
    TheReporter().ReportError(kMsgWrongBoardType, ExpectedBoardTypes(platform_), {}, kShown);
    return E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  }
  const std::string path = FindPinFile(Absolute(pinFile));
  if (path.empty()) {
    TheReporter().ReportError(kMsgCannotOpenSystem);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }

  std::int32_t found = 0;
  HRESULT result = FAULTBOX_OK;
  {
    QFCKR40HardwareInfo probe(path, ecuVersion, nullptr);
    result = probe.DetectBoardType(found);
  }
  if (result != FAULTBOX_OK) {
    ReportOpenFailure(result);
    return result;
  }
  if (found != platform_) {
    TheReporter().ReportError(kMsgWrongBoardType, ExpectedBoardTypes(platform_), {}, kShown);
    return E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
  }

  QFCSystem* system = nullptr;
  result = admin_.Open(path, ecuVersion, author, description, system);
  if (result != FAULTBOX_OK || system == nullptr) {
    ReportOpenFailure(result == FAULTBOX_OK ? E_FAULTBOX_NULL_POINTER : result);
    return result == FAULTBOX_OK ? E_FAULTBOX_NULL_POINTER : result;
  }
  system_ = system;
  return FAULTBOX_OK;
}

}  // namespace faultbox

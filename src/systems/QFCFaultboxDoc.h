// A document of the component: one failure simulation system and the file
// that stores it, ".fss" for the KR40 family and ".fsa" for KR60. Without a
// GUI the caller supplies what a dialog would ask for and decides what to do
// when a pin file cannot be found.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {

class Archive;
class ArchiveException;
class QFCSystem;
class QFCSystemAdmin;

class QFCFaultboxDoc {
 public:
  static constexpr std::uint32_t kFileVersion = 1;

  // The text element that closes every stored file.
  static std::string VersionText();
  // The document kind a file name's extension names: 1 (".fss"), 2 (".fsa"),
  // 0 for any other; the extension counts without regard to case.
  static std::int32_t PlatformOfPath(const std::string& path);
  // ".fss" or ".fsa"; "" for a platform without documents.
  static std::string ExtensionOfPlatform(std::int32_t platform);

  // A document of the kind `platform` (as its template gives it); its system
  // will live in `admin`, which must outlive the document.
  QFCFaultboxDoc(QFCSystemAdmin& admin, std::int32_t platform);
  // A document object that goes away takes its system with it, silently.
  ~QFCFaultboxDoc();
  QFCFaultboxDoc(const QFCFaultboxDoc&) = delete;
  QFCFaultboxDoc& operator=(const QFCFaultboxDoc&) = delete;

  // A new document on the pin file with the values a dialog would ask for.
  // Message 115 and the document comes up modified; false when no system could
  // be created.
  bool OnNewDocument(const std::string& pinFile, std::int32_t ecuVersion, const std::string& author,
                     const std::string& description);
  // Loads the file. False when it is open already (GetAlreadyOpenSystem then
  // names that system), cannot be read or holds no loadable system; a failed
  // load leaves no system behind.
  bool OnOpenDocument(const std::string& path);
  // OnOpenDocument on bytes that stand for the file at `path`.
  bool OpenFromBytes(const std::string& path, const std::vector<std::uint8_t>& bytes);
  // Stores or loads the whole file; relative paths are taken against the file
  // being written or read. Loading throws ArchiveException for a damaged file.
  void Serialize(Archive& ar);
  // Saves atomically under `path`: the old file stays whole until the new one
  // is complete. Refused with message 118 for a write-protected file, 88 when
  // another open system bears the path, 49 for the other kind's extension, 178
  // when writing fails.
  bool OnSaveDocument(const std::string& path);
  // Refused with message 85 while a pattern is activated; otherwise the
  // system is removed (message 117).
  bool OnCloseDocument();
  // Message 178 for a load or save that failed with an archive exception, or
  // with a file error (its text).
  void ReportSaveLoadException(const std::string& path, const ArchiveException& e);
  void ReportSaveLoadException(const std::string& path, const std::string& fileError);
  // Finds the pin file (replacement path, then the document's folder), checks
  // that its board type suits the document kind (message 49) and opens the
  // system in the administration (messages 83, 84).
  [[nodiscard]] HRESULT CreateSystem(const std::string& pinFile, std::int32_t ecuVersion, const std::string& author,
                       const std::string& description);

  QFCSystem* GetSystem() const { return system_; }
  std::int32_t GetPlatform() const { return platform_; }
  // The absolute path of the document file, "" until saved or loaded.
  const std::string& GetPathName() const { return pathName_; }
  // The system's name ("" without a system).
  std::string GetTitle() const;
  bool IsModified() const;
  // Set when loading had to change something (pin file found elsewhere, the
  // document differed from its pin file).
  bool IsChangedOnLoad() const { return changedOnLoad_; }
  // The system that bears the path a refused open asked for, or nullptr.
  QFCSystem* GetAlreadyOpenSystem() const { return alreadyOpen_; }
  // A pin file to use instead of the stored one on the next load (warning 64);
  // used once, then cleared.
  void SetPinFileReplacement(std::string path) { pinFileReplacement_ = std::move(path); }
  const std::string& GetPinFileReplacement() const { return pinFileReplacement_; }

  // The bytes the document would store at `path` (throws nothing the caller
  // must handle: storing does not fail).
  std::vector<std::uint8_t> StoreToBytes(const std::string& path);

 private:
  bool Load(const std::string& path, const std::vector<std::uint8_t>& bytes);
  void Store(Archive& ar);
  void LoadFrom(Archive& ar);
  // The pin file as found, or "" when it is nowhere (messages given).
  std::string FindPinFile(const std::string& pinFile);
  // Messages 83, 84 or an internal fault for a system that could not be opened.
  void ReportOpenFailure(HRESULT result);
  void DiscardSystem();

  QFCSystemAdmin& admin_;
  std::int32_t platform_;
  QFCSystem* system_ = nullptr;  // owned by the administration
  std::string pathName_;
  std::string archivePath_;  // the file being read or written
  std::string pinFileReplacement_;
  QFCSystem* alreadyOpen_ = nullptr;
  bool loaded_ = false;
  bool changedOnLoad_ = false;
};

}  // namespace faultbox

// Loading a system's failure class file, with its default path and the
// messages that say why a file was not taken.
#include "config/FailureClassLoader.h"

#include <sys/stat.h>

#include <cstdlib>

#include "platform/QFCReporter.h"
#include "platform/Archive.h"
#include "platform/AtomicFile.h"
#include "platform/FileHelper.h"

namespace faultbox {
namespace {

constexpr int kMsgDefaultFileUsed = 157;
constexpr int kMsgRootNotSet = 158;
constexpr int kMsgCannotOpen = 80;
constexpr int kMsgCannotRead = 81;
constexpr int kMsgWrongPlatform = 168;
constexpr int kShown = 1;
constexpr int kPlaceCreateCollection = 304;

// The platform type a file names in its header, or 0 when the header cannot
// be read (the full read then says why).
std::int32_t PeekPlatform(const std::vector<std::uint8_t>& bytes) {
  try {
    Archive ar(bytes);
    ar.ReadString();
    ar.ReadString();
    return ar.ReadI32();
  } catch (const ArchiveException&) {
    return 0;
  }
}

}  // namespace

std::string DefaultFailureClassFile(std::int32_t platform, const std::string& boardType) {
  // Written with '/': the path is shown to the user and stored in documents,
  // and on Linux that is the separator people read and type.
  if (platform == kFailureClassPlatformKR60) return "/Cockpit/Users/AllUsers/FailureClassesKR60.fcd";
  if (boardType == "KR80" || boardType == "KR080") return "/Cockpit/Users/AllUsers/FailureClassesKR80.fcd";
  return "/Cockpit/Users/AllUsers/FailureClassesKR40.fcd";
}

std::unique_ptr<QFCAbstractFailureClasses> ReadFailureClasses(std::vector<std::uint8_t> bytes,
                                                              std::int32_t platform) {
  std::int32_t type = platform;
  if (type == 0) {
    type = PeekPlatform(bytes);
    // A header naming no known platform still has to be read to the end, so
    // that a damaged file is told apart from a foreign one.
    if (type != kFailureClassPlatformKR40) type = kFailureClassPlatformKR60;
  }
  std::unique_ptr<QFCAbstractFailureClasses> classes = QFCAbstractFailureClasses::Create(type);
  if (!classes) return nullptr;
  Archive ar(std::move(bytes));
  classes->Serialize(ar);
  return classes;
}

std::vector<std::uint8_t> StoreFailureClasses(QFCAbstractFailureClasses& classes) {
  Archive ar;
  classes.Serialize(ar);
  return ar.Data();
}

[[nodiscard]] HRESULT LoadFailureClasses(const std::string& fileName, std::int32_t platform, const std::string& boardType,
                           std::unique_ptr<QFCAbstractFailureClasses>* out, std::string* pathUsed) {
  QFCReporter& app = TheReporter();
  if (out) out->reset();

  std::string path = fileName;
  bool openable = true;
  // Exactly "none": "None" and other spellings are file names.
  if (fileName == kDefaultFailureClassFileName) {
    const char* root = std::getenv(kFailureClassRootVariable);
    if (root == nullptr || *root == '\0') {
      app.ReportWarning(kMsgRootNotSet);
      // The path stays "none", which names no failure class file: a file of
      // that name in the working folder must not be taken by chance.
      openable = false;
    } else {
      path = std::string(root) + DefaultFailureClassFile(platform, boardType);
      app.ReportInternal(kMsgDefaultFileUsed, path);
    }
  }
  if (pathUsed) *pathUsed = path;

  const std::string native = QFCFileHelper::ToNative(path);
  // Only regular files: a device or pipe named by mistake would never end.
  struct stat st {};
  if (openable && (::stat(native.c_str(), &st) != 0 || !S_ISREG(st.st_mode))) openable = false;
  std::optional<std::vector<std::uint8_t>> bytes;
  if (openable) bytes = ReadWholeFile(native);
  if (!bytes) {
    app.ReportError(kMsgCannotOpen, path, {}, kShown);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }

  std::unique_ptr<QFCAbstractFailureClasses> classes;
  try {
    classes = ReadFailureClasses(std::move(*bytes), platform);
  } catch (const ArchiveException& e) {
    app.ReportInternal(kMsgCannotRead, ArchiveException::CauseText(e.Cause()), path);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }
  if (!classes) {
    app.ReportInternalFault(kPlaceCreateCollection);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }

  const bool accepted = platform == 0 ? classes->CheckVersion(kFailureClassPlatformKR40) == 1 ||
                                            classes->CheckVersion(kFailureClassPlatformKR60) == 1
                                      : classes->CheckVersion(platform) == 1;
  if (!accepted) {
    app.ReportError(kMsgWrongPlatform, path);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  if (out) *out = std::move(classes);
  return FAULTBOX_OK;
}

}  // namespace faultbox

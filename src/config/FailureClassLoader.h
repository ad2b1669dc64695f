// Reading and writing failure class files (.fcd), and the default file of a
// platform below the folder named by NORVIK_ROOT.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/QFCAbstractFailureClasses.h"
#include "platform/ResultCodes.h"

namespace faultbox {

// The environment variable naming the folder of the default failure class files.
constexpr const char* kFailureClassRootVariable = "NORVIK_ROOT";
// The failure class file name that stands for the platform's default file.
constexpr const char* kDefaultFailureClassFileName = "none";

// The default file of a platform, to be appended to the NORVIK_ROOT folder:
// "/Cockpit/Users/AllUsers/FailureClassesKR60.fcd" for platform 2, the KR80
// file for a KR40-family board "KR80" or "KR080", the KR40 file otherwise.
std::string DefaultFailureClassFile(std::int32_t platform, const std::string& boardType);

// Loads the failure classes of a system. `fileName` exactly "none" stands for
// the platform's default file below NORVIK_ROOT (message 157 names it; an
// unset or empty variable gives message 158, the path stays "none" and the
// load fails with message 80 without looking for a file of that name).
// `pathUsed` receives the path as formed; when opening, '\' counts as a
// folder separator too.
// Results: FAULTBOX_OK with the collection in `out`; E_FAULTBOX_CANN_NOT_OPEN_FILE
// when the file cannot be opened or is no regular file (message 80) or read (message 81 with the
// cause text and the path); E_FAULTBOX_CONSISTENCY_CHECK when the file is of
// another platform (message 168). `out` receives a collection only when it
// was read completely and is of the system's platform.
// `platform` 0 takes the platform the file names, which must be 1 or 2 (for
// tools that show a file without a system); "none" then needs a real platform.
[[nodiscard]] HRESULT LoadFailureClasses(const std::string& fileName, std::int32_t platform, const std::string& boardType,
                           std::unique_ptr<QFCAbstractFailureClasses>* out, std::string* pathUsed = nullptr);

// Reads a collection from the bytes of a failure class file; throws
// ArchiveException when they are damaged. `platform` 0 takes the file's own.
std::unique_ptr<QFCAbstractFailureClasses> ReadFailureClasses(std::vector<std::uint8_t> bytes,
                                                              std::int32_t platform);

// The bytes of the failure class file of a collection.
std::vector<std::uint8_t> StoreFailureClasses(QFCAbstractFailureClasses& classes);

}  // namespace faultbox

// Whole-file reading and atomic replacement: a file we write is either the old
// one or the complete new one, never half-written.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace faultbox {

// The whole file, or nullopt when it cannot be opened or read (`error` says why).
std::optional<std::vector<std::uint8_t>> ReadWholeFile(const std::string& path, std::string* error = nullptr);

// Writes `data` to a temporary file in the target's folder, flushes it to disk
// and renames it over `path`. On failure the old file is untouched, the
// temporary file is removed and `error` says why.
bool WriteFileAtomic(const std::string& path, std::string_view data, std::string* error = nullptr);
inline bool WriteFileAtomic(const std::string& path, const std::vector<std::uint8_t>& data,
                            std::string* error = nullptr) {
  return WriteFileAtomic(path, std::string_view(reinterpret_cast<const char*>(data.data()), data.size()), error);
}

}  // namespace faultbox

// The INI settings store: parsing that keeps every line as written, so that a
// write changes only the one line it must, and atomic replacement of the file.
#include "platform/Settings.h"

#include "platform/Text.h"

#include "platform/AtomicFile.h"

#include <fcntl.h>
#include <pwd.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <mutex>
#include <string_view>

namespace faultbox {

namespace {

// A settings file is a handful of lines; anything far larger is not ours and
// is neither read into memory nor overwritten.
constexpr off_t kMaxFileSize = 16 * 1024 * 1024;

std::mutex gOverrideMutex;
std::string gOverride;

bool IsBlank(char c) {
  return c == ' ' || c == '\t' || c == '\v' || c == '\f' || c == '\r';
}

std::string_view Trim(std::string_view s) {
  while (!s.empty() && IsBlank(s.front())) s.remove_prefix(1);
  while (!s.empty() && IsBlank(s.back())) s.remove_suffix(1);
  return s;
}


// "A" matches "A" and every section below it ("A\B", "A\B\C"), as deleting a registry key does.
bool IsSameOrBelow(std::string_view name, std::string_view section) {
  if (EqualsNoCase(name, section)) return true;
  return name.size() > section.size() && name[section.size()] == '\\' &&
         EqualsNoCase(name.substr(0, section.size()), section);
}

struct Line {
  enum Kind { Blank, Comment, Garbled, Header, Entry };
  std::string raw;  // as read, without the line end
  Kind kind = Garbled;
  std::string name;       // section name (Header) or key (Entry)
  std::string value;      // Entry only
  size_t valueStart = 0;  // Entry only: where the value begins in `raw`
};

Line ParseLine(std::string raw, bool first) {
  Line line;
  line.raw = std::move(raw);
  std::string_view text = line.raw;
  size_t offset = 0;
  if (first && text.substr(0, 3) == "\xEF\xBB\xBF") offset = 3;  // editors on Windows add a byte order mark
  std::string_view t = Trim(text.substr(offset));
  if (t.empty()) {
    line.kind = Line::Blank;
  } else if (t.front() == ';' || t.front() == '#') {
    line.kind = Line::Comment;
  } else if (t.front() == '[') {
    std::string_view inner =
        t.size() >= 2 && t.back() == ']' ? Trim(t.substr(1, t.size() - 2)) : std::string_view{};
    if (!inner.empty()) {
      line.kind = Line::Header;
      line.name = std::string(inner);
    }
  } else {
    size_t eq = text.find('=', offset);
    if (eq != std::string_view::npos) {
      std::string_view key = Trim(text.substr(offset, eq - offset));
      if (!key.empty()) {
        line.kind = Line::Entry;
        line.name = std::string(key);
        size_t start = eq + 1;
        while (start < text.size() && IsBlank(text[start])) ++start;
        line.valueStart = start;
        line.value = std::string(Trim(text.substr(start)));
      }
    }
  }
  return line;
}

struct IniFile {
  std::vector<Line> lines;
  bool crlf = false;  // keep the line ends the file was written with
};

enum class LoadResult { Ok, Missing, Failed };

LoadResult Load(const std::string& path, IniFile& out) {
  out = IniFile{};
  if (path.empty()) return LoadResult::Failed;
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return (errno == ENOENT) ? LoadResult::Missing : LoadResult::Failed;
  struct stat st {};
  if (::fstat(fd, &st) != 0 || !S_ISREG(st.st_mode) || st.st_size > kMaxFileSize) {
    ::close(fd);
    return LoadResult::Failed;
  }
  std::string content;
  char buffer[8192];
  for (;;) {
    ssize_t n = ::read(fd, buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) {
      ::close(fd);
      return LoadResult::Failed;
    }
    if (n == 0) break;
    content.append(buffer, static_cast<size_t>(n));
    if (content.size() > static_cast<size_t>(kMaxFileSize)) {
      ::close(fd);
      return LoadResult::Failed;
    }
  }
  ::close(fd);

  size_t pos = 0;
  bool firstLine = true;
  while (pos < content.size()) {
    size_t end = content.find('\n', pos);
    if (end == std::string::npos) end = content.size();
    std::string raw = content.substr(pos, end - pos);
    if (!raw.empty() && raw.back() == '\r') {
      raw.pop_back();
      if (firstLine) out.crlf = true;
    }
    out.lines.push_back(ParseLine(std::move(raw), firstLine));
    firstLine = false;
    pos = end + 1;
  }
  return LoadResult::Ok;
}

// Calls `visit(line, index)` for every entry of `section` (every block of it, in file order).
template <typename Visit>
void ForEachEntry(const IniFile& file, std::string_view section, Visit visit) {
  bool inside = false;
  for (size_t i = 0; i < file.lines.size(); ++i) {
    const Line& line = file.lines[i];
    if (line.kind == Line::Header)
      inside = EqualsNoCase(line.name, section);
    else if (inside && line.kind == Line::Entry)
      visit(line, i);
  }
}

std::string Serialise(const IniFile& file) {
  const char* eol = file.crlf ? "\r\n" : "\n";
  std::string out;
  for (const Line& line : file.lines) {
    out += line.raw;
    out += eol;
  }
  return out;
}

std::string FolderOf(const std::string& path) {
  size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  if (slash == 0) return "/";
  return path.substr(0, slash);
}

bool MakeFolders(const std::string& folder) {
  struct stat st {};
  if (::stat(folder.c_str(), &st) == 0) return S_ISDIR(st.st_mode);
  for (size_t pos = 1; pos <= folder.size(); ++pos) {
    if (pos != folder.size() && folder[pos] != '/') continue;
    std::string part = folder.substr(0, pos);
    if (::mkdir(part.c_str(), 0777) != 0 && errno != EEXIST) return false;
  }
  return ::stat(folder.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

// The file a write goes to: a settings file that is a symbolic link (kept in a
// dotfiles folder, say) is written through the link instead of being replaced by a plain file.
std::string WriteTarget() {
  std::string path = Settings::Path();
  if (path.empty()) return path;
  struct stat st {};
  if (::lstat(path.c_str(), &st) == 0 && S_ISLNK(st.st_mode)) {
    char resolved[PATH_MAX];
    if (::realpath(path.c_str(), resolved) != nullptr) return resolved;
  }
  return path;
}

// Serialises writers of the same folder across processes (registration running
// beside a bench tool, say), so that no read-modify-write loses another's change.
class FolderLock {
 public:
  explicit FolderLock(const std::string& folder)
      : fd_(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    if (fd_ >= 0) {
      while (::flock(fd_, LOCK_EX) != 0 && errno == EINTR) {
      }
    }
  }
  ~FolderLock() {
    if (fd_ >= 0) ::close(fd_);  // closing releases the lock
  }
  FolderLock(const FolderLock&) = delete;
  FolderLock& operator=(const FolderLock&) = delete;

 private:
  int fd_;
};

bool HasLineBreakOrNul(std::string_view s) {
  return s.find_first_of(std::string_view("\r\n\0", 3)) != std::string_view::npos;
}

// Names and values are refused when the file could not give them back unchanged.
bool IsStorableName(std::string_view s) {
  return !s.empty() && !HasLineBreakOrNul(s) && Trim(s) == s;
}

bool IsStorableKey(std::string_view key) {
  return IsStorableName(key) && key.find('=') == std::string_view::npos && key.front() != ';' &&
         key.front() != '#' && key.front() != '[';
}

bool IsStorableValue(std::string_view value) {
  return !HasLineBreakOrNul(value) && Trim(value) == value;
}

}  // namespace

std::string Settings::DefaultPath() {
  const char* explicitPath = std::getenv("FAULTBOX_CONFIG");
  if (explicitPath != nullptr && *explicitPath != '\0') return explicitPath;
  // A relative XDG_CONFIG_HOME is invalid and ignored, as the base directory rules say.
  const char* xdg = std::getenv("XDG_CONFIG_HOME");
  if (xdg != nullptr && xdg[0] == '/') return std::string(xdg) + "/faultbox/faultbox.ini";
  std::string home;
  if (const char* env = std::getenv("HOME"); env != nullptr && *env != '\0') {
    home = env;
  } else if (const passwd* pw = ::getpwuid(::getuid()); pw != nullptr && pw->pw_dir != nullptr) {
    home = pw->pw_dir;
  }
  if (home.empty()) return {};
  if (home.size() > 1 && home.back() == '/') home.pop_back();
  return (home == "/" ? std::string() : home) + "/.config/faultbox/faultbox.ini";
}

void Settings::SetPathOverride(const std::string& path) {
  std::string absolute = path;
  // Fixed now, so that a later change of the working folder does not move the settings.
  if (!absolute.empty() && absolute.front() != '/') {
    char cwd[PATH_MAX];
    if (::getcwd(cwd, sizeof cwd) != nullptr) absolute = std::string(cwd) + "/" + absolute;
  }
  std::lock_guard<std::mutex> lock(gOverrideMutex);
  gOverride = std::move(absolute);
}

std::string Settings::Path() {
  {
    std::lock_guard<std::mutex> lock(gOverrideMutex);
    if (!gOverride.empty()) return gOverride;
  }
  return DefaultPath();
}

std::optional<std::string> Settings::GetString(const std::string& section, const std::string& key) {
  IniFile file;
  if (Load(Path(), file) != LoadResult::Ok) return std::nullopt;
  std::optional<std::string> result;
  ForEachEntry(file, section, [&](const Line& line, size_t) {
    if (!result && EqualsNoCase(line.name, key)) result = line.value;
  });
  return result;
}

std::vector<std::pair<std::string, std::string>> Settings::GetSection(const std::string& section) {
  std::vector<std::pair<std::string, std::string>> result;
  IniFile file;
  if (Load(Path(), file) != LoadResult::Ok) return result;
  ForEachEntry(file, section, [&](const Line& line, size_t) {
    for (const auto& [name, value] : result)
      if (EqualsNoCase(name, line.name)) return;  // the first of repeated keys is the one in force
    result.emplace_back(line.name, line.value);
  });
  return result;
}

bool Settings::SetString(const std::string& section, const std::string& key, const std::string& value) {
  if (!IsStorableName(section) || !IsStorableKey(key) || !IsStorableValue(value)) return false;
  const std::string path = WriteTarget();
  if (path.empty()) return false;
  const std::string folder = FolderOf(path);
  if (!MakeFolders(folder)) return false;
  FolderLock lock(folder);

  IniFile file;
  // A file we cannot read is never overwritten: that would lose all of its other values.
  if (Load(path, file) == LoadResult::Failed) return false;

  std::optional<size_t> existing;
  ForEachEntry(file, section, [&](const Line& line, size_t index) {
    if (!existing && EqualsNoCase(line.name, key)) existing = index;
  });
  if (existing) {
    Line& line = file.lines[*existing];
    if (line.value == value) return true;
    // Keeps the key's spelling and the spacing around '=' as the user wrote them.
    line.raw = line.raw.substr(0, line.valueStart) + value;
    line.value = value;
    return WriteFileAtomic(path, Serialise(file));
  }

  Line entry = ParseLine(key + "=" + value, false);
  std::optional<size_t> header;
  for (size_t i = 0; i < file.lines.size() && !header; ++i)
    if (file.lines[i].kind == Line::Header && EqualsNoCase(file.lines[i].name, section)) header = i;
  if (header) {
    // After the section's last entry, so that comments that introduce the next section stay with it.
    size_t insertAt = *header + 1;
    for (size_t i = *header + 1; i < file.lines.size() && file.lines[i].kind != Line::Header; ++i)
      if (file.lines[i].kind == Line::Entry) insertAt = i + 1;
    file.lines.insert(file.lines.begin() + static_cast<std::ptrdiff_t>(insertAt), std::move(entry));
  } else {
    if (!file.lines.empty() && file.lines.back().kind != Line::Blank)
      file.lines.push_back(ParseLine("", false));
    file.lines.push_back(ParseLine("[" + section + "]", false));
    file.lines.push_back(std::move(entry));
  }
  return WriteFileAtomic(path, Serialise(file));
}

bool Settings::DeleteSection(const std::string& section) {
  if (!IsStorableName(section)) return false;
  const std::string path = WriteTarget();
  if (path.empty()) return false;
  const std::string folder = FolderOf(path);
  struct stat st {};
  if (::stat(folder.c_str(), &st) != 0) return errno == ENOENT;  // no folder, no file, nothing to remove
  FolderLock lock(folder);

  IniFile file;
  LoadResult loaded = Load(path, file);
  if (loaded == LoadResult::Missing) return true;
  if (loaded == LoadResult::Failed) return false;

  std::vector<bool> removed(file.lines.size(), false);
  bool deleting = false;
  bool any = false;
  for (size_t i = 0; i < file.lines.size(); ++i) {
    if (file.lines[i].kind == Line::Header) {
      deleting = IsSameOrBelow(file.lines[i].name, section);
      any = any || deleting;
    }
    removed[i] = deleting;
  }
  if (!any) return true;
  // Comments directly above a kept section describe that section, not the removed one before it.
  for (size_t i = 0; i < file.lines.size(); ++i) {
    if (file.lines[i].kind != Line::Header || removed[i]) continue;
    for (size_t j = i; j > 0 && removed[j - 1] && file.lines[j - 1].kind == Line::Comment; --j)
      removed[j - 1] = false;
  }

  std::vector<Line> kept;
  for (size_t i = 0; i < file.lines.size(); ++i)
    if (!removed[i]) kept.push_back(std::move(file.lines[i]));
  while (!kept.empty() && kept.back().kind == Line::Blank) kept.pop_back();
  file.lines = std::move(kept);
  return WriteFileAtomic(path, Serialise(file));
}

}  // namespace faultbox

// Path arithmetic on texts that may come from Windows, and the file attribute
// questions the documents ask (existence, write protection).
#include "platform/FileHelper.h"

#include "platform/Text.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <filesystem>
#include <string_view>
#include <system_error>
#include <vector>

namespace faultbox {

namespace {

bool IsSeparator(char c) {
  return c == '/' || c == '\\';
}

// "C:..." after folding: a Windows drive path that names nothing on this machine.
bool HasDriveLetter(std::string_view p) {
  return p.size() >= 2 && p[1] == ':' && ((p[0] >= 'A' && p[0] <= 'Z') || (p[0] >= 'a' && p[0] <= 'z'));
}

struct SplitPath {
  std::string root;  // "" (relative), "/" or a drive root such as "C:/"
  std::vector<std::string> segments;
  bool trailingSeparator = false;

  bool IsAbsolute() const { return !root.empty(); }
  bool IsDrive() const { return root.size() >= 2 && root[1] == ':'; }
};

// Splits a folded path and removes "." and ".." lexically (as Windows does:
// symbolic links are not followed). ".." above a root stays at the root.
SplitPath Split(const std::string& folded) {
  SplitPath out;
  std::string_view rest = folded;
  if (HasDriveLetter(rest)) {
    out.root = std::string(rest.substr(0, 2));
    rest.remove_prefix(2);
    if (!rest.empty() && rest.front() == '/') out.root += '/';
  } else if (!rest.empty() && rest.front() == '/') {
    out.root.push_back('/');  // not `= "/"`: GCC 12 warns falsely (-Wrestrict) on that
  }
  out.trailingSeparator = !rest.empty() && rest.back() == '/';
  size_t pos = 0;
  while (pos <= rest.size()) {
    size_t end = rest.find('/', pos);
    if (end == std::string_view::npos) end = rest.size();
    std::string_view part = rest.substr(pos, end - pos);
    pos = end + 1;
    if (part.empty() || part == ".") continue;
    if (part == "..") {
      if (!out.segments.empty() && out.segments.back() != "..") {
        out.segments.pop_back();
        continue;
      }
      if (out.IsAbsolute()) continue;
    }
    out.segments.emplace_back(part);
  }
  return out;
}

std::string Join(const SplitPath& p, size_t from = 0) {
  std::string out;
  for (size_t i = from; i < p.segments.size(); ++i) {
    if (!out.empty()) out += '/';
    out += p.segments[i];
  }
  return out;
}

std::string Render(const SplitPath& p) {
  std::string body = Join(p);
  if (body.empty()) return p.root.empty() ? std::string(".") : p.root;
  return p.root + body + (p.trailingSeparator ? "/" : "");
}

bool SameRoot(const SplitPath& a, const SplitPath& b) {
  if (a.root.size() != b.root.size()) return false;
  for (size_t i = 0; i < a.root.size(); ++i)
    if (AsciiUpper(a.root[i]) != AsciiUpper(b.root[i])) return false;
  return true;
}

bool SameSegment(const std::string& a, const std::string& b, bool ignoreCase) {
  if (!ignoreCase) return a == b;
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (AsciiUpper(a[i]) != AsciiUpper(b[i])) return false;
  return true;
}

std::string CurrentFolder() {
  char cwd[PATH_MAX];
  return ::getcwd(cwd, sizeof cwd) != nullptr ? std::string(cwd) + "/" : std::string();
}

}  // namespace

std::string QFCFileHelper::ToNative(const std::string& path) {
  std::string out = path;
  for (char& c : out)
    if (c == '\\') c = '/';
  return out;
}

bool QFCFileHelper::Exists(const std::string& path) {
  struct stat st {};
  return !path.empty() && ::stat(ToNative(path).c_str(), &st) == 0;
}

bool QFCFileHelper::IsDirectory(const std::string& path) {
  struct stat st {};
  return !path.empty() && ::stat(ToNative(path).c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

bool QFCFileHelper::IsWriteProtected(const std::string& path) {
  if (path.empty()) return false;
  const std::string native = ToNative(path);
  struct stat st {};
  if (::stat(native.c_str(), &st) != 0) return false;
  // The superuser passes access(); the mode bits still say what the owner meant,
  // so a file nobody may write counts as protected for root too.
  if ((st.st_mode & 0222) == 0) return true;
  if (::faccessat(AT_FDCWD, native.c_str(), W_OK, AT_EACCESS) != 0) return true;
  struct statvfs fs {};
  return ::statvfs(native.c_str(), &fs) == 0 && (fs.f_flag & ST_RDONLY) != 0;
}

bool QFCFileHelper::SameFile(const std::string& a, const std::string& b) {
  const std::string nativeA = ToNative(a);
  const std::string nativeB = ToNative(b);
  if (nativeA == nativeB) return true;
  struct stat sa {};
  struct stat sb {};
  if (::stat(nativeA.c_str(), &sa) == 0 && ::stat(nativeB.c_str(), &sb) == 0)
    return sa.st_dev == sb.st_dev && sa.st_ino == sb.st_ino;
  std::error_code errorA;
  std::error_code errorB;
  const auto canonicalA = std::filesystem::weakly_canonical(GetAbsolutePath(nativeA, {}), errorA);
  const auto canonicalB = std::filesystem::weakly_canonical(GetAbsolutePath(nativeB, {}), errorB);
  if (errorA || errorB) return GetAbsolutePath(nativeA, {}) == GetAbsolutePath(nativeB, {});
  return canonicalA == canonicalB;
}

std::string QFCFileHelper::FindIgnoringCase(const std::string& path) {
  const std::string native = ToNative(path);
  if (native.empty() || native.front() != '/') return {};
  if (Exists(native)) return native;
  const SplitPath split = Split(native);
  std::string found = "/";
  for (std::size_t i = 0; i < split.segments.size(); ++i) {
    const std::string& wanted = split.segments[i];
    std::string exact = found + wanted;
    struct stat st {};
    if (::lstat(exact.c_str(), &st) != 0) {
      DIR* dir = ::opendir(found.c_str());
      if (dir == nullptr) return {};
      std::vector<std::string> matches;
      while (const dirent* entry = ::readdir(dir)) {
        const std::string name = entry->d_name;
        if (name != "." && name != ".." && SameSegment(name, wanted, true)) matches.push_back(name);
      }
      ::closedir(dir);
      if (matches.empty()) return {};
      exact = found + *std::min_element(matches.begin(), matches.end());
    }
    found = i + 1 < split.segments.size() ? exact + "/" : exact;
  }
  return Exists(found) ? found : std::string();
}

std::string QFCFileHelper::FileName(const std::string& path) {
  for (size_t i = path.size(); i > 0; --i)
    if (IsSeparator(path[i - 1])) return path.substr(i);
  return path;
}

std::string QFCFileHelper::Folder(const std::string& path) {
  for (size_t i = path.size(); i > 0; --i)
    if (IsSeparator(path[i - 1])) return ToNative(path.substr(0, i));
  return {};
}

std::string QFCFileHelper::GetRelativePath(const std::string& path, const std::string& base) {
  const std::string folded = ToNative(path);
  if (folded.empty()) return {};
  const SplitPath target = Split(folded);
  // A foreign drive path is kept as written: rewriting it would not make it reachable.
  const std::string unchanged = target.IsDrive() ? folded : Render(target);
  const SplitPath from = Split(Folder(ToNative(base)));
  if (!target.IsAbsolute() || !from.IsAbsolute() || !SameRoot(target, from)) return unchanged;

  const bool ignoreCase = target.IsDrive();  // Windows names do not regard case
  size_t common = 0;
  while (common < target.segments.size() && common < from.segments.size() &&
         SameSegment(target.segments[common], from.segments[common], ignoreCase))
    ++common;
  // Sharing only the root ("/home/..." and "/data/..."): the two live in unrelated
  // trees, and an absolute path survives moving the document where "../../data" would not.
  if (common == 0 && !from.segments.empty()) return unchanged;

  std::string out;
  for (size_t i = common; i < from.segments.size(); ++i) out += "../";
  std::string rest = Join(target, common);
  if (rest.empty()) return out.empty() ? std::string(".") : out.substr(0, out.size() - 1);
  return out + rest + (target.trailingSeparator ? "/" : "");
}

std::string QFCFileHelper::GetAbsolutePath(const std::string& path, const std::string& base) {
  const std::string folded = ToNative(path);
  if (folded.empty()) return {};
  if (HasDriveLetter(folded)) return folded;
  if (folded.front() == '/') return Render(Split(folded));
  std::string folder = Folder(ToNative(base));
  if (!HasDriveLetter(folder) && (folder.empty() || folder.front() != '/')) folder = CurrentFolder() + folder;
  return Render(Split(folder + folded));
}

}  // namespace faultbox

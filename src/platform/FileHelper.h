// Paths and file attributes. Every stored path may use '/' or '\' as folder
// separator (documents and pin files written on Windows open here unchanged).
// Path arithmetic is lexical: "." and ".." are removed without following
// symbolic links. A Windows drive path ("C:\x\y") names nothing here; it is
// treated as an absolute path of a foreign machine and returned with its
// separators folded but otherwise unchanged.
#pragma once

#include <string>

namespace faultbox {

class QFCFileHelper {
 public:
  // Turns every '\' into '/'.
  static std::string ToNative(const std::string& path);

  static bool Exists(const std::string& path);
  static bool IsDirectory(const std::string& path);

  // True when the file exists and may not be written: access(W_OK) fails, its
  // mode grants no write bit to anyone (counted even for root, who passes
  // access(), so that a bench run as root sees what a user would), or it lies on
  // a file system mounted read-only. A file that does not exist is not
  // write-protected: saving creates it.
  static bool IsWriteProtected(const std::string& path);

  // True when both paths name one file: the same device and inode when both
  // exist, else the same path once made absolute with the symbolic links of
  // its existing part resolved. Case counts, as it does for Linux file names.
  static bool SameFile(const std::string& a, const std::string& b);
  // For paths written on Windows, whose case may differ from the files on
  // disk: `path` when it exists, else the existing path whose every folder
  // and file name equals that of `path` without regard to case (at each
  // level an exact match first, else the first such name in sorted order);
  // "" when there is none or `path` is not absolute.
  static std::string FindIgnoringCase(const std::string& path);

  // The file name without its folder ("a\b\c.csv" and "a/b/c.csv" give "c.csv").
  static std::string FileName(const std::string& path);
  // The folder of a path, with a trailing '/', or "" when there is none.
  static std::string Folder(const std::string& path);

  // `path` relative to the folder of the file `base` (a `base` ending in a
  // separator is that folder itself), written with '/' and with ".." where needed;
  // "." when `path` is that folder. The path is returned normalised instead of
  // made relative when either is relative (an unsaved document has no folder),
  // when their roots differ (a drive path against a Linux one, or two drives),
  // or when they share only the root "/" and the base's folder is not the root
  // itself ("/data/p.csv" against "/home/u/d.fsa" stays absolute: unrelated trees
  // do not move together). Two paths on the same drive compare without regard to case.
  static std::string GetRelativePath(const std::string& path, const std::string& base);
  // `path` made absolute against the folder of the file `base`; an absolute
  // path is only normalised ("." and ".." removed, separators folded); a drive
  // path is returned as written. A relative or empty `base` is first taken
  // against the working folder. An empty `path` gives "".
  static std::string GetAbsolutePath(const std::string& path, const std::string& base);
};

}  // namespace faultbox

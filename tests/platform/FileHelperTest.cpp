// Tests of the path helper: Windows separators, relative and absolute paths
// against a document's folder, and write protection.
#include "platform/FileHelper.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <string>

#include "support/RunProcess.h"

namespace faultbox {
namespace {

namespace fs = std::filesystem;

TEST(FileHelperTest, FileNameAndFolder) {
  struct Case {
    const char* path;
    const char* fileName;
    const char* folder;
  };
  const Case cases[] = {
      {"a\\b\\c.csv", "c.csv", "a/b/"},
      {"a/b/c.csv", "c.csv", "a/b/"},
      {"C:\\pins\\kr60.csv", "kr60.csv", "C:/pins/"},
      {"/doc.fsa", "doc.fsa", "/"},
      {"doc.fsa", "doc.fsa", ""},
      {"a/b\\", "", "a/b/"},
      {"", "", ""},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(QFCFileHelper::FileName(c.path), c.fileName) << c.path;
    EXPECT_EQ(QFCFileHelper::Folder(c.path), c.folder) << c.path;
  }
}

TEST(FileHelperTest, AbsolutePathAgainstTheDocumentFolder) {
  struct Case {
    const char* path;
    const char* base;
    const char* expected;
  };
  const Case cases[] = {
      {"pins\\kr60.csv", "/bench/docs/sys.fsa", "/bench/docs/pins/kr60.csv"},
      {"..\\data\\.\\pins.csv", "\\bench\\docs\\sys.fsa", "/bench/data/pins.csv"},
      {"../../../../x.csv", "/bench/docs/sys.fsa", "/x.csv"},
      {"/bench/./a/../b//c.csv", "/elsewhere/d.fsa", "/bench/b/c.csv"},
      {"\\bench\\b\\", "/elsewhere/d.fsa", "/bench/b/"},
      {".", "/bench/docs/sys.fsa", "/bench/docs"},
      {"C:\\Pins\\..\\kr60.csv", "/bench/docs/sys.fsa", "C:/Pins/../kr60.csv"},  // foreign: only folded
      {"pins\\kr60.csv", "C:\\Bench\\sys.fsa", "C:/Bench/pins/kr60.csv"},
      {"", "/bench/docs/sys.fsa", ""},
  };
  for (const Case& c : cases) EXPECT_EQ(QFCFileHelper::GetAbsolutePath(c.path, c.base), c.expected) << c.path;

  // An unsaved document (no base) or a relative base is taken against the working folder.
  const std::string cwd = fs::current_path().string();
  EXPECT_EQ(QFCFileHelper::GetAbsolutePath("x.csv", ""), (cwd == "/" ? "" : cwd) + "/x.csv");
  EXPECT_EQ(QFCFileHelper::GetAbsolutePath("x.csv", "docs\\d.fsa"), (cwd == "/" ? "" : cwd) + "/docs/x.csv");
}

TEST(FileHelperTest, RelativePathAgainstTheDocumentFolder) {
  struct Case {
    const char* path;
    const char* base;
    const char* expected;
  };
  const Case cases[] = {
      {"/bench/docs/pins.csv", "/bench/docs/sys.fsa", "pins.csv"},
      {"\\bench\\docs\\pins\\kr60.csv", "\\bench\\docs\\sys.fsa", "pins/kr60.csv"},
      {"/bench/data/pins.csv", "/bench/docs/sys.fsa", "../data/pins.csv"},
      {"/bench/a/b/c/p.csv", "/bench/x/y/sys.fsa", "../../a/b/c/p.csv"},
      {"/bench/docs/../data/p.csv", "/bench/docs/sub/../sys.fsa", "../data/p.csv"},
      {"/bench/docs", "/bench/docs/sys.fsa", "."},
      {"/Bench/docs/p.csv", "/bench/docs/sys.fsa", "/Bench/docs/p.csv"},  // names differ in case on Linux
      {"/data/p.csv", "/home/u/sys.fsa", "/data/p.csv"},                  // only the root in common
      {"/data/p.csv", "/sys.fsa", "data/p.csv"},                          // the document lies in the root
      {"rel\\p.csv", "/bench/sys.fsa", "rel/p.csv"},                      // relative stays as it is
      {"/bench/p.csv", "", "/bench/p.csv"},                               // unsaved document
      {"C:\\Pins\\p.csv", "D:\\Pins\\sys.fsa", "C:/Pins/p.csv"},
      {"c:\\bench\\pins\\p.csv", "C:\\Bench\\Docs\\sys.fsa", "../pins/p.csv"},
      {"", "/bench/sys.fsa", ""},
  };
  for (const Case& c : cases)
    EXPECT_EQ(QFCFileHelper::GetRelativePath(c.path, c.base), c.expected) << c.path << " from " << c.base;
}

TEST(FileHelperTest, RelativeAndAbsoluteRoundTrip) {
  const char* bases[] = {"/bench/docs/sys.fsa", "\\bench\\docs\\deep\\er\\sys.fsa", "/sys.fsa"};
  const char* paths[] = {"/bench/docs/p.csv", "/bench/p.csv", "/bench/docs/deep/a/b.csv",
                         "/other/p.csv",      "/p.csv",       "\\bench\\x\\..\\docs\\p.csv"};
  for (const char* base : bases) {
    for (const char* path : paths) {
      const std::string relative = QFCFileHelper::GetRelativePath(path, base);
      EXPECT_EQ(QFCFileHelper::GetAbsolutePath(relative, base), QFCFileHelper::GetAbsolutePath(path, "/"))
          << path << " from " << base << " via " << relative;
    }
  }
}

TEST(FileHelperTest, ExistenceAndWriteProtectionAcceptBothSeparators) {
  test::TempDir dir;
  const std::string file = dir.Write("doc.fsa", "x");
  auto backslashed = [](std::string path) {
    std::replace(path.begin(), path.end(), '/', '\\');
    return path;
  };
  EXPECT_TRUE(QFCFileHelper::Exists(backslashed(file)));
  EXPECT_FALSE(QFCFileHelper::IsDirectory(backslashed(file)));
  EXPECT_TRUE(QFCFileHelper::IsDirectory(backslashed(dir.Path())));
  EXPECT_FALSE(QFCFileHelper::Exists(file + ".missing"));
  EXPECT_FALSE(QFCFileHelper::Exists(""));

  // The mode bits decide, so root sees what a user sees.
  for (auto [mode, expected] :
       {std::pair<mode_t, bool>{0644, false}, {0444, true}, {0200, false}, {0000, true}}) {
    ASSERT_EQ(::chmod(file.c_str(), mode), 0);
    EXPECT_EQ(QFCFileHelper::IsWriteProtected(file), expected) << std::oct << mode;
    EXPECT_EQ(QFCFileHelper::IsWriteProtected(backslashed(file)), expected) << std::oct << mode;
  }
  EXPECT_FALSE(QFCFileHelper::IsWriteProtected(file + ".new"));  // saving creates it
  EXPECT_FALSE(QFCFileHelper::IsWriteProtected(""));
}

}  // namespace
}  // namespace faultbox

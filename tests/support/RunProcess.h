// Runs a program and collects its exit status, standard output and standard
// error, for tests that drive the real command line tools.
#pragma once

#include <string>
#include <vector>

namespace faultbox::test {

struct ProcessResult {
  int exitCode = -1;  // -1 when the program did not exit normally
  std::string out;
  std::string err;
};

// `input` is written to the program's standard input, which is then closed.
ProcessResult RunProcess(const std::vector<std::string>& argv, const std::string& input = {},
                         const std::vector<std::string>& extraEnv = {});

// Runs the built faultbox program with the given arguments.
ProcessResult RunFaultbox(const std::vector<std::string>& args, const std::string& input = {},
                          const std::vector<std::string>& extraEnv = {});

// A fresh empty folder below the system's temporary folder, removed with the object.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  const std::string& Path() const { return path_; }
  std::string File(const std::string& name) const { return path_ + "/" + name; }
  // Writes a file below the folder and returns its path.
  std::string Write(const std::string& name, const std::string& content) const;

 private:
  std::string path_;
};

std::string ReadText(const std::string& path);

}  // namespace faultbox::test

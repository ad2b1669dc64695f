// Tests of the INI settings store: path rules, lookup, writes that keep the
// rest of the file, section removal and atomic replacement.
#include "platform/Settings.h"

#include <gtest/gtest.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <vector>

#include "support/RunProcess.h"

namespace faultbox {
namespace {

namespace fs = std::filesystem;
using namespace std::string_literals;

// Restores an environment variable when the test ends.
class EnvGuard {
 public:
  explicit EnvGuard(const char* name) : name_(name) {
    if (const char* v = std::getenv(name)) old_ = v;
  }
  ~EnvGuard() { Set(old_); }
  void Set(const std::optional<std::string>& value) {
    value ? ::setenv(name_, value->c_str(), 1) : ::unsetenv(name_);
  }

 private:
  const char* name_;
  std::optional<std::string> old_;
};

class SettingsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    config_.Set(file_.string());
    Settings::SetPathOverride("");
  }
  void TearDown() override { Settings::SetPathOverride(""); }

  void WriteFile(const std::string& content) {
    fs::create_directories(folder_);
    std::ofstream(file_, std::ios::binary) << content;
  }
  std::string ReadFile() const { return test::ReadText(file_.string()); }

  EnvGuard config_{"FAULTBOX_CONFIG"};
  EnvGuard xdg_{"XDG_CONFIG_HOME"};
  EnvGuard home_{"HOME"};
  test::TempDir temp_;
  fs::path dir_ = temp_.Path();
  fs::path folder_ = dir_ / "cfg";
  fs::path file_ = folder_ / "faultbox.ini";
};

std::string PasswdHome() {
  const passwd* pw = ::getpwuid(::getuid());
  return pw != nullptr && pw->pw_dir != nullptr ? pw->pw_dir : "";
}

TEST_F(SettingsTest, DefaultPathFollowsEnvironment) {
  struct Case {
    std::optional<std::string> config, xdg, home;
    std::string expected;
  };
  const std::string home = PasswdHome();
  const std::string fromPasswd = home.empty() || home == "/" ? "/.config/faultbox/faultbox.ini"
                                                             : home + "/.config/faultbox/faultbox.ini";
  const Case cases[] = {
      {"/etc/fb.ini", "/xdg", "/home/u", "/etc/fb.ini"},
      {"", "/xdg", "/home/u", "/xdg/faultbox/faultbox.ini"},
      {std::nullopt, "/xdg", "/home/u", "/xdg/faultbox/faultbox.ini"},
      {std::nullopt, "relative/xdg", "/home/u", "/home/u/.config/faultbox/faultbox.ini"},
      {std::nullopt, "", "/home/u/", "/home/u/.config/faultbox/faultbox.ini"},
      {std::nullopt, std::nullopt, "/", "/.config/faultbox/faultbox.ini"},
      {std::nullopt, std::nullopt, std::nullopt, fromPasswd},
  };
  for (const Case& c : cases) {
    config_.Set(c.config);
    xdg_.Set(c.xdg);
    home_.Set(c.home);
    EXPECT_EQ(Settings::DefaultPath(), c.expected) << c.config.value_or("-") << " " << c.xdg.value_or("-");
    EXPECT_EQ(Settings::Path(), c.expected);
  }
}

TEST_F(SettingsTest, OverrideAndMissingFile) {
  Settings::SetPathOverride("/opt/bench/fb.ini");
  EXPECT_EQ(Settings::Path(), "/opt/bench/fb.ini");
  Settings::SetPathOverride("rel/fb.ini");
  EXPECT_EQ(Settings::Path(), (fs::current_path() / "rel/fb.ini").string());
  Settings::SetPathOverride("");
  EXPECT_EQ(Settings::Path(), file_.string());

  // A missing file reads as empty, and deleting from it creates nothing.
  EXPECT_EQ(Settings::GetString(Settings::kComponentSection, "Timeout"), std::nullopt);
  EXPECT_TRUE(Settings::GetSection(Settings::kComponentSection).empty());
  EXPECT_TRUE(Settings::DeleteSection(Settings::kComponentSection));
  EXPECT_FALSE(fs::exists(folder_));
}

TEST_F(SettingsTest, LookupIgnoresCaseCommentsAndGarbledLines) {
  // A std::string literal: the junk line holds a NUL byte.
  WriteFile(
      "\xEF\xBB\xBF"
      "orphan=before any section\r\n; a comment\r\n[Components\\Faultbox.Component]\r\n"
      "  Timeout  =  250  \r\n# Info=commented out\r\nInfo=a=b ; kept\r\nthis line is garbled\r\n"
      "[broken\r\n=no key\r\nEmpty=\r\ntimeout=999\r\n\x01\xFF\x00junk\r\n"
      "[ components\\faultbox.component\\HARDWARE ]\r\nChannel=can0\r\n"
      "[Components\\Faultbox.Component]\r\nUserMode=1"s);
  struct Case {
    const char* section;
    const char* key;
    std::optional<std::string> expected;
  };
  const Case cases[] = {
      {Settings::kComponentSection, "Timeout", "250"},  // the first of repeated keys is in force
      {"COMPONENTS\\FAULTBOX.COMPONENT", "TIMEOUT", "250"},
      {Settings::kComponentSection, "Info", "a=b ; kept"},
      {Settings::kComponentSection, "Empty", ""},
      {Settings::kComponentSection, "UserMode", "1"},  // a section may appear twice
      {Settings::kHardwareSection, "channel", "can0"},
      {Settings::kComponentSection, "Channel", std::nullopt},
      {"", "orphan", std::nullopt},
      {"Components", "Timeout", std::nullopt},
      {"broken", "Empty", std::nullopt},
  };
  for (const Case& c : cases)
    EXPECT_EQ(Settings::GetString(c.section, c.key), c.expected) << c.section << " / " << c.key;

  using Entries = std::vector<std::pair<std::string, std::string>>;
  EXPECT_EQ(Settings::GetSection(Settings::kComponentSection),
            (Entries{{"Timeout", "250"}, {"Info", "a=b ; kept"}, {"Empty", ""}, {"UserMode", "1"}}));
}

TEST_F(SettingsTest, WritesChangeOnlyTheirLine) {
  struct Case {
    const char* name;
    std::optional<std::string> before;  // nullopt: no file, no folder
    const char* section;
    const char* key;
    const char* value;
    std::string after;
  };
  const Case cases[] = {
      {"new file and folders", std::nullopt, Settings::kComponentSection, "Timeout", "1000",
       "[Components\\Faultbox.Component]\nTimeout=1000\n"},
      {"update keeps spelling, spacing and comments",
       "; top\n[Components\\Faultbox.Component]\n  TimeOut = 5 \n; tail\n", "components\\faultbox.component",
       "timeout", "250", "; top\n[Components\\Faultbox.Component]\n  TimeOut = 250\n; tail\n"},
      {"new key after the last entry, not into the next section's comment",
       "[A]\nx=1\n\n; about B\n[B]\ny=2\n", "a", "z", "3", "[A]\nx=1\nz=3\n\n; about B\n[B]\ny=2\n"},
      {"new key in an empty section", "[A]\n[B]\n", "B", "k", "v", "[A]\n[B]\nk=v\n"},
      {"new section after a blank line", "[A]\nx=1", "A\\B", "k", "", "[A]\nx=1\n\n[A\\B]\nk=\n"},
      {"garbled lines and line ends survive", "[A]\r\n???\r\nx=1\r\n", "A", "x", "2",
       "[A]\r\n???\r\nx=2\r\n"},
      {"sub-section is a section of its own", "[A]\n[A\\B]\nk=1\n", "A", "k", "2", "[A]\nk=2\n[A\\B]\nk=1\n"},
  };
  for (const Case& c : cases) {
    std::error_code ec;
    fs::remove_all(folder_, ec);
    if (c.before) WriteFile(*c.before);
    EXPECT_TRUE(Settings::SetString(c.section, c.key, c.value)) << c.name;
    EXPECT_EQ(ReadFile(), c.after) << c.name;
    EXPECT_EQ(Settings::GetString(c.section, c.key), std::string(c.value)) << c.name;
  }
}

TEST_F(SettingsTest, RefusesTextsTheFileCannotGiveBack) {
  const std::string before = "[A]\nx=1\n";
  struct Case {
    std::string section, key, value;
  };
  const Case cases[] = {
      {"", "k", "v"},    {" A", "k", "v"}, {"A\nB", "k", "v"},     {"A", "", "v"},
      {"A", "k=j", "v"}, {"A", ";k", "v"}, {"A", "#k", "v"},       {"A", "[k]", "v"},
      {"A", "k ", "v"},  {"A", "k", " v"}, {"A", "k", "v\r\nx=2"}, {"A", "k", std::string("v\0w", 3)},
  };
  WriteFile(before);
  for (const Case& c : cases) {
    EXPECT_FALSE(Settings::SetString(c.section, c.key, c.value)) << "[" << c.section << "] " << c.key;
    EXPECT_EQ(ReadFile(), before);
  }
  EXPECT_FALSE(Settings::DeleteSection(""));
}

TEST_F(SettingsTest, UnreadableOrUnwritableFileIsNeverReplaced) {
  // A folder where the file should be cannot be read: writing must fail, not start afresh.
  fs::create_directories(file_);
  EXPECT_FALSE(Settings::SetString("A", "k", "v"));
  EXPECT_FALSE(Settings::DeleteSection("A"));
  EXPECT_TRUE(fs::is_directory(file_));
  EXPECT_EQ(Settings::GetString("A", "k"), std::nullopt);

  // The folder cannot be created because a plain file is in the way.
  std::ofstream(dir_ / "blocker") << "x";
  config_.Set((dir_ / "blocker" / "faultbox.ini").string());
  EXPECT_FALSE(Settings::SetString("A", "k", "v"));
}

TEST_F(SettingsTest, DeleteRemovesSectionAndItsSubSections) {
  struct Case {
    const char* section;
    std::string before, after;
  };
  // A neighbour whose name starts like the section is no sub-section, and
  // the comment above it belongs to it.
  const std::string registered =
      "; top\n[Other]\na=1\n\n[C\\F]\nt=1\n\n[C\\F\\Hardware]\nch=1\n[c\\f\\hardware\\Ports]\nCOM1=x\n"
      "; about the neighbour\n[C\\FX]\nk=1\n";
  const Case cases[] = {
      {"C\\F", registered, "; top\n[Other]\na=1\n\n; about the neighbour\n[C\\FX]\nk=1\n"},
      {"C\\F\\Hardware", registered,
       "; top\n[Other]\na=1\n\n[C\\F]\nt=1\n\n; about the neighbour\n[C\\FX]\nk=1\n"},
      {"C\\F\\Hard", registered, registered},  // a name prefix is not a parent section
      {"A", "[A]\nx=1\n[B]\ny=2\n[a]\nz=3\n", "[B]\ny=2\n"},
  };
  for (const Case& c : cases) {
    WriteFile(c.before);
    EXPECT_TRUE(Settings::DeleteSection(c.section)) << c.section;
    EXPECT_EQ(ReadFile(), c.after) << c.section;
    EXPECT_TRUE(Settings::GetSection(c.section).empty()) << c.section;
  }
}

TEST_F(SettingsTest, WritesLeaveNoTemporaryFilesAndKeepPermissions) {
  WriteFile("[A]\nx=1\n");
  ::chmod(file_.c_str(), 0640);
  ASSERT_TRUE(Settings::SetString("A", "x", "2"));
  ASSERT_TRUE(Settings::SetString("B", "y", "3"));
  ASSERT_TRUE(Settings::DeleteSection("B"));
  std::vector<std::string> names;
  for (const auto& entry : fs::directory_iterator(folder_)) names.push_back(entry.path().filename().string());
  EXPECT_EQ(names, std::vector<std::string>{"faultbox.ini"});
  struct stat st {};
  ASSERT_EQ(::stat(file_.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 07777, 0640u);
  EXPECT_EQ(ReadFile(), "[A]\nx=2\n");
}

TEST_F(SettingsTest, SymbolicLinkIsWrittenThrough) {
  fs::create_directories(dir_ / "dotfiles");
  std::ofstream(dir_ / "dotfiles" / "fb.ini") << "[A]\nx=1\n";
  fs::create_directories(folder_);
  fs::create_symlink(dir_ / "dotfiles" / "fb.ini", file_);
  ASSERT_TRUE(Settings::SetString("A", "x", "2"));
  EXPECT_TRUE(fs::is_symlink(file_));
  EXPECT_EQ(Settings::GetString("A", "x"), "2");
}

}  // namespace
}  // namespace faultbox

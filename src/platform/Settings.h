// The settings store: an INI file that takes the place of the component's
// registry key. Missing files read as empty; every write replaces the file
// atomically, so a crash never leaves a half-written settings file.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace faultbox {

class Settings {
 public:
  // File format: "[section]" lines (names kept literally, backslashes included),
  // "key=value" lines, comment lines starting with ';' or '#'. Spaces around
  // names and values are not part of them; there are no inline comments. Lines
  // that fit none of these are kept on writing and otherwise ignored. When a key
  // (or a section) appears twice, the first one is in force.
  //
  // Sections that hold the component key and its hardware sub-key.
  static constexpr const char* kComponentSection = "Components\\Faultbox.Component";
  static constexpr const char* kHardwareSection = "Components\\Faultbox.Component\\Hardware";

  // The settings file in use: $FAULTBOX_CONFIG, else
  // $XDG_CONFIG_HOME/faultbox/faultbox.ini (only when absolute), else
  // ~/.config/faultbox/faultbox.ini ($HOME, or the password database's home
  // folder when HOME is unset). Empty when no home folder is known: reads then
  // find nothing and writes fail.
  static std::string DefaultPath();

  // Overrides the path for this process (the command line's --config); an
  // empty text returns to the default rule. A relative path is made absolute
  // against the working folder at the time of the call.
  static void SetPathOverride(const std::string& path);
  static std::string Path();

  // Reads a text value; nullopt when the file, section or key is missing.
  // Section and key names are compared without regard to case, as registry names are.
  static std::optional<std::string> GetString(const std::string& section, const std::string& key);

  // Writes one value (creating the file, its folder and the section as needed),
  // keeping every other line, comment and the order of the file. Returns false
  // and leaves the old file as it was when writing fails, when the existing file
  // cannot be read (it is never replaced by one holding only the new value), or
  // when a text could not be read back unchanged: empty names, line breaks, '='
  // in a key, a key starting with ';', '#' or '[', spaces around a name or value.
  // Writers in several processes are serialised by a lock on the folder; a
  // settings file that is a symbolic link is written through the link.
  static bool SetString(const std::string& section, const std::string& key, const std::string& value);

  // Removes a section and every section below it ("A" also removes "A\B").
  // Comment lines directly above a remaining section stay. A missing file or
  // section is success. Returns false on a write failure or an empty name.
  static bool DeleteSection(const std::string& section);

  // Every key of a section with its value, in file order and spelt as in the file.
  static std::vector<std::pair<std::string, std::string>> GetSection(const std::string& section);
};

}  // namespace faultbox

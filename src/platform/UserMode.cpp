// The user mode, read once from the settings.
#include "platform/UserMode.h"

#include <atomic>
#include <optional>
#include <string>

#include "platform/Settings.h"

namespace faultbox {
namespace {
std::atomic<int> userMode{-1};  // -1 until read
}  // namespace

int GetUserMode() {
  int mode = userMode.load();
  if (mode >= 0) return mode;
  const std::optional<std::string> value = Settings::GetString(Settings::kComponentSection, "UserMode");
  mode = !value ? 0 : (*value == kServiceModeCode ? 2 : 1);
  userMode.store(mode);
  return mode;
}

void ResetUserMode() { userMode.store(-1); }

}  // namespace faultbox

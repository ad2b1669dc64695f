// The user mode of the component: standard, or the service mode for the
// staff who commission benches, chosen by the "UserMode" setting.
#pragma once

namespace faultbox {

// The "UserMode" value of the component's settings that switches to the
// service mode 2.
constexpr const char* kServiceModeCode = "8C3E51A7-2F64-4B9D-A0E7-6D15F2C94B38";

// 0 without a "UserMode" setting, 2 when it is the service code, 1 for any
// other value. Read on first use and then kept.
int GetUserMode();
// Forgets the mode read, so that the next GetUserMode reads the setting again.
void ResetUserMode();

}  // namespace faultbox

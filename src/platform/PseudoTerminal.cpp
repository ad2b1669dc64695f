// Pseudo-terminal pairs for simulated serial devices.
#include "platform/PseudoTerminal.h"

#include <fcntl.h>
#include <stdlib.h>
#include <termios.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace faultbox {

namespace {
std::unique_ptr<PseudoTerminal> Fail(std::string* error, const char* call, int master) {
  if (error != nullptr) *error = std::string(call) + ": " + std::strerror(errno);
  if (master >= 0) ::close(master);
  return nullptr;
}
}  // namespace

std::unique_ptr<PseudoTerminal> PseudoTerminal::Open(std::string* error) {
  int master = ::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
  if (master < 0) return Fail(error, "posix_openpt", -1);
  if (::grantpt(master) != 0) return Fail(error, "grantpt", master);
  if (::unlockpt(master) != 0) return Fail(error, "unlockpt", master);
  char name[128];
  if (::ptsname_r(master, name, sizeof name) != 0) return Fail(error, "ptsname_r", master);
  // Raw on the master too, so the bytes a device answers are never rewritten
  // (no CR/LF mapping, no echo) on their way to the port.
  termios tio{};
  if (::tcgetattr(master, &tio) == 0) {
    ::cfmakeraw(&tio);
    ::tcsetattr(master, TCSANOW, &tio);
  }
  return std::unique_ptr<PseudoTerminal>(new PseudoTerminal(master, name));
}

PseudoTerminal::~PseudoTerminal() {
  if (master_ >= 0) ::close(master_);
}

}  // namespace faultbox

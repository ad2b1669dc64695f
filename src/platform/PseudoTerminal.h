// A pseudo-terminal pair: the master side is what a simulated serial device
// reads and writes, the slave path is what the serial port layer opens as if
// it were a real port.
#pragma once

#include <memory>
#include <string>

namespace faultbox {

class PseudoTerminal {
 public:
  // Opens a new pair with the master in raw mode. On failure returns nullptr
  // and, if `error` is given, a text naming the failed call.
  static std::unique_ptr<PseudoTerminal> Open(std::string* error = nullptr);
  ~PseudoTerminal();
  PseudoTerminal(const PseudoTerminal&) = delete;
  PseudoTerminal& operator=(const PseudoTerminal&) = delete;

  int MasterFd() const { return master_; }
  // The device path of the slave side, e.g. /dev/pts/7.
  const std::string& SlavePath() const { return slavePath_; }

 private:
  PseudoTerminal(int master, std::string slavePath) : master_(master), slavePath_(std::move(slavePath)) {}
  int master_;
  std::string slavePath_;
};

}  // namespace faultbox

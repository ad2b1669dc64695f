// Drives the pin file reader over arbitrary bytes: board type detection, a
// load by both platform descriptions, and every pin's accessors and document
// storage. The input goes through a real file, since the reader opens paths.
#include <fcntl.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>

#include "config/kr40/QFCKR40HardwareInfo.h"
#include "config/kr60/QFCKR60HardwareInfo.h"
#include "platform/QFCReporter.h"
#include "platform/Archive.h"

namespace {

// One file per process, in memory where possible; removed after every input
// because libFuzzer may end the process without running exit handlers.
const std::string& InputPath() {
  static const std::string path = [] {
    const char* tmp = std::getenv("TMPDIR");
    const std::string folder = access("/dev/shm", W_OK) == 0 ? "/dev/shm" : (tmp ? tmp : "/tmp");
    return folder + "/faultbox-fuzz-" + std::to_string(getpid()) + ".csv";
  }();
  return path;
}

bool WriteInput(const std::uint8_t* data, std::size_t size) {
  const int fd = open(InputPath().c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (fd < 0) return false;
  std::size_t done = 0;
  while (done < size) {
    const ssize_t n = write(fd, data + done, size - done);
    if (n <= 0) break;
    done += static_cast<std::size_t>(n);
  }
  close(fd);
  return done == size;
}

void Exercise(faultbox::QFCAbstractHardwareInfo& info) {
  using namespace faultbox;
  std::string value;
  info.GetPlatformFromBoardType();
  for (int i = 0; i < 6; ++i) info.GetPotential(i, value);
  for (const std::string& name : info.GetAdditionalFiles()) info.ResolveAdditionalFile(name);
  for (int e = 0; e < info.GetEcuCount(); ++e) {
    QFCECU* ecu = info.GetEcu(e);
    for (int p = 0; p < ecu->GetPinCount(); ++p) {
      QFCAbstractPin* pin = ecu->GetPin(p);
      pin->GetModuleAddress();
      pin->GetModuleChannels();
      std::vector<std::string> classes;
      pin->ReadFailureClasses(classes);
      if (ecu->FindPin(pin->PinName()) == nullptr) std::abort();  // every pin must be found by its name
      Archive out;
      pin->Serialize(out);
      Archive in(out.Data());
      pin->Serialize(in);  // compare on load: the same values, no difference
    }
  }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  faultbox::TheReporter().StartReporting();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace faultbox;
  if (!WriteInput(data, size)) return 0;
  const bool additional = size % 2 == 1;
  std::int32_t platform = 0;
  {
    QFCKR40HardwareInfo probe(InputPath(), 1, nullptr);
    probe.DetectBoardType(platform);
  }
  {
    QFCKR40HardwareInfo info(InputPath(), 1, nullptr);
    info.LoadPinFile(additional);
    Exercise(info);
  }
  {
    QFCKR60HardwareInfo info(InputPath(), 1, nullptr);
    info.LoadPinFile(additional);
    Exercise(info);
  }
  unlink(InputPath().c_str());
  return 0;
}

// Drives the archive reader over arbitrary bytes: texts, counts and object
// tags in the mix a document or failure class file would hold them.
#include <cstddef>
#include <cstdint>

#include "platform/Archive.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace faultbox;
  if (size == 0) return 0;
  Archive ar(std::vector<std::uint8_t>(data + 1, data + size));
  const std::uint8_t plan = data[0];
  try {
    for (int step = 0; step < 64 && ar.Remaining() > 0; ++step) {
      switch ((plan + step) % 5) {
        case 0:
          ar.ReadString();
          break;
        case 1: {
          std::uint32_t n = ar.ReadCountOf(1);
          for (std::uint32_t i = 0; i < n; ++i) ar.ReadU8();
          break;
        }
        case 2:
          ar.ReadObjectTag();
          break;
        case 3:
          ar.ReadObjectStart({{"QFCKR40FailureClass", 1}, {"QFCKR60FailureClass", 1}});
          break;
        default:
          ar.ReadU32();
      }
    }
  } catch (const ArchiveException&) {
  }
  return 0;
}

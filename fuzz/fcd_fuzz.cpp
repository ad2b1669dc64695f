// Reads arbitrary bytes as a failure class file of either platform, as a
// system loads it, then uses the classes the way patterns and tools do: the
// lookups must stay inside every list, and the source form of what was read
// must build the same file again whenever the source check accepts it.
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/FailureClassLoader.h"
#include "config/FailureClassSource.h"
#include "platform/Archive.h"

namespace {

using namespace faultbox;

void Exercise(QFCAbstractFailureClasses& classes) {
  std::vector<std::uint32_t> none(kRelayPositions, 0);
  std::vector<std::uint32_t> some(kRelayPositions, 0);
  some[0] = some[10] = some[42] = 1;
  std::vector<QFTFoundFailureClass> candidates;
  for (int i = 0; i < classes.GetCount(); ++i) {
    QFCAbstractFailureClass& c = *classes.GetAt(i);
    candidates.push_back({c.GetId(), 0});
    for (int group : {0, kGroupExternal, kGroupLoad}) {
      c.GetMaxNumber(group, true);
      c.GetMaxNumber(group, false);
    }
    for (int j = -1; j <= c.GetPossibilityCount(); ++j) {
      std::uint64_t mask = 0;
      c.GetRelayMask(j, mask);
      c.MatchesStates(j, none);
      c.MatchesStates(j, some);
      c.FindNumber(j, 1, kGroupExternal, true);
      c.FindNumber(j, 0, kGroupLoad, false);
      c.GetNumbers(j, 0, true);
    }
    c.TryUse();
  }
  std::vector<QFTFoundFailureClass> found;
  classes.FindByStates(some, candidates, found);
  classes.ResetAllUses();
  for (int i = 0; i < classes.GetCount(); ++i) {
    QFCAbstractFailureClass& c = *classes.GetAt(i);
    if (c.MoveSelectedPossibilityLater()) c.MoveSelectedPossibilityEarlier();
  }
}

bool OfOwnType(const QFCAbstractFailureClasses& classes) {
  const std::string own = classes.CreateFailureClass()->GetClassName();
  for (int i = 0; i < classes.GetCount(); ++i) {
    if (own != classes.GetAt(i)->GetClassName()) return false;
  }
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::vector<std::uint8_t> bytes(data, data + size);
  for (std::int32_t platform : {0, kFailureClassPlatformKR40, kFailureClassPlatformKR60}) {
    std::unique_ptr<QFCAbstractFailureClasses> classes;
    try {
      classes = ReadFailureClasses(bytes, platform);
    } catch (const ArchiveException&) {
      continue;
    }
    if (!classes) __builtin_trap();
    if (platform == 0) {
      const std::vector<std::uint8_t> stored = StoreFailureClasses(*classes);
      std::unique_ptr<QFCAbstractFailureClasses> rebuilt;
      // The source form names no class types: a file holding the other
      // platform's type is rebuilt with its own, so only uniform files compare.
      if (ParseFailureClassSource(FailureClassSourceText(*classes), "fuzz", &rebuilt) == FAULTBOX_OK &&
          OfOwnType(*classes) && StoreFailureClasses(*rebuilt) != stored) {
        __builtin_trap();
      }
      // What we write, we read back to the same bytes.
      if (StoreFailureClasses(*ReadFailureClasses(stored, 0)) != stored) __builtin_trap();
    }
    Exercise(*classes);
  }
  return 0;
}

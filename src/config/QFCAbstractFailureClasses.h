// The failure classes of one platform as a failure class file holds them:
// version text, platform type and the classes in file order.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "config/QFCAbstractFailureClass.h"

namespace faultbox {

class Archive;

// Platform types of a failure class file.
constexpr std::int32_t kFailureClassPlatformKR40 = 1;  // KR40 family (KR40 and KR80 boards)
constexpr std::int32_t kFailureClassPlatformKR60 = 2;

// A failure class and one of its relay vectors, as the safety interlock hands
// candidates around.
struct QFTFoundFailureClass {
  std::int32_t failureClassId = 0;
  std::int32_t relayVectorIndex = 0;
  bool operator==(const QFTFoundFailureClass&) const = default;
};

class QFCAbstractFailureClasses {
 public:
  // The first text of every failure class file; read back but not checked.
  static constexpr const char* kFileHeader = "Failure Class Generation Version 1.0";

  virtual ~QFCAbstractFailureClasses() = default;

  // An empty collection of the platform type (1 or 2), or nullptr for any other.
  static std::unique_ptr<QFCAbstractFailureClasses> Create(std::int32_t platform);

  // A new, empty failure class of this collection's platform.
  virtual std::unique_ptr<QFCAbstractFailureClass> CreateFailureClass() const = 0;

  const std::string& GetVersion() const { return version_; }
  void SetVersion(std::string version) { version_ = std::move(version); }
  std::int32_t GetPlatform() const { return platform_; }
  void SetPlatform(std::int32_t platform) { platform_ = platform; }

  int GetCount() const { return static_cast<int>(classes_.size()); }
  // nullptr for an index outside 0 .. count - 1.
  QFCAbstractFailureClass* GetAt(int index) const;
  // The first class with the ID, in file order; nullptr when there is none.
  QFCAbstractFailureClass* FindById(std::int32_t id) const;
  // Fills `found` with (ID, relay vector index) of every relay vector that
  // accepts `states`, over the classes named by a candidate that can take
  // another use, in collection order and by index within a class. The
  // candidates' own relay vector indexes play no part.
  void FindByStates(const std::vector<std::uint32_t>& states,
                    const std::vector<QFTFoundFailureClass>& candidates,
                    std::vector<QFTFoundFailureClass>& found) const;
  void ResetAllUses();

  // Appends a new class of this platform and returns it.
  QFCAbstractFailureClass& AddFailureClass();
  void Add(std::unique_ptr<QFCAbstractFailureClass> failureClass);
  void RemoveAll() { classes_.clear(); }

  // 1 when the collection belongs to a system of the platform type, else 0.
  int CheckVersion(std::int32_t platform) const { return platform_ == platform ? 1 : 0; }

  // The whole file. Loading first deletes the classes held; a damaged file
  // throws ArchiveException and may leave the collection half filled.
  void Serialize(Archive& ar);

 protected:
  explicit QFCAbstractFailureClasses(std::int32_t platform) : platform_(platform) {}

 private:
  std::string version_;
  std::int32_t platform_;
  std::vector<std::unique_ptr<QFCAbstractFailureClass>> classes_;
};

}  // namespace faultbox

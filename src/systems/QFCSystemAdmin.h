// The administration of every open failure simulation system: it creates,
// names, renames and removes them, and answers questions about the set.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {

class QFCSystem;

class QFCSystemAdmin {
 public:
  QFCSystemAdmin();
  ~QFCSystemAdmin();
  QFCSystemAdmin(const QFCSystemAdmin&) = delete;
  QFCSystemAdmin& operator=(const QFCSystemAdmin&) = delete;

  // Creates a system under the first free default name, opens it from the pin
  // file and keeps it. On failure the system is deleted, `system` is nullptr
  // and the administration is unchanged.
  [[nodiscard]] HRESULT Open(const std::string& pinFile, std::int32_t ecuVersion, const std::string& author,
               const std::string& description, QFCSystem*& system);
  // The first default name ("System 1", "System 2", ...) that no system bears.
  std::string GetDefaultName() const;

  // The first system whose name equals `name`, or nullptr. Document paths (the
  // names of saved systems) are equal when they name the same file; other
  // names compare without regard to case.
  QFCSystem* FindByName(std::string_view name) const;
  // True when a system other than `ignore` bears the name.
  bool IsNameUsed(std::string_view name, const QFCSystem* ignore = nullptr) const;
  int GetCount() const { return static_cast<int>(systems_.size()); }
  // nullptr outside 0 ... count-1.
  QFCSystem* GetAt(int index) const;

  // Deletes the system of that name (message 117); the others keep their order.
  void Remove(const std::string& name);
  // Deletes the system without a message: for a system that never became a
  // document's (its load failed) or whose document object goes away.
  void Discard(const QFCSystem* system);
  // Refused with message 88 when another system bears the new name; a change
  // of case of a system's own name is allowed.
  bool Rename(QFCSystem* system, const std::string& newName);

  // Another connected system that drives the same KR60 HIL simulator (equal
  // FIU load address, an unreadable one counting as 0), or nullptr. KR40-family
  // systems never share a simulator.
  QFCSystem* FindOtherSystemOnSameHil(const QFCSystem* system) const;
  // Deactivates the activated pattern of every system: all its pins take part
  // in the deactivation and are deselected afterwards. Every system is tried;
  // the result is the first failure, so a caller knows a relay may still be on.
  [[nodiscard]] HRESULT DeactivateAll();
  // Appends every connected system, in the order of creation.
  void GetConnectedSystems(std::vector<QFCSystem*>& systems) const;

 private:
  std::vector<std::unique_ptr<QFCSystem>> systems_;
};

}  // namespace faultbox

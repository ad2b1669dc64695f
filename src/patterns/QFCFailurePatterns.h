// The failure patterns of one system, in creation order: creation with
// unique names, lookup, renaming, removal, the activated pattern, storage.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ResultCodes.h"

namespace faultbox {

class Archive;
class QFCAbstractFailurePattern;
class QFCFailurePatternNode;
class QFCSystem;

class QFCFailurePatterns {
 public:
  // Runs the system's hardware reset; answers its result code.
  using HardwareReset = std::function<HRESULT()>;
  // Opens (or brings to front) the view of a pattern; the front end installs it.
  using ViewOpener = std::function<void(QFCAbstractFailurePattern&)>;

  explicit QFCFailurePatterns(QFCSystem* system);
  virtual ~QFCFailurePatterns();
  QFCFailurePatterns(const QFCFailurePatterns&) = delete;
  QFCFailurePatterns& operator=(const QFCFailurePatterns&) = delete;

  // A new pattern of the system's platform. An empty name takes the first
  // free default name; a name in use is refused (message 87, class 0).
  [[nodiscard]] HRESULT CreatePattern(QFCAbstractFailurePattern*& out, const std::string& name);
  // The default name format counted from 1: the first name no pattern bears.
  std::string MakeDefaultName() const;
  QFCAbstractFailurePattern* FindPattern(std::string_view name) const;
  bool NameExists(std::string_view name) const { return FindPattern(name) != nullptr; }
  QFCAbstractFailurePattern* GetAt(int index) const;
  int GetCount() const { return static_cast<int>(patterns_.size()); }
  int IndexOf(const QFCAbstractFailurePattern* pattern) const;
  // Destroys the pattern: its views are told, its pins give back their
  // failure class uses, and every folder forgets it.
  bool RemoveAt(int index);
  bool RemovePattern(std::string_view name);
  // Refused with message 87 when any pattern bears the name, its own included.
  bool RenamePattern(QFCAbstractFailurePattern* pattern, const std::string& name);
  // The last pattern with an activated pin; false when there is none.
  bool GetActivatedPattern(QFCAbstractFailurePattern*& out) const;
  void ClearActivatedFlags();
  void OpenSavedViews();
  // 1 for the KR40 family, 2 for KR60, 0 without a system.
  std::int32_t GetPlatformType() const;
  QFCSystem* GetSystem() const { return system_; }

  // The folder tree whose references are dropped with a removed pattern.
  void SetRootFolder(QFCFailurePatternNode* root) { root_ = root; }
  // The system's hardware reset after a failed transfer. Without one, the
  // patterns are only marked deactivated.
  void SetHardwareReset(HardwareReset reset) { hardwareReset_ = std::move(reset); }
  [[nodiscard]] HRESULT ResetHardware();
  void SetViewOpener(ViewOpener opener) { viewOpener_ = std::move(opener); }
  const ViewOpener& GetViewOpener() const { return viewOpener_; }

  // Count, then every pattern record. Loading replaces the patterns held; a
  // pattern that cannot be created ends the load (message 94 and an archive
  // exception). Pins lost from the pin file are counted for HasLoadChanges.
  void Serialize(Archive& ar);
  // Loading found pins that left the pin file: the document differs from it.
  bool HasLoadChanges() const { return lostPinsOnLoad_ > 0; }
  int GetLostPinsOnLoad() const { return lostPinsOnLoad_; }
  // Used by the pattern records while they load.
  void AddLostPins(int count) { lostPinsOnLoad_ += count; }

 protected:
  // Makes the platform's pattern; nullptr for a platform without patterns.
  virtual std::unique_ptr<QFCAbstractFailurePattern> NewPattern(std::int32_t platformType,
                                                                const std::string& name);

 private:
  void RemoveAllPatterns();

  QFCSystem* system_;
  std::vector<std::unique_ptr<QFCAbstractFailurePattern>> patterns_;
  QFCFailurePatternNode* root_ = nullptr;
  HardwareReset hardwareReset_;
  ViewOpener viewOpener_;
  int lostPinsOnLoad_ = 0;
};

}  // namespace faultbox

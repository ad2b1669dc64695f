// A failure simulation system: one failure insertion hardware as its pin
// files describe it, with its platform, ECUs, failure classes and transfer
// interface.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "systems/QFCSystemProperty.h"

namespace faultbox {

class QFCAbstractFailureClasses;
class QFCAbstractHardwareInfo;
class QFCECU;
class QFCAbstractFailurePattern;
class QFCAbstractPin;
class QFCFailurePatterns;
class QFCFailurePatternNode;
class QFCSystemAdmin;

class QFCSystem : public QFCSystemProperty {
 public:
  // What changed when the views are told.
  enum UpdateHint : int {
    kUpdateAll = 0,
    kUpdateName = 1,
    kUpdateConnection = 2,
    kUpdateReset = 3,
    kUpdateProperties = 4,
  };

  // Only the system administration makes systems, and opens them at once.
  QFCSystem(std::string name, const std::string& pinFilePath, std::int32_t ecuVersion, std::string author,
            std::string description);
  ~QFCSystem() override;

  // Reads the pin file, the additional pin files it names, the platform's
  // configuration and failure classes, collects the ECUs and creates the
  // transfer interface. A failure leaves a half-built system that the caller
  // deletes.
  [[nodiscard]] HRESULT OpenFromPinFile();

  // "FIULoadAddress", "RSIMLoadAddress" or "OffsetLoadAddress" of the pin
  // file as a number. A module that is not fitted ("none", "-", "#"), a value
  // that cannot be read and any other key fail with message 37 and
  // E_FAULTBOX_INVALID_PARAMETER.
  [[nodiscard]] HRESULT GetLoadAddress(const std::string& key, std::uint32_t& address) const;

  // The ECUs of all pin files, in pin file order. GetECU gives nullptr and an
  // internal fault for an index outside 0 ... count-1.
  int GetECUCount() const { return static_cast<int>(ecus_.size()); }
  QFCECU* GetECU(int index) const;
  const std::vector<QFCECU*>& GetECUs() const { return ecus_; }

  // Author, ECU version, connection, description, pin file and user mode,
  // each under its label.
  void GetProperties(PropertyTable& table) const override;

  // The system's part of the document: the property part, then the names of
  // the disabled ECUs.
  void Serialize(Archive& ar) override;

  // ---- questions of the owner chain ----
  // True when the document file that holds the system is write-protected; a
  // system that no saved document holds is writable.
  bool IsReadOnly() const override;
  bool IsPatternActivated() const override;
  // True when a pattern has an activated pin; `pattern` is that pattern.
  bool HasActivatedPattern(QFCAbstractFailurePattern*& pattern) const;

  // ---- connection to the hardware ----
  // The setting (milliseconds, section Settings::kHardwareSection) for how
  // long a KR60 reset lets the modules answer before it collects the answers.
  static constexpr const char* kResetCollectionWaitKey = "ResetCollectionWait";
  static constexpr std::int32_t kDefaultResetCollectionWait = 1000;
  // The setting, or the default when it is missing; a value that is not a
  // decimal number is reported (message 37, class 2) and the default used.
  static std::int32_t GetResetCollectionWait();

  // Connects (followed by a hardware reset) or disconnects the transfer
  // interface. `report` shows the messages and notifies the views; without it
  // the attempt is silent. Connecting a connected system does nothing;
  // disconnecting is refused (E_FAULTBOX_DISCONNECT) while a pattern is
  // activated, and both are refused while another system on the same HIL
  // simulator is connected. A failed connect leaves the system disconnected
  // with every pin unavailable.
  [[nodiscard]] HRESULT SetConnection(bool connect, bool report);
  // Sends the reset messages to all modules, learns which modules answer and
  // marks every pattern deactivated. Modules that stay silent are reported but
  // do not fail the reset. A module that answers without acknowledging was
  // not reset: it is named, the reset fails and the patterns keep their
  // activated pins, since their relays may still be switched.
  [[nodiscard]] HRESULT ResetHardware();
  // The result of the last ResetHardware, also of the one a connect runs.
  [[nodiscard]] HRESULT GetLastResetResult() const { return lastResetResult_; }
  // The hardware this system is tied to instead of what the settings' tables
  // name for its interface settings: a CAN channel target "driver:interface"
  // (KR60) or a serial device path (KR40 family); "" for the tables. A front
  // end that gives the system a bench of its own sets it once after the
  // open; it then holds whatever the interface settings become, so that no
  // change elsewhere moves the system to other hardware.
  void SetHardwareRoute(std::string route) { hardwareRoute_ = std::move(route); }
  const std::string& GetHardwareRoute() const override { return hardwareRoute_; }
  // A pin is available when its module answered the last reset.
  void UpdatePinAvailability();
  // The administration asked for other systems on the same HIL simulator; a
  // system without one never meets another.
  void SetAdministration(const QFCSystemAdmin* admin) { admin_ = admin; }

  // The pattern collection and the root of the pattern folders.
  QFCFailurePatterns* GetFailurePatterns() const { return patterns_.get(); }
  QFCFailurePatternNode* GetRootFolder() const { return rootFolder_.get(); }

  // ---- pattern operations with the read-only rule ----
  // Each is refused with message 118 naming the system while the document is
  // write-protected; the collection's own checks (unique names, message 87)
  // follow. A successful change marks the document modified.
  [[nodiscard]] HRESULT CreatePattern(const std::string& name, QFCAbstractFailurePattern*& pattern);
  // A pattern with an activated pin stays (message 127): its relays would be
  // left switched with nothing to switch them back.
  bool RemovePattern(std::string_view name);
  bool RenamePattern(QFCAbstractFailurePattern* pattern, const std::string& name);
  // The first pattern whose name is byte-for-byte `name`, or nullptr.
  QFCAbstractFailurePattern* FindPattern(std::string_view name) const;

  // The first ECU named exactly `name`, or nullptr.
  QFCECU* FindECU(std::string_view name) const;
  // The pin `pinName` of an ECU named `ecuName` (names compared exactly), or nullptr.
  QFCAbstractPin* FindPin(std::string_view ecuName, std::string_view pinName) const;
  // "BoardType" as the main pin file writes it ("" before the open read it).
  std::string GetPinFileBoardType() const;

  // Marks the document modified; ignored while read-only.
  void SetModified() override;
  bool IsModified() const { return modified_; }
  void ClearModified() { modified_ = false; }

  void SetDocumentPath(std::string path) { documentPath_ = std::move(path); }

  // ---- properties ----
  // The caller keeps names unique (the administration's Rename does).
  void SetName(std::string name);
  // Refused with message 118 (false) on a read-only system.
  bool SetAuthor(std::string author);
  bool SetDescription(std::string description);
  bool SetECUVersion(std::int32_t ecuVersion);

  // Tells the views of the system about a change.
  void UpdateViews(int hint = kUpdateAll);

  // The hardware descriptions: the pin file's first, then one per additional pin file.
  const std::vector<std::unique_ptr<QFCAbstractHardwareInfo>>& GetHardwareInfos() const {
    return hardwareInfos_;
  }
  // The failure classes read at open, or nullptr.
  QFCAbstractFailureClasses* GetFailureClasses() const { return failureClasses_.get(); }
  // The failure class file as it was opened (relative names resolved, the
  // default file completed), "" before the open reached it.
  const std::string& GetFailureClassPathUsed() const { return failureClassPathUsed_; }

 private:
  // A hardware description of the platform that the file's board type gives;
  // `platform` receives that platform. nullptr with `result` set when the
  // board type cannot be read or names no platform.
  std::unique_ptr<QFCAbstractHardwareInfo> CreateHardwareInfo(const std::string& path, std::int32_t& platform,
                                                              HRESULT& result);
  [[nodiscard]] HRESULT ReadPlatformConfiguration(const QFCAbstractHardwareInfo& info);
  [[nodiscard]] HRESULT ReadKR40Configuration(const QFCAbstractHardwareInfo& info);
  [[nodiscard]] HRESULT ReadKR60Configuration(const QFCAbstractHardwareInfo& info);
  [[nodiscard]] HRESULT LoadSystemFailureClasses();
  // Adds the description's columns to the visible pin properties, keeping the flags of known ones.
  void RegisterColumns(const QFCAbstractHardwareInfo& info);
  bool CheckWritable() const;
  // A load module text that stands for a module that is not fitted.
  static bool IsModuleNotFitted(const std::string& text);
  // Takes every transfer interface off the hardware and enters the
  // disconnected state, without any check: for a system that is going away.
  void DisconnectSilently();
  // Not connected, no responding module, every pin unavailable.
  void EnterDisconnectedState();
  // The platform parts of ResetHardware; `completed` is false when a send
  // failed and the reset ended early, or a module did not acknowledge it.
  [[nodiscard]] HRESULT ResetKR60Hardware(bool& completed);
  [[nodiscard]] HRESULT ResetKR40Hardware(bool& completed);

  std::vector<std::unique_ptr<QFCAbstractHardwareInfo>> hardwareInfos_;
  std::vector<QFCECU*> ecus_;  // owned by the hardware descriptions
  std::unique_ptr<QFCAbstractFailureClasses> failureClasses_;
  std::string failureClassPathUsed_;
  std::string documentPath_;
  bool modified_ = false;
  std::unique_ptr<QFCFailurePatterns> patterns_;
  std::unique_ptr<QFCFailurePatternNode> rootFolder_;
  const QFCSystemAdmin* admin_ = nullptr;
  HRESULT lastResetResult_ = FAULTBOX_OK;
  std::string hardwareRoute_;
};

}  // namespace faultbox

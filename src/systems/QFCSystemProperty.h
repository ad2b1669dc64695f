// The descriptive properties of a failure simulation system and the settings
// with which its transfer interface reaches the hardware: the serial port of
// the KR40 family, the CAN channel and bus timing of KR60.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <type_traits>
#include <vector>

#include "config/QFCAbstractObjectData.h"
#include "comm/QFCAbstractTransferInterface.h"
#include "platform/InterfaceSettings.h"
#include "platform/ResultCodes.h"

namespace faultbox {

class Archive;

class QFCSystemProperty : public QFCAbstractObjectData, public QFITransferOwner {
 public:
  static constexpr std::uint32_t kDefaultBusTiming0 = kDefaultCanBusTiming0;
  static constexpr std::uint32_t kDefaultBusTiming1 = kDefaultCanBusTiming1;
  // Message numbers of the spare texts, in the order first, second, third.
  static constexpr int kSpareTextMessages[3] = {93, 99, 98};

  ~QFCSystemProperty() override;

  // The property part of the document: failure class file, spare texts,
  // visible pin properties, platform and interface settings. Loading compares
  // with or merges into what the pin file gave at open.
  void Serialize(Archive& ar) override;

  // ---- interface settings ----
  const std::string& GetName() const override { return QFCAbstractObjectData::GetName(); }
  bool IsReadOnly() const override { return QFCAbstractObjectData::IsReadOnly(); }
  const QFTSerialInterfaceSettings& GetSerialSettings() const override { return serial_; }
  // Refused (false) on a read-only system (message 118), while a transfer
  // interface is connected (message 169) and for a null record.
  bool SetSerialSettings(const QFTSerialInterfaceSettings* settings);
  const QFTCANInterfaceSettings& GetCANSettings() const override { return can_; }
  bool SetCANSettings(const QFTCANInterfaceSettings* settings) override;
  void GetBusTiming(std::uint32_t& first, std::uint32_t& second) const override;
  void SetBusTiming(std::uint32_t first, std::uint32_t second);

  // (device type, port number, 0) for the KR40 family, (device type, first,
  // second interface parameter) for KR60; other platforms leave the values.
  [[nodiscard]] HRESULT GetInterfaceParameter(std::int32_t& deviceType, std::int32_t& value1, std::int32_t& value2) const;
  // Takes effect at the next connect. Message 57 for a device type that does
  // not suit the platform.
  [[nodiscard]] HRESULT SetInterfaceParameter(std::int32_t deviceType, std::int32_t value1, std::int32_t value2);
  // True when none of the system's transfer interfaces is connected.
  bool IsInterfaceFree() const;

  // The number of answer wait passes: the decimal "Timeout" setting, 1000
  // without it; a value that is not a decimal number is reported (message 37,
  // class 2) and 1000 is used. Read anew on every call: each transfer
  // interface asks once and keeps the answer.
  static std::int32_t GetTransferTimeout();

  // ---- transfer interfaces ----
  QFCAbstractTransferInterface* GetTransferInterface() const { return currentTransferInterface_; }
  // Takes the interface and makes it the current one.
  void AddTransferInterface(std::unique_ptr<QFCAbstractTransferInterface> transferInterface);
  const std::vector<std::unique_ptr<QFCAbstractTransferInterface>>& GetTransferInterfaces() const {
    return transferInterfaces_;
  }

  // ---- descriptive properties ----
  const std::string& GetAuthor() const { return author_; }
  const std::string& GetDescription() const { return description_; }
  std::int32_t GetECUVersion() const { return ecuVersion_; }
  const std::string& GetPinFilePath() const { return pinFilePath_; }
  const std::string& GetPinFileTitle() const { return pinFileTitle_; }
  const std::string& GetFailureClassFile() const { return failureClassFile_; }
  const std::vector<std::string>& GetAdditionalPinFiles() const { return additionalPinFiles_; }
  const std::vector<std::string>& GetPotentialNames() const { return potentialNames_; }
  std::int32_t GetPlatformType() const { return platformType_; }
  const std::string& GetBoardType() const { return boardType_; }
  // 0, 1 or 2 for the first, second and third spare text; 3 for the fourth, which is never stored.
  const std::string& GetSpareText(int index) const;
  // Pin column name (lower case) to its flag (1 = shown in the pattern views).
  std::map<std::string, std::int32_t>& GetVisiblePinProperties() { return visiblePinProperties_; }
  const std::map<std::string, std::int32_t>& GetVisiblePinProperties() const { return visiblePinProperties_; }
  // The labels used when pin texts are formatted for display: pin, ECU,
  // module, channel, failure classes.
  const std::string& GetLabelText(int index) const;

  // ---- connection state (kept up to date by the connection logic) ----
  bool IsConnected() const override { return connected_; }
  void SetConnectedFlag(bool connected) { connected_ = connected; }
  // Modules that answered the last hardware reset.
  std::set<std::uint16_t>& GetRespondingModules() { return respondingModules_; }
  const std::set<std::uint16_t>& GetRespondingModules() const { return respondingModules_; }

 protected:
  explicit QFCSystemProperty(std::string name);

  // Sets the pin file path and its title (the name after the last separator).
  void SetPinFile(const std::string& path);

  std::set<std::uint16_t> respondingModules_;
  std::vector<std::string> additionalPinFiles_;
  std::string failureClassFile_;
  std::string description_;
  std::string pinFileTitle_;
  std::string pinFilePath_;
  std::string author_;
  std::int32_t platformType_ = 0;
  std::int32_t ecuVersion_ = 0;
  std::array<std::string, 4> spareTexts_;
  std::vector<std::string> potentialNames_;
  std::string boardType_;
  bool connected_ = false;
  std::map<std::string, std::int32_t> visiblePinProperties_;

 private:
  // The read-only and connected checks that every settings change passes
  // (messages 118 and 169); a null record is refused without a message.
  bool MaySetSettings(const void* settings) const;

  void StoreProperties(Archive& ar) const;
  void LoadProperties(Archive& ar);

  QFCAbstractTransferInterface* currentTransferInterface_ = nullptr;
  std::vector<std::unique_ptr<QFCAbstractTransferInterface>> transferInterfaces_;
  std::uint32_t busTiming0_ = kDefaultBusTiming0;
  std::uint32_t busTiming1_ = kDefaultBusTiming1;
  QFTCANInterfaceSettings can_;
  QFTSerialInterfaceSettings serial_;
  std::array<std::string, 5> labels_;
};

}  // namespace faultbox

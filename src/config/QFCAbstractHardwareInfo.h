// The hardware description of one pin file: reads the file (format block,
// comment, header, pin lines), keeps the ECUs and pins it found, and answers
// the format keys. The platform classes decide which keys and columns are
// required and which pins are made.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "config/QFCAbstractObjectData.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCCSVFileParser.h"
#include "config/QFCECU.h"
#include "platform/ResultCodes.h"

namespace faultbox {

// Platform type values (automation enumeration FSPlatformType).
constexpr std::int32_t fptKR40Platform = 1;
constexpr std::int32_t fptKR60Platform = 2;

class QFCAbstractHardwareInfo : public QFCAbstractObjectData {
 public:
  // Format table: lower-cased key to value.
  using FormatTable = std::unordered_map<std::string, std::string>;

  QFCAbstractHardwareInfo(std::string name, const std::string& pinFilePath, std::int32_t ecuVersion,
                          QFCAbstractObjectData* system);
  ~QFCAbstractHardwareInfo() override;

  // ---- platform operations ----
  [[nodiscard]] virtual HRESULT CheckMandatoryColumns();
  // Checks the format keys; `additional` is set for a file that another pin
  // file names and during board type detection (only "BoardType" required).
  [[nodiscard]] virtual HRESULT EvaluateFormat(bool additional);
  virtual std::unique_ptr<QFCAbstractPin> CreatePin();

  // ---- loading ----
  // Reads the whole pin file; stops at the first bad pin line, keeping the
  // pins of earlier lines. A second load replaces format table, header and
  // comment and adds to the ECUs.
  [[nodiscard]] HRESULT LoadPinFile(bool additional);
  // Reads only tags and format block and sets `platform` from "BoardType".
  [[nodiscard]] HRESULT DetectBoardType(std::int32_t& platform);
  void SetPinFilePath(const std::string& path);

  // ---- answers ----
  // FAULTBOX_OK with the value, E_FAULTBOX_CONSISTENCY_CHECK without a report
  // when the key is absent (message 35 first when no format block was read).
  [[nodiscard]] HRESULT GetFormatValue(std::string_view key, std::string& value) const;
  // fptKR40Platform, fptKR60Platform, or 0 (message 49, class 2).
  std::int32_t GetPlatformFromBoardType() const;
  // The name of potential 0 to 4.
  [[nodiscard]] HRESULT GetPotential(int index, std::string& name) const;
  // "FIULoadAddress" and "RSIMLoadAddress" as written, "" when absent.
  std::string GetFIULoadModule() const;
  std::string GetRSIMLoadModule() const;

  const std::string& GetComment() const { return comment_; }
  const std::string& GetPinFilePath() const { return pinFilePath_; }
  const std::string& GetFileName() const { return fileName_; }
  std::vector<std::string> GetColumnNames() const { return columns_; }
  std::int32_t GetEcuVersion() const { return ecuVersion_; }
  // The names "AdditionalFiles" lists, as written, in order.
  const std::vector<std::string>& GetAdditionalFiles() const { return additionalFiles_; }
  // Where an additional file lies: a relative name is taken against this pin
  // file's folder, '\' counts as separator, the case stays as written.
  std::string ResolveAdditionalFile(const std::string& name) const;
  const FormatTable* GetFormatTable() const { return format_.get(); }

  // ECUs in the order they first appear in the pin file.
  int GetEcuCount() const { return static_cast<int>(ecus_.size()); }
  QFCECU* GetEcu(int index) const;
  QFCECU* FindEcu(std::string_view name) const;
  std::size_t GetPinCount() const;

 protected:
  // The three columns every platform requires; message 39 names the first
  // missing one.
  [[nodiscard]] HRESULT CheckCommonColumns();
  // Message 50 for a missing key.
  bool RequireKey(std::string_view key) const;
  // The platform the pins of this load get, decided once per load.
  std::int32_t PinPlatform() const;

 private:
  [[nodiscard]] HRESULT CheckTags();
  [[nodiscard]] HRESULT ReadFormat(bool additional);
  void ReadAdditionalFiles();
  void ReadComment();
  [[nodiscard]] HRESULT ReadHeader();
  [[nodiscard]] HRESULT ReadPins();
  [[nodiscard]] HRESULT ParsePinLine(const std::vector<std::string_view>& fields);
  // Opens the pin file for reading; a failure is reported (message 46 and
  // the internal fault of the given place) and returned.
  [[nodiscard]] HRESULT OpenPinFile(int placeCannotOpen, int placeNotOpened);
  std::int32_t FindOrReport(std::string_view tag, std::int32_t start);

  QFCCSVFileParser parser_;
  std::vector<std::unique_ptr<QFCECU>> ecus_;
  std::unordered_map<std::string, QFCECU*> ecuByName_;
  std::unique_ptr<FormatTable> format_;
  std::vector<std::string> columns_;
  std::size_t columnBytes_ = 0;  // the column names' lengths together
  std::string comment_;
  std::string pinFilePath_;
  std::string fileName_;
  std::int32_t ecuVersion_;
  std::vector<std::string> additionalFiles_;
  mutable std::int32_t pinPlatform_ = -1;
};

}  // namespace faultbox

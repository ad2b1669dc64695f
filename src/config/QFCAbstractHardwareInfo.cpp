// Loading a pin file into ECUs and pins, and the format key answers.
#include "config/QFCAbstractHardwareInfo.h"

#include <algorithm>
#include <cstdio>
#include <new>

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"
#include "platform/FileHelper.h"

namespace faultbox {
namespace {

constexpr const char* kTags[6] = {"/Comment",   "/CommentEnd", "/Format",
                                  "/FormatEnd", "/Signallist", "/SignallistEnd"};

// The signal list line of the header, and of the first pin ("/Signallist" is line 1).
constexpr int kHeaderLine = 3;
constexpr int kFirstPinLine = 7;

bool IsKR40Board(std::string_view board) {
  return board == "KR40" || board == "KR040" || board == "KR80" || board == "KR080";
}

bool IsKR60Board(std::string_view board) {
  return board == "KR60" || board == "KR060";
}

std::string FormatNumbered(const char* pattern, std::int32_t n) {
  char buffer[48];
  std::snprintf(buffer, sizeof buffer, pattern, static_cast<int>(n));
  return buffer;
}

// The fields of a block line from the tag's column on; none when the tag line
// held no field equal to the tag (column -1).
void FieldsFrom(std::string_view line, std::int32_t column, std::vector<std::string_view>& fields) {
  fields.clear();
  if (column < 0) return;
  QFCFSHelper::Split(line, ';', fields);
  const auto skip = std::min(fields.size(), static_cast<std::size_t>(column));
  fields.erase(fields.begin(), fields.begin() + static_cast<std::ptrdiff_t>(skip));
}

std::vector<std::string_view> FieldsFrom(std::string_view line, std::int32_t column) {
  std::vector<std::string_view> fields;
  FieldsFrom(line, column, fields);
  return fields;
}

}  // namespace

QFCAbstractHardwareInfo::QFCAbstractHardwareInfo(std::string name, const std::string& pinFilePath,
                                                 std::int32_t ecuVersion, QFCAbstractObjectData* system)
    : QFCAbstractObjectData(std::move(name), kKindHardwareInfo, system), ecuVersion_(ecuVersion) {
  SetPinFilePath(pinFilePath);
}

QFCAbstractHardwareInfo::~QFCAbstractHardwareInfo() = default;

void QFCAbstractHardwareInfo::SetPinFilePath(const std::string& path) {
  pinFilePath_ = path;
  fileName_ = QFCFileHelper::FileName(path);
}

std::unique_ptr<QFCAbstractPin> QFCAbstractHardwareInfo::CreatePin() {
  return nullptr;
}

HRESULT QFCAbstractHardwareInfo::EvaluateFormat(bool) {
  return FAULTBOX_OK;
}

HRESULT QFCAbstractHardwareInfo::CheckMandatoryColumns() {
  return CheckCommonColumns();
}

HRESULT QFCAbstractHardwareInfo::CheckCommonColumns() {
  if (columns_.empty()) {
    TheReporter().ReportInternalFault(48);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  for (const char* pattern : {"pin_name(%i)", "ecu_name(%i)", "faults_ecu(%i)"}) {
    const std::string column = QFCFSHelper::ToLower(FormatNumbered(pattern, ecuVersion_));
    if (std::find(columns_.begin(), columns_.end(), column) == columns_.end()) {
      TheReporter().ReportError(39, column, fileName_);
      return E_FAULTBOX_HEADER_COL_NOT_FOUND;
    }
  }
  return FAULTBOX_OK;
}

bool QFCAbstractHardwareInfo::RequireKey(std::string_view key) const {
  std::string value;
  if (GetFormatValue(key, value) == FAULTBOX_OK) return true;
  TheReporter().ReportError(50, std::string(key), fileName_);
  return false;
}

HRESULT QFCAbstractHardwareInfo::GetFormatValue(std::string_view key, std::string& value) const {
  if (!format_) {
    TheReporter().ReportInternalFault(51);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  auto it = format_->find(QFCFSHelper::ToLower(key));
  if (it == format_->end()) return E_FAULTBOX_CONSISTENCY_CHECK;
  value = it->second;
  return FAULTBOX_OK;
}

std::int32_t QFCAbstractHardwareInfo::GetPlatformFromBoardType() const {
  std::string board;
  if (GetFormatValue("BoardType", board) != FAULTBOX_OK) board.clear();
  if (IsKR40Board(board)) return fptKR40Platform;
  if (IsKR60Board(board)) return fptKR60Platform;
  TheReporter().ReportWarning(49, board);
  return 0;
}

std::int32_t QFCAbstractHardwareInfo::PinPlatform() const {
  if (pinPlatform_ < 0) pinPlatform_ = GetPlatformFromBoardType();
  return pinPlatform_;
}

HRESULT QFCAbstractHardwareInfo::GetPotential(int index, std::string& name) const {
  if (index < 0 || index >= 5) {
    TheReporter().ReportInternalFault(54);
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  return GetFormatValue(FormatNumbered("Potential%i", index), name);
}

std::string QFCAbstractHardwareInfo::GetFIULoadModule() const {
  std::string value;
  return format_ && GetFormatValue("FIULoadAddress", value) == FAULTBOX_OK ? value : std::string();
}

std::string QFCAbstractHardwareInfo::GetRSIMLoadModule() const {
  std::string value;
  return format_ && GetFormatValue("RSIMLoadAddress", value) == FAULTBOX_OK ? value : std::string();
}

std::string QFCAbstractHardwareInfo::ResolveAdditionalFile(const std::string& name) const {
  return QFCFileHelper::GetAbsolutePath(name, pinFilePath_);
}

QFCECU* QFCAbstractHardwareInfo::GetEcu(int index) const {
  if (index < 0 || index >= GetEcuCount()) return nullptr;
  return ecus_[static_cast<std::size_t>(index)].get();
}

QFCECU* QFCAbstractHardwareInfo::FindEcu(std::string_view name) const {
  auto it = ecuByName_.find(std::string(name));
  return it == ecuByName_.end() ? nullptr : it->second;
}

std::size_t QFCAbstractHardwareInfo::GetPinCount() const {
  std::size_t count = 0;
  for (const auto& ecu : ecus_) count += static_cast<std::size_t>(ecu->GetPinCount());
  return count;
}

// ---- loading ----

std::int32_t QFCAbstractHardwareInfo::FindOrReport(std::string_view tag, std::int32_t start) {
  const std::int32_t position = parser_.FindTag(tag, start);
  if (position < 0) TheReporter().ReportError(47, std::string(tag), parser_.GetTitle());
  return position;
}

HRESULT QFCAbstractHardwareInfo::OpenPinFile(int placeCannotOpen, int placeNotOpened) {
  if (!parser_.Open(pinFilePath_)) {
    TheReporter().ReportError(46, pinFilePath_);
    TheReporter().ReportInternalFault(placeCannotOpen);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }
  if (!parser_.IsOpen()) {
    TheReporter().ReportError(46, pinFilePath_);
    TheReporter().ReportInternalFault(placeNotOpened);
    return E_FAULTBOX_FILE_IS_NOT_OPENED;
  }
  return FAULTBOX_OK;
}

HRESULT QFCAbstractHardwareInfo::LoadPinFile(bool additional) {
  if (HRESULT opened = OpenPinFile(738, 739); opened != FAULTBOX_OK) return opened;
  TheReporter().ReportInternal(154);
  TheReporter().ReportInfo(152, pinFilePath_);
  pinPlatform_ = -1;

  HRESULT hr = CheckTags();
  if (hr == FAULTBOX_OK) hr = ReadFormat(additional);
  if (hr == FAULTBOX_OK) {
    ReadAdditionalFiles();
    ReadComment();
    hr = ReadHeader();
  }
  if (hr == FAULTBOX_OK) hr = ReadPins();
  parser_.Close();
  if (hr == FAULTBOX_OK) {
    TheReporter().ReportInfo(153, pinFilePath_);
    TheReporter().ReportInternal(154);
  }
  return hr;
}

HRESULT QFCAbstractHardwareInfo::DetectBoardType(std::int32_t& platform) {
  if (HRESULT opened = OpenPinFile(740, 741); opened != FAULTBOX_OK) return opened;
  HRESULT hr = CheckTags();
  if (hr == FAULTBOX_OK) hr = ReadFormat(true);
  if (hr == FAULTBOX_OK) {
    std::string board;
    // Without the key the board is unknown and refused below like any other.
    if (GetFormatValue("BoardType", board) != FAULTBOX_OK) board.clear();
    if (IsKR40Board(board)) {
      platform = fptKR40Platform;
    } else if (IsKR60Board(board)) {
      platform = fptKR60Platform;
    } else {
      TheReporter().ReportError(49, board);
      hr = E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED;
    }
  }
  parser_.Close();
  return hr;
}

HRESULT QFCAbstractHardwareInfo::CheckTags() {
  std::int32_t position[6];
  bool missing = false;
  for (int i = 0; i < 6; ++i) {
    position[i] = FindOrReport(kTags[i], 0);
    missing = missing || position[i] < 0;
  }
  if (missing) return E_FAULTBOX_TAG_NOT_FOUND;
  // The comment tags may share a line; a format or signal list block may not
  // (its start line would also be its end).
  if (position[0] > position[1] || position[2] >= position[3] || position[4] >= position[5]) {
    TheReporter().ReportError(144);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  return FAULTBOX_OK;
}

HRESULT QFCAbstractHardwareInfo::ReadFormat(bool additional) {
  const std::int32_t start = FindOrReport("/Format", 0);
  if (start < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  const std::int32_t column = parser_.GetTagColumn();
  const std::int32_t end = FindOrReport("/FormatEnd", 0);
  if (end < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  try {
    format_ = std::make_unique<FormatTable>();
  } catch (const std::bad_alloc&) {
    TheReporter().ReportInternalFault(49);
    return E_FAULTBOX_NULL_POINTER;
  }
  std::string line;
  std::int32_t next = 0;
  parser_.ReadLineAt(line, start, next, true);
  for (std::int32_t position = next; position < end; position = next) {
    if (!parser_.ReadLineAt(line, position, next, true)) break;
    const std::vector<std::string_view> fields = FieldsFrom(line, column);
    const std::string_view key = fields.size() > 0 ? QFCFSHelper::Trim(fields[0]) : std::string_view();
    const std::string_view value = fields.size() > 1 ? QFCFSHelper::Trim(fields[1]) : std::string_view();
    if (key.empty() && value.empty()) continue;
    if (value.empty()) {
      TheReporter().ReportWarning(38, std::string(key), parser_.GetTitle());
      continue;
    }
    (*format_)[QFCFSHelper::ToLower(key)] = std::string(value);
  }
  return EvaluateFormat(additional);
}

void QFCAbstractHardwareInfo::ReadAdditionalFiles() {
  additionalFiles_.clear();
  std::string value;
  if (GetFormatValue("AdditionalFiles", value) != FAULTBOX_OK || value.empty() || value == "none") return;
  std::size_t read = 0;
  for (std::string_view name : QFCFSHelper::Split(value, ',')) {
    additionalFiles_.emplace_back(name);
    ++read;
  }
  TheReporter().ReportInternal(48, std::to_string(read), std::to_string(additionalFiles_.size()));
}

void QFCAbstractHardwareInfo::ReadComment() {
  comment_.clear();
  const std::int32_t start = FindOrReport("/Comment", 0);
  if (start < 0) return;
  const std::int32_t end = FindOrReport("/CommentEnd", 0);
  if (end < 0) return;
  std::string line;
  std::int32_t next = 0;
  parser_.ReadLineAt(line, start, next, false);
  for (std::int32_t position = next; position < end; position = next) {
    if (!parser_.ReadLineAt(line, position, next, false)) break;
    std::replace(line.begin(), line.end(), ';', ' ');
    const std::string_view text = QFCFSHelper::TrimRight(line);
    if (!text.empty()) comment_.append(text).append("\r\n");
  }
}

HRESULT QFCAbstractHardwareInfo::ReadHeader() {
  columns_.clear();
  const std::int32_t start = FindOrReport("/Signallist", 0);
  if (start < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  const std::int32_t column = parser_.GetTagColumn();
  // The end tag bounds the block: a block too short to hold a header has none.
  const std::int32_t end = FindOrReport("/SignallistEnd", 0);
  if (end < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  std::string line;
  std::int32_t position = start;
  std::int32_t next = 0;
  for (int number = 1; number < kHeaderLine && position < end; ++number) {
    if (!parser_.ReadLineAt(line, position, next, true)) break;
    position = next;
  }
  if (position < end && parser_.ReadLineAt(line, position, next, true)) {
    bool gap = false;
    std::size_t gapColumn = 0;
    const std::vector<std::string_view> fields = FieldsFrom(line, column);
    for (std::size_t i = 0; i < fields.size(); ++i) {
      const std::string_view name = QFCFSHelper::Trim(fields[i]);
      if (name.empty()) {
        gap = true;
        gapColumn = i + 1;
      } else if (gap) {
        TheReporter().ReportError(112, std::to_string(gapColumn), fileName_);
        return E_FAULTBOX_INVALID_PARAMETER;
      } else {
        columns_.push_back(QFCFSHelper::ToLower(name));
      }
    }
  }
  columnBytes_ = 0;
  for (const std::string& name : columns_) columnBytes_ += name.size();
  return CheckMandatoryColumns();
}

HRESULT QFCAbstractHardwareInfo::ReadPins() {
  const std::int32_t start = FindOrReport("/Signallist", 0);
  if (start < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  const std::int32_t column = parser_.GetTagColumn();
  const std::int32_t end = FindOrReport("/SignallistEnd", 0);
  if (end < 0) return E_FAULTBOX_TAG_NOT_FOUND;
  std::string line;
  std::int32_t position = start;
  std::int32_t next = 0;
  int number = 1;
  for (; number < kFirstPinLine && position < end; ++number) {
    if (!parser_.ReadLineAt(line, position, next, true)) return FAULTBOX_OK;
    position = next;
  }
  std::vector<std::string_view> fields;
  for (; position < end; ++number, position = next) {
    if (!parser_.ReadLineAt(line, position, next, true)) break;
    FieldsFrom(line, column, fields);
    const HRESULT hr = ParsePinLine(fields);
    if (hr != FAULTBOX_OK) {
      TheReporter().ReportError(146, std::to_string(number));
      return hr;
    }
  }
  return FAULTBOX_OK;
}

HRESULT QFCAbstractHardwareInfo::ParsePinLine(const std::vector<std::string_view>& fields) {
  std::unique_ptr<QFCAbstractPin> pin = CreatePin();
  if (!pin) {
    TheReporter().ReportInternalFault(50);
    return E_FAULTBOX_NULL_POINTER;
  }
  pin->SetFileName(parser_.GetTitle());
  std::size_t bytes = columnBytes_;
  for (std::string_view field : fields) bytes += field.size();
  pin->ReserveValues(columns_.size(), bytes);
  // Field numbers in messages count from the line's first field.
  const std::size_t offset = static_cast<std::size_t>(std::max(parser_.GetTagColumn(), 0));
  std::size_t f = 0;
  std::size_t c = 0;
  for (; f < fields.size() && c < columns_.size(); ++f, ++c) {
    const std::string_view value = QFCFSHelper::Trim(fields[f]);
    if (value.empty()) {
      TheReporter().ReportError(111, parser_.GetTitle());
      return E_FAULTBOX_CONSISTENCY_CHECK;
    }
    if (columns_[c] == "not defined") continue;
    const HRESULT hr = pin->SetValue(columns_[c], std::string(value));
    if (hr != FAULTBOX_OK) {
      TheReporter().ReportError(147, std::to_string(f + offset));
      return hr;
    }
  }
  if (c < columns_.size()) {
    TheReporter().ReportError(147, std::to_string(f + offset));
    TheReporter().ReportError(148);
    return E_FAULTBOX_CONSISTENCY_CHECK;
  }
  pin->SetEcuVersion(ecuVersion_);
  const HRESULT valid = pin->Validate();
  if (valid == W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION) return FAULTBOX_OK;
  if (valid != FAULTBOX_OK) return valid;

  std::string ecuName;
  if (pin->GetEcuName(ecuName) != QFCAbstractPin::kPresent) return E_FAULTBOX_CONSISTENCY_CHECK;
  auto it = ecuByName_.find(ecuName);
  if (it != ecuByName_.end()) {
    if (!it->second->AddPinIfNew(pin)) {
      const std::string pinName = pin->PinName();
      const std::string detail = "Value: " + pinName + ", pin name: " + pinName + ", ECU name: " + ecuName +
                                 ", File name: " + fileName_;
      TheReporter().ReportError(114, pinName, detail);
      return E_FAULTBOX_CONSISTENCY_CHECK;
    }
    return FAULTBOX_OK;
  }
  auto ecu = std::make_unique<QFCECU>(ecuName, GetOwner());
  ecu->AddPin(std::move(pin));
  ecuByName_.emplace(ecuName, ecu.get());
  ecus_.push_back(std::move(ecu));
  return FAULTBOX_OK;
}

}  // namespace faultbox

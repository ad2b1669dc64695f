// One ECU pin as one pin file line describes it: the line's values by column,
// the checks every platform makes, the allowed failure class entries and the
// pin's storage in a document.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "config/QFCAbstractObjectData.h"
#include "platform/ResultCodes.h"

namespace faultbox {

class QFCECU;

// A pin's values: lower-cased column name to value, in the order the columns
// came. Keys and values of a pin share one buffer, so that a pin costs a few
// allocations and not two per column: a bench has pins by the ten thousand.
// Most pins have a handful of columns, searched in place; a wide header gets
// an index so that a line stays linear in its number of fields.
class QFCPinValueTable {
 public:
  using Entry = std::pair<std::string_view, std::string_view>;

  class const_iterator {
   public:
    const_iterator(const QFCPinValueTable* table, std::size_t index) : table_(table), index_(index) {}
    Entry operator*() const { return table_->At(index_); }
    const_iterator& operator++() {
      ++index_;
      return *this;
    }
    bool operator==(const const_iterator& other) const { return index_ == other.index_; }

   private:
    const QFCPinValueTable* table_;
    std::size_t index_;
  };

  QFCPinValueTable() = default;
  QFCPinValueTable(QFCPinValueTable&&) noexcept = default;
  QFCPinValueTable& operator=(QFCPinValueTable&&) noexcept = default;

  std::optional<std::string_view> Find(std::string_view key) const;
  bool Contains(std::string_view key) const { return Find(key).has_value(); }
  // Inserts, or replaces the value of an existing key.
  void Set(std::string_view key, std::string_view value);
  void Clear();
  void Reserve(std::size_t entries, std::size_t bytes = 0) {
    spans_.reserve(entries);
    text_.reserve(bytes);
  }
  std::size_t Size() const { return spans_.size(); }
  Entry At(std::size_t index) const;
  const_iterator begin() const { return {this, 0}; }
  const_iterator end() const { return {this, spans_.size()}; }

 private:
  static constexpr std::size_t kIndexFrom = 24;
  struct Span {
    std::uint32_t key;
    std::uint32_t keyLength;
    std::uint32_t value;
    std::uint32_t valueLength;
  };
  std::string text_;
  std::vector<Span> spans_;
  std::unique_ptr<std::unordered_map<std::string, std::size_t>> index_;  // from kIndexFrom entries on
};

class QFCAbstractPin : public QFCAbstractObjectData {
 public:
  // What GetValue and the getters built on it answer.
  static constexpr int kMissing = 0;  // the column is not there (message 39 reported)
  static constexpr int kPresent = 1;
  static constexpr int kNotUsed = 2;  // the value is "-" or "#"

  QFCAbstractPin(std::int32_t platform, QFCAbstractObjectData* system);
  ~QFCAbstractPin() override;

  // ---- platform operations ----
  // The address of the relay module that serves the pin, 0 when unknown.
  virtual std::uint32_t GetModuleAddress() const { return 0; }
  virtual const QFCPinValueTable& GetValues() const { return values_; }
  // The checks of the pin's line; W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION
  // means the line is not used, any other failure refuses the line.
  [[nodiscard]] virtual HRESULT Validate();
  // Whether one failure class entry has the platform's form.
  [[nodiscard]] virtual HRESULT CheckFailureClassEntry(const std::string& entry) const;
  // The module channel(s) the pin uses, as far as they can be read; no messages.
  virtual std::vector<std::uint32_t> GetModuleChannels() const { return {}; }
  // The two columns a document stores for the platform and compares on load.
  virtual std::vector<std::string> GetPlatformColumns() const { return {}; }

  // ---- values ----
  // Stores a value under the lower-cased column. A column given twice is
  // refused (message 40) unless it is the repeatable one, which keeps its
  // first value.
  [[nodiscard]] HRESULT SetValue(const std::string& column, const std::string& value);
  // kMissing (message 39), kNotUsed or kPresent.
  int GetValue(std::string_view column, std::string& value) const;
  // The value without any report; none when the column is missing.
  std::optional<std::string_view> FindValue(std::string_view column) const;

  // Sets n and the three column names built from it.
  void SetEcuVersion(std::int32_t n);
  std::int32_t GetEcuVersion() const { return ecuVersion_; }
  // "pin_name(n)", "ecu_name(n)", "faults_ecu(n)".
  std::string GetPinNameColumn() const { return Column("pin_name"); }
  std::string GetEcuNameColumn() const { return Column("ecu_name"); }
  std::string GetFailureClassColumn() const { return Column("faults_ecu"); }
  void SetFileName(std::string name) { fileName_ = std::move(name); }
  const std::string& GetFileName() const { return fileName_; }

  int GetPinName(std::string& name) const { return GetValue(GetPinNameColumn(), name); }
  int GetEcuName(std::string& name) const { return GetValue(GetEcuNameColumn(), name); }
  // Room for the values of a line: that many columns, keys and values
  // together that many bytes.
  void ReserveValues(std::size_t columns, std::size_t bytes) { values_.Reserve(columns, bytes); }
  // Quiet forms: the value, or "" when the column is missing.
  std::string PinName() const;
  std::string EcuName() const;
  // The raw value of the failure class column.
  std::string GetFailureClassText() const;

  // The allowed failure class entries, in file order: kPresent with the
  // entries, kNotUsed, or kMissing (column missing, or an entry refused with
  // message 37). The outcome is kept: asking again reports nothing new.
  int ReadFailureClasses(std::vector<std::string>& list);
  // The same without the copy: the outcome, with the entries in GetFailureClasses().
  int EnsureFailureClasses();
  std::size_t GetFailureClassCount();
  const std::vector<std::string>& GetFailureClasses() const { return failureClasses_; }

  // Cleared by the system for pins whose module did not answer a reset
  // (message 109 while connected).
  void SetPresent(bool present);
  bool IsPresent() const { return present_; }
  void SetCompareOnLoad(bool compare) { compareOnLoad_ = compare; }
  bool GetCompareOnLoad() const { return compareOnLoad_; }
  QFCECU* GetEcu() const { return ecu_; }
  void SetEcu(QFCECU* ecu) { ecu_ = ecu; }
  std::int32_t GetPlatform() const { return platform_; }
  // The one column a line may give twice (the first value counts).
  static const std::string& GetRepeatableColumn();

  // Items in document order: values, failure class entries, file name, the
  // three column names, n, the raw failure class text, 0, n, then the
  // platform columns. Loading with compare on load set keeps the pin's
  // current values and reports each difference with message 142.
  void Serialize(Archive& ar) override;

  // "Value: %s, pin name: %s, ECU name: %s, File name: %s".
  std::string DetailText(std::string_view value) const;

 protected:
  // Reported message 37 for `column` with the detail text of `value`.
  void ReportInvalid(std::string_view column, std::string_view value) const;

  QFCPinValueTable values_;

 private:
  void LoadCompared(Archive& ar);
  void ForgetFailureClasses();
  std::string Column(std::string_view name) const;

  std::int32_t platform_;
  bool compareOnLoad_ = true;
  QFCECU* ecu_ = nullptr;
  bool present_ = false;
  std::vector<std::string> failureClasses_;
  int failureClassOutcome_ = -1;  // -1 until the entries were read
  std::int32_t ecuVersion_ = 0;
  std::string fileName_;
};

}  // namespace faultbox

// Checks and module numbers of KR40-family pins.
#include "config/kr40/QFCKR40Pin.h"

#include "config/QFCFSHelper.h"
#include "platform/QFCReporter.h"

namespace faultbox {
namespace {

int ReadNumber(const QFCAbstractPin& pin, std::string_view column, int base, std::uint32_t& number) {
  std::string text;
  const int state = pin.GetValue(column, text);
  if (state != QFCAbstractPin::kPresent) return state;
  return QFCFSHelper::StringToNumber(text, number, base) ? QFCAbstractPin::kPresent
                                                         : QFCAbstractPin::kMissing;
}

}  // namespace

std::uint32_t QFCKR40Pin::GetModuleAddress() const {
  const auto text = FindValue("fiu_module_id");
  std::uint32_t id = 0;
  if (!text || !QFCFSHelper::StringToNumber(*text, id, 16)) return 0;
  return id;
}

std::vector<std::uint32_t> QFCKR40Pin::GetModuleChannels() const {
  const auto text = FindValue("fiu_module_channel");
  std::uint32_t channel = 0;
  if (!text || !QFCFSHelper::StringToNumber(*text, channel, 10)) return {};
  return {channel};
}

int QFCKR40Pin::GetFiuModuleId(std::uint32_t& id) const {
  return ReadNumber(*this, "fiu_module_id", 16, id);
}

int QFCKR40Pin::GetFiuModuleChannel(std::uint32_t& channel) const {
  return ReadNumber(*this, "fiu_module_channel", 10, channel);
}

HRESULT QFCKR40Pin::CheckFailureClassEntry(const std::string& entry) const {
  std::uint32_t id = 0;
  return QFCFSHelper::StringToNumber(entry, id, 10) ? FAULTBOX_OK : E_FAULTBOX_INVALID_PARAMETER;
}

HRESULT QFCKR40Pin::Validate() {
  const int classes = EnsureFailureClasses();
  if (classes == kNotUsed) return W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;
  if (classes == kMissing) return E_FAULTBOX_CONSISTENCY_CHECK;
  if (HRESULT hr = QFCAbstractPin::Validate(); hr != FAULTBOX_OK) return hr;

  struct Check {
    const char* column;
    int base;
    std::uint32_t min;
    std::uint32_t max;
  };
  const Check checks[] = {{"fiu_module_id", 16, 0, kMaxModuleId},
                          {"fiu_module_channel", 10, kMinChannel, kMaxChannel}};
  bool good = true;
  for (const Check& check : checks) {
    std::string text;
    const int state = GetValue(check.column, text);
    if (state == kNotUsed) {
      TheReporter().ReportError(41, check.column, DetailText(text));
      return E_FAULTBOX_CONSISTENCY_CHECK;
    }
    if (state == kMissing) {
      good = false;
      continue;
    }
    std::uint32_t number = 0;
    if (!QFCFSHelper::StringToNumber(text, number, check.base) || number < check.min || number > check.max) {
      ReportInvalid(check.column, text);
      good = false;
    }
  }
  if (good) return FAULTBOX_OK;
  TheReporter().ReportInternalFault(600);
  return E_FAULTBOX_CONSISTENCY_CHECK;
}

}  // namespace faultbox

#include "config/QFCExternHardware.h"

#include <utility>

#include "platform/MessageTable.h"

namespace faultbox {

namespace {

constexpr int kResNotConfigured = 6787;
constexpr int kResNoPotential = 8905;

}  // namespace

QFCExternHardware::QFCExternHardware(std::string kindText, std::int32_t type)
    : name_(ResourceText(kResNotConfigured)), kindText_(std::move(kindText)), type_(type) {}

QFCExternHardwareMeas::QFCExternHardwareMeas() : QFCExternHardware("Measurement", kMeasurement) {}

std::int32_t QFCExternHardwareMeas::GetChannel(int channel) const {
  if (channel < 1 || channel > kChannelCount) return 0;
  return channels_[static_cast<std::size_t>(channel - 1)];
}

bool QFCExternHardwareMeas::SetChannel(int channel, std::int32_t endpoint) {
  if (channel < 1 || channel > kChannelCount) return false;
  channels_[static_cast<std::size_t>(channel - 1)] = endpoint;
  return true;
}

QFCExternHardwarePot::QFCExternHardwarePot(const std::vector<std::string>& potentials)
    : QFCExternHardware("Potential", kPotential) {
  for (std::size_t i = 0; i < kPotentialCount && i < potentials.size(); ++i) names_[i] = potentials[i];
  names_[kNoPotential] = ResourceText(kResNoPotential);
}

int QFCExternHardwarePot::FindPotentialIndex(const std::string& name) const {
  for (int i = 0; i < kNameCount; ++i)
    if (names_[static_cast<std::size_t>(i)] == name) return i;
  return -1;
}

int QFCExternHardwarePot::GetChoiceIndex(std::int32_t kind) const {
  if (kind == kResistor) return resistorChoice_;
  if (kind == kMeasurement) return measurementChoice_;
  return -1;
}

bool QFCExternHardwarePot::SetChoiceIndex(std::int32_t kind, int index) {
  if (index < 0 || index >= kNameCount) return false;
  if (kind == kResistor) {
    resistorChoice_ = index;
    return true;
  }
  if (kind == kMeasurement) {
    measurementChoice_ = index;
    return true;
  }
  return false;
}

}  // namespace faultbox

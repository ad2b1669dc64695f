#include "config/QFCExternHardwareAdmin.h"

#include <new>

#include "platform/QFCReporter.h"
#include "platform/MessageTable.h"

namespace faultbox {

namespace {

constexpr int kResNoPotential = 8905;

constexpr int kPlaceCreateFirstItem = 210;  // 210 ... 214 in the order of creation
constexpr int kPlaceIsConnectedType = 455;
constexpr int kPlacePotentialNames = 2501;
constexpr int kPlaceSetChoice = 2502;
constexpr int kPlaceSetChoiceByIndex = 2503;
constexpr int kPlaceGetChoice = 2504;
constexpr int kPlaceFindPotential = 2505;

bool IsChoiceKind(std::int32_t kind) {
  return kind == QFCExternHardware::kResistor || kind == QFCExternHardware::kMeasurement;
}

}  // namespace

HRESULT QFCExternHardwareAdmin::Create(const std::vector<std::string>& potentials) {
  Clear();
  const char* noPotential = ResourceString(kResNoPotential);
  // Allocation failures are reported like any missing object instead of
  // escaping as exceptions.
  QFCExternHardware* made[] = {
      new (std::nothrow) QFCExternHardwarePot(potentials),
      new (std::nothrow) QFCExternHardware(noPotential ? noPotential : "", QFCExternHardware::kEmpty),
      new (std::nothrow) QFCExternHardware("Resistor", QFCExternHardware::kResistor),
      new (std::nothrow) QFCExternHardwareMeas(),
      new (std::nothrow) QFCExternHardware("Source", QFCExternHardware::kSource),
  };
  std::vector<std::unique_ptr<QFCExternHardware>> items;
  HRESULT result = FAULTBOX_OK;
  for (int i = 0; i < 5; ++i) {
    std::unique_ptr<QFCExternHardware> item(made[i]);
    if (!item && result == FAULTBOX_OK) {
      TheReporter().ReportInternalFault(kPlaceCreateFirstItem + i);
      result = E_FAULTBOX_NULL_POINTER;
    }
    items.push_back(std::move(item));
  }
  if (result != FAULTBOX_OK) return result;
  items_ = std::move(items);
  currentItem_ = 0;
  return FAULTBOX_OK;
}

QFCExternHardware* QFCExternHardwareAdmin::FindItem(std::int32_t type) const {
  for (const auto& item : items_)
    if (item->GetType() == type) return item.get();
  return nullptr;
}

QFCExternHardwarePot* QFCExternHardwareAdmin::PotentialItem(int place) const {
  auto* pot = dynamic_cast<QFCExternHardwarePot*>(FindItem(QFCExternHardware::kPotential));
  if (!pot) TheReporter().ReportInternalFault(place);
  return pot;
}

void QFCExternHardwareAdmin::GetPotentialNames(std::vector<std::string>& names) const {
  names.clear();
  const QFCExternHardwarePot* pot = PotentialItem(kPlacePotentialNames);
  if (!pot) return;
  names.assign(pot->GetNames().begin(), pot->GetNames().end());
}

bool QFCExternHardwareAdmin::SetPotentialChoice(const std::string& name, std::int32_t kind) {
  if (!IsChoiceKind(kind)) return false;
  QFCExternHardwarePot* pot = PotentialItem(kPlaceSetChoice);
  if (!pot) return false;
  const int index =
      name == kNoPotentialName ? QFCExternHardwarePot::kNoPotential : pot->FindPotentialIndex(name);
  return index >= 0 && pot->SetChoiceIndex(kind, index);
}

bool QFCExternHardwareAdmin::SetPotentialChoiceByIndex(int index, std::int32_t kind) {
  if (!IsChoiceKind(kind)) return false;
  QFCExternHardwarePot* pot = PotentialItem(kPlaceSetChoiceByIndex);
  return pot && pot->SetChoiceIndex(kind, index);
}

std::string QFCExternHardwareAdmin::GetPotentialChoice(std::int32_t kind) const {
  if (!IsChoiceKind(kind)) return {};
  const QFCExternHardwarePot* pot = PotentialItem(kPlaceGetChoice);
  if (!pot) return {};
  return pot->GetNames()[static_cast<std::size_t>(pot->GetChoiceIndex(kind))];
}

int QFCExternHardwareAdmin::GetPotentialChoiceIndex(std::int32_t kind) const {
  if (!IsChoiceKind(kind)) return -1;
  const QFCExternHardwarePot* pot = PotentialItem(kPlaceGetChoice);
  return pot ? pot->GetChoiceIndex(kind) : -1;
}

int QFCExternHardwareAdmin::FindPotentialIndex(const std::string& name) const {
  const QFCExternHardwarePot* pot = PotentialItem(kPlaceFindPotential);
  return pot ? pot->FindPotentialIndex(name) : -1;
}

bool QFCExternHardwareAdmin::Connect(std::int32_t type, std::int32_t channel, std::int32_t a,
                                     std::int32_t b) {
  bool result = false;
  for (const auto& item : items_) {
    // Two items on the same pair of endpoints would short each other.
    if (item->IsBetween(a, b)) item->Disconnect();
    if (item->GetType() != type) continue;
    if (type == QFCExternHardware::kEmpty) {
      result = true;
      continue;
    }
    if (type == QFCExternHardware::kMeasurement && channel >= 1 &&
        channel <= QFCExternHardwareMeas::kChannelCount) {
      result = static_cast<QFCExternHardwareMeas&>(*item).SetChannel(channel, a);
      continue;
    }
    if (a == kSetEndpointA && item->GetEndpointA() == 0) {
      item->SetEndpointA(b);
      result = true;
    } else if (a == kSetEndpointB && item->GetEndpointB() == 0) {
      item->SetEndpointB(b);
      result = true;
    } else if (item->IsFree()) {
      item->SetEndpoints(a, b);
      result = true;
    } else {
      result = false;
    }
  }
  return result;
}

bool QFCExternHardwareAdmin::GetConnection(std::int32_t type, std::int32_t channel, std::int32_t& a,
                                           std::int32_t& b) const {
  if (type != QFCExternHardware::kResistor && type != QFCExternHardware::kMeasurement &&
      type != QFCExternHardware::kSource)
    return false;
  const QFCExternHardware* item = FindItem(type);
  if (!item) return false;
  if (type == QFCExternHardware::kMeasurement && channel >= 1) {
    if (channel > QFCExternHardwareMeas::kChannelCount) return false;
    a = static_cast<const QFCExternHardwareMeas&>(*item).GetChannel(channel);
    // A channel has one endpoint; a fixed second value keeps stored patterns byte-identical.
    b = 0;
    return true;
  }
  a = item->GetEndpointA();
  b = item->GetEndpointB();
  return true;
}

bool QFCExternHardwareAdmin::IsConnected(std::int32_t type) const {
  if (type != QFCExternHardware::kResistor && type != QFCExternHardware::kMeasurement &&
      type != QFCExternHardware::kSource) {
    TheReporter().ReportInternalFault(kPlaceIsConnectedType);
    return false;
  }
  const QFCExternHardware* item = FindItem(type);
  return item && item->IsConnected();
}

void QFCExternHardwareAdmin::GetFreeTypes(std::vector<std::int32_t>& types) const {
  types.clear();
  for (const auto& item : items_)
    if (item->GetType() != QFCExternHardware::kPotential && item->IsFree()) types.push_back(item->GetType());
}

std::int32_t QFCExternHardwareAdmin::GetTypeAt(std::int32_t a, std::int32_t b) const {
  for (const auto& item : items_)
    if (item->GetEndpointA() == a && item->GetEndpointB() == b) return item->GetType();
  return QFCExternHardware::kEmpty;
}

std::int32_t QFCExternHardwareAdmin::TypeOfIndex(int index) {
  switch (index) {
    case 0:
      return QFCExternHardware::kResistor;
    case 2:
      return QFCExternHardware::kMeasurement;
    case 3:
      return QFCExternHardware::kSource;
    default:
      return QFCExternHardware::kEmpty;
  }
}

void QFCExternHardwareAdmin::DisconnectAll() {
  for (const auto& item : items_) {
    item->Disconnect();
    if (auto* meas = dynamic_cast<QFCExternHardwareMeas*>(item.get())) meas->ClearChannels();
  }
}

}  // namespace faultbox

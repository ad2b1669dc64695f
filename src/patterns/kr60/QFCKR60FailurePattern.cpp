// The KR60 pattern: its parts, Reset, the guarded external hardware setters,
// the translation of a failure class choice into PinConfig and external
// hardware settings, the requirement positions and RSIM word derived from
// them, and their stored form.
#include "patterns/kr60/QFCKR60FailurePattern.h"

#include <algorithm>
#include <array>

#include "config/QFCAbstractFailureClass.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"
#include "patterns/kr60/QFCKR60FailurePatternSafetyInterlock.h"
#include "platform/Archive.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgResistorRange = 100;
constexpr int kMsgClassNotSet = 125;
constexpr int kMsgPatternActivated = 127;

constexpr int kPlaceInitializeNoSystem = 206;
constexpr int kPlaceSetterNoHardware = 6701;
constexpr int kPlaceRsimRange = 6702;
constexpr int kPlaceStoreNoHardware = 6703;
constexpr int kPlaceLoadPotential = 6704;
constexpr int kPlaceLoadEndpoint = 6705;
constexpr int kPlaceLoadResistor = 6706;
constexpr int kPlaceEntryKind = 6707;
constexpr int kPlaceChoiceNoHardware = 6708;

using Item = QFCExternHardware;
using Admin = QFCExternHardwareAdmin;

// Endpoints of the relay matrix; 0 is "not connected".
constexpr std::int32_t kMaxEndpoint = 5;
// The only endpoint a measurement channel can be switched to on its own.
constexpr std::int32_t kChannelEndpoint = 1;

// Requirement positions of the external hardware. An item connected to
// matrix endpoint v (2 to 5) sets the row of v: resistor A, resistor B,
// measurement A, measurement B, source A, source B, in that order.
constexpr std::size_t kResistorPotentialFirst = 5;
constexpr std::size_t kMeasurementPotentialFirst = 16;
constexpr std::size_t kChannelFirst = 33;                              // channel 1; channels 2 to 4 follow
constexpr std::array<std::size_t, 4> kEndpointRow = {10, 21, 27, 37};  // for endpoints 2, 3, 4, 5
constexpr std::size_t kExternalFirst = 5;

// The offset of an item within a row: resistor 0, measurement 2, source 4.
std::size_t ItemOffset(std::int32_t type) {
  return type == Item::kResistor ? 0 : type == Item::kMeasurement ? 2 : 4;
}

// 0 or a matrix endpoint.
bool IsMatrixEndpoint(std::int32_t value) {
  return value >= 0 && value <= kMaxEndpoint;
}

// Endpoint 1 is reserved for the measurement channels: a potential, the
// resistor, the measurement or the source on it would have no requirement
// position.
bool IsItemEndpoint(std::int32_t value) {
  return IsMatrixEndpoint(value) && value != kChannelEndpoint;
}

// Only settings that requirement positions describe are let through: any
// other would make every later check of the pattern fail. The potential item
// is chosen, never wired, and its endpoints are not kept.
bool IsValidConnect(std::int32_t type, std::int32_t channel, std::int32_t a, std::int32_t b) {
  switch (type) {
    case Item::kEmpty:
      return IsMatrixEndpoint(a) && IsMatrixEndpoint(b);
    case Item::kMeasurement:
      if (channel > QFCExternHardwareMeas::kChannelCount) return false;
      if (channel >= 1) return IsMatrixEndpoint(a) && IsMatrixEndpoint(b);
      [[fallthrough]];
    case Item::kResistor:
    case Item::kSource:
      return (a == Admin::kSetEndpointA || a == Admin::kSetEndpointB || IsItemEndpoint(a)) &&
             IsItemEndpoint(b);
    default:
      return false;
  }
}

// Sets the position of one endpoint of an item; false when no row describes it.
bool SetEndpointPosition(std::vector<std::uint32_t>& vector, std::int32_t type, std::int32_t endpoint,
                         bool isB) {
  if (endpoint == 0) return true;
  if (endpoint < 2 || endpoint > kMaxEndpoint) return false;
  vector[kEndpointRow[static_cast<std::size_t>(endpoint - 2)] + ItemOffset(type) + (isB ? 1 : 0)] = 1;
  return true;
}

bool SetItemPositions(std::vector<std::uint32_t>& vector, std::int32_t type, std::int32_t a, std::int32_t b) {
  return SetEndpointPosition(vector, type, a, false) && SetEndpointPosition(vector, type, b, true);
}

// The external hardware settings of the requirement positions 10 to 42 that
// a failure class switches on, as Connect calls: for each of the endpoints
// 2 to 5 the six one-sided connections in row order.
struct ConnectCall {
  std::int32_t type;
  std::int32_t a;
};
constexpr std::array<ConnectCall, 6> kRowCalls = {{{Item::kResistor, Admin::kSetEndpointA},
                                                   {Item::kResistor, Admin::kSetEndpointB},
                                                   {Item::kMeasurement, Admin::kSetEndpointA},
                                                   {Item::kMeasurement, Admin::kSetEndpointB},
                                                   {Item::kSource, Admin::kSetEndpointA},
                                                   {Item::kSource, Admin::kSetEndpointB}}};

// Re-enables the interlock when a load ends with an archive exception, so
// that a pattern kept after a failed load still checks its pins.
class InterlockPause {
 public:
  explicit InterlockPause(QFCAbstractFailurePattern& pattern) : pattern_(pattern) {
    pattern_.SetInterlockEnabled(false);
  }
  ~InterlockPause() { pattern_.SetInterlockEnabled(true); }
  InterlockPause(const InterlockPause&) = delete;
  InterlockPause& operator=(const InterlockPause&) = delete;

 private:
  QFCAbstractFailurePattern& pattern_;
};

[[noreturn]] void LoadFault(int place) {
  TheReporter().ReportInternalFault(place);
  throw ArchiveException(ArchiveCause::kGeneric, "external hardware of a KR60 pattern");
}

}  // namespace

QFCKR60FailurePattern::QFCKR60FailurePattern(std::string name, QFCSystem* system)
    : QFCAbstractFailurePattern(std::move(name), system) {}

QFCKR60FailurePattern::~QFCKR60FailurePattern() = default;

// ---- platform operations ----

HRESULT QFCKR60FailurePattern::Initialize() {
  ReleaseParts();
  if (HRESULT result = QFCAbstractFailurePattern::Initialize(); result != FAULTBOX_OK) return result;
  interlock_ = std::make_unique<QFCKR60FailurePatternSafetyInterlock>(this);
  externHardware_ = std::make_unique<QFCExternHardwareAdmin>();
  const QFCSystem* system = GetOwnerSystem();
  if (!system) {
    TheReporter().ReportInternalFault(kPlaceInitializeNoSystem);
    return E_FAULTBOX_NULL_POINTER;
  }
  return externHardware_->Create(system->GetPotentialNames());
}

void QFCKR60FailurePattern::ReleaseParts() {
  QFCAbstractFailurePattern::ReleaseParts();
  externHardware_.reset();
}

bool QFCKR60FailurePattern::Reset() {
  if (ResetBase() != ResetOutcome::kDone) return false;
  ResetExternalHardware();
  // ResetBase has checked what the setter checks (writable, nothing activated).
  (void)SetResistorValue(0);
  return true;
}

std::unique_ptr<QFCAbstractPin> QFCKR60FailurePattern::CreatePlaceholderPin() {
  QFCSystem* system = GetOwnerSystem();
  return std::make_unique<QFCKR60Pin>(system ? system->GetPlatformType() : fptKR60Platform, system);
}

std::unique_ptr<QFCAbstractFailurePatternPin> QFCKR60FailurePattern::CreatePatternPin() {
  return std::make_unique<QFCKR60FailurePatternPin>(this);
}

HRESULT QFCKR60FailurePattern::SetFailureClass(QFCAbstractFailurePatternPin* pin, std::int32_t failureClassId,
                                               std::int32_t relayVectorIndex) {
  std::uint64_t mask = 0;
  if (HRESULT result = CheckFailureClassChoice(pin, failureClassId, relayVectorIndex, mask);
      result != FAULTBOX_OK)
    return result;
  if (!externHardware_) {
    TheReporter().ReportInternalFault(kPlaceChoiceNoHardware);
    return E_FAULTBOX_NULL_POINTER;
  }

  // The external hardware belongs to the pattern: a new choice starts it afresh.
  ResetExternalHardware();
  pin->SetPinConfigs({0, 0, 0, 0, 0});
  for (std::size_t position = 0; position < kRelayPositions; ++position) {
    if (((mask >> position) & 1u) == 0) continue;
    if (position < QFCAbstractFailurePatternPin::kPinConfigEntries) {
      pin->SetPinConfig(static_cast<int>(position), QFCAbstractFailurePatternPin::kEntryOn, false);
    } else if (position < kResistorPotentialFirst + QFCExternHardwarePot::kPotentialCount) {
      externHardware_->SetPotentialChoiceByIndex(static_cast<int>(position - kResistorPotentialFirst),
                                                 kKindResistor);
    } else if (position >= kMeasurementPotentialFirst &&
               position < kMeasurementPotentialFirst + QFCExternHardwarePot::kPotentialCount) {
      externHardware_->SetPotentialChoiceByIndex(static_cast<int>(position - kMeasurementPotentialFirst),
                                                 kKindMeasurement);
    } else if (position >= kChannelFirst && position < kChannelFirst + QFCExternHardwareMeas::kChannelCount) {
      externHardware_->Connect(Item::kMeasurement, static_cast<std::int32_t>(position - kChannelFirst + 1),
                               kChannelEndpoint, 2);
    } else {
      // One of the rows of endpoints 2 to 5.
      for (std::size_t row = 0; row < kEndpointRow.size(); ++row) {
        if (position < kEndpointRow[row] || position >= kEndpointRow[row] + kRowCalls.size()) continue;
        const ConnectCall& call = kRowCalls[position - kEndpointRow[row]];
        externHardware_->Connect(call.type, -1, call.a, static_cast<std::int32_t>(row + 2));
      }
    }
  }
  OnPinChanged(nullptr);

  std::int32_t id = -1;
  std::int32_t index = -1;
  if (pin->GetAdjustedFailureClass(id, index) == nullptr) {
    TheReporter().ReportError(kMsgClassNotSet);
    return E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED;
  }
  return FAULTBOX_OK;
}

// ---- external hardware ----

bool QFCKR60FailurePattern::CanChangeExternHardware(int place) const {
  if (!CheckWritable()) return false;
  if (!externHardware_) {
    TheReporter().ReportInternalFault(place);
    return false;
  }
  return !IsAnyPinActivated();
}

HRESULT QFCKR60FailurePattern::SetResistorValue(std::int32_t value) {
  if (!CheckWritable()) return E_FAULTBOX;
  if (!externHardware_) {
    TheReporter().ReportInternalFault(kPlaceSetterNoHardware);
    return E_FAULTBOX_NULL_POINTER;
  }
  if (IsAnyPinActivated()) {
    TheReporter().ReportError(kMsgPatternActivated);
    return E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED;
  }
  if (value < 0 || value > kMaxResistorValue) {
    TheReporter().ReportWarning(kMsgResistorRange, std::to_string(value));
    return E_FAULTBOX_INVALID_PARAMETER;
  }
  externHardware_->SetResistorValue(value);
  OnPinChanged(nullptr);
  SetModified();
  return FAULTBOX_OK;
}

bool QFCKR60FailurePattern::SetPotentialChoice(const std::string& name, std::int32_t kind) {
  if (!CanChangeExternHardware(kPlaceChoiceNoHardware)) return false;
  if (!externHardware_->SetPotentialChoice(name, kind)) return false;
  OnPinChanged(nullptr);
  SetModified();
  return true;
}

bool QFCKR60FailurePattern::Connect(std::int32_t type, std::int32_t channel, std::int32_t a, std::int32_t b) {
  if (!CanChangeExternHardware(kPlaceSetterNoHardware)) return false;
  if (!IsValidConnect(type, channel, a, b)) return false;
  const bool connected = externHardware_->Connect(type, channel, a, b);
  // Even a refused connection may have freed items between a and b.
  const bool checked = OnPinChanged(nullptr);
  SetModified();
  return connected && checked;
}

void QFCKR60FailurePattern::ResetExternalHardware() {
  // Frozen while on the hardware: the relays of an active pattern stay as sent.
  if (!externHardware_ || IsAnyPinActivated() || IsReadOnly()) return;
  externHardware_->SetPotentialChoiceByIndex(QFCExternHardwarePot::kNoPotential, kKindResistor);
  externHardware_->SetPotentialChoiceByIndex(QFCExternHardwarePot::kNoPotential, kKindMeasurement);
  externHardware_->DisconnectAll();
  OnPinChanged(nullptr);
  SetModified();
}

std::int32_t QFCKR60FailurePattern::GetResistorValue() const {
  return externHardware_ ? externHardware_->GetResistorValue() : -1;
}

std::string QFCKR60FailurePattern::GetPotentialChoice(std::int32_t kind) const {
  return externHardware_ ? externHardware_->GetPotentialChoice(kind) : std::string();
}

int QFCKR60FailurePattern::FindPotentialIndex(const std::string& name) const {
  return externHardware_ ? externHardware_->FindPotentialIndex(name) : -1;
}

bool QFCKR60FailurePattern::GetConnection(std::int32_t type, std::int32_t channel, std::int32_t& a,
                                          std::int32_t& b) const {
  return externHardware_ && externHardware_->GetConnection(type, channel, a, b);
}

bool QFCKR60FailurePattern::IsExternHardwareConnected(std::int32_t type) const {
  return externHardware_ && externHardware_->IsConnected(type);
}

bool QFCKR60FailurePattern::BuildExternalRequirement(std::vector<std::uint32_t>& vector) const {
  if (!externHardware_ || vector.size() < kRelayPositions) return false;
  std::fill(vector.begin() + kExternalFirst, vector.begin() + kRelayPositions, 0u);

  // The potentials: by index, since two potentials may bear the same name.
  const int resistorPotential = externHardware_->GetPotentialChoiceIndex(kKindResistor);
  if (resistorPotential < -1 || resistorPotential > QFCExternHardwarePot::kNoPotential) return false;
  if (resistorPotential >= 0 && resistorPotential < QFCExternHardwarePot::kPotentialCount)
    vector[kResistorPotentialFirst + static_cast<std::size_t>(resistorPotential)] = 1;
  const int measurementPotential = externHardware_->GetPotentialChoiceIndex(kKindMeasurement);
  if (measurementPotential < 0 || measurementPotential > QFCExternHardwarePot::kNoPotential) return false;
  if (measurementPotential < QFCExternHardwarePot::kPotentialCount)
    vector[kMeasurementPotentialFirst + static_cast<std::size_t>(measurementPotential)] = 1;

  std::int32_t a = 0;
  std::int32_t b = 0;
  if (!externHardware_->GetConnection(Item::kResistor, 0, a, b) ||
      !SetItemPositions(vector, Item::kResistor, a, b))
    return false;

  if (!externHardware_->GetConnection(Item::kMeasurement, 0, a, b)) return false;
  // The channels are wired through the measurement: without it they lead nowhere.
  if (a != 0 && b != 0) {
    if (!SetItemPositions(vector, Item::kMeasurement, a, b)) return false;
    for (int channel = 1; channel <= QFCExternHardwareMeas::kChannelCount; ++channel) {
      std::int32_t endpoint = 0;
      std::int32_t unused = 0;
      if (!externHardware_->GetConnection(Item::kMeasurement, channel, endpoint, unused)) return false;
      if (endpoint == kChannelEndpoint)
        vector[kChannelFirst + static_cast<std::size_t>(channel - 1)] = 1;
      else if (!SetEndpointPosition(vector, Item::kMeasurement, endpoint, false))
        return false;
    }
  }

  return externHardware_->GetConnection(Item::kSource, 0, a, b) &&
         SetItemPositions(vector, Item::kSource, a, b);
}

bool QFCKR60FailurePattern::GetRsimRelayState(bool withResistor, std::uint64_t& word) const {
  if (!withResistor) {
    word = 0x00000000FFFFFFFFull;
    return true;
  }
  const std::int32_t r = GetResistorValue();
  if (r < 0 || r > kMaxResistorValue) {
    TheReporter().ReportInternalFault(kPlaceRsimRange);
    return false;
  }
  // Below 32 the low bits alone carry the value, and a range relay chooses
  // which of the fine resistors take part.
  const auto value = static_cast<std::uint64_t>(r);
  if (r <= 1)
    word = 0xFFF9FFFEull | value;
  else if (r <= 31)
    word = 0xFFF5FFE0ull | value;
  else
    word = 0xFFFC0000ull | value;
  return true;
}

// ---- pins ----

bool QFCKR60FailurePattern::IsEntryUsedByOtherPin(const QFCAbstractFailurePatternPin* pin, int entry) const {
  std::size_t index = 0;
  switch (entry) {
    case kEntryZero:
      index = 0;
      break;
    case kEntryOne:
      index = 1;
      break;
    case kEntryThree:
      index = 3;
      break;
    default:
      TheReporter().ReportInternalFault(kPlaceEntryKind);
      return false;
  }
  if (!pins_) return false;
  for (const auto& other : pins_->GetList()) {
    if (other.get() == pin || other->GetPinConfig()[index] != QFCAbstractFailurePatternPin::kEntryOn)
      continue;
    std::int32_t id = -1;
    std::int32_t vector = -1;
    if (other->GetAdjustedFailureClass(id, vector) != nullptr) return true;
  }
  return false;
}

bool QFCKR60FailurePattern::AreAllActivatedPinsSelected() const {
  if (!pins_) return true;
  for (const auto& pin : pins_->GetList())
    if (pin->IsFromPinFile() && pin->IsActivated() && !pin->IsSelected()) return false;
  return true;
}

// ---- stored form ----

void QFCKR60FailurePattern::StoreExternHardware(Archive& ar) const {
  if (!externHardware_) {
    TheReporter().ReportInternalFault(kPlaceStoreNoHardware);
    throw ArchiveException(ArchiveCause::kGeneric, "external hardware of a KR60 pattern");
  }
  ar.WriteI32(externHardware_->GetPotentialChoiceIndex(kKindResistor));
  ar.WriteI32(externHardware_->GetPotentialChoiceIndex(kKindMeasurement));
  std::int32_t a = 0;
  std::int32_t b = 0;
  externHardware_->GetConnection(Item::kResistor, 0, a, b);
  ar.WriteI32(a);
  ar.WriteI32(b);
  ar.WriteI32(externHardware_->GetResistorValue());
  for (int channel = 0; channel <= QFCExternHardwareMeas::kChannelCount; ++channel) {
    a = b = 0;
    externHardware_->GetConnection(Item::kMeasurement, channel, a, b);
    ar.WriteI32(a);
    ar.WriteI32(b);
  }
  a = b = 0;
  externHardware_->GetConnection(Item::kSource, 0, a, b);
  ar.WriteI32(a);
  ar.WriteI32(b);
}

void QFCKR60FailurePattern::LoadExternHardware(Archive& ar) {
  if (!externHardware_) LoadFault(kPlaceStoreNoHardware);
  QFCExternHardwareAdmin& hardware = *externHardware_;
  hardware.DisconnectAll();

  for (std::int32_t kind : {kKindResistor, kKindMeasurement})
    if (!hardware.SetPotentialChoiceByIndex(ar.ReadI32(), kind)) LoadFault(kPlaceLoadPotential);

  // One endpoint at a time: connecting an item between both endpoints at
  // once would free an item stored earlier on the same pair, and a
  // half-connected item could not be restored at all.
  const auto connectItem = [&hardware](std::int32_t type, std::int32_t a, std::int32_t b) {
    if (!IsItemEndpoint(a) || !IsItemEndpoint(b)) LoadFault(kPlaceLoadEndpoint);
    if (a != 0 && !hardware.Connect(type, -1, Admin::kSetEndpointA, a)) LoadFault(kPlaceLoadEndpoint);
    if (b != 0 && !hardware.Connect(type, -1, Admin::kSetEndpointB, b)) LoadFault(kPlaceLoadEndpoint);
  };

  std::int32_t a = ar.ReadI32();
  std::int32_t b = ar.ReadI32();
  connectItem(Item::kResistor, a, b);

  const std::int32_t value = ar.ReadI32();
  if (value < 0 || value > kMaxResistorValue) LoadFault(kPlaceLoadResistor);
  hardware.SetResistorValue(value);

  a = ar.ReadI32();
  b = ar.ReadI32();
  connectItem(Item::kMeasurement, a, b);
  for (int channel = 1; channel <= QFCExternHardwareMeas::kChannelCount; ++channel) {
    const std::int32_t endpoint = ar.ReadI32();
    ar.ReadI32();  // a channel has one endpoint; the second value means nothing
    if (!IsMatrixEndpoint(endpoint)) LoadFault(kPlaceLoadEndpoint);
    // The second endpoint is one no item holds, so that nothing stored is freed again.
    if (endpoint != 0 && !hardware.Connect(Item::kMeasurement, channel, endpoint, Admin::kSetEndpointA))
      LoadFault(kPlaceLoadEndpoint);
  }

  a = ar.ReadI32();
  b = ar.ReadI32();
  connectItem(Item::kSource, a, b);
}

void QFCKR60FailurePattern::Serialize(Archive& ar) {
  {
    // The settings are applied one after another; judging the pins between
    // them would only give passing verdicts.
    InterlockPause pause(*this);
    QFCAbstractFailurePattern::Serialize(ar);
    if (ar.IsStoring())
      StoreExternHardware(ar);
    else
      LoadExternHardware(ar);
  }
  if (interlock_) interlock_->CheckAll();
}

}  // namespace faultbox

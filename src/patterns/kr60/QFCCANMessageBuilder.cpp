// The KR60 message builder: which pins take part, their relay states per
// step, the relay state records per module and the frames made from them.
#include "patterns/kr60/QFCCANMessageBuilder.h"

#include <algorithm>
#include <cstdio>
#include <limits>
#include <set>
#include <string>
#include <tuple>

#include "config/QFCAbstractFailureClass.h"
#include "config/QFCAbstractPin.h"
#include "config/QFCECU.h"
#include "config/QFCExternHardware.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "patterns/kr60/QFCKR60FailurePatternPin.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgModuleNotRegistered = 109;
constexpr int kMsgPinLeftOut = 131;
constexpr int kMsgAddressUnreadable = 161;

constexpr int kPlaceBuildNoPattern = 7101;
constexpr int kPlaceBuildNoOffset = 7102;
constexpr int kPlaceLoadChannel = 7103;
constexpr int kPlaceLoadRelay = 7104;
constexpr int kPlaceFiuPosition = 7105;
constexpr int kPlaceNoPins = 7106;
constexpr int kPlaceNotKR60Pin = 7107;
constexpr int kPlaceNoPossibility = 7108;
constexpr int kPlaceStepTooLarge = 7109;
constexpr int kPlaceBuildNoRecord = 7110;

constexpr const char* kOffsetLoadAddress = "OffsetLoadAddress";
constexpr const char* kFiuLoadAddress = "FIULoadAddress";
constexpr const char* kRsimLoadAddress = "RSIMLoadAddress";

// Identifier parts.
constexpr QFTIdentifier kClearDirection{0, 0xFFFCFFFF, 0};
constexpr std::uint32_t kOffsetKeep = 0xE003FFFF;
constexpr std::uint32_t kAddressKeep = 0xFFFFF000;
constexpr std::uint32_t kTypeCodeKeep = 0xFFFF0FFF;

// Data parts. The relay half's 32 bits go to data bits 39..8.
constexpr std::uint64_t kRelayFieldKeep = 0xFFFF0000000000FF;
constexpr QFTMessage kRelayBase{0x82040000000000FF, 0x0000FFFFFFFFFF00};
constexpr QFTMessage kLowMarker{0x0000FE0000000000, 0xFFFF00FFFFFFFFFF};
constexpr QFTMessage kHighMarker{0x0000FD0000000000, 0xFFFF00FFFFFFFFFF};
constexpr QFTMessage kCommit{0x820500FFFFFFFFFF, 0x0000FF0000000000};
constexpr QFTMessage kByteTwoZero{0, 0xFFFF00FFFFFFFFFF};
constexpr QFTMessage kReset{0x8101FFFFFFFFFFFF, 0};

constexpr std::uint32_t kStateOff = 0;
constexpr std::uint32_t kStateOn = 1;
constexpr std::uint32_t kStateMustBeOff = 2;
constexpr std::uint32_t kMaxStep = static_cast<std::uint32_t>(std::numeric_limits<std::int32_t>::max());

std::string Hex(std::uint32_t value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%X", value);
  return text;
}

// The low or high 32 bits of a vector, sign-extended as the data field expects them.
std::uint64_t Half(std::uint64_t vector, bool high) {
  const auto bits = static_cast<std::int32_t>(static_cast<std::uint32_t>(high ? vector >> 32 : vector));
  return static_cast<std::uint64_t>(static_cast<std::int64_t>(bits));
}

std::vector<QFTIdentifier> IdentifierParts(std::uint32_t offset, std::uint32_t moduleType) {
  return {kClearDirection, QFTIdentifier{offset, kOffsetKeep, 1},
          QFTIdentifier{QFCCANMessage::TypeCodeOf(moduleType), kTypeCodeKeep, 0}};
}

// Whether an item of the external hardware is wired in at all: one endpoint
// already puts it into the relay matrix.
bool InUse(const QFCKR60FailurePattern& pattern, std::int32_t type) {
  std::int32_t a = 0, b = 0;
  return pattern.GetConnection(type, 0, a, b) && (a != 0 || b != 0);
}

}  // namespace

QFCCANMessageBuilder::QFCCANMessageBuilder(QFCKR60FailurePattern* pattern) : pattern_(pattern) {}

QFCCANMessageBuilder::~QFCCANMessageBuilder() = default;

void QFCCANMessageBuilder::DeleteRelayStates() {
  relayStates_.clear();
  written_.clear();
}

QFTModuleRelayState* QFCCANMessageBuilder::FindOrCreateRelayState(std::uint32_t address, std::int32_t step,
                                                                  std::uint32_t moduleType, bool activate) {
  return relayStates_[FindOrCreateIndex(address, step, moduleType, activate)].get();
}

std::size_t QFCCANMessageBuilder::FindOrCreateIndex(std::uint32_t address, std::int32_t step,
                                                    std::uint32_t moduleType, bool activate) {
  const QFTModuleRelayState* latest = nullptr;
  for (std::size_t i = 0; i < relayStates_.size(); ++i) {
    const QFTModuleRelayState& record = *relayStates_[i];
    if (record.moduleAddress != address || record.moduleType != moduleType || record.activate != activate)
      continue;
    if (record.step == step) return i;
    if (record.step > 0 && (latest == nullptr || record.step > latest->step)) latest = &record;
  }
  relayStates_.push_back(std::make_unique<QFTModuleRelayState>(
      QFTModuleRelayState{latest ? latest->vector : kAllRelaysOff, address, step, moduleType, activate}));
  written_.push_back(0);
  return relayStates_.size() - 1;
}

// ---- relay bits ----

bool QFCCANMessageBuilder::WriteLoadRelay(std::uint64_t& vector, std::uint32_t channel, std::uint32_t relay,
                                          std::uint32_t state) {
  if (channel >= kLoadChannels) {
    TheReporter().ReportInternalFault(kPlaceLoadChannel);
    return false;
  }
  if (relay >= kLoadRelaysPerChannel) {
    TheReporter().ReportInternalFault(kPlaceLoadRelay);
    return false;
  }
  // Channels 6 to 9 sit in the high half, which starts afresh at bit 32.
  const std::uint32_t bit = channel < 6 ? kLoadRelaysPerChannel * channel + relay
                                        : 32 + kLoadRelaysPerChannel * (channel - 6) + relay;
  if (state == kStateOn) vector &= ~(std::uint64_t{1} << bit);
  if (state == kStateOff) vector |= std::uint64_t{1} << bit;
  return true;
}

bool QFCCANMessageBuilder::WriteFiuRelay(std::uint64_t& vector, std::size_t position, std::uint32_t state) {
  if (position < kFirstFiuPosition || position >= kPositions) {
    TheReporter().ReportInternalFault(kPlaceFiuPosition);
    return false;
  }
  const std::size_t bit = position - kFirstFiuPosition;
  if (state == kStateOn) vector &= ~(std::uint64_t{1} << bit);
  if (state == kStateOff) vector |= std::uint64_t{1} << bit;
  return true;
}

// ---- steps ----

std::vector<std::uint32_t> QFCCANMessageBuilder::StepsOf(const RelayTable& table, std::size_t from,
                                                         std::size_t to, bool activate) {
  std::set<std::uint32_t> steps;
  for (std::size_t i = from; i <= to && i < kPositions; ++i) {
    const std::uint32_t n = activate ? table.first[i] : table.last[i];
    if (n != 0) steps.insert(n);
  }
  // 0 means every step: a table without numbers still switches, in step 1.
  if (steps.empty()) steps.insert(1);
  return {steps.begin(), steps.end()};
}

void QFCCANMessageBuilder::ApplyStep(const RelayTable& table, std::size_t from, std::size_t to,
                                     std::uint32_t step, bool activate,
                                     std::array<std::uint32_t, kPositions>& states) {
  for (std::size_t i = from; i <= to && i < kPositions; ++i) {
    const std::uint32_t s = table.state[i], a = table.first[i], d = table.last[i];
    // A last step of 0 means every step as a first step of 0 does; taken
    // literally, a relay switched on in a numbered step would stay on after
    // the deactivation.
    const bool belongs = activate ? (a == step || a == 0) : (d == step || a == 0 || d == 0);
    const bool offStep = activate ? (a != step || a == 0) : (d != step || a == 0);
    if (belongs && (s == kStateOn || (offStep && table.current[i] == kStateOn)))
      states[i] = activate ? kStateOn : kStateOff;
  }
}

// ---- the pins that take part ----

bool QFCCANMessageBuilder::FillTable(QFCAbstractFailurePatternPin& pin, const QFTPossibility* possibility,
                                     RelayTable& table) {
  auto* kr60Pin = dynamic_cast<QFCKR60FailurePatternPin*>(&pin);
  if (kr60Pin == nullptr || possibility == nullptr) {
    TheReporter().ReportInternalFault(kr60Pin == nullptr ? kPlaceNotKR60Pin : kPlaceNoPossibility);
    return false;
  }
  for (std::size_t i = 0; i < kPositions; ++i) {
    table.state[i] = possibility->RelayState(i);
    table.first[i] = possibility->FirstNumber(i);
    table.last[i] = possibility->SecondNumber(i);
    // Steps are signed in the frames' bookkeeping; a larger number would never come round.
    if (table.first[i] > kMaxStep || table.last[i] > kMaxStep) {
      TheReporter().ReportInternalFault(kPlaceStepTooLarge);
      return false;
    }
    std::uint32_t current = 0;
    kr60Pin->GetRelayState(static_cast<int>(i), current);
    table.current[i] = current;
  }
  return true;
}

bool QFCCANMessageBuilder::CollectTakers(bool activate, std::vector<Taker>& takers) {
  QFCFailurePatternPins* pins = pattern_->GetPins();
  QFCSystem* system = pattern_->GetOwnerSystem();
  if (pins == nullptr || system == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoPins);
    return false;
  }
  for (const auto& entry : pins->GetList()) {
    QFCAbstractFailurePatternPin* pin = entry.get();
    const bool activated = pin->IsActivated();
    if (activated == activate || (!activated && !pin->IsSelected()) || !pin->CanBeActivated() ||
        !pin->IsFromPinFile()) {
      pin->SetSelected(false);
      continue;
    }
    std::int32_t id = -1, index = -1;
    const QFCAbstractFailureClass* failureClass = pin->GetAdjustedFailureClass(id, index);
    const QFCAbstractPin* raw = pin->GetPin();
    const QFCECU* ecu = raw ? raw->GetEcu() : nullptr;
    if (failureClass == nullptr || ecu == nullptr || !ecu->IsEnabled()) {
      TheReporter().ReportWarning(kMsgPinLeftOut, pin->GetPinName(), pin->GetEcuName());
      pin->SetSelected(false);
      continue;
    }
    std::uint32_t address = 0;
    const bool known = pin->GetModuleAddress(address);
    // Address 0 would reach every module of the type.
    if (!known || address == 0 || address > 0xFFFF ||
        system->GetRespondingModules().count(static_cast<std::uint16_t>(address)) == 0) {
      TheReporter().ReportWarning(kMsgModuleNotRegistered, Hex(address), pin->GetPinName());
      pin->SetSelected(false);
      continue;
    }
    Taker taker{pin, {}, address};
    if (!FillTable(*pin, failureClass->GetPossibility(index), taker.table)) return false;
    // Every activated pin is switched off, so each must end deactivated.
    if (!activate) pin->SetSelected(true);
    takers.push_back(taker);
  }
  return true;
}

// ---- composing the records ----

bool QFCCANMessageBuilder::ComposeLoad(const Taker& taker, bool activate) {
  std::vector<std::uint32_t> channels;
  if (!taker.pin->GetModuleChannels(channels) || channels.empty()) return true;
  if (taker.address == 0) {
    TheReporter().ReportError(kMsgAddressUnreadable, "load_module_id, pin " + taker.pin->GetPinName());
    return false;
  }
  constexpr std::size_t kLast = kFirstFiuPosition - 1;
  std::array<std::uint32_t, kPositions> states{};
  if (!activate)
    for (std::uint32_t n : StepsOf(taker.table, 0, kLast, true))
      ApplyStep(taker.table, 0, kLast, n, true, states);
  for (std::uint32_t n : StepsOf(taker.table, 0, kLast, activate)) {
    ApplyStep(taker.table, 0, kLast, n, activate, states);
    const std::size_t at =
        FindOrCreateIndex(taker.address, static_cast<std::int32_t>(n), kModuleLOAD, activate);
    QFTModuleRelayState* record = relayStates_[at].get();
    std::uint64_t bits = 0;
    for (std::uint32_t channel : channels) {
      for (std::uint32_t relay = 0; relay < kLoadRelaysPerChannel; ++relay) {
        if (!WriteLoadRelay(record->vector, channel, relay, states[relay])) continue;
        std::uint64_t mask = kAllRelaysOff;
        WriteLoadRelay(mask, channel, relay, kStateOn);
        bits |= ~mask;
      }
    }
    written_[at] |= bits;
  }
  return true;
}

bool QFCCANMessageBuilder::ComposeRsim(bool activate) {
  std::uint32_t address = 0;
  if (!ReadModuleAddress(kRsimLoadAddress, address)) return false;
  const std::size_t at = FindOrCreateIndex(address, 1, kModuleRSIM, activate);
  // The pattern reports a resistor value it cannot code.
  if (!pattern_->GetRsimRelayState(activate, relayStates_[at]->vector)) return false;
  written_[at] = kAllRelaysOff;
  return true;
}

bool QFCCANMessageBuilder::ComposeFiu(const std::vector<Taker>& takers, bool activate) {
  // One FIU serves the whole pattern: a relay is on when any pin needs it.
  RelayTable merged;
  for (const Taker& taker : takers) {
    for (std::size_t i = kFirstFiuPosition; i < kPositions; ++i) {
      if (taker.table.current[i] == kStateOn) merged.current[i] = kStateOn;
      const std::uint32_t state = taker.table.state[i];
      if (state != kStateOn && state != kStateMustBeOff) continue;
      merged.first[i] = std::max(merged.first[i], taker.table.first[i]);
      if (merged.last[i] == 0 || merged.last[i] >= taker.table.last[i]) merged.last[i] = taker.table.last[i];
      merged.state[i] = state;
    }
  }
  bool anyOn = false;
  std::uint64_t owned = 0;
  for (std::size_t i = kFirstFiuPosition; i < kPositions; ++i) {
    if (merged.state[i] == kStateOn) anyOn = true;
    if (merged.state[i] == kStateOn || merged.state[i] == kStateMustBeOff)
      owned |= std::uint64_t{1} << (i - kFirstFiuPosition);
  }
  // An item with one endpoint set, or a potential choice, can need FIU
  // relays although no item is connected at both ends.
  const bool needed = InUse(*pattern_, QFCExternHardware::kResistor) ||
                      InUse(*pattern_, QFCExternHardware::kMeasurement) ||
                      InUse(*pattern_, QFCExternHardware::kSource) || anyOn;
  if (!needed) return true;

  std::uint32_t address = 0;
  if (!ReadModuleAddress(kFiuLoadAddress, address)) return false;
  constexpr std::size_t kLast = kPositions - 1;
  std::array<std::uint32_t, kPositions> states{};
  if (!activate)
    for (std::uint32_t n : StepsOf(merged, kFirstFiuPosition, kLast, true))
      ApplyStep(merged, kFirstFiuPosition, kLast, n, true, states);
  for (std::uint32_t n : StepsOf(merged, kFirstFiuPosition, kLast, activate)) {
    ApplyStep(merged, kFirstFiuPosition, kLast, n, activate, states);
    const std::size_t at = FindOrCreateIndex(address, static_cast<std::int32_t>(n), kModuleFIU, activate);
    QFTModuleRelayState* record = relayStates_[at].get();
    for (std::size_t i = kFirstFiuPosition; i < kPositions; ++i) WriteFiuRelay(record->vector, i, states[i]);
    written_[at] |= owned;
  }
  return true;
}

bool QFCCANMessageBuilder::ComposeFor(const std::vector<Taker>& takers, bool activate) {
  for (const Taker& taker : takers)
    if (!ComposeLoad(taker, activate)) return false;
  if (InUse(*pattern_, QFCExternHardware::kResistor) && !ComposeRsim(activate)) return false;
  return ComposeFiu(takers, activate);
}

std::map<QFCCANMessageBuilder::ModuleKey, std::uint64_t> QFCCANMessageBuilder::ActivatedEndState() {
  std::map<ModuleKey, std::uint64_t> end;
  std::vector<Taker> activated;
  for (const auto& entry : pattern_->GetPins()->GetList()) {
    QFCAbstractFailurePatternPin* pin = entry.get();
    if (!pin->IsActivated()) continue;
    std::int32_t id = -1, index = -1;
    const QFCAbstractFailureClass* failureClass = pin->GetAdjustedFailureClass(id, index);
    std::uint32_t address = 0;
    if (failureClass == nullptr || !pin->GetModuleAddress(address)) continue;
    Taker taker{pin, {}, address};
    if (!FillTable(*pin, failureClass->GetPossibility(index), taker.table)) return end;
    activated.push_back(taker);
  }
  if (activated.empty()) return end;
  QFCCANMessageBuilder scratch(pattern_);
  if (!scratch.ComposeFor(activated, true)) return end;
  scratch.ChainSteps({});
  // The records of the highest step hold what the hardware shows now.
  std::map<ModuleKey, std::int32_t> steps;
  for (const auto& record : scratch.relayStates_) {
    const ModuleKey key{record->moduleAddress, record->moduleType};
    auto it = steps.find(key);
    if (it == steps.end() || record->step >= it->second) {
      steps[key] = record->step;
      end[key] = record->vector;
    }
  }
  return end;
}

void QFCCANMessageBuilder::ChainSteps(const std::map<ModuleKey, std::uint64_t>& base) {
  // Records of one module in rising step order.
  std::vector<std::size_t> order(relayStates_.size());
  for (std::size_t i = 0; i < order.size(); ++i) order[i] = i;
  std::stable_sort(order.begin(), order.end(), [&](std::size_t x, std::size_t y) {
    const auto& a = *relayStates_[x];
    const auto& b = *relayStates_[y];
    return std::tie(a.moduleAddress, a.moduleType, a.activate, a.step) <
           std::tie(b.moduleAddress, b.moduleType, b.activate, b.step);
  });
  const QFTModuleRelayState* previous = nullptr;
  std::uint64_t carried = kAllRelaysOff;
  for (std::size_t i : order) {
    QFTModuleRelayState& record = *relayStates_[i];
    const bool sameModule = previous != nullptr && previous->moduleAddress == record.moduleAddress &&
                            previous->moduleType == record.moduleType &&
                            previous->activate == record.activate;
    if (!sameModule) {
      auto it = base.find({record.moduleAddress, record.moduleType});
      carried = it != base.end() ? it->second : kAllRelaysOff;
    }
    record.vector = (carried & ~written_[i]) | (record.vector & written_[i]);
    carried = record.vector;
    previous = &record;
  }
}

// ---- frames ----

bool QFCCANMessageBuilder::ReadModuleAddress(const char* key, std::uint32_t& address) const {
  const QFCSystem* system = pattern_->GetOwnerSystem();
  if (system == nullptr || system->GetLoadAddress(key, address) != FAULTBOX_OK) {
    TheReporter().ReportError(kMsgAddressUnreadable, key);
    return false;
  }
  return true;
}

bool QFCCANMessageBuilder::AppendMessages(const QFTModuleRelayState& record, std::uint32_t offset,
                                          QFCMessageList& messages, std::set<StepAndType>& commits) const {
  std::vector<QFTIdentifier> identifierParts = IdentifierParts(offset, record.moduleType);
  // The relay frames address one module; the commit (below) all of the type.
  identifierParts.insert(identifierParts.begin() + 2, QFTIdentifier{record.moduleAddress, kAddressKeep, 1});

  const bool withHighHalf = record.moduleType != kModuleRSIM;
  for (bool high : {false, true}) {
    if (high && !withHighHalf) break;
    auto message = std::make_unique<QFCCANMessage>();
    message->SetMessageKind(QFCCANMessage::kRelayMessage);
    message->SetStep(record.step);
    message->SetModuleType(record.moduleType);
    message->SetDataField(Half(record.vector, high), kRelayFieldKeep);
    message->ApplyIdentifierParts(identifierParts);
    std::vector<QFTMessage> dataParts{kRelayBase, kLowMarker};
    if (high) dataParts.push_back(kHighMarker);
    message->ApplyDataParts(dataParts);
    messages.push_back(std::move(message));
  }

  // One commit per step and module type: it makes every module of the type
  // take what it received in the step.
  if (!commits.insert({record.step, record.moduleType}).second) return true;
  auto commit = std::make_unique<QFCCANMessage>();
  commit->SetMessageKind(QFCCANMessage::kCommitMessage);
  commit->SetStep(record.step);
  commit->SetModuleType(record.moduleType);
  commit->ApplyIdentifierParts(IdentifierParts(offset, record.moduleType));
  commit->ApplyDataParts({kCommit, kByteTwoZero});
  messages.push_back(std::move(commit));
  return true;
}

bool QFCCANMessageBuilder::BuildMessages(QFCMessageList& messages, bool activate) {
  messages.clear();
  if (pattern_ == nullptr || pattern_->GetOwnerSystem() == nullptr) {
    TheReporter().ReportInternalFault(kPlaceBuildNoPattern);
    return false;
  }
  DeleteRelayStates();
  std::vector<Taker> takers;
  bool composed = CollectTakers(activate, takers);
  // What the pins already activated hold stays on while more are added.
  const auto base = composed && activate ? ActivatedEndState() : std::map<ModuleKey, std::uint64_t>{};
  composed = composed && ComposeFor(takers, activate);
  if (composed) ChainSteps(base);

  std::uint32_t offset = 0;
  if (pattern_->GetOwnerSystem()->GetLoadAddress(kOffsetLoadAddress, offset) != FAULTBOX_OK) {
    TheReporter().ReportInternalFault(kPlaceBuildNoOffset);
    return false;
  }
  if (!composed) return false;
  std::set<StepAndType> commits;
  for (const auto& record : relayStates_) {
    if (!record) {
      TheReporter().ReportInternalFault(kPlaceBuildNoRecord);
      return false;
    }
    if (record->activate != activate) continue;
    if (!AppendMessages(*record, offset, messages, commits)) return false;
  }
  return true;
}

bool QFCCANMessageBuilder::BuildResetMessages(int selector, std::uint32_t moduleType,
                                              QFCMessageList& messages, std::uint32_t offset) {
  if (selector != kResetSelector) return false;
  if (QFCCANMessage::TypeCodeOf(moduleType) != 0) {
    auto reset = std::make_unique<QFCCANMessage>();
    reset->ApplyIdentifierParts(IdentifierParts(offset, moduleType));
    reset->ApplyDataParts({kReset});
    messages.push_back(std::move(reset));
  }
  return !messages.empty();
}

}  // namespace faultbox

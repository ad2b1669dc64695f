// The bytes of the KR40 family: collecting the relays of a pattern module by
// module, and writing them in protocol A or B; the reset bytes.
#include "patterns/kr40/QFCSerielleMessageBuilder.h"
#include "platform/MessageTable.h"

#include "config/QFCAbstractFailureClass.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "platform/QFCReporter.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr40/QFCKR40FailurePattern.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {

constexpr int kMsgInvalidValue = 37;
constexpr int kMsgModuleUnknown = 109;
constexpr int kMsgNoFailureClass = 131;
constexpr int kMsgAddressUnreadable = 161;
constexpr int kResPinOfEcu = 6789;

constexpr int kPlaceNoPins = 7601;

// Protocol A.
constexpr std::uint32_t kSelectA = 0x40;
constexpr std::uint32_t kAddressFlagA = 0x80;
constexpr std::uint32_t kStateA = 0x60;
constexpr std::uint32_t kRelayFlagA = 0x80;
constexpr std::uint32_t kExecuteA = 0x51;
constexpr std::uint32_t kResetA = 0x49;
// Protocol B.
constexpr std::uint32_t kRelayOffsetB = 14;
constexpr std::uint32_t kOffB = 0x80;
constexpr std::uint32_t kExecuteB = 0x9F;
constexpr std::uint32_t kResetB = 0x9E;
// The failure class IDs a KR80 board knows, and the state bits that carry them.
constexpr std::uint32_t kStateBitsB[] = {0xA0, 0xC0, 0xE0};

void Append(QFCMessageList& messages, std::int32_t kind, std::uint32_t address, std::uint32_t value,
            bool addressByte = false, bool answerExpected = false) {
  messages.push_back(std::make_unique<QFCSerielleMessage>(kind, address, value, addressByte, answerExpected));
}

}  // namespace

QFCSerielleMessageBuilder::QFCSerielleMessageBuilder(QFCKR40FailurePattern* pattern, QFCSystem* system)
    : pattern_(pattern), system_(system) {}

QFCSerielleMessageBuilder::~QFCSerielleMessageBuilder() = default;

QFCSerielleMessageBuilder::Protocol QFCSerielleMessageBuilder::ProtocolOf(const std::string& boardType) {
  return boardType == "KR80" || boardType == "KR080" ? Protocol::kB : Protocol::kA;
}

bool QFCSerielleMessageBuilder::IsKR40System() const {
  return system_ != nullptr && system_->GetPlatformType() == fptKR40Platform;
}

bool QFCSerielleMessageBuilder::BuildMessages(QFCMessageList& messages, bool activate) {
  messages.clear();
  DeleteRelayStates();
  const Protocol protocol = ProtocolOf(system_ ? system_->GetBoardType() : std::string());
  if (!CollectModuleData(protocol, activate)) {
    DeleteRelayStates();
    return false;
  }
  if (!IsKR40System()) {
    DeleteRelayStates();
    return false;
  }
  AppendModuleBytes(modules_, protocol, activate, messages);
  DeleteRelayStates();
  return true;
}

bool QFCSerielleMessageBuilder::CollectModuleData(Protocol protocol, bool activate) {
  QFCFailurePatternPins* pins = pattern_ ? pattern_->GetPins() : nullptr;
  if (pins == nullptr) {
    TheReporter().ReportInternalFault(kPlaceNoPins);
    return false;
  }
  for (const auto& owned : pins->GetList()) {
    QFCAbstractFailurePatternPin& pin = *owned;
    // Activating sends the pins not yet on, deactivating the pins that are.
    if (pin.IsActivated() == activate) continue;
    if (!pin.IsActivated() && !pin.IsSelected()) continue;
    // A pin goes on only when the interlock cleared it; an activated pin must
    // always be able to go off again.
    if (activate && (!pin.CanBeActivated() || !pin.IsFromPinFile())) continue;
    std::vector<std::uint32_t> channels;
    if (!pin.GetModuleChannels(channels) || channels.empty()) {
      pin.SetSelected(false);
      continue;
    }

    std::int32_t failureClassId = -1;
    std::int32_t relayVectorIndex = -1;
    if (pin.GetAdjustedFailureClass(failureClassId, relayVectorIndex) == nullptr) {
      TheReporter().ReportWarning(kMsgNoFailureClass, pin.GetPinName(), pin.GetEcuName());
      pin.SetSelected(false);
      continue;
    }
    std::uint32_t address = 0;
    if (!pin.GetModuleAddress(address)) {
      TheReporter().ReportError(kMsgAddressUnreadable, ResourceText(
                                                      kResPinOfEcu, {pin.GetPinName(), pin.GetEcuName()}));
      return false;
    }
    if (address == 0) {
      TheReporter().ReportWarning(kMsgModuleUnknown, ModuleAddressText(address), pin.GetPinName());
      pin.SetSelected(false);
      continue;
    }

    // Only relays 1 to 10 exist; a module created for another would go out
    // selected with nothing to switch.
    const std::uint32_t relay = channels.front();
    if (relay < QFCSerielleMessageData::kFirstRelay || relay > QFCSerielleMessageData::kLastRelay) {
      pin.SetSelected(false);
      continue;
    }
    std::uint16_t state = 0;
    if (!ReadState(pin, failureClassId, protocol, activate, state)) continue;
    ModuleData(address).SetRelayState(static_cast<std::uint16_t>(relay), state);
    // Every activated pin goes off, selected or not; selecting it lets the
    // deactivation mark it off too, so that no pin stays marked as switched
    // while its relay is off.
    if (!activate) pin.SetSelected(true);
  }
  return true;
}

bool QFCSerielleMessageBuilder::ReadState(QFCAbstractFailurePatternPin& pin, std::int32_t failureClassId,
                                          Protocol protocol, bool activate, std::uint16_t& state) const {
  if (protocol == Protocol::kA) {
    // The state byte carries the five PinConfig relays of the channel as bits.
    state = 0;
    const auto& config = pin.GetPinConfig();
    for (std::size_t k = 0; k < config.size(); ++k)
      if (config[k] == QFCAbstractFailurePatternPin::kEntryOn) state |= static_cast<std::uint16_t>(1u << k);
    return true;
  }
  // A KR80 board is told the failure class itself. Another ID would go out as
  // a byte the boards read as a module selection: such a pin is refused.
  if (activate && (failureClassId < 1 || failureClassId > 3)) {
    TheReporter().ReportError(
        kMsgInvalidValue, "failure class " + std::to_string(failureClassId),
        ResourceText(kResPinOfEcu, {pin.GetPinName(), pin.GetEcuName()}) +
            ": a KR80 board takes only the failure classes 1, 2 and 3");
    pin.SetSelected(false);
    return false;
  }
  state = static_cast<std::uint16_t>(failureClassId);
  return true;
}

QFCSerielleMessageData& QFCSerielleMessageBuilder::ModuleData(std::uint32_t address) {
  for (const auto& module : modules_)
    if (module->GetModuleAddress() == address) return *module;
  modules_.push_back(std::make_unique<QFCSerielleMessageData>(address));
  return *modules_.back();
}

void QFCSerielleMessageBuilder::AppendModuleBytes(
    const std::vector<std::unique_ptr<QFCSerielleMessageData>>& modules, Protocol protocol, bool activate,
    QFCMessageList& messages) {
  bool any = false;
  for (const auto& module : modules) {
    if (module == nullptr || module->IsEmpty()) continue;
    any = true;
    const std::uint32_t a = module->GetModuleAddress();
    if (protocol == Protocol::kA) {
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, kSelectA);
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, (a | kAddressFlagA) & 0xFF, true, true);
      for (const auto& [relay, state] : module->GetRelayStates()) {
        Append(messages, QFCSerielleMessage::kKindState, a, activate ? ((state | kStateA) & 0xFF) : kStateA);
        Append(messages, QFCSerielleMessage::kKindRelay, a, (relay | kRelayFlagA) & 0xFF, false, true);
      }
    } else {
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, a & 0xFF);
      for (const auto& [relay, state] : module->GetRelayStates()) {
        std::uint32_t bits = kOffB;
        if (activate) bits = state >= 1 && state <= 3 ? kStateBitsB[state - 1] : 0x00;
        Append(messages, QFCSerielleMessage::kKindState, a, ((relay + kRelayOffsetB) | bits) & 0xFF);
      }
    }
  }
  if (any)
    Append(messages, QFCSerielleMessage::kKindExecute, 0, protocol == Protocol::kA ? kExecuteA : kExecuteB);
}

void QFCSerielleMessageBuilder::AppendResetBytes(Protocol protocol, QFCMessageList& messages) {
  // The reset command goes to every module; the selections that follow let
  // each one that is there answer.
  if (protocol == Protocol::kA) {
    Append(messages, QFCSerielleMessage::kKindReset, 0, kResetA);
    for (std::uint32_t a = 0; a < kResetModules; ++a) {
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, kSelectA);
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, a | kAddressFlagA, true, true);
    }
  } else {
    Append(messages, QFCSerielleMessage::kKindReset, 0, kResetB);
    for (std::uint32_t a = 0; a < kResetModules; ++a)
      Append(messages, QFCSerielleMessage::kKindModuleSelection, a, a);
  }
}

bool QFCSerielleMessageBuilder::BuildResetMessages(int selector, QFCMessageList& messages) const {
  if (selector != kResetSelector) return false;
  if (IsKR40System()) AppendResetBytes(ProtocolOf(system_->GetBoardType()), messages);
  return true;
}

}  // namespace faultbox

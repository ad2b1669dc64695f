// The KR60 pattern's sending: step by step, every relay frame awaited alone,
// then the step's commits by module type, each awaited from the modules of
// its type that were loaded in the step.
#include <array>
#include <set>
#include <vector>

#include "comm/QFCCANTransferInterface.h"
#include "platform/QFCReporter.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"

namespace faultbox {

namespace {

constexpr int kMsgTimeOut = 69;

constexpr int kPlaceNoTransferInterface = 6711;
constexpr int kPlaceNotCAN = 6712;
constexpr int kPlaceNotCANMessage = 6713;
constexpr int kPlaceModuleType = 6714;
constexpr int kPlaceSend = 6715;

// Message 69 for a time-out of any wait, relay frame or commit: the
// interface names silent modules only when others were heard.
[[nodiscard]] HRESULT Await(QFCCANTransferInterface& can, const QFCCANExpectedMap& expected) {
  const HRESULT result = can.WaitForAnswers(expected);
  if (result == E_FAULTBOX_TIME_OUT) TheReporter().ReportError(kMsgTimeOut);
  return result;
}

}  // namespace

HRESULT QFCKR60FailurePattern::TransferMessages(QFCMessageList& messages, bool activate) {
  HRESULT opened = FAULTBOX_OK;
  auto* can =
      ConnectedTransferInterface<QFCCANTransferInterface>(kPlaceNoTransferInterface, kPlaceNotCAN, opened);
  if (can == nullptr) return opened;

  // Checked before anything is sent: a list that breaks off half-way would
  // leave modules loaded without their commit.
  std::vector<const QFCCANMessage*> frames;
  std::set<std::int32_t> steps;
  for (const auto& message : messages) {
    const auto* frame = dynamic_cast<const QFCCANMessage*>(message.get());
    if (frame == nullptr) return InternalFault(kPlaceNotCANMessage);
    if (frame->GetModuleType() < kModuleFIU || frame->GetModuleType() > kModuleRSIM)
      return InternalFault(kPlaceModuleType);
    frames.push_back(frame);
    steps.insert(frame->GetStep());
  }

  // Activating closes the FIU lines to the ECU last, once the resistor
  // simulation and the loads behind them are set; deactivating opens them first.
  const std::array<std::uint32_t, 3> commitOrder =
      activate ? std::array<std::uint32_t, 3>{kModuleRSIM, kModuleLOAD, kModuleFIU}
               : std::array<std::uint32_t, 3>{kModuleFIU, kModuleLOAD, kModuleRSIM};

  for (const std::int32_t step : steps) {
    // Per module type, the modules loaded in this step: exactly those answer
    // the step's commit of their type.
    std::array<QFCCANExpectedMap, kModuleRSIM + 1> loaded;
    for (const QFCCANMessage* frame : frames) {
      if (frame->GetStep() != step || frame->IsCommit()) continue;
      loaded[frame->GetModuleType()][frame->GetIdentifier()] = frame;
      if (HRESULT result = can->SendMessage(frame, kPlaceSend, true); result != FAULTBOX_OK) return result;
      if (HRESULT result = Await(*can, {{frame->GetIdentifier(), frame}}); result != FAULTBOX_OK)
        return result;
    }
    for (const std::uint32_t type : commitOrder) {
      // A commit nobody was loaded for would only wait for silence.
      if (loaded[type].empty()) continue;
      for (const QFCCANMessage* frame : frames) {
        if (frame->GetStep() != step || !frame->IsCommit() || frame->GetModuleType() != type) continue;
        if (HRESULT result = can->SendMessage(frame, kPlaceSend, true); result != FAULTBOX_OK) return result;
        if (HRESULT result = Await(*can, loaded[type]); result != FAULTBOX_OK) return result;
      }
    }
  }
  return FAULTBOX_OK;
}

}  // namespace faultbox

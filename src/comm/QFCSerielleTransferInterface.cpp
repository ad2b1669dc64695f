// The serial transfer interface: construction and the connection state.
#include "comm/QFCSerielleTransferInterface.h"

#include "host/QFCFaultboxApp.h"
#include "systems/QFCSystem.h"

namespace faultbox {

namespace {
constexpr int kMsgPortNotSetUp = 171;
}  // namespace

QFCSerielleTransferInterface::QFCSerielleTransferInterface(QFCSystem* owner)
    : QFCAbstractTransferInterface(owner) {}

QFCSerielleTransferInterface::~QFCSerielleTransferInterface() = default;

HRESULT QFCSerielleTransferInterface::Connect(bool connect, std::int32_t, std::int32_t) {
  if (!connect || connected_) return FAULTBOX_OK;
  const QFCSystem* system = GetOwnerSystem();
  // No port can be opened yet: the system must never believe it is connected.
  TheApp().ReportError(kMsgPortNotSetUp, system ? system->GetSerialSettings().portName : std::string());
  return E_FAULTBOX_CONNECT;
}

}  // namespace faultbox

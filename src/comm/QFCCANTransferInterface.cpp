// The CAN transfer interface: construction and the connection state.
#include "comm/QFCCANTransferInterface.h"

#include "host/QFCFaultboxApp.h"

namespace faultbox {

namespace {
constexpr int kMsgChannelNotSetUp = 61;
}  // namespace

QFCCANTransferInterface::QFCCANTransferInterface(QFCSystem* owner) : QFCAbstractTransferInterface(owner) {}

QFCCANTransferInterface::~QFCCANTransferInterface() = default;

HRESULT QFCCANTransferInterface::Connect(bool connect, std::int32_t, std::int32_t) {
  if (!connect || connected_) return FAULTBOX_OK;
  // No channel can be opened yet: the system must never believe it is connected.
  TheApp().ReportError(kMsgChannelNotSetUp);
  return E_FAIL;
}

}  // namespace faultbox

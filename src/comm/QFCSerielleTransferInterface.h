// The transfer interface of a KR40-family system: reaches the hardware over
// the serial port of the system's interface settings.
#pragma once

#include "comm/QFCAbstractTransferInterface.h"

namespace faultbox {

class QFCSerielleTransferInterface : public QFCAbstractTransferInterface {
 public:
  explicit QFCSerielleTransferInterface(QFCSystem* owner = nullptr);
  ~QFCSerielleTransferInterface() override;

  // Until the port can be opened, connecting fails with message 171 naming
  // the port and E_FAULTBOX_CONNECT and leaves the interface disconnected.
  // The two parameters are not used by the serial line.
  HRESULT Connect(bool connect, std::int32_t first, std::int32_t second) override;
};

}  // namespace faultbox

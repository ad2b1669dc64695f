// The transfer interface of a KR60 system: reaches the hardware's modules
// over the CAN channel of the system's interface settings.
#pragma once

#include "comm/QFCAbstractTransferInterface.h"

namespace faultbox {

class QFCCANTransferInterface : public QFCAbstractTransferInterface {
 public:
  explicit QFCCANTransferInterface(QFCSystem* owner = nullptr);
  ~QFCCANTransferInterface() override;

  // Until the CAN channel can be opened, connecting fails with message 61 and
  // E_FAIL and leaves the interface disconnected.
  HRESULT Connect(bool connect, std::int32_t acceptanceCode, std::int32_t acceptanceMask) override;
};

}  // namespace faultbox

// The answer time-out of the transfer interfaces.
#include "comm/QFCAbstractTransferInterface.h"

#include "systems/QFCSystemProperty.h"

namespace faultbox {

std::int32_t QFCAbstractTransferInterface::GetAnswerTimeout() {
  if (answerTimeout_ < 0) answerTimeout_ = QFCSystemProperty::GetTransferTimeout();
  return answerTimeout_;
}

}  // namespace faultbox

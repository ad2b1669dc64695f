// The answer time-out of the transfer interfaces.
#include "comm/QFCAbstractTransferInterface.h"

#include "config/QFCFSHelper.h"
#include "platform/Settings.h"

namespace faultbox {

std::int32_t QFCAbstractTransferInterface::ReadTransferTimeout() {
  return QFCFSHelper::ReadCountSetting(Settings::kComponentSection, "Timeout", kDefaultTransferTimeout);
}

std::int32_t QFCAbstractTransferInterface::GetAnswerTimeout() {
  if (answerTimeout_ < 0) answerTimeout_ = ReadTransferTimeout();
  return answerTimeout_;
}

}  // namespace faultbox

// The KR60 pattern's frames: built by the CAN message builder for the pins
// that take part, and destroyed once they were sent.
#include "patterns/kr60/QFCCANMessageBuilder.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"

namespace faultbox {

bool QFCKR60FailurePattern::BuildMessages(QFCMessageList& messages, bool activate) {
  // The relay state records matter only while the frames are made, so the
  // builder lives for this one build and keeps nothing between activations.
  QFCCANMessageBuilder builder(this);
  return builder.BuildMessages(messages, activate);
}

void QFCKR60FailurePattern::FreeMessages(QFCMessageList& messages) {
  messages.clear();
}

}  // namespace faultbox

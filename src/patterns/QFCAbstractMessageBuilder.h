// The common base of the message builders that turn a failure pattern into
// the messages its hardware understands (CAN frames, serial bytes).
#pragma once

#include "comm/QFCAbstractMessage.h"

namespace faultbox {

class QFCAbstractMessageBuilder {
 public:
  virtual ~QFCAbstractMessageBuilder() = default;
  QFCAbstractMessageBuilder(const QFCAbstractMessageBuilder&) = delete;
  QFCAbstractMessageBuilder& operator=(const QFCAbstractMessageBuilder&) = delete;

  // Empties `messages`, then appends the messages that activate (true) or
  // deactivate (false) the pattern; the list owns them. False when the
  // messages could not be built; the list then holds nothing usable.
  virtual bool BuildMessages(QFCMessageList& messages, bool activate) = 0;
  // Forgets the per-module data collected while building.
  virtual void DeleteRelayStates() {}

 protected:
  QFCAbstractMessageBuilder() = default;
};

}  // namespace faultbox

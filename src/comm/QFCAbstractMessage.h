// The common base of the messages a pattern builds for its hardware (CAN
// frames, serial byte blocks) and the list that carries them from building to
// sending.
#pragma once

#include <memory>
#include <vector>

namespace faultbox {

class QFCAbstractMessage {
 public:
  virtual ~QFCAbstractMessage() = default;
};

// The list owns its messages: emptying it destroys them.
using QFCMessageList = std::vector<std::unique_ptr<QFCAbstractMessage>>;

}  // namespace faultbox

// The common part of the CAN and serial transfer interfaces: the connected
// flag, the owning system and the answer time-out.
#pragma once

#include <cstdint>

#include "host/ResultCodes.h"

namespace faultbox {

class QFCSystem;

class QFCAbstractTransferInterface {
 public:
  explicit QFCAbstractTransferInterface(QFCSystem* owner = nullptr) : owner_(owner) {}
  virtual ~QFCAbstractTransferInterface() = default;
  QFCAbstractTransferInterface(const QFCAbstractTransferInterface&) = delete;
  QFCAbstractTransferInterface& operator=(const QFCAbstractTransferInterface&) = delete;

  // Drops what the hardware sent and nobody asked for; nothing to drop here.
  virtual void FlushReceiveQueue() {}
  // The system the interface belongs to (not owned), or nullptr.
  virtual QFCSystem* GetOwnerSystem() const { return owner_; }
  // Connects (true) or disconnects (false) with two platform parameters (the
  // CAN acceptance code and mask). Connecting an interface that is already
  // connected, or disconnecting one that is not, does nothing.
  virtual HRESULT Connect(bool connect, std::int32_t first, std::int32_t second) = 0;

  bool IsConnected() const { return connected_; }
  // The number of passes an answer wait makes. Read from the settings the
  // first time it is asked and then kept for the life of the interface, so
  // that a change of the setting never alters a wait that is under way.
  std::int32_t GetAnswerTimeout();

 protected:
  bool connected_ = false;

 private:
  QFCSystem* owner_;
  std::int32_t answerTimeout_ = -1;  // -1 until first read
};

}  // namespace faultbox

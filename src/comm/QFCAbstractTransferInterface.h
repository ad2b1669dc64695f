// The common part of the CAN and serial transfer interfaces: the connected
// flag, the owning system and the answer time-out.
#pragma once

#include <cstdint>
#include <string>

#include "platform/InterfaceSettings.h"
#include "platform/ResultCodes.h"

namespace faultbox {

// What a transfer interface needs of the system it serves, and no more: the
// system's name for messages, its interface settings, and the one change a
// connect makes to them.
class QFITransferOwner {
 public:
  virtual const std::string& GetName() const = 0;
  virtual const QFTCANInterfaceSettings& GetCANSettings() const = 0;
  virtual const QFTSerialInterfaceSettings& GetSerialSettings() const = 0;
  virtual void GetBusTiming(std::uint32_t& first, std::uint32_t& second) const = 0;
  virtual bool IsReadOnly() const = 0;
  // Keeps the values the CAN layer reported for the configured channel.
  virtual bool SetCANSettings(const QFTCANInterfaceSettings* settings) = 0;
  // The bench the system is tied to instead of what the settings' tables
  // name: a CAN channel target or a serial device path; "" for the tables.
  virtual const std::string& GetHardwareRoute() const = 0;

 protected:
  ~QFITransferOwner() = default;
};

class QFCAbstractTransferInterface {
 public:
  explicit QFCAbstractTransferInterface(QFITransferOwner* owner = nullptr) : owner_(owner) {}
  virtual ~QFCAbstractTransferInterface() = default;
  QFCAbstractTransferInterface(const QFCAbstractTransferInterface&) = delete;
  QFCAbstractTransferInterface& operator=(const QFCAbstractTransferInterface&) = delete;

  // Drops what the hardware sent and nobody asked for; nothing to drop here.
  virtual void FlushReceiveQueue() {}
  // The system the interface belongs to (not owned), or nullptr.
  virtual QFITransferOwner* GetOwnerSystem() const { return owner_; }
  // Connects (true) or disconnects (false) with two platform parameters (the
  // CAN acceptance code and mask). Connecting an interface that is already
  // connected, or disconnecting one that is not, does nothing.
  [[nodiscard]] virtual HRESULT Connect(bool connect, std::int32_t first, std::int32_t second) = 0;

  bool IsConnected() const { return connected_; }
  // The number of passes an answer wait makes. Read from the settings the
  // first time it is asked and then kept for the life of the interface, so
  // that a change of the setting never alters a wait that is under way.
  std::int32_t GetAnswerTimeout();
  // The number of passes: the decimal "Timeout" setting, 1000 without it; a
  // value that is not a decimal number is reported (message 37, class 2) and
  // 1000 is used. Read anew on every call.
  static std::int32_t ReadTransferTimeout();
  static constexpr std::int32_t kDefaultTransferTimeout = 1000;

 protected:
  bool connected_ = false;

 private:
  QFITransferOwner* owner_;
  std::int32_t answerTimeout_ = -1;  // -1 until first read
};

}  // namespace faultbox

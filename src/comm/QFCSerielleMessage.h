// The serial line's messages: one byte each, with what the KR40 family's
// modules make of it, and the relay settings of one module collected while
// a pattern's bytes are built.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "comm/QFCAbstractMessage.h"

namespace faultbox {

class QFCSerielleMessage : public QFCAbstractMessage {
 public:
  // What the byte means to the modules.
  enum Kind : std::int32_t {
    kKindNew = -1,
    kKindExecute = 0,
    kKindReset = 1,
    kKindModuleSelection = 2,
    kKindState = 4,
    kKindRelay = 5,
  };

  QFCSerielleMessage() = default;
  QFCSerielleMessage(std::int32_t kind, std::uint32_t moduleAddress, std::uint32_t value,
                     bool addressByte = false, bool answerExpected = false)
      : kind_(kind),
        moduleAddress_(moduleAddress),
        addressByte_(addressByte),
        answerExpected_(answerExpected),
        value_(value) {}

  std::int32_t GetKind() const { return kind_; }
  std::uint32_t GetModuleAddress() const { return moduleAddress_; }
  // The second byte of a protocol A module selection.
  bool IsAddressByte() const { return addressByte_; }
  bool IsAnswerExpected() const { return answerExpected_; }
  // Either flag means the module answers after this byte.
  bool ExpectsAnswer() const { return answerExpected_ || addressByte_; }
  std::uint32_t GetValue() const { return value_; }
  void SetValue(std::uint32_t value) { value_ = value; }
  // What goes on the line: the value's low 8 bits.
  std::uint8_t GetByte() const { return static_cast<std::uint8_t>(value_ & 0xFF); }

 private:
  std::int32_t kind_ = kKindNew;
  std::uint32_t moduleAddress_ = 0;
  bool addressByte_ = false;
  bool answerExpected_ = false;
  std::uint32_t value_ = 0;
};

// Sent messages by their place in the transfer (not owned): what an answer
// is checked against.
using QFCSerielleMessageMap = std::map<std::int32_t, const QFCSerielleMessage*>;
// Bytes read from the line by their position in the read (owned).
using QFCSerielleReceivedMap = std::map<std::int32_t, std::unique_ptr<QFCSerielleMessage>>;

// A module address as messages show it ("0x%X").
std::string ModuleAddressText(std::uint32_t address);

// The relays one activation or deactivation sets on one module.
class QFCSerielleMessageData {
 public:
  static constexpr std::uint16_t kFirstRelay = 1;
  static constexpr std::uint16_t kLastRelay = 10;
  using RelayState = std::pair<std::uint16_t, std::uint16_t>;  // relay number, state

  explicit QFCSerielleMessageData(std::uint32_t moduleAddress) : moduleAddress_(moduleAddress) {}

  std::uint32_t GetModuleAddress() const { return moduleAddress_; }
  // Stores the state of a relay 1 to 10 (a relay already stored takes the
  // new state in its old place); false, and nothing stored, for other relays.
  bool SetRelayState(std::uint16_t relay, std::uint16_t state);
  // The stored relays, the relay stored first coming last: the order in
  // which the modules have always been sent their relays.
  std::vector<RelayState> GetRelayStates() const;
  bool IsEmpty() const { return relays_.empty(); }

 private:
  std::uint32_t moduleAddress_;
  std::vector<RelayState> relays_;  // in order of first storing
};

}  // namespace faultbox

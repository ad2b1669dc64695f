// Turns a KR40-family pattern into the bytes its modules understand, and
// makes the bytes of a hardware reset. Two byte protocols exist: A for KR40
// boards (with checksum answers), B for KR80 boards (without answers).
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "patterns/QFCAbstractMessageBuilder.h"
#include "comm/QFCSerielleMessage.h"

namespace faultbox {

class QFCAbstractFailurePatternPin;
class QFCKR40FailurePattern;
class QFCSystem;

class QFCSerielleMessageBuilder : public QFCAbstractMessageBuilder {
 public:
  enum class Protocol { kA, kB };
  // The only selector BuildResetMessages answers.
  static constexpr int kResetSelector = 2;
  // Module addresses a reset walks: 0 to kResetModules-1.
  static constexpr std::uint32_t kResetModules = 128;

  // Neither is owned; a builder without a pattern only makes reset bytes.
  QFCSerielleMessageBuilder(QFCKR40FailurePattern* pattern, QFCSystem* system);
  ~QFCSerielleMessageBuilder() override;

  // The bytes that switch the taking-part pins of the pattern on (true) or
  // off (false), module by module in the order the pins first name them.
  // Pins left out on the way are deselected, so that they are not marked
  // as switched; activated pins that go off are selected, so that they are
  // marked off. False when a module address cannot be read or the system
  // is not of the KR40 family.
  bool BuildMessages(QFCMessageList& messages, bool activate) override;
  void DeleteRelayStates() override { modules_.clear(); }
  // Selector kResetSelector appends the reset bytes of the system's protocol
  // (none for a system outside the KR40 family) and answers true; any other
  // selector changes nothing and answers false.
  bool BuildResetMessages(int selector, QFCMessageList& messages) const;

  // B for the board types "KR80" and "KR080", A for every other.
  static Protocol ProtocolOf(const std::string& boardType);
  // Appends the bytes of the modules in the order given. Modules without a
  // relay add nothing; without any relay at all not even the execute byte goes.
  static void AppendModuleBytes(const std::vector<std::unique_ptr<QFCSerielleMessageData>>& modules,
                                Protocol protocol, bool activate, QFCMessageList& messages);
  static void AppendResetBytes(Protocol protocol, QFCMessageList& messages);

  // The modules collected by the running build (empty outside it).
  const std::vector<std::unique_ptr<QFCSerielleMessageData>>& GetModuleData() const { return modules_; }

 private:
  // Collects the relays of the taking-part pins; false when the build must end.
  bool CollectModuleData(Protocol protocol, bool activate);
  // The relay state a pin asks for; false (and the pin deselected) when the
  // pin cannot be sent.
  bool ReadState(QFCAbstractFailurePatternPin& pin, std::int32_t failureClassId, Protocol protocol,
                 bool activate, std::uint16_t& state) const;
  QFCSerielleMessageData& ModuleData(std::uint32_t address);
  bool IsKR40System() const;

  QFCKR40FailurePattern* pattern_;
  QFCSystem* system_;
  std::vector<std::unique_ptr<QFCSerielleMessageData>> modules_;
};

}  // namespace faultbox

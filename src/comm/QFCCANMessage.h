// One CAN frame between the system and the KR60 modules (FIU, LOAD, RSIM):
// a 29-bit identifier and 8 data bytes, with the step and module type it
// belongs to, and the parts from which the message builder assembles it.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <type_traits>
#include <vector>

#include "comm/QFCAbstractMessage.h"

namespace faultbox {

// The module type of a message or relay state record. The identifier codes
// the types differently (see QFCCANMessage::TypeCodeOf).
enum QFTModuleType : std::uint32_t {
  kModuleNone = 0,  // reset messages and received frames
  kModuleFIU = 1,
  kModuleLOAD = 2,
  kModuleRSIM = 3,
};

// One change of an identifier: identifier = (identifier AND keepMask) OR
// value. With `shift` set the value is first moved up to the lowest bit that
// keepMask leaves free and cut to the free bits.
struct QFTIdentifier {
  std::uint32_t value;
  std::uint32_t keepMask;
  std::uint32_t shift;  // a flag held in 32 bits
};
static_assert(std::is_standard_layout_v<QFTIdentifier> && sizeof(QFTIdentifier) == 12);

// One change of the data: data = (data AND keepMask) OR value.
struct QFTMessage {
  std::uint64_t value;
  std::uint64_t keepMask;
};
static_assert(std::is_standard_layout_v<QFTMessage> && sizeof(QFTMessage) == 16);

class QFCCANMessage : public QFCAbstractMessage {
 public:
  // Message kinds.
  static constexpr std::uint32_t kRelayMessage = 0;  // also every received frame
  static constexpr std::uint32_t kCommitMessage = 3;

  static constexpr int kDataBytes = 8;

  // Identifier layout: offset in bits 28..18, direction in 17..16, module
  // type code in 15..12, module address in 11..0 (0 addresses every module
  // of the type).
  static constexpr std::uint32_t kIdentifierMask = 0x1FFFFFFF;
  static constexpr std::uint32_t kDirectionMask = 0x00030000;
  static constexpr std::uint32_t kDirectionAnswer = 0x00010000;
  static constexpr std::uint32_t kTypeCodeMask = 0x0000F000;
  static constexpr std::uint32_t kAddressMask = 0x00000FFF;
  static constexpr std::uint32_t kOffsetShift = 18;
  static constexpr std::uint32_t kOffsetBits = 0x7FF;
  static constexpr std::uint32_t kTypeCodeLOAD = 0x1000;
  static constexpr std::uint32_t kTypeCodeFIU = 0x2000;
  static constexpr std::uint32_t kTypeCodeRSIM = 0x3000;

  // Answers: byte 0 AND 0xC0 must be 0x40; byte 2 tells accepted or refused.
  static constexpr std::uint64_t kAnswerMask = 0xC000FF0000000000;
  static constexpr std::uint64_t kAnswerAccepted = 0x4000010000000000;
  static constexpr std::uint64_t kAnswerRefused = 0x4000140000000000;
  enum class AnswerStatus { kAccepted, kRefused, kInvalid };

  QFCCANMessage() = default;
  QFCCANMessage(std::uint32_t identifier, std::uint64_t data) : data_(data), identifier_(identifier) {}

  // A frame received from the bus: kind 0, step 0, module type 0. Fewer than
  // 8 bytes leave the missing ones 0; more than 8 are ignored.
  static std::unique_ptr<QFCCANMessage> FromFrame(std::uint32_t identifier, const std::uint8_t* bytes,
                                                  std::size_t count);

  // Places `value` at the lowest bit that keepMask leaves free and keeps the
  // bits of keepMask; a keepMask of all ones leaves the data as they are.
  virtual bool SetDataField(std::uint64_t value, std::uint64_t keepMask);
  virtual bool ApplyDataParts(const std::vector<QFTMessage>& parts);
  virtual bool ApplyIdentifierParts(const std::vector<QFTIdentifier>& parts);

  std::uint32_t GetMessageKind() const { return messageKind_; }
  void SetMessageKind(std::uint32_t kind) { messageKind_ = kind; }
  bool IsCommit() const { return messageKind_ == kCommitMessage; }
  std::int32_t GetStep() const { return step_; }
  void SetStep(std::int32_t step) { step_ = step; }
  std::uint64_t GetData() const { return data_; }
  std::uint32_t GetIdentifier() const { return identifier_; }
  std::uint32_t GetModuleType() const { return moduleType_; }
  void SetModuleType(std::uint32_t type) { moduleType_ = type; }

  // The data in bus order: byte 0 is bits 63..56.
  std::array<std::uint8_t, kDataBytes> GetDataBytes() const;
  std::uint32_t GetModuleAddress() const { return identifier_ & kAddressMask; }
  // The identifier a module answers this request with.
  std::uint32_t GetAnswerIdentifier() const { return AnswerIdentifierOf(identifier_); }
  // What this frame, taken as a module's answer, says.
  AnswerStatus EvaluateAnswer() const { return EvaluateAnswerData(data_); }

  static constexpr std::uint32_t AnswerIdentifierOf(std::uint32_t identifier) {
    return (identifier & ~kDirectionMask) | kDirectionAnswer;
  }
  static AnswerStatus EvaluateAnswerData(std::uint64_t data);
  // The identifier's type code of a module type; 0 for any other type.
  static std::uint32_t TypeCodeOf(std::uint32_t moduleType);
  // The identifier of a request: offset (low 11 bits), direction 00, type
  // code of the module type and module address (low 12 bits).
  static std::uint32_t MakeIdentifier(std::uint32_t offset, std::uint32_t moduleType, std::uint32_t address);

 private:
  std::uint32_t messageKind_ = kRelayMessage;
  std::int32_t step_ = 0;
  std::uint64_t data_ = 0;
  std::uint32_t identifier_ = 0;
  std::uint32_t moduleType_ = kModuleNone;
};

}  // namespace faultbox

// The CAN frame of the KR60 modules: assembling it from parts, reading a
// received frame, and what a module's answer says.
#include "comm/QFCCANMessage.h"

#include <bit>

namespace faultbox {

namespace {

// The lowest bit position that `keepMask` leaves free, or `width` when it keeps every bit.
template <typename T>
int LowestFreeBit(T keepMask) {
  return std::countr_one(keepMask);
}

}  // namespace

std::unique_ptr<QFCCANMessage> QFCCANMessage::FromFrame(std::uint32_t identifier, const std::uint8_t* bytes,
                                                        std::size_t count) {
  std::uint64_t data = 0;
  for (std::size_t i = 0; i < static_cast<std::size_t>(kDataBytes); ++i) {
    const std::uint64_t byte = (bytes != nullptr && i < count) ? bytes[i] : 0;
    data |= byte << (8 * (kDataBytes - 1 - i));
  }
  return std::make_unique<QFCCANMessage>(identifier, data);
}

bool QFCCANMessage::SetDataField(std::uint64_t value, std::uint64_t keepMask) {
  const int position = LowestFreeBit(keepMask);
  if (position >= 64) return true;
  data_ = (data_ & keepMask) | (~keepMask & (value << position));
  return true;
}

bool QFCCANMessage::ApplyDataParts(const std::vector<QFTMessage>& parts) {
  for (const QFTMessage& part : parts) data_ = (data_ & part.keepMask) | part.value;
  return true;
}

bool QFCCANMessage::ApplyIdentifierParts(const std::vector<QFTIdentifier>& parts) {
  for (const QFTIdentifier& part : parts) {
    std::uint32_t value = part.value;
    if (part.shift != 0) {
      const int position = LowestFreeBit(part.keepMask);
      value = position >= 32 ? 0 : (value << position) & ~part.keepMask;
    }
    identifier_ = (identifier_ & part.keepMask) | value;
  }
  return true;
}

std::array<std::uint8_t, QFCCANMessage::kDataBytes> QFCCANMessage::GetDataBytes() const {
  std::array<std::uint8_t, kDataBytes> bytes{};
  for (int i = 0; i < kDataBytes; ++i)
    bytes[i] = static_cast<std::uint8_t>(data_ >> (8 * (kDataBytes - 1 - i)));
  return bytes;
}

QFCCANMessage::AnswerStatus QFCCANMessage::EvaluateAnswerData(std::uint64_t data) {
  const std::uint64_t masked = data & kAnswerMask;
  if (masked == kAnswerAccepted) return AnswerStatus::kAccepted;
  if (masked == kAnswerRefused) return AnswerStatus::kRefused;
  return AnswerStatus::kInvalid;
}

std::uint32_t QFCCANMessage::TypeCodeOf(std::uint32_t moduleType) {
  switch (moduleType) {
    case kModuleFIU:
      return kTypeCodeFIU;
    case kModuleLOAD:
      return kTypeCodeLOAD;
    case kModuleRSIM:
      return kTypeCodeRSIM;
    default:
      return 0;
  }
}

std::uint32_t QFCCANMessage::MakeIdentifier(std::uint32_t offset, std::uint32_t moduleType,
                                            std::uint32_t address) {
  return ((offset & kOffsetBits) << kOffsetShift) | TypeCodeOf(moduleType) | (address & kAddressMask);
}

}  // namespace faultbox

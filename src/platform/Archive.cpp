// The binary archive encoding, byte for byte as documents and failure class
// files carry it.
#include "platform/Archive.h"

#include <cstring>

namespace faultbox {
namespace {

constexpr std::uint16_t kNullTag = 0x0000;
constexpr std::uint16_t kNewClassTag = 0xFFFF;
constexpr std::uint16_t kClassTag = 0x8000;
constexpr std::uint16_t kBigObjectTag = 0x7FFF;
constexpr std::uint32_t kBigClassTag = 0x80000000u;
// Indexes above this cannot be written in 16 bits beside the class bit.
constexpr std::uint32_t kMaxSmallIndex = 0x7FFE;

}  // namespace

ArchiveException::ArchiveException(ArchiveCause cause, std::string detail) : cause_(cause) {
  what_ = CauseText(cause);
  if (!detail.empty()) what_ += " (" + detail + ")";
}

const char* ArchiveException::CauseText(ArchiveCause cause) {
  switch (cause) {
    case ArchiveCause::kNone:
      return "";
    case ArchiveCause::kEndOfFile:
      return "Reached end of file while reading an object";
    case ArchiveCause::kBadIndex:
      return "Invalid file format";
    case ArchiveCause::kBadClass:
      return "Tried to read an object into an object of the wrong type";
    case ArchiveCause::kBadSchema:
      return "Tried to read an object with a different version of the class";
    case ArchiveCause::kGeneric:
      break;
  }
  return "Unspecified file error";
}

Archive::Archive() : storing_(true) {}

Archive::Archive(std::vector<std::uint8_t> input) : storing_(false), input_(std::move(input)) {}

// ---- storing ----

void Archive::Put(const void* bytes, std::size_t size) {
  const auto* p = static_cast<const std::uint8_t*>(bytes);
  data_.insert(data_.end(), p, p + size);
}

void Archive::WriteU8(std::uint8_t value) { data_.push_back(value); }

void Archive::WriteU16(std::uint16_t value) {
  std::uint8_t b[2] = {static_cast<std::uint8_t>(value), static_cast<std::uint8_t>(value >> 8)};
  Put(b, 2);
}

void Archive::WriteU32(std::uint32_t value) {
  WriteU16(static_cast<std::uint16_t>(value));
  WriteU16(static_cast<std::uint16_t>(value >> 16));
}

void Archive::WriteU64(std::uint64_t value) {
  WriteU32(static_cast<std::uint32_t>(value));
  WriteU32(static_cast<std::uint32_t>(value >> 32));
}

void Archive::WriteString(std::string_view text) {
  const std::size_t n = text.size();
  if (n < 0xFF) {
    WriteU8(static_cast<std::uint8_t>(n));
  } else if (n < 0xFFFE) {
    WriteU8(0xFF);
    WriteU16(static_cast<std::uint16_t>(n));
  } else {
    WriteU8(0xFF);
    WriteU16(0xFFFF);
    WriteU32(static_cast<std::uint32_t>(n));
  }
  Put(text.data(), n);
}

void Archive::WriteCount(std::uint32_t count) {
  if (count < 0xFFFF) {
    WriteU16(static_cast<std::uint16_t>(count));
  } else {
    WriteU16(0xFFFF);
    WriteU32(count);
  }
}

void Archive::WriteTag32(std::uint32_t value) {
  // Small indexes (with or without the class bit) fit one 16-bit word; larger
  // ones go behind the big-object tag as 32 bits.
  const std::uint32_t index = value & ~kBigClassTag;
  if (index <= kMaxSmallIndex) {
    WriteU16(static_cast<std::uint16_t>(index | ((value & kBigClassTag) ? kClassTag : 0)));
  } else {
    WriteU16(kBigObjectTag);
    WriteU32(value);
  }
}

void Archive::WriteObjectStart(std::string_view className, std::uint16_t schema) {
  auto it = storedClasses_.find(className);
  if (it == storedClasses_.end()) {
    WriteU16(kNewClassTag);
    WriteU16(schema);
    WriteU16(static_cast<std::uint16_t>(className.size()));
    Put(className.data(), className.size());
    storedClasses_.emplace(std::string(className), nextIndex_++);
  } else {
    WriteTag32(kBigClassTag | it->second);
  }
  ++nextIndex_;  // the object itself
}

void Archive::WriteNullObject() { WriteU16(kNullTag); }

// ---- loading ----

void Archive::Require(std::size_t bytes) const {
  if (storing_ || bytes > Remaining()) throw ArchiveException(ArchiveCause::kEndOfFile);
}

std::uint8_t Archive::ReadU8() {
  Require(1);
  return input_[pos_++];
}

std::uint16_t Archive::ReadU16() {
  Require(2);
  std::uint16_t v = static_cast<std::uint16_t>(input_[pos_] | (input_[pos_ + 1] << 8));
  pos_ += 2;
  return v;
}

std::uint32_t Archive::ReadU32() {
  Require(4);
  std::uint32_t lo = ReadU16();
  std::uint32_t hi = ReadU16();
  return lo | (hi << 16);
}

std::uint64_t Archive::ReadU64() {
  Require(8);
  std::uint64_t lo = ReadU32();
  std::uint64_t hi = ReadU32();
  return lo | (hi << 32);
}

std::string Archive::ReadString() {
  std::uint32_t n = ReadU8();
  if (n == 0xFF) {
    n = ReadU16();
    if (n == 0xFFFE) {
      // Wide-character texts are never written by this system.
      throw ArchiveException(ArchiveCause::kGeneric, "wide-character text");
    }
    if (n == 0xFFFF) n = ReadU32();
  }
  Require(n);
  std::string text(reinterpret_cast<const char*>(input_.data() + pos_), n);
  pos_ += n;
  return text;
}

std::uint32_t Archive::ReadCount() {
  std::uint32_t n = ReadU16();
  if (n == 0xFFFF) n = ReadU32();
  return n;
}

std::uint32_t Archive::ReadCountOf(std::size_t minItemBytes) {
  std::uint32_t n = ReadCount();
  if (minItemBytes != 0 && n > Remaining() / minItemBytes) throw ArchiveException(ArchiveCause::kEndOfFile);
  return n;
}

std::uint32_t Archive::ReadU32CountOf(std::size_t minItemBytes) {
  std::uint32_t n = ReadU32();
  if (minItemBytes != 0 && n > Remaining() / minItemBytes) throw ArchiveException(ArchiveCause::kEndOfFile);
  return n;
}

Archive::ObjectTag Archive::ReadObjectTag() {
  ObjectTag tag;
  const std::uint16_t word = ReadU16();
  if (word == kNullTag) return tag;

  if (word == kNewClassTag) {
    tag.schema = ReadU16();
    const std::uint16_t length = ReadU16();
    Require(length);
    tag.className.assign(reinterpret_cast<const char*>(input_.data() + pos_), length);
    pos_ += length;
    loaded_.push_back({true, tag.className, tag.schema});
    loaded_.push_back({false, tag.className, tag.schema});
    tag.kind = ObjectTag::Kind::kNew;
    tag.index = static_cast<std::uint32_t>(loaded_.size());
    return tag;
  }

  std::uint32_t value;
  if (word == kBigObjectTag) {
    value = ReadU32();
  } else {
    value = (static_cast<std::uint32_t>(word & kClassTag) << 16) | (word & ~kClassTag);
  }
  const std::uint32_t index = value & ~kBigClassTag;
  if (index == 0 || index > loaded_.size()) throw ArchiveException(ArchiveCause::kBadIndex);
  const Entry entry = loaded_[index - 1];  // a copy: the table grows below
  if (value & kBigClassTag) {
    if (!entry.isClass) throw ArchiveException(ArchiveCause::kBadIndex);
    loaded_.push_back({false, entry.className, entry.schema});
    tag.kind = ObjectTag::Kind::kNew;
    tag.className = entry.className;
    tag.schema = entry.schema;
    tag.index = static_cast<std::uint32_t>(loaded_.size());
    return tag;
  }
  if (entry.isClass) throw ArchiveException(ArchiveCause::kBadIndex);
  tag.kind = ObjectTag::Kind::kReference;
  tag.className = entry.className;
  tag.schema = entry.schema;
  tag.index = index;
  return tag;
}

std::size_t Archive::ReadObjectStart(std::initializer_list<ArchiveClass> accepted) {
  ObjectTag tag = ReadObjectTag();
  if (tag.kind != ObjectTag::Kind::kNew) throw ArchiveException(ArchiveCause::kBadClass);
  std::size_t position = 0;
  for (const ArchiveClass& cls : accepted) {
    if (cls.name == tag.className) {
      if (cls.schema != tag.schema) throw ArchiveException(ArchiveCause::kBadSchema);
      return position;
    }
    ++position;
  }
  throw ArchiveException(ArchiveCause::kBadClass, tag.className);
}

}  // namespace faultbox

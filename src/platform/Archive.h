// The binary encoding of documents and failure class files: little-endian
// numbers, length-prefixed single-byte texts, counts and object class tags.
// Reading checks every length and count against what is left of the input
// before allocating or looping, so a damaged file gives an ArchiveException
// and never a huge allocation, a crash or a hang.
#pragma once

#include <cstddef>
#include <cstdint>
#include <exception>
#include <initializer_list>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace faultbox {

enum class ArchiveCause { kNone, kGeneric, kEndOfFile, kBadIndex, kBadClass, kBadSchema };

class ArchiveException : public std::exception {
 public:
  explicit ArchiveException(ArchiveCause cause, std::string detail = {});
  ArchiveCause Cause() const { return cause_; }
  // The cause's own text, as users see it in load failure messages.
  static const char* CauseText(ArchiveCause cause);
  const char* what() const noexcept override { return what_.c_str(); }

 private:
  ArchiveCause cause_;
  std::string what_;
};

// A class an object may be read as: its stored name and schema number.
struct ArchiveClass {
  std::string_view name;
  std::uint16_t schema;
};

class Archive {
 public:
  // An archive that stores into memory.
  Archive();
  // An archive that loads from the given bytes.
  explicit Archive(std::vector<std::uint8_t> input);

  bool IsStoring() const { return storing_; }

  // ---- storing ----
  void WriteU8(std::uint8_t value);
  void WriteU16(std::uint16_t value);
  void WriteU32(std::uint32_t value);
  void WriteI32(std::int32_t value) { WriteU32(static_cast<std::uint32_t>(value)); }
  void WriteU64(std::uint64_t value);
  void WriteString(std::string_view text);
  void WriteCount(std::uint32_t count);
  // Starts an object of the class: the new-class tag with schema and name the
  // first time the class appears, afterwards the known-class tag. The class and
  // the object each take the next index.
  void WriteObjectStart(std::string_view className, std::uint16_t schema);
  void WriteNullObject();
  const std::vector<std::uint8_t>& Data() const { return data_; }

  // ---- loading ----
  std::uint8_t ReadU8();
  std::uint16_t ReadU16();
  std::uint32_t ReadU32();
  std::int32_t ReadI32() { return static_cast<std::int32_t>(ReadU32()); }
  std::uint64_t ReadU64();
  std::string ReadString();
  std::uint32_t ReadCount();
  // A count of items that take at least `minItemBytes` each: a count that the
  // rest of the input cannot hold is a damaged file (end of file).
  std::uint32_t ReadCountOf(std::size_t minItemBytes);
  std::uint32_t ReadU32CountOf(std::size_t minItemBytes);

  struct ObjectTag {
    enum class Kind { kNull, kNew, kReference } kind = Kind::kNull;
    std::string className;    // the object's class (kNew and kReference)
    std::uint16_t schema = 0;  // the class's stored schema
    std::uint32_t index = 0;   // the object's index in the archive's table
  };
  // Reads an object's class tag. A class tag that names no class, or an object
  // reference that points nowhere, is a bad index.
  ObjectTag ReadObjectTag();
  // Reads the start of a new object that must be of one of the accepted
  // classes: another class is a bad class, another schema a bad schema, a null
  // object or a reference a bad class. Returns the accepted entry's position.
  std::size_t ReadObjectStart(std::initializer_list<ArchiveClass> accepted);

  std::size_t Remaining() const { return input_.size() - pos_; }
  std::size_t Position() const { return pos_; }
  // Throws end of file unless `bytes` more bytes can be read.
  void Require(std::size_t bytes) const;

 private:
  void Put(const void* bytes, std::size_t size);
  void WriteTag32(std::uint32_t value);  // a tag or index, in the 16-bit or big form

  bool storing_;
  std::vector<std::uint8_t> data_;   // storing
  std::vector<std::uint8_t> input_;  // loading
  std::size_t pos_ = 0;

  std::uint32_t nextIndex_ = 1;
  std::map<std::string, std::uint32_t, std::less<>> storedClasses_;  // class name -> index
  // Loading: what each index stands for; class entries carry isClass.
  struct Entry {
    bool isClass;
    std::string className;
    std::uint16_t schema;
  };
  std::vector<Entry> loaded_;  // loaded_[i] is index i + 1
};

}  // namespace faultbox

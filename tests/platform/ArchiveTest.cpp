// The archive's encoding byte for byte, and its refusal of damaged input.
#include "platform/Archive.h"

#include <gtest/gtest.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace faultbox {
namespace {

using Bytes = std::vector<std::uint8_t>;

// The cause a reader raises on `data`, or none when it reads through.
std::optional<ArchiveCause> CauseOf(const Bytes& data, const std::function<void(Archive&)>& read) {
  Archive in(data);
  try {
    read(in);
  } catch (const ArchiveException& e) {
    return e.Cause();
  }
  return std::nullopt;
}

TEST(ArchiveTest, NumbersAreLittleEndian) {
  Archive ar;
  ar.WriteU8(0xAB);
  ar.WriteU16(0x1234);
  ar.WriteU32(0xDEADBEEF);
  ar.WriteI32(-1);
  ar.WriteU64(0x0102030405060708ull);
  EXPECT_EQ(ar.Data(), (Bytes{0xAB, 0x34, 0x12, 0xEF, 0xBE, 0xAD, 0xDE, 0xFF, 0xFF, 0xFF, 0xFF, 8, 7, 6, 5, 4,
                              3, 2, 1}));

  Archive in(ar.Data());
  in.ReadU8();
  in.ReadU16();
  in.ReadU32();
  EXPECT_EQ(in.ReadI32(), -1);
  EXPECT_EQ(in.ReadU64(), 0x0102030405060708ull);
}

TEST(ArchiveTest, TextLengthPrefixes) {
  struct Case {
    std::size_t length;
    Bytes prefix;
  };
  const Case cases[] = {
      {0, {0x00}},
      {254, {0xFE}},
      {255, {0xFF, 0xFF, 0x00}},
      {256, {0xFF, 0x00, 0x01}},
      {65533, {0xFF, 0xFD, 0xFF}},
      {65534, {0xFF, 0xFF, 0xFF, 0xFE, 0xFF, 0x00, 0x00}},
      {65535, {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00}},
      {70000, {0xFF, 0xFF, 0xFF, 0x70, 0x11, 0x01, 0x00}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.length);
    std::string text(c.length, 'x');
    if (!text.empty()) text.back() = 'z';
    Archive ar;
    ar.WriteString(text);
    const Bytes& data = ar.Data();
    ASSERT_EQ(data.size(), c.prefix.size() + c.length);
    EXPECT_EQ(Bytes(data.begin(), data.begin() + c.prefix.size()), c.prefix);
    Archive in(data);
    EXPECT_EQ(in.ReadString(), text);
    EXPECT_EQ(in.Remaining(), 0u);
  }
}

TEST(ArchiveTest, CountForms) {
  struct Case {
    std::uint32_t count;
    Bytes bytes;
  };
  const Case cases[] = {
      {0, {0x00, 0x00}},
      {0xFFFE, {0xFE, 0xFF}},
      {0xFFFF, {0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00}},
      {0x12345678, {0xFF, 0xFF, 0x78, 0x56, 0x34, 0x12}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.count);
    Archive ar;
    ar.WriteCount(c.count);
    EXPECT_EQ(ar.Data(), c.bytes);
    Archive in(ar.Data());
    EXPECT_EQ(in.ReadCount(), c.count);
  }
}

TEST(ArchiveTest, ClassTagsNewKnownAndNull) {
  Archive ar;
  ar.WriteObjectStart("QFCKR40FailureClass", 1);  // class index 1, object 2
  ar.WriteU8(0x11);
  ar.WriteObjectStart("QFCKR40FailureClass", 1);  // object 3
  ar.WriteU8(0x22);
  ar.WriteObjectStart("Other", 2);  // class 4, object 5
  ar.WriteObjectStart("Other", 2);  // object 6
  ar.WriteNullObject();

  Bytes expected = {0xFF, 0xFF, 0x01, 0x00, 0x13, 0x00};
  for (char ch : std::string("QFCKR40FailureClass")) expected.push_back(static_cast<std::uint8_t>(ch));
  expected.insert(expected.end(), {0x11, 0x01, 0x80, 0x22, 0xFF, 0xFF, 0x02, 0x00, 0x05, 0x00, 'O', 't', 'h',
                                   'e', 'r', 0x04, 0x80, 0x00, 0x00});
  EXPECT_EQ(ar.Data(), expected);

  Archive in(ar.Data());
  EXPECT_EQ(in.ReadObjectStart({{"QFCKR60FailureClass", 1}, {"QFCKR40FailureClass", 1}}), 1u);
  EXPECT_EQ(in.ReadU8(), 0x11);
  auto tag = in.ReadObjectTag();
  EXPECT_EQ(tag.kind, Archive::ObjectTag::Kind::kNew);
  EXPECT_EQ(tag.className, "QFCKR40FailureClass");
  EXPECT_EQ(tag.index, 3u);
  EXPECT_EQ(in.ReadU8(), 0x22);
  EXPECT_EQ(in.ReadObjectTag().schema, 2);
  EXPECT_EQ(in.ReadObjectTag().index, 6u);
  EXPECT_EQ(in.ReadObjectTag().kind, Archive::ObjectTag::Kind::kNull);
}

TEST(ArchiveTest, ObjectReferencesAndBigIndexForm) {
  // Object 2 exists after one new-class tag; a reference to it reads back,
  // the same reference written in the 32-bit form too.
  Bytes data = {0xFF, 0xFF, 0x01, 0x00, 0x01, 0x00, 'A',  0x02, 0x00, 0xFF, 0x7F,
                0x02, 0x00, 0x00, 0x00, 0xFF, 0x7F, 0x01, 0x00, 0x00, 0x80};
  Archive in(data);
  EXPECT_EQ(in.ReadObjectTag().kind, Archive::ObjectTag::Kind::kNew);
  auto ref = in.ReadObjectTag();
  EXPECT_EQ(ref.kind, Archive::ObjectTag::Kind::kReference);
  EXPECT_EQ(ref.index, 2u);
  EXPECT_EQ(in.ReadObjectTag().index, 2u);
  auto big = in.ReadObjectTag();  // big class tag for class 1: a new object, index 3
  EXPECT_EQ(big.kind, Archive::ObjectTag::Kind::kNew);
  EXPECT_EQ(big.className, "A");
  EXPECT_EQ(big.index, 3u);
}

TEST(ArchiveTest, ManyClassesUseTheBigTagWhenStored) {
  Archive ar;
  for (int i = 0; i < 0x4000; ++i) ar.WriteObjectStart("C" + std::to_string(i), 1);  // indexes up to 0x8000
  ar.WriteObjectStart("C16383", 1);  // class index 0x7FFF: past the 16-bit form
  const Bytes& d = ar.Data();
  EXPECT_EQ(Bytes(d.end() - 6, d.end()), (Bytes{0xFF, 0x7F, 0xFF, 0x7F, 0x00, 0x80}));
  Archive in(d);
  Archive::ObjectTag last;
  for (int i = 0; i <= 0x4000; ++i) last = in.ReadObjectTag();
  EXPECT_EQ(last.className, "C16383");
  EXPECT_EQ(last.kind, Archive::ObjectTag::Kind::kNew);
}

TEST(ArchiveTest, DamagedInputRaisesItsCause) {
  auto start = [](const std::string& name, std::uint16_t schema) {
    Archive ar;
    name.empty() ? ar.WriteNullObject() : ar.WriteObjectStart(name, schema);
    return ar.Data();
  };
  const auto tags = [](Archive& in) {
    for (;;) in.ReadObjectTag();
  };
  const auto failureClass = [](Archive& in) { in.ReadObjectStart({{"QFCKR60FailureClass", 1}}); };
  // Lengths and counts beyond the input fail before anything is allocated.
  const auto text = [](Archive& in) { in.ReadString(); };
  const auto count = [](Archive& in) { in.ReadCountOf(4); };
  struct Case {
    const char* name;
    Bytes data;
    std::function<void(Archive&)> read;
    ArchiveCause cause;
  };
  const Case cases[] = {
      {"reference to nothing", {0x05, 0x00}, tags, ArchiveCause::kBadIndex},
      {"class index to nothing", {0x01, 0x80}, tags, ArchiveCause::kBadIndex},
      {"class tag naming an object",
       {0xFF, 0xFF, 0x01, 0x00, 0x01, 0x00, 'A', 0x02, 0x80},
       tags,
       ArchiveCause::kBadIndex},
      {"reference naming a class",
       {0xFF, 0xFF, 0x01, 0x00, 0x01, 0x00, 'A', 0x01, 0x00},
       tags,
       ArchiveCause::kBadIndex},
      {"big reference to nothing", {0xFF, 0x7F, 0x00, 0x10, 0x00, 0x00}, tags, ArchiveCause::kBadIndex},
      {"other class", start("QFCSomethingElse", 1), failureClass, ArchiveCause::kBadClass},
      {"other schema", start("QFCKR60FailureClass", 2), failureClass, ArchiveCause::kBadSchema},
      {"null object", start("", 0), failureClass, ArchiveCause::kBadClass},
      {"wide text", {0xFF, 0xFE, 0xFF, 0x01, 'a', 0}, text, ArchiveCause::kGeneric},
      {"text of 4 GiB", {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 'a'}, text, ArchiveCause::kEndOfFile},
      {"text of 65000", {0xFF, 0xE8, 0xFD, 'a', 'b'}, text, ArchiveCause::kEndOfFile},
      {"count of 4 billion", {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 1, 2, 3}, count, ArchiveCause::kEndOfFile},
  };
  for (const Case& c : cases) EXPECT_EQ(CauseOf(c.data, c.read), c.cause) << c.name;
}

// A small archive of every element kind, cut at every byte: each cut must give
// end of file and nothing else.
TEST(ArchiveTest, TruncationAtEveryByteIsEndOfFile) {
  Archive ar;
  ar.WriteU32(1);
  ar.WriteString("name");
  ar.WriteString(std::string(300, 'a'));
  ar.WriteCount(0x10000);
  ar.WriteObjectStart("QFCKR60FailureClass", 1);
  ar.WriteU16(7);
  ar.WriteU8(9);
  ar.WriteU64(42);
  const Bytes full = ar.Data();

  auto readAll = [](Archive& in) {
    in.ReadU32();
    in.ReadString();
    in.ReadString();
    in.ReadCount();
    in.ReadObjectStart({{"QFCKR60FailureClass", 1}});
    in.ReadU16();
    in.ReadU8();
    in.ReadU64();
  };
  EXPECT_EQ(CauseOf(full, readAll), std::nullopt);
  for (std::size_t cut = 0; cut < full.size(); ++cut)
    EXPECT_EQ(CauseOf(Bytes(full.begin(), full.begin() + cut), readAll), ArchiveCause::kEndOfFile) << cut;
}

}  // namespace
}  // namespace faultbox

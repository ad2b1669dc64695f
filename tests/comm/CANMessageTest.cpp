// The KR60 CAN frame: reset frames, received frames and what an answer says.
// The relay and commit frames are asserted with the message builder.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>

#include "comm/QFCCANMessage.h"
#include "patterns/kr60/QFCCANMessageBuilder.h"

namespace faultbox {
namespace {

using Bytes = std::array<std::uint8_t, 8>;

const QFCCANMessage& AsCAN(const std::unique_ptr<QFCAbstractMessage>& message) {
  return dynamic_cast<const QFCCANMessage&>(*message);
}

TEST(CANMessageTest, ResetFramesAddressEveryModuleOfTheirType) {
  struct Case {
    std::uint32_t moduleType;
    std::uint32_t offset;
    std::uint32_t identifier;
  };
  const Case cases[] = {
      {kModuleLOAD, 0x10, 0x00401000},
      {kModuleFIU, 0x10, 0x00402000},
      {kModuleRSIM, 0x10, 0x00403000},
      // Only the offset's low 11 bits reach the identifier; nothing above bit 28.
      {kModuleLOAD, 0xFFFFF, 0x1FFC1000},
      {kModuleFIU, 0x7E0, 0x1F802000},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.identifier);
    QFCMessageList list;
    ASSERT_TRUE(QFCCANMessageBuilder::BuildResetMessages(2, c.moduleType, list, c.offset));
    ASSERT_EQ(list.size(), 1u);
    const QFCCANMessage& reset = AsCAN(list[0]);
    EXPECT_EQ(reset.GetIdentifier(), c.identifier);
    EXPECT_EQ(reset.GetDataBytes(), (Bytes{0x81, 0x01, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}));
    EXPECT_EQ(reset.GetStep(), 0);
    EXPECT_EQ(reset.GetModuleType(), 0u);
    EXPECT_EQ(reset.GetModuleAddress(), 0u);
  }
}

TEST(CANMessageTest, ResetSelectorAndUnknownTypesAddNothing) {
  QFCMessageList list;
  EXPECT_FALSE(QFCCANMessageBuilder::BuildResetMessages(1, kModuleFIU, list, 0x10));
  EXPECT_FALSE(QFCCANMessageBuilder::BuildResetMessages(2, 0, list, 0x10));
  EXPECT_FALSE(QFCCANMessageBuilder::BuildResetMessages(2, 4, list, 0x10));
  EXPECT_TRUE(list.empty());
  // The answer is about the list, which already holds the LOAD reset.
  ASSERT_TRUE(QFCCANMessageBuilder::BuildResetMessages(2, kModuleLOAD, list, 0x10));
  EXPECT_TRUE(QFCCANMessageBuilder::BuildResetMessages(2, 4, list, 0x10));
  EXPECT_EQ(list.size(), 1u);
}

TEST(CANMessageTest, DataBytesAreInBusOrder) {
  const QFCCANMessage message(0, 0x8204FEFFFFFFFCFF);
  EXPECT_EQ(message.GetDataBytes(), (Bytes{0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}));

  const std::uint8_t received[] = {0x40, 0x05, 0x01};
  auto frame = QFCCANMessage::FromFrame(0x00412003, received, sizeof received);
  EXPECT_EQ(frame->GetIdentifier(), 0x00412003u);
  EXPECT_EQ(frame->GetData(), 0x4005010000000000u);
  EXPECT_EQ(frame->GetMessageKind(), QFCCANMessage::kRelayMessage);
  EXPECT_EQ(frame->GetStep(), 0);
  EXPECT_EQ(frame->GetModuleType(), 0u);
}

TEST(CANMessageTest, AnswersComeWithDirectionOneAndSayAcceptedOrRefused) {
  EXPECT_EQ(QFCCANMessage(0x00402003, 0).GetAnswerIdentifier(), 0x00412003u);
  EXPECT_EQ(QFCCANMessage::AnswerIdentifierOf(0x00422003), 0x00412003u);

  using Status = QFCCANMessage::AnswerStatus;
  struct Case {
    Bytes bytes;
    Status status;
  };
  const Case cases[] = {
      {{0x40, 0x04, 0x01, 0, 0, 0, 0, 0}, Status::kAccepted},
      {{0x7F, 0xFF, 0x01, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}, Status::kAccepted},  // other bits ignored
      {{0x40, 0x05, 0x14, 0, 0, 0, 0, 0}, Status::kRefused},
      {{0x82, 0x04, 0x01, 0, 0, 0, 0, 0}, Status::kInvalid},  // direction bits 10
      {{0xC0, 0x04, 0x01, 0, 0, 0, 0, 0}, Status::kInvalid},
      {{0x00, 0x04, 0x01, 0, 0, 0, 0, 0}, Status::kInvalid},
      {{0x40, 0x04, 0x02, 0, 0, 0, 0, 0}, Status::kInvalid},
  };
  for (const Case& c : cases) {
    const auto answer = QFCCANMessage::FromFrame(0x00412003, c.bytes.data(), c.bytes.size());
    EXPECT_EQ(answer->EvaluateAnswer(), c.status) << std::hex << answer->GetData();
  }
}

}  // namespace
}  // namespace faultbox

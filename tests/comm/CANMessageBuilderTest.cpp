// The KR60 message builder: which pins take part, the relay state records per
// module and step, and the frames built from them, byte for byte, over a
// KR60 system opened from a pin file with offset 0x10, FIU module 3 and RSIM
// module 4.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <initializer_list>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "comm/QFCCANMessage.h"
#include "patterns/kr60/QFCCANMessageBuilder.h"
#include "config/QFCAbstractFailureClasses.h"
#include "patterns/KR60PatternBench.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/kr60/QFCKR60FailurePattern.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"

namespace faultbox::test {
namespace {

using Bytes = std::array<std::uint8_t, 8>;

struct Frame {
  std::uint32_t identifier;
  Bytes bytes;
  std::int32_t step;
  std::uint32_t kind;
  bool operator==(const Frame&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Frame& f) {
  char text[80];
  std::snprintf(text, sizeof text, "%08X %02X %02X %02X %02X %02X %02X %02X %02X step %d kind %u",
                f.identifier, f.bytes[0], f.bytes[1], f.bytes[2], f.bytes[3], f.bytes[4], f.bytes[5],
                f.bytes[6], f.bytes[7], f.step, f.kind);
  return out << text;
}

std::vector<Frame> Frames(const QFCMessageList& list) {
  std::vector<Frame> out;
  for (const auto& m : list) {
    const auto& can = dynamic_cast<const QFCCANMessage&>(*m);
    out.push_back({can.GetIdentifier(), can.GetDataBytes(), can.GetStep(), can.GetMessageKind()});
  }
  return out;
}

Bytes Byte4(std::uint8_t marker, std::uint32_t half) {
  auto byte = [&](int shift) { return static_cast<std::uint8_t>(half >> shift); };
  return {0x82, 0x04, marker, byte(24), byte(16), byte(8), byte(0), 0xFF};
}
// The two relay frames of a module and step, and the commit of a module type.
Frame Low(std::uint32_t id, std::uint64_t vector, std::int32_t step = 1) {
  return {id, Byte4(0xFE, static_cast<std::uint32_t>(vector)), step, 0};
}
Frame High(std::uint32_t id, std::uint64_t vector, std::int32_t step = 1) {
  return {id, Byte4(0xFD, static_cast<std::uint32_t>(vector >> 32)), step, 0};
}
Frame Commit(std::uint32_t id, std::int32_t step = 1) {
  return {id, {0x82, 0x05, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}, step, 3};
}

constexpr std::uint32_t kLoad12 = 0x00401012;  // LOAD module 0_1_2 (pins P1, P2)
constexpr std::uint32_t kLoad13 = 0x00401013;  // LOAD module 0_1_3 (pin P3)
constexpr std::uint32_t kLoadCommit = 0x00401000;
constexpr std::uint32_t kFiu = 0x00402003;
constexpr std::uint32_t kFiuCommit = 0x00402000;
constexpr std::uint32_t kRsim = 0x00403004;
constexpr std::uint32_t kRsimCommit = 0x00403000;
constexpr std::uint64_t kOff = ~std::uint64_t{0};

// The bit of LOAD channel c, relay r: 5c + r for channels 0 to 5, 32 + 5(c - 6) + r above.
constexpr std::uint64_t Ch(std::uint32_t channel, std::uint32_t relay) {
  constexpr int kBits[10][5] = {
      {0, 1, 2, 3, 4},      {}, {}, {15, 16, 17, 18, 19}, {20, 21, 22, 23, 24}, {}, {},
      {37, 38, 39, 40, 41}, {}, {}};
  return std::uint64_t{1} << kBits[channel][relay];
}
constexpr std::uint64_t On(std::uint64_t bits) {
  return ~bits;
}

struct Relay {
  std::size_t position;
  std::uint32_t state;
  std::uint32_t first = 0;
  std::uint32_t last = 0;
};
// A relay vector that does not care about any position but those given.
QFTPossibility Relays(std::initializer_list<Relay> relays) {
  QFTPossibility p(kRelayPositions, kRelayAny);
  for (const Relay& r : relays) p.Set(r.position, r.state, r.first, r.last);
  return p;
}

// The system and its pattern: P1 and P2 on LOAD module 0_1_2 (channels 3
// and 4), P3 on module 0_1_3 (channels 0 and 7). Every module answered the
// reset unless a test says otherwise.
class CANBuilderTest : public ::testing::Test {
 protected:
  void Open(const char* rsim = "0_0_4", const char* fiu = "0_0_3", const char* offset = "10") {
    builder_.reset();
    bench_.reset();
    bench_ = std::make_unique<KR60Bench>(
        std::vector<KR60PinLine>{{"P1", "Engine", "1", "0_1_2", "3"},
                                 {"P2", "Engine", "1", "0_1_2", "4"},
                                 {"P3", "Gearbox", "1", "0_1_3", "0,7"}},
        std::vector<std::pair<std::string, std::string>>{
            {"OffsetLoadAddress", offset}, {"FIULoadAddress", fiu}, {"RSIMLoadAddress", rsim}});
    system_ = bench_->system();
    system_->GetRespondingModules() = {0x012, 0x013, 0x003, 0x004};
    pattern_ = bench_->CreateWith(bench_->AllPins(), "Pattern");
    ASSERT_NE(pattern_, nullptr);
  }
  void SetUp() override { Open(); }

  QFCAbstractFailurePatternPin* Pin(const std::string& name) {
    const std::string ecu = name == "P3" ? "Gearbox" : "Engine";
    return pattern_->GetPins()->FindPin(name, ecu);
  }
  // Gives the pin the relay vector as its failure class and selects it, as
  // the interlock would have when the pattern's settings fit it.
  void Give(const std::string& name, QFTPossibility vector, bool activated = false) {
    const std::int32_t id = ++lastId_;
    QFCAbstractFailureClass& fc = system_->GetFailureClasses()->AddFailureClass();
    fc.SetId(id);
    fc.AddPossibility(std::move(vector));
    QFCAbstractFailurePatternPin* pin = Pin(name);
    ASSERT_TRUE(pin->SetFailureClass({{id, 0}}));
    pin->SetCanBeActivated(true);
    pin->SetSelected(true);
    pin->SetActivated(activated);
  }
  std::vector<Frame> Build(bool activate, bool expectResult = true) {
    QFCMessageList list;
    EXPECT_EQ(builder().BuildMessages(list, activate), expectResult);
    return Frames(list);
  }
  QFCCANMessageBuilder& builder() {
    if (!builder_) builder_ = std::make_unique<QFCCANMessageBuilder>(pattern_);
    return *builder_;
  }

  MessageCapture messages_;
  std::unique_ptr<KR60Bench> bench_;
  QFCSystem* system_ = nullptr;
  QFCKR60FailurePattern* pattern_ = nullptr;
  std::unique_ptr<QFCCANMessageBuilder> builder_;
  std::int32_t lastId_ = 0;
};

TEST_F(CANBuilderTest, FiuRelaysFiveSixAndFortyTwo) {
  Give("P1", Relays({{5, 1}, {6, 1}, {42, 1}}));
  const std::vector<Frame> expected = {
      Low(kLoad12, kOff),
      High(kLoad12, kOff),
      Commit(kLoadCommit),
      {kFiu, {0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}, 1, 0},
      {kFiu, {0x82, 0x04, 0xFD, 0xFF, 0xFF, 0xFF, 0xDF, 0xFF}, 1, 0},
      Commit(kFiuCommit),
  };
  QFCMessageList list;
  ASSERT_TRUE(builder().BuildMessages(list, true));
  EXPECT_EQ(Frames(list), expected);
  EXPECT_EQ(dynamic_cast<const QFCCANMessage&>(*list[3]).GetAnswerIdentifier(), 0x00412003u);
  ASSERT_EQ(builder().GetRelayStates().size(), 2u);
  const QFTModuleRelayState& fiu = *builder().GetRelayStates()[1];
  EXPECT_EQ(fiu.vector, 0xFFFFFFDFFFFFFFFCu);
  EXPECT_EQ(fiu.moduleAddress, 3u);
  EXPECT_EQ(fiu.moduleType, kModuleFIU);
  EXPECT_TRUE(fiu.activate);

  // Switched back: the same frames with every relay off.
  Pin("P1")->SetActivated(true);
  const std::vector<Frame> off = {Low(kLoad12, kOff), High(kLoad12, kOff), Commit(kLoadCommit),
                                  Low(kFiu, kOff),    High(kFiu, kOff),    Commit(kFiuCommit)};
  EXPECT_EQ(Build(false), off);
}

TEST_F(CANBuilderTest, FramesPerPatternShape) {
  struct Case {
    const char* name;
    std::vector<std::pair<std::string, QFTPossibility>> pins;
    bool resistor;  // connected between 2 and 3 with the value 32
    std::vector<Frame> activation;
    std::vector<Frame> deactivation;
  };
  const std::uint64_t p3 = On(Ch(0, 0) | Ch(0, 4) | Ch(7, 0) | Ch(7, 4));
  const std::uint64_t p1Relay0 = On(Ch(3, 0));
  const std::uint64_t p1Relays01 = On(Ch(3, 0) | Ch(3, 1));
  const std::uint64_t p1Relay1 = On(Ch(3, 1));
  const std::uint64_t withP2 = On(Ch(3, 0) | Ch(4, 0));
  const std::uint64_t withP2Step2 = On(Ch(3, 0) | Ch(3, 1) | Ch(4, 0));
  const Case cases[] = {
      {"both load channels of a pin, in both halves",
       {{"P3", Relays({{0, 1}, {4, 1}})}},
       false,
       {Low(kLoad13, p3), High(kLoad13, p3), Commit(kLoadCommit)},
       {Low(kLoad13, kOff), High(kLoad13, kOff), Commit(kLoadCommit)}},
      {"two LOAD modules in one step share one commit",
       {{"P1", Relays({{0, 1}})}, {"P3", Relays({{0, 1}})}},
       false,
       {Low(kLoad12, p1Relay0), High(kLoad12, p1Relay0), Commit(kLoadCommit),
        Low(kLoad13, On(Ch(0, 0) | Ch(7, 0))), High(kLoad13, On(Ch(0, 0) | Ch(7, 0)))},
       {Low(kLoad12, kOff), High(kLoad12, kOff), Commit(kLoadCommit), Low(kLoad13, kOff),
        High(kLoad13, kOff)}},
      {"RSIM: one relay frame and a commit, before the FIU",
       {{"P1", Relays({})}},
       true,
       {Low(kLoad12, kOff),
        High(kLoad12, kOff),
        Commit(kLoadCommit),
        {kRsim, {0x82, 0x04, 0xFE, 0xFF, 0xFC, 0x00, 0x20, 0xFF}, 1, 0},
        Commit(kRsimCommit),
        Low(kFiu, kOff),
        High(kFiu, kOff),
        Commit(kFiuCommit)},
       {Low(kLoad12, kOff), High(kLoad12, kOff), Commit(kLoadCommit), Low(kRsim, kOff), Commit(kRsimCommit),
        Low(kFiu, kOff), High(kFiu, kOff), Commit(kFiuCommit)}},
      {"two steps: step 2 starts from step 1; deactivation by last steps",
       {{"P1", Relays({{0, 1, 1, 2}, {1, 1, 2, 1}})}},
       false,
       {Low(kLoad12, p1Relay0, 1), High(kLoad12, p1Relay0, 1), Commit(kLoadCommit, 1),
        Low(kLoad12, p1Relays01, 2), High(kLoad12, p1Relays01, 2), Commit(kLoadCommit, 2)},
       {Low(kLoad12, p1Relay0, 1), High(kLoad12, p1Relay0, 1), Commit(kLoadCommit, 1), Low(kLoad12, kOff, 2),
        High(kLoad12, kOff, 2), Commit(kLoadCommit, 2)}},
      {"steps without step 1",
       {{"P1", Relays({{1, 1, 3, 4}})}},
       false,
       {Low(kLoad12, p1Relay1, 3), High(kLoad12, p1Relay1, 3), Commit(kLoadCommit, 3)},
       {Low(kLoad12, kOff, 4), High(kLoad12, kOff, 4), Commit(kLoadCommit, 4)}},
      // A last step of 0 means every step, as a first step of 0 does: the
      // relay must not stay on after the deactivation.
      {"last step 0 after a numbered first step",
       {{"P1", Relays({{0, 1, 2, 0}})}},
       false,
       {Low(kLoad12, p1Relay0, 2), High(kLoad12, p1Relay0, 2), Commit(kLoadCommit, 2)},
       {Low(kLoad12, kOff), High(kLoad12, kOff), Commit(kLoadCommit)}},
      // Two pins on one module: the step-2 vector keeps what the other pin
      // switched in step 1.
      {"two pins of one module with different steps",
       {{"P1", Relays({{0, 1, 1, 2}, {1, 1, 2, 1}})}, {"P2", Relays({{0, 1}})}},
       false,
       {Low(kLoad12, withP2, 1), High(kLoad12, withP2, 1), Commit(kLoadCommit, 1),
        Low(kLoad12, withP2Step2, 2), High(kLoad12, withP2Step2, 2), Commit(kLoadCommit, 2)},
       {Low(kLoad12, p1Relay0, 1), High(kLoad12, p1Relay0, 1), Commit(kLoadCommit, 1), Low(kLoad12, kOff, 2),
        High(kLoad12, kOff, 2), Commit(kLoadCommit, 2)}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Open();
    builder_.reset();
    if (c.resistor) {
      ASSERT_TRUE(pattern_->Connect(QFCExternHardware::kResistor, -1, 2, 3));
      ASSERT_EQ(pattern_->SetResistorValue(32), FAULTBOX_OK);
    }
    for (const auto& [name, vector] : c.pins) Give(name, vector);
    EXPECT_EQ(Build(true), c.activation);
    for (const auto& [name, vector] : c.pins) Pin(name)->SetActivated(true);
    EXPECT_EQ(Build(false), c.deactivation);
  }
}

TEST_F(CANBuilderTest, PatternBuildsAndFreesItsFrames) {
  Give("P1", Relays({{0, 1}, {5, 1}}));
  QFCMessageList list;
  list.push_back(std::make_unique<QFCCANMessage>());  // left from before: replaced
  ASSERT_TRUE(pattern_->BuildMessages(list, true));
  const std::uint64_t p1 = On(Ch(3, 0));
  const std::vector<Frame> expected = {Low(kLoad12, p1), High(kLoad12, p1), Commit(kLoadCommit),
                                       Low(kFiu, On(1)), High(kFiu, On(1)), Commit(kFiuCommit)};
  EXPECT_EQ(Frames(list), expected);
  pattern_->FreeMessages(list);
  EXPECT_TRUE(list.empty());
}

TEST_F(CANBuilderTest, PinsAlreadyActivatedStayOnWhenMoreAreAdded) {
  Give("P1", Relays({{0, 1}}), /*activated=*/true);
  Give("P2", Relays({{0, 1}}));
  const std::uint64_t both = On(Ch(3, 0) | Ch(4, 0));
  const std::vector<Frame> expected = {Low(kLoad12, both), High(kLoad12, both), Commit(kLoadCommit)};
  EXPECT_EQ(Build(true), expected);
  // P1 takes no part and is no longer selected, so its flag stays as it is.
  EXPECT_FALSE(Pin("P1")->IsSelected());
  EXPECT_TRUE(Pin("P2")->IsSelected());
}

TEST_F(CANBuilderTest, WhichPinsTakePart) {
  Give("P1", Relays({{0, 1}}));
  Give("P2", Relays({{0, 1}}));
  Give("P3", Relays({{0, 1}}));
  Pin("P2")->SetSelected(false);
  system_->GetRespondingModules().erase(0x013);
  const std::vector<Frame> p1Only = {Low(kLoad12, On(Ch(3, 0))), High(kLoad12, On(Ch(3, 0))),
                                     Commit(kLoadCommit)};
  EXPECT_EQ(Build(true), p1Only);
  ASSERT_NE(messages_.Find(109), nullptr);
  EXPECT_EQ(messages_.Find(109)->first, "0x13");
  EXPECT_EQ(messages_.Find(109)->second, "P3");
  EXPECT_FALSE(Pin("P3")->IsSelected());
  EXPECT_EQ(messages_.Count(131), 0);

  // A disabled ECU leaves its pins out with message 131.
  system_->GetRespondingModules().insert(0x013);
  Pin("P3")->SetSelected(true);
  Pin("P3")->GetPin()->GetEcu()->SetEnabled(false, true);
  messages_.Clear();
  EXPECT_EQ(Build(true), p1Only);
  ASSERT_NE(messages_.Find(131), nullptr);
  EXPECT_EQ(messages_.Find(131)->first, "P3");
  EXPECT_EQ(messages_.Find(131)->second, "Gearbox");
  Pin("P3")->GetPin()->GetEcu()->SetEnabled(true, true);

  // Deactivating switches every activated pin off, selected or not, and
  // selects them so that all end deactivated.
  for (const char* name : {"P1", "P2", "P3"}) Pin(name)->SetSelected(false);
  Pin("P2")->SetActivated(true);
  Pin("P3")->SetActivated(true);
  const std::vector<Frame> off = {Low(kLoad12, kOff), High(kLoad12, kOff), Commit(kLoadCommit),
                                  Low(kLoad13, kOff), High(kLoad13, kOff)};
  EXPECT_EQ(Build(false), off);
  EXPECT_FALSE(Pin("P1")->IsSelected());
  EXPECT_TRUE(Pin("P2")->IsSelected());
  EXPECT_TRUE(Pin("P3")->IsSelected());
}

TEST_F(CANBuilderTest, ExternalHardwareDecidesRsimAndFiu) {
  struct Case {
    const char* name;
    std::int32_t a;  // Connect (resistor, -1, a, b)
    std::int32_t b;
    QFTPossibility vector;
    bool rsim;
    bool fiu;
  };
  const Case cases[] = {
      {"nothing connected, no FIU relay", 0, 0, Relays({{0, 1}}), false, false},
      // One endpoint set by a failure class already wires the resistor in.
      {"resistor at one endpoint", QFCExternHardwareAdmin::kSetEndpointA, 2, Relays({{10, 1}}), true, true},
      {"resistor at both endpoints", 2, 3, Relays({}), true, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Open();
    builder_.reset();
    if (c.a != 0) {
      ASSERT_TRUE(pattern_->Connect(QFCExternHardware::kResistor, -1, c.a, c.b));
    }
    Give("P1", c.vector);
    Build(true);
    bool rsim = false, fiu = false;
    for (const auto& record : builder().GetRelayStates()) {
      rsim = rsim || record->moduleType == kModuleRSIM;
      fiu = fiu || record->moduleType == kModuleFIU;
    }
    EXPECT_EQ(rsim, c.rsim);
    EXPECT_EQ(fiu, c.fiu);
  }
}

TEST_F(CANBuilderTest, UnreadableAddressesFailTheBuild) {
  struct Case {
    const char* name;
    const char* rsim;
    const char* fiu;
    const char* offset;
    bool resistor;
    QFTPossibility vector;
    bool result;
    int message;
  };
  const Case cases[] = {
      {"FIU needed, none fitted", "0_0_4", "none", "10", false, Relays({{5, 1}}), false, 161},
      {"resistor connected, no RSIM", "none", "0_0_3", "10", true, Relays({}), false, 161},
      {"no resistor, no RSIM: fine", "none", "none", "10", false, Relays({{0, 1}}), true, 0},
      {"no offset", "0_0_4", "0_0_3", "none", false, Relays({{0, 1}}), false, 35},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Open(c.rsim, c.fiu, c.offset);
    builder_.reset();
    if (c.resistor) {
      ASSERT_TRUE(pattern_->Connect(QFCExternHardware::kResistor, -1, 2, 3));
    }
    Give("P1", c.vector);
    messages_.Clear();
    QFCMessageList list;
    EXPECT_EQ(builder().BuildMessages(list, true), c.result);
    if (!c.result) {
      EXPECT_TRUE(list.empty());
    }
    if (c.message != 0) {
      EXPECT_GE(messages_.Count(c.message), 1);
    }
  }
}

TEST_F(CANBuilderTest, NewRecordStartsFromTheHighestStepOfItsModule) {
  QFCCANMessageBuilder& b = builder();
  QFTModuleRelayState* first = b.FindOrCreateRelayState(3, 1, kModuleFIU, true);
  EXPECT_EQ(first->vector, kOff);
  first->vector = 0xF0;
  EXPECT_EQ(b.FindOrCreateRelayState(3, 1, kModuleFIU, true), first);
  b.FindOrCreateRelayState(3, 3, kModuleFIU, true)->vector = 0xF00;
  EXPECT_EQ(b.FindOrCreateRelayState(3, 2, kModuleFIU, true)->vector, 0xF00u);
  // Another direction, type or address starts with every relay off.
  EXPECT_EQ(b.FindOrCreateRelayState(3, 2, kModuleFIU, false)->vector, kOff);
  EXPECT_EQ(b.FindOrCreateRelayState(3, 2, kModuleLOAD, true)->vector, kOff);
  EXPECT_EQ(b.FindOrCreateRelayState(4, 2, kModuleFIU, true)->vector, kOff);
  EXPECT_EQ(b.GetRelayStates().size(), 6u);
}

}  // namespace
}  // namespace faultbox::test

// The CAN transfer interface and the KR60 pattern's sending on the
// in-process bus: a peer on the same bus plays the modules (answering,
// refusing, garbling or staying silent) or puts frames in front of a wait.
#include "comm/QFCCANTransferInterface.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <map>
#include <mutex>
#include <set>
#include <thread>

#include "patterns/KR60PatternBench.h"
#include "support/MessageCapture.h"
#include "systems/SystemTestBench.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;
using test::MessageCapture;

constexpr std::uint32_t kOffset = 0x10;
constexpr std::uint64_t kAccepted = 0x4000010000000000;
constexpr std::uint64_t kRefused = 0x4000140000000000;
constexpr std::uint64_t kGarbled = 0x8200010000000000;  // byte 2 right, direction bits wrong

std::uint32_t Id(std::uint32_t type, std::uint32_t address) {
  return QFCCANMessage::MakeIdentifier(kOffset, type, address);
}

std::string UniqueBus() {
  static std::atomic<int> counter{0};
  return "cti-" + std::to_string(::getpid()) + "-" + std::to_string(counter++);
}

// A refusing bus: every frame handed to it is lost.
class RefusingDriver final : public CanDriver {
  class Channel final : public CanDriverChannel {
   public:
    CanResult Transmit(const CanFrameRecord&, std::string* error) override {
      *error = "cable unplugged";
      return CanResult::kBusError;
    }
    std::string TraceName() const override { return "refusing"; }
  };

 public:
  bool IsAvailable(const std::string&) override { return true; }
  std::unique_ptr<CanDriverChannel> Open(const std::string&, std::shared_ptr<CanFrameSink>, CanResult* result,
                                         std::string*) override {
    *result = CanResult::kOk;
    return std::make_unique<Channel>();
  }
};

// Another participant on the bus. Play() starts a thread that answers as
// the modules do: a relay frame from the addressed module, a commit from
// every module of its type loaded since that type's last commit, each as
// `behaviour` says (accepted when not named; 0 for silence).
class Peer {
 public:
  explicit Peer(const std::string& bus) {
    EXPECT_EQ(CanAccess::RegisterInterfaceTarget("virtual:" + bus, &handle_), CanResult::kOk);
    std::uint32_t access = 0;
    // Never asks for init access: that belongs to the interface under test.
    CanAccess::InitInterface(handle_, 0, 0x10000, &access);
    event_ = NamedEvent::CreateFirstFree("FB_TEST_PEER_%i");
    CanAccess::SetEventNotification(handle_, event_, 1);
    CanAccess::ActivateChannel(handle_);
  }
  ~Peer() {
    stop_ = true;
    if (thread_.joinable()) thread_.join();
    CanAccess::UnRegisterInterface(handle_);
  }

  void Send(std::uint32_t id, std::uint64_t data, std::uint32_t type = kCanFrameData) {
    CanFrameRecord f;
    f.frameType = type;
    f.flags = kCanFlagExtended;
    f.identifier = id;
    f.length = 8;
    for (int i = 0; i < 8; ++i) f.data[i] = static_cast<std::uint8_t>(data >> (56 - 8 * i));
    ASSERT_EQ(CanAccess::TransmitMessage(handle_, f), CanResult::kOk);
  }
  std::vector<CanFrameRecord> Take() {
    std::vector<CanFrameRecord> frames(64);
    std::uint32_t n = 64;
    CanAccess::ReadReceiveQueue(handle_, frames.data(), &n);
    frames.resize(n);
    return frames;
  }

  void Play(std::map<std::uint32_t, std::uint64_t> behaviour) {
    behaviour_ = std::move(behaviour);
    thread_ = std::thread([this] {
      while (!stop_) {
        event_->Wait(10ms);
        for (const CanFrameRecord& f : Take()) Answer(f);
      }
    });
  }
  // Identifiers heard by the playing modules, in order.
  std::vector<std::uint32_t> Heard() {
    std::lock_guard lock(mutex_);
    return heard_;
  }
  // Once `count` frames were heard (or after a long patience), those heard.
  std::vector<std::uint32_t> HeardAtLeast(std::size_t count) {
    for (int i = 0; i < 2000 && Heard().size() < count; ++i) std::this_thread::sleep_for(10ms);
    return Heard();
  }

 private:
  void Answer(const CanFrameRecord& f) {
    {
      std::lock_guard lock(mutex_);
      heard_.push_back(f.identifier);
    }
    const std::uint32_t address = f.identifier & QFCCANMessage::kAddressMask;
    const std::uint32_t type = f.identifier & QFCCANMessage::kTypeCodeMask;
    std::set<std::uint32_t> from = {address};
    if (address == 0)
      from = std::exchange(loaded_[type], {});
    else
      loaded_[type].insert(address);
    for (std::uint32_t module : from) {
      const auto b = behaviour_.find(module);
      const std::uint64_t data = b == behaviour_.end() ? kAccepted : b->second;
      if (data != 0)
        Send(QFCCANMessage::AnswerIdentifierOf((f.identifier & ~QFCCANMessage::kAddressMask) | module), data);
    }
  }

  CanHandle handle_ = 0;
  std::shared_ptr<NamedEvent> event_;
  std::map<std::uint32_t, std::uint64_t> behaviour_;
  std::map<std::uint32_t, std::set<std::uint32_t>> loaded_;
  std::mutex mutex_;
  std::vector<std::uint32_t> heard_;
  std::atomic<bool> stop_{false};
  std::thread thread_;
};

class CANTransferTest : public ::testing::Test {
 protected:
  CANTransferTest() { Route("virtual:" + bus_); }
  ~CANTransferTest() override { CanChannelTable::SetOverride({}); }

  // Every channel, whatever a system names, leads to `target`.
  static void Route(const std::string& target) {
    CanChannelTarget t;
    ASSERT_TRUE(ParseCanChannelTarget(target, &t));
    CanChannelTable::SetOverride({{{-1, -1, -1}, t}});
  }

  test::Bench bench_;
  std::string bus_ = UniqueBus();
};

TEST_F(CANTransferTest, ConnectsEachInterfaceWithAnEventOfItsOwn) {
  MessageCapture cap;
  QFCCANTransferInterface first, second;
  EXPECT_EQ(first.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_TRUE(first.IsConnected());
  EXPECT_EQ(first.GetReceiveEventName(), "FS_CAN_RECEIVE_EVENT_0");
  EXPECT_EQ(first.GetChannelDescription(), "Vector CANCardX (board 1, channel 1)");
  EXPECT_EQ(cap.Numbers(), std::vector<int>{62});

  // The bus is set up already: used as it is, at 125000 bit/s.
  cap.Clear();
  EXPECT_EQ(second.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(second.GetReceiveEventName(), "FS_CAN_RECEIVE_EVENT_1");
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{59, 62}));
  EXPECT_EQ(first.Connect(true, 0, 0), FAULTBOX_OK);  // nothing happens

  cap.Clear();
  EXPECT_EQ(first.Connect(false, 0, 0), FAULTBOX_OK);
  EXPECT_FALSE(first.IsConnected());
  EXPECT_EQ(cap.Numbers(), std::vector<int>{103});
  EXPECT_EQ(NamedEvent::Open("FS_CAN_RECEIVE_EVENT_0"), nullptr);
  EXPECT_EQ(first.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(first.GetReceiveEventName(), "FS_CAN_RECEIVE_EVENT_0");
}

TEST_F(CANTransferTest, RefusesABusAtAnotherBitRate) {
  // A system first on the bus sets the bus timing of its settings: 250000 bit/s.
  test::KR60Bench bench({{"P1", "Engine", "1"}});
  bench.system()->SetBusTiming(0x43, 0x14);
  ASSERT_EQ(bench.system()->GetTransferInterface()->Connect(true, 0, 0), FAULTBOX_OK);

  MessageCapture cap;
  QFCCANTransferInterface late;
  EXPECT_EQ(late.Connect(true, 0, 0), E_FAIL);
  EXPECT_FALSE(late.IsConnected());
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{59, 177, 61}));
  EXPECT_EQ(cap.Find(177)->first, "250000");
  // Nothing stays registered: the event's name is free again.
  EXPECT_EQ(NamedEvent::Open("FS_CAN_RECEIVE_EVENT_1"), nullptr);
  bench.system()->GetTransferInterface()->Connect(false, 0, 0);
}

TEST_F(CANTransferTest, ConnectFailsWithoutAChannel) {
  Route("no-such-driver:bench");
  MessageCapture cap;
  QFCCANTransferInterface can;
  EXPECT_EQ(can.Connect(true, 0, 0), E_FAIL);
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{58, 61}));
  EXPECT_EQ(can.GetReceiveEventName(), "");
  std::vector<QFTCANInterfaceSettings> channels(3);
  std::uint32_t count = 7;
  EXPECT_EQ(can.GetAvailableChannels(channels, count), FAULTBOX_OK);
  EXPECT_EQ(count, 0u);
  EXPECT_TRUE(channels.empty());
}

TEST_F(CANTransferTest, SendsTheFrameAsBuilt) {
  Peer modules(bus_);
  QFCCANTransferInterface can;
  const QFCCANMessage message(0x00402003, 0x8204FEFFFFFFFCFF);
  {
    MessageCapture cap;
    EXPECT_EQ(can.SendMessage(&message), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
    EXPECT_EQ(can.SendMessage(nullptr), E_FAULTBOX_NULL_POINTER);
    EXPECT_EQ(cap.Numbers(), (std::vector<int>{54, 35}));
    EXPECT_TRUE(modules.Take().empty());
  }
  ASSERT_EQ(can.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(can.SendMessage(&message, 0, true), FAULTBOX_OK);
  const auto frames = modules.Take();
  ASSERT_EQ(frames.size(), 1u);
  EXPECT_EQ(frames[0].frameType, kCanFrameData);
  EXPECT_TRUE(frames[0].IsExtended());
  EXPECT_EQ(frames[0].identifier, 0x00402003u);
  EXPECT_EQ(frames[0].length, 8);
  EXPECT_EQ(std::vector<std::uint8_t>(frames[0].data, frames[0].data + 8),
            (std::vector<std::uint8_t>{0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}));
}

TEST_F(CANTransferTest, AFrameTheLayerRefusesIsNotSuccess) {
  static const bool registered =
      CanAccess::RegisterDriver("fbtest-refusing", std::make_shared<RefusingDriver>());
  ASSERT_TRUE(registered);
  struct Case {
    const char* target;
    std::uint32_t identifier;
  };
  for (const Case& c : {Case{"virtual:", 0x20000000}, Case{"fbtest-refusing:", 0x00402003}}) {
    SCOPED_TRACE(c.target);
    Route(c.target + bus_);
    QFCCANTransferInterface can;
    ASSERT_EQ(can.Connect(true, 0, 0), FAULTBOX_OK);
    MessageCapture cap;
    const QFCCANMessage message(c.identifier, 0x8205000000000000);
    EXPECT_EQ(can.SendMessage(&message), E_FAULTBOX_MSG_WAS_NOT_TRANSMITED);
    EXPECT_EQ(cap.Numbers(), std::vector<int>{190});
  }
}

TEST_F(CANTransferTest, ReceiveKeepsTheLastDataFramePerIdentifier) {
  bench_.SetSetting("Info", "1");
  Peer peer(bus_);
  QFCCANTransferInterface can;
  QFCCANReceivedMap received;
  {
    MessageCapture cap;
    EXPECT_EQ(can.Receive(received), E_FAIL);  // not connected
    EXPECT_EQ(cap.Numbers(), std::vector<int>{35});
  }
  ASSERT_EQ(can.Connect(true, 0, 0), FAULTBOX_OK);
  EXPECT_EQ(can.Receive(received), E_FAULTBOX_TIME_OUT);

  peer.Send(0x00412003, 0x4000010000000000);
  peer.Send(0x00412003, 0x4000140000000001);
  peer.Send(0x00412004, 0, kCanFrameRemote);
  MessageCapture cap;
  EXPECT_EQ(can.Receive(received), FAULTBOX_OK);
  ASSERT_EQ(received.size(), 1u);
  EXPECT_EQ(received.at(0x00412003)->GetData(), 0x4000140000000001u);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{81});
  EXPECT_EQ(
      cap.records[0].first,
      "Received Messages: 3 (Data msg: 2, Error msg: 0, BUS status Msg: 0, Remote msg: 1, Unknow msg: 0)");
}

// A wait (3 passes) for the answers of FIU modules 3 and 4 to frames sent
// before: the bus holds the answers `first`, then as many frames of a
// talkative third party as fill `fullPasses` reads, then the answers `later`.
struct WaitCase {
  const char* name;
  std::vector<std::pair<std::uint32_t, std::uint64_t>> first;
  std::uint32_t fullPasses;
  std::vector<std::pair<std::uint32_t, std::uint64_t>> later;
  HRESULT result;
  std::vector<int> messages;
  const char* text1 = "";
  const char* text2 = "";
};

class CANWaitTest : public CANTransferTest, public ::testing::WithParamInterface<WaitCase> {};

TEST_P(CANWaitTest, EvaluatesTheAnswers) {
  const WaitCase& c = GetParam();
  bench_.SetSetting("Timeout", "3");
  Peer peer(bus_);
  QFCCANTransferInterface can;
  ASSERT_EQ(can.Connect(true, 0, 0), FAULTBOX_OK);
  const QFCCANMessage three(Id(kModuleFIU, 3), 0), four(Id(kModuleFIU, 4), 0);
  auto answer = [&](const auto& answers) {
    for (const auto& [module, data] : answers)
      peer.Send(QFCCANMessage::AnswerIdentifierOf(Id(kModuleFIU, module)), data);
  };
  answer(c.first);
  for (auto n = c.first.size(); n < c.fullPasses * QFCCANTransferInterface::kReceiveRoom; ++n)
    peer.Send(0x1234, 0);
  answer(c.later);

  MessageCapture cap;
  EXPECT_EQ(can.WaitForAnswers({{three.GetIdentifier(), &three}, {four.GetIdentifier(), &four}}), c.result);
  EXPECT_EQ(cap.Numbers(), c.messages);
  if (!cap.records.empty()) {
    EXPECT_EQ(cap.records[0].first, c.text1);
    EXPECT_EQ(cap.records[0].second, c.text2);
  }
}

const WaitCase kWaitCases[] = {
    {"BothAnswer", {{4, kAccepted}, {3, kAccepted}}, 0, {}, FAULTBOX_OK, {}},
    // Counted in the first pass, not needed again in the second.
    {"AnswersInTwoPasses", {{3, kAccepted}}, 1, {{4, kAccepted}}, FAULTBOX_OK, {}},
    {"Refused", {{3, kAccepted}, {4, kRefused}}, 0, {}, E_FAIL, {107}, "0x4", "0x4000140000000000"},
    {"Garbled", {{3, kGarbled}}, 0, {}, E_FAULTBOX_RECEIVE_MESSAGE, {101}, "0x3", "0x8000010000000000"},
    {"Silence", {}, 0, {}, E_FAULTBOX_TIME_OUT, {}},
    {"SilentAfterOneAnswered", {{3, kAccepted}}, 0, {}, E_FAULTBOX_TIME_OUT, {}},
    // Frames come in every pass, but never from module 4.
    {"OneNeverAnswers", {{3, kAccepted}}, 3, {}, E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING, {108}, "4"},
};

INSTANTIATE_TEST_SUITE_P(Cases, CANWaitTest, ::testing::ValuesIn(kWaitCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST_F(CANTransferTest, WaitWithoutMessagesToAwait) {
  QFCCANTransferInterface can;
  MessageCapture cap;
  EXPECT_EQ(can.WaitForAnswers({}), E_FAULTBOX_MSG_WAS_NOT_TRANSMITED);
  EXPECT_EQ(can.WaitForAnswers({{1, nullptr}}), E_FAULTBOX_EVALUATE_MESSAGE);
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{65, 35}));
}

// ---- the KR60 pattern's sending

// Two steps: the FIU, two LOAD modules and the RSIM in step 1 (their
// commits listed FIU, LOAD, RSIM), the FIU and one LOAD module in step 2.
QFCMessageList TwoSteps() {
  QFCMessageList list;
  auto add = [&](std::int32_t step, std::uint32_t type, std::uint32_t address) {
    auto m = std::make_unique<QFCCANMessage>(Id(type, address), 0x8204FEFFFFFFFFFF);
    m->SetStep(step);
    m->SetModuleType(type);
    if (address == 0) m->SetMessageKind(QFCCANMessage::kCommitMessage);
    list.push_back(std::move(m));
  };
  add(1, kModuleFIU, 0x27), add(1, kModuleFIU, 0x27), add(1, kModuleFIU, 0);
  add(1, kModuleLOAD, 0x12), add(1, kModuleLOAD, 0x12), add(1, kModuleLOAD, 0x13), add(1, kModuleLOAD, 0);
  add(1, kModuleRSIM, 0x5), add(1, kModuleRSIM, 0);
  add(2, kModuleFIU, 0x27), add(2, kModuleFIU, 0), add(2, kModuleLOAD, 0x12), add(2, kModuleLOAD, 0);
  return list;
}

const std::uint32_t kFiu = Id(kModuleFIU, 0x27), kLoad12 = Id(kModuleLOAD, 0x12),
                    kLoad13 = Id(kModuleLOAD, 0x13), kRsim = Id(kModuleRSIM, 5),
                    kFiuCommit = Id(kModuleFIU, 0), kLoadCommit = Id(kModuleLOAD, 0),
                    kRsimCommit = Id(kModuleRSIM, 0);

class KR60TransferTest : public CANTransferTest {
 protected:
  KR60TransferTest() : kr60_({{"P1", "Engine", "1"}}), modules_(bus_), pattern_(kr60_.Create("Sending")) {}
  ~KR60TransferTest() override { can()->Connect(false, 0, 0); }

  HRESULT Transfer(bool activate) {
    QFCMessageList list = TwoSteps();
    return pattern_->TransferMessages(list, activate);
  }
  QFCAbstractTransferInterface* can() { return kr60_.system()->GetTransferInterface(); }

  test::KR60Bench kr60_;
  Peer modules_;
  QFCKR60FailurePattern* pattern_;
};

TEST_F(KR60TransferTest, StepByStepWithTheCommitsInTypeOrder) {
  {
    MessageCapture cap;
    EXPECT_EQ(Transfer(true), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
    EXPECT_EQ(cap.Numbers(), std::vector<int>{120});
  }
  ASSERT_EQ(can()->Connect(true, 0, 0), FAULTBOX_OK);
  modules_.Play({});
  // Step 2's LOAD commit is awaited from module 0x12 alone: 0x13 got nothing then.
  EXPECT_EQ(Transfer(true), FAULTBOX_OK);
  const std::vector<std::uint32_t> step1 = {kFiu, kFiu, kLoad12, kLoad12, kLoad13, kRsim};
  const std::vector<std::uint32_t> step2 = {kFiu, kLoad12};
  std::vector<std::uint32_t> expected = step1;
  expected.insert(expected.end(), {kRsimCommit, kLoadCommit, kFiuCommit});
  expected.insert(expected.end(), step2.begin(), step2.end());
  expected.insert(expected.end(), {kLoadCommit, kFiuCommit});
  EXPECT_EQ(modules_.Heard(), expected);

  EXPECT_EQ(Transfer(false), FAULTBOX_OK);
  expected.insert(expected.end(), step1.begin(), step1.end());
  expected.insert(expected.end(), {kFiuCommit, kLoadCommit, kRsimCommit});
  expected.insert(expected.end(), step2.begin(), step2.end());
  expected.insert(expected.end(), {kFiuCommit, kLoadCommit});
  EXPECT_EQ(modules_.Heard(), expected);
}

struct FailureCase {
  const char* name;
  std::map<std::uint32_t, std::uint64_t> behaviour;
  HRESULT result;
  std::size_t sent;  // frames on the bus when the transfer ended
  int message;
};

class KR60FailureTest : public KR60TransferTest, public ::testing::WithParamInterface<FailureCase> {};

TEST_P(KR60FailureTest, TheFirstFailureEndsTheTransfer) {
  const FailureCase& c = GetParam();
  bench_.SetSetting("Timeout", "3");
  ASSERT_EQ(can()->Connect(true, 0, 0), FAULTBOX_OK);
  modules_.Play(c.behaviour);
  MessageCapture cap;
  EXPECT_EQ(Transfer(true), c.result);
  // The frame that failed was heard, and nothing after it was sent.
  EXPECT_EQ(modules_.HeardAtLeast(c.sent).size(), c.sent);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{c.message});
}

const FailureCase kFailureCases[] = {
    {"SilentModule", {{0x13, 0}}, E_FAULTBOX_TIME_OUT, 5, 69},
    {"RefusingModule", {{0x5, kRefused}}, E_FAIL, 6, 107},
    {"GarblingModule", {{0x27, kGarbled}}, E_FAULTBOX_RECEIVE_MESSAGE, 1, 101},
};

INSTANTIATE_TEST_SUITE_P(Cases, KR60FailureTest, ::testing::ValuesIn(kFailureCases),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace faultbox

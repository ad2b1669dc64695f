// Tests of the CAN access layer: one back-to-back suite that every driver
// must pass (two handles on one bus), the layer's own rules (handles,
// acceptance, init access, queue room, events), the channel table, the
// trace, the socketcand text protocol and the hub program.
#include "platform/CanAccess.h"

#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <optional>
#include <sstream>
#include <thread>

#include "platform/Settings.h"
#include "platform/can/SocketcandProtocol.h"
#include "support/BackgroundProcess.h"
#include "support/RunProcess.h"
#include "systems/QFCSystemProperty.h"
#include "TestPaths.h"

namespace faultbox {
namespace {

using namespace std::chrono_literals;

// A safety net for waits that should end at once; never an expectation about speed.
constexpr auto kPatience = 20s;

std::string UniqueBus(const char* stem) {
  static std::atomic<int> counter{0};
  return std::string(stem) + "-" + std::to_string(::getpid()) + "-" + std::to_string(counter++);
}

CanFrameRecord Frame(std::uint32_t id, std::vector<std::uint8_t> data, bool extended = true) {
  CanFrameRecord f;
  f.frameType = kCanFrameData;
  f.flags = extended ? kCanFlagExtended : 0;
  f.identifier = id;
  f.length = static_cast<std::uint8_t>(data.size());
  std::copy(data.begin(), data.end(), f.data);
  f.options = 4;
  return f;
}

// The hub program on a free port, stopped with the object.
class HubProcess {
 public:
  HubProcess() : process_({FAULTBOX_CANHUB_PATH, "--port", "0"}) {
    port_ = std::atoi(process_.ReadLine().c_str());
  }
  ~HubProcess() { Stop(); }
  // The exit status of the hub, which must end cleanly on SIGTERM.
  int Stop() {
    if (process_.Started()) status_ = process_.Stop(SIGTERM);
    return status_;
  }
  int Port() const { return port_; }

 private:
  test::BackgroundProcess process_;
  int port_ = 0;
  int status_ = -1;
};

HubProcess& SharedHub() {
  static HubProcess hub;
  return hub;
}

bool KernelInterfaceExists(const char* name) {
  std::ifstream in(std::string("/sys/class/net/") + name + "/type");
  std::string type;
  return std::getline(in, type) && type == "280";
}

// Each test reads an empty settings file of its own and traces nothing.
class CanTest : public ::testing::Test {
 protected:
  void SetUp() override {
    if (const char* v = std::getenv(CanFrameTrace::kEnvironment)) oldTrace_ = v;
    ::unsetenv(CanFrameTrace::kEnvironment);
    Settings::SetPathOverride(dir_.File("faultbox.ini"));
    CanChannelTable::SetOverride({});
  }
  void TearDown() override {
    for (CanHandle h : handles_) CanAccess::UnRegisterInterface(h);
    CanChannelTable::SetOverride({});
    if (oldTrace_)
      ::setenv(CanFrameTrace::kEnvironment, oldTrace_->c_str(), 1);
    else
      ::unsetenv(CanFrameTrace::kEnvironment);
    CanFrameTrace::Configure();
    Settings::SetPathOverride("");
  }

  // An active handle on `target` that signals `event`.
  struct Endpoint {
    CanHandle handle = 0;
    std::shared_ptr<NamedEvent> event;
  };
  Endpoint Open(const std::string& target, std::uint32_t queueSize = 0) {
    Endpoint e;
    EXPECT_EQ(CanAccess::RegisterInterfaceTarget(target, &e.handle), CanResult::kOk)
        << CanAccess::LastErrorText();
    handles_.push_back(e.handle);
    std::uint32_t access = 0;
    EXPECT_EQ(CanAccess::InitInterface(e.handle, 2, queueSize, &access), CanResult::kOk);
    e.event = NamedEvent::CreateFirstFree();
    EXPECT_EQ(CanAccess::SetEventNotification(e.handle, e.event, 1), CanResult::kOk);
    EXPECT_EQ(CanAccess::ActivateChannel(e.handle), CanResult::kOk);
    return e;
  }
  void Close(CanHandle h) {
    EXPECT_EQ(CanAccess::UnRegisterInterface(h), CanResult::kOk);
    std::erase(handles_, h);
  }

  // Waits for the event until `count` frames are read. One signal may stand
  // for many frames, so each wake-up empties the queue.
  static std::vector<CanFrameRecord> Receive(const Endpoint& e, std::size_t count) {
    std::vector<CanFrameRecord> got;
    while (got.size() < count) {
      if (e.event->Wait(kPatience) != NamedEvent::WaitResult::kSignalled) break;
      for (;;) {
        std::vector<CanFrameRecord> buf(64);
        std::uint32_t n = static_cast<std::uint32_t>(buf.size());
        EXPECT_EQ(CanAccess::ReadReceiveQueue(e.handle, buf.data(), &n), CanResult::kOk);
        if (n == 0) break;
        got.insert(got.end(), buf.begin(), buf.begin() + n);
      }
    }
    return got;
  }
  static std::vector<CanFrameRecord> Drain(const Endpoint& e) {
    std::vector<CanFrameRecord> buf(4096);
    std::uint32_t n = static_cast<std::uint32_t>(buf.size());
    EXPECT_EQ(CanAccess::ReadReceiveQueue(e.handle, buf.data(), &n), CanResult::kOk);
    buf.resize(n);
    return buf;
  }

  test::TempDir dir_;
  std::vector<CanHandle> handles_;
  std::optional<std::string> oldTrace_;
};

void ExpectSameFrame(const CanFrameRecord& got, const CanFrameRecord& want) {
  EXPECT_EQ(got.frameType, want.frameType);
  EXPECT_EQ(got.identifier, want.identifier);
  EXPECT_EQ(got.IsExtended(), want.IsExtended());
  ASSERT_EQ(got.length, want.length);
  EXPECT_EQ(std::memcmp(got.data, want.data, want.length), 0) << "identifier " << want.identifier;
  EXPECT_NE(got.timeStamp, 0u);
}

// ---------------------------------------------------------------- back to back, every driver

class CanBackToBack : public CanTest, public ::testing::WithParamInterface<const char*> {
 protected:
  void SetUp() override {
    CanTest::SetUp();
    const std::string driver = GetParam();
    if (driver == "virtual") {
      target_ = "virtual:" + UniqueBus("b2b");
    } else if (driver == "tcp") {
      ASSERT_GT(SharedHub().Port(), 0) << "the hub did not start";
      target_ = "tcp:127.0.0.1:" + std::to_string(SharedHub().Port()) + "/" + UniqueBus("b2b");
    } else if (KernelInterfaceExists("vcan0")) {
      target_ = "socketcan:vcan0";
    } else {
      GTEST_SKIP() << "no vcan0 (modprobe vcan; ip link add vcan0 type vcan; ip link set vcan0 up)";
    }
    a_ = Open(target_);
    b_ = Open(target_);
  }
  std::string target_;
  Endpoint a_, b_;
};

TEST_P(CanBackToBack, FramesArriveUnchangedInBothDirections) {
  const std::vector<CanFrameRecord> frames = {
      Frame(0, {}),
      Frame(kCanMaxExtendedId, {0, 1, 2, 3, 4, 5, 6, 0xFF}),
      Frame(0x00402003, {0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}),
      Frame(0x7FF, {0xAA}, false),
      Frame(0, {0x01, 0x02}, false),
  };
  for (const auto& [from, to] : {std::pair{&a_, &b_}, std::pair{&b_, &a_}}) {
    for (const auto& f : frames) ASSERT_EQ(CanAccess::TransmitMessage(from->handle, f), CanResult::kOk);
    const auto got = Receive(*to, frames.size());
    ASSERT_EQ(got.size(), frames.size());
    for (std::size_t i = 0; i < frames.size(); ++i) ExpectSameFrame(got[i], frames[i]);
  }
}

TEST_P(CanBackToBack, OrderIsKeptAndOwnFramesNeverComeBack) {
  constexpr std::uint32_t kCount = 300;
  for (std::uint32_t i = 0; i < kCount; ++i)
    ASSERT_EQ(CanAccess::TransmitMessage(a_.handle, Frame(i, {static_cast<std::uint8_t>(i)})),
              CanResult::kOk);
  const auto got = Receive(b_, kCount);
  ASSERT_EQ(got.size(), kCount);
  for (std::uint32_t i = 0; i < kCount; ++i) ASSERT_EQ(got[i].identifier, i);
  // An answer from b reaches a after anything a's own frames could have brought back.
  ASSERT_EQ(CanAccess::TransmitMessage(b_.handle, Frame(0x00412003, {0x40, 0, 1})), CanResult::kOk);
  const auto back = Receive(a_, 1);
  ASSERT_FALSE(back.empty());
  EXPECT_EQ(back[0].identifier, 0x00412003u);
}

TEST_P(CanBackToBack, ArrivalWakesAWaiter) {
  std::atomic<bool> woken{false};
  std::thread waiter([&] { woken = b_.event->Wait(kPatience) == NamedEvent::WaitResult::kSignalled; });
  ASSERT_EQ(CanAccess::TransmitMessage(a_.handle, Frame(0x00402000, {0x81, 0})), CanResult::kOk);
  waiter.join();
  EXPECT_TRUE(woken);
  const auto got = Drain(b_);
  ASSERT_EQ(got.size(), 1u);
  EXPECT_EQ(got[0].identifier, 0x00402000u);
}

TEST_P(CanBackToBack, AcceptanceFilterDropsOtherIdentifiers) {
  // Only answers (direction bits 01 at bits 16..17) pass, as the transfer interface wants them.
  ASSERT_EQ(CanAccess::SetAcceptance(b_.handle, 0xFFFF, 0xFFFF, 0x00010000, 0x00030000), CanResult::kOk);
  for (const auto& f : {Frame(0x00402003, {1}), Frame(0x123, {2}, false), Frame(0x00412003, {3})})
    ASSERT_EQ(CanAccess::TransmitMessage(a_.handle, f), CanResult::kOk);
  const auto got = Receive(b_, 1);
  ASSERT_EQ(got.size(), 1u);
  EXPECT_EQ(got[0].identifier, 0x00412003u);
}

INSTANTIATE_TEST_SUITE_P(Drivers, CanBackToBack, ::testing::Values("virtual", "tcp", "socketcan"),
                         [](const auto& info) { return std::string(info.param); });

// ---------------------------------------------------------------- the layer's own rules

TEST_F(CanTest, RefusesWhatCannotBeSent) {
  CanHandle h = 0;
  ASSERT_EQ(CanAccess::RegisterInterfaceTarget("virtual:" + UniqueBus("refuse"), &h), CanResult::kOk);
  handles_.push_back(h);
  EXPECT_EQ(CanAccess::TransmitMessage(h, Frame(1, {})), CanResult::kNotActive);
  ASSERT_EQ(CanAccess::ActivateChannel(h), CanResult::kOk);
  CanFrameRecord errorFrame = Frame(1, {});
  errorFrame.frameType = kCanFrameError;
  CanFrameRecord nine = Frame(1, {});
  nine.length = 9;
  const struct {
    const char* what;
    CanFrameRecord frame;
  } cases[] = {
      {"29-bit identifier too large", Frame(kCanMaxExtendedId + 1, {})},
      {"11-bit identifier too large", Frame(kCanMaxStandardId + 1, {}, false)},
      {"more than 8 bytes", nine},
      {"error frame", errorFrame},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(CanAccess::TransmitMessage(h, c.frame), CanResult::kInvalidParameter) << c.what;
    EXPECT_NE(CanAccess::LastErrorText(), "") << c.what;
  }
  Close(h);
  CanFrameRecord buf[1];
  std::uint32_t n = 1, access = 0;
  EXPECT_EQ(CanAccess::TransmitMessage(h, Frame(1, {})), CanResult::kInvalidHandle);
  EXPECT_EQ(CanAccess::ReadReceiveQueue(h, buf, &n), CanResult::kInvalidHandle);
  EXPECT_EQ(CanAccess::InitInterface(h, 2, 0, &access), CanResult::kInvalidHandle);
  EXPECT_EQ(CanAccess::UnRegisterInterface(h), CanResult::kInvalidHandle);
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("no-colon", &h), CanResult::kInvalidParameter);
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("nosuchdriver:x", &h), CanResult::kNoChannel);
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("virtual:has<bracket", &h), CanResult::kInvalidParameter);
}

TEST_F(CanTest, InactiveChannelsAndFullQueuesLoseFrames) {
  const std::string bus = "virtual:" + UniqueBus("queue");
  Endpoint a = Open(bus), b = Open(bus, 2);
  ASSERT_EQ(CanAccess::DeactivateChannel(b.handle), CanResult::kOk);
  ASSERT_EQ(CanAccess::TransmitMessage(a.handle, Frame(1, {})), CanResult::kOk);
  EXPECT_TRUE(Drain(b).empty());
  ASSERT_EQ(CanAccess::ActivateChannel(b.handle), CanResult::kOk);
  for (std::uint32_t id : {2, 3, 4})
    ASSERT_EQ(CanAccess::TransmitMessage(a.handle, Frame(id, {})), CanResult::kOk);
  // Room for two: the oldest two stay, read one at a time.
  CanFrameRecord one;
  std::uint32_t n = 1;
  ASSERT_EQ(CanAccess::ReadReceiveQueue(b.handle, &one, &n), CanResult::kOk);
  ASSERT_EQ(n, 1u);
  EXPECT_EQ(one.identifier, 2u);
  auto rest = Drain(b);
  ASSERT_EQ(rest.size(), 1u);
  EXPECT_EQ(rest[0].identifier, 3u);
  ASSERT_EQ(CanAccess::TransmitMessage(a.handle, Frame(5, {})), CanResult::kOk);
  ASSERT_EQ(CanAccess::FlushReceiveQueue(b.handle), CanResult::kOk);
  EXPECT_TRUE(Drain(b).empty());
}

TEST_F(CanTest, InitAccessBelongsToTheFirstHandleOfABus) {
  const std::string bus = "virtual:" + UniqueBus("timing");
  CanHandle first = 0, second = 0;
  ASSERT_EQ(CanAccess::RegisterInterfaceTarget(bus, &first), CanResult::kOk);
  handles_.push_back(first);
  ASSERT_EQ(CanAccess::RegisterInterfaceTarget(bus, &second), CanResult::kOk);
  handles_.push_back(second);
  std::uint32_t access1 = 9, access2 = 9;
  ASSERT_EQ(CanAccess::InitInterface(first, 2, 0x8000, &access1), CanResult::kOk);
  ASSERT_EQ(CanAccess::InitInterface(second, 2, 0x8000, &access2), CanResult::kOk);
  EXPECT_EQ(access1, 1u);
  EXPECT_EQ(access2, 0u);
  CanBaudrateInfo info;
  ASSERT_EQ(CanAccess::GetCurrentBaudrate(second, &info), CanResult::kOk);
  EXPECT_EQ(info.bitRate, 125000u);
  EXPECT_EQ(CanAccess::SetBusTimingRegister(second, 0x43, 0x14), CanResult::kNoInitAccess);
  EXPECT_EQ(CanAccess::SetBusTimingRegister(first, 0x143, 0x14), CanResult::kInvalidParameter);
  ASSERT_EQ(CanAccess::SetBusTimingRegister(first, 0x43, 0x14), CanResult::kOk);
  ASSERT_EQ(CanAccess::GetCurrentBaudrate(second, &info), CanResult::kOk);
  EXPECT_EQ(info.bitRate, 250000u);
  EXPECT_EQ(info.busTiming0, 0x43);
  // The access passes on when its holder leaves.
  Close(first);
  ASSERT_EQ(CanAccess::InitInterface(second, 2, 0x8000, &access2), CanResult::kOk);
  EXPECT_EQ(access2, 1u);
}

TEST(CanBitRate, SjaRegistersAt16MHz) {
  const struct {
    std::uint8_t btr0, btr1;
    std::uint32_t rate;
  } cases[] = {{0x47, 0x14, 125000},
               {0x43, 0x14, 250000},
               {0x41, 0x14, 500000},
               {0x40, 0x14, 1000000},
               {0x49, 0x1C, 50000}};
  for (const auto& c : cases) EXPECT_EQ(CanBitRateFromBusTiming(c.btr0, c.btr1), c.rate) << int(c.btr0);
}

TEST(CanNamedEvent, FirstFreeNumberIsTaken) {
  const char* format = "FB_TEST_EVENT_%i";
  auto e0 = NamedEvent::CreateFirstFree(format);
  auto e1 = NamedEvent::CreateFirstFree(format);
  ASSERT_TRUE(e0 && e1);
  EXPECT_EQ(e0->Name(), "FB_TEST_EVENT_0");
  EXPECT_EQ(e1->Name(), "FB_TEST_EVENT_1");
  EXPECT_EQ(NamedEvent::Open("FB_TEST_EVENT_1"), e1);
  EXPECT_EQ(NamedEvent::Create("FB_TEST_EVENT_1"), nullptr);
  e0.reset();
  EXPECT_EQ(NamedEvent::Open("FB_TEST_EVENT_0"), nullptr);
  auto again = NamedEvent::CreateFirstFree(format);
  EXPECT_EQ(again->Name(), "FB_TEST_EVENT_0");
  EXPECT_EQ(NamedEvent::CreateFirstFree(format)->Name(), "FB_TEST_EVENT_2");
  EXPECT_EQ(NamedEvent::CreateFirstFree("no mark"), nullptr);
  EXPECT_EQ(NamedEvent::CreateFirstFree()->Name().rfind("FS_CAN_RECEIVE_EVENT_", 0), 0u);
}

TEST(CanNamedEvent, AutoResetKeepsOneSignal) {
  auto e = NamedEvent::Create("FB_TEST_AUTO_RESET");
  ASSERT_TRUE(e);
  EXPECT_EQ(e->Wait(0ms), NamedEvent::WaitResult::kTimedOut);
  e->Set();
  e->Set();
  EXPECT_EQ(e->Wait(0ms), NamedEvent::WaitResult::kSignalled);
  EXPECT_EQ(e->Wait(0ms), NamedEvent::WaitResult::kTimedOut);
  e->Set();
  e->Reset();
  EXPECT_EQ(e->Wait(0ms), NamedEvent::WaitResult::kTimedOut);
}

// ---------------------------------------------------------------- channel table

TEST_F(CanTest, ChannelTableChoosesTheMostSpecificEntry) {
  const std::string section = CanChannelTable::kSection;
  for (const auto& [key, value] : std::vector<std::pair<std::string, std::string>>{
           {"*,*,*", "virtual:any"},
           {"1,1,*", "virtual:board1"},
           {"1,1,2", "tcp:127.0.0.1:29536/exact"},
           {"fdtCAN_IF_LINKBOX_USB, 3, 4", "socketcan:can7"},
           {"1, 1, 2", "virtual:second-of-equal"},
           {"1,256,1", "virtual:bad-board"},
           {"1,2", "virtual:short"},
           {"1,2,3", "nocolon"},
       })
    ASSERT_TRUE(Settings::SetString(section, key, value));
  std::vector<std::string> problems;
  EXPECT_EQ(CanChannelTable::Read(&problems).size(), 5u);
  EXPECT_EQ(problems.size(), 3u);
  const struct {
    std::uint32_t type;
    std::uint8_t board, channel;
    const char* want;
  } cases[] = {
      {1, 1, 2, "tcp:127.0.0.1:29536/exact"},
      {1, 1, 9, "virtual:board1"},
      {4, 3, 4, "socketcan:can7"},
      {4, 1, 2, "virtual:any"},
      {7, 0, 0, "virtual:any"},
  };
  for (const auto& c : cases) {
    auto target = CanChannelTable::Lookup(c.type, c.board, c.channel);
    ASSERT_TRUE(target) << c.want;
    EXPECT_EQ(target->Text(), c.want);
  }
  CanChannelTable::SetOverride({{{-1, -1, -1}, {"virtual", "sim"}}});
  EXPECT_EQ(CanChannelTable::Lookup(1, 1, 2)->Text(), "virtual:sim");
}

TEST_F(CanTest, WithoutEntriesBoardOneIsTheKernelsInterfaces) {
  EXPECT_EQ(CanChannelTable::Lookup(1, 1, 1)->Text(), "socketcan:can0");
  EXPECT_EQ(CanChannelTable::Lookup(4, 1, 3)->Text(), "socketcan:can2");
  EXPECT_FALSE(CanChannelTable::Lookup(1, 2, 1));
  EXPECT_FALSE(CanChannelTable::Lookup(1, 1, 0));
  if (KernelInterfaceExists("can0")) GTEST_SKIP() << "this machine has can0";
  // A machine without kernel CAN (or without can0) answers "no channel", cleanly.
  CanHandle h = 0;
  EXPECT_EQ(CanAccess::RegisterInterface(1, 1, 1, &h), CanResult::kNoChannel);
  EXPECT_NE(CanAccess::LastErrorText().find("can0"), std::string::npos) << CanAccess::LastErrorText();
  std::uint32_t count = 99;
  ASSERT_EQ(CanAccess::GetAvailableChannels(&count, nullptr), CanResult::kOk);
  EXPECT_EQ(count, 0u);
}

TEST_F(CanTest, TableChannelsAreListedAndOpened) {
  const std::string bus = UniqueBus("table");
  ASSERT_TRUE(Settings::SetString(CanChannelTable::kSection, "1,1,1", "virtual:" + bus));
  ASSERT_TRUE(Settings::SetString(CanChannelTable::kSection, "4,2,7", "tcp:127.0.0.1:1/" + bus));
  std::uint32_t count = 0;
  // Table entries come first; a machine's own canN interfaces may follow.
  ASSERT_EQ(CanAccess::GetAvailableChannels(&count, nullptr), CanResult::kOk);
  ASSERT_GE(count, 2u);
  std::vector<QFTCANInterfaceSettings> records(count + 1);
  const std::uint32_t all = count;
  count = all + 1;
  ASSERT_EQ(CanAccess::GetAvailableChannels(&count, records.data()), CanResult::kOk);
  ASSERT_EQ(count, all);
  EXPECT_EQ(reinterpret_cast<const char*>(records[0].head), "virtual:" + bus);
  EXPECT_EQ(records[1].deviceType, 4u);
  EXPECT_EQ(records[1].firstParameter, 2);
  EXPECT_EQ(records[1].secondParameter, 7);
  count = 1;
  ASSERT_EQ(CanAccess::GetAvailableChannels(&count, records.data()), CanResult::kOk);
  EXPECT_EQ(count, 1u);

  CanHandle viaTable = 0;
  ASSERT_EQ(CanAccess::RegisterInterface(1, 1, 1, &viaTable), CanResult::kOk) << CanAccess::LastErrorText();
  handles_.push_back(viaTable);
  ASSERT_EQ(CanAccess::ActivateChannel(viaTable), CanResult::kOk);
  Endpoint direct = Open("virtual:" + bus);
  ASSERT_EQ(CanAccess::TransmitMessage(viaTable, Frame(0x00402000, {0x81})), CanResult::kOk);
  EXPECT_EQ(Receive(direct, 1).size(), 1u);
}

TEST(CanChannelTarget, Parsing) {
  const struct {
    const char* text;
    bool ok;
    const char* driver;
    const char* iface;
  } cases[] = {
      {"socketcan:can0", true, "socketcan", "can0"},
      {" TCP:127.0.0.1:29536/bench1 ", true, "tcp", "127.0.0.1:29536/bench1"},
      {"virtual:", false, "", ""},
      {":can0", false, "", ""},
      {"can0", false, "", ""},
      {"virtual:a b", false, "", ""},
  };
  for (const auto& c : cases) {
    CanChannelTarget t;
    ASSERT_EQ(ParseCanChannelTarget(c.text, &t), c.ok) << c.text;
    if (!c.ok) continue;
    EXPECT_EQ(t.driver, c.driver);
    EXPECT_EQ(t.interfaceName, c.iface);
  }
}

// ---------------------------------------------------------------- trace

TEST(CanTraceLine, CandumpLogForm) {
  CanFrameRecord remote = Frame(0x123, {}, false);
  remote.frameType = kCanFrameRemote;
  remote.length = 2;
  CanFrameRecord error = Frame(0x4, {0, 0x10}, true);
  error.frameType = kCanFrameError;
  const struct {
    CanFrameRecord frame;
    const char* line;
  } cases[] = {
      {Frame(0x00402003, {0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}),
       "(1.000002) can0 00402003#8204FEFFFFFFFCFF"},
      {Frame(0, {}), "(1.000002) can0 00000000#"},
      {Frame(0x7FF, {0xa}, false), "(1.000002) can0 7FF#0A"},
      {remote, "(1.000002) can0 123#R"},
      {error, "(1.000002) can0 20000004#0010"},
  };
  for (auto c : cases) {
    c.frame.timeStamp = 1000002;
    EXPECT_EQ(CanFrameTrace::FormatLine(c.frame, "can0"), c.line);
  }
}

TEST_F(CanTest, TraceRecordsSentAndReceivedFrames) {
  const std::string path = dir_.File("trace.log");
  ::setenv(CanFrameTrace::kEnvironment, path.c_str(), 1);
  const std::string bus = UniqueBus("trace");
  Endpoint a = Open("virtual:" + bus), b = Open("virtual:" + bus);
  ASSERT_TRUE(CanFrameTrace::IsOn());
  ASSERT_EQ(CanAccess::TransmitMessage(a.handle, Frame(0x00402003, {0x82, 0x04})), CanResult::kOk);
  ASSERT_EQ(Receive(b, 1).size(), 1u);
  ::setenv(CanFrameTrace::kEnvironment, "0", 1);
  CanFrameTrace::Configure();
  EXPECT_FALSE(CanFrameTrace::IsOn());
  std::istringstream lines(test::ReadText(path));
  int count = 0;
  for (std::string line; std::getline(lines, line); ++count) {
    const std::string tail = " " + bus + " 00402003#8204";
    EXPECT_EQ(line.front(), '(') << line;
    EXPECT_EQ(line.substr(line.size() - tail.size()), tail) << line;
  }
  EXPECT_EQ(count, 2);  // sent by a, received by b
}

// ---------------------------------------------------------------- socketcand protocol

std::vector<std::string> Words(const std::string& element) {
  SocketcandParser p;
  p.Feed(element);
  SocketcandElement e;
  std::string error;
  EXPECT_EQ(p.Next(&e, &error), SocketcandParser::Status::kElement) << element << ": " << error;
  return e.words;
}

// Feeds `stream` in pieces and collects elements ("ERR" for each error).
std::vector<std::string> ParseStream(const std::string& stream, std::size_t cut) {
  SocketcandParser p;
  std::vector<std::string> out;
  auto drain = [&] {
    SocketcandElement e;
    std::string error;
    for (;;) {
      auto s = p.Next(&e, &error);
      if (s == SocketcandParser::Status::kNeedMore) return;
      if (s == SocketcandParser::Status::kError) {
        out.push_back("ERR");
        continue;
      }
      std::string joined;
      for (const auto& w : e.words) joined += (joined.empty() ? "" : " ") + w;
      out.push_back(joined);
    }
  };
  p.Feed(stream.substr(0, cut));
  drain();
  p.Feed(stream.substr(cut));
  drain();
  return out;
}

TEST(Socketcand, StreamSplitAtEveryByteGivesTheSameElements) {
  const std::string stream =
      "< hi >< ok >\r\n< frame 00402003 1700000000.123456 8204FEFFFFFFFCFF >"
      "<frame 123 1.5 11 22 33>   < send 1FFFFFFF 0 >";
  const std::vector<std::string> want = {"hi", "ok", "frame 00402003 1700000000.123456 8204FEFFFFFFFCFF",
                                         "frame 123 1.5 11 22 33", "send 1FFFFFFF 0"};
  for (std::size_t cut = 0; cut <= stream.size(); ++cut) ASSERT_EQ(ParseStream(stream, cut), want) << cut;
}

TEST(Socketcand, MalformedInputGivesErrorsAndTheParserRecovers) {
  const struct {
    std::string stream;
    std::vector<std::string> want;
  } cases[] = {
      {"garbage< ok >", {"ERR", "ok"}},
      {"< open <ok >", {"ERR", "ok"}},
      {"< >< ok >", {"ERR", "ok"}},
      {">>>< ok >", {"ERR", "ok"}},
      {std::string("\0\xff< ok >", 8), {"ERR", "ok"}},
      {"< " + std::string(3000, 'a') + " >< ok >", {"ERR", "ok"}},
      {"<" + std::string(3000, 'a') + "< ok >", {"ERR", "ok"}},
  };
  for (const auto& c : cases)
    for (std::size_t cut : {std::size_t{0}, c.stream.size() / 2, c.stream.size()})
      EXPECT_EQ(ParseStream(c.stream, cut), c.want) << c.stream.substr(0, 40) << " cut " << cut;
}

TEST(Socketcand, FrameElements) {
  const struct {
    const char* element;
    bool ok;
    std::uint32_t id;
    bool extended;
    std::vector<std::uint8_t> data;
    std::uint64_t stamp;
  } cases[] = {
      {"< frame 00402003 1700000000.123456 8204FEFFFFFFFCFF >",
       true,
       0x00402003,
       true,
       {0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF},
       1700000000123456},
      {"< frame 1fffffff 0.5 82 04 fe >", true, 0x1FFFFFFF, true, {0x82, 0x04, 0xFE}, 500000},
      {"< FRAME 123 1.000001 8 4 0A >", true, 0x123, false, {0x08, 0x04, 0x0A}, 1000001},
      {"< frame 0 2.0 >", true, 0, false, {}, 2000000},
      {"< frame 00000000 2.0 8204 FE >", true, 0, true, {0x82, 0x04, 0xFE}, 2000000},
      {"< frame 7ff 1.0 >", true, 0x7FF, false, {}, 1000000},
      {"< frame 800 1.0 >", true, 0x800, true, {}, 1000000},
      {"< frame 12345678 >", true, 0x12345678, true, {}, 0},
      {"< frame 123456789 1.0 >", false, 0, false, {}, 0},
      {"< frame 20000000 1.0 >", false, 0, false, {}, 0},
      {"< frame 12G 1.0 >", false, 0, false, {}, 0},
      {"< frame 123 1.x >", false, 0, false, {}, 0},
      {"< frame 123 1.0 123 >", false, 0, false, {}, 0},
      {"< frame 123 1.0 11 22 33 44 55 66 77 88 99 >", false, 0, false, {}, 0},
      {"< frame 123 1.0 1122334455667788 99 >", false, 0, false, {}, 0},
      {"< frame >", false, 0, false, {}, 0},
      {"< send 123 0 >", false, 0, false, {}, 0},
  };
  for (const auto& c : cases) {
    SocketcandElement e;
    e.words = Words(c.element);
    CanFrameRecord f;
    std::string error;
    ASSERT_EQ(ParseSocketcandFrame(e, &f, &error), c.ok) << c.element << ": " << error;
    if (!c.ok) {
      EXPECT_FALSE(error.empty());
      continue;
    }
    EXPECT_EQ(f.identifier, c.id) << c.element;
    EXPECT_EQ(f.IsExtended(), c.extended) << c.element;
    EXPECT_EQ(std::vector<std::uint8_t>(f.data, f.data + f.length), c.data) << c.element;
    EXPECT_EQ(f.timeStamp, c.stamp) << c.element;
  }
}

TEST(Socketcand, SendElementsAndRoundTrips) {
  const struct {
    const char* element;
    bool ok;
  } cases[] = {
      {"< send 00402003 8 82 04 FE FF FF FF FC FF >", true},
      {"< send 123 0 >", true},
      {"< send 123 3 112233 >", true},
      {"< send 123 2 11 >", false},
      {"< send 123 9 11 22 33 44 55 66 77 88 99 >", false},
      {"< send 123 x >", false},
      {"< send 123 >", false},
  };
  for (const auto& c : cases) {
    SocketcandElement e;
    e.words = Words(c.element);
    CanFrameRecord f;
    std::string error;
    EXPECT_EQ(ParseSocketcandSend(e, &f, &error), c.ok) << c.element << ": " << error;
  }
  for (const auto& f : {Frame(0x00402003, {0x82, 0x04, 0xFE, 0xFF, 0xFF, 0xFF, 0xFC, 0xFF}), Frame(0, {}),
                        Frame(0x1A, {0x01}, false)}) {
    CanFrameRecord stamped = f;
    stamped.timeStamp = 1700000000000001;
    CanFrameRecord sent, framed;
    std::string error;
    SocketcandElement e;
    e.words = Words(FormatSocketcandSend(f));
    ASSERT_TRUE(ParseSocketcandSend(e, &sent, &error)) << FormatSocketcandSend(f);
    e.words = Words(FormatSocketcandFrame(stamped));
    ASSERT_TRUE(ParseSocketcandFrame(e, &framed, &error)) << FormatSocketcandFrame(stamped);
    ExpectSameFrame(framed, f);
    EXPECT_EQ(framed.timeStamp, stamped.timeStamp);
    EXPECT_EQ(sent.identifier, f.identifier);
    EXPECT_EQ(sent.IsExtended(), f.IsExtended());
    EXPECT_EQ(sent.length, f.length);
  }
  EXPECT_EQ(FormatSocketcandSend(Frame(0x00402003, {0x82, 0x04})), "< send 00402003 2 82 04 >");
  EXPECT_EQ(FormatSocketcandError("a <b> c"), "< error a 'b' c >");
}

// ---------------------------------------------------------------- the hub

// A plain socketcand client: what it sends and what the hub must answer.
class RawClient {
 public:
  explicit RawClient(int port) {
    fd_ = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in a{};
    a.sin_family = AF_INET;
    a.sin_port = htons(static_cast<std::uint16_t>(port));
    a.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    connected_ = ::connect(fd_, reinterpret_cast<sockaddr*>(&a), sizeof a) == 0;
  }
  ~RawClient() { ::close(fd_); }
  bool Connected() const { return connected_; }
  void Send(const std::string& text) {
    ASSERT_EQ(::send(fd_, text.data(), text.size(), MSG_NOSIGNAL), ssize_t(text.size()));
  }
  // The next element, or "" when the hub sends none in time.
  std::string Next() {
    SocketcandElement e;
    std::string error;
    for (;;) {
      const auto s = parser_.Next(&e, &error);
      if (s == SocketcandParser::Status::kElement) {
        std::string joined;
        for (const auto& w : e.words) joined += (joined.empty() ? "" : " ") + w;
        return joined;
      }
      if (s == SocketcandParser::Status::kError) return "parse error: " + error;
      pollfd p{fd_, POLLIN, 0};
      if (::poll(&p, 1, static_cast<int>(std::chrono::milliseconds(kPatience).count())) != 1) return "";
      char buf[512];
      const ssize_t n = ::recv(fd_, buf, sizeof buf, 0);
      if (n <= 0) return "";
      parser_.Feed(std::string_view(buf, static_cast<std::size_t>(n)));
    }
  }

 private:
  int fd_ = -1;
  bool connected_ = false;
  SocketcandParser parser_;
};

TEST_F(CanTest, HubConversationWithASocketcandClient) {
  HubProcess hub;
  ASSERT_GT(hub.Port(), 0);
  RawClient client(hub.Port());
  ASSERT_TRUE(client.Connected());
  EXPECT_EQ(client.Next(), "hi");
  const struct {
    const char* send;
    const char* answerStart;
  } steps[] = {
      {"< rawmode >", "error"},  {"< open a b >", "error"},
      {"< open hubbus >", "ok"}, {"< send 123 1 11 >", "error"},
      {"< echo >", "echo"},      {"< rawmode >", "ok"},
      {"noise", "error"},        {"< send 123 2 11 >", "error"},
      {"< what >", "error"},
  };
  for (const auto& s : steps) {
    client.Send(s.send);
    EXPECT_EQ(client.Next().rfind(s.answerStart, 0), 0u) << s.send;
  }
  // A layer handle on the same bus reaches the plain client, and the other way round.
  Endpoint e = Open("tcp:127.0.0.1:" + std::to_string(hub.Port()) + "/hubbus");
  ASSERT_EQ(CanAccess::TransmitMessage(e.handle, Frame(0x00402003, {0x82, 0x04})), CanResult::kOk);
  const std::string frame = client.Next();
  EXPECT_EQ(frame.rfind("frame 00402003 ", 0), 0u) << frame;
  EXPECT_EQ(frame.substr(frame.size() - 5), " 8204") << frame;
  client.Send("< send 412003 1 40 >");
  const auto got = Receive(e, 1);
  ASSERT_EQ(got.size(), 1u);
  EXPECT_EQ(got[0].identifier, 0x412003u);
  Close(e.handle);
  EXPECT_EQ(hub.Stop(), 0);
}

TEST_F(CanTest, MissingHubAnswersNoChannel) {
  int port = 0;
  {
    HubProcess hub;
    port = hub.Port();
    ASSERT_GT(port, 0);
  }
  CanHandle h = 0;
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("tcp:127.0.0.1:" + std::to_string(port) + "/gone", &h),
            CanResult::kNoChannel);
  EXPECT_NE(CanAccess::LastErrorText().find("hub"), std::string::npos) << CanAccess::LastErrorText();
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("tcp:127.0.0.1:99999/x", &h), CanResult::kInvalidParameter);
}

TEST_F(CanTest, SocketCanWithoutTheInterfaceAnswersNoChannel) {
  if (KernelInterfaceExists("vcan0")) GTEST_SKIP() << "this machine has vcan0";
  CanHandle h = 0;
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("socketcan:vcan0", &h), CanResult::kNoChannel);
  EXPECT_EQ(CanAccess::RegisterInterfaceTarget("socketcan:../lo", &h), CanResult::kNoChannel);
  EXPECT_NE(CanAccess::LastErrorText().find("../lo"), std::string::npos);
}

}  // namespace
}  // namespace faultbox

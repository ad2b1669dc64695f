// Scripts activating and deactivating a KR60 pattern through the object model,
// on the simulated bench that the CAN access driver "sim" reaches in process;
// the bench's relays show what reached the modules.
#include <gtest/gtest.h>

#include <array>
#include <map>

#include "automation/AutomationBench.h"
#include "config/QFCAbstractFailureClasses.h"
#include "kr60/KR60Simulator.h"
#include "platform/CanAccess.h"
#include "platform/Settings.h"
#include "support/MessageCapture.h"

namespace faultbox {
namespace {

using sim::KR60ModuleId;
using sim::KR60ModuleType;
using sim::KR60Simulator;
using test::AutomationBench;
using test::LastError;
using test::MessageCapture;

constexpr const char* kBenchName = "automation-bench";
constexpr KR60ModuleId kLoad12{KR60ModuleType::kLOAD, 0x012};
constexpr KR60ModuleId kLoad13{KR60ModuleType::kLOAD, 0x013};

std::uint64_t On(std::initializer_list<int> bits) {
  std::uint64_t vector = KR60Simulator::kAllOff;
  for (int bit : bits) vector &= ~(std::uint64_t{1} << bit);
  return vector;
}

class AutomationKR60Sim : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(sim::RegisterKR60SimDriver());
    // Passes enough for the simulator thread on a busy machine; the answers
    // to a reset are there long before the collection wait ends.
    bench_.files().SetSetting("Timeout", "500000");
    ASSERT_TRUE(Settings::SetString(Settings::kHardwareSection, QFCSystem::kResetCollectionWaitKey, "200"));
    test::PinFile file = test::PinFile::KR60();
    file.Set("OffsetLoadAddress", "10").Set("FIULoadAddress", "0_0_3").Set("RSIMLoadAddress", "0_0_4");
    file.pins = {"P1;Engine;2;1;0_1_2;3", "P3;Gearbox;3;2;0_1_3;0,7"};
    const std::string pinFile = bench_.files().WriteFile("bench.csv", file.Text());
    sim::KR60SimulatorOptions options;
    options.pinFile = pinFile;
    ASSERT_TRUE(sim::DefineKR60SimBench(kBenchName, options));
    CanChannelTarget target;
    ASSERT_TRUE(ParseCanChannelTarget(std::string("sim:") + kBenchName, &target));
    CanChannelTable::SetOverride({{{-1, -1, -1}, target}});

    // The document names the sample pin file; the script opens it on the bench's.
    const std::string document = bench_.SaveDocument("bench.fsa", true);
    ASSERT_EQ(bench_.systems().Open(document, pinFile, system_), FAULTBOX_OK) << LastError();
    ASSERT_EQ(system_->Connect(), FAULTBOX_OK) << LastError();

    // P1 switches load relay 2 of its channel, P3 relay 4 of both its channels.
    QFCAbstractFailureClasses* classes = system_->GetOwner()->GetFailureClasses();
    classes->RemoveAll();
    for (const auto& [id, relay] : {std::array<std::uint32_t, 2>{2, 2}, std::array<std::uint32_t, 2>{3, 4}}) {
      QFCAbstractFailureClass& fc = classes->AddFailureClass();
      fc.SetId(static_cast<std::int32_t>(id));
      QFTPossibility p(kRelayPositions, kRelayAny);
      p.Set(relay, kRelayOn, 0, 0);
      fc.AddPossibility(std::move(p));
    }
    pattern_ = bench_.MakePattern(*system_, "Loads", {{"P1", "Engine"}, {"P3", "Gearbox"}});
    p1_ = AutomationBench::Pin(*pattern_, 0);
    p3_ = AutomationBench::Pin(*pattern_, 1);
    ASSERT_EQ(p1_->SetFailureClass(2), FAULTBOX_OK);
    ASSERT_EQ(p3_->SetFailureClass(3, Variant{std::int64_t{0}}), FAULTBOX_OK);
  }
  void TearDown() override {
    if (pattern_) (void)pattern_->Deactivate();  // tests that leave it activated only
    bench_.DropRoot();
    sim::RemoveKR60SimBench(kBenchName);
    CanChannelTable::SetOverride({});
  }

  static std::map<KR60ModuleId, std::uint64_t> Relays() {
    std::map<KR60ModuleId, std::uint64_t> out;
    for (const KR60ModuleId id : {kLoad12, kLoad13})
      out[id] = sim::FindKR60SimBench(kBenchName)->RelayVector(id).value_or(0);
    return out;
  }
  static std::map<KR60ModuleId, std::uint64_t> Expect(std::uint64_t load12, std::uint64_t load13) {
    return {{kLoad12, load12}, {kLoad13, load13}};
  }

  AutomationBench bench_;
  std::shared_ptr<QFCSystemImpl> system_;
  std::shared_ptr<QFCBaseFailurePatternImpl> pattern_;
  std::shared_ptr<QFCBaseFailurePatternPinImpl> p1_;
  std::shared_ptr<QFCBaseFailurePatternPinImpl> p3_;
};

TEST_F(AutomationKR60Sim, ActivateAndDeactivateWholeAndByPins) {
  const std::uint64_t p1On = On({KR60Simulator::LoadRelayBit(3, 2)});
  const std::uint64_t p3On = On({KR60Simulator::LoadRelayBit(0, 4), KR60Simulator::LoadRelayBit(7, 4)});
  const std::uint64_t off = KR60Simulator::kAllOff;
  VARIANT_BOOL flag = VARIANT_FALSE;
  ASSERT_EQ(system_->IsConnected(flag), FAULTBOX_OK);
  EXPECT_EQ(flag, VARIANT_TRUE);
  std::vector<std::string> connected;
  ASSERT_EQ(bench_.root().get_ConnectedSystem(connected), FAULTBOX_OK);
  EXPECT_EQ(connected, (std::vector<std::string>{bench_.File("bench.fsa")}));

  struct Step {
    const char* name;
    std::function<HRESULT()> call;
    int message;  // 165, 167
    std::map<KR60ModuleId, std::uint64_t> relays;
  } steps[] = {
      {"activate the whole pattern", [&] { return pattern_->Activate(); }, 165, Expect(p1On, p3On)},
      // A KR60 deactivation takes every activated pin along, chosen or not.
      {"deactivate P3 by array", [&] { return pattern_->Deactivate(Variant{QFTObjectArray{p3_}}); }, 167,
       Expect(off, off)},
      {"activate P3 by array", [&] { return pattern_->Activate(Variant{QFTObjectArray{p3_}}); }, 165,
       Expect(off, p3On)},
      {"activate both by array: only P1 is switched",
       [&] {
         return pattern_->Activate(Variant{QFTObjectArray{p1_, p3_}});
       },
       165, Expect(p1On, p3On)},
      {"deactivate the whole pattern", [&] { return pattern_->Deactivate(); }, 167, Expect(off, off)},
      {"activate P1 alone", [&] { return p1_->Activate(); }, 165, Expect(p1On, off)},
      {"deactivate P1 alone", [&] { return p1_->Deactivate(); }, 167, Expect(off, off)},
  };
  for (const Step& s : steps) {
    MessageCapture capture;
    ASSERT_EQ(s.call(), FAULTBOX_OK) << s.name << ": " << LastError();
    ASSERT_NE(capture.Find(s.message), nullptr) << s.name;
    EXPECT_EQ(capture.Find(s.message)->first, "Loads") << s.name;
    EXPECT_EQ(Relays(), s.relays) << s.name;
  }
}

TEST_F(AutomationKR60Sim, ResetOfAnActivatedPatternOrPinChangesNothing) {
  ASSERT_EQ(pattern_->Activate(), FAULTBOX_OK) << LastError();
  const auto relays = Relays();
  std::vector<std::int32_t> before;
  ASSERT_EQ(p1_->get_PinConfig(before), FAULTBOX_OK);
  for (const auto& reset : {std::function<HRESULT()>([&] { return pattern_->Reset(); }),
                            std::function<HRESULT()>([&] { return p1_->Reset(); })}) {
    EXPECT_EQ(reset(), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);
    std::vector<std::int32_t> after;
    EXPECT_EQ(p1_->get_PinConfig(after), FAULTBOX_OK);
    EXPECT_EQ(after, before);
    std::int32_t id = 0, vector = -1;
    EXPECT_EQ(p1_->get_AdjustedFailureClassID(id, vector), FAULTBOX_OK);
    EXPECT_EQ(id, 2);
    EXPECT_EQ(Relays(), relays);
  }
  // Neither can the system go away or be disconnected while its relays are switched.
  EXPECT_EQ(system_->Disconnect(), E_FAULTBOX_DISCONNECT);
  EXPECT_EQ(system_->Close(), E_FAULTBOX);
  EXPECT_TRUE(system_->IsAttached());
  ASSERT_EQ(pattern_->Deactivate(), FAULTBOX_OK);
  EXPECT_EQ(system_->ResetHardware(), FAULTBOX_OK);
  EXPECT_EQ(system_->Disconnect(), FAULTBOX_OK);
  VARIANT_BOOL flag = VARIANT_TRUE;
  EXPECT_EQ(system_->IsConnected(flag), FAULTBOX_OK);
  EXPECT_EQ(flag, VARIANT_FALSE);
}

}  // namespace
}  // namespace faultbox

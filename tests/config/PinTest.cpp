// Pins, ECUs and the model base: platform checks, failure class entries,
// document storage and the questions answered through the owner chain.
#include <gtest/gtest.h>

#include <memory>

#include "config/QFCECU.h"
#include "config/kr40/QFCKR40Pin.h"
#include "config/kr60/QFCKR60Pin.h"
#include "platform/Archive.h"
#include "support/MessageCapture.h"

namespace faultbox {
namespace {

using test::MessageCapture;

// Stands in for the system at the top of an owner chain.
class StandInSystem : public QFCAbstractObjectData {
 public:
  StandInSystem() : QFCAbstractObjectData("bench", kKindSystem, this) {}
  bool IsConnected() const override { return connected; }
  bool IsPatternActivated() const override { return activated; }
  bool IsReadOnly() const override { return readOnly; }
  void SetModified() override {
    if (!readOnly) ++modified;
  }
  bool connected = false;
  bool activated = false;
  bool readOnly = false;
  int modified = 0;
};

class Recorder : public QFCObjectObserver {
 public:
  void OnUpdate(QFCAbstractObjectData* sender, int hint, void*) override {
    senders.push_back(sender);
    hints.push_back(hint);
    if (removeSelf) sender->RemoveObserver(this);
  }
  std::vector<QFCAbstractObjectData*> senders;
  std::vector<int> hints;
  bool removeSelf = false;
};

using Columns = std::vector<std::pair<std::string, std::string>>;

template <class Pin>
std::unique_ptr<Pin> MakePin(const Columns& columns, QFCAbstractObjectData* system = nullptr) {
  auto pin = std::make_unique<Pin>(std::is_same_v<Pin, QFCKR60Pin> ? 2 : 1, system);
  pin->SetFileName("bench.csv");
  for (const auto& [column, value] : columns) EXPECT_EQ(pin->SetValue(column, value), FAULTBOX_OK) << column;
  pin->SetEcuVersion(1);
  return pin;
}

Columns KR40Columns(const std::string& id, const std::string& channel, const std::string& faults = "1,2") {
  return {{"pin_name(1)", "P1"},
          {"ecu_name(1)", "ECU"},
          {"faults_ecu(1)", faults},
          {"fiu_module_id", id},
          {"fiu_module_channel", channel}};
}

Columns KR60Columns(const std::string& required, const std::string& id, const std::string& channels,
                    const std::string& faults = "1") {
  return {{"pin_name(1)", "P1"},     {"ecu_name(1)", "ECU"},
          {"faults_ecu(1)", faults}, {"load_channels_required", required},
          {"load_module_id", id},    {"load_module_channel", channels}};
}

struct ValidateCase {
  Columns columns;
  HRESULT result;
  std::vector<int> messages;
  const char* firstText = nullptr;  // first text of the first message, when checked
};

void ExpectValidate(QFCAbstractPin& pin, const ValidateCase& c) {
  std::string values;
  for (const auto& column : c.columns) values += column.second + ";";
  SCOPED_TRACE(values);
  MessageCapture cap;
  EXPECT_EQ(pin.Validate(), c.result);
  EXPECT_EQ(cap.Numbers(), c.messages);
  if (c.firstText && !cap.records.empty()) {
    EXPECT_EQ(cap.records[0].first, c.firstText);
  }
}

const HRESULT kCheck = E_FAULTBOX_CONSISTENCY_CHECK;
const HRESULT kNotUsed = W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION;

TEST(KR40PinTest, Validate) {
  const ValidateCase cases[] = {
      {KR40Columns("7F", "1"), FAULTBOX_OK, {}},
      {KR40Columns("0x7F", "10"), FAULTBOX_OK, {}},
      {KR40Columns("0", "5"), FAULTBOX_OK, {}},
      {KR40Columns("7f", "1"), kCheck, {37, 35}, "fiu_module_id"},
      {KR40Columns("128", "1"), kCheck, {37, 35}, "fiu_module_id"},
      {KR40Columns("1", "0"), kCheck, {37, 35}, "fiu_module_channel"},
      {KR40Columns("1", "11"), kCheck, {37, 35}, "fiu_module_channel"},
      {KR40Columns("80", "11"), kCheck, {37, 37, 35}, "fiu_module_id"},
      {KR40Columns("-", "1"), kCheck, {41}, "fiu_module_id"},
      {KR40Columns("1", "1", "1,,2"), FAULTBOX_OK, {}},  // the empty entry reads as ID 0
      {KR40Columns("1", "1", "1,x"), kCheck, {37}, "faults_ecu"},
      {KR40Columns("1", "1", "-"), kNotUsed, {}},
      {{{"pin_name(1)", "#"}, {"ecu_name(1)", "ECU"}, {"faults_ecu(1)", "1"}}, kNotUsed, {}},
      {{{"pin_name(1)", "P"}, {"ecu_name(1)", "-"}, {"faults_ecu(1)", "1"}}, kCheck, {41}, "ecu_name"},
      {{{"pin_name(1)", "P"}, {"ecu_name(1)", "E"}, {"faults_ecu(1)", "1"}, {"fiu_module_id", "1"}},
       kCheck,
       {39, 35},
       "fiu_module_channel"},
  };
  for (const ValidateCase& c : cases) ExpectValidate(*MakePin<QFCKR40Pin>(c.columns), c);

  auto good = MakePin<QFCKR40Pin>(KR40Columns("0x2A", "3"));
  EXPECT_EQ(good->GetModuleAddress(), 0x2Au);
  EXPECT_EQ(good->GetModuleChannels(), std::vector<std::uint32_t>{3});
  EXPECT_EQ(MakePin<QFCKR40Pin>(KR40Columns("zz", "3"))->GetModuleAddress(), 0u);
}

TEST(KR60PinTest, Validate) {
  const ValidateCase cases[] = {
      {KR60Columns("1", "2_15_7", "3"), FAULTBOX_OK, {}},
      {KR60Columns("3", "0_0_0", "1,2,3"), FAULTBOX_OK, {}},
      {KR60Columns("2", "1_2_3", "3,03"), kCheck, {42}, "load_module_id"},  // equal as numbers
      {KR60Columns("-", "1_2_3", "3"), kNotUsed, {}},
      {KR60Columns("0", "1_2_3", "3"), kNotUsed, {}},
      {KR60Columns("10", "1_2_3", "3"), kCheck, {37}, "load_channels_required"},
      {KR60Columns("two", "1_2_3", "3"), kNotUsed, {37}, "load_channels_required"},
      {KR60Columns("1", "10_0_0", "3"), kCheck, {34, 37, 35}, "cabinet"},
      {KR60Columns("1", "1_2_3", "-"), kCheck, {41}, "load_module_channel"},
      {KR60Columns("1", "1_2_3", "10"), kCheck, {37, 37, 42}, "load_module_channel"},
      // The count is checked on the channels read before the bad item.
      {KR60Columns("1", "1_2_3", "3,x"), FAULTBOX_OK, {37, 37}, "load_module_channel"},
      {KR60Columns("2", "1_2_3", "3,,4"), kCheck, {37, 37, 42}, "load_module_channel"},
      // Refused failure class entries are reported; the pin stays.
      {KR60Columns("1", "1_2_3", "3", "x"), FAULTBOX_OK, {37}, "faults_ecu"},
  };
  for (const ValidateCase& c : cases) ExpectValidate(*MakePin<QFCKR60Pin>(c.columns), c);

  auto pin = MakePin<QFCKR60Pin>(KR60Columns("3", "2_15_7", "5, 1,5,3"));
  EXPECT_EQ(pin->GetModuleAddress(), 0x2F7u);
  EXPECT_EQ(pin->GetModuleChannels(), (std::vector<std::uint32_t>{1, 3, 5}));
  EXPECT_EQ(MakePin<QFCKR60Pin>(KR60Columns("1", "none", "1"))->GetModuleAddress(), 0u);
}

TEST(PinTest, FailureClassEntries) {
  struct Case {
    bool kr60;
    const char* text;
    int outcome;
    std::vector<std::string> entries;
    int reports;
  };
  const Case cases[] = {
      {false, "1, 2 ,3", QFCAbstractPin::kPresent, {"1", "2", "3"}, 0},
      {true, "3(1,2),5", QFCAbstractPin::kPresent, {"3(1,2)", "5"}, 0},
      {true, "3( 1, 2 ), 5", QFCAbstractPin::kPresent, {"3( 1,2 )", "5"}, 0},
      {true, "4,3(1,2", QFCAbstractPin::kPresent, {"4"}, 0},  // never closed: dropped silently
      {true, "3(1,2)x", QFCAbstractPin::kMissing, {}, 1},
      {true, "(1)", QFCAbstractPin::kMissing, {}, 1},
      {true, "3()", QFCAbstractPin::kMissing, {}, 1},
      {true, "1,", QFCAbstractPin::kPresent, {"1", ""}, 0},
      {false, "1,,2", QFCAbstractPin::kPresent, {"1", "", "2"}, 0},
      {true, "4,x,5", QFCAbstractPin::kMissing, {"4"}, 1},
      {false, "3(1,2),5", QFCAbstractPin::kMissing, {}, 1},
      {false, "#", QFCAbstractPin::kNotUsed, {}, 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    std::unique_ptr<QFCAbstractPin> pin =
        c.kr60 ? std::unique_ptr<QFCAbstractPin>(MakePin<QFCKR60Pin>(KR60Columns("1", "1_1_1", "1", c.text)))
               : MakePin<QFCKR40Pin>(KR40Columns("1", "1", c.text));
    MessageCapture cap;
    std::vector<std::string> list;
    // A second read reuses the outcome without reporting again.
    for (int read = 0; read < 2; ++read) {
      EXPECT_EQ(pin->ReadFailureClasses(list), c.outcome);
      EXPECT_EQ(list, c.entries);
      EXPECT_EQ(static_cast<int>(cap.records.size()), c.reports);
    }
    EXPECT_EQ(pin->GetFailureClassCount(), c.entries.size());
  }
  std::uint32_t id = 0;
  std::vector<std::uint32_t> parameters;
  ASSERT_TRUE(QFCKR60Pin::ParseFailureClassEntry("12(4,0)", id, parameters));
  EXPECT_EQ(id, 12u);
  EXPECT_EQ(parameters, (std::vector<std::uint32_t>{4, 0}));
}

TEST(PinTest, ValuesAndColumns) {
  QFCKR40Pin pin(1, nullptr);
  pin.SetFileName("f.csv");
  MessageCapture cap;
  EXPECT_EQ(pin.SetValue("Signal", "S1"), FAULTBOX_OK);
  EXPECT_EQ(pin.SetValue("SIGNAL", "S2"), E_FAULTBOX_INVALID_PARAMETER);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{40});
  EXPECT_EQ(cap.records[0].errorClass, 2);
  EXPECT_EQ(cap.records[0].first, "signal");
  EXPECT_EQ(cap.records[0].second, "f.csv");
  EXPECT_EQ(pin.SetValue("Comment", "first"), FAULTBOX_OK);
  EXPECT_EQ(pin.SetValue("comment", "second"), FAULTBOX_OK);
  EXPECT_EQ(*pin.FindValue("comment"), "first");

  cap.Clear();
  std::string value;
  EXPECT_EQ(pin.GetValue("absent", value), QFCAbstractPin::kMissing);
  EXPECT_EQ(cap.Numbers(), std::vector<int>{39});
  EXPECT_EQ(cap.records[0].errorClass, 3);
  EXPECT_EQ(pin.GetValue("Signal", value), QFCAbstractPin::kPresent);
  EXPECT_EQ(value, "S1");

  // Lines wider than the first table size still find every value.
  for (int i = 0; i < 40; ++i)
    ASSERT_EQ(pin.SetValue("C" + std::to_string(i), std::to_string(i)), FAULTBOX_OK);
  EXPECT_EQ(pin.SetValue("c5", "again"), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(pin.FindValue("C30").value_or("missing"), "30");
  EXPECT_FALSE(pin.FindValue("c40").has_value());

  QFCPinValueTable table;
  for (const char* key : {"a", "b", "c"}) table.Set(key, key);
  table.Set("b", "replaced");
  ASSERT_EQ(table.Size(), 3u);
  EXPECT_EQ(table.At(1), QFCPinValueTable::Entry("b", "replaced"));
  EXPECT_EQ(table.At(2), QFCPinValueTable::Entry("c", "c"));
}

// The stored form, written out: values, failure class entries, file name, the
// three column names, ECU version, the class text, 0, the version again and
// the platform's own columns.
TEST(PinTest, StoredFormAndRoundTrip) {
  const Columns columns = KR60Columns("2", "1_2_3", "4,5", "3(1,2),5");
  auto pin = MakePin<QFCKR60Pin>(columns);
  ASSERT_EQ(pin->Validate(), FAULTBOX_OK);
  Archive out;
  pin->Serialize(out);
  Archive expected;
  expected.WriteCount(6);
  for (const auto& [column, value] : columns) {
    expected.WriteString(column);
    expected.WriteString(value);
  }
  expected.WriteCount(2);
  for (const char* text : {"3(1,2)", "5", "bench.csv", "ecu_name(1)", "faults_ecu(1)", "pin_name(1)"})
    expected.WriteString(text);
  expected.WriteI32(1);
  expected.WriteString("3(1,2),5");
  expected.WriteI32(0);
  expected.WriteI32(1);
  for (const char* text : {"1_2_3", "4,5"}) expected.WriteString(text);
  EXPECT_EQ(out.Data(), expected.Data());

  QFCKR60Pin copy(2, nullptr);
  copy.SetCompareOnLoad(false);
  Archive in(out.Data());
  copy.Serialize(in);
  EXPECT_EQ(in.Remaining(), 0u);
  EXPECT_EQ(copy.GetModuleAddress(), 0x123u);
  Archive again;
  copy.Serialize(again);
  EXPECT_EQ(again.Data(), out.Data());

  // Every cut of the stored bytes is a damaged document, never a crash.
  for (std::size_t cut = 0; cut < out.Data().size(); ++cut) {
    QFCKR60Pin broken(2, nullptr);
    broken.SetCompareOnLoad(false);
    Archive part(std::vector<std::uint8_t>(out.Data().begin(), out.Data().begin() + static_cast<long>(cut)));
    EXPECT_THROW(broken.Serialize(part), ArchiveException) << cut;
  }
}

TEST(PinTest, CompareOnLoadReportsEachDifference) {
  StandInSystem system;
  auto stored = MakePin<QFCKR60Pin>(KR60Columns("2", "1_2_3", "4,5", "7"), &system);
  Archive out;
  stored->Serialize(out);

  auto same = MakePin<QFCKR60Pin>(KR60Columns("2", "1_2_3", "4,5", "7"), &system);
  MessageCapture cap;
  Archive in1(out.Data());
  same->Serialize(in1);
  EXPECT_TRUE(cap.records.empty());
  EXPECT_EQ(system.modified, 0);

  auto changed = MakePin<QFCKR60Pin>(KR60Columns("2", "1_2_3", "4,6", "7,8"), &system);
  changed->SetEcuVersion(2);
  Archive in2(out.Data());
  changed->Serialize(in2);
  ASSERT_EQ(cap.Numbers(), (std::vector<int>{142, 142, 142}));
  EXPECT_EQ(cap.records[0].errorClass, 2);
  EXPECT_EQ(cap.records[0].first, "faults_ecu");
  EXPECT_EQ(cap.records[1].first, "ECU version");
  EXPECT_EQ(cap.records[2].first, "load_module_channel");
  EXPECT_EQ(cap.records[0].second, "pin name: , ECU name: , File name: bench.csv");  // n=2 columns are absent
  EXPECT_EQ(system.modified, 3);
  EXPECT_EQ(changed->GetFailureClassText(), "");  // the current values stay
  EXPECT_EQ(*changed->FindValue("load_module_channel"), "4,6");
}

TEST(EcuTest, PinsByNameAndPresence) {
  StandInSystem system;
  QFCECU ecu("ECU", &system);
  EXPECT_TRUE(ecu.AreAllPinsPresent());
  for (const char* name : {"B", "A", "C"}) ecu.AddPin(MakePin<QFCKR40Pin>({{"pin_name(1)", name}}, &system));
  EXPECT_FALSE(ecu.HasPin("a"));
  EXPECT_EQ(ecu.GetPin(0)->PinName(), "B");
  EXPECT_EQ(ecu.FindPin("C"), ecu.GetPin(2));
  EXPECT_EQ(ecu.GetPin(3), nullptr);
  EXPECT_FALSE(ecu.AreAllPinsPresent());
  for (int i = 0; i < 3; ++i) ecu.GetPin(i)->SetPresent(true);
  EXPECT_TRUE(ecu.AreAllPinsPresent());
}

TEST(EcuTest, SetEnabledAsksTheSystem) {
  StandInSystem system;
  QFCECU ecu("ECU_A", &system);
  Recorder views;
  ecu.AddObserver(&views);
  MessageCapture cap;

  system.readOnly = true;
  EXPECT_FALSE(ecu.SetEnabled(false, false));
  EXPECT_TRUE(ecu.IsEnabled());
  ASSERT_EQ(cap.Numbers(), std::vector<int>{136});
  EXPECT_EQ(cap.records[0].first, "ECU_A");
  EXPECT_TRUE(ecu.SetEnabled(false, true));  // quiet: the document's own load may change it
  EXPECT_EQ(system.modified, 0);             // but a read-only document is not marked
  system.readOnly = false;
  ASSERT_TRUE(ecu.SetEnabled(true, true));

  cap.Clear();
  system.activated = true;
  EXPECT_FALSE(ecu.SetEnabled(false, false));
  ASSERT_EQ(cap.Numbers(), std::vector<int>{132});
  EXPECT_EQ(cap.records[0].errorClass, 3);
  EXPECT_TRUE(ecu.IsEnabled());
  EXPECT_TRUE(ecu.SetEnabled(true, false));  // enabling stays allowed

  system.activated = false;
  views.senders.clear();
  EXPECT_TRUE(ecu.SetEnabled(false, false));
  EXPECT_FALSE(ecu.IsEnabled());
  EXPECT_EQ(views.senders, std::vector<QFCAbstractObjectData*>{&ecu});
  EXPECT_GE(system.modified, 2);
}

TEST(PinTest, SetPresentWarnsOnlyWhileConnected) {
  StandInSystem system;
  auto pin = MakePin<QFCKR60Pin>(KR60Columns("1", "2_15_7", "3"), &system);
  MessageCapture cap;
  pin->SetPresent(false);
  EXPECT_TRUE(cap.records.empty());
  system.connected = true;
  pin->SetPresent(true);
  EXPECT_TRUE(pin->IsPresent());
  pin->SetPresent(false);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{109});
  EXPECT_EQ(cap.records[0].errorClass, 2);
  EXPECT_EQ(cap.records[0].first, "0x2F7");
  EXPECT_EQ(cap.records[0].second, "P1");
  EXPECT_FALSE(pin->IsPresent());
}

TEST(ObjectDataTest, OwnerChainAndObservers) {
  StandInSystem system;
  QFCECU ecu("E", &system);
  QFCKR40Pin pin(1, &ecu);  // a deeper chain than pins have, to see the forwarding
  EXPECT_EQ(pin.GetSystem(), &system);
  system.connected = system.activated = system.readOnly = true;
  EXPECT_TRUE(pin.IsConnected());
  EXPECT_TRUE(pin.IsPatternActivated());
  EXPECT_TRUE(pin.IsReadOnly());
  system.readOnly = false;
  pin.SetModified();
  EXPECT_EQ(system.modified, 1);

  QFCKR40Pin orphan(1, nullptr);
  EXPECT_FALSE(orphan.IsConnected());
  orphan.SetModified();  // nobody to tell; must not crash

  // An observer may leave while being told; one added twice is told once.
  Recorder first;
  Recorder second;
  first.removeSelf = true;
  ecu.AddObserver(&first);
  ecu.AddObserver(&first);
  ecu.AddObserver(&second);
  ecu.NotifyObservers(7);
  ecu.NotifyObservers(8);
  EXPECT_EQ(first.hints, std::vector<int>{7});
  EXPECT_EQ(second.hints, (std::vector<int>{7, 8}));
  ecu.RemoveObserver(&second);
  EXPECT_TRUE(ecu.GetObservers().empty());
}

}  // namespace
}  // namespace faultbox

// Interface settings, transfer time-out, user mode, properties, the read-only
// rule and the system's part of the document.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <cstring>
#include <optional>
#include <ostream>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/QFCECU.h"
#include "platform/Archive.h"
#include "platform/MessageTable.h"
#include "support/MessageCapture.h"
#include "systems/QFCSystem.h"
#include "systems/SystemTestBench.h"
#include "platform/UserMode.h"

namespace faultbox {
namespace {

using test::Bench;
using test::MessageCapture;
using test::PinFile;

std::unique_ptr<QFCSystem> OpenSystem(const Bench& bench, const PinFile& pinFile,
                                      const char* name = "bench.csv") {
  auto system = std::make_unique<QFCSystem>("Bench", bench.Write(name, pinFile), 1, "Tester", "Rig");
  EXPECT_EQ(system->OpenFromPinFile(), FAULTBOX_OK);
  return system;
}

// An interface that connects whenever asked, as a real one does once its hardware answers.
class AlwaysConnects : public QFCAbstractTransferInterface {
 public:
  HRESULT Connect(bool connect, std::int32_t, std::int32_t) override {
    connected_ = connect;
    return FAULTBOX_OK;
  }
};

// ---- interface parameters ----

struct ParameterCase {
  const char* name;
  bool kr60;
  std::int32_t deviceType, value1, value2;
  HRESULT result;
  std::vector<int> messages;
  std::int32_t getDevice, get1, get2;  // InterfaceParameter afterwards
};

// Test names and failures show the case's name, not its bytes.
void PrintTo(const ParameterCase& c, std::ostream* os) {
  *os << c.name;
}

class InterfaceParameterTest : public ::testing::TestWithParam<ParameterCase> {};

TEST_P(InterfaceParameterTest, SetThenGet) {
  const ParameterCase& c = GetParam();
  Bench bench;
  auto system = OpenSystem(bench, c.kr60 ? PinFile::KR60() : PinFile::KR40());
  MessageCapture cap;
  EXPECT_EQ(system->SetInterfaceParameter(c.deviceType, c.value1, c.value2), c.result);
  EXPECT_EQ(cap.Numbers(), c.messages);
  std::int32_t device = -1, value1 = -1, value2 = -1;
  EXPECT_EQ(system->GetInterfaceParameter(device, value1, value2), FAULTBOX_OK);
  EXPECT_EQ(device, c.getDevice);
  EXPECT_EQ(value1, c.get1);
  EXPECT_EQ(value2, c.get2);
  if (!c.kr60) {
    EXPECT_EQ(system->GetSerialSettings().portName, "COM" + std::to_string(c.get1));
  }
}

const ParameterCase kParameterCases[] = {
    {"SerialPort3", false, 200, 3, 0, FAULTBOX_OK, {}, 200, 3, 0},
    {"SerialRefusesCanDevice", false, 1, 3, 0, E_FAULTBOX, {57}, 200, 1, 0},
    {"CanRefusesSerialDevice", true, 200, 3, 0, E_FAULTBOX, {57}, 1, 1, 1},
    {"CanTakesLowBytes", true, 4, 0x101, 2, FAULTBOX_OK, {}, 4, 1, 2},
    {"CanCardX", true, 1, 5, 0x1FF, FAULTBOX_OK, {}, 1, 5, 255},
    {"CanRefusesUnknownDevice", true, 2, 1, 1, E_FAULTBOX, {57}, 1, 1, 1},
};

INSTANTIATE_TEST_SUITE_P(Cases, InterfaceParameterTest, ::testing::ValuesIn(kParameterCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(InterfaceSettingsTest, RefusedWhileAnInterfaceIsConnected) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR40());
  auto fake = std::make_unique<AlwaysConnects>();
  AlwaysConnects* connected = fake.get();
  system->AddTransferInterface(std::move(fake));
  connected->Connect(true, 0, 0);
  EXPECT_FALSE(system->IsInterfaceFree());

  MessageCapture cap;
  QFTSerialInterfaceSettings settings;
  settings.portName = "COM9";
  EXPECT_FALSE(system->SetSerialSettings(&settings));
  EXPECT_EQ(system->SetInterfaceParameter(200, 9, 0), E_FAULTBOX);
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{169, 169, 35}));
  EXPECT_TRUE(cap.shown[0]);
  EXPECT_EQ(system->GetSerialSettings().portName, "COM1");

  connected->Connect(false, 0, 0);
  EXPECT_TRUE(system->IsInterfaceFree());
  EXPECT_TRUE(system->SetSerialSettings(&settings));
  EXPECT_FALSE(system->SetSerialSettings(nullptr));
  EXPECT_EQ(system->GetSerialSettings().portName, "COM9");
}

TEST(InterfaceSettingsTest, CanRecordTakesOnlyItsOwnFields) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR60());
  QFTCANInterfaceSettings settings;
  std::memcpy(settings.head, "CAN 1", 6);
  settings.deviceType = 4;
  settings.firstParameter = 2;
  settings.secondParameter = 3;
  settings.furtherValues[0] = 7;
  settings.furtherValues[2] = 9;
  settings.rest[0] = 0x55;
  ASSERT_TRUE(system->SetCANSettings(&settings));
  const QFTCANInterfaceSettings& now = system->GetCANSettings();
  EXPECT_EQ(now.deviceType, 4u);
  EXPECT_EQ(now.firstParameter, 2);
  EXPECT_EQ(now.secondParameter, 3);
  EXPECT_EQ(now.furtherValues[0], 7u);
  EXPECT_EQ(now.furtherValues[2], 9u);
  // The channel's head and the rest belong to the access layer.
  EXPECT_EQ(now.head[0], 0);
  EXPECT_EQ(now.rest[0], 0);

  // A new parameter keeps the further values.
  ASSERT_EQ(system->SetInterfaceParameter(1, 0, 1), FAULTBOX_OK);
  EXPECT_EQ(system->GetCANSettings().furtherValues[2], 9u);
  std::uint32_t first = 0, second = 0;
  system->GetBusTiming(first, second);
  EXPECT_EQ(first, 0x47u);
  EXPECT_EQ(second, 0x14u);
}

// ---- settings store ----

struct TimeoutCase {
  const char* name;
  std::optional<std::string> value;
  std::int32_t passes;
  bool reported;
};

void PrintTo(const TimeoutCase& c, std::ostream* os) {
  *os << c.name;
}

class TransferTimeoutTest : public ::testing::TestWithParam<TimeoutCase> {};

TEST_P(TransferTimeoutTest, ReadsTheSetting) {
  const TimeoutCase& c = GetParam();
  Bench bench;
  if (c.value) bench.SetSetting("Timeout", *c.value);
  MessageCapture cap;
  EXPECT_EQ(QFCSystemProperty::GetTransferTimeout(), c.passes);
  if (c.reported) {
    ASSERT_EQ(cap.Numbers(), std::vector<int>{37});
    EXPECT_EQ(cap.records[0].errorClass, 2);
    EXPECT_EQ(cap.records[0].first, "Timeout");
  } else {
    EXPECT_TRUE(cap.records.empty());
  }
}

const TimeoutCase kTimeoutCases[] = {
    {"Missing", std::nullopt, 1000, false},
    {"Set", "250", 250, false},
    {"Zero", "0", 0, false},
    {"Empty", "", 1000, true},
    {"Text", "fast", 1000, true},
    {"TrailingLetters", "25x", 1000, true},
    {"Negative", "-5", 1000, true},
    {"BeyondSigned", "3000000000", 1000, true},
    {"Overflow", "99999999999", 1000, true},
};

INSTANTIATE_TEST_SUITE_P(Cases, TransferTimeoutTest, ::testing::ValuesIn(kTimeoutCases),
                         [](const auto& info) { return std::string(info.param.name); });

struct UserModeCase {
  const char* name;
  std::optional<std::string> value;
  int mode;
};

void PrintTo(const UserModeCase& c, std::ostream* os) {
  *os << c.name;
}

class UserModeTest : public ::testing::TestWithParam<UserModeCase> {};

TEST_P(UserModeTest, ReadOnceFromTheSetting) {
  const UserModeCase& c = GetParam();
  Bench bench;
  if (c.value) bench.SetSetting("UserMode", *c.value);
  EXPECT_EQ(GetUserMode(), c.mode);
  // Kept: a later change of the setting is not seen until the mode is read anew.
  bench.SetSetting("UserMode", c.mode == 2 ? "0" : kServiceModeCode);
  EXPECT_EQ(GetUserMode(), c.mode);
  ResetUserMode();
  EXPECT_EQ(GetUserMode(), c.mode == 2 ? 1 : 2);
}

const UserModeCase kUserModeCases[] = {
    {"Missing", std::nullopt, 0},
    {"Zero", "0", 1},
    {"Empty", "", 1},
    {"ServiceCode", kServiceModeCode, 2},
    {"ServiceCodeInLowerCase", "8c3e51a7-2f64-4b9d-a0e7-6d15f2c94b38", 1},
};

INSTANTIATE_TEST_SUITE_P(Cases, UserModeTest, ::testing::ValuesIn(kUserModeCases),
                         [](const auto& info) { return std::string(info.param.name); });

// ---- properties and the read-only rule ----

TEST(SystemPropertiesTest, LabelledTable) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR60());
  auto label = [](int id) { return std::string(ResourceString(id)); };
  QFCAbstractObjectData::PropertyTable table{{"stale", "row"}};
  system->GetProperties(table);
  const QFCAbstractObjectData::PropertyTable expected = {{label(6770), "Tester"},
                                                         {label(6771), "1"},
                                                         {label(6774), label(6773)},
                                                         {label(6775), "Rig"},
                                                         {label(6776), system->GetPinFilePath()},
                                                         {label(6731), label(6747)}};
  EXPECT_EQ(table, expected);

  system->SetConnectedFlag(true);
  bench.SetSetting("UserMode", kServiceModeCode);
  ResetUserMode();
  system->GetProperties(table);
  EXPECT_EQ(table[label(6774)], label(6772));
  EXPECT_EQ(table[label(6731)], label(6745));
}

class Hints : public QFCObjectObserver {
 public:
  void OnUpdate(QFCAbstractObjectData*, int hint, void*) override { hints.push_back(hint); }
  std::vector<int> hints;
};

TEST(SystemPropertiesTest, ReadOnlyDocumentRefusesChanges) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR40());
  system->ClearModified();
  // Not yet saved: writable.
  EXPECT_FALSE(system->IsReadOnly());
  const std::string document = bench.WriteFile("bench.fss", "saved");
  system->SetDocumentPath(document);
  EXPECT_TRUE(system->SetAuthor("Someone"));
  EXPECT_TRUE(system->IsModified());

  system->ClearModified();
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);
  EXPECT_TRUE(system->IsReadOnly());
  MessageCapture cap;
  EXPECT_FALSE(system->SetAuthor("Other"));
  EXPECT_FALSE(system->SetDescription("Other"));
  EXPECT_FALSE(system->SetECUVersion(2));
  EXPECT_EQ(system->SetInterfaceParameter(200, 4, 0), E_FAULTBOX);
  EXPECT_EQ(cap.Numbers(), (std::vector<int>{118, 118, 118, 118, 35}));
  EXPECT_EQ(cap.records[0].first, "Bench");
  EXPECT_EQ(cap.records[0].errorClass, 3);
  EXPECT_EQ(system->GetAuthor(), "Someone");
  EXPECT_EQ(system->GetDescription(), "Rig");
  EXPECT_EQ(system->GetECUVersion(), 1);
  EXPECT_EQ(system->GetSerialSettings().portNumber, 1u);
  system->SetModified();
  EXPECT_FALSE(system->IsModified());
  // The name is the administration's business and is never refused.
  Hints hints;
  system->AddObserver(&hints);
  system->SetName("Renamed");
  EXPECT_EQ(system->GetName(), "Renamed");
  EXPECT_EQ(hints.hints, std::vector<int>{QFCSystem::kUpdateName});
  system->RemoveObserver(&hints);
  ::chmod(document.c_str(), 0644);
}

// ---- document part ----

// Archive bytes written out by hand (texts shorter than 255 bytes).
struct Bytes {
  std::vector<std::uint8_t> data;
  Bytes& U8(std::uint8_t v) {
    data.push_back(v);
    return *this;
  }
  Bytes& U32(std::uint32_t v) {
    for (int i = 0; i < 4; ++i) data.push_back(static_cast<std::uint8_t>(v >> (8 * i)));
    return *this;
  }
  Bytes& Str(const std::string& s) {
    data.push_back(static_cast<std::uint8_t>(s.size()));
    data.insert(data.end(), s.begin(), s.end());
    return *this;
  }
  // The visible pin properties of the KR40 test bench, every one shown but `hidden`.
  Bytes& KR40Columns(const std::string& hidden = {}) {
    U32(5);
    for (const char* column :
         {"ecu_name(1)", "faults_ecu(1)", "fiu_module_channel", "fiu_module_id", "pin_name(1)"})
      Str(column).U32(column == hidden ? 0 : 1);
    return *this;
  }
  // An empty pattern collection and an empty root folder, which end the system's part.
  Bytes& NoPatterns() { return U32(0).Str(ResourceString(6768)).U32(0).U32(0); }
};

TEST(SystemDocumentTest, KR40PartByteForByte) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR40());
  ASSERT_EQ(system->SetInterfaceParameter(200, 7, 0), FAULTBOX_OK);
  system->GetVisiblePinProperties()["fiu_module_id"] = 0;
  ASSERT_TRUE(system->GetECU(1)->SetEnabled(false, false));
  Archive ar;
  system->Serialize(ar);
  Bytes expected;
  expected.Str("kr40.fcd").Str("").Str("").Str("").KR40Columns("fiu_module_id");
  expected.U32(1).Str("COM7").U32(7).U32(200);
  expected.U32(1).Str("Brake").NoPatterns();
  EXPECT_EQ(ar.Data(), expected.data);
}

TEST(SystemDocumentTest, KR60PartByteForByteAndBack) {
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR60());
  ASSERT_EQ(system->SetInterfaceParameter(4, 2, 3), FAULTBOX_OK);
  system->SetBusTiming(0x01, 0x1C);
  system->GetVisiblePinProperties()["load_module_id"] = 0;
  ASSERT_TRUE(system->GetECU(0)->SetEnabled(false, false));
  Archive stored;
  system->Serialize(stored);
  Bytes expected;
  expected.Str("kr60.fcd").Str("").Str("").Str("").U32(6);
  for (const char* column : {"ecu_name(1)", "faults_ecu(1)", "load_channels_required", "load_module_channel",
                             "load_module_id", "pin_name(1)"})
    expected.Str(column).U32(std::string(column) == "load_module_id" ? 0 : 1);
  expected.U32(2).U32(4).U8(2).U8(3).U32(0x01).U32(0x1C);
  expected.U32(1).Str("Engine").NoPatterns();
  EXPECT_EQ(stored.Data(), expected.data);

  auto reopened = OpenSystem(bench, PinFile::KR60());
  MessageCapture cap;
  Archive load(stored.Data());
  reopened->Serialize(load);
  EXPECT_EQ(load.Remaining(), 0u);
  EXPECT_TRUE(cap.records.empty());
  std::int32_t device = 0, value1 = 0, value2 = 0;
  EXPECT_EQ(reopened->GetInterfaceParameter(device, value1, value2), FAULTBOX_OK);
  EXPECT_EQ((std::vector<std::int32_t>{device, value1, value2}), (std::vector<std::int32_t>{4, 2, 3}));
  std::uint32_t first = 0, second = 0;
  reopened->GetBusTiming(first, second);
  EXPECT_EQ(first, 0x01u);
  EXPECT_EQ(second, 0x1Cu);
  EXPECT_EQ(reopened->GetVisiblePinProperties().at("load_module_id"), 0);
  EXPECT_FALSE(reopened->GetECU(0)->IsEnabled());
  EXPECT_TRUE(reopened->GetECU(1)->IsEnabled());
}

struct LoadCase {
  const char* name;
  Bytes bytes;
  std::vector<int> messages;
  std::optional<ArchiveCause> thrown;
  std::vector<std::pair<std::string, std::string>> texts = {};  // of the messages, in order
};

void PrintTo(const LoadCase& c, std::ostream* os) {
  *os << c.name;
}

class SystemDocumentLoadTest : public ::testing::TestWithParam<LoadCase> {};

TEST_P(SystemDocumentLoadTest, ComparesAndMerges) {
  const LoadCase& c = GetParam();
  Bench bench;
  auto system = OpenSystem(bench, PinFile::KR40());
  // Read-only documents still load: restoring is no change by the user.
  const std::string document = bench.WriteFile("bench.fss", "saved");
  system->SetDocumentPath(document);
  ASSERT_EQ(::chmod(document.c_str(), 0444), 0);
  MessageCapture cap;
  Archive ar(c.bytes.data);
  std::optional<ArchiveCause> thrown;
  try {
    system->Serialize(ar);
  } catch (const ArchiveException& e) {
    thrown = e.Cause();
  }
  ::chmod(document.c_str(), 0644);
  EXPECT_EQ(thrown, c.thrown);
  EXPECT_EQ(cap.Numbers(), c.messages);
  for (std::size_t i = 0; i < c.texts.size() && i < cap.records.size(); ++i) {
    EXPECT_EQ(cap.records[i].first, c.texts[i].first) << i;
    EXPECT_EQ(cap.records[i].second, c.texts[i].second) << i;
  }
  if (!thrown) {
    EXPECT_EQ(system->GetFailureClassFile(), "kr40.fcd");  // the pin file's entry stays, case and all
    EXPECT_EQ(system->GetSpareText(0), "");
    EXPECT_EQ(system->GetSerialSettings().portName, "COM5");
    EXPECT_EQ(system->GetVisiblePinProperties().count("gone"), 0u);
    EXPECT_FALSE(system->GetECU(1)->IsEnabled());
  }
}

Bytes Kr40Tail() {
  Bytes b;
  b.U32(1).Str("COM5").U32(5).U32(200).U32(2).Str("Brake").Str("NoSuchEcu").NoPatterns();
  return b;
}

Bytes With(Bytes head, const Bytes& tail) {
  head.data.insert(head.data.end(), tail.data.begin(), tail.data.end());
  return head;
}

const LoadCase kLoadCases[] = {
    {"SameInOtherCase",
     With(Bytes().Str("KR40.FCD").Str("").Str("").Str("").KR40Columns(), Kr40Tail()),
     {},
     std::nullopt},
    // Paths are shown with '/', as they are read on Linux.
    {"OtherFailureClassFile",
     With(Bytes().Str("C:\\Norvik\\old.fcd").Str("").Str("").Str("").KR40Columns(), Kr40Tail()),
     {92},
     std::nullopt,
     {{"C:/Norvik/old.fcd", "kr40.fcd"}}},
    {"SpareTextsInStoredOrder",
     With(Bytes().Str("kr40.fcd").Str("first").Str("third").Str("second").KR40Columns(), Kr40Tail()),
     {93, 98, 99},
     std::nullopt,
     {{"first", ""}, {"third", ""}, {"second", ""}}},
    {"UnknownColumnDropped",
     With(Bytes()
              .Str("kr40.fcd")
              .Str("")
              .Str("")
              .Str("")
              .U32(2)
              .Str("gone")
              .U32(0)
              .Str("fiu_module_id")
              .U32(0),
          Kr40Tail()),
     {},
     std::nullopt},
    {"UnknownPlatform",
     Bytes().Str("kr40.fcd").Str("").Str("").Str("").U32(0).U32(3).U32(0),
     {49, 35},
     ArchiveCause::kGeneric,
     {{"3", ""}}},
    {"Truncated", Bytes().Str("kr40.fcd").Str("").Str(""), {}, ArchiveCause::kEndOfFile},
    {"CountBeyondTheFile",
     Bytes().Str("kr40.fcd").Str("").Str("").Str("").U32(0x7FFFFFFF),
     {},
     ArchiveCause::kEndOfFile},
    {"EcuCountBeyondTheFile",
     Bytes().Str("kr40.fcd").Str("").Str("").Str("").U32(0).U32(1).Str("COM5").U32(5).U32(200).U32(1000),
     {},
     ArchiveCause::kEndOfFile},
};

INSTANTIATE_TEST_SUITE_P(Cases, SystemDocumentLoadTest, ::testing::ValuesIn(kLoadCases),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace faultbox

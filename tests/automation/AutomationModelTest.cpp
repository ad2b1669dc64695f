// The automation object model over documents opened as a script opens them:
// look-up, the lifetime rule, enumeration, pin arrays, resets and relay
// states, the extensions, and the error information scripts get.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>

#include "automation/AutomationBench.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "platform/MessageTable.h"
#include "support/MessageCapture.h"

namespace faultbox {
namespace {

using test::AutomationBench;
using test::LastError;
using test::MessageCapture;

Variant At(std::int64_t index) {
  return Variant{index};
}
Variant Named(const std::string& name) {
  return Variant{name};
}

std::string Name(QFCSystemImpl& system) {
  std::string name;
  EXPECT_EQ(system.get_Name(name), FAULTBOX_OK);
  return name;
}

TEST(AutomationModelTest, SystemsItemByPositionNameAndRefusals) {
  AutomationBench bench;
  auto first = bench.Open("first.fss", false);
  auto second = bench.Open("second.fsa", true);
  ASSERT_TRUE(first && second);
  std::int32_t count = 0;
  ASSERT_EQ(bench.systems().get_Count(count), FAULTBOX_OK);
  ASSERT_EQ(count, 2);
  std::vector<std::string> names;
  ASSERT_EQ(bench.systems().get_Names(names), FAULTBOX_OK);
  EXPECT_EQ(names, (std::vector<std::string>{Name(*first), Name(*second)}));

  struct Case {
    const char* name;
    Variant index;
    HRESULT result;
    const QFCSystemImpl* found;
    int text;  // resource string of the description, 0 for none
  } cases[] = {
      {"position 0", At(0), FAULTBOX_OK, first.get(), 0},
      {"position 1 as real", Variant{1.0}, FAULTBOX_OK, second.get(), 0},
      {"false is position 0", Variant{false}, FAULTBOX_OK, first.get(), 0},
      {"name", Named(Name(*second)), FAULTBOX_OK, second.get(), 0},
      {"position Count", At(count), E_FAULTBOX_INVALID_PARAMETER, nullptr, 6714},
      {"negative position", At(-1), E_FAULTBOX_INVALID_PARAMETER, nullptr, 6714},
      {"true is -1", Variant{true}, E_FAULTBOX_INVALID_PARAMETER, nullptr, 6714},
      {"unknown name", Named("no such system"), E_FAULTBOX_INVALID_PARAMETER, nullptr, 6714},
      {"a digit is a name", Named("0"), E_FAULTBOX_INVALID_PARAMETER, nullptr, 6714},
      {"omitted", Variant{}, E_FAULTBOX_INVALID_PARAMETER, nullptr, 6713},
      {"object", Variant{std::shared_ptr<QFCAutomationObject>(first)}, E_FAULTBOX_INVALID_PARAMETER, nullptr,
       6713},
      {"array", Variant{QFTObjectArray{first}}, E_FAULTBOX_INVALID_PARAMETER, nullptr, 6713},
      {"number out of range", At(std::int64_t{1} << 40), E_FAULTBOX_INVALID_PARAMETER, nullptr, 6713},
  };
  for (const Case& c : cases) {
    std::shared_ptr<QFCSystemImpl> system = first;
    EXPECT_EQ(bench.systems().Item(c.index, system), c.result) << c.name;
    EXPECT_EQ(system.get(), c.found) << c.name;
    // A look-up that finds nothing names what it looked for after the text.
    std::string text = c.text ? ResourceString(c.text) : "";
    if (c.text == 6714) text.back() = ':';
    EXPECT_EQ(c.text ? LastError().substr(0, text.size()) : LastError(), text) << c.name;
  }
  EXPECT_EQ(LastError(), "The index is neither a name nor a number.");
  std::shared_ptr<QFCSystemImpl> found;
  ASSERT_EQ(bench.systems().Item(Named("no such system"), found), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(LastError(), "No failure simulation system has this name or position: \"no such system\".");
  // A document's name is its path: case counts, as it does for Linux file names.
  std::string upper = Name(*second);
  for (char& ch : upper) ch = static_cast<char>(std::toupper(static_cast<unsigned char>(ch)));
  EXPECT_EQ(bench.systems().Item(Named(upper), found), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(bench.systems().Item(Named(Name(*second)), found), FAULTBOX_OK);
  EXPECT_EQ(found, second);
}

TEST(AutomationModelTest, OpenRefusesMissingFilesAndGivesAnOpenDocumentOnce) {
  AutomationBench bench;
  MessageCapture capture;
  const std::string document = bench.SaveDocument("doc.fss", false);
  struct Case {
    const char* name;
    std::string file;
    std::string pinFile;
    std::string missing;
  } cases[] = {
      {"document", bench.File("absent.fss"), "", bench.File("absent.fss")},
      {"pin file", document, bench.File("absent.csv"), bench.File("absent.csv")},
      {"folder", bench.File(""), "", bench.File("")},
  };
  for (const Case& c : cases) {
    capture.Clear();
    std::shared_ptr<QFCSystemImpl> system;
    EXPECT_EQ(bench.systems().Open(c.file, c.pinFile, system), E_FAULTBOX_CANN_NOT_OPEN_FILE) << c.name;
    EXPECT_EQ(system, nullptr);
    ASSERT_NE(capture.Find(46), nullptr) << c.name;
    EXPECT_EQ(capture.Find(46)->first, c.missing);
    EXPECT_NE(LastError().find(c.missing), std::string::npos) << LastError();
  }
  // A file that exists but holds no document.
  const std::string junk = bench.files().WriteFile("junk.fss", "not a document");
  std::shared_ptr<QFCSystemImpl> system;
  EXPECT_EQ(bench.systems().Open(junk, system), E_FAULTBOX_FILE_IS_NOT_OPENED);
  EXPECT_NE(LastError().find(junk), std::string::npos);

  std::shared_ptr<QFCSystemImpl> again;
  ASSERT_EQ(bench.systems().Open(document, system), FAULTBOX_OK);
  ASSERT_EQ(bench.systems().Open(document, again), FAULTBOX_OK);
  EXPECT_EQ(system, again);
  std::int32_t count = 0;
  EXPECT_EQ(bench.systems().get_Count(count), FAULTBOX_OK);
  EXPECT_EQ(count, 1);
}

TEST(AutomationModelTest, SystemValuesAndInterfaceParameters) {
  AutomationBench bench;
  auto kr40 = bench.Open("a.fss", false);
  auto kr60 = bench.Open("b.fsa", true);
  ASSERT_TRUE(kr40 && kr60);
  std::string text;
  std::int32_t number = 0;
  EXPECT_EQ(kr40->get_Author(text), FAULTBOX_OK);
  EXPECT_EQ(text, "Tester");
  EXPECT_EQ(kr40->get_Description(text), FAULTBOX_OK);
  EXPECT_EQ(text, "Rig 7");
  EXPECT_EQ(kr60->get_PlatformType(number), FAULTBOX_OK);
  EXPECT_EQ(number, fptKR60Platform);
  EXPECT_EQ(kr40->get_PinFile(text), FAULTBOX_OK);
  EXPECT_EQ(text, bench.File("kr40.csv"));
  VARIANT_BOOL connected = VARIANT_TRUE;
  EXPECT_EQ(kr60->IsConnected(connected), FAULTBOX_OK);
  EXPECT_EQ(connected, VARIANT_FALSE);
  std::vector<std::string> names = {"stale"};
  EXPECT_EQ(bench.root().get_ConnectedSystem(names), FAULTBOX_OK);
  EXPECT_TRUE(names.empty());
  // Not connected: no reset is sent.
  EXPECT_EQ(kr60->ResetHardware(), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
  EXPECT_EQ(LastError(), ResourceString(8910));

  struct Case {
    const char* name;
    QFCSystemImpl* system;
    std::int32_t type;
    Variant first;
    Variant second;
    HRESULT result;
    std::array<std::int32_t, 3> after;
  } cases[] = {
      {"KR40 as stored", kr40.get(), fdtRS232_IF_PORT, Variant{}, Variant{}, FAULTBOX_OK, {200, 1, 0}},
      {"KR40 port 3", kr40.get(), fdtRS232_IF_PORT, At(3), Variant{}, FAULTBOX_OK, {200, 3, 0}},
      {"KR40 port as text", kr40.get(), fdtRS232_IF_PORT, Named("4"), Variant{}, FAULTBOX_OK, {200, 4, 0}},
      {"KR40 port 0",
       kr40.get(),
       fdtRS232_IF_PORT,
       At(0),
       Variant{},
       E_FAULTBOX_INVALID_PARAMETER,
       {200, 4, 0}},
      {"KR40 CAN card", kr40.get(), fdtCAN_IF_VI_CAN_CARD_X, At(1), Variant{}, E_FAULTBOX, {200, 4, 0}},
      {"KR60 board and channel", kr60.get(), fdtCAN_IF_LINKBOX_USB, At(2), At(3), FAULTBOX_OK, {4, 2, 3}},
      {"KR60 channel only", kr60.get(), fdtCAN_IF_LINKBOX_USB, Variant{}, At(0), FAULTBOX_OK, {4, 2, 0}},
      {"KR60 board past a byte",
       kr60.get(),
       fdtCAN_IF_LINKBOX_USB,
       At(257),
       Variant{},
       E_FAULTBOX_INVALID_PARAMETER,
       {4, 2, 0}},
      {"KR60 value no number",
       kr60.get(),
       fdtCAN_IF_LINKBOX_USB,
       Named("x"),
       Variant{},
       E_FAULTBOX_INVALID_PARAMETER,
       {4, 2, 0}},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(c.system->SetInterfaceParameter(c.type, c.first, c.second), c.result) << c.name;
    std::array<std::int32_t, 3> read{};
    EXPECT_EQ(c.system->InterfaceParameter(read[0], read[1], read[2]), FAULTBOX_OK);
    EXPECT_EQ(read, c.after) << c.name;
  }

  // A system that never read its pin file has no interface settings.
  QFCSystem unopened("Unopened", bench.File("kr40.csv"), 1, "", "");
  std::array<std::int32_t, 3> read = {7, 7, 7};
  EXPECT_EQ(QFCSystemImpl::Of(unopened)->InterfaceParameter(read[0], read[1], read[2]), FAULTBOX_OK);
  EXPECT_EQ(read, (std::array<std::int32_t, 3>{-1, -1, -1}));
}

// Every wrapper reached from a system fails with the kept text once the
// system is closed, and can still be released.
TEST(AutomationModelTest, KeptReferencesOfAClosedSystemFailWithTheKeptText) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  ASSERT_TRUE(system);
  auto pattern = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}});
  auto pin = AutomationBench::Pin(*pattern, 0);
  std::shared_ptr<QFCFailurePatternsImpl> patterns;
  std::shared_ptr<QFCFailureClassesImpl> classes;
  std::shared_ptr<QFCFailureClassImpl> failureClass;
  std::shared_ptr<QFCFailurePatternPinsImpl> pins;
  ASSERT_EQ(system->get_FailurePatterns(patterns), FAULTBOX_OK);
  ASSERT_EQ(system->get_FailureClasses(classes), FAULTBOX_OK);
  ASSERT_EQ(classes->Item(At(0), failureClass), FAULTBOX_OK);
  ASSERT_EQ(pattern->get_Pins(pins), FAULTBOX_OK);
  std::shared_ptr<QFCEnumVariant> enumerator;
  ASSERT_EQ(pins->get__NewEnum(enumerator), FAULTBOX_OK);

  ASSERT_EQ(system->Close(), FAULTBOX_OK);
  const std::string kept = ResourceString(8907);
  std::string text;
  std::int32_t number = 0;
  VARIANT_BOOL flag = 0;
  std::uint32_t fetched = 0;
  QFTObjectArray items;
  const std::function<HRESULT()> calls[] = {
      [&] { return system->get_Name(text); },
      [&] { return system->Connect(); },
      [&] { return system->Close(); },
      [&] { return patterns->get_Count(number); },
      [&] { return classes->get_Version(text); },
      [&] { return failureClass->get_ID(number); },
      [&] { return pattern->IsActivated(flag); },
      [&] { return pattern->Reset(); },
      [&] { return pins->get_Count(number); },
      [&] { return pin->get_Name(text); },
      [&] { return pin->Select(); },
      [&] { return enumerator->Next(1, items, fetched); },
      [&] { return enumerator->Reset(); },
  };
  for (std::size_t i = 0; i < std::size(calls); ++i) {
    EXPECT_EQ(calls[i](), E_FAULTBOX) << i;
    EXPECT_EQ(LastError(), kept) << i;
  }
  EXPECT_FALSE(system->IsAttached());
  std::int32_t count = -1;
  EXPECT_EQ(bench.systems().get_Count(count), FAULTBOX_OK);
  EXPECT_EQ(count, 0);
  // Released after the model is gone, in any order.
  system.reset();
  pin.reset();
  enumerator.reset();
  pins.reset();
  pattern.reset();
  bench.DropRoot();
  failureClass.reset();
}

TEST(AutomationModelTest, EndOfTheRootDetachesWhatScriptsKeep) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  std::shared_ptr<QFCSystemsImpl> systems;
  ASSERT_EQ(bench.root().get_Systems(systems), FAULTBOX_OK);
  bench.DropRoot();
  std::int32_t count = 0;
  EXPECT_EQ(systems->get_Count(count), E_FAULTBOX);
  EXPECT_EQ(system->Connect(), E_FAULTBOX);
  EXPECT_EQ(LastError(), ResourceString(8907));
}

TEST(AutomationModelTest, EnumeratorWalksTheLiveCollection) {
  AutomationBench bench;
  auto first = bench.Open("a.fss", false);
  auto second = bench.Open("b.fss", false);
  std::shared_ptr<QFCEnumVariant> enumerator;
  ASSERT_EQ(bench.systems().get__NewEnum(enumerator), FAULTBOX_OK);
  QFTObjectArray items;
  std::uint32_t fetched = 0;
  ASSERT_EQ(enumerator->Next(1, items, fetched), S_OK);
  EXPECT_EQ(items, (QFTObjectArray{first}));
  // Appended behind the position: the walk shows it.
  auto third = bench.Open("c.fss", false);
  EXPECT_EQ(enumerator->Next(5, items, fetched), S_FALSE);
  EXPECT_EQ(fetched, 2u);
  EXPECT_EQ(items, (QFTObjectArray{second, third}));
  EXPECT_EQ(enumerator->Next(1, items, fetched), S_FALSE);
  EXPECT_EQ(fetched, 0u);
  EXPECT_TRUE(items.empty());
  // Reset after a complete walk starts again at the first.
  ASSERT_EQ(enumerator->Reset(), S_OK);
  ASSERT_EQ(enumerator->Next(1, items, fetched), S_OK);
  EXPECT_EQ(items, (QFTObjectArray{first}));

  struct SkipCase {
    std::uint32_t from;
    std::uint32_t count;
    HRESULT result;
    std::shared_ptr<QFCSystemImpl> next;  // what Next gives afterwards
  } skips[] = {
      {0, 1, S_OK, second},
      {0, 2, S_OK, third},
      {1, 1, S_OK, third},
      {0, 3, E_FAULTBOX_INVALID_PARAMETER, nullptr},  // reaches the end
      {2, 5, E_FAULTBOX_INVALID_PARAMETER, nullptr},  // would pass it
      {0, 0xFFFFFFFFu, E_FAULTBOX_INVALID_PARAMETER, nullptr},
  };
  for (const SkipCase& s : skips) {
    enumerator->Reset();
    if (s.from) enumerator->Skip(s.from);
    EXPECT_EQ(enumerator->Skip(s.count), s.result) << s.from << "+" << s.count;
    enumerator->Next(1, items, fetched);
    EXPECT_EQ(items.empty() ? nullptr : items.front(), std::shared_ptr<QFCAutomationObject>(s.next))
        << s.from << "+" << s.count;
  }
  std::shared_ptr<QFCEnumVariant> clone = enumerator;
  EXPECT_EQ(enumerator->Clone(clone), E_NOTIMPL);
  EXPECT_EQ(clone, nullptr);

  // A collection that shrinks under the position gives nothing more.
  enumerator->Reset();
  enumerator->Skip(2);
  ASSERT_EQ(third->Close(), FAULTBOX_OK);
  ASSERT_EQ(second->Close(), FAULTBOX_OK);
  EXPECT_EQ(enumerator->Next(1, items, fetched), S_FALSE);
  EXPECT_EQ(fetched, 0u);
}

TEST(AutomationModelTest, PatternAndPinCollections) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  auto alpha = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}, {"P1", "Brake"}, {"P2", "Engine"}});
  auto beta = bench.MakePattern(*system, "Beta", {});
  std::shared_ptr<QFCFailurePatternsImpl> patterns;
  ASSERT_EQ(system->get_FailurePatterns(patterns), FAULTBOX_OK);
  std::vector<std::string> names;
  ASSERT_EQ(patterns->get_Names(names), FAULTBOX_OK);
  EXPECT_EQ(names, (std::vector<std::string>{"Alpha", "Beta"}));
  std::shared_ptr<QFCBaseFailurePatternImpl> found;
  EXPECT_EQ(patterns->Item(Named("Beta"), found), FAULTBOX_OK);
  EXPECT_EQ(found, beta);
  EXPECT_NE(dynamic_cast<QFCFailurePatternKR40Impl*>(found.get()), nullptr);
  EXPECT_EQ(patterns->Item(Named("beta"), found), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(LastError(), "No failure pattern has this name or position: \"beta\".");
  EXPECT_EQ(patterns->Item(At(2), found), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(patterns->get_ActivatedFailurePattern(found), FAULTBOX_OK);
  EXPECT_EQ(found, nullptr);

  std::shared_ptr<QFCFailurePatternPinsImpl> pins;
  ASSERT_EQ(alpha->get_Pins(pins), FAULTBOX_OK);
  std::vector<std::array<std::string, 2>> pinNames;
  ASSERT_EQ(pins->get_Names(pinNames), FAULTBOX_OK);
  EXPECT_EQ(pinNames,
            (std::vector<std::array<std::string, 2>>{{"Engine", "P1"}, {"Brake", "P1"}, {"Engine", "P2"}}));
  struct Case {
    Variant index;
    std::string ecu;
    HRESULT result;
    int position;
  } cases[] = {
      {Named("P1"), "", FAULTBOX_OK, 0},
      {Named("P1"), "Brake", FAULTBOX_OK, 1},
      {At(2), "", FAULTBOX_OK, 2},
      {Named("P2"), "Brake", E_FAULTBOX_INVALID_PARAMETER, -1},
      {At(3), "", E_FAULTBOX_INVALID_PARAMETER, -1},
      {Variant{}, "", E_FAULTBOX_INVALID_PARAMETER, -1},
  };
  for (const Case& c : cases) {
    std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
    EXPECT_EQ(pins->Item(c.index, c.ecu, pin), c.result) << c.ecu << c.position;
    if (c.position >= 0) {
      EXPECT_EQ(pin, AutomationBench::Pin(*alpha, c.position));
    }
  }

  // The extensions: a pin the system lacks, removal of a pin and a pattern.
  std::shared_ptr<QFCBaseFailurePatternPinImpl> added;
  EXPECT_EQ(pins->Add("P9", "Engine", added), E_FAULTBOX_INVALID_PARAMETER);
  auto removed = AutomationBench::Pin(*alpha, 1);
  EXPECT_EQ(pins->Remove(Named("P1"), "Brake"), FAULTBOX_OK);
  EXPECT_FALSE(removed->IsAttached());
  std::int32_t count = 0;
  EXPECT_EQ(pins->get_Count(count), FAULTBOX_OK);
  EXPECT_EQ(count, 2);
  EXPECT_EQ(patterns->Remove(At(0)), FAULTBOX_OK);
  EXPECT_FALSE(alpha->IsAttached());
  EXPECT_EQ(pins->get_Count(count), E_FAULTBOX);
  EXPECT_EQ(patterns->Add("Beta", found), E_FAULTBOX_NAME_NOT_UNIQUE);
}

// A pin array is checked whole before anything is selected or sent.
TEST(AutomationModelTest, ActivateRefusesABadPinArrayBeforeTouchingAnything) {
  AutomationBench bench;
  MessageCapture capture;
  auto system = bench.Open("a.fss", false);
  auto alpha = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}, {"P2", "Engine"}});
  auto beta = bench.MakePattern(*system, "Beta", {{"P1", "Brake"}});
  auto own = AutomationBench::Pin(*alpha, 0);
  auto second = AutomationBench::Pin(*alpha, 1);
  auto foreign = AutomationBench::Pin(*beta, 0);
  ASSERT_EQ(own->SetFailureClass(1), FAULTBOX_OK);
  ASSERT_EQ(own->Select(), FAULTBOX_OK);
  auto gone = AutomationBench::Pin(*beta, 0);
  auto gamma = bench.MakePattern(*system, "Gamma", {{"P2", "Engine"}});
  auto detached = AutomationBench::Pin(*gamma, 0);
  std::shared_ptr<QFCFailurePatternsImpl> patterns;
  EXPECT_EQ(system->get_FailurePatterns(patterns), FAULTBOX_OK);
  ASSERT_EQ(patterns->Remove(Named("Gamma")), FAULTBOX_OK);

  struct Case {
    const char* name;
    Variant pins;
    HRESULT result;
    std::string text;
  } cases[] = {
      {"pin of another pattern", Variant{QFTObjectArray{own, foreign}}, E_FAULTBOX_INVALID_PARAMETER, ""},
      {"detached pin", Variant{QFTObjectArray{own, detached}}, E_FAULTBOX_INVALID_PARAMETER, ""},
      {"not a pin", Variant{QFTObjectArray{own, system}}, E_FAULTBOX_INVALID_PARAMETER, ""},
      {"null element", Variant{QFTObjectArray{own, nullptr}}, E_FAULTBOX_INVALID_PARAMETER, ""},
      {"a pin alone", Variant{std::shared_ptr<QFCAutomationObject>(own)}, E_FAULTBOX_INVALID_PARAMETER, ""},
      {"a number", At(0), E_FAULTBOX_INVALID_PARAMETER, ""},
      {"pin without class", Variant{QFTObjectArray{own, second}}, E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED,
       "Pin P2 of ECU Engine has no failure class."},
  };
  for (const Case& c : cases) {
    capture.Clear();
    EXPECT_EQ(alpha->Activate(c.pins), c.result) << c.name;
    EXPECT_EQ(LastError(), c.text) << c.name;
    // The selection is as it was and the transfer was never started.
    VARIANT_BOOL selected = 0;
    EXPECT_EQ(own->IsSelected(selected), FAULTBOX_OK);
    EXPECT_EQ(selected, VARIANT_TRUE) << c.name;
    EXPECT_EQ(capture.Find(164), nullptr) << c.name;
  }
  // A valid array goes on to the transfer, which finds no connection.
  EXPECT_EQ(alpha->Activate(Variant{QFTObjectArray{own}}), E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE);
  EXPECT_EQ(capture.Find(165), nullptr);
  (void)gone;
}

// Reset of an activated pattern or pin changes nothing; the activation is
// marked on the model, as no hardware takes part.
TEST(AutomationModelTest, ResetOfAnActivatedPatternOrPinChangesNothing) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  auto pattern = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}, {"P2", "Engine"}});
  auto first = AutomationBench::Pin(*pattern, 0);
  auto second = AutomationBench::Pin(*pattern, 1);
  QFCAbstractFailurePatternPin* model = first->GetOwner();
  model->SetPinConfigs({1, 0, 1, 0, 0});
  second->GetOwner()->SetPinConfigs({0, 1, 0, 0, 0});
  model->SetActivated(true);

  EXPECT_EQ(pattern->Reset(), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);
  EXPECT_EQ(LastError(), ResourceString(8912));
  EXPECT_EQ(first->Reset(), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);
  std::vector<std::int32_t> config;
  EXPECT_EQ(first->get_PinConfig(config), FAULTBOX_OK);
  EXPECT_EQ(config, (std::vector<std::int32_t>{1, 0, 1, 0, 0}));
  EXPECT_EQ(second->get_PinConfig(config), FAULTBOX_OK);
  EXPECT_EQ(config, (std::vector<std::int32_t>{0, 1, 0, 0, 0}));
  VARIANT_BOOL activated = 0;
  EXPECT_EQ(pattern->IsActivated(activated), FAULTBOX_OK);
  EXPECT_EQ(activated, VARIANT_TRUE);
  std::shared_ptr<QFCFailurePatternsImpl> patterns;
  std::shared_ptr<QFCBaseFailurePatternImpl> found;
  EXPECT_EQ(system->get_FailurePatterns(patterns), FAULTBOX_OK);
  EXPECT_EQ(patterns->get_ActivatedFailurePattern(found), FAULTBOX_OK);
  EXPECT_EQ(found, pattern);
  // Closing is refused too: the system would go with its relays switched.
  EXPECT_EQ(system->Close(), E_FAULTBOX);
  EXPECT_EQ(bench.systems().CloseAll(), E_FAULTBOX);
  EXPECT_TRUE(system->IsAttached());
  EXPECT_EQ(patterns->Remove(Named("Alpha")), E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED);

  // A pin that is not activated resets alone: nothing is switched on.
  auto switchedOn = [](const std::vector<std::int32_t>& entries) {
    return std::count(entries.begin(), entries.end(), 1);
  };
  EXPECT_EQ(second->Reset(), FAULTBOX_OK);
  EXPECT_EQ(second->get_PinConfig(config), FAULTBOX_OK);
  EXPECT_EQ(switchedOn(config), 0);
  EXPECT_EQ(first->get_PinConfig(config), FAULTBOX_OK);
  EXPECT_EQ(switchedOn(config), 2);
  model->SetActivated(false);
  EXPECT_EQ(pattern->Reset(), FAULTBOX_OK);
  EXPECT_EQ(first->get_PinConfig(config), FAULTBOX_OK);
  EXPECT_EQ(switchedOn(config), 0);
}

TEST(AutomationModelTest, PinValuesAndFailureClasses) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  auto pattern = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}});
  auto pin = AutomationBench::Pin(*pattern, 0);
  auto* kr40 = dynamic_cast<QFCFailurePatternKR40PinImpl*>(pin.get());
  ASSERT_NE(kr40, nullptr);
  std::int32_t id = 7;
  std::int32_t vector = 7;
  ASSERT_EQ(pin->get_AdjustedFailureClassID(id, vector), FAULTBOX_OK);
  EXPECT_EQ(id, 0);
  EXPECT_EQ(vector, -1);
  std::shared_ptr<QFCFailureClassImpl> adjusted;
  EXPECT_EQ(pin->get_AdjustedFailureClass(adjusted), FAULTBOX_OK);
  EXPECT_EQ(adjusted, nullptr);
  EXPECT_EQ(pin->Select(), E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED);

  std::vector<std::int32_t> list;
  ASSERT_EQ(pin->get_DefinedFailureClasses(list), FAULTBOX_OK);
  EXPECT_EQ(list, (std::vector<std::int32_t>{1, 2}));
  ASSERT_EQ(pin->get_ModuleChannel(list), FAULTBOX_OK);
  EXPECT_EQ(list, (std::vector<std::int32_t>{1}));
  std::int32_t address = 0;
  ASSERT_EQ(kr40->get_ModuleAddress(address), FAULTBOX_OK);
  EXPECT_EQ(address, 0x7F);

  EXPECT_EQ(pin->SetFailureClass(2, Named("one")), E_FAULTBOX_INVALID_PARAMETER);
  EXPECT_EQ(pin->SetFailureClass(3), E_FAULTBOX);  // not a class of the pin
  ASSERT_EQ(pin->SetFailureClass(2, At(0)), FAULTBOX_OK);
  ASSERT_EQ(pin->get_AdjustedFailureClassID(id, vector), FAULTBOX_OK);
  EXPECT_EQ(id, 2);
  EXPECT_EQ(vector, 0);
  ASSERT_EQ(pin->get_AdjustedFailureClass(adjusted), FAULTBOX_OK);
  ASSERT_NE(adjusted, nullptr);
  std::string name;
  std::int32_t size = 0;
  EXPECT_EQ(adjusted->get_Name(name), FAULTBOX_OK);
  EXPECT_EQ(name, "Class 2");
  EXPECT_EQ(adjusted->get_RelayVectorSize(size), FAULTBOX_OK);
  EXPECT_EQ(size, 1);
  EXPECT_EQ(pin->Select(), FAULTBOX_OK);

  // The same class object comes as the same wrapper from either side.
  std::shared_ptr<QFCFailureClassesImpl> classes;
  std::shared_ptr<QFCFailureClassImpl> item;
  ASSERT_EQ(system->get_FailureClasses(classes), FAULTBOX_OK);
  EXPECT_EQ(classes->Item(Named("Class 2"), item), FAULTBOX_OK);
  EXPECT_EQ(item, adjusted);
  std::vector<std::string> names;
  EXPECT_EQ(classes->get_Names(names), FAULTBOX_OK);
  EXPECT_EQ(names, (std::vector<std::string>{"Class 1", "Class 2", "Class 3"}));
  EXPECT_EQ(classes->get_Version(name), FAULTBOX_OK);
  EXPECT_EQ(name, "1.0");
  // A class that leaves the collection leaves its wrapper detached.
  QFCSystem* model = system->GetOwner();
  model->GetFailureClasses()->RemoveAll();
  EXPECT_EQ(item->get_Name(name), E_FAULTBOX);
  EXPECT_EQ(LastError(), ResourceString(8907));
}

TEST(AutomationModelTest, FiuRelayStateShowsTheSwitchedRelaysAsClearedBits) {
  AutomationBench bench;
  auto system = bench.Open("a.fsa", true);
  auto pattern = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}, {"P2", "Engine"}});
  auto* kr60 = dynamic_cast<QFCFailurePatternKR60Impl*>(pattern.get());
  ASSERT_NE(kr60, nullptr);
  std::string state;
  ASSERT_EQ(kr60->get_FIURelayState(state), FAULTBOX_OK);
  EXPECT_EQ(state, "0xFFFFFFFFFFFFFFFF");

  // Classes whose relay vectors switch FIU relays on, given to the pins as
  // the interlock would give them.
  QFCAbstractFailureClasses* classes = system->GetOwner()->GetFailureClasses();
  auto addClass = [&](std::int32_t id, std::initializer_list<std::size_t> on) {
    QFCAbstractFailureClass& fc = classes->AddFailureClass();
    fc.SetId(id);
    QFTPossibility vector(kRelayPositions, kRelayAny);
    for (std::size_t position : on) vector.Set(position, kRelayOn, 0, 0);
    fc.AddPossibility(vector);
  };
  addClass(10, {0, 5, 6});
  addClass(11, {42});
  auto first = AutomationBench::Pin(*pattern, 0);
  auto second = AutomationBench::Pin(*pattern, 1);
  ASSERT_TRUE(first->GetOwner()->SetFailureClass({{10, 0}}));
  ASSERT_EQ(kr60->get_FIURelayState(state), FAULTBOX_OK);
  EXPECT_EQ(state, "0xFFFFFFFFFFFFFFFC");
  ASSERT_TRUE(second->GetOwner()->SetFailureClass({{11, 0}}));
  ASSERT_EQ(kr60->get_FIURelayState(state), FAULTBOX_OK);
  EXPECT_EQ(state, "0xFFFFFFDFFFFFFFFC");

  ASSERT_EQ(kr60->get_RsimRelayState(state), FAULTBOX_OK);
  EXPECT_EQ(state, "0xFFFFFFFF");
  EXPECT_EQ(kr60->put_ResistorValue(0x20000), E_FAULTBOX_INVALID_PARAMETER);
  ASSERT_EQ(kr60->put_ResistorValue(32), FAULTBOX_OK);
  std::int32_t value = 0;
  ASSERT_EQ(kr60->get_ResistorValue(value), FAULTBOX_OK);
  EXPECT_EQ(value, 32);

  auto* pin = dynamic_cast<QFCFailurePatternKR60PinImpl*>(first.get());
  ASSERT_NE(pin, nullptr);
  std::int32_t cabinet = -1, rack = -1, slot = -1;
  ASSERT_EQ(pin->get_ModuleAddress(cabinet, rack, slot), FAULTBOX_OK);
  EXPECT_EQ((std::array<std::int32_t, 3>{cabinet, rack, slot}), (std::array<std::int32_t, 3>{0, 1, 2}));
}

TEST(AutomationModelTest, SaveStoresTheScriptsChanges) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  bench.MakePattern(*system, "Made by a script", {{"P2", "Engine"}});
  ASSERT_EQ(system->Save(), FAULTBOX_OK);
  const std::string path = bench.File("a.fss");
  ASSERT_EQ(system->Close(), FAULTBOX_OK);

  std::shared_ptr<QFCSystemImpl> reopened;
  ASSERT_EQ(bench.systems().Open(path, reopened), FAULTBOX_OK);
  std::shared_ptr<QFCFailurePatternsImpl> patterns;
  std::vector<std::string> names;
  EXPECT_EQ(reopened->get_FailurePatterns(patterns), FAULTBOX_OK);
  EXPECT_EQ(patterns->get_Names(names), FAULTBOX_OK);
  EXPECT_EQ(names, (std::vector<std::string>{"Made by a script"}));
  EXPECT_NE(reopened, system);
}

// While a member runs, the document and its views can tell that a script
// called: they leave out their questions.
class CallWatcher : public QFCObjectObserver {
 public:
  void OnUpdate(QFCAbstractObjectData*, int, void*) override {
    seen.push_back(QFCAutomationCall::InProgress());
  }
  std::vector<bool> seen;
};

TEST(AutomationModelTest, TheCallMarkHoldsOnlyWhileAMemberRuns) {
  AutomationBench bench;
  auto system = bench.Open("a.fss", false);
  auto pattern = bench.MakePattern(*system, "Alpha", {{"P1", "Engine"}});
  auto pin = AutomationBench::Pin(*pattern, 0);
  ASSERT_EQ(pin->SetFailureClass(1), FAULTBOX_OK);
  CallWatcher watcher;
  system->GetOwner()->AddObserver(&watcher);
  EXPECT_FALSE(QFCAutomationCall::InProgress());
  ASSERT_EQ(pin->Select(), FAULTBOX_OK);
  EXPECT_FALSE(QFCAutomationCall::InProgress());
  system->GetOwner()->RemoveObserver(&watcher);
  ASSERT_FALSE(watcher.seen.empty());
  for (bool inProgress : watcher.seen) EXPECT_TRUE(inProgress);
}

}  // namespace
}  // namespace faultbox

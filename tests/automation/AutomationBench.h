// Documents saved into a temporary bench and opened through the root object
// of the automation model, as a script does.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>

#include "automation/QFCAutomationCall.h"
#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternImpl.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "automation/QFCFailurePatternPinsImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemImpl.h"
#include "automation/QFCSystemsImpl.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"
#include "systems/SystemTestBench.h"

namespace faultbox::test {

// The description of the calling thread's error information, "" without one.
inline std::string LastError() {
  QFTErrorInfo info;
  return GetErrorInfo(info) ? info.description : std::string();
}

class AutomationBench {
 public:
  AutomationBench() {
    kr40Pins_ = files_.Write("kr40.csv", PinFile::KR40());
    kr60Pins_ = files_.Write("kr60.csv", PinFile::KR60());
    // After the pin files: writing them writes the sample classes too.
    files_.WriteFile("kr40.fcd", KR40Classes());
    root_ = QFCFaultInjectionImpl::Create();
    EXPECT_EQ(root_->get_Systems(systems_), FAULTBOX_OK);
  }

  // Classes 1 to 3 of the KR40 family: load relay 0, 1 or 2 on, the others
  // off; a pin whose PinConfig switches nothing on has no class.
  static std::string KR40Classes() {
    auto classes = QFCAbstractFailureClasses::Create(1);
    classes->SetVersion("1.0");
    for (int id = 1; id <= 3; ++id) {
      QFCAbstractFailureClass& fc = classes->AddFailureClass();
      fc.SetId(id);
      fc.SetName("Class " + std::to_string(id));
      QFTPossibility vector(kRelayPositions, kRelayOff);
      vector.Set(static_cast<std::size_t>(id - 1), kRelayOn, 0, 0);
      fc.AddPossibility(vector);
    }
    const std::vector<std::uint8_t> bytes = StoreFailureClasses(*classes);
    return std::string(bytes.begin(), bytes.end());
  }

  // Saves a new document of the pin file as `name`; `build` may add to its
  // system first. Answers the document's path.
  std::string SaveDocument(const std::string& name, bool kr60,
                           const std::function<void(QFCSystem&)>& build = {}) const {
    QFCSystemAdmin admin;
    const std::string path = files_.File(name);
    QFCFaultboxDoc doc(admin, QFCFaultboxDoc::PlatformOfPath(path));
    EXPECT_TRUE(doc.OnNewDocument(kr60 ? kr60Pins_ : kr40Pins_, 1, "Tester", "Rig 7"));
    if (build) build(*doc.GetSystem());
    EXPECT_TRUE(doc.OnSaveDocument(path));
    return path;
  }

  // Saves and opens a document; nullptr on failure.
  std::shared_ptr<QFCSystemImpl> Open(const std::string& name, bool kr60) {
    std::shared_ptr<QFCSystemImpl> system;
    EXPECT_EQ(systems_->Open(SaveDocument(name, kr60), system), FAULTBOX_OK) << LastError();
    return system;
  }

  // A pattern of the system with the listed pins (pin, ECU), made through the
  // model's extensions.
  std::shared_ptr<QFCBaseFailurePatternImpl> MakePattern(
      QFCSystemImpl& system, const std::string& name,
      std::initializer_list<std::pair<const char*, const char*>> pins) {
    std::shared_ptr<QFCFailurePatternsImpl> patterns;
    std::shared_ptr<QFCBaseFailurePatternImpl> pattern;
    EXPECT_EQ(system.get_FailurePatterns(patterns), FAULTBOX_OK);
    EXPECT_EQ(patterns->Add(name, pattern), FAULTBOX_OK);
    std::shared_ptr<QFCFailurePatternPinsImpl> collection;
    EXPECT_EQ(pattern->get_Pins(collection), FAULTBOX_OK);
    for (const auto& [pin, ecu] : pins) {
      std::shared_ptr<QFCBaseFailurePatternPinImpl> added;
      EXPECT_EQ(collection->Add(pin, ecu, added), FAULTBOX_OK) << pin << " " << ecu;
    }
    return pattern;
  }

  static std::shared_ptr<QFCBaseFailurePatternPinImpl> Pin(QFCBaseFailurePatternImpl& pattern, int index) {
    std::shared_ptr<QFCFailurePatternPinsImpl> pins;
    std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
    EXPECT_EQ(pattern.get_Pins(pins), FAULTBOX_OK);
    EXPECT_EQ(pins->Item(Variant{std::int64_t{index}}, pin), FAULTBOX_OK);
    return pin;
  }

  QFCSystemsImpl& systems() { return *systems_; }
  QFCFaultInjectionImpl& root() { return *root_; }
  const Bench& files() const { return files_; }
  std::string File(const std::string& name) const { return files_.File(name); }
  // Discards every document, as a script's end does.
  void DropRoot() {
    systems_.reset();
    root_.reset();
  }

 private:
  Bench files_;
  std::string kr40Pins_;
  std::string kr60Pins_;
  std::shared_ptr<QFCFaultInjectionImpl> root_;
  std::shared_ptr<QFCSystemsImpl> systems_;
};

}  // namespace faultbox::test

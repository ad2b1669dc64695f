// What the activation benchmarks share: a temporary folder with its own
// settings, failure class file and pin file, a simulated bench, a system
// opened from the pin file, and one pattern holding every pin with the
// classes taking turns.
#pragma once

#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "comm/QFCAbstractTransferInterface.h"
#include "config/FailureClassLoader.h"
#include "config/QFCAbstractFailureClasses.h"
#include "config/QFCECU.h"
#include "platform/ResultCodes.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "platform/CanAccess.h"
#include "platform/Settings.h"
#include "systems/QFCSystem.h"

namespace faultbox::bench {

template <class Simulator>
class SimulatedRig {
 public:
  using ClassFiller = void (*)(QFCAbstractFailureClasses&);

  ~SimulatedRig() {
    if (system_ && system_->GetTransferInterface()) system_->GetTransferInterface()->Connect(false, 0, 0);
    system_.reset();
    if (sim_) sim_->Stop();
    CanChannelTable::SetOverride({});
    Settings::SetPathOverride("");
    std::filesystem::remove_all(dir_, ignored_);
  }

  // Empty when the rig is ready.
  const std::string& error() const { return error_; }
  QFCAbstractFailurePattern& pattern() { return *pattern_; }
  Simulator& sim() { return *sim_; }

 protected:
  // A fresh folder `name` with the settings (answer wait `timeout` passes),
  // classes.fcd and bench.csv; the pin file's path.
  std::string PrepareFolder(const std::string& name, const char* timeout, std::int32_t platform,
                            ClassFiller fill, const std::string& pinText) {
    dir_ = std::filesystem::temp_directory_path() / name;
    std::filesystem::remove_all(dir_, ignored_);
    std::filesystem::create_directories(dir_);
    Settings::SetPathOverride((dir_ / "faultbox.ini").string());
    Settings::SetString(Settings::kComponentSection, "Timeout", timeout);
    auto classes = QFCAbstractFailureClasses::Create(platform);
    classes->SetVersion("bench");
    fill(*classes);
    const auto bytes = StoreFailureClasses(*classes);
    std::ofstream((dir_ / "classes.fcd").string(), std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    const std::string pinFile = (dir_ / "bench.csv").string();
    std::ofstream(pinFile, std::ios::binary) << pinText;
    return pinFile;
  }

  // The system of the pin file with the benchmark's classes; "" or what went wrong.
  std::string OpenSystem(const std::string& pinFile, ClassFiller fill) {
    system_ = std::make_unique<QFCSystem>("Bench", pinFile, 1, "", "");
    if (system_->OpenFromPinFile() != FAULTBOX_OK || system_->GetFailureClasses() == nullptr)
      return "the system could not be opened from the pin file";
    fill(*system_->GetFailureClasses());
    return "";
  }

  // The pattern of all `pins` pins in pin file order, classes 1 to 3 taking turns.
  std::string BuildPattern(int pins) {
    std::vector<QFCAbstractPin*> all;
    for (QFCECU* ecu : system_->GetECUs())
      for (int i = 0; i < ecu->GetPinCount(); ++i) all.push_back(ecu->GetPin(i));
    if (system_->CreatePattern("Bench", pattern_) != FAULTBOX_OK || pattern_ == nullptr)
      return "the pattern could not be created";
    if (!pattern_->AddPins(all) || pattern_->GetPinCount() != pins) return "the pattern does not hold all pins";
    for (int i = 0; i < pins; ++i)
      if (pattern_->SetFailureClass(pattern_->GetPinAt(i), i % 3 + 1, 0) != FAULTBOX_OK)
        return "pin " + std::to_string(i) + " takes no failure class";
    pattern_->SelectAllPins(true);
    return "";
  }

  std::filesystem::path dir_;
  std::error_code ignored_;
  std::string error_;
  std::unique_ptr<Simulator> sim_;
  std::unique_ptr<QFCSystem> system_;
  QFCAbstractFailurePattern* pattern_ = nullptr;
};

}  // namespace faultbox::bench

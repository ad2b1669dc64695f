// Reads arbitrary bytes as a document of either kind against a small bench of
// both platforms, as the cockpit or the command line opens one. A load must
// fail cleanly and leave no system behind, or give a system that stores
// itself; what it stores must load again, and saving must settle on one form.
#include <stdlib.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "config/FailureClassLoader.h"
#include "config/FailureClassSource.h"
#include "config/QFCAbstractHardwareInfo.h"
#include "config/QFCECU.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternNode.h"
#include "patterns/QFCFailurePatternPins.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"
#include "platform/FileHelper.h"
#include "platform/Settings.h"
#include "systems/QFCFaultboxDoc.h"
#include "systems/QFCSystem.h"
#include "systems/QFCSystemAdmin.h"

namespace {

using namespace faultbox;

const char* const kKR40PinFile =
    "/Comment\r\nFuzz bench\r\n/CommentEnd\r\n/Format\r\nBoardType;KR40\r\nAdditionalFiles;none\r\n"
    "FaultClassFile;kr40.fcd\r\n/FormatEnd\r\n/Signallist\r\ncolumns\r\n"
    "pin_name(1);ecu_name(1);faults_ecu(1);fiu_module_id;fiu_module_channel\r\n\r\n\r\n\r\n"
    "P1;Engine;1,2,3;10;1\r\nP2;Engine;2,3;10;2\r\nP1;Brake;1,3;11;1\r\n/SignallistEnd\r\n";

const char* const kKR60PinFile =
    "/Comment\r\nFuzz bench\r\n/CommentEnd\r\n/Format\r\nBoardType;KR60\r\nAdditionalFiles;none\r\n"
    "FaultClassFile;kr60.fcd\r\nPotential0;UBATT\r\nPotential1;GND\r\nPotential2;none\r\nPotential3;none\r\n"
    "Potential4;U5V\r\nOffsetCANAddress;none\r\nOffsetLoadAddress;10\r\nOffsetPowerSwitchAddress;none\r\n"
    "FIULoadAddress;0_15_1\r\nRSIMLoadAddress;0_15_2\r\nFIUCANAddress;none\r\nRSIMCANAddress(1);none\r\n"
    "RSIMCANAddress(2);none\r\n/FormatEnd\r\n/Signallist\r\ncolumns\r\n"
    "pin_name(1);ecu_name(1);faults_ecu(1);load_channels_required;load_module_id;load_module_channel\r\n"
    "\r\n\r\n\r\nA1;Engine;1,2;1;0_1_1;1\r\nA2;Engine;1,2,3;2;0_1_1;2,3\r\nS1;Airbag;1,3;1;0_1_2;1\r\n"
    "/SignallistEnd\r\n";

const char* const kKR40Classes = R"({"version": "fuzz", "platform": "KR40", "classes": [
  {"id": 1, "name": "Open line", "relayVectors": [{"on": [0]}]},
  {"id": 2, "name": "Short to battery", "relayVectors": [{"on": [1]}, {"on": [0, 1]}]},
  {"id": 3, "name": "Short to ground", "relayVectors": [{"on": [2]}, {"on": [0, 2]}]}]})";

const char* const kKR60Classes = R"({"version": "fuzz", "platform": "KR60", "classes": [
  {"id": 1, "name": "Open line", "relayVectors": [{"on": [2]}]},
  {"id": 2, "name": "Short to potential", "relayVectors": [{"on": [0, 10], "any": [5, 6, 7, 8, 9]}]},
  {"id": 3, "name": "Pin to pin", "useLimit": 1, "relayVectors": [{"on": [0]}, {"on": [1]}]}]})";

void WriteFile(const std::string& path, const std::string& text) {
  std::ofstream(path, std::ios::binary) << text;
}

void WriteClasses(const std::string& path, const char* source) {
  std::unique_ptr<QFCAbstractFailureClasses> classes;
  if (ParseFailureClassSource(source, path, &classes) != FAULTBOX_OK) __builtin_trap();
  const std::vector<std::uint8_t> bytes = StoreFailureClasses(*classes);
  WriteFile(path, std::string(bytes.begin(), bytes.end()));
}

// The bench's folder, made once: pin files "kr40.csv" and "kr60.csv" with
// their failure class files, and a settings file of its own.
const std::string& BenchFolder() {
  // Kept for the whole run: the exit handler below still needs it.
  static const std::string& folder = *new std::string([] {
    char name[] = "/tmp/faultbox-document-fuzz-XXXXXX";
    if (::mkdtemp(name) == nullptr) __builtin_trap();
    const std::string dir = name;
    WriteFile(dir + "/kr40.csv", kKR40PinFile);
    WriteFile(dir + "/kr60.csv", kKR60PinFile);
    WriteClasses(dir + "/kr40.fcd", kKR40Classes);
    WriteClasses(dir + "/kr60.fcd", kKR60Classes);
    Settings::SetPathOverride(dir + "/faultbox.ini");
    std::atexit([] { std::filesystem::remove_all(BenchFolder()); });
    return dir;
  }());
  return folder;
}

// The pin file a document names, or "" when its head cannot be read. The
// reader may follow it only into the bench: elsewhere on the machine it could
// meet files of any size.
std::string StoredPinFile(const std::vector<std::uint8_t>& bytes, const std::string& path) {
  try {
    Archive ar(bytes);
    ar.ReadU32();
    for (int i = 0; i < 3; ++i) ar.ReadString();
    return QFCFileHelper::GetAbsolutePath(ar.ReadString(), path);
  } catch (const ArchiveException&) {
    return {};
  }
}

// What the views and the command line ask of a loaded document.
void Exercise(QFCSystem& system) {
  for (QFCECU* ecu : system.GetECUs()) ecu->IsEnabled();
  QFCFailurePatterns& patterns = *system.GetFailurePatterns();
  for (int i = 0; i < patterns.GetCount(); ++i) {
    QFCAbstractFailurePattern& pattern = *patterns.GetAt(i);
    for (const auto& pin : pattern.GetPins()->GetList()) {
      std::int32_t id = -1, vector = -1;
      pin->GetAdjustedFailureClass(id, vector);
      pin->IsReadyForActivation();
      pin->GetEcuName();
    }
  }
  std::vector<QFCFailurePatternNode*> folders{system.GetRootFolder()};
  while (!folders.empty()) {
    QFCFailurePatternNode* folder = folders.back();
    folders.pop_back();
    for (int i = 0; i < folder->GetPatternCount(); ++i)
      if (patterns.IndexOf(folder->GetPatternAt(i)) < 0) __builtin_trap();  // a reference to nothing
    for (int i = 0; i < folder->GetChildCount(); ++i) folders.push_back(folder->GetChildAt(i));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string& bench = BenchFolder();
  const std::vector<std::uint8_t> bytes(data, data + size);
  for (std::int32_t platform : {fptKR40Platform, fptKR60Platform}) {
    const std::string path = bench + "/fuzz" + QFCFaultboxDoc::ExtensionOfPlatform(platform);
    const std::string pinFile = StoredPinFile(bytes, path);
    if (pinFile.compare(0, bench.size() + 1, bench + "/") != 0) continue;

    QFCSystemAdmin admin;
    std::vector<std::uint8_t> stored;
    {
      QFCFaultboxDoc doc(admin, platform);
      if (!doc.OpenFromBytes(path, bytes)) {
        if (admin.GetCount() != 0 || doc.GetSystem() != nullptr) __builtin_trap();
        continue;
      }
      if (admin.GetCount() != 1 || doc.GetSystem() == nullptr) __builtin_trap();
      Exercise(*doc.GetSystem());
      stored = doc.StoreToBytes(path);
    }
    if (admin.GetCount() != 0) __builtin_trap();
    // What we write, we read. A damaged file may say two things at once (a
    // pattern pin's names and the names in its own record): the first save
    // settles on one, and from then on saving changes nothing.
    std::vector<std::uint8_t> settled;
    {
      QFCFaultboxDoc again(admin, platform);
      if (!again.OpenFromBytes(path, stored)) __builtin_trap();
      settled = again.StoreToBytes(path);
    }
    QFCFaultboxDoc last(admin, platform);
    if (!last.OpenFromBytes(path, settled)) __builtin_trap();
    if (last.StoreToBytes(path) != settled) __builtin_trap();
  }
  return 0;
}

// `faultbox fcd build` and `faultbox fcd show`: failure class files from their
// readable source, and what a failure class file holds, read with the code a
// system loads it with.
#include <algorithm>
#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Cli.h"
#include "config/FailureClassLoader.h"
#include "config/FailureClassSource.h"
#include "platform/QFCReporter.h"
#include "platform/AtomicFile.h"

namespace faultbox::cli {
namespace {

struct BuildArgs {
  std::string source;
  std::string output;
};

struct ShowArgs {
  std::string file;
  std::string board;
  bool json = false;
};

const char* PlatformName(std::int32_t platform) {
  return platform == kFailureClassPlatformKR40 ? "KR40 family" : "KR60";
}

HRESULT Build(const BuildArgs& args) {
  std::string error;
  std::optional<std::vector<std::uint8_t>> bytes = ReadWholeFile(args.source, &error);
  if (!bytes) {
    TheReporter().ReportError(kMsgCannotReadFile, args.source, error);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }
  std::unique_ptr<QFCAbstractFailureClasses> classes;
  const std::string_view text(reinterpret_cast<const char*>(bytes->data()), bytes->size());
  HRESULT hr = ParseFailureClassSource(text, args.source, &classes);
  if (Failed(hr)) return hr;
  if (!WriteFileAtomic(args.output, StoreFailureClasses(*classes), &error)) {
    TheReporter().ReportError(kMsgCannotWriteFile, args.output, error);
    return E_FAULTBOX_CANN_NOT_OPEN_FILE;
  }
  std::printf("%s: %d failure classes, platform %s, version \"%s\"\n", args.output.c_str(),
              classes->GetCount(), PlatformName(classes->GetPlatform()), classes->GetVersion().c_str());
  return FAULTBOX_OK;
}

// "0, 5, 10-14" for the positions whose state is `state`.
std::string Positions(const QFTPossibility& p, std::uint32_t state) {
  std::string out;
  for (std::size_t k = 0; k < p.Size();) {
    if (p.RelayState(k) != state) {
      ++k;
      continue;
    }
    std::size_t end = k;
    while (end + 1 < p.Size() && p.RelayState(end + 1) == state) ++end;
    if (!out.empty()) out += ", ";
    out += std::to_string(k);
    if (end > k) out += (end == k + 1 ? ", " : "-") + std::to_string(end);
    k = end + 1;
  }
  return out;
}

void PrintPossibility(const QFTPossibility& p, int index) {
  std::printf("  Relay vector %d (%zu positions; positions not listed are off)\n", index, p.Size());
  std::vector<std::uint32_t> states;
  for (std::uint32_t s : p.RelayStates()) {
    if (s != kRelayOff && std::find(states.begin(), states.end(), s) == states.end()) states.push_back(s);
  }
  std::sort(states.begin(), states.end(), [](std::uint32_t a, std::uint32_t b) {
    // on before any before states no source can name
    auto rank = [](std::uint32_t s) { return s == kRelayOn ? 0u : s == kRelayAny ? 1u : 2u + s; };
    return rank(a) < rank(b);
  });
  for (std::uint32_t s : states) {
    std::string label = s == kRelayOn ? "on" : s == kRelayAny ? "any" : "state " + std::to_string(s);
    std::printf("    %-6s %s\n", (label + ":").c_str(), Positions(p, s).c_str());
  }
  std::string steps;
  for (std::size_t k = 0; k < p.Size(); ++k) {
    if (p.FirstNumber(k) == 0 && p.SecondNumber(k) == 0) continue;
    if (!steps.empty()) steps += ", ";
    steps += std::to_string(k) + " (" + std::to_string(p.FirstNumber(k)) + "/" +
             std::to_string(p.SecondNumber(k)) + ")";
  }
  if (!steps.empty())
    std::printf("    steps: %s  [position (activation step/deactivation step)]\n", steps.c_str());
}

void PrintText(const QFCAbstractFailureClasses& classes, const std::string& path) {
  std::printf("File: %s\nVersion: %s\nPlatform: %d (%s)\nFailure classes: %d\n", path.c_str(),
              classes.GetVersion().c_str(), classes.GetPlatform(), PlatformName(classes.GetPlatform()),
              classes.GetCount());
  for (int i = 0; i < classes.GetCount(); ++i) {
    const QFCAbstractFailureClass& c = *classes.GetAt(i);
    std::printf("\nClass %d: %s\n", c.GetId(), c.GetName().c_str());
    if (!c.GetDescription().empty()) std::printf("  Description: %s\n", c.GetDescription().c_str());
    if (!c.GetLimitation().empty()) std::printf("  Limitation: %s\n", c.GetLimitation().c_str());
    if (!c.GetFormat().empty()) std::printf("  Format: %s\n", c.GetFormat().c_str());
    const std::string limit = c.GetUseLimit() == 0 ? "no limit" : std::to_string(c.GetUseLimit());
    const std::string selected =
        c.GetSelectedPossibility() < 0 ? "none" : std::to_string(c.GetSelectedPossibility());
    std::printf("  Use limit: %s; selected relay vector: %s; stored values: %d, %d, %d\n", limit.c_str(),
                selected.c_str(), c.GetStoredValue(0), c.GetStoredValue(1), c.GetStoredValue(2));
    for (int j = 0; j < c.GetPossibilityCount(); ++j) PrintPossibility(*c.GetPossibility(j), j);
  }
}

std::int32_t PlatformOfBoard(const std::string& board) {
  if (board == "KR60" || board == "KR060") return kFailureClassPlatformKR60;
  return kFailureClassPlatformKR40;
}

HRESULT Show(const ShowArgs& args) {
  if (args.file == kDefaultFailureClassFileName && args.board.empty()) {
    throw CLI::ValidationError("FILE", "\"none\" names the default file of a board: give --board");
  }
  const std::int32_t platform = args.board.empty() ? 0 : PlatformOfBoard(args.board);
  std::unique_ptr<QFCAbstractFailureClasses> classes;
  std::string path;
  HRESULT hr = LoadFailureClasses(args.file, platform, args.board, &classes, &path);
  if (Failed(hr)) return hr;
  if (args.json) {
    const std::string text = FailureClassSourceText(*classes);
    std::fwrite(text.data(), 1, text.size(), stdout);
  } else {
    PrintText(*classes, path);
  }
  return FAULTBOX_OK;
}

}  // namespace

void RegisterFcdCommands(CLI::App& app, Context& ctx) {
  auto* fcd = app.add_subcommand("fcd", "Build and show failure class files (.fcd)");
  fcd->require_subcommand(1);

  auto buildArgs = std::make_shared<BuildArgs>();
  auto* build =
      fcd->add_subcommand("build", "Check a failure class source (JSON) and write its failure class file");
  build->add_option("SOURCE", buildArgs->source, "Failure class source (JSON, see docs/failure-classes.md)")
      ->required();
  build->add_option("OUTPUT", buildArgs->output, "Failure class file to write (replaced as a whole)")
      ->required();
  build->callback([&ctx, buildArgs] { ctx.result = Build(*buildArgs); });

  auto showArgs = std::make_shared<ShowArgs>();
  auto* show = fcd->add_subcommand("show", "Print what a failure class file holds");
  show->add_option("FILE", showArgs->file,
                   "Failure class file; \"none\" with --board: the board's default file")
      ->required();
  show->add_flag("--json", showArgs->json, "Print the failure class source (JSON) that `fcd build` accepts");
  show->add_option("--board", showArgs->board,
                   "Board type of the system that would load the file: the file must be of its platform")
      ->check(CLI::IsMember({"KR40", "KR040", "KR80", "KR080", "KR60", "KR060"}));
  show->callback([&ctx, showArgs] { ctx.result = Show(*showArgs); });
}

}  // namespace faultbox::cli

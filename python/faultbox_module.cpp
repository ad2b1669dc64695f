// The compiled part of the Python package `faultbox`: the automation object
// model for test scripts, reported messages as Python logging records (and
// with the failure of the call that reported them), and an orderly end at
// the interpreter's exit. faultbox/__init__.py adds what is plain Python.
#include <atomic>
#include <cstdio>
#include <cstdlib>

#include "BindModel.h"
#include "ScriptHardware.h"
#include "automation/QFCFailurePatternImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCSystemImpl.h"
#include "automation/QFCSystemsImpl.h"
#include "platform/ErrorModule.h"
#include "platform/QFCReporter.h"

namespace faultbox::python {

namespace {

constexpr const char* kLoggerName = "faultbox";

// Hands every reported message to the logger "faultbox". It may run on any
// thread, with or without the GIL: a call in progress has released it.
class LoggingSink : public MessageSink {
 public:
  void Display(const ErrorRecord& record, bool show) override {
    NoteReportedMessage(record);
    if (closed_.load()) return;
    py::gil_scoped_acquire gil;
    try {
      py::object logging = py::module_::import("logging");
      const char* level = record.errorClass == 3   ? "ERROR"
                          : record.errorClass == 2 ? "WARNING"
                          : record.errorClass == 1 ? "INFO"
                                                   : "DEBUG";
      py::dict extra;
      extra["number"] = record.number;
      extra["texts"] = py::make_tuple(ToText(record.first), ToText(record.second));
      extra["show"] = show;
      logging.attr("getLogger")(kLoggerName)
          .attr("log")(logging.attr(level), "%d: %s", record.number, ToText(record.Text()),
                       py::arg("extra") = extra);
    } catch (py::error_already_set& error) {
      // A failing handler must not fail the member that reported.
      error.discard_as_unraisable("faultbox: passing a message to logging");
    }
  }
  void Close() { closed_.store(true); }

 private:
  std::atomic<bool> closed_{false};
};

// Both live until the process ends: the sink may be called from a thread
// after the module's objects are gone.
LoggingSink* g_sink = nullptr;
std::shared_ptr<ScriptRoot>* g_root = nullptr;

constexpr int kMsgResetFailed = 944;

// Leaves no relay switched and no system connected, then discards the
// documents and the simulated benches behind them. When a bench kept its
// relays even through a reset, the interpreter ends with status 1 after
// the message, whatever the script's own status.
void ShutDown() {
  if (g_root == nullptr || !(*g_root)->impl) return;
  bool mayBeSwitched = false;
  {
    py::gil_scoped_release release;
    std::lock_guard<std::recursive_mutex> lock(ModelMutex());
    QFCFaultInjectionImpl& root = *(*g_root)->impl;
    std::shared_ptr<QFCSystemsImpl> systems;
    std::int32_t count = 0;
    if (Succeeded(root.get_Systems(systems)) && Succeeded(systems->get_Count(count))) {
      for (std::int32_t i = 0; i < count; ++i) {
        std::shared_ptr<QFCSystemImpl> system;
        if (Failed(systems->Item(Variant{std::int64_t{i}}, system))) continue;
        std::shared_ptr<QFCFailurePatternsImpl> patterns;
        std::shared_ptr<QFCBaseFailurePatternImpl> active;
        if (Succeeded(system->get_FailurePatterns(patterns)) &&
            Succeeded(patterns->get_ActivatedFailurePattern(active)) && active) {
          BenchOperation operation(system->GetOwner());
          operation.Done(Succeeded(active->Deactivate()));
          VARIANT_BOOL still = VARIANT_FALSE;
          // A bench that did not take the deactivation is reset instead.
          if (Succeeded(active->IsActivated(still)) && still != VARIANT_FALSE &&
              Failed(system->ResetHardware())) {
            std::string name;
            (void)system->get_Name(name);
            TheReporter().ReportError(kMsgResetFailed, name);
            mayBeSwitched = true;
          }
        }
        VARIANT_BOOL connected = VARIANT_FALSE;
        if (Succeeded(system->IsConnected(connected)) && connected != VARIANT_FALSE)
          (void)system->Disconnect();  // the process ends either way
      }
    }
    (*g_root)->impl.reset();
    ReleaseScriptHardware();
  }
  if (g_sink != nullptr) {
    if (ErrorModule* module = TheReporter().Module()) module->RemoveSink(g_sink);
    g_sink->Close();
  }
  if (mayBeSwitched) {
    // Python has no way to change the status once the script has ended:
    // what the handlers still hold goes out, then the process ends.
    try {
      py::module_::import("logging").attr("shutdown")();
      py::module_ sys = py::module_::import("sys");
      for (const char* stream : {"stdout", "stderr"})
        if (py::object file = sys.attr(stream); !file.is_none()) file.attr("flush")();
    } catch (py::error_already_set& error) {
      error.discard_as_unraisable("faultbox: flushing the output before the exit");
    }
    std::fflush(nullptr);
    std::_Exit(1);
  }
}

std::shared_ptr<ScriptRoot> FaultInjection() {
  if (g_root != nullptr) return *g_root;
  g_root = new std::shared_ptr<ScriptRoot>(std::make_shared<ScriptRoot>());
  {
    py::gil_scoped_release release;
    std::lock_guard<std::recursive_mutex> lock(ModelMutex());
    (*g_root)->impl = QFCFaultInjectionImpl::Create();
    InstallScriptHardware();
    if (ErrorModule* module = TheReporter().Module()) {
      g_sink = new LoggingSink;
      module->AddSink(g_sink);
    }
  }
  // logging was imported first, so its own exit handler (which flushes and
  // closes the handlers) runs after this one and the last messages get out.
  py::module_::import("atexit").attr("register")(py::cpp_function(&ShutDown));
  return *g_root;
}

}  // namespace

}  // namespace faultbox::python

PYBIND11_MODULE(_faultbox, m) {
  using namespace faultbox;
  using namespace faultbox::python;
  m.doc() =
      "The compiled part of the package faultbox: the automation object model. Import faultbox, not this "
      "module.";
  m.attr("__version__") = FAULTBOX_VERSION_TEXT;
  py::module_::import("logging");

  // The classes are the package's: their names, reprs and help pages say
  // faultbox.System, which is where scripts find them.
  const py::object ownName = m.attr("__name__");
  m.attr("__name__") = "faultbox";
  AddErrorsAndConstants(m);
  AddModelClasses(m);
  m.attr("__name__") = ownName;

  m.def("FaultInjection", &FaultInjection,
        "The root object. The first call starts the component; every call gives the same object.");
  m.def(
      "_started", [] { return g_root != nullptr; }, "True once FaultInjection() started the component.");

  m.def(
      "sim_relays",
      [](QFCSystemImpl& system) {
        std::vector<std::string> lines;
        Invoke([&] {
          QFCAutomationCall frame;
          if (system.GetOwner() == nullptr) return frame.Detached(system.GetKeptText());
          lines = SimulatedRelays(*system.GetOwner());
          return frame.Return(FAULTBOX_OK);
        });
        return ToTextList(lines);
      },
      py::arg("system"),
      "Extension: the relays that are on in the built-in simulated bench of `system`, one line per module, "
      "or [\"all relays off\"]; [] when the system runs on the settings' hardware.");
}

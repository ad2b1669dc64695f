// The module's lock, the messages of a call, failures as Python exceptions,
// the enumerations, and argument conversion.
#include "ModuleSupport.h"

#include <cstdint>

namespace faultbox::python {

namespace {

// Builds the exception of a failure (faultbox._errors.make_failure), kept for
// the lifetime of the process: the translator runs until the interpreter is
// gone, and a Python object must not be released after that.
PyObject* g_failureFactory = nullptr;

std::mutex g_captureMutex;
MessageCapture* g_capture = nullptr;

// Meanings of the enumeration members the object model leaves without a help text.
const char* FallbackHelp(const std::string& name) {
  if (name == "ffpDeactivated") return "The failure pattern is deactivated";
  if (name == "ffpActivated") return "The failure pattern is activated";
  return "";
}

const char* EnumerationHelp(const std::string& name) {
  if (name == "FSPlatformType") return "The platform of a failure simulation system.";
  if (name == "FSDeviceType") return "The interface a system reaches its hardware through.";
  if (name == "FSFailurePattern") return "The state of a failure pattern.";
  if (name == "FSDeviceConstant") return "The connection state of a system.";
  return "The result codes of the object model's members; a member's help text is the code's description.";
}

std::uint32_t Unsigned(HRESULT code) {
  return static_cast<std::uint32_t>(code);
}

}  // namespace

MessageCapture::MessageCapture() {
  std::lock_guard<std::mutex> lock(g_captureMutex);
  outer_ = g_capture;
  g_capture = this;
}

MessageCapture::~MessageCapture() {
  std::lock_guard<std::mutex> lock(g_captureMutex);
  g_capture = outer_;
}

std::vector<ErrorRecord> MessageCapture::Take() {
  std::lock_guard<std::mutex> lock(g_captureMutex);
  return std::move(records_);
}

void NoteReportedMessage(const ErrorRecord& record) {
  std::lock_guard<std::mutex> lock(g_captureMutex);
  if (g_capture != nullptr) g_capture->records_.push_back(record);
}

std::recursive_mutex& ModelMutex() {
  static std::recursive_mutex mutex;
  return mutex;
}

std::string DescribeFailure(HRESULT code) {
  QFTErrorInfo info;
  if (GetErrorInfo(info) && info.code == code && !info.description.empty()) return info.description;
  const char* help = ResultCodeDescription(code);
  return help ? help : "";
}

py::str ToText(const std::string& text) {
  PyObject* decoded =
      PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "surrogateescape");
  if (decoded == nullptr) throw py::error_already_set();
  return py::reinterpret_steal<py::str>(decoded);
}

std::string FromText(py::handle text) {
  if (!py::isinstance<py::str>(text)) throw py::type_error("a text (str) is expected");
  PyObject* encoded = PyUnicode_AsEncodedString(text.ptr(), "utf-8", "surrogateescape");
  if (encoded == nullptr) throw py::error_already_set();
  const auto bytes = py::reinterpret_steal<py::bytes>(encoded);
  return std::string(bytes);
}

std::string FromPath(py::handle path) {
  if (py::isinstance<py::str>(path)) return FromText(path);
  PyObject* name = PyOS_FSPath(path.ptr());
  if (name == nullptr) {
    PyErr_Clear();
    throw py::type_error("a path (str or os.PathLike) is expected");
  }
  const auto object = py::reinterpret_steal<py::object>(name);
  if (py::isinstance<py::bytes>(object)) return std::string(py::reinterpret_borrow<py::bytes>(object));
  return FromText(object);
}

py::list ToTextList(const std::vector<std::string>& texts) {
  py::list out;
  for (const std::string& text : texts) out.append(ToText(text));
  return out;
}

Variant ToVariant(py::handle value) {
  if (value.is_none()) return std::monostate{};
  if (py::isinstance<py::bool_>(value)) return value.cast<bool>();
  if (py::isinstance<py::str>(value)) return FromText(value);
  if (py::isinstance<py::float_>(value)) return value.cast<double>();
  if (py::isinstance<QFCAutomationObject>(value)) return value.cast<std::shared_ptr<QFCAutomationObject>>();
  if (PyIndex_Check(value.ptr())) {
    long long number = -1;
    if (PyObject* index = PyNumber_Index(value.ptr())) {
      number = PyLong_AsLongLong(index);
      Py_DECREF(index);
    }
    // Numbers beyond 64 bits are out of every range the model takes.
    if (number == -1 && PyErr_Occurred()) {
      PyErr_Clear();
      return std::shared_ptr<QFCAutomationObject>();
    }
    return static_cast<std::int64_t>(number);
  }
  if (py::isinstance<py::list>(value) || py::isinstance<py::tuple>(value)) {
    QFTObjectArray array;
    for (py::handle element : value) {
      array.push_back(py::isinstance<QFCAutomationObject>(element)
                          ? element.cast<std::shared_ptr<QFCAutomationObject>>()
                          : std::shared_ptr<QFCAutomationObject>());
    }
    return array;
  }
  return std::shared_ptr<QFCAutomationObject>();
}

void AddErrorsAndConstants(py::module_& module) {
  py::object intEnum = py::module_::import("enum").attr("IntEnum");
  for (const QFTEnumeration& enumeration : AutomationEnumerations()) {
    const std::string name = enumeration.name;
    const bool codes = name == "FaultboxErrors";
    py::list members;
    std::string doc = std::string(EnumerationHelp(name)) + "\n";
    for (const QFTNamedConstant& constant : enumeration.constants) {
      // Codes are published as the unsigned numbers they are written as.
      py::object value = codes ? py::int_(Unsigned(constant.value)) : py::int_(constant.value);
      members.append(py::make_tuple(constant.name, value));
    }
    py::object type = intEnum(name, members, py::arg("module") = "faultbox");
    for (const QFTNamedConstant& constant : enumeration.constants) {
      const std::string help = *constant.help ? constant.help : FallbackHelp(constant.name);
      py::object member = type.attr(constant.name);
      member.attr("__doc__") = help;
      doc += std::string("\n") + constant.name + ": " + help;
      module.attr(constant.name) = member;
    }
    type.attr("__doc__") = doc;
    module.attr(enumeration.name) = type;
  }
  // Results of the enumerators that are no error of the model's own.
  module.attr("S_FALSE") = py::int_(Unsigned(S_FALSE));
  module.attr("E_NOTIMPL") = py::int_(Unsigned(E_NOTIMPL));

  module.def(
      "_set_failure_factory",
      [](py::object factory) {
        Py_XDECREF(g_failureFactory);
        g_failureFactory = factory.release().ptr();
      },
      "Names the callable (code, description, messages) that builds the exception of a failed call.");

  py::register_exception_translator([](std::exception_ptr thrown) {
    try {
      if (thrown) std::rethrow_exception(thrown);
    } catch (const FaultboxFailure& failure) {
      if (g_failureFactory == nullptr) {
        PyErr_SetString(PyExc_RuntimeError, failure.what());
        return;
      }
      py::list messages;
      for (const ErrorRecord& record : failure.Messages())
        messages.append(py::make_tuple(record.number, record.errorClass, ToText(record.Text())));
      try {
        py::object error = py::reinterpret_borrow<py::object>(g_failureFactory)(
            Unsigned(failure.Code()), ToText(failure.Description()), messages);
        PyErr_SetObject(reinterpret_cast<PyObject*>(Py_TYPE(error.ptr())), error.ptr());
      } catch (py::error_already_set& error) {
        error.restore();
      }
    }
  });
}

}  // namespace faultbox::python

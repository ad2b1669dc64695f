// The module's lock, FaultboxError with the constants, and argument conversion.
#include "ModuleSupport.h"

#include <pybind11/eval.h>

#include <cstdint>

namespace faultbox::python {

namespace {

// Python source of the exception: an ordinary Exception subclass, so that
// scripts catch it the usual way and tracebacks show its text.
constexpr const char* kErrorClassSource = R"PY(
class FaultboxError(Exception):
    """A member of the object model failed.

    ``hresult`` is the member's result code (a ``FaultboxErrors`` member when
    the code is one of them) and ``description`` says why it failed.
    """

    def __init__(self, hresult, description=""):
        try:
            hresult = FaultboxErrors(hresult)
        except ValueError:
            pass
        super().__init__(hresult, description)
        self.hresult = hresult
        self.description = description

    def __str__(self):
        code = "0x%08X" % int(self.hresult)
        name = getattr(self.hresult, "name", None)
        where = "%s, %s" % (name, code) if name else code
        return "%s (%s)" % (self.description, where) if self.description else where
)PY";

// The class object, kept for the lifetime of the process: the translator runs
// until the interpreter is gone, and a Python object must not be released
// after that.
PyObject* g_errorClass = nullptr;

std::uint32_t Unsigned(HRESULT code) {
  return static_cast<std::uint32_t>(code);
}

}  // namespace

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
  PyObject* decoded = PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "surrogateescape");
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
    const bool codes = std::string(enumeration.name) == "FaultboxErrors";
    py::list members;
    for (const QFTNamedConstant& constant : enumeration.constants) {
      // Codes are published as the unsigned numbers they are written as.
      py::object value = codes ? py::int_(Unsigned(constant.value)) : py::int_(constant.value);
      members.append(py::make_tuple(constant.name, value));
    }
    py::object type = intEnum(enumeration.name, members, py::arg("module") = "faultbox");
    module.attr(enumeration.name) = type;
    for (const QFTNamedConstant& constant : enumeration.constants)
      module.attr(constant.name) = type.attr(constant.name);
  }
  // Results of the enumerators that are no error of the model's own.
  module.attr("S_FALSE") = py::int_(Unsigned(S_FALSE));
  module.attr("E_NOTIMPL") = py::int_(Unsigned(E_NOTIMPL));

  py::exec(kErrorClassSource, module.attr("__dict__"));
  g_errorClass = module.attr("FaultboxError").ptr();
  Py_INCREF(g_errorClass);

  py::register_exception_translator([](std::exception_ptr thrown) {
    try {
      if (thrown) std::rethrow_exception(thrown);
    } catch (const FaultboxFailure& failure) {
      py::object error = py::reinterpret_borrow<py::object>(g_errorClass)(Unsigned(failure.Code()),
                                                                           failure.Description());
      PyErr_SetObject(g_errorClass, error.ptr());
    }
  });
}

}  // namespace faultbox::python

// The conversion of model objects to their Python classes, the base class,
// the enumerator, the root object and the failure classes.
#include "BindModel.h"

#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternImpl.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "automation/QFCFailurePatternPinsImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemImpl.h"
#include "automation/QFCSystemsImpl.h"

namespace faultbox::python {

namespace {

// A member of the root object with one [out] result.
template <class Out>
auto RootGet(HRESULT (QFCFaultInjectionImpl::*member)(Out&)) {
  return [member](ScriptRoot& root) {
    Out out{};
    root.Run([&](QFCFaultInjectionImpl& impl) { return (impl.*member)(out); });
    return Convert(out);
  };
}

}  // namespace

py::object ToPython(const Object& object) {
  if (!object) return py::none();
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternKR60Impl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternKR40Impl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternKR60PinImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternKR40PinImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCSystemImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailureClassImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCSystemsImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternsImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailurePatternPinsImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCFailureClassesImpl>(object)) return py::cast(p);
  if (auto p = std::dynamic_pointer_cast<QFCEnumVariant>(object)) return py::cast(p);
  return py::cast(object);
}

void AddEnumerator(py::module_& m) {
  py::class_<QFCEnumVariant, QFCAutomationObject, std::shared_ptr<QFCEnumVariant>>(
      m, "Enumerator", "Walks a live collection from its current position; also a Python iterator.")
      .def(
          "Next",
          [](QFCEnumVariant& self, std::uint32_t count) {
            QFTObjectArray items;
            std::uint32_t fetched = 0;
            Invoke([&] { return self.Next(count, items, fetched); });
            py::list out;
            for (const Object& item : items) out.append(ToPython(item));
            return out;
          },
          py::arg("count") = 1, "Next: up to `count` elements from the current position (fewer at the end).")
      .def(
          "Skip", [](QFCEnumVariant& self, std::uint32_t count) { Invoke([&] { return self.Skip(count); }); },
          py::arg("count") = 1,
          "Skip: moves on by `count` elements; E_FAULTBOX_INVALID_PARAMETER when that reaches the end.")
      .def("Reset", Do(&QFCEnumVariant::Reset), "Reset: back to the first element.")
      .def(
          "Clone",
          [](QFCEnumVariant& self) {
            std::shared_ptr<QFCEnumVariant> clone;
            Invoke([&] { return self.Clone(clone); });
            return ToPython(clone);
          },
          "Clone: not offered; always raises FaultboxError with E_NOTIMPL.")
      .def("__iter__", [](py::object self) { return self; })
      .def("__next__", [](QFCEnumVariant& self) {
        QFTObjectArray items;
        std::uint32_t fetched = 0;
        Invoke([&] { return self.Next(1, items, fetched); });
        if (fetched == 0) throw py::stop_iteration();
        return ToPython(items.front());
      });
}

void AddRoot(py::module_& m) {
  py::class_<ScriptRoot, std::shared_ptr<ScriptRoot>>(m, "_FaultInjection",
                                                      "The root object; faultbox.FaultInjection() gives it.")
      .def_property_readonly("Name", RootGet(&QFCFaultInjectionImpl::get_Name),
                             "The component name: \"Faultbox.Component\".")
      .def_property_readonly("Systems", RootGet(&QFCFaultInjectionImpl::get_Systems),
                             "The failure simulation system collection: the systems of the documents the "
                             "script opened.")
      .def_property_readonly("ConnectedSystem", RootGet(&QFCFaultInjectionImpl::get_ConnectedSystem),
                             "The connected failure simulation systems: a list of their names.")
      .def(
          "SelectHardware",
          [](ScriptRoot& self, py::object choice) {
            const std::string text = FromText(choice);
            self.Run([&](QFCFaultInjectionImpl& root) { return root.SelectHardware(text); });
          },
          py::arg("choice"),
          "Extension: the hardware of the systems opened from now on: \"sim\" (the built-in simulated "
          "bench of each system's pin files) or \"config\" (the settings' CAN channel and serial port "
          "tables).");
}

void AddFailureClasses(py::module_& m) {
  Class<QFCFailureClassesImpl> classes(m, "FailureClasses",
                                       "The failure classes of a system; also a sequence of FailureClass "
                                       "with look-up by name.");
  classes
      .def("Item", ItemBy(&QFCFailureClassesImpl::Item), py::arg("Index"),
           "Item: a failure class by name or position 0 to Count - 1.")
      .def_property_readonly("Names", Get(&QFCFailureClassesImpl::get_Names),
                             "Names: the classes' names, in order.")
      .def_property_readonly("Version", Get(&QFCFailureClassesImpl::get_Version),
                             "Version of failure class file");
  AddCountAndEnumerator(classes, "Count: the number of failure classes.");
}

void AddFailureClass(py::module_& m) {
  Class<QFCFailureClassImpl>(m, "FailureClass", "A failure class: which relays a failure switches.")
      .def_property_readonly("Name", Get(&QFCFailureClassImpl::get_Name), "Name: the failure class's name.")
      .def_property_readonly("Description", Get(&QFCFailureClassImpl::get_Description),
                             "Description: the class's description text.")
      .def_property_readonly("Limitation", Get(&QFCFailureClassImpl::get_Limitation),
                             "Limitation: the class's limitation text.")
      .def_property_readonly("Format", Get(&QFCFailureClassImpl::get_Format),
                             "Format: the class's format text.")
      .def_property_readonly("ID", Get(&QFCFailureClassImpl::get_ID),
                             "ID: the class's number within its failure class file.")
      .def_property_readonly("RelayVectorSize", Get(&QFCFailureClassImpl::get_RelayVectorSize),
                             "RelayVectorSize Gets the number of relay vectors in this failure class");
}

void AddModelClasses(py::module_& m) {
  py::class_<QFCAutomationObject, std::shared_ptr<QFCAutomationObject>>(
      m, "AutomationObject", "Every object of the model derives from this class.")
      .def_property_readonly(
          "_attached",
          [](QFCAutomationObject& self) {
            py::gil_scoped_release release;
            std::lock_guard<std::recursive_mutex> lock(ModelMutex());
            return self.IsAttached();
          },
          "False once the model object behind this object went away.");
  AddEnumerator(m);
  AddRoot(m);
  AddSystems(m);
  AddSystem(m);
  AddFailurePatterns(m);
  AddFailurePattern(m);
  AddFailurePatternPins(m);
  AddFailurePatternPin(m);
  AddFailureClasses(m);
  AddFailureClass(m);
}

}  // namespace faultbox::python

// The Python classes of the object model. A property of the model is a Python
// property, a method a method with the model's argument names; [out] results
// are returned (several as a tuple), boolean results are bool, and a failure
// code raises FaultboxError.
#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "ModuleSupport.h"
#include "ScriptHardware.h"
#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternImpl.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "automation/QFCFailurePatternPinsImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCFaultInjectionImpl.h"
#include "automation/QFCSystemImpl.h"
#include "automation/QFCSystemsImpl.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"

namespace faultbox::python {

namespace {

using Object = std::shared_ptr<QFCAutomationObject>;

template <class T>
using Class = py::class_<T, QFCAutomationObject, std::shared_ptr<T>>;

// A model object as the Python object of its most derived class; None for
// no object. Done here rather than left to pybind11, whose downcast of a
// holder assumes the base class sits at the start of the object.
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

py::object Convert(const std::string& text) { return ToText(text); }
py::object Convert(std::int32_t value) { return py::int_(value); }
py::object Convert(VARIANT_BOOL flag) { return py::bool_(flag != VARIANT_FALSE); }
py::object Convert(const std::vector<std::string>& texts) { return ToTextList(texts); }
py::object Convert(const std::vector<std::int32_t>& values) {
  py::list out;
  for (const std::int32_t value : values) out.append(value);
  return out;
}
template <class W>
py::object Convert(const std::shared_ptr<W>& object) {
  return ToPython(object);
}

// A member with one [out] result, as a property getter or a method.
template <class T, class Out>
auto Get(HRESULT (T::*member)(Out&)) {
  return [member](T& self) {
    Out out{};
    Invoke([&] { return (self.*member)(out); });
    return Convert(out);
  };
}

// A member without arguments or results.
template <class T>
auto Do(HRESULT (T::*member)()) {
  return [member](T& self) { Invoke([&] { return (self.*member)(); }); };
}

std::vector<bool> PinStates(const QFCAbstractFailurePattern* pattern) {
  std::vector<bool> states;
  if (pattern == nullptr) return states;
  for (const auto& pin : pattern->GetPins()->GetList()) states.push_back(pin->IsActivated());
  return states;
}

// Runs a switching member of `pattern`'s wrapper inside a bench operation.
template <class Switch>
HRESULT SwitchOnBench(const QFCOwnerProvider<QFCAbstractFailurePattern>* patternWrapper,
                      QFCAbstractFailurePattern* pattern, Switch&& run) {
  BenchOperation operation(pattern ? pattern->GetOwnerSystem() : nullptr);
  const std::vector<bool> before = PinStates(pattern);
  const HRESULT result = run();
  const bool alive = patternWrapper == nullptr || patternWrapper->IsAttached();
  operation.Done(Succeeded(result) && alive && PinStates(pattern) != before);
  return result;
}

std::string ReprName(const std::string& kind, const std::function<HRESULT(std::string&)>& name) {
  std::string text;
  {
    py::gil_scoped_release release;
    std::lock_guard<std::recursive_mutex> lock(ModelMutex());
    if (Failed(name(text))) return "<faultbox." + kind + " (no longer exists)>";
  }
  return "<faultbox." + kind + " '" + text + "'>";
}

// len(), iteration through the enumerator, and indexing by position or name
// (a negative position counts from the end, as Python sequences do).
template <class C, class Item>
void AddCollectionProtocol(Class<C>& cls, Item item) {
  cls.def("__len__", [](C& self) {
    std::int32_t count = 0;
    Invoke([&] { return self.get_Count(count); });
    return count;
  });
  cls.def("__iter__", Get(&C::get__NewEnum));
  cls.def("__getitem__", [item](C& self, py::object key) {
    if (PyLong_Check(key.ptr()) && !py::isinstance<py::bool_>(key)) {
      int overflow = 0;
      const long long position = PyLong_AsLongLongAndOverflow(key.ptr(), &overflow);
      if (overflow == 0 && position < 0) {
        std::int32_t count = 0;
        Invoke([&] { return self.get_Count(count); });
        key = py::int_(position + count);
      }
    }
    return item(self, key);
  });
}

// A member of the root object with one [out] result.
template <class Out>
auto RootGet(HRESULT (QFCFaultInjectionImpl::*member)(Out&)) {
  return [member](ScriptRoot& root) {
    Out out{};
    root.Run([&](QFCFaultInjectionImpl& impl) { return (impl.*member)(out); });
    return Convert(out);
  };
}

// Item(Index) of a collection.
template <class C, class W>
auto ItemBy(HRESULT (C::*member)(const Variant&, std::shared_ptr<W>&)) {
  return [member](C& self, py::object Index) {
    const Variant index = ToVariant(Index);
    std::shared_ptr<W> out;
    Invoke([&] { return (self.*member)(index, out); });
    return ToPython(out);
  };
}

}  // namespace

void AddModelClasses(py::module_& m) {
  py::class_<QFCAutomationObject, std::shared_ptr<QFCAutomationObject>>(
      m, "AutomationObject", "Every object of the model derives from this class.");

  // ---- enumerator
  py::class_<QFCEnumVariant, QFCAutomationObject, std::shared_ptr<QFCEnumVariant>>(
      m, "Enumerator", "Walks a live collection; also a Python iterator.")
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
          py::arg("count") = 1, "Up to `count` elements from the current position (fewer at the end).")
      .def(
          "Skip", [](QFCEnumVariant& self, std::uint32_t count) { Invoke([&] { return self.Skip(count); }); },
          py::arg("count") = 1)
      .def("Reset", Do(&QFCEnumVariant::Reset))
      .def("Clone",
           [](QFCEnumVariant& self) {
             std::shared_ptr<QFCEnumVariant> clone;
             Invoke([&] { return self.Clone(clone); });
             return ToPython(clone);
           })
      .def("__iter__", [](py::object self) { return self; })
      .def("__next__", [](QFCEnumVariant& self) {
        QFTObjectArray items;
        std::uint32_t fetched = 0;
        Invoke([&] { return self.Next(1, items, fetched); });
        if (fetched == 0) throw py::stop_iteration();
        return ToPython(items.front());
      });

  // ---- root
  py::class_<ScriptRoot, std::shared_ptr<ScriptRoot>>(m, "_FaultInjection",
                                                      "The root object; faultbox.FaultInjection() gives it.")
      .def_property_readonly("Name", RootGet(&QFCFaultInjectionImpl::get_Name))
      .def_property_readonly("Systems", RootGet(&QFCFaultInjectionImpl::get_Systems))
      .def_property_readonly("ConnectedSystem", RootGet(&QFCFaultInjectionImpl::get_ConnectedSystem))
      .def(
          "SelectHardware",
          [](ScriptRoot& self, py::object choice) {
            const std::string text = FromText(choice);
            self.Run([&](QFCFaultInjectionImpl& root) { return root.SelectHardware(text); });
          },
          py::arg("choice"), "Extension: \"sim\" (the built-in simulator) or \"config\" (the settings' tables).");

  // ---- systems
  Class<QFCSystemsImpl> systems(m, "Systems", "The systems of the documents the script opened.");
  systems.def("Item", ItemBy(&QFCSystemsImpl::Item), py::arg("Index"))
      .def_property_readonly("Count", Get(&QFCSystemsImpl::get_Count))
      .def_property_readonly("Names", Get(&QFCSystemsImpl::get_Names))
      .def(
          "Open",
          [](QFCSystemsImpl& self, py::object FileName, py::object PinFile) {
            const std::string file = FromText(FileName);
            const std::string pinFile = PinFile.is_none() ? std::string() : FromText(PinFile);
            std::shared_ptr<QFCSystemImpl> system;
            Invoke([&] { return self.Open(file, pinFile, system); });
            return ToPython(system);
          },
          py::arg("FileName"), py::arg("PinFile") = py::none())
      .def("CloseAll", Do(&QFCSystemsImpl::CloseAll))
      .def_property_readonly("_NewEnum", Get(&QFCSystemsImpl::get__NewEnum));
  AddCollectionProtocol(systems, ItemBy(&QFCSystemsImpl::Item));

  // ---- system
  Class<QFCSystemImpl>(m, "System", "A failure simulation system: one opened document.")
      .def_property_readonly("Author", Get(&QFCSystemImpl::get_Author))
      .def_property_readonly("Description", Get(&QFCSystemImpl::get_Description))
      .def_property_readonly("PlatformType",
                             [](QFCSystemImpl& self) {
                               std::int32_t type = 0;
                               Invoke([&] { return self.get_PlatformType(type); });
                               return py::module_::import("faultbox").attr("FSPlatformType")(type);
                             })
      .def_property_readonly("Name", Get(&QFCSystemImpl::get_Name))
      .def_property_readonly("PinFile", Get(&QFCSystemImpl::get_PinFile))
      .def_property_readonly("ECUVersion", Get(&QFCSystemImpl::get_ECUVersion))
      .def("Close", Do(&QFCSystemImpl::Close))
      .def("Connect",
           [](QFCSystemImpl& self) {
             Invoke([&] {
               BenchOperation operation(self.GetOwner());
               const HRESULT result = self.Connect();
               operation.Done(false);
               return result;
             });
           })
      .def("Disconnect", Do(&QFCSystemImpl::Disconnect))
      .def("IsConnected", Get(&QFCSystemImpl::IsConnected))
      .def_property_readonly("FailurePatterns", Get(&QFCSystemImpl::get_FailurePatterns))
      .def_property_readonly("FailureClasses", Get(&QFCSystemImpl::get_FailureClasses))
      .def("ResetHardware",
           [](QFCSystemImpl& self) {
             Invoke([&] {
               BenchOperation operation(self.GetOwner());
               const HRESULT result = self.ResetHardware();
               operation.Done(false);
               return result;
             });
           })
      .def(
          "SetInterfaceParameter",
          [](QFCSystemImpl& self, std::int32_t DeviceType, py::object pVal1, py::object pVal2) {
            const Variant first = ToVariant(pVal1);
            const Variant second = ToVariant(pVal2);
            Invoke([&] { return self.SetInterfaceParameter(DeviceType, first, second); });
          },
          py::arg("DeviceType"), py::arg("pVal1") = py::none(), py::arg("pVal2") = py::none())
      .def("InterfaceParameter",
           [](QFCSystemImpl& self) {
             std::int32_t deviceType = -1, first = -1, second = -1;
             Invoke([&] { return self.InterfaceParameter(deviceType, first, second); });
             return py::make_tuple(deviceType, first, second);
           })
      .def("Save", Do(&QFCSystemImpl::Save), "Extension: saves the document in place.")
      .def("__repr__", [](QFCSystemImpl& self) {
        return ReprName("System", [&](std::string& name) { return self.get_Name(name); });
      });

  // ---- failure patterns
  Class<QFCFailurePatternsImpl> patterns(m, "FailurePatterns", "The failure patterns of a system.");
  patterns.def("Item", ItemBy(&QFCFailurePatternsImpl::Item), py::arg("Index"))
      .def_property_readonly("Count", Get(&QFCFailurePatternsImpl::get_Count))
      .def_property_readonly("Names", Get(&QFCFailurePatternsImpl::get_Names))
      .def_property_readonly("ActivatedFailurePattern", Get(&QFCFailurePatternsImpl::get_ActivatedFailurePattern))
      .def_property_readonly("_NewEnum", Get(&QFCFailurePatternsImpl::get__NewEnum))
      .def(
          "Add",
          [](QFCFailurePatternsImpl& self, py::object Name) {
            const std::string name = Name.is_none() ? std::string() : FromText(Name);
            std::shared_ptr<QFCBaseFailurePatternImpl> pattern;
            Invoke([&] { return self.Add(name, pattern); });
            return ToPython(pattern);
          },
          py::arg("Name") = py::none(), "Extension: a new, empty pattern (a default name when none is given).")
      .def(
          "Remove",
          [](QFCFailurePatternsImpl& self, py::object Index) {
            const Variant index = ToVariant(Index);
            Invoke([&] { return self.Remove(index); });
          },
          py::arg("Index"), "Extension: removes a pattern that is not activated.");
  AddCollectionProtocol(patterns, ItemBy(&QFCFailurePatternsImpl::Item));

  // ---- failure pattern
  const auto switchPattern = [](QFCBaseFailurePatternImpl& self, py::object Pins, bool activate) {
    const Variant pins = ToVariant(Pins);
    Invoke([&] {
      return SwitchOnBench(&self, self.GetOwner(),
                           [&] { return activate ? self.Activate(pins) : self.Deactivate(pins); });
    });
  };
  Class<QFCBaseFailurePatternImpl>(m, "_BaseFailurePattern", "What the patterns of both platforms offer.")
      .def_property_readonly("Pins", Get(&QFCBaseFailurePatternImpl::get_Pins))
      .def_property_readonly("Name", Get(&QFCBaseFailurePatternImpl::get_Name))
      .def("IsActivated", Get(&QFCBaseFailurePatternImpl::IsActivated))
      .def(
          "Activate",
          [switchPattern](QFCBaseFailurePatternImpl& self, py::object Pins) { switchPattern(self, Pins, true); },
          py::arg("Pins") = py::none())
      .def(
          "Deactivate",
          [switchPattern](QFCBaseFailurePatternImpl& self, py::object Pins) { switchPattern(self, Pins, false); },
          py::arg("Pins") = py::none())
      .def("Reset", Do(&QFCBaseFailurePatternImpl::Reset))
      .def("__repr__", [](QFCBaseFailurePatternImpl& self) {
        return ReprName("FailurePattern", [&](std::string& name) { return self.get_Name(name); });
      });
  py::class_<QFCFailurePatternKR40Impl, QFCBaseFailurePatternImpl, std::shared_ptr<QFCFailurePatternKR40Impl>>(
      m, "FailurePatternKR40", "A failure pattern of the KR40 family.");
  py::class_<QFCFailurePatternKR60Impl, QFCBaseFailurePatternImpl, std::shared_ptr<QFCFailurePatternKR60Impl>>(
      m, "FailurePatternKR60", "A failure pattern of a KR60 bench.")
      .def_property_readonly("FIURelayState", Get(&QFCFailurePatternKR60Impl::get_FIURelayState))
      .def_property_readonly("RsimRelayState", Get(&QFCFailurePatternKR60Impl::get_RsimRelayState))
      .def_property("ResistorValue", Get(&QFCFailurePatternKR60Impl::get_ResistorValue),
                    [](QFCFailurePatternKR60Impl& self, std::int32_t value) {
                      Invoke([&] { return self.put_ResistorValue(value); });
                    });

  // ---- pattern pins
  using PinItem = HRESULT (QFCFailurePatternPinsImpl::*)(const Variant&, const std::string&,
                                                          std::shared_ptr<QFCBaseFailurePatternPinImpl>&);
  const auto pinItem = [](QFCFailurePatternPinsImpl& self, py::object Index, py::object EcuName) {
    const Variant index = ToVariant(Index);
    const std::string ecu = EcuName.is_none() ? std::string() : FromText(EcuName);
    std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
    Invoke([&] { return (self.*static_cast<PinItem>(&QFCFailurePatternPinsImpl::Item))(index, ecu, pin); });
    return ToPython(pin);
  };
  Class<QFCFailurePatternPinsImpl> pins(m, "FailurePatternPins", "The pins of a failure pattern.");
  pins.def("Item", pinItem, py::arg("Index"), py::arg("EcuName") = py::none())
      .def_property_readonly("Count", Get(&QFCFailurePatternPinsImpl::get_Count))
      .def_property_readonly("Names",
                             [](QFCFailurePatternPinsImpl& self) {
                               std::vector<std::array<std::string, 2>> names;
                               Invoke([&] { return self.get_Names(names); });
                               py::list out;
                               for (const auto& [ecu, pin] : names) out.append(py::make_tuple(ToText(ecu), ToText(pin)));
                               return out;
                             })
      .def_property_readonly("_NewEnum", Get(&QFCFailurePatternPinsImpl::get__NewEnum))
      .def(
          "Add",
          [](QFCFailurePatternPinsImpl& self, py::object PinName, py::object EcuName) {
            const std::string pinName = FromText(PinName);
            const std::string ecuName = FromText(EcuName);
            std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
            Invoke([&] { return self.Add(pinName, ecuName, pin); });
            return ToPython(pin);
          },
          py::arg("PinName"), py::arg("EcuName"), "Extension: adds a pin of the system to the pattern.")
      .def(
          "Remove",
          [](QFCFailurePatternPinsImpl& self, py::object Index, py::object EcuName) {
            const Variant index = ToVariant(Index);
            const std::string ecu = EcuName.is_none() ? std::string() : FromText(EcuName);
            Invoke([&] { return self.Remove(index, ecu); });
          },
          py::arg("Index"), py::arg("EcuName") = py::none(), "Extension: removes a pin that is not activated.");
  // pins["X1.1", "BCM"] is Item("X1.1", "BCM").
  AddCollectionProtocol(pins, [pinItem](QFCFailurePatternPinsImpl& self, py::object key) {
    if (py::isinstance<py::tuple>(key) && py::len(key) == 2)
      return pinItem(self, key[py::int_(0)], key[py::int_(1)]);
    return pinItem(self, key, py::none());
  });

  // ---- pattern pin
  const auto switchPin = [](QFCBaseFailurePatternPinImpl& self, bool activate) {
    Invoke([&] {
      QFCAbstractFailurePatternPin* pin = self.GetOwner();
      QFCAbstractFailurePattern* pattern = pin ? pin->GetPattern() : nullptr;
      return SwitchOnBench(nullptr, pattern, [&] { return activate ? self.Activate() : self.Deactivate(); });
    });
  };
  Class<QFCBaseFailurePatternPinImpl>(m, "_BaseFailurePatternPin", "What the pattern pins of both platforms offer.")
      .def_property_readonly("Name", Get(&QFCBaseFailurePatternPinImpl::get_Name))
      .def_property_readonly("EcuName", Get(&QFCBaseFailurePatternPinImpl::get_EcuName))
      .def("Select", Do(&QFCBaseFailurePatternPinImpl::Select))
      .def("Deselect", Do(&QFCBaseFailurePatternPinImpl::Deselect))
      .def("IsSelected", Get(&QFCBaseFailurePatternPinImpl::IsSelected))
      .def("IsActivated", Get(&QFCBaseFailurePatternPinImpl::IsActivated))
      .def("CanBeActivated", Get(&QFCBaseFailurePatternPinImpl::CanBeActivated))
      .def_property_readonly("AdjustedFailureClass", Get(&QFCBaseFailurePatternPinImpl::get_AdjustedFailureClass))
      .def("Activate", [switchPin](QFCBaseFailurePatternPinImpl& self) { switchPin(self, true); })
      .def("Deactivate", [switchPin](QFCBaseFailurePatternPinImpl& self) { switchPin(self, false); })
      .def(
          "SetFailureClass",
          [](QFCBaseFailurePatternPinImpl& self, std::int32_t FailureClassID, py::object RelayVector) {
            const Variant relayVector = ToVariant(RelayVector);
            Invoke([&] { return self.SetFailureClass(FailureClassID, relayVector); });
          },
          py::arg("FailureClassID"), py::arg("RelayVector") = py::none())
      .def_property_readonly("DefinedFailureClasses", Get(&QFCBaseFailurePatternPinImpl::get_DefinedFailureClasses))
      .def_property_readonly("ModuleChannel", Get(&QFCBaseFailurePatternPinImpl::get_ModuleChannel))
      .def_property_readonly("PinConfig", Get(&QFCBaseFailurePatternPinImpl::get_PinConfig))
      .def_property_readonly("RefusalReason", Get(&QFCBaseFailurePatternPinImpl::get_RefusalReason),
                             "Extension: why the safety interlock left the pin without a failure class "
                             "(\"\" while it holds one).")
      .def_property_readonly("AdjustedFailureClassID",
                             [](QFCBaseFailurePatternPinImpl& self) {
                               std::int32_t id = 0, relayVector = -1;
                               Invoke([&] { return self.get_AdjustedFailureClassID(id, relayVector); });
                               return py::make_tuple(id, relayVector);
                             })
      .def("Reset", Do(&QFCBaseFailurePatternPinImpl::Reset))
      .def("__repr__", [](QFCBaseFailurePatternPinImpl& self) {
        return ReprName("FailurePatternPin", [&](std::string& text) {
          std::string ecu;
          const HRESULT result = self.get_Name(text);
          if (Succeeded(result) && Succeeded(self.get_EcuName(ecu))) text += "' of '" + ecu;
          return result;
        });
      });
  py::class_<QFCFailurePatternKR40PinImpl, QFCBaseFailurePatternPinImpl,
             std::shared_ptr<QFCFailurePatternKR40PinImpl>>(m, "FailurePatternKR40Pin",
                                                            "A pin of a KR40 family pattern.")
      .def_property_readonly("ModuleAddress", Get(&QFCFailurePatternKR40PinImpl::get_ModuleAddress));
  py::class_<QFCFailurePatternKR60PinImpl, QFCBaseFailurePatternPinImpl,
             std::shared_ptr<QFCFailurePatternKR60PinImpl>>(m, "FailurePatternKR60Pin", "A pin of a KR60 pattern.")
      .def_property_readonly("ModuleAddress", [](QFCFailurePatternKR60PinImpl& self) {
        std::int32_t cabinet = 0, rack = 0, slot = 0;
        Invoke([&] { return self.get_ModuleAddress(cabinet, rack, slot); });
        return py::make_tuple(cabinet, rack, slot);
      });

  // ---- failure classes
  Class<QFCFailureClassesImpl> classes(m, "FailureClasses", "The failure classes of a system.");
  classes.def("Item", ItemBy(&QFCFailureClassesImpl::Item), py::arg("Index"))
      .def_property_readonly("Count", Get(&QFCFailureClassesImpl::get_Count))
      .def_property_readonly("Names", Get(&QFCFailureClassesImpl::get_Names))
      .def_property_readonly("Version", Get(&QFCFailureClassesImpl::get_Version))
      .def_property_readonly("_NewEnum", Get(&QFCFailureClassesImpl::get__NewEnum));
  AddCollectionProtocol(classes, ItemBy(&QFCFailureClassesImpl::Item));

  Class<QFCFailureClassImpl>(m, "FailureClass", "A failure class: which relays a failure switches.")
      .def_property_readonly("Name", Get(&QFCFailureClassImpl::get_Name))
      .def_property_readonly("Description", Get(&QFCFailureClassImpl::get_Description))
      .def_property_readonly("Limitation", Get(&QFCFailureClassImpl::get_Limitation))
      .def_property_readonly("Format", Get(&QFCFailureClassImpl::get_Format))
      .def_property_readonly("ID", Get(&QFCFailureClassImpl::get_ID))
      .def_property_readonly("RelayVectorSize", Get(&QFCFailureClassImpl::get_RelayVectorSize))
      .def("__repr__", [](QFCFailureClassImpl& self) {
        return ReprName("FailureClass", [&](std::string& name) { return self.get_Name(name); });
      });
}

}  // namespace faultbox::python

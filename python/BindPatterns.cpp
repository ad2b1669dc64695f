// The failure patterns of a system, a pattern, its pins and a pattern pin.
#include <array>

#include "BindModel.h"
#include "ScriptHardware.h"
#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternImpl.h"
#include "automation/QFCFailurePatternPinImpl.h"
#include "automation/QFCFailurePatternPinsImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCSystemImpl.h"
#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCAbstractFailurePatternPin.h"
#include "patterns/QFCFailurePatternPins.h"

namespace faultbox::python {

namespace {

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

void SwitchPattern(QFCBaseFailurePatternImpl& self, py::object Pins, bool activate) {
  const Variant pins = ToVariant(Pins);
  Invoke([&] {
    return SwitchOnBench(&self, self.GetOwner(),
                         [&] { return activate ? self.Activate(pins) : self.Deactivate(pins); });
  });
}

void SwitchPin(QFCBaseFailurePatternPinImpl& self, bool activate) {
  Invoke([&] {
    QFCAbstractFailurePatternPin* pin = self.GetOwner();
    QFCAbstractFailurePattern* pattern = pin ? pin->GetPattern() : nullptr;
    return SwitchOnBench(nullptr, pattern, [&] { return activate ? self.Activate() : self.Deactivate(); });
  });
}

// The pin and ECU a member of the pins names: (PinName, EcuName) in the
// model's order, or one (ECU, PIN) tuple as Names gives them and the command
// line takes them. An EcuName of None stays "" (any ECU).
std::pair<py::object, std::string> PinAndEcu(py::object PinName, py::object EcuName) {
  if (py::isinstance<py::tuple>(PinName) && EcuName.is_none()) {
    const auto pair = py::reinterpret_borrow<py::tuple>(PinName);
    if (pair.size() != 2) throw py::type_error("a pin is given as (ECU, PIN)");
    return {pair[1], FromText(pair[0])};
  }
  return {PinName, EcuName.is_none() ? std::string() : FromText(EcuName)};
}

}  // namespace

void AddFailurePatterns(py::module_& m) {
  Class<QFCFailurePatternsImpl> patterns(m, "FailurePatterns",
                                         "The failure patterns of a system; also a sequence of patterns with "
                                         "look-up by name.");
  patterns
      .def("Item", ItemBy(&QFCFailurePatternsImpl::Item), py::arg("Index"),
           "Item: a pattern by name (exactly) or position 0 to Count - 1, as its FailurePatternKR40 or "
           "FailurePatternKR60.")
      .def_property_readonly("Names", Get(&QFCFailurePatternsImpl::get_Names),
                             "Names: the patterns' names, in order.")
      .def_property_readonly("ActivatedFailurePattern",
                             Get(&QFCFailurePatternsImpl::get_ActivatedFailurePattern),
                             "property ActivatedFailurePattern: the activated pattern, or None.")
      .def(
          "Add",
          [](QFCFailurePatternsImpl& self, py::object Name) {
            const std::string name = Name.is_none() ? std::string() : FromText(Name);
            std::shared_ptr<QFCBaseFailurePatternImpl> pattern;
            Invoke([&] { return self.Add(name, pattern); });
            return ToPython(pattern);
          },
          py::arg("Name") = py::none(),
          "Extension: a new, empty pattern (a default name when none is given); E_FAULTBOX_NAME_NOT_UNIQUE "
          "for a name in use.")
      .def(
          "Remove",
          [](QFCFailurePatternsImpl& self, py::object Index) {
            const Variant index = ToVariant(Index);
            Invoke([&] { return self.Remove(index); });
          },
          py::arg("Index"), "Extension: removes the pattern Index selects; an activated pattern stays.");
  AddCountAndEnumerator(patterns, "Count: the number of patterns.");
}

void AddFailurePattern(py::module_& m) {
  Class<QFCBaseFailurePatternImpl>(
      m, "_BaseFailurePattern",
      "What the patterns of both platforms offer. activated() switches the pattern on "
      "for a `with` block.")
      .def_property_readonly("Pins", Get(&QFCBaseFailurePatternImpl::get_Pins),
                             "get the failure pattern pin collection")
      .def_property_readonly("Name", Get(&QFCBaseFailurePatternImpl::get_Name),
                             "get the failure pattern name")
      .def("IsActivated", Get(&QFCBaseFailurePatternImpl::IsActivated),
           "IsActivated: True when a pin of the pattern is activated.")
      .def(
          "Activate",
          [](QFCBaseFailurePatternImpl& self, py::object Pins) { SwitchPattern(self, Pins, true); },
          py::arg("Pins") = py::none(),
          "activate the failure pattern: every pin, or the pins of the list Pins. NotConnectedError without "
          "a connection; InterlockError when no pin has a failure class or another pattern of the system is "
          "activated.")
      .def(
          "Deactivate",
          [](QFCBaseFailurePatternImpl& self, py::object Pins) { SwitchPattern(self, Pins, false); },
          py::arg("Pins") = py::none(),
          "deactivate the failure pattern: every pin, or the pins of the list Pins (on KR60 every activated "
          "pin).")
      .def("Reset", Do(&QFCBaseFailurePatternImpl::Reset),
           "reset the failure pattern to default state; refused (E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED) "
           "while it is activated.")
      .def_property_readonly(
          "_system",
          [](QFCBaseFailurePatternImpl& self) {
            std::shared_ptr<QFCSystemImpl> system;
            Invoke([&] {
              QFCAutomationCall frame;
              QFCAbstractFailurePattern* pattern = self.GetOwner();
              if (pattern == nullptr) return frame.Detached(self.GetKeptText());
              if (QFCSystem* owner = pattern->GetOwnerSystem()) system = QFCSystemImpl::Of(*owner);
              return frame.Return(FAULTBOX_OK);
            });
            return ToPython(system);
          },
          "The System the pattern belongs to.");
  py::class_<QFCFailurePatternKR40Impl, QFCBaseFailurePatternImpl,
             std::shared_ptr<QFCFailurePatternKR40Impl>>(m, "FailurePatternKR40",
                                                         "A failure pattern of the KR40 family.");
  py::class_<QFCFailurePatternKR60Impl, QFCBaseFailurePatternImpl,
             std::shared_ptr<QFCFailurePatternKR60Impl>>(m, "FailurePatternKR60",
                                                         "A failure pattern of a KR60 bench.")
      .def_property_readonly("FIURelayState", Get(&QFCFailurePatternKR60Impl::get_FIURelayState),
                             "FIU relay state: \"0x...\"; bit i - 5 is 0 for every FIU relay i that a pin's "
                             "failure class switches on.")
      .def_property_readonly("RsimRelayState", Get(&QFCFailurePatternKR60Impl::get_RsimRelayState),
                             "get the RSIM relay state as hex value")
      .def_property(
          "ResistorValue", Get(&QFCFailurePatternKR60Impl::get_ResistorValue),
          [](QFCFailurePatternKR60Impl& self, std::int32_t value) {
            Invoke([&] { return self.put_ResistorValue(value); });
          },
          "get the resistor value / set the resistor value (0 to 131071).");
}

void AddFailurePatternPins(py::module_& m) {
  using PinItem = HRESULT (QFCFailurePatternPinsImpl::*)(const Variant&, const std::string&,
                                                         std::shared_ptr<QFCBaseFailurePatternPinImpl>&);
  Class<QFCFailurePatternPinsImpl> pins(
      m, "FailurePatternPins",
      "The pins of a failure pattern; also a sequence of pins with look-up by "
      "pin name and by (ECU, PIN).");
  pins.def(
          "Item",
          [](QFCFailurePatternPinsImpl& self, py::object Index, py::object EcuName) {
            const Variant index = ToVariant(Index);
            const std::string ecu = EcuName.is_none() ? std::string() : FromText(EcuName);
            std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
            Invoke([&] {
              return (self.*static_cast<PinItem>(&QFCFailurePatternPinsImpl::Item))(index, ecu, pin);
            });
            return ToPython(pin);
          },
          py::arg("Index"), py::arg("EcuName") = py::none(),
          "Item: a pin by pin name (the first one of EcuName, or of any ECU when it is left out) or "
          "position. "
          "The pin comes first here, as in the object model; pins[ECU, PIN] takes the ECU first.")
      .def_property_readonly(
          "Names",
          [](QFCFailurePatternPinsImpl& self) {
            std::vector<std::array<std::string, 2>> names;
            Invoke([&] { return self.get_Names(names); });
            py::list out;
            for (const auto& [ecu, pin] : names) out.append(py::make_tuple(ToText(ecu), ToText(pin)));
            return out;
          },
          "Names, format:((ECUName,PINName),(ECUName,PINName)): a list of (ECU, PIN) tuples.")
      .def(
          "Add",
          [](QFCFailurePatternPinsImpl& self, py::object PinName, py::object EcuName) {
            const auto [name, ecu] = PinAndEcu(PinName, EcuName);
            const std::string pinName = FromText(name);
            std::shared_ptr<QFCBaseFailurePatternPinImpl> pin;
            Invoke([&] { return self.Add(pinName, ecu, pin); });
            return ToPython(pin);
          },
          py::arg("PinName"), py::arg("EcuName") = py::none(),
          "Extension: adds a pin of the system to the pattern and gives its pattern pin: Add(PinName, "
          "EcuName) "
          "or Add((ECU, PIN)).")
      .def(
          "Remove",
          [](QFCFailurePatternPinsImpl& self, py::object Index, py::object EcuName) {
            const auto [index, ecu] = PinAndEcu(Index, EcuName);
            const Variant chosen = ToVariant(index);
            Invoke([&] { return self.Remove(chosen, ecu); });
          },
          py::arg("Index"), py::arg("EcuName") = py::none(),
          "Extension: removes a pin that is not activated: Remove(Index, EcuName) as Item selects, or "
          "Remove((ECU, PIN)).");
  AddCountAndEnumerator(pins, "Count: the number of pins.");
}

void AddFailurePatternPin(py::module_& m) {
  using Pin = QFCBaseFailurePatternPinImpl;
  Class<Pin>(m, "_BaseFailurePatternPin", "What the pattern pins of both platforms offer.")
      .def_property_readonly("Name", Get(&Pin::get_Name), "Name: the pin's name.")
      .def_property_readonly("EcuName", Get(&Pin::get_EcuName), "EcuName: the name of the pin's ECU.")
      .def(
          "Select", Do(&Pin::Select),
          "Select: selects the pin for the pattern's next activation or deactivation; InterlockError without "
          "a failure class.")
      .def("Deselect", Do(&Pin::Deselect), "Deselect: the pin is no longer selected.")
      .def("IsSelected", Get(&Pin::IsSelected), " is pin selected for activate/deactivate")
      .def("IsActivated", Get(&Pin::IsActivated), "is pin failures activated")
      .def("CanBeActivated", Get(&Pin::CanBeActivated), "can pin be activated")
      .def_property_readonly("AdjustedFailureClass", Get(&Pin::get_AdjustedFailureClass),
                             "AdjustedFailureClass: the pin's FailureClass, or None when none is configured.")
      .def(
          "Activate", [](Pin& self) { SwitchPin(self, true); },
          "activate this pin: the pattern is switched with this pin alone selected.")
      .def(
          "Deactivate", [](Pin& self) { SwitchPin(self, false); },
          "deactivate this pin: the pattern is switched with this pin alone selected.")
      .def(
          "SetFailureClass",
          [](Pin& self, std::int32_t FailureClassID, py::object RelayVector) {
            const Variant relayVector = ToVariant(RelayVector);
            Invoke([&] { return self.SetFailureClass(FailureClassID, relayVector); });
          },
          py::arg("FailureClassID"), py::arg("RelayVector") = py::none(),
          "set failure class for this pin: the class FailureClassID with its relay vector RelayVector (0 "
          "when "
          "left out). InterlockError when the interlock does not allow the class for the pin.")
      .def_property_readonly(
          "DefinedFailureClasses", Get(&Pin::get_DefinedFailureClasses),
          "Get defined failure classes: the IDs of the classes the pin file defines for the pin.")
      .def_property_readonly("ModuleChannel", Get(&Pin::get_ModuleChannel), "Norvik module channel(s)")
      .def_property_readonly("PinConfig", Get(&Pin::get_PinConfig), "Pin configuration: five numbers.")
      .def_property_readonly("RefusalReason", Get(&Pin::get_RefusalReason),
                             "Extension: why the safety interlock left the pin without a failure class "
                             "(\"\" while it holds one).")
      .def_property_readonly(
          "AdjustedFailureClassID",
          [](Pin& self) {
            std::int32_t id = 0, relayVector = -1;
            Invoke([&] { return self.get_AdjustedFailureClassID(id, relayVector); });
            return py::make_tuple(id, relayVector);
          },
          "adjusted failure class ID with relay vector, if ID = 0 then the failure class is not "
          "configurated: (ID, RelayVector).")
      .def("Reset", Do(&Pin::Reset),
           "Reset the pin to default state; refused (E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED) while it is "
           "activated.");
  py::class_<QFCFailurePatternKR40PinImpl, Pin, std::shared_ptr<QFCFailurePatternKR40PinImpl>>(
      m, "FailurePatternKR40Pin", "A pin of a KR40 family pattern.")
      .def_property_readonly("ModuleAddress", Get(&QFCFailurePatternKR40PinImpl::get_ModuleAddress),
                             "Norvik module address");
  py::class_<QFCFailurePatternKR60PinImpl, Pin, std::shared_ptr<QFCFailurePatternKR60PinImpl>>(
      m, "FailurePatternKR60Pin", "A pin of a KR60 pattern.")
      .def_property_readonly(
          "ModuleAddress",
          [](QFCFailurePatternKR60PinImpl& self) {
            std::int32_t cabinet = 0, rack = 0, slot = 0;
            Invoke([&] { return self.get_ModuleAddress(cabinet, rack, slot); });
            return py::make_tuple(cabinet, rack, slot);
          },
          "Norvik module address as cabinet,rack,slot: a tuple.");
}

}  // namespace faultbox::python

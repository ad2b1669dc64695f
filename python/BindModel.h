// The Python classes of the object model, one registration function per
// class, and the helpers they share. A property of the model is a Python
// property, a method a method with the model's argument names; [out] results
// are returned (several as a tuple), boolean results are bool, and a failure
// code raises FaultboxError. Every member carries its help text.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "ModuleSupport.h"

namespace faultbox::python {

using Object = std::shared_ptr<QFCAutomationObject>;

template <class T>
using Class = py::class_<T, QFCAutomationObject, std::shared_ptr<T>>;

// A model object as the Python object of its most derived class; None for
// no object. Done here rather than left to pybind11, whose downcast of a
// holder assumes the base class sits at the start of the object.
py::object ToPython(const Object& object);

inline py::object Convert(const std::string& text) {
  return ToText(text);
}
inline py::object Convert(std::int32_t value) {
  return py::int_(value);
}
inline py::object Convert(VARIANT_BOOL flag) {
  return py::bool_(flag != VARIANT_FALSE);
}
inline py::object Convert(const std::vector<std::string>& texts) {
  return ToTextList(texts);
}
inline py::object Convert(const std::vector<std::int32_t>& values) {
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

// Count and _NewEnum, which every collection has; the Python side
// (faultbox/_idioms.py) builds len(), iteration, `in` and [] on them.
template <class C>
void AddCountAndEnumerator(Class<C>& cls, const char* countHelp) {
  cls.def_property_readonly("Count", Get(&C::get_Count), countHelp)
      .def_property_readonly("_NewEnum", Get(&C::get__NewEnum),
                             "_NewEnum: an Enumerator over the live collection. Iterating the collection "
                             "itself walks a snapshot instead, so that members may be closed or removed "
                             "inside the loop.");
}

void AddEnumerator(py::module_& m);
void AddRoot(py::module_& m);
void AddSystems(py::module_& m);
void AddSystem(py::module_& m);
void AddFailurePatterns(py::module_& m);
void AddFailurePattern(py::module_& m);
void AddFailurePatternPins(py::module_& m);
void AddFailurePatternPin(py::module_& m);
void AddFailureClasses(py::module_& m);
void AddFailureClass(py::module_& m);

// Every class above, in the order their references need.
void AddModelClasses(py::module_& m);

}  // namespace faultbox::python

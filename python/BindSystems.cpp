// The system collection and the system.
#include "BindModel.h"
#include "ScriptHardware.h"
#include "automation/QFCFailureClassesImpl.h"
#include "automation/QFCFailurePatternsImpl.h"
#include "automation/QFCSystemImpl.h"
#include "automation/QFCSystemsImpl.h"

namespace faultbox::python {

namespace {

// A member that may switch the relays of the system's bench (a connect ends
// with a reset).
auto OnBench(HRESULT (QFCSystemImpl::*member)()) {
  return [member](QFCSystemImpl& self) {
    Invoke([&] {
      BenchOperation operation(self.GetOwner());
      const HRESULT result = (self.*member)();
      operation.Done(false);
      return result;
    });
  };
}

}  // namespace

void AddSystems(py::module_& m) {
  Class<QFCSystemsImpl> systems(m, "Systems",
                                "The systems of the documents the script opened; also a sequence of System "
                                "with look-up by name.");
  systems
      .def("Item", ItemBy(&QFCSystemsImpl::Item), py::arg("Index"),
           "Item: a system by name (without regard to case) or position 0 to Count - 1.")
      .def_property_readonly("Names", Get(&QFCSystemsImpl::get_Names),
                             "Names: the systems' names (their documents' paths), in order.")
      .def(
          "Open",
          [](QFCSystemsImpl& self, py::object FileName, py::object PinFile) {
            const std::string file = FromPath(FileName);
            const std::string pinFile = PinFile.is_none() ? std::string() : FromPath(PinFile);
            std::shared_ptr<QFCSystemImpl> system;
            Invoke([&] { return self.Open(file, pinFile, system); });
            return ToPython(system);
          },
          py::arg("FileName"), py::arg("PinFile") = py::none(),
          "Open failure simulation system: opens the document FileName (a str or os.PathLike; .fss for the "
          "KR40 family, .fsa for KR60) and gives its System, which `with` closes at the block's end. "
          "PinFile, when given, replaces the pin file the document names. A missing or unreadable file "
          "raises FileError.")
      .def("CloseAll", Do(&QFCSystemsImpl::CloseAll),
           "CloseAll all failure simulation systems; one with an activated pattern stays open, and "
           "FaultboxError (E_FAULTBOX) is raised.");
  AddCountAndEnumerator(systems, "Count: the number of systems.");
}

void AddSystem(py::module_& m) {
  Class<QFCSystemImpl>(
      m, "System",
      "A failure simulation system: one opened document. `with` closes it at the block's end; "
      "connected() connects it for a block.")
      .def_property_readonly("Author", Get(&QFCSystemImpl::get_Author), "Author: the document's author.")
      .def_property_readonly("Description", Get(&QFCSystemImpl::get_Description),
                             "Description: the document's comment.")
      .def_property_readonly(
          "PlatformType",
          [](QFCSystemImpl& self) {
            std::int32_t type = 0;
            Invoke([&] { return self.get_PlatformType(type); });
            return py::module_::import("faultbox").attr("FSPlatformType")(type);
          },
          "get the PlatformType: a member of FSPlatformType.")
      .def_property_readonly("Name", Get(&QFCSystemImpl::get_Name),
                             "Name: the path of the system's document.")
      .def_property_readonly("PinFile", Get(&QFCSystemImpl::get_PinFile),
                             "PinFile: the path of its pin file.")
      .def_property_readonly("ECUVersion", Get(&QFCSystemImpl::get_ECUVersion),
                             "ECUVersion: the ECU version of its pin file.")
      .def("Close", Do(&QFCSystemImpl::Close),
           "Close this failure simulation system. Refused (FaultboxError, E_FAULTBOX) while a pattern is "
           "activated.")
      .def("Connect", OnBench(&QFCSystemImpl::Connect),
           "Connect this failure simulation system to Norvik hardware, then reset the hardware.")
      .def("Disconnect", Do(&QFCSystemImpl::Disconnect),
           "Disconnect this failure simulation system from Norvik hardware. Refused (E_FAULTBOX_DISCONNECT) "
           "while a pattern is activated.")
      .def("IsConnected", Get(&QFCSystemImpl::IsConnected),
           "IsConnected: True when the system is connected to its hardware.")
      .def_property_readonly("FailurePatterns", Get(&QFCSystemImpl::get_FailurePatterns),
                             "failure pattern collection")
      .def_property_readonly("FailureClasses", Get(&QFCSystemImpl::get_FailureClasses),
                             "failure class collection")
      .def("ResetHardware", OnBench(&QFCSystemImpl::ResetHardware),
           "reset Norvik hardware: every relay off. NotConnectedError when the system is not connected.")
      .def(
          "SetInterfaceParameter",
          [](QFCSystemImpl& self, std::int32_t DeviceType, py::object pVal1, py::object pVal2) {
            const Variant first = ToVariant(pVal1);
            const Variant second = ToVariant(pVal2);
            Invoke([&] { return self.SetInterfaceParameter(DeviceType, first, second); });
          },
          py::arg("DeviceType"), py::arg("pVal1") = py::none(), py::arg("pVal2") = py::none(),
          "method set the interface parameter, used at the next connect: KR40 family fdtRS232_IF_PORT and "
          "the port number 1 to 255; KR60 fdtCAN_IF_VI_CAN_CARD_X or fdtCAN_IF_LINKBOX_USB with board and "
          "channel, 0 to 255 each. A value left out keeps the one set.")
      .def(
          "InterfaceParameter",
          [](QFCSystemImpl& self) {
            std::int32_t deviceType = -1, first = -1, second = -1;
            Invoke([&] { return self.InterfaceParameter(deviceType, first, second); });
            return py::make_tuple(deviceType, first, second);
          },
          "method get interface parameter: (DeviceType, pVal1, pVal2); all three -1 when the settings cannot "
          "be read.")
      .def("Save", Do(&QFCSystemImpl::Save), "Extension: saves the document in place, atomically.");
}

}  // namespace faultbox::python

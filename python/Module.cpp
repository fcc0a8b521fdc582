// The `maroset` extension: the host façade, nodeDB and node with every member under its own
// name and its arguments in the same order, their events, the runtime's settings and loop,
// and the simulators.

#include <pybind11/pybind11.h>
#include <pybind11/stl.h>

#include <memory>
#include <string>

#include "BoundEvent.h"
#include "ConnectionRegistry.h"
#include "Host.h"
#include "LoopControl.h"
#include "RuntimeSettings.h"
#include "VariantConversion.h"
#include "core/Runtime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "lang/Conversions.h"
#include "lang/VbError.h"
#include "sim/softplc/SoftPlcSimulator.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

// Arguments convert as the language converts a Variant passed to a typed parameter: 7 and
// "7" both make a Long, 7 makes the text "7", None fails with Invalid use of Null (94).
int32_t Long(py::handle value) {
    return CLng(FromPython(value));
}

std::string Text(py::handle value) {
    return CStr(FromPython(value));
}

VbArray<int32_t> HandlesFromPython(py::handle sequence) {
    const VbArray<Variant> values = ArrayFromPython(sequence, 1);
    VbArray<int32_t> handles(1, values.size());
    for (int32_t i = 1; i <= values.size(); ++i) handles(i) = CLng(values(i));
    return handles;
}

// The façade of a Python object, or nothing while it has none (being made or unmade).
Host* HostOf(PyObject* self) {
    auto* instance = reinterpret_cast<py::detail::instance*>(self);
    const auto holder = instance->get_value_and_holder();
    return holder.holder_constructed() ? holder.template holder<std::shared_ptr<Host>>().get()
                                       : nullptr;
}

// The VbError class of the package's pure-Python part, kept for the life of the process.
py::object* vbErrorType_ = nullptr;

void TranslateVbError(std::exception_ptr pending) {
    try {
        if (pending) std::rethrow_exception(pending);
    } catch (const VbError& e) {
        const py::object error =
            (*vbErrorType_)(e.number(), TextToPython(e.description()), TextToPython(e.source()));
        PyErr_SetObject(vbErrorType_->ptr(), error.ptr());
    }
}

struct EmptyType {};

template <class EventType>
void BindEvent(py::module_& m, const char* name) {
    py::class_<BoundEvent<EventType>>(m, name)
        .def("connect", &BoundEvent<EventType>::connect, py::arg("handler"),
             "Calls handler with the event's arguments each time it is raised; returns the "
             "Connection that can disconnect it.")
        .def_property_readonly("handler_count", &BoundEvent<EventType>::handlerCount);
}

template <class Class>
void VariantMember(Class& cls, const char* name, Variant node::*member) {
    cls.def_property(
        name, [member](const node& n) { return ToPython(n.*member); },
        [member](node& n, py::handle value) { n.*member = FromPython(value); });
}

void BindNode(py::module_& m) {
    py::class_<node, std::shared_ptr<node>> cls(m, "node");
    cls.def(py::init<>())
        .def_property(
            "NodeID", [](const node& n) { return n.NodeID; },
            [](node& n, py::handle v) { n.NodeID = Long(v); })
        .def_property(
            "Name", [](const node& n) { return TextToPython(n.Name); },
            [](node& n, py::handle v) { n.Name = Text(v); })
        .def_property(
            "NodeName", [](const node& n) { return TextToPython(n.NodeName); },
            [](node& n, py::handle v) { n.NodeName = Text(v); });
    VariantMember(cls, "DriverName", &node::DriverName);
    VariantMember(cls, "ScanRate", &node::ScanRate);
    VariantMember(cls, "OPCTopic", &node::OPCTopic);
    VariantMember(cls, "ServerName", &node::ServerName);
    VariantMember(cls, "SerialPort", &node::SerialPort);
    VariantMember(cls, "BaudRate", &node::BaudRate);
    VariantMember(cls, "TagPrefex", &node::TagPrefex);
    VariantMember(cls, "IPAddress", &node::IPAddress);
    VariantMember(cls, "Port", &node::Port);
    cls.def("Init", &node::Init)
        .def(
            "AddTag",
            [](node& n, py::handle TagID, py::handle TagAddress) {
                n.AddTag(Long(TagID), Text(TagAddress));
            },
            py::arg("TagID"), py::arg("TagAddress"))
        .def(
            "RemoveTag", [](node& n, py::handle TagID) { n.RemoveTag(Long(TagID)); },
            py::arg("TagID"))
        .def(
            "ReadTag", [](node& n, py::handle TagID) { n.ReadTag(Long(TagID)); }, py::arg("TagID"))
        .def(
            "WriteTag",
            [](node& n, py::handle TagID, py::handle value) {
                return ToPython(n.WriteTag(Text(TagID), FromPython(value)));
            },
            py::arg("TagID"), py::arg("value"))
        .def_property(
            "IsActive", [](const node& n) { return n.IsActive(); },
            [](node& n, py::handle v) { n.IsActive(CBool(FromPython(v))); })
        .def("browse", &node::browse)
        .def(
            "WriteArray",
            [](node& n, py::handle TagID, py::handle Values) {
                VbArray<Variant> values = ArrayFromPython(Values, 0);
                return ToPython(n.WriteArray(Text(TagID), values));
            },
            py::arg("TagID"), py::arg("Values"))
        .def("__repr__", [](const node& n) {
            return py::str("<maroset.node {!r} ({!r})>")
                .format(TextToPython(n.Name), ToPython(n.DriverName));
        });
}

void BindNodeDB(py::module_& m) {
    py::class_<nodeDB, std::shared_ptr<nodeDB>>(m, "nodeDB")
        .def(py::init<>())
        .def("GetDrivers", [](nodeDB& db) { return ToPython(db.GetDrivers()); })
        .def("GetDriverType", [](nodeDB& db) { return ToPython(db.GetDriverType()); })
        .def(
            "getNode", [](nodeDB& db, py::handle NodeName) { return db.getNode(Text(NodeName)); },
            py::arg("NodeName"))
        .def("count", &nodeDB::count)
        .def(
            "AddNode",
            [](nodeDB& db, py::handle NodeName, py::handle DriverName, py::handle OPCTopic,
               py::handle ScanRate, py::handle TagPrefex) {
                db.AddNode(Text(NodeName), Text(DriverName), Text(OPCTopic), Long(ScanRate),
                           Long(TagPrefex));
            },
            py::arg("NodeName"), py::arg("DriverName"), py::arg("OPCTopic") = "",
            py::arg("ScanRate") = 0, py::arg("TagPrefex") = 0)
        .def(
            "AddAllNodes",
            [](nodeDB& db, py::handle ProjectDBName) {
                db.AddAllNodes(PathFromPython(ProjectDBName));
            },
            py::arg("ProjectDBName"))
        .def(
            "RemoveNode", [](nodeDB& db, py::handle NodeName) { db.RemoveNode(Text(NodeName)); },
            py::arg("NodeName"))
        .def("RemoveAllNodes", &nodeDB::RemoveAllNodes)
        .def(
            "NewValue",
            [](nodeDB& db, py::handle TagIDs, py::handle NumItems, py::handle Values) {
                VbArray<int32_t> ids = HandlesFromPython(TagIDs);
                VbArray<Variant> values = ArrayFromPython(Values, 1);
                db.NewValue(ids, CInt(FromPython(NumItems)), values);
            },
            py::arg("TagIDs"), py::arg("NumItems"), py::arg("Values"))
        .def("StartScanning", &nodeDB::StartScanning)
        .def("StopScanning", &nodeDB::StopScanning)
        .def(
            "NUVError",
            [](nodeDB& db, py::handle Driver, py::handle FromSub, py::handle Message) {
                db.NUVError(Text(Driver), Text(FromSub), Text(Message));
            },
            py::arg("Driver"), py::arg("FromSub"), py::arg("Message"))
        .def("nodes", &nodeDB::nodes, "The nodes in collection order.")
        .def_property_readonly("ValueChange",
                               [](py::object self) {
                                   auto db = py::cast<std::shared_ptr<nodeDB>>(self);
                                   return BoundEvent<ValueChangeEvent>(
                                       db->ValueChange, ConnectionRegistry::of(db), self);
                               })
        .def_property_readonly("DriverError", [](py::object self) {
            auto db = py::cast<std::shared_ptr<nodeDB>>(self);
            return BoundEvent<DriverErrorEvent>(db->DriverError, ConnectionRegistry::of(db), self);
        });
}

// The façade's handlers may refer back to it (a lambda that uses `host`): the garbage
// collector sees the callables through the façade and can break such cycles.
void HostTypeSetup(PyHeapTypeObject* heapType) {
    PyTypeObject* type = &heapType->ht_type;
    type->tp_flags |= Py_TPFLAGS_HAVE_GC;
    type->tp_traverse = [](PyObject* self, visitproc visit, void* arg) {
        Py_VISIT(Py_TYPE(self));
        if (Host* host = HostOf(self)) return host->connections().traverse(visit, arg);
        return 0;
    };
    type->tp_clear = [](PyObject* self) {
        if (Host* host = HostOf(self)) host->connections().clear();
        return 0;
    };
}

void BindInterface(py::module_& m) {
    py::class_<Host, std::shared_ptr<Host>>(m, "ClsNodeDBInterface",
                                            py::custom_type_setup(&HostTypeSetup))
        .def(py::init<>())
        .def_property(
            "nodeDB", [](const Host& h) { return h.nodeDB(); },
            [](Host& h, std::shared_ptr<nodeDB> db) { h.nodeDB(std::move(db)); })
        .def_property_readonly("ValueChange",
                               [](py::object self) {
                                   Host& h = py::cast<Host&>(self);
                                   return BoundEvent<ValueChangeEvent>(h.ValueChange,
                                                                       h.connections(), self);
                               })
        .def_property_readonly("DriverError", [](py::object self) {
            Host& h = py::cast<Host&>(self);
            return BoundEvent<DriverErrorEvent>(h.DriverError, h.connections(), self);
        });
}

// The runtime's reports by node (`maroset.reports`): its handlers live as long as the process.
void BindReportTap(py::module_& m) {
    static auto* connections = new ConnectionList();
    py::class_<ReportTap>(m, "ReportTap")
        .def_property_readonly("Values",
                               [](ReportTap& tap) {
                                   return BoundEvent<ReportValuesEvent>(tap.Values, *connections,
                                                                        py::none());
                               })
        .def_property_readonly("Errors", [](ReportTap& tap) {
            return BoundEvent<ReportErrorsEvent>(tap.Errors, *connections, py::none());
        });
    BindEvent<ReportValuesEvent>(m, "ReportValuesEvent");
    BindEvent<ReportErrorsEvent>(m, "ReportErrorsEvent");
    m.attr("reports") = py::cast(&Runtime::current().reports(), py::return_value_policy::reference);
}

void BindRuntime(py::module_& m) {
    using Ports = RuntimeSettings::SerialPorts;
    py::class_<Ports>(m, "SerialPorts")
        .def("__getitem__",
             [](const Ports&, py::handle key) { return RuntimeSettings().serialDevice(key); })
        .def("__setitem__", [](Ports&, py::handle key, py::handle device) {
            RuntimeSettings().mapSerialPort(key, TextFromPython(py::str(device)));
        });
    py::class_<RuntimeSettings>(m, "RuntimeSettings")
        .def_property("drive_root", &RuntimeSettings::driveRoot, &RuntimeSettings::setDriveRoot)
        .def_property(
            "com_ports", [](const RuntimeSettings&) { return Ports{}; },
            &RuntimeSettings::mapSerialPorts)
        .def_property("modbus_port", &RuntimeSettings::modbusPort, &RuntimeSettings::setModbusPort)
        .def_property("trap", &RuntimeSettings::trap, &RuntimeSettings::setTrap)
        .def_property("message_box", &RuntimeSettings::messageBox, &RuntimeSettings::setMessageBox);
    m.attr("runtime") = RuntimeSettings();
}

void BindLoop(py::module_& m) {
    m.def("run_for", &LoopControl::runFor, py::arg("seconds"),
          "Runs the loop for the given seconds, or until stop().");
    m.def("run", &LoopControl::run, "Runs the loop until stop().");
    m.def("stop", &LoopControl::stop, "Makes the innermost run() or run_for() return.");
    m.def("pump", &LoopControl::pump, "Runs what is ready now and returns.");
    m.def("_readiness_fd", &LoopControl::readinessFd);
    // For the benchmark: `count` one-tag reports raised through the nodeDB, as drivers do.
    m.def("_raise_value_changes", [](nodeDB& db, int32_t count) {
        VbArray<int32_t> ids(1, 1);
        VbArray<Variant> values(1, 1);
        ids(1) = 1;
        for (int32_t i = 0; i < count; ++i) {
            values(1) = static_cast<double>(i);
            db.NewValue(ids, 1, values);
        }
    });
    m.def("_prepare_wait", &LoopControl::prepareWait);
}

void BindSimulators(py::module_& m) {
    py::module_ sim = m.def_submodule("sim", "Device simulators on the library's loop.");
    using Sim = sim::SoftPlcSimulator;
    py::class_<Sim>(sim, "SoftPlcSimulator")
        .def(py::init([](int32_t port, int32_t step_ms) {
                 Sim::Options options;
                 options.stepMs = step_ms;
                 return Sim::OnLoopback(port, options);
             }),
             py::arg("port") = 0, py::arg("step_ms") = 1000,
             "A soft-PLC server on 127.0.0.1 (port 0: a free one).")
        .def_property_readonly("port", &Sim::port)
        .def_property_readonly("endpoint", &Sim::endpoint)
        .def_property_readonly("clients", &Sim::clients)
        .def("set_value", &Sim::setValue, py::arg("handle"), py::arg("value"))
        .def(
            "value",
            [](const Sim& s, int32_t handle) -> py::object {
                const auto tag = s.tag(handle);
                return tag ? py::object(TextToPython(tag->value)) : py::none();
            },
            py::arg("handle"))
        .def("command", &Sim::command, py::arg("line"))
        .def("help", &Sim::help);
}

}  // namespace

}  // namespace maroset::python

PYBIND11_MODULE(_maroset, m) {
    using namespace maroset;
    using namespace maroset::python;

    m.doc() = "Python binding of the Maroset host façade.";

    py::class_<EmptyType>(m, "EmptyType")
        .def("__repr__", [](const EmptyType&) { return "Empty"; })
        .def("__bool__", [](const EmptyType&) { return false; });
    SetEmptyValue(py::cast(EmptyType{}));
    m.attr("Empty") = EmptyValue();

    vbErrorType_ = new py::object(py::module_::import("maroset._errors").attr("VbError"));
    m.attr("VbError") = *vbErrorType_;
    py::register_exception_translator(&TranslateVbError);

    py::class_<Connection, std::shared_ptr<Connection>>(m, "Connection")
        .def("disconnect", &Connection::disconnect)
        .def_property_readonly("connected", &Connection::connected)
        .def("__enter__", [](const std::shared_ptr<Connection>& c) { return c; })
        .def("__exit__", [](Connection& c, py::args) { c.disconnect(); });
    BindEvent<ValueChangeEvent>(m, "ValueChangeEvent");
    BindEvent<DriverErrorEvent>(m, "DriverErrorEvent");

    BindNode(m);
    BindNodeDB(m);
    BindInterface(m);
    BindRuntime(m);
    BindReportTap(m);
    BindLoop(m);
    BindSimulators(m);
}

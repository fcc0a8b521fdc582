"""Maroset for Python hosts: the host façade (`ClsNodeDBInterface`, `nodeDB`, `node`) with
its events, the runtime's settings and loop, and helpers for `with` and `async for`."""

from ._errors import VbError
from ._maroset import (
    ClsNodeDBInterface,
    Connection,
    DriverErrorEvent,
    Empty,
    EmptyType,
    ReportErrorsEvent,
    ReportTap,
    ReportValuesEvent,
    RuntimeSettings,
    SerialPorts,
    ValueChangeEvent,
    node,
    nodeDB,
    pump,
    reports,
    run,
    run_for,
    runtime,
    sim,
    stop,
)
from ._asyncio import Attachment, attach
from ._project import Change, Project

__all__ = [
    "Attachment", "Change", "ClsNodeDBInterface", "Connection", "DriverErrorEvent", "Empty",
    "EmptyType", "Project", "ReportErrorsEvent", "ReportTap", "ReportValuesEvent",
    "RuntimeSettings", "SerialPorts", "ValueChangeEvent", "VbError", "attach", "node", "nodeDB",
    "pump", "reports", "run", "run_for", "runtime", "sim", "stop",
]

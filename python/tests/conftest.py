import gc
import sqlite3
import sys

import pytest

import maroset

NODES_TABLE = (
    "create table Nodes (Name text, Driver text, OPCServer text, OPCTopic text, "
    "UpdateRate integer, CommPort integer, BaudRate integer, TagPrefex text, "
    "IPAddress text, Port integer)"
)


def make_project(path, rows):
    """A project database whose Nodes table holds `rows`: dicts of column values."""
    with sqlite3.connect(path) as db:
        db.execute(NODES_TABLE)
        for row in rows:
            columns = ", ".join(row)
            marks = ", ".join("?" for _ in row)
            db.execute(f"insert into Nodes ({columns}) values ({marks})", list(row.values()))
    return str(path)


def run_until(done, seconds=5.0):
    """Runs the loop in short steps until done() holds or the time is up."""
    for _ in range(int(seconds / 0.01)):
        if done():
            return True
        maroset.run_for(0.01)
    return done()


@pytest.fixture(autouse=True)
def fresh_runtime(tmp_path):
    """Each test gets its own drive C: and finds no nodes, the trap off and the default
    message box, whatever the test before it did."""
    gc.collect()  # façades an earlier test left in reference cycles report no more
    maroset.runtime.drive_root = tmp_path / "drive_c"
    maroset.runtime.trap = False
    yield
    maroset.ClsNodeDBInterface().nodeDB.RemoveAllNodes()
    maroset.runtime.trap = False
    maroset.runtime.message_box = None


@pytest.fixture
def host():
    return maroset.ClsNodeDBInterface()


@pytest.fixture
def reports(host):
    """Every ValueChange of the façade, as (handles, count, values)."""
    seen = []
    host.ValueChange.connect(lambda handles, count, values: seen.append((handles, count, values)))
    return seen


@pytest.fixture
def unraisable(monkeypatch):
    """What callbacks raised and the binding reported instead of passing on."""
    seen = []
    monkeypatch.setattr(sys, "unraisablehook", seen.append)
    yield seen
    seen.clear()  # their tracebacks hold the test's frame


@pytest.fixture
def softplc(tmp_path):
    """A soft-PLC simulator on loopback and a project with one NUVTCPIP node, PLC1, on it."""
    sim = maroset.sim.SoftPlcSimulator(step_ms=50)
    project = make_project(tmp_path / "plc.db", [{
        "Name": "PLC1", "Driver": "NUVTCPIP", "UpdateRate": 1000,
        "IPAddress": "127.0.0.1", "Port": sim.port,
    }])
    return sim, project

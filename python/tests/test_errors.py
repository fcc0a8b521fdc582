"""Run-time errors reach Python as maroset.VbError with the library's numbers."""

import pytest

import maroset


def error_of(operation):
    with pytest.raises(maroset.VbError) as raised:
        operation()
    return raised.value


def test_errors_carry_number_description_and_source(host, tmp_path):
    db = host.nodeDB
    db.AddNode("Mem", "MEMTAG")
    e = error_of(lambda: db.AddNode("MEM", "MEMTAG"))
    assert e.number == 457
    assert e.description == "This key is already associated with an element of this collection"
    assert isinstance(e, Exception) and "457" in str(e)
    e = error_of(lambda: db.RemoveNode("Pump"))
    assert e.number == 5 and e.source
    assert error_of(lambda: db.AddAllNodes(tmp_path / "missing.db")).number == 3024
    assert db.getNode("Pump") is None


def test_arguments_convert_as_the_language_does(host):
    host.nodeDB.AddNode("Mem", "MEMTAG")
    mem = host.nodeDB.getNode("Mem")
    assert error_of(lambda: mem.AddTag(40000, "x")).number == 6  # handles are 16-bit
    assert error_of(lambda: mem.AddTag("seven", "x")).number == 13
    assert error_of(lambda: mem.AddTag(None, "x")).number == 94
    mem.AddTag("8", 12)  # "8" is a number, 12 a text


def test_a_node_never_initialised_is_object_not_set():
    bare = maroset.node()
    assert error_of(lambda: bare.WriteTag("1", 2)).number == 91


def test_with_the_trap_on_errors_are_logged_not_raised(host):
    maroset.runtime.trap = True
    host.nodeDB.RemoveNode("Pump")  # logged to C:\MarosetErrors.txt, then carries on
    log = maroset.runtime.drive_root + "/MarosetErrors.txt"
    assert "Invalid procedure call or argument" in open(log, encoding="latin-1").read()

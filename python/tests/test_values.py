"""Values in both directions through memory and disk tags."""

import pytest

import maroset

# (written, reported by a memory tag, read back from a disk tag, which keeps text)
KINDS = [
    (maroset.Empty, maroset.Empty, ""),
    (None, None, None),
    (-32768, -32768, "-32768"),
    (2**31 - 1, 2**31 - 1, "2147483647"),
    (-(2**31), -(2**31), "-2147483648"),
    (1.5, 1.5, "1.5"),
    (1e300, 1e300, "1E+300"),
    ("café", "café", "café"),
    ("caf\udce9", "caf\udce9", "caf\udce9"),  # the byte E9 alone: not UTF-8, kept as it is
    (b"\xff\x00", "\udcff\x00", "\udcff\x00"),
    (True, True, "True"),
    ([1, "two", None, [3.5]], [1, "two", None, [3.5]], None),
]


@pytest.mark.parametrize("written,reported,stored", KINDS)
def test_memory_tag_reports_each_kind_as_written(host, reports, written, reported, stored):
    db = host.nodeDB
    db.AddNode("Mem", "MEMTAG")
    db.getNode("Mem").AddTag(7, "Level")
    db.getNode("Mem").WriteTag("7", written)
    handles, count, values = reports[-1]
    assert (handles, count) == ([7], 1)
    assert values == [reported] and type(values[0]) is type(reported)


@pytest.mark.parametrize("written,reported,stored",
                         [k for k in KINDS if not isinstance(k[0], list)])
def test_disk_tag_keeps_the_value_across_nodes(host, reports, written, reported, stored):
    db = host.nodeDB
    db.AddNode("Line1", "DISKTAG")
    db.getNode("Line1").AddTag(5, "Level")
    db.getNode("Line1").WriteTag(5, written)
    db.RemoveNode("Line1")
    db.AddNode("Line1", "DISKTAG")
    db.getNode("Line1").AddTag(5, "Level")
    db.getNode("Line1").ReadTag(5)
    assert reports[-1] == ([5], 1, [stored])


def test_arrays_and_report_lists_keep_their_order(host, reports):
    db = host.nodeDB
    db.NewValue([3, 1, 2], 3, ["c", "a", "b"])
    assert reports[-1] == ([3, 1, 2], 3, ["c", "a", "b"])
    assert db.GetDrivers()[0] == "MEMTAG" and db.GetDriverType()[-1] == "2"


@pytest.mark.parametrize("value", [2**31, -(2**31) - 1, 2**80])
def test_ints_out_of_range_are_overflow(host, value):
    host.nodeDB.AddNode("Mem", "MEMTAG")
    with pytest.raises(maroset.VbError) as raised:
        host.nodeDB.getNode("Mem").WriteTag("1", value)
    assert raised.value.number == 6


def test_a_value_of_no_kind_is_type_mismatch(host):
    host.nodeDB.AddNode("Mem", "MEMTAG")
    with pytest.raises(maroset.VbError) as raised:
        host.nodeDB.getNode("Mem").WriteTag("1", object())
    assert raised.value.number == 13


def test_node_properties_hold_variants(host):
    host.nodeDB.AddNode("Mem", "MEMTAG", "topic", 250, 3)
    n = host.nodeDB.getNode("mem")  # keys in any letter case
    assert (n.Name, n.DriverName, n.OPCTopic) == ("Mem", "MEMTAG", "topic")
    assert (n.ScanRate, n.TagPrefex) == (250, 3)
    n.IPAddress = None
    n.Port = 502
    assert n.IPAddress is None and n.Port == 502 and n.IsActive is False
    assert [x.Name for x in host.nodeDB.nodes()] == ["Mem"] and host.nodeDB.count() == 1

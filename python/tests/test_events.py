"""Python callbacks on the library's events."""

import maroset


def mem_node(host):
    host.nodeDB.AddNode("Mem", "MEMTAG")
    node = host.nodeDB.getNode("Mem")
    node.AddTag(1, "x")
    return node


def test_handlers_stay_until_disconnected_whether_or_not_the_handle_is_kept(host):
    seen = []
    host.ValueChange.connect(lambda h, n, v: seen.append(("kept by the façade", v[0])))
    connection = host.ValueChange.connect(lambda h, n, v: seen.append(("by the handle", v[0])))
    mem = mem_node(host)
    mem.WriteTag(1, 1)
    connection.disconnect()
    mem.WriteTag(1, 2)
    assert seen == [("kept by the façade", 1), ("by the handle", 1), ("kept by the façade", 2)]
    assert not connection.connected and host.ValueChange.handler_count == 1
    with host.ValueChange.connect(lambda *a: seen.append("scoped")):
        mem.WriteTag(1, 3)
    mem.WriteTag(1, 4)
    assert seen.count("scoped") == 1


def test_driver_errors_and_the_nodedb_events(host):
    seen = []
    host.DriverError.connect(lambda driver, source, message: seen.append((driver, source, message)))
    host.nodeDB.DriverError.connect(lambda *args: seen.append("nodeDB"))
    host.nodeDB.NUVError("OPC", "Group_DataChange", "bad item \xe9")
    assert seen == ["nodeDB", ("OPC", "Group_DataChange", "bad item \xe9")] or \
        seen == [("OPC", "Group_DataChange", "bad item \xe9"), "nodeDB"]


def test_the_report_tap_names_the_node(host):
    seen = []
    with maroset.reports.Values.connect(lambda *report: seen.append(report)):
        mem_node(host).WriteTag(1, 2.5)
        host.nodeDB.NewValue([1], 1, [0])  # not a driver's: not tapped
    assert seen == [("Mem", [1], 1, [2.5])]


def test_a_raising_callback_is_reported_and_the_others_carry_on(host, unraisable):
    seen = []

    def bad(handles, count, values):
        raise ValueError("boom")

    host.ValueChange.connect(bad)
    host.ValueChange.connect(lambda h, n, v: seen.append(v[0]))
    mem = mem_node(host)
    mem.WriteTag(1, "a")
    mem.WriteTag(1, "b")
    assert seen == ["a", "b"]
    assert [type(u.exc_value) for u in unraisable] == [ValueError, ValueError]
    assert unraisable[0].object is bad
    maroset.run_for(0.01)


def test_a_callback_may_remove_the_node_that_raised_it(host):
    mem = mem_node(host)
    host.ValueChange.connect(lambda h, n, v: host.nodeDB.RemoveNode("Mem"))
    mem.WriteTag(1, 5)
    assert host.nodeDB.getNode("Mem") is None
    del mem  # the last reference: the driver shuts down here
    maroset.run_for(0.01)


def test_a_callback_may_drop_the_facade(unraisable):
    holder = [maroset.ClsNodeDBInterface()]
    seen = []

    def drop(handles, count, values):
        seen.append(values[0])
        holder.clear()

    holder[0].ValueChange.connect(drop)
    holder[0].nodeDB.NewValue([1], 1, [2.5])
    holder_db = maroset.ClsNodeDBInterface().nodeDB
    holder_db.NewValue([1], 1, [3.5])  # the dropped façade no longer reports
    assert seen == [2.5] and not unraisable

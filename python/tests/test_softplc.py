"""A NUVTCPIP node against the soft-PLC simulator on loopback, in this process."""

from conftest import run_until


def test_values_move_writes_reach_the_plc_and_a_raising_callback_does_not_stop_the_loop(
        host, reports, softplc, unraisable):
    sim, project = softplc
    db = host.nodeDB
    db.AddAllNodes(project)
    assert run_until(lambda: sim.clients == 1)
    calls = []

    def raises_once(handles, count, values):
        calls.append(values)
        if len(calls) == 1:
            raise RuntimeError("first report")

    host.ValueChange.connect(raises_once)
    db.getNode("PLC1").AddTag(41, "Level")
    db.StartScanning()
    assert run_until(lambda: len(reports) >= 3), "values move"
    assert isinstance(unraisable[0].exc_value, RuntimeError) and len(calls) >= 3

    db.getNode("PLC1").WriteTag("41", "hello")
    assert run_until(lambda: sim.value(41) == "hello")
    sim.set_value(41, "from the PLC")
    assert run_until(lambda: reports[-1][2] == ["from the PLC"])
    db.RemoveAllNodes()
    assert run_until(lambda: sim.clients == 0)

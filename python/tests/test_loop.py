"""The loop: run_for, run and stop, the interpreter lock, the runtime's settings."""

import os
import signal
import threading

import pytest

import maroset


def test_run_for_checks_its_argument():
    for bad in (-1, float("nan"), float("inf")):
        with pytest.raises(ValueError):
            maroset.run_for(bad)
    maroset.run_for(0)


def test_ctrl_c_ends_a_run_that_sleeps():
    timer = threading.Timer(0.1, os.kill, (os.getpid(), signal.SIGINT))
    timer.start()
    with pytest.raises(KeyboardInterrupt):
        maroset.run()
    timer.join()
    maroset.run_for(0.01)  # and the loop runs again


def test_other_threads_run_while_the_loop_sleeps():
    ticks = []
    stop = threading.Event()

    def worker():
        while not stop.is_set():
            ticks.append(1)
            stop.wait(0.005)

    thread = threading.Thread(target=worker)
    thread.start()
    before = len(ticks)
    maroset.run_for(0.2)
    stop.set()
    thread.join()
    assert len(ticks) - before >= 5


def test_stop_from_a_callback_ends_run(host, softplc):
    sim, project = softplc
    host.nodeDB.AddAllNodes(project)
    host.nodeDB.getNode("PLC1").AddTag(41, "Level")
    host.nodeDB.StartScanning()
    seen = []

    def first(handles, count, values):
        seen.append(values)
        maroset.stop()

    host.ValueChange.connect(first)
    maroset.run()
    assert seen


def test_runtime_settings(tmp_path):
    rt = maroset.runtime
    rt.com_ports[3] = "/dev/ttyUSB0"
    rt.com_ports = {("Meter", 1): "/dev/ttyUSB1"}
    assert rt.com_ports[3] == "/dev/ttyUSB0"
    assert rt.com_ports["meter", 1] == "/dev/ttyUSB1" and rt.com_ports[1] == "/dev/ttyS0"
    with pytest.raises(KeyError):
        rt.com_ports["1"]
    rt.drive_root = tmp_path
    assert rt.drive_root == str(tmp_path)
    rt.modbus_port = 1502
    assert rt.modbus_port == 1502
    with pytest.raises(ValueError):
        rt.modbus_port = 70000
    rt.modbus_port = 502
    with pytest.raises(TypeError):
        rt.message_box = 5
    shown = []
    rt.message_box = shown.append
    assert rt.message_box == shown.append

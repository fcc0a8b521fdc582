"""Reference counting: callbacks and values are released, façades may go at any time."""

import gc
import tracemalloc
import weakref

import maroset
from conftest import run_until


class Counter:
    def __init__(self):
        self.count = 0

    def __call__(self, handles, count, values):
        self.count += 1


def test_no_leak_after_10000_events(host):
    counter = Counter()
    connection = host.ValueChange.connect(counter)
    db = host.nodeDB
    maroset._maroset._raise_value_changes(db, 1000)  # warm up
    db.NewValue([1, 2], 2, ["text", [1.5]])
    gc.collect()
    tracemalloc.start()
    before = tracemalloc.get_traced_memory()[0]
    maroset._maroset._raise_value_changes(db, 5000)
    for i in range(5000):
        db.NewValue([1, 2], 2, ["text %d" % i, [1.5, i]])
    gc.collect()
    grown = tracemalloc.get_traced_memory()[0] - before
    tracemalloc.stop()
    assert counter.count == 11001
    assert grown < 64 * 1024, f"{grown} bytes kept after 10,000 events"
    watch = weakref.ref(counter)
    connection.disconnect()
    del counter
    gc.collect()
    assert watch() is None, "a disconnected callback is released"


def test_a_dropped_facade_releases_its_callbacks():
    host = maroset.ClsNodeDBInterface()
    counter = Counter()
    host.ValueChange.connect(counter)
    watch = weakref.ref(counter)
    del counter, host
    gc.collect()
    assert watch() is None


def test_a_facade_dropped_while_the_loop_runs(softplc):
    sim, project = softplc
    keeper = maroset.ClsNodeDBInterface()
    keeper.nodeDB.AddAllNodes(project)
    keeper.nodeDB.getNode("PLC1").AddTag(41, "Level")
    keeper.nodeDB.StartScanning()
    holder = [maroset.ClsNodeDBInterface()]
    counter = Counter()
    holder[0].ValueChange.connect(counter)
    holder[0].ValueChange.connect(lambda *a: holder.clear())
    seen = []
    keeper.ValueChange.connect(lambda h, n, v: seen.append(v))
    assert run_until(lambda: len(seen) >= 3)
    assert counter.count == 1 and not holder


def test_a_callback_that_refers_to_its_facade_does_not_keep_it_alive():
    host = maroset.ClsNodeDBInterface()
    # The default argument holds the façade itself, not a cell that `del` empties.
    host.ValueChange.connect(lambda h, n, v, host=host: host.nodeDB.count())
    watch = weakref.ref(host)
    del host
    gc.collect()
    assert watch() is None

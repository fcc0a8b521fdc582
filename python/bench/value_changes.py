"""Value changes per second delivered to a Python callback.

Through the library: one-tag reports raised by the nodeDB, as a driver raises them, passed on
by the façade and handed to the callback as lists. Reference: a bare pybind11 loop calling the
same callback with the same lists. Both run here, in this process, so the ratio does not
depend on the machine. Rates are per second of this thread's CPU time.

    PYTHONPATH=build/release/python python3 python/bench/value_changes.py [REPORTS]
"""

import sys
import time

import _maroset_bench
import maroset


ROUNDS = 21


def rate(run, reports):
    # CPU time of this thread: other work on a busy machine does not count against either.
    start = time.thread_time()
    run(reports)
    return reports / (time.thread_time() - start)


def main():
    reports = int(sys.argv[1]) if len(sys.argv) > 1 else 100_000
    received = 0

    def callback(handles, count, values):
        nonlocal received
        received += count

    host = maroset.ClsNodeDBInterface()
    host.ValueChange.connect(callback)
    db = host.nodeDB
    library = bare = 0.0
    # Rounds alternate, and each side keeps its best, so a busy moment of the machine
    # weighs on neither side more than on the other.
    through_library = lambda n: maroset._maroset._raise_value_changes(db, n)  # noqa: E731
    bare_loop = lambda n: _maroset_bench.bare(callback, n)  # noqa: E731
    for _ in range(ROUNDS):
        library = max(library, rate(through_library, reports))
        bare = max(bare, rate(bare_loop, reports))
    assert received == 2 * ROUNDS * reports
    print(f"through the library : {library:12,.0f} value changes/s (CPU)")
    print(f"bare pybind11 loop  : {bare:12,.0f} value changes/s (CPU)")
    print(f"ratio               : {library / bare:.2f}x (goal: 0.7x or more)")


if __name__ == "__main__":
    main()

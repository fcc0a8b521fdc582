"""The library driven from asyncio, with no thread of its own."""

import asyncio

import maroset


def test_project_changes_arrive_in_async_for(softplc):
    sim, project = softplc

    async def main():
        ticks = 0

        async def ticker():
            nonlocal ticks
            while True:
                await asyncio.sleep(0.01)
                ticks += 1

        other = asyncio.create_task(ticker())
        with maroset.Project(project) as p:
            p.add_tag("PLC1", 41, "Level")
            changes = []
            async for change in p.changes():
                changes.append(change)
                if len(changes) == 3:
                    break
            p.node("PLC1").WriteTag(41, "written")
            async for change in p.changes():
                if change.value == "written":
                    break
        other.cancel()
        return changes, ticks

    changes, ticks = asyncio.run(asyncio.wait_for(main(), 10))
    assert [(c.node.Name, c.handle) for c in changes] == [("PLC1", 41)] * 3
    assert ticks > 0, "the asyncio loop kept running its other tasks"
    assert maroset.ClsNodeDBInterface().nodeDB.count() == 0, "the project removed its nodes"


def test_attach_is_shared_and_work_queued_from_python_wakes_the_loop(host, reports, softplc):
    sim, project = softplc

    async def main():
        attachment = await maroset.attach(asyncio.get_running_loop())
        assert await maroset.attach() is attachment
        host.nodeDB.AddAllNodes(project)  # connects on the loop: queued from outside it
        for _ in range(500):
            if sim.clients == 1:
                break
            await asyncio.sleep(0.01)
        attachment.detach()
        return sim.clients

    assert asyncio.run(main()) == 1
    # A new asyncio loop attaches afresh.
    assert asyncio.run(maroset.attach()).loop is not None

"""A project as a context: loaded and started on entry, stopped and removed on exit."""

from __future__ import annotations

import asyncio
import os
from typing import AsyncIterator, NamedTuple, Optional, Union

from ._asyncio import attach
from . import _maroset
from ._maroset import ClsNodeDBInterface, reports


class Change(NamedTuple):
    """One tag's new value: the node whose driver reported it (None when the node is gone
    by the time the change is taken), the tag's handle and the value."""

    node: Optional[_maroset.node]
    handle: int
    value: object


class Project:
    """`with maroset.Project("plant.db") as p:` loads the project's nodes (AddAllNodes) and
    starts scanning; leaving the block stops scanning and removes the nodes."""

    def __init__(self, path: Union[str, os.PathLike], *, start: bool = True) -> None:
        self.path = path
        self.start = start
        self.host: Optional[ClsNodeDBInterface] = None

    def __enter__(self) -> "Project":
        self.host = ClsNodeDBInterface()
        self.db = self.host.nodeDB
        try:
            self.db.AddAllNodes(self.path)
            if self.start:
                self.db.StartScanning()
        except BaseException:
            self.db.RemoveAllNodes()
            raise
        return self

    def __exit__(self, *exc: object) -> None:
        try:
            self.db.StopScanning()
        finally:
            self.db.RemoveAllNodes()

    def node(self, name: str) -> _maroset.node:
        """The node of that name; KeyError when the project has none."""
        found = self.db.getNode(name)
        if found is None:
            raise KeyError(name)
        return found

    __getitem__ = node

    def add_tag(self, node_name: str, handle: int, address: str) -> None:
        """`AddTag` on the named node."""
        self.node(node_name).AddTag(handle, address)

    async def changes(self) -> AsyncIterator[Change]:
        """Every tag of every value report a driver makes from now on, as
        `Change(node, handle, value)`; attaches the library to the running asyncio loop if
        it is not yet."""
        if self.host is None:
            raise RuntimeError("changes() needs the project entered (with Project(...) as p)")
        await attach()
        queue: asyncio.Queue = asyncio.Queue()

        def report(name: str, handles: list, count: int, values: list) -> None:
            for handle, value in zip(handles, values):
                queue.put_nowait((name, handle, value))

        connection = reports.Values.connect(report)
        try:
            while True:
                name, handle, value = await queue.get()
                yield Change(self.db.getNode(name), handle, value)
        finally:
            connection.disconnect()

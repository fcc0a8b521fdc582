"""A project as a context: loaded and started on entry, stopped and removed on exit."""

from __future__ import annotations

import asyncio
import os
from typing import AsyncIterator, Dict, NamedTuple, Optional, Union

from ._asyncio import attach
from ._maroset import ClsNodeDBInterface, node


class Change(NamedTuple):
    """One tag's new value: the node that reported it (None where it is not known), the
    tag's handle and the value."""

    node: Optional[node]
    handle: int
    value: object


class Project:
    """`with maroset.Project("plant.db") as p:` loads the project's nodes (AddAllNodes) and
    starts scanning; leaving the block stops scanning and removes the nodes.

    Value reports carry handles only. `changes()` names the node of a handle added through
    `add_tag` (when no other node has a tag with that handle); for other handles the node
    is None."""

    def __init__(self, path: Union[str, os.PathLike], *, start: bool = True) -> None:
        self.path = path
        self.start = start
        self.host: Optional[ClsNodeDBInterface] = None
        self._owners: Dict[int, Optional[node]] = {}

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
            self._owners.clear()

    def node(self, name: str) -> node:
        """The node of that name; KeyError when the project has none."""
        found = self.db.getNode(name)
        if found is None:
            raise KeyError(name)
        return found

    __getitem__ = node

    def add_tag(self, node_name: str, handle: int, address: str) -> None:
        """`AddTag` on the named node, remembering which node the handle belongs to."""
        owner = self.node(node_name)
        owner.AddTag(handle, address)
        known = self._owners.get(handle, owner)
        self._owners[handle] = owner if known is owner else None

    async def changes(self) -> AsyncIterator[Change]:
        """Every tag of every value report from now on, as `Change(node, handle, value)`;
        attaches the library to the running asyncio loop if it is not yet."""
        if self.host is None:
            raise RuntimeError("changes() needs the project entered (with Project(...) as p)")
        await attach()
        queue: asyncio.Queue[Change] = asyncio.Queue()

        def report(handles: list, count: int, values: list) -> None:
            for handle, value in zip(handles, values):
                queue.put_nowait(Change(self._owners.get(handle), handle, value))

        connection = self.host.ValueChange.connect(report)
        try:
            while True:
                yield await queue.get()
        finally:
            connection.disconnect()

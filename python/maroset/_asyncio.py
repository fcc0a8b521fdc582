"""The library's loop driven by an asyncio loop, on the asyncio loop's thread."""

from __future__ import annotations

import asyncio
from typing import Optional

from . import _maroset

_current: Optional["Attachment"] = None


class Attachment:
    """Keeps the library's loop running inside an asyncio loop: asyncio watches the
    library's readiness descriptor and wakes it when its next timer is due; each wake-up
    runs what is ready (`maroset.pump()`). Callbacks then run on the asyncio loop's thread,
    between its other callbacks."""

    def __init__(self, loop: asyncio.AbstractEventLoop) -> None:
        self.loop = loop
        self._fd = _maroset._readiness_fd()
        self._timer: Optional[asyncio.Handle] = None
        self._attached = True
        loop.add_reader(self._fd, self._turn)
        self._schedule()

    @property
    def attached(self) -> bool:
        return self._attached and not self.loop.is_closed()

    def detach(self) -> None:
        """Stops driving the library's loop from asyncio."""
        global _current
        if not self._attached:
            return
        self._attached = False
        if self._timer is not None:
            self._timer.cancel()
            self._timer = None
        if not self.loop.is_closed():
            self.loop.remove_reader(self._fd)
        if _current is self:
            _current = None

    def _turn(self) -> None:
        self._timer = None
        try:
            _maroset.pump()
        finally:
            if self._attached:
                self._schedule()

    def _schedule(self) -> None:
        if self._timer is not None:
            self._timer.cancel()
            self._timer = None
        wait = _maroset._prepare_wait()
        if wait is None:
            return
        self._timer = self.loop.call_later(wait, self._turn)


async def attach(loop: Optional[asyncio.AbstractEventLoop] = None) -> Attachment:
    """Drives the library from `loop` (the running loop when None) until `detach()`; the
    library has one loop, so attaching to another asyncio loop detaches the former one.
    Attaching again to the same loop returns the same attachment."""
    global _current
    loop = loop or asyncio.get_running_loop()
    if _current is not None:
        if _current.loop is loop and _current.attached:
            return _current
        _current.detach()
    _current = Attachment(loop)
    return _current

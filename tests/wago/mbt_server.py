"""A Modbus/TCP server on pymodbus, for testing our MBT functions against an implementation
that is not ours. Prints "PORT <n>" once it listens on 127.0.0.1 (a free port), and serves
until standard input closes.

Process image (addresses from 0):
  input registers   0-99   0x1234, 0xFFFF, 7, then 100 + n
  holding registers 0-99   0xABCD, 2, 3, then 200 + n; reading 50 takes 300 ms
  discrete inputs   0-99   on where n % 3 == 0
  coils             0-99   on where n % 2 == 1
"""
import asyncio
import os
import sys
import threading
import time

try:
    from pymodbus.datastore import (ModbusSequentialDataBlock, ModbusServerContext,
                                    ModbusSlaveContext)
    from pymodbus.server.async_io import ModbusTcpServer
except ImportError as error:
    print(f"pymodbus is missing ({error}): install python3-pymodbus and "
          "python3-serial-asyncio (./run does)", file=sys.stderr, flush=True)
    sys.exit(3)

SLOW_REGISTER = 50


class SlowBlock(ModbusSequentialDataBlock):
    def getValues(self, address, count=1):
        if address <= SLOW_REGISTER < address + count:
            time.sleep(0.3)
        return super().getValues(address, count)


def main():
    inputs = [0x1234, 0xFFFF, 7] + [100 + n for n in range(3, 100)]
    holding = [0xABCD, 2, 3] + [200 + n for n in range(3, 100)]
    store = ModbusSlaveContext(
        ir=ModbusSequentialDataBlock(0, inputs),
        hr=SlowBlock(0, holding),
        di=ModbusSequentialDataBlock(0, [n % 3 == 0 for n in range(100)]),
        co=ModbusSequentialDataBlock(0, [n % 2 == 1 for n in range(100)]),
        zero_mode=True)
    context = ModbusServerContext(slaves=store, single=True)

    # Leave when the test goes away, whatever becomes of it.
    def watch_stdin():
        sys.stdin.read()
        os._exit(0)
    threading.Thread(target=watch_stdin, daemon=True).start()

    async def serve():
        server = ModbusTcpServer(context, address=("127.0.0.1", 0), allow_reuse_address=True)
        task = asyncio.create_task(server.serve_forever())
        await server.serving
        print(f"PORT {server.server.sockets[0].getsockname()[1]}", flush=True)
        await task

    asyncio.run(serve())


main()

import asyncio
from typing import AsyncIterator, Awaitable, Coroutine


class Connection:
    async def __aenter__(self): return self
    async def __aexit__(self, *a): pass
    def __aiter__(self): return self
    async def __anext__(self) -> bytes: return b"x"
    def __await__(self):
        yield
        return self
    async def read(self, n: int = -1) -> bytes: return await self._read(n)
    async def _read(self, n): return b"" * n
    @property
    async def size(self): return 3


async def lines(connection: Connection) -> AsyncIterator[str]:
    async for chunk in connection:
        yield chunk.decode()
    async with connection as c, Connection() as d:
        yield str(c)
    return


async def main(*, limit=3):
    """Runs."""
    connection = await Connection()
    data = await connection.read()
    size = await connection.size
    texts = [line async for line in lines(connection) if await check(line)]
    pairs = {k: await v for k, v in {}.items()}
    one = await anext(lines(connection))
    async def inner(x): return x
    results = await asyncio.gather(inner(1), inner("a"))
    async with connection:
        async for line in lines(connection): last = line
        else: last = None
    task = inner(2)
    return await task, data, size, texts, pairs, one, results, last, limit


async def check(line: str): return bool(line)
def waits(x: Awaitable[int], y: Coroutine[None, None, str]): return x, y
async def awaited():
    n = await waits(1, 2)[0]
    f = lambda: (await_ for await_ in [])
    return n, f
def not_async():
    [x async for x in y]
    await x
    async with y: pass
    async for z in y: pass
async = 1
await = 2
asyncio.run(main(limit=1))

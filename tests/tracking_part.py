"""The part that counts in the kernel, as its users call it."""
import ctypes
import os

U32, U64 = ctypes.c_uint32, ctypes.c_uint64
PACKETS, RUNS, VECTORS, MOVES, TASKS = range(5)
FINE, GONE, UNSUPPORTED, REFUSED, INTERRUPTED, BROKEN = range(6)
RECEIVES, SENDS = range(2)
SIZES, INTERVALS = range(2)
RUN, READY, WAIT = range(3)
SIZE_LIMITS = (64, 128, 256, 512, 768, 1024, 1280, 1514, 4096, 9014, 32768)
MICROSECONDS = tuple(digit * 10 ** power for power in range(7) for digit in (1, 2, 5))


def record(name, *fields):
    return type(name, (ctypes.Structure,), {"_fields_": fields})


Port = record("Port", ("netns", U32), ("index", U32), ("direction", U32))
PortSamples = record("PortSamples", ("count", U64), ("sum", U64), ("min", U64), ("max", U64), ("buckets", U64 * 20))
Period = record("Period", ("count", U64), ("sum", U64), ("buckets", U64 * 20))
Thread = record("Thread", ("born", U64), ("periods", Period * 3))
Vector = record("Vector", ("count", U64), ("time", U64))
Task = record("Task", ("tid", U32), ("pid", U32), ("born", U64), ("run", U64), ("ready", U64), ("runs", U64),
              ("migrations", U64), ("remote_wakeups", U64), ("known", U32), ("reserved", U32))


def call(result, *arguments):
    return ctypes.CFUNCTYPE(result, *arguments)


P, PORT = ctypes.c_void_p, ctypes.POINTER(Port)
Table = record(
    "Table", ("version", U32), ("open", call(P)), ("close", call(None, P)), ("reason", call(ctypes.c_char_p, P)),
    ("ask", call(U32, P, U32)), ("portStart", call(U32, P, PORT, U32)),
    ("portRead", call(U32, P, PORT, U32, ctypes.POINTER(PortSamples))), ("portStop", call(None, P, PORT, U32)),
    ("threadWatch", call(U32, P, U32)), ("threadRead", call(U32, P, U32, ctypes.POINTER(Thread))),
    ("threadUnwatch", call(None, P, U32)), ("vectorWatch", call(U32, P, U32)),
    ("vectorRead", call(U32, P, U32, U32, ctypes.POINTER(Vector))), ("vectorUnwatch", call(None, P, U32)),
    ("movesCaches", call(U32, P, ctypes.POINTER(U32), U32)), ("movesWatch", call(U32, P, U32)),
    ("movesRead", call(U32, P, U32, ctypes.POINTER(U64))), ("movesUnwatch", call(None, P, U32)),
    ("tasksRead", call(U32, P, U32, ctypes.POINTER(ctypes.POINTER(Task)), ctypes.POINTER(U32))),
    ("tasksEnd", call(None, P)))


def netns():
    return os.stat("/proc/self/ns/net").st_ino


class Part:
    """One reader. What fails raises RuntimeError with the reason."""

    def __init__(self, build):
        self.table = Table.in_dll(ctypes.CDLL(f"{build}/libcorekit-tracking.so"), "corekitTracking")
        assert self.table.version == 1
        self.tracking = self.table.open()

    def _made(self, outcome):
        if outcome != FINE:
            raise RuntimeError(f"{outcome}: {self.table.reason(self.tracking).decode()}")

    def close(self):
        self.table.close(self.tracking)

    def ask(self, group):
        outcome = self.table.ask(self.tracking, group)
        return outcome, self.table.reason(self.tracking).decode()

    def do(self, name, *arguments):
        self._made(getattr(self.table, name)(self.tracking, *arguments))

    def end(self, name, *arguments):
        getattr(self.table, name)(self.tracking, *arguments)

    def read(self, name, kind, *arguments):
        row = kind()
        self.do(name, *arguments, ctypes.byref(row))
        return row

    def start(self, port, family):
        self.do("portStart", ctypes.byref(port), family)

    def stop(self, port, family):
        self.end("portStop", ctypes.byref(port), family)

    def samples(self, port, family):
        return self.read("portRead", PortSamples, ctypes.byref(port), family)

    def thread(self, tid):
        return self.read("threadRead", Thread, tid).periods

    def vector(self, irq, cpu):
        rows = (Vector * (cpu + 1))()
        self.do("vectorRead", irq, cpu + 1, rows)
        return rows[cpu]

    def tasks(self, pid):
        rows, count = ctypes.POINTER(Task)(), U32()
        self.do("tasksRead", pid, ctypes.byref(rows), ctypes.byref(count))
        return [Task.from_buffer_copy(rows[i]) for i in range(count.value)]


def buckets(counts, limits):
    """The buckets that have samples, by their limits; None is the one above all."""
    limits = (*limits, None)
    return {limits[i]: count for i, count in enumerate(counts) if count}

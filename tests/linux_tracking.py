#!/usr/bin/env python3
"""Holds what is counted in the kernel against known traffic, threads and interrupts, and against other tools."""
# tests/linux_tracking.py BUILD TEST: a directory with libcorekit-tracking.so, and a function from `packets` on. Each test
# has a network namespace of its own. Needs root of the machine; the exit status is 77, with the reason, if a test can't
# be made here, and 1 if a figure is wrong.
import ctypes, fcntl, os, pathlib, re, select, signal, socket, struct, subprocess, sys, threading, time

from tracking_part import *

BUILD, TEST = os.path.abspath(sys.argv[1]), sys.argv[2]
LIBC = ctypes.CDLL(None, use_errno=True)
NEW_NET = 0x40000000
CPUS = sorted(os.sched_getaffinity(0))
FRAMES = {64: 64, 200: 256, 1400: 1514}  # sizes, and the limits of their buckets


def skip(reason):
    print(f"skipped: {reason}")
    sys.exit(77)


def check(what, ours, theirs):
    assert ours == theirs, f"{what}: {ours!r} is not {theirs!r}"


def until(true, what):
    end = time.monotonic() + 30
    while not true():
        assert time.monotonic() < end, what
        time.sleep(0.005)


def tool(command):
    return subprocess.run(command, shell=True, check=True, stdout=subprocess.PIPE, text=True).stdout


def read(path):
    return pathlib.Path(path).read_text(encoding="utf-8", errors="surrogateescape")


def counters(name):
    """Packets and bytes that an interface received and sent."""
    columns = read("/proc/net/dev").split(f"{name}:")[1].split()
    return {RECEIVES: (int(columns[1]), int(columns[0])), SENDS: (int(columns[9]), int(columns[8]))}


def frame(size):
    return (b"\xff" * 6 + b"\2\0\0\0\0\1\x88\xb5").ljust(size, b"\0")


def sender(name):
    """A function that sends a frame of a size out of an interface."""
    packets = socket.socket(socket.AF_PACKET, socket.SOCK_RAW, 0)
    packets.bind((name, 0))
    return lambda size: packets.send(frame(size))


def port(name, direction):
    return Port(netns(), socket.if_nametoindex(name), direction)


def pair(names="index 500 v0", peer="index 501 p0"):
    """Two interfaces that send nothing of their own."""
    tool("for file in /proc/sys/net/ipv6/conf/*/disable_ipv6; do test ! -e $file || echo 1 >$file; done")
    tool(f"ip link add name {names.split()[2]} {names[:9]} up type veth peer name {peer.split()[2]} {peer[:9]}; "
         f"ip link set {peer.split()[2]} up")


def check_frames(part, watched, times):
    sizes = part.samples(watched, SIZES)
    check("buckets", buckets(sizes.buckets, SIZE_LIMITS), {limit: times for limit in FRAMES.values()})
    check("totals", (sizes.count, sizes.sum, sizes.min, sizes.max), (3 * times, times * sum(FRAMES), 64, 1400))
    check("empty span", (part.samples(watched, SIZES).min, part.samples(watched, SIZES).max), (0, 0))
    return sizes


def packets(part, times=20000):
    """Each frame once, in its bucket, in both directions of both ends; what came before the start not at all."""
    pair()
    send = sender("p0")
    send(1000)
    here, there, quiet = port("p0", SENDS), port("v0", RECEIVES), port("v0", SENDS)
    for watched in (here, there, quiet):
        part.start(watched, SIZES)
    before = counters("p0")[SENDS], counters("v0")[RECEIVES]
    for size in FRAMES:
        for _ in range(times):
            send(size)
    for watched, name, old in ((here, "p0", before[0]), (there, "v0", before[1])):
        check_frames(part, watched, times)
        counted = part.samples(watched, SIZES)
        new = counters(name)[watched.direction]
        check("counters", (counted.count, counted.sum), (new[0] - old[0], new[1] - old[1]))
    check("other direction", part.samples(quiet, SIZES).count, 0)
    send(300)
    last = part.samples(there, SIZES)
    check("span", (last.count, last.min, last.max), (3 * times + 1, 300, 300))
    part.start(there, SIZES)
    check("a second start", part.samples(there, SIZES).count, 3 * times + 1)
    part.start(there, INTERVALS)
    part.stop(there, SIZES)
    send(64)
    part.start(there, SIZES)
    send(64)
    check("a new start", (part.samples(there, SIZES).count, part.samples(there, INTERVALS).count), (1, 1))


def together(part, times=20000):
    """Two CPUs at once, read meanwhile: no frame and no interval is lost, and none is counted backwards."""
    pair()
    watched = port("p0", SENDS)
    for family in (SIZES, INTERVALS):
        part.start(watched, family)
    begin, peers, last = time.monotonic_ns(), [], 0
    for i, size in enumerate((64, 1400)):
        peers.append(os.fork())
        if peers[i] == 0:
            os.sched_setaffinity(0, {CPUS[i % len(CPUS)]})
            send = sender("p0")
            for _ in range(times):
                send(size)
            os._exit(0)
    while peers:
        sizes = part.samples(watched, SIZES)
        assert sizes.count >= last and {sizes.min, sizes.max} <= {0, 64, 1400}, (last, sizes.count, sizes.min, sizes.max)
        last = sizes.count
        peers = [peer for peer in peers if os.waitpid(peer, os.WNOHANG)[0] == 0]
    sizes, gaps = part.samples(watched, SIZES), part.samples(watched, INTERVALS)
    check("frames", buckets(sizes.buckets, SIZE_LIMITS), {64: times, 1514: times})
    check("intervals", gaps.count, 2 * times - 1)
    assert gaps.sum <= time.monotonic_ns() - begin, gaps.sum


def elsewhere(part):
    """The same index in another namespace counts nothing there, and an index that is used again begins at 0."""
    pair()
    watched = port("v0", RECEIVES)
    part.start(watched, SIZES)
    here = os.open("/proc/self/ns/net", os.O_RDONLY)
    LIBC.unshare(NEW_NET)
    pair()
    for _ in range(1000):
        sender("p0")(64)
    check("there", counters("v0")[RECEIVES][0], 1000)
    check("here", part.samples(watched, SIZES).count, 0)
    LIBC.setns(here, NEW_NET)
    twin = Port(watched.netns, watched.index + 16384, RECEIVES)  # of the same bit in the filter
    part.start(twin, SIZES)
    part.stop(twin, SIZES)
    sender("p0")(64)
    check("one", part.samples(watched, SIZES).count, 1)
    part.stop(watched, SIZES)
    tool("ip link del v0")
    pair()
    part.start(watched, SIZES)
    check("used again", part.samples(watched, SIZES).count, 0)


def tap(part, times=20000):
    """Frames of a tap's client and to it, behind a bridge; what its queue has no room for is not sent."""
    if not os.access("/dev/net/tun", os.R_OK | os.W_OK):
        skip("/dev/net/tun is not there")
    pair()
    tool("ip link add br0 type bridge mcast_snooping 0; ip tuntap add t0 mode tap; ip link set v0 master br0; "
         "ip link set t0 master br0 up; ip link set br0 up")
    client = os.open("/dev/net/tun", os.O_RDWR)
    fcntl.ioctl(client, 0x400454CA, struct.pack("16sH22x", b"t0", 0x1002))  # TUNSETIFF
    until(lambda: "state forwarding" in tool("bridge -d link show dev t0 | head -1; bridge link show dev t0"), "tap")
    until(lambda: "state forwarding" in tool("bridge link show dev v0"), "veth")
    every = [port(*end) for end in (("t0", RECEIVES), ("v0", SENDS), ("p0", RECEIVES), ("br0", RECEIVES))]
    for watched in every:
        part.start(watched, SIZES)
    for size in FRAMES:
        for _ in range(times):
            os.write(client, frame(size))
    for watched in every:
        until(lambda one=watched: counters(socket.if_indextoname(one.index))[one.direction][0] >= 3 * times, "frames")
        check_frames(part, watched, times)
    to, send = port("t0", SENDS), sender("p0")
    part.start(to, SIZES)
    before, seen = counters("t0")[SENDS][0], 0

    def drain():
        while select.select([client], [], [], 0)[0]:
            os.read(client, 2000)

    for size in FRAMES:
        for _ in range(times):
            send(size)
            seen += 1
            if seen % 100 == 0:
                drain()
    drain()
    check_frames(part, to, times)
    check("sent", 3 * times, counters("t0")[SENDS][0] - before)
    for _ in range(3000):
        send(64)
    drain()
    left = counters("t0")[SENDS][0] - before
    check("full queue", part.samples(to, SIZES).count, left)
    assert 3 * times < left < 3 * times + 3000, left


def offload(part):
    """A packet that stands for many is one sample, as it is one packet of the interface."""
    tool("ip link set lo up")
    every = [port("lo", RECEIVES), port("lo", SENDS)]
    for watched in every:
        part.start(watched, SIZES)
    before = counters("lo")
    listener = socket.create_server(("127.0.0.1", 0))
    with socket.create_connection(listener.getsockname()) as connection:
        peer = listener.accept()[0]
        threading.Thread(target=lambda: connection.sendall(bytes(4 << 20)), daemon=True).start()
        left = 4 << 20
        while left:
            left -= len(peer.recv(1 << 20))
    for watched in every:
        counted, new, old = part.samples(watched, SIZES), counters("lo")[watched.direction], before[watched.direction]
        check("packets", counted.count, new[0] - old[0])
        check("bytes", counted.sum, new[1] - old[1] + 14 * counted.count)  # this interface leaves out its header
        assert counted.max > 20000 and counted.count < 1000, (counted.count, counted.max)


def intervals(part, times=300):
    """A paced sender: one interval fewer than packets, in the buckets of its own clock, and together as long."""
    pair()
    watched, send, sent, done = port("v0", RECEIVES), sender("p0"), [], []
    part.start(watched, INTERVALS)
    for _ in range(times):
        time.sleep(0.003)
        sent.append(time.monotonic_ns())
        send(64)
        done.append(time.monotonic_ns())
    counted = part.samples(watched, INTERVALS)
    check("intervals", counted.count, times - 1)
    assert sent[-1] - done[0] <= counted.sum <= done[-1] - sent[0], (sent[-1] - done[0], counted.sum)
    own = [0] * 20
    for before, after in zip(sent, sent[1:]):
        own[sum((after - before) / 1000 > limit for limit in MICROSECONDS[:18])] += 1
    apart = sum(abs(mine - theirs) for mine, theirs in zip(own, counted.buckets))
    assert apart < 0.1 * times, (own, list(counted.buckets))
    assert 2500000 < counted.min <= counted.sum / counted.count <= counted.max, (counted.min, counted.max)


def scheduled(tid):
    """Run and ready time, runs, and switches by its own will."""
    own = re.search(r"^voluntary_ctxt_switches:\s*(\d+)", read(f"/proc/{tid}/status"), re.M)[1]
    return tuple(map(int, [*read(f"/proc/{tid}/schedstat").split(), own]))


def threads(part, times=20000):
    """Of two processes that wake each other: each round trip a run and a wait, as long as their own clocks say."""
    mine, theirs = socket.socketpair()
    peer = os.fork()
    if peer == 0:
        mine.close()
        while theirs.recv(1):
            theirs.send(b"x")
        os._exit(0)
    os.sched_setaffinity(0, {CPUS[0]})
    os.sched_setaffinity(peer, {CPUS[0]})
    time.sleep(0.1)
    part.do("threadWatch", peer)
    begin = time.monotonic_ns()
    before = scheduled(peer)
    for _ in range(times):
        mine.send(b"x")
        mine.recv(1)
    time.sleep(0.1)
    after, told, end = scheduled(peer), part.thread(peer), time.monotonic_ns()
    run, ready, wait = told[RUN], told[READY], told[WAIT]
    runs, waits = after[2] - before[2], after[3] - before[3]
    for ours, theirs in ((run.count, runs), (ready.count, runs), (wait.count, waits)):
        assert theirs > times / 2 and 0.999 * theirs - 1 <= ours <= theirs + 1, (ours, theirs)
    assert abs(run.sum - (after[0] - before[0])) < 0.1 * run.sum, (run.sum, after[0] - before[0])
    assert abs(ready.sum - (after[1] - before[1])) < 0.1 * ready.sum + 1e7, (ready.sum, after[1] - before[1])
    assert run.sum + ready.sum + wait.sum <= end - begin, (run.sum, ready.sum, wait.sum, end - begin)
    assert run.sum + ready.sum + wait.sum >= 0.7 * (end - begin), (run.sum, ready.sum, wait.sum, end - begin)
    part.do("threadWatch", os.getpid())
    check("running at the start", part.thread(os.getpid())[RUN].count, 0)
    part.end("threadUnwatch", peer)
    part.do("threadWatch", peer)
    check("watched anew", [period.count for period in part.thread(peer)], [0, 0, 0])
    full = [tid for tid in range(1, 4000) if part.table.threadWatch(part.tracking, tid) == FINE]
    check("full", part.table.reason(part.tracking), b"2048 threads are the most")
    part.end("threadUnwatch", full[0])
    part.do("threadWatch", 4001)
    mine.close()


def vectors(part):
    """Interrupts of the disk, or of whatever device has some, as /proc/interrupts counts them."""
    def table():
        rows = [line.split() for line in read("/proc/interrupts").splitlines()]
        cpus = [int(name[3:]) for name in rows[0]]
        return {int(row[0][:-1]): dict(zip(cpus, map(int, row[1:]))) for row in rows[1:] if row[0][:-1].isdigit()}

    def work():
        tool("sync; for disk in $(ls /sys/block); do timeout 5 dd if=/dev/$disk of=/dev/null bs=4k count=2000 "
             "iflag=direct 2>/dev/null || true; done")

    numbers = list(table())
    first = table()
    for irq in numbers:
        part.do("vectorWatch", irq)
    second = table()
    work()
    third = table()
    ours = {(irq, cpu): part.vector(irq, cpu) for irq in numbers for cpu in third[irq]}
    fourth = table()
    for (irq, cpu), row in ours.items():
        assert third[irq][cpu] - second[irq][cpu] <= row.count <= fourth[irq][cpu] - first[irq][cpu], (irq, cpu)
        assert (row.time > 0) == (row.count > 0) and row.time < 1e6 * row.count + 1, (irq, cpu, row.count, row.time)
    if not any(row.count for row in ours.values()):
        skip("no device of this machine interrupts")
    check("a CPU that is not there", part.vector(numbers[0], 8191).count, 0)


def moves(part):
    """Each CPU taken for a cache: as many moves as migrations. One cache: none."""
    if len(CPUS) < 2:
        skip("there is one CPU")

    def counted(caches):
        part.do("movesCaches", (U32 * len(caches))(*caches), len(caches))
        os.sched_setaffinity(0, {CPUS[0]})
        part.do("movesWatch", os.getpid())
        before = part.tasks(os.getpid())[0].migrations
        for i in range(40):
            os.sched_setaffinity(0, {CPUS[(i + 1) % 2]})
        after = part.tasks(os.getpid())[0].migrations
        told = part.read("movesRead", U64, os.getpid()).value
        part.end("movesUnwatch", os.getpid())
        return told, after - before

    check("own caches", counted(range(CPUS[-1] + 1)), (40, 40))
    check("one cache", counted([7] * (CPUS[-1] + 1)), (0, 40))
    check("none known", counted([]), (0, 40))


def tasks(part):
    """Rows of a process that stands still are what /proc says, to the last digit."""
    peer = subprocess.Popen([sys.executable, "-c", "import threading, time\n"
                             "for i in range(7): threading.Thread(target=time.sleep, args=(60,)).start()\n"
                             "print(flush=True)"], stdout=subprocess.PIPE)
    peer.stdout.read(1)
    peer.send_signal(signal.SIGSTOP)
    directory = pathlib.Path(f"/proc/{peer.pid}/task")
    until(lambda: all(") T " in read(one / "stat") for one in directory.iterdir()), "it goes on")
    ours = {row.tid: (row.run, row.ready, row.runs, row.migrations) for row in part.tasks(peer.pid)}
    theirs = {int(one.name): (*map(int, read(one / "schedstat").split()),
                              int(re.search(r"^se.nr_migrations\s*:\s*(\d+)", read(one / "sched"), re.M)[1]))
              for one in directory.iterdir()}
    check("rows", ours, theirs)
    ticks = [int(read(directory / str(row.tid) / "stat").rpartition(")")[2].split()[19])
             for row in part.tasks(peer.pid)]
    check("births", [row.born // 10000000 for row in part.tasks(peer.pid)], ticks)
    assert {row.tid for row in part.tasks(0)} >= set(ours)
    peer.kill()
    peer.wait()
    check("none", part.tasks(peer.pid), [])


def fill(part):
    """Something of each group."""
    part.start(port("lo", RECEIVES), SIZES)
    for name in ("threadWatch", "movesWatch", "vectorWatch"):
        part.do(name, os.getpid() if name != "vectorWatch" else 1)
    part.tasks(os.getpid())


def held(pid):
    """Programs, links and maps that a process holds."""
    found = set()
    for file in pathlib.Path(f"/proc/{pid}/fdinfo").iterdir():
        if file.exists():  # not the directory itself
            found |= set(re.findall(r"^(prog_id|link_id|map_id):\s*(\d+)", read(file), re.M))
    return found


def there(kind, number):
    """Whether the kernel still has it, by a call for its descriptor."""
    call = {"prog_id": 13, "map_id": 14, "link_id": 30}[kind]
    where = (U32 * 4)(int(number))
    number = {"x86_64": 321}.get(os.uname().machine, 280)
    descriptor = LIBC.syscall(number, call, ctypes.byref(where), ctypes.sizeof(where))
    if descriptor >= 0:
        os.close(descriptor)
    return descriptor >= 0


def death(part):
    """Nothing is left of a process that was killed, nor of a reader that stopped all."""
    ready, done = os.pipe()
    peer = os.fork()
    if peer == 0:
        fill(part)
        os.write(done, b"x")
        signal.pause()
    os.read(ready, 1)
    left = held(peer)
    assert {kind for kind, _ in left} == {"prog_id", "link_id", "map_id"} and len(left) > 20, left
    assert all(there(*one) for one in left)
    os.kill(peer, signal.SIGKILL)
    os.wait()
    until(lambda: not any(there(*one) for one in left), "something is left")
    fill(part)
    assert held("self")
    part.stop(port("lo", RECEIVES), SIZES)
    for name in ("threadUnwatch", "movesUnwatch"):
        part.end(name, os.getpid())
    part.end("vectorUnwatch", 1)
    part.end("tasksEnd")
    check("held", held("self"), set())
    for group in range(5):
        check("asked", part.ask(group)[0], FINE)
    check("held", held("self"), set())
    fill(part)
    part.close()
    check("held", held("self"), set())


def refused(_):
    """What this user, or this namespace, may not do is told in words, and leaves nothing behind."""
    ask = (f"import sys; sys.path.insert(0, {os.path.dirname(os.path.abspath(__file__))!r}); from tracking_part import *\n"
           f"part = Part({BUILD!r}); print([part.ask(group) for group in range(5)])")
    namespaces = [prefix for prefix in ("unshare -Ur", "unshare -pf --mount-proc")
                  if subprocess.run(f"{prefix} true", shell=True, check=False, stderr=subprocess.DEVNULL).returncode == 0]
    for prefix in ("setpriv --bounding-set -bpf,-perfmon,-sys_admin", "setpriv --bounding-set -perfmon,-sys_admin",
                   *[prefix for prefix in namespaces if prefix == "unshare -Ur"]):
        told = eval(tool(f'{prefix} {sys.executable} -c "{ask}"'))
        check(prefix, told, [(REFUSED, "needs CAP_BPF and CAP_PERFMON outside of user namespaces")] * 5)
    if len(namespaces) < 2:
        skip("no namespaces in which to be refused")
    told = eval(tool(f'{namespaces[1]} {sys.executable} -c "{ask}"'))
    check("PID namespace", [outcome for outcome, _ in told], [FINE, UNSUPPORTED, FINE, UNSUPPORTED, UNSUPPORTED])
    assert "PID namespace" in told[RUNS][1], told


def types(_):
    """The fields that the programs read are in the running kernel, and as wide as they are taken for."""
    width = {"__u16": 2, "u16": 2, "int": 4, "unsigned int": 4, "__u32": 4, "u32": 4, "pid_t": 4} | dict.fromkeys(
        ("__u64", "u64", "unsigned long", "long unsigned int", "unsigned long long", "long long unsigned int"), 8)
    kernel = tool("PATH=$PATH:/usr/sbin bpftool btf dump file /sys/kernel/btf/vmlinux format c")
    header = pathlib.Path(__file__).resolve().parent.parent / "corekit/linuxhost/tracking/kernel_types.h"
    fields = 0
    for name, body in re.findall(r"^struct (\w+) \{\n(.*?)^\};", read(header), re.M | re.S):
        theirs = re.search(rf"^struct {name} \{{(\}};|.*?^\}})", kernel, re.M | re.S)[1]
        for kind, field in re.findall(r"^    (.*[ *])(\w+);", body, re.M):
            found = re.search(rf"^\s+(.*[ *]){field};", theirs, re.M)
            if found is None and name == "sched_statistics":
                continue  # which the programs can do without
            assert found, f"{name}.{field}"
            check(f"{name}.{field}", *(width.get(one.strip(), one.strip()) for one in (found[1], kind)))
            fields += 1
    assert fields > 20, fields


def main():
    if os.geteuid() != 0 or LIBC.unshare(NEW_NET) != 0:
        skip("only root may count in the kernel")
    part = Part(BUILD)
    for group in range(5):
        outcome, reason = part.ask(group)
        if outcome == REFUSED or "type data" in reason or "PID namespace" in reason:
            skip(reason)
        check(reason, outcome, FINE)
    globals()[TEST](part)


main()

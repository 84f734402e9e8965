#!/usr/bin/env python3
"""Holds the figures of a real Linux host against traffic that is known to the last byte, and against other tools."""
# tests/linux_truth.py BUILD TEST: a directory with lan-meter and knf-record, and a function from `frames` on. `host` looks
# at the machine as it is; each other test has a network namespace of its own, for which it needs user namespaces or
# root. The program stands still between two samples while a test acts, so that exact counts don't depend on the load
# of the machine. The exit status is 77, with the reason, if a test can't be made here, and 1 if a figure is wrong.
import atexit, collections, concurrent.futures, ctypes, fcntl, json, os, pathlib, re, select, signal
import shutil, socket, struct, subprocess, sys, tempfile, threading, time

SCRIPT = os.path.abspath(__file__)
LIBC = ctypes.CDLL(None, use_errno=True)
CPUS = sorted(os.sched_getaffinity(0))
PPOLL = "271", "73"  # its number on x86-64, and on the newer architectures


def skip(reason):
    """The test can't be made here."""
    print(f"skipped: {reason}")
    sys.exit(77)


def check(what, ours, theirs):
    """Ours against the figures of a peer; of a dictionary, those that the peer names; None is not there."""
    if isinstance(theirs, dict):
        for key, value in theirs.items():
            check(f"{what}: {key}", ours.get(key), value)
    else:
        assert ours == theirs, f"{what}: {ours!r} is not {theirs!r}"


def until(true):
    """Waits."""
    end = time.monotonic() + 60
    while not true():
        assert time.monotonic() < end, "it took too long"
        time.sleep(0.005)


def read(path):
    """The text of a file."""
    return pathlib.Path(path).read_text(errors="surrogateescape")


def tool(*command, **more):
    """What a command prints."""
    more |= {"stdout": subprocess.PIPE, "encoding": "utf-8", "errors": "surrogateescape"}
    return subprocess.run(command, check=True, **more).stdout


def ip(orders):
    """Orders to `ip`."""
    if "tuntap" in orders and not os.access("/dev/net/tun", os.R_OK | os.W_OK):
        skip("/dev/net/tun is not there, or not for this user")
    tool("ip", "-batch", "-", input=orders.replace("; ", "\n") + "\n")


def start(*command, **more):
    """A process that ends with the test."""
    process = subprocess.Popen(command, bufsize=0, stdin=subprocess.PIPE, **more)
    atexit.register(process.kill)
    return process


def freeze(process):
    """Stops a process, and waits until it stands still."""
    process.send_signal(signal.SIGSTOP)
    until(lambda: ") T " in read(f"/proc/{process.pid}/stat"))


def links():
    """All links but lo, as `ip` tells them."""
    told = json.loads(tool("ip", "-s", "-j", "link"), strict=False)
    return {link["ifname"]: link for link in told if link["ifname"] != "lo"}


def ready(*names):
    """Waits until these links carry frames."""
    until(lambda: all(link["operstate"] in ("UP", "UNKNOWN") for name, link in links().items() if name in names))


def quiet():
    """Keeps the kernel from sending anything of its own in this namespace."""
    tool("sh", "-c", "for file in ipv6/conf/*/disable_ipv6; do test ! -e $file || echo 1 >$file; done; "
         "echo 0 >ipv4/igmp_link_local_mcast_reports", cwd="/proc/sys/net")


def network(pairs=0, taps=0):
    """A bridge br0 with taps t0, t1 and so on, and with v0 and so on, whose other ends are p0 and so on."""
    quiet()
    ip("; ".join(["link add br0 type bridge mcast_snooping 0; link set br0 up"] +
                 [f"tuntap add t{i} mode tap; link set t{i} master br0 up" for i in range(taps)] +
                 [f"link add v{i} index {1000 + i} up master br0 type veth peer p{i}; link set p{i} up"
                  for i in range(pairs)]))
    ready(*(f"{end}{i}" for end in "vp" for i in range(pairs)))


def settled():
    """Waits until no counter of a link moves."""
    until(lambda: links() == (time.sleep(0.01) or links()))


def nstat():
    """The kernel's counters of its IP stack."""
    return collections.Counter(json.loads(tool("nstat", "-asjz"))["kernel"])


class Run:
    """A run that stands still in its first wait; what happens until `go` or `end` shows in its next record."""

    def __init__(self, *arguments, program="lan-meter", wrapper="", interval=2):
        self.out, self.err = f"out-{id(self)}", f"err-{id(self)}"
        command = [*wrapper.split(), f"{BUILD}/{program}", *["-a"] * (program == "lan-meter"), "-i", str(interval)]
        self.process = start(*command, *arguments, stdout=open(self.out, "w"), stderr=open(self.err, "w"))
        if interval:
            self.go(0)

    def waits(self, records):
        """Whether it is in the wait behind so many records: in a ppoll of nothing."""
        assert self.process.poll() is None, f"ended early: {read(self.err)}"
        asleep = read(f"/proc/{self.process.pid}/syscall").split()[:3] in ([call, "0x0", "0x0"] for call in PPOLL)
        return asleep and read(self.out).count('"overhead"') == records

    def go(self, records):
        """On to the wait behind so many records."""
        self.process.send_signal(signal.SIGCONT)
        until(lambda: self.waits(records))
        freeze(self.process)
        if not self.waits(records):
            skip("the machine is too busy to stop a run in its wait")

    def end(self, status=0, messages="^$"):
        """What it printed; of what it told, lines like `messages` are allowed, and none of them twice."""
        self.process.send_signal(signal.SIGCONT)
        check("exit status", self.process.wait(timeout=60), status)
        lines = read(self.err).splitlines()
        check("messages", [line for line in lines if not re.search(messages, line)], [])
        kinds = [re.sub(r"(?<!Port )\b\d+", "", line) for line in lines]
        check("messages of one kind", len(kinds), len(set(kinds)))
        return read(self.out)


def once(*arguments, status=0, messages="^$", **more):
    """The output of a run that does not wait."""
    return Run(*arguments, interval=0, **more).end(status, messages)


def records(text):
    """Of each record the ports by name; those that can't be read any more are left out."""
    told = json.loads(text, strict=False)["stats"]
    return [{port["name"]: port for port in record["ports"] if port} for record in told]


def chosen(*choice, **more):
    """The names of the ports in a single report."""
    return set(records(once(*choice, **more))[0])


def listing():
    """Of each port its type, switch, address and client."""
    rows = [line.split(maxsplit=5) for line in once("-l").splitlines()[1:]]
    return {row[5]: (int(row[1]), row[3], row[4], int(row[0])) for row in rows}


def snapshot(name):
    """The numbers in a new snapshot: of node and keys, a reader of 64 bits at an offset."""
    once("-o", name, "-n", "1", program="knf-record")
    return dump(f"{name}.0")


def dump(name):
    """The numbers in a snapshot."""
    rows = re.findall(r"^record (\d+) (.*?) ?size=\d+ (.*)$", tool(f"{BUILD}/knf-record", "--dump", name), re.M)
    return {(int(node), keys): lambda at, record=record: struct.unpack_from("<Q", bytes.fromhex(record), at)[0]
            for node, keys, record in rows}


def told(wrapper=""):
    """The sections of ports that knf-source tells to be there, which are those of a report; histograms are not asked for."""
    there = set(re.findall(r"^ports\.(\w+): there$", tool(*wrapper.split(), f"{BUILD}/knf-source"), re.M)) - {"histos"}
    ports = records(once("-A", "-t", "vqiWc", wrapper=wrapper))[0].values()
    check("sections", {key for port in ports for key, value in port.items() if isinstance(value, (dict, list))}, there)
    return there


def way(prefix, packets, size):
    """What a record shows of these differences."""
    return {f"{prefix}pps": packets, f"{prefix}size": size // packets if packets else 0,
            f"{prefix}mbps": float(f"{size * 8 / 1e6:.1f}")}


def counted(before, after):
    """What a record shows of links, by the counters of `ip`: what a veth or tap receives was sent by its port's client."""
    shown = {name: {} for name in before}
    for name in before:
        for prefix, side in zip(("tx", "rx"), ("rx", "tx") if name[0] in "vptx" else ("tx", "rx")):
            step = {key: after[name]["stats64"][side][key] - old for key, old in before[name]["stats64"][side].items()}
            shown[name] |= way(prefix, step["packets"], step["bytes"])
            shown[name][f"{prefix}eps"] = step["dropped"] + step["errors"]
    return shown


def used(rows, spent):
    """The share of a second of each thread, in hundredths, against the ns that it ran."""
    for row, ran in zip(rows, spent, strict=True):
        assert abs(row["used"] - ran / 1e7) <= 0.011, (row, ran)


def spent(directory, name):
    """The ns of each thread or process in a directory that has this in its name."""
    return {int(path.name): int(read(path / "schedstat").split()[0])
            for path in sorted(pathlib.Path(directory).glob("[0-9]*")) if name in read(path / "comm")}


def frame(size, source=b"\2\0\0\0\0\1"):
    """A broadcast of a protocol that nobody speaks."""
    return (b"\xff" * 6 + source + b"\x88\xb5").ljust(size, b"\0")


def send(name, count, size):
    """Frames out of an interface, until the last one has arrived."""
    with socket.socket(socket.AF_PACKET, socket.SOCK_RAW, 0) as sender:
        for _ in range(count):
            sender.sendto(frame(size), (name, 0))
    settled()


def hold(tap, flags=0x1002):
    """A function that writes frames as the client of a tap, and the tap's file."""
    file = os.open(tap if tap[0] == "/" else "/dev/net/tun", os.O_RDWR)
    fcntl.ioctl(file, 0x400454CA, struct.pack("16sH22x", os.fsencode(tap[:15]), flags))  # TUNSETIFF: tap, no header
    return lambda count, *what: [os.write(file, frame(*what)) for _ in range(count)], file


def hold_far(tap):
    """Holds a tap of this name in another network namespace; in which the process goes on, if it is to."""
    ours = os.open("/proc/self/ns/net", os.O_RDONLY)
    assert LIBC.unshare(0x40000000) == 0  # CLONE_NEWNET
    ip(f"tuntap add {tap} mode tap")
    hold(tap)
    return ours


class Worker(concurrent.futures.ThreadPoolExecutor):
    """A thread of a guest. Between two orders it sleeps."""

    def __init__(self, name):
        super().__init__(1, "", LIBC.prctl, (15, os.fsencode(name), 0, 0, 0))  # PR_SET_NAME
        self.thread = self.ask(threading.current_thread)

    def ask(self, *order):
        """Has a function called, and waits for it."""
        return self.submit(*order).result()

    def move(self, times):
        """From CPU to CPU."""
        self.ask(lambda: [os.sched_setaffinity(0, {CPUS[i % 2]}) for i in range(times)])

    def clock(self):
        """The ns that it ran."""
        return time.clock_gettime_ns(time.pthread_getcpuclockid(self.thread.ident))


def play_guest(tap, names):
    """Holds a tap, has threads, and does what it is told, an expression a line."""
    workers = [Worker(name.replace("PID", str(os.getpid()))) for name in names.split(",") if name]
    flags = 0x1102 if tap[0] == "q" else 0x1002  # with several queues
    means = {"workers": workers, "write": hold(tap, flags)[0], "again": lambda: hold(tap, flags), "far": hold_far,
             "LIBC": LIBC}
    for line in sys.stdin:
        print(json.dumps(eval(line, means)), flush=True)


class Guest:
    """A process that looks like a guest with a tap, threads and a name."""

    def __init__(self, tap, threads, name):
        self.process = start(sys.executable, SCRIPT, "--guest", tap, threads, "-name", name, stdout=subprocess.PIPE)
        self.threads = self.do("[worker.thread.native_id for worker in workers]")

    def do(self, order):
        """Lets it do something."""
        self.process.stdin.write(order.encode() + b"\n")
        return json.loads(self.process.stdout.readline())


def web_guest(threads):
    """A guest named web1 behind t0 on br0."""
    network(taps=1)
    web = Guest("t0", threads, "guest=web1,debug-threads=on")
    ready("t0", "br0")
    return web


def frames():
    """Every kind of port, in both directions, live and by snapshots."""
    network(pairs=2)
    ip("link add br1 type bridge; address add 10.9.0.1/24 dev br1; link add v2 master br1 type veth peer p2; "
       "link add v3 type veth peer p3; link add m0 link v3 type macvlan mode bridge; "
       "link add m1 link v3 type macvlan mode bridge; " +
       "; ".join(f"link set {name} up multicast off" for name in "br0 br1 v0 v1 v2 v3 p0 p1 p2 p3 m0 m1".split()))
    ready(*links())
    switch = {"br0": "br0", "v0": "br0", "v1": "br0", "br1": "br1", "v2": "br1", "v3": "v3", "m0": "v3", "m1": "v3"}
    check("ip link", sorted(listing().items()), sorted(
        (name, (3 if name == "br1" else 2, switch.get(name, "no/switch"), link["address"], link["ifindex"]))
        for name, link in links().items()))
    settled()
    first, run, before = snapshot("first"), Run("-A"), links()
    for name, count, size in ("p0", 11, 100), ("p1", 23, 900), ("br0", 5, 300), ("m0", 9, 150), ("m1", 4, 1000):
        send(name, count, size)
    ip("link set p0 promisc on; link set v2 allmulticast on; link set m0 promisc on allmulticast on")
    after, second, live = links(), snapshot("second"), records(run.end())[0]
    check("ip -s link", live, counted(before, after))
    check("ip link set", [live[name]["rxmode"] for name in ("v0", "p0", "v2", "m0")], [0, 1, 2, 3])
    check("live run", records(once("-c", "first.0:second.0", "-A"))[0], live)
    # On the way in a bridge's own device leaves out the 14 bytes of a frame's header, and a macvlan counts them twice.
    for name, *known in ("v0", 11, 1100, 28, 22200), ("br0", 5, 1500, 34, 21324), ("m0", 9, 1350, 4, 4056):
        check(f"known frames of {name}", live[name], way("tx", *known[:2]) | way("rx", *known[2:]))
        keys = 269, f'"{live[name]["switch"]}" {live[name]["id"]}'
        check(f"known frames of {name}", [second[keys](at) - first[keys](at) for at in (0, 8, 72, 80)], known)


def tap():
    """A tap that a process holds, which is no guest; its queue runs full; and a tap that nobody holds."""
    network(taps=2)
    ip("link set t0 txqueuelen 10")
    write, file = hold("t0")
    ready("t0")

    def drain():
        while select.select([file], [], [], 0)[0]:
            yield len(os.read(file, 65536))

    run = Run("-A", "-n", "2")
    write(13, 400)
    send("t0", 25, 700)
    run.go(1)
    queued = list(drain())
    assert 0 < len(queued) < 25
    send("t0", 3, 200)
    size = sum(queued) + sum(drain())  # the kernel counts a frame when it is read
    full, then = (record["t0"] for record in records(run.end()))
    check("own reads", full, way("tx", 13, 5200) | {"rxeps": 25 - len(queued), "rxpps": 0})
    check("own reads", then, way("rx", len(queued) + 3, size) | {"rxeps": 0})
    check("types", [listing()[name][0] for name in ("t0", "t1")], [5, 2])


def bound(address, port):
    """A UDP socket."""
    made = socket.socket(socket.AF_INET6 if ":" in address else socket.AF_INET, socket.SOCK_DGRAM)
    made.bind((address, port))
    return made


def other_host():
    """A host at the other end of v0, with a TCP and a UDP socket, in a namespace of the thread that calls this."""
    assert LIBC.unshare(0x40000000) == 0  # CLONE_NEWNET
    quiet()
    ip(f"link add p0 type veth peer v0 netns {os.getpid()}; address add 10.9.0.2/24 dev p0; link set p0 up")
    return socket.create_server(("10.9.0.2", 7000)), bound("10.9.0.2", 7001)


def sent_over(*pairs):
    """Bytes that our ends of TCP connections sent, by their own account."""
    return sum(struct.unpack_from("<Q", ours.getsockopt(6, socket.TCP_INFO, 256), 200)[0] for ours, _ in pairs)


def talk(pair, there, here):
    """Bytes over a connection in both directions."""
    for sender, receiver, size in (*pair, there), (*pair[::-1], here):
        sender.sendall(b"x" * size)
        receiver.recv(size, socket.MSG_WAITALL)
    time.sleep(0.3)  # longer than an acknowledgement is late


def stack():
    """The host's IP stack beside another host, with connections that open and close during a run."""
    enable = pathlib.Path("/proc/sys/net/ipv6/conf/lo/disable_ipv6")
    if not enable.exists():
        skip("no IPv6")
    network()
    server, theirs = concurrent.futures.ThreadPoolExecutor(1).submit(other_host).result()
    ip("link set lo up; link set v0 master br0 up; address add 10.9.0.1/24 dev br0")
    enable.write_text("0")
    until(lambda: "::1/128" in tool("ip", "address", "show", "lo"))
    ready("v0", "br0")
    ours, small, six = bound("10.9.0.1", 7002), bound("10.9.0.1", 7003), bound("::1", 7004)
    small.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)

    def connect():
        return socket.create_connection(("10.9.0.2", 7000)), server.accept()[0]

    stays, ends = connect(), connect()
    talk(stays, 500, 600)
    talk(ends, 70, 80)
    run = Run("-p", str(socket.if_nametoindex("br0")), "-t", "v")
    recorder = Run("-o", "snap", "-n", "2", program="knf-record")
    inner, new = nstat(), connect()
    talk(stays, 50000, 3000)
    talk(ends, 20000, 7)
    talk(new, 11, 40000)
    sent = sent_over(stays, ends, new) - 570  # more than was said, as a busy machine says it again
    new[1].setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))  # a reset
    for leaver in new[1], *ends, new[0]:
        leaver.close()
    for sender, to, count, size in ((ours, ("10.9.0.2", 7001), 17, 300), (ours, ("10.9.0.2", 7001), 1, 4000),
                                    (theirs, ("10.9.0.1", 7002), 29, 100), (theirs, ("10.9.0.1", 7009), 5, 10),
                                    (theirs, ("10.9.0.1", 7003), 40, 1000), (six, ("::1", 7004), 4, 50)):
        for _ in range(count):
            sender.sendto(b"x" * size, to)
    for receiver in [ours] * 29 + [six] * 4:
        receiver.recv(100)
    settled()
    step = nstat() - inner
    recorder.end()
    shown = next(iter(records(run.end())[0].values()))
    first, second = (dump(f"snap.{i}")[33, ""] for i in range(2))
    # The kernel counts the end of a connection that it hears as one more byte.
    check("TCP_INFO and payload", [second(at) - first(at) for at in (144, 232)], [sent, 43007 + 1])
    lost, out = step["UdpRcvbufErrors"], step["IpOutTransmits" if "IpOutTransmits" in inner else "IpOutRequests"]
    check("told", told(), {"ipv4", "ipv6", "tcptx", "tcprx", "udp"})
    check("own sends", shown, {"udp": {"txpps": 22, "rxpps": 33, "rxsockeps": lost, "rxothereps": 5},
                               "ipv6": {"txpps": 4, "rxpps": 4, "rxdeliv": 4, "rxeps": 0}, "ipv4": {"txfrags": 3}})
    tcptx = {"pps": step["TcpOutSegs"] + step["TcpRetransSegs"], "mbps": float(f"{sent * 8e-6:.1f}")}
    check("nstat", shown, {"ipv4": {"txpps": out, "rxpps": step["IpInReceives"], "rxdeliv": step["IpInDelivers"]},
                           "tcptx": tcptx, "tcprx": {"pps": step["TcpInSegs"]}})


def kernel_settings():
    """All that a run might want to turn on."""
    return tool("sh", "-c", "grep -rs '' /proc/sys/net; grep -s '' /proc/sys/kernel/[ps]*; true")


def guest():
    """A guest's name, address, vcpus and worker, then its tap's name and its end; a run leaves nothing behind."""
    if len(CPUS) < 2:
        skip("a thread can't migrate on one CPU")
    web = web_guest("CPU 0/KVM,CPU 1/KVM,vhost-PID")
    ip("tuntap add t1 mode tap")
    Guest("t1", "", "mail1")
    web.do("write(2, 100, b'\\2\\0\\0\\7\\7\\7')")
    web.do("[worker.move(1 + i // 2) for i, worker in enumerate(workers)]")  # bound from here on
    check("told", told(), {"vcpu", "wdt"})
    settings, clocks = kernel_settings(), "[worker.clock() for worker in workers]"
    run, begun = Run("-A", "-t", "vW", "-n", "2"), web.do(clocks)
    web.do("workers[0].move(41), workers[2].move(8), write(6, 900)")
    web.do("workers[1].ask(sum, range(8000000)), workers[2].ask(sum, range(2000000))")
    times = [last - first for first, last in zip(begun, web.do(clocks))]
    run.go(1)
    ip("link set t0 down; link set t0 name x; link set t1 name t0; link set x name t1; link set t1 up")
    web.do("write(4, 80)")
    web.process.kill()
    web.process.wait()
    port, later = (record["web1"] for record in records(run.end(messages="read stateTimes|wdt: stats read")))
    check("port", port, way("tx", 6, 5400) | {"switch": "br0", "mac": "02:00:00:07:07:07"})
    check("vcpus", [(vcpu["id"], vcpu["migtot"]) for vcpu in port["vcpu"]], list(zip(web.threads, (40, 0))))
    check("worker", port["wdt"][0], {"migct": 8, "afftype": "pcpu", "affval": CPUS[1],
                                     "name": f"NetWdt-Async-{web.process.pid}-vhost-{web.threads[2]}"})
    used(port["vcpu"] + port["wdt"], times)
    check("of another name", later, way("tx", 4, 320) | {"id": port["id"], "vcpu": None, "wdt": None})
    check("settings", kernel_settings(), settings)


def holders():
    """Taps whose guest is in another namespace, or holds one of their name there, is one of two, or was handed it."""
    network(taps=2)
    ip("; ".join(f"tuntap add q{i} mode tap multi_queue" for i in range(3)))
    held = ("t0", "far"), ("q0", "one"), ("q0", "two"), ("q1", ""), ("q1", "guest"), ("q2", "queues")
    far, _, _, _, _, queues = [Guest(tap, "CPU 0/KVM" if name else "", name) for tap, name in held]
    queues.do("again() and 0")
    home = far.do("far('t1')")
    told = "corekit: \"q0\" is held by several guests"
    there = {"far": (5, "t0"), "q0": (5, "q0"), "guest": (5, "q1"), "queues": (5, "q2"), "t1": (2, "t1")}
    for place in "a namespace of its own", "ours":
        rows = {row[5]: row for row in (line.split(maxsplit=5) for line in once("-l", messages=told).splitlines()[1:])}
        check(place, {name: int(rows[name][1]) for name in there}, {name: kind for name, (kind, _) in there.items()})
        check(place, {name: int(rows[name][0]) for name in there},
              {name: socket.if_nametoindex(tap) for name, (_, tap) in there.items()})
        check("setns", far.do(f"LIBC.setns({home}, 0x40000000)"), 0)
    run = Run("-A", "-t", "v", interval=0)
    vcpus = {name: len(port.get("vcpu", ())) for name, port in records(run.end(messages=told))[0].items()}
    check("vcpus", vcpus, {"far": 1, "q0": 0, "guest": 1, "queues": 1, "t1": 0})
    check("it is told", len(re.findall(told, read(run.err))), 1)


def macvtap():
    """A guest behind a macvtap, and a process that holds another device by the name that one would have."""
    quiet()
    ip("link add v0 up type veth peer p0; link set p0 up; " +
       "; ".join(f"link add m{i} link v0 up type macvtap mode bridge" for i in range(2)))
    tool("mount", "-t", "sysfs", "sys", "/sys")
    tool("mount", "-t", "tmpfs", "dev", "/dev")
    files = [f"/dev/tap{socket.if_nametoindex(name)}" for name in ("m0", "m1")]
    device = read(f"/sys/class/net/m0{files[0][4:]}/dev").split(":")
    try:
        os.mknod(files[0], 0o20600, os.makedev(*map(int, device)))
        os.mknod(files[1], 0o20600, os.makedev(1, 3))
    except PermissionError:
        skip("this user may not make devices")
    web = Guest(files[0], "CPU 0/KVM", "guest=web1")
    start("sleep", "100", stdout=open(files[1], "w"))
    ready("m0", "m1")
    run = Run("-A", "-t", "v")
    web.do("write(5, 300)")
    ports = records(run.end())[0]
    check("known frames", ports["web1"], way("tx", 5, 1500) | {"switch": "v0", "mac": links()["m0"]["address"]})
    check("types", [listing()[name][0] for name in ("web1", "m1")], [5, 2])
    check("vcpus", [vcpu["id"] for vcpu in ports["web1"]["vcpu"]], web.threads)


class Firmware:
    """A real guest, stopped, whose firmware will ask for an address."""

    def __init__(self, backend, device, *more):
        if subprocess.run(["which", "qemu-system-x86_64"], capture_output=True).returncode:
            skip("no qemu-system-x86_64")
        network(taps=1)
        self.process = start(*"qemu-system-x86_64 -S -accel tcg -smp 2 -m 64 -nodefaults -display none -monitor stdio "
                             "-name guest=web1,debug-threads=on".split(), "-device", f"{device},netdev=n0", *more,
                             "-netdev", f"tap,id=n0,ifname=t0,script=no,downscript=no{backend}",
                             stdout=subprocess.DEVNULL)
        ready("t0", "br0")
        until(lambda: len(self.ran()) == 2)
        freeze(self.process)

    def ran(self):
        """The ns of each vcpu."""
        return spent(f"/proc/{self.process.pid}/task", "CPU ")

    def go(self):
        """Starts it, and sends it something."""
        self.process.stdin.write(b"cont\n")
        self.process.send_signal(signal.SIGCONT)
        send("t0", 4, 210)


def qemu():
    """A real guest against QEMU's own capture."""
    mac = "52:54:00:12:34:56"
    machine = Firmware("", f"e1000,mac={mac}", "-object", "filter-dump,id=f0,netdev=n0,file=capture")

    def captured():
        """Sizes of the frames from the guest, and of those to it."""
        data, at, sizes = pathlib.Path("capture").read_bytes(), 24, ([], [])
        while at + 16 <= len(data):
            size = struct.unpack_from("<I", data, at + 12)[0]
            sizes[data[at + 22:at + 28].hex(":") != mac].append(size)
            at += 16 + size
        return sizes

    run, begun = Run("-V", "web1"), machine.ran()
    machine.go()
    until(lambda: len(captured()[0]) >= 2 and len(captured()[1]) >= 4)
    freeze(machine.process)
    out, into = captured()
    port = records(run.end())[0]["web1"]
    check("filter-dump", port, way("tx", len(out), sum(out)) | way("rx", len(into), sum(into)) | {"mac": mac})
    check("vcpus", {vcpu["id"] for vcpu in port["vcpu"]}, set(begun))
    used(port["vcpu"], [machine.ran()[vcpu["id"]] - begun[vcpu["id"]] for vcpu in port["vcpu"]])


def vhost():
    """A real guest whose frames a vhost worker moves, which is a thread of the guest or, up to kernel 6.3, of its own."""
    if not os.access("/dev/vhost-net", os.R_OK | os.W_OK):
        skip("/dev/vhost-net is not there, or not for this user")
    machine = Firmware(",vhost=on,vhostforce=on", "virtio-net-pci")
    pid = machine.process.pid
    workers = lambda: spent("/proc", f"vhost-{pid}") | spent(f"/proc/{pid}/task", f"vhost-{pid}")
    run, begun, before = Run("-V", "web1", "-t", "W"), workers(), links()
    machine.go()
    until(lambda: links()["t0"]["stats64"]["rx"]["packets"] >= 2)
    freeze(machine.process)
    settled()
    after, port = links(), records(run.end())[0]["web1"]
    check("ip -s link", port, counted({"v": before["t0"]}, {"v": after["t0"]})["v"])
    check("workers", [row["name"] for row in port["wdt"]], [f"NetWdt-Async-{pid}-vhost-{tid}" for tid in begun])
    used(port["wdt"], [workers()[tid] - begun[tid] for tid in begun])
    assert workers() != begun


def nic():
    """Queues and threads of NICs that this may send on: the machine of tests/linux_kernel has eth0 and eth1."""
    quiet()
    ip("link set eth0 up; link set eth1 up")
    pathlib.Path("/sys/class/net/eth0/threaded").write_text("1")
    ready("eth0", "eth1")
    settled()

    def disciplines():
        """The packets of each queue of eth0, as its queue discipline counts them."""
        rows = json.loads(tool("tc", "-s", "-j", "qdisc", "show", "dev", "eth0"))
        return [row["packets"] for row in sorted(rows, key=lambda row: row.get("parent", "")) if "parent" in row]

    run, begun, before = Run("-A", "-t", "vqW"), {name: spent("/proc", name) for name in ("eth0", "eth1")}, disciplines()
    for cpu in CPUS:
        os.sched_setaffinity(0, {cpu})
        send("eth0", 100 * (cpu + 1), 200)
    after, ports = disciplines(), records(run.end())[0]
    steps = [new - old for old, new in zip(before, after)]
    queues = ports["eth0"]["txqueue"]
    check("known frames", sum(steps), 50 * len(CPUS) * (len(CPUS) + 1))
    check("tc -s qdisc", [queue["pps"] for queue in queues["details"]], steps)
    check("queues", (queues["count"], ports["eth0"]["rxqueue"]["count"]), (len(steps), len(CPUS)))
    for name, threads in begun.items():
        shown = {row["name"]: row for row in ports[name].get("wdt", [])}
        names = [read(f"/proc/{tid}/comm").strip() for tid in threads]
        rows = [shown.get(name) or shown[f"{name}/{tid}"] for name, tid in zip(names, threads)]
        used(rows, [ran - threads[tid] for tid, ran in spent("/proc", name).items()])
        print(*zip(shown, spent("/proc", name).values()), sep="\n")
    check("told", told(), {"physnic", "txqueue", "rxqueue", "wdt"})


def datapath():
    """The datapath of Open vSwitch, with a port of a container and one of the host's stack."""
    add = ["ovs-dpctl", "add-dp", "ovs-system"]
    if not shutil.which(add[0]) or subprocess.run(add, capture_output=True).returncode:
        skip("no Open vSwitch")
    quiet()
    ip("link add v0 type veth peer p0")
    tool("ovs-dpctl", "add-if", "ovs-system", "v0", "ovs0,type=internal")
    ip("address add 10.9.0.1/24 dev ovs0; link set ovs0 up; link set v0 up; link set p0 up")
    check("switches", {name: row[:2] for name, row in listing().items()}, {
        "ovs-system": (2, "ovs-system"), "v0": (2, "ovs-system"), "ovs0": (3, "ovs-system"), "p0": (2, "no/switch")})
    check("-S", chosen("-S", "ovs-system"), {"ovs-system", "v0", "ovs0"})


def changes():
    """Interfaces that go, come back, get another name, bridge or namespace while a run goes on, and a bridge."""
    network(pairs=7)
    run, there = Run("-S", "br0", "-n", "3"), start("unshare", "-n", "sleep", "1000").pid
    until(lambda: os.readlink(f"/proc/{there}/ns/net") != os.readlink("/proc/self/ns/net"))
    ip(f"link set v6 netns {there}")
    tool("nsenter", "-t", str(there), "-n", "ip", "link", "set", "v6", "netns", str(os.getpid()))
    ip("link add br1 type bridge; link set v1 down; link set v1 name w1; link set w1 up; link set v2 master br1; "
       "link del v3; link add v3 index 303 master br0 type veth peer p3; link del v4; "
       "link add v4 index 1004 master br0 type veth peer p4; link del v5; link set v6 master br0")
    ready("w1", "v0")
    send("p0", 8, 120)
    run.go(1)
    send("p1", 5, 500)
    ip("link set w1 nomaster; link set w1 master br0")  # it has been away, and nobody looked
    ip("link set br0 down; link set br0 name b0; link set b0 up")
    ready("b0")
    run.go(2)
    check("a new list", chosen("-S", "b0"), {"b0", "v0", "w1", "v3", "v4", "v6"})
    ip("link del b0")
    ports = records(run.end(messages="Log0 Status: .*port"))
    check("ports that are left", [set(record) for record in ports],
          [{"br0", "v0", "w1"}, {"b0", "v0", "w1"}, set()])
    check("its switch", {port["switch"] for record in ports for port in record.values()}, {"br0"})
    check("known frames", ports[0], {"v0": way("tx", 8, 960), "w1": way("rx", 8, 960)})
    check("known frames", ports[1], {"v0": way("rx", 5, 2500), "w1": way("tx", 5, 2500)})


def storm(told=12):
    """More news of interfaces than a socket holds, interfaces that come and go while they are read, and one that goes
    unseen, while another takes its index, name and address and sends so many more frames."""
    if told > 0:
        tool("mount", "-t", "sysfs", "sys", "/sys")
    network(pairs=3)
    ip("link set v2 address 02:00:00:00:02:02")
    send("p2", 9, 100)
    run = Run("-A", "-n", "2")
    flood = "; ".join(f"link add s{i} group 7 type veth peer r{i} group 7" for i in range(500)) + "; link del group 7"
    ip("; ".join([flood] * 3 + ["link del v1; link del v2; link add v2 index 1002 address 02:00:00:00:02:02 up "
                                "master br0 type veth peer p2; link set p2 up; link set v0 down; "
                                "link set v0 name w0 address 02:00:00:00:00:01 up"]))
    ready("w0", "p0", "v2", "p2")
    send("p2", 9 + told, 100)
    send("p0", 19, 333)
    run.go(1)
    run.process.send_signal(signal.SIGCONT)
    ip(flood)
    ports = records(run.end(messages="Log0 Status: .*port"))
    check("known frames", ports[0]["w0"], way("tx", 19, 6327))
    check("ports that are left", [set(record) for record in ports], [{"br0", "w0", "p0"}] * 2)


def storm_unmarked():
    """The same where /sys shows another namespace, and only counts that began again tell of the other interface."""
    storm(-5)


def names():
    """Names of interfaces and guests with any byte that the kernel takes, and a guest that says nonsense."""
    odd = ["'<>&|;$()*?[]#", "\x1b[31m\x07\x01", "\udcff\udcfe\udc80", "-A", "123456789012345", "NetWdt-Async-1"]
    bridge = "br\udcff'\x7f(&;|<>#$[]"
    quiet()
    tool("ip", "link", "add", "name", bridge, "up", "type", "bridge")
    for i, name in enumerate(odd):
        tool("ip", "link", "add", "name", name, "up", "master", bridge, "type", "veth", "peer", "name", f"p{i}")
    ip("link set p0 up; tuntap add t0 mode tap; tuntap add t1 mode tap")
    Guest("t0", "CPU 0/KVM,CPU 99999999999,\nCPU 1/KVM", "guest=\udcff\x1b\n%s,debug-threads=on")
    Guest("t1", "CPU 0/KVM", "guest=" + "x" * 4000)
    ready("p0", odd[0])
    run = Run("-A", "-t", "vW")
    send("p0", 6, 250)
    ports = records(run.end())[0]
    check("names", {name for name in ports if name[0] not in "pb"}, {*odd, "\udcff\x1b\n%s", "x" * 1047})
    check("known frames", ports[odd[0]], way("tx", 6, 1500) | {"switch": bridge})
    check("-S", chosen("-S", bridge), {*odd, bridge})


def many():
    """A thousand ports, half of them on one bridge, where all get what one of them sends."""
    network(pairs=500)
    run, alone, before = Run("-A"), Run("-p", "1003"), links()
    send("p3", 10, 100)
    after, ports, known = links(), records(run.end())[0], {"v3": way("tx", 10, 1000)}
    check("known frames", records(alone.end())[0], known)
    check("known frames", ports, known | {"v499": way("rx", 10, 1000)})
    check("ip -s link", ports, counted(before, after))


def kinds():
    """Ports of many kinds on large bridges, whose kind the kernel's short list does not tell."""
    network(pairs=40, taps=2)
    away = start("unshare", "-n", "sleep", "100")
    until(lambda: os.stat(f"/proc/{away.pid}/ns/net") != os.stat("/proc/self/ns/net"))
    ip("link add br1 up type bridge mcast_snooping 0; link add x0 up master br0 type veth peer x1; link set x1 up master br1; "
       f"link add x2 up master br0 type veth peer gone index 1003 netns {away.pid}; "  # as v3 has here
       "link add x3 up type veth peer x4; link set x4 up; link add m0 link x3 up type macvlan; "
       "link add e0 up master br0 type vxlan id 5 dstport 4789")
    write, file = hold("t0")
    quiet()
    ready("t0", "x0", "x1", "x3", "x4")
    run, before = Run("-A"), links()
    send("p3", 10, 100)
    write(7, 300)
    settled()
    after, ports = links(), records(run.end())[0]
    check("known frames", ports, {"v3": way("tx", 10, 1000) | way("rx", 7, 2100), "x1": way("tx", 17, 3100),
                                  "t0": way("tx", 7, 2100)})
    check("ip -s link", ports, counted(before, after))
    check("switches", {name: listing()[name][1] for name in ("x1", "x3", "x4", "e0", "m0", "t1")},
          {"x1": "br1", "x3": "x3", "x4": "no/switch", "e0": "br0", "m0": "x3", "t1": "br0"})
    os.close(file)


def nothing():
    """A namespace without interfaces but the hidden one."""
    check("list", len(listing()), 0)
    check("report", once("-A", status=1, messages="at ?least one valid port"), "")


def no_proc():
    """A host that shows no processes, no CPU times and no counters of its IP stack."""
    if b"__asan_init" in pathlib.Path(BUILD, "lan-meter").read_bytes():
        skip("the sanitizers need /proc")
    network(pairs=1)
    ip("address add 10.9.0.1/24 dev br0")
    tool("mount", "-t", "tmpfs", "none", "/proc")
    check("ports", chosen("-A", "-t", "vW", messages=""), {"br0", "v0", "p0"})
    check("types", {name: row[0] for name, row in listing().items()}, {"br0": 3, "v0": 2, "p0": 2})
    check("told", re.findall("^ports.*: there$", tool(f"{BUILD}/knf-source"), re.M), ["ports: there"])


def few_files():
    """A guest with more threads than the run may open files."""
    web = web_guest(",".join(f"CPU {i}/KVM" for i in range(15)))
    web.do("[worker.move(1) for worker in workers]")
    run = Run("-A", wrapper="prlimit --nofile=20")
    web.do("[worker.move(i + 1) for i, worker in enumerate(workers)], write(7, 70)")
    port = records(run.end(messages="corekit: "))[0]["web1"]
    check("known frames", port, way("tx", 7, 490))
    check("it is told", read(run.err).count("descriptors"), 1)
    check("own moves", [vcpu["migtot"] for vcpu in port["vcpu"]], list(range(15)))


def stranger():
    """What a user sees who may not look at the guest, and one from whom it is hidden."""
    web = web_guest("CPU 0/KVM")
    wrapper = "setpriv --reuid=65534 --regid=65534 --clear-groups"
    for hidden, others in ("0", "yes"), ("1", "not allowed"), ("2", "not allowed"), ("4", "not allowed"):
        tool("mount", "-t", "proc", "-o", f"hidepid={hidden}", "proc", "/proc")
        text = tool(*wrapper.split(), f"{BUILD}/knf-source")
        features = dict(re.findall(r"^  (processes of other users|holders of taps) +(.*)$", text, re.M))
        check(f"hidepid={hidden}", features, {"processes of other users": others, "holders of taps": "not allowed"})
        check(f"hidepid={hidden}", "(hidepid)" in text, others != "yes")
        check("told", told(wrapper), set())
        run = Run("-A", "-t", "vW", wrapper=wrapper)
        web.do("write(9, 90)")
        port = records(run.end())[0]["t0"]
        check("known frames", port, way("tx", 9, 810) | {"switch": "br0", "vcpu": None, "wdt": None})


def counting(*features):
    """Skips a test where the kernel does not count for us."""
    told = tool(f"{BUILD}/knf-source")
    lacks = [name for name in features if not re.search(f"^  {name} +yes$", told, re.M)]
    if lacks:
        skip(f"{lacks[0]}: not for this user, or not on this kernel")


def shares(port):
    """Of each histogram with samples the least and largest, the mean, the count and the shares of its buckets."""
    return {row["name"]: (row["min"], row["max"], row["mean"], row["count"], {at: part for at, part in row["values"] if part})
            for row in port["histos"] if row["count"]}


def histograms():
    """Sizes and intervals of known frames, at a port that gets another name, and one whose index another one takes."""
    counting("histograms of ports")
    network(pairs=3, taps=1)
    write, _ = hold("t0")
    ip("link add m0 link p2 up type macvtap mode bridge")
    ready("t0", "m0", *(f"v{i}" for i in range(3)))
    settled()
    run = Run("-A", "-t", "h", "-n", "2")
    for count, size in (300, 100), (200, 500), (100, 1400):
        send("p0", count, size)
    write(50, 65)
    for _ in range(5):
        send("m0", 1, 300)
        time.sleep(0.002)
    run.go(1)
    ip("link set v0 down; link set v0 name w0; link set w0 up; link del v1; "
       "link add v1 index 1001 up master br0 type veth peer p1; link set p1 up")
    ready("w0", "v1", "p1")
    send("p0", 10, 200)
    send("p1", 7, 300)
    first, second = records(run.end(messages="macvtap|Log0 Status: .*port"))
    veth, tapped, macvtapped, renamed = map(shares, (first["v0"], first["t0"], first["m0"], second["w0"]))
    check("sizes", (veth["pktsizein"], veth["pktsizeout"]), (
        (100, 1400, 450, 600, {128: 50.0, 512: 33.3, 1514: 16.7}), (65, 300, 86, 55, {128: 90.9, 512: 9.1})))
    check("sizes", (tapped["pktsizein"], tapped["pktsizeout"]), (
        (65, 65, 65, 50, {128: 100.0}), (100, 1400, 448, 605, {128: 49.6, 512: 33.9, 1514: 16.5})))
    check("sizes", shares(first["br0"])["pktsizeout"][:2], (65, 1400))
    check("intervals", [side[f"pktinterval{way}"][3] for side in (veth, tapped) for way in ("in", "out")], [599, 54, 49, 604])
    assert macvtapped["pktintervalin"][0] >= 2000, macvtapped
    check("macvtap", {name: row[3] for name, row in macvtapped.items()}, {"pktsizein": 5, "pktintervalin": 4})
    check("ports that are left", [name in second for name in ("v0", "w0", "v1")], [False, True, False])
    check("after a reset", (renamed["pktsizein"], renamed["pktsizeout"]),
          ((200, 200, 200, 10, {256: 100.0}), (300, 300, 300, 7, {512: 100.0})))


def periods():
    """Periods of a guest's vcpus: one that sleeps between short runs, one that is busy."""
    counting("histograms of vcpus")
    web = web_guest("CPU 0/KVM,CPU 1/KVM")
    clocks = "[open(f'/proc/self/task/{worker.thread.native_id}/schedstat').read().split() for worker in workers]"
    run, before = Run("-V", "web1", "-t", "V"), web.do(clocks)
    web.do("[workers[0].ask(sum, range(9)) for i in range(200)] + [workers[1].ask(sum, range(9000000))]")
    until(lambda: web.do(clocks) == (time.sleep(0.05) or web.do(clocks)))  # all of them sleep
    after, rows = web.do(clocks), records(run.end())[0]["web1"]["vcpu"]
    for row, old, new in zip(rows, before, after, strict=True):
        kinds = {kind["name"]: kind for kind in row["histos"]["values"]}
        ran, runs = (int(new[i]) - int(old[i]) for i in (0, 2))
        print(ran, runs, {name: (kind["count"], kind["mean"]) for name, kind in kinds.items()})
        count = kinds["run"]["count"]
        assert runs * 0.8 - 3 <= count <= runs, (runs, count)  # a kernel may leave out to trace a switch, even for ftrace
        check("co-stop", kinds["cstp"]["count"], 0)
        check("buckets", [sum(kind["values"]) for kind in kinds.values()], [kind["count"] for kind in kinds.values()])
        assert -1 <= ran / 1000 / count - kinds["run"]["mean"] <= 2, (ran, kinds)
    assert rows[0]["histos"]["values"][3]["count"] >= 100, rows  # some orders come ahead of the sleep


def walk():
    """So many vcpus that one walk over all threads tells of them, with none of their files open."""
    counting("histograms of vcpus")
    web = web_guest(",".join(f"CPU {i}/KVM" for i in range(140)))
    web.do("[worker.move(1) for worker in workers]")
    clocks = "[worker.clock() for worker in workers]"
    run, begun = Run("-A"), web.do(clocks)
    files = [os.readlink(path) for path in pathlib.Path(f"/proc/{run.process.pid}/fd").iterdir()]
    check("files of threads", [name for name in files if name.endswith("schedstat")], [])
    web.do("[worker.move(1 + i % 7) for i, worker in enumerate(workers)]")
    web.do("workers[139].ask(sum, range(3000000))")
    times = [last - first for first, last in zip(begun, web.do(clocks))]
    vcpus = records(run.end())[0]["web1"]["vcpu"]
    check("vcpus", [(vcpu["id"], vcpu["migtot"]) for vcpu in vcpus],
          [(tid, i % 7) for i, tid in enumerate(web.threads)])
    used(vcpus, times)


def refused():
    """Histograms and interrupts for root without the rights to count, as in a user namespace."""
    network(pairs=1)
    run = Run("-p", "1000", "-t", "hiV", "-n", "2", wrapper="setpriv --bounding-set -bpf,-perfmon,-sys_admin")
    send("p0", 6, 100)
    run.go(1)
    send("p0", 4, 100)
    ports = records(run.end(messages="histograms of ports can't be counted: needs CAP_BPF|op start failed in stage start"))
    check("messages", len(read(run.err).splitlines()), 2)
    for port, count in zip(ports, (6, 4), strict=True):
        check("known frames", port["v0"], way("tx", count, count * 100) | {"histos": None, "intr": None})


def held(pid):
    """The programs and links that a process holds in the kernel."""
    told = "".join(read(path) for path in pathlib.Path(f"/proc/{pid}/fdinfo").iterdir())
    return set(re.findall(r"^(prog|link)_id:\t(\d+)$", told, re.M))


def ends():
    """Whatever ends a run takes along what it had in the kernel."""
    counting("histograms of ports", "histograms of vcpus")
    if not shutil.which("bpftool"):
        skip("no bpftool")
    web_guest("CPU 0/KVM")
    for how, status in (signal.SIGCONT, 0), (signal.SIGTERM, 1), (signal.SIGKILL, -9):
        run = Run("-A", "-t", "hV")
        mine = held(run.process.pid)
        check("held", {kind for kind, _ in mine}, {"prog", "link"})
        run.process.send_signal(how)
        run.end(status)
        until(lambda: not mine & {(kind, str(row["id"])) for kind in ("prog", "link")
                                  for row in json.loads(tool("bpftool", "-j", kind, "show"))})


def came(name):
    """Interrupts of a NIC's device, as /proc counts them."""
    device = pathlib.Path(f"/sys/class/net/{name}/device").resolve()
    vectors = {path.name for place in (device, device.parent) for path in place.glob("msi_irqs/*")}
    rows = re.findall(r"^ *(\d+):((?: +\d+)+) ", read("/proc/interrupts"), re.M)
    return sum(sum(map(int, counts.split())) for number, counts in rows if number in vectors)


def interrupts():
    """Interrupts of the NICs of this machine, live and by snapshots."""
    counting("time of interrupts")
    nics = {name: row[3] for name, row in listing().items() if row[0] == 4 and came(name)}
    if not nics:
        skip("no NIC with interrupts of its own")
    for name, number in nics.items():
        outer, run = came(name), Run("-p", str(number), "-t", "vi")
        recorder = Run("-o", "snap", "-n", "2", program="knf-record")
        inner = came(name)
        time.sleep(1)
        inner = came(name) - inner
        live = records(run.end())[0][name]["intr"]
        recorder.end()
        outer = came(name) - outer
        replayed = records(once("-a", "-c", "snap.0:snap.1", "-p", str(number), "-t", "vi"))[0][name]["intr"]
        print(name, inner, outer, live, replayed)
        for told in live, replayed:
            assert inner <= told["count"] <= outer and (told["used"] > 0) >= (inner > 1000), (inner, told, outer)


def look():
    """What other tools tell: counters by name, CPU times in us, columns of /proc/net/dev by interface and number."""
    told = nstat()
    for cpu, times in re.findall(r"^(cpu\d+) (.*)", read("/proc/stat"), re.M):
        user, nice, system, _, _, *more = map(int, times.split())
        told[cpu] = (user + nice + system + sum(more[:3])) * 1000000 // os.sysconf("SC_CLK_TCK")
    for name, columns in re.findall(r"^ *(.*):(.*)$", read("/proc/net/dev"), re.M):
        told |= {f"{name} {i}": int(column) for i, column in enumerate(columns.split())}
    return told


def host():
    """The host as it is: figures that move lie between two looks of another tool."""
    told()
    before, seen, after = look(), snapshot("now"), look()
    ours = {word: seen[797, word[3:]](0) for word in before if re.fullmatch(r"cpu\d+", word)}
    ours |= {"TcpInSegs": seen[33, ""](216), "IpInReceives": seen[32, ""](0)}
    for name, (kind, switch, _, number) in listing().items():
        if kind == 4:
            nic, port = seen[73, f'"{name}"'], seen[269, f'"{switch}" {number}']
            ours |= {f"{name} {column}": nic(at) for at, column in ((0, 1), (8, 9), (16, 0), (24, 8))}
            check("its port", [port(at) for at in (0, 8, 72, 80)], [nic(at) for at in (8, 24, 0, 16)])
    for key, value in ours.items():
        assert before[key] <= value <= after[key], f"{key}: {value} is not from {before[key]} to {after[key]}"


# How a test gets its namespaces: the first way that this user may go.
WAYS = {"histograms": ["-n", "-Urn"], "periods": ["-n", "-Urn"], "walk": ["-n", "-Urn"], "ends": ["-n", "-Urn"], "interrupts": [""],
        "host": [""], "nic": [""], "no_proc": ["-Urnm", "-nm"], "storm": ["-Urnm", "-nm"], "stranger": ["-nmpf"],
        "macvtap": ["-nm"]}


def main(name):
    """The test in a process of its own, in a directory that goes with it."""
    for flags in WAYS.get(name, ["-Urn", "-n"]):
        unshare = ["unshare", *flags.split()]
        if subprocess.run([*unshare, "true"], capture_output=True).returncode == 0:
            with tempfile.TemporaryDirectory() as directory:
                sys.exit(subprocess.call([*unshare, sys.executable, SCRIPT, BUILD, name, "inside"], cwd=directory))
    skip("this user may not make its namespaces")


if sys.argv[1] == "--guest":
    play_guest(*sys.argv[2:4])
else:
    BUILD, TEST, *INSIDE = os.path.abspath(sys.argv[1]), *sys.argv[2:]
    globals()[TEST]() if INSIDE else main(TEST)

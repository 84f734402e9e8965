#!/usr/bin/python3
"""What `lan-report summary` finds: `summary_test.py BUILD-DIRECTORY`.

Each row of HOSTS describes what differs from a quiet host, and the findings that a report of it must have, all of
them; rows come in pairs, one that shows a rule and one that nearly does. RECORDS has what no described host can show.
"""
import fcntl
import json
import os
import pathlib
import signal
import struct
import subprocess
import sys
import tempfile
import termios
import time

BUILD = pathlib.Path(sys.argv[1]).resolve()
DATA = pathlib.Path(__file__).resolve().parents[1] / "data/report"
MANUAL = pathlib.Path(__file__).resolve().parents[2] / "docs/man/lan-report.1"
QUIET = {
    "host": "host name=quiet pcpus=4 packages=1 cores=2 llc=2",
    "pcpus": "pcpu 0..3 busy=200 worldlet=50",
    "self": "self used=2",
    "stack": "stack tx=0 rx=0",
    "vm": "vm web leader=100 vcpus=4 used=200 ready=5 costop=1",
    "switch": "switch s0",
    "uplink": "uplink switch=s0 port=7 nic=nic0 txqueues=4 rxqueues=4 filters=1,1,1,1 tx=20000 rx=20000 size=900",
    "hostnic": "hostnic switch=s0 port=8 name=host0 tx=100 rx=100",
    "web": "vnic switch=s0 port=9 vm=web model=parlan3 tx=20000 rx=32000 size=900",
    "worker": "worldlet NetWdt-Async-100 used=100 ready=5 wait=895 vcpu=5",
    "nicworker": "worldlet nic0-rx used=100 ready=5 wait=895 pcpu=1",
    "vector": "vector 64 names=nic0-rx rate=1000 time=50000",
    "more": "",
}


def field(node, key, at, width=8, start=9, **rest):
    """One counter over what the entities made: `rate=` a second, `then=SECOND:VALUE[:RATE]`."""
    more = "".join(f" {name}={value}" for name, value in rest.items())
    return f"field {node} {key} at={at} width={width} start={start}{more}\n"


def sent_drops(**rest):
    return field(269, '"s0" 9', 16, **rest)


def vcpu(number, used):
    return field(770, 10100000 + number, 32, rate=used * 1000)


def line(name, **keys):
    """A line of the quiet host with other values; figures of time are per mille."""
    words = [word for word in QUIET[name].split() if word.split("=")[0] not in keys]
    return {name: " ".join(words + [f"{key}={value}" for key, value in keys.items()])}


def lossy(more="", drops=400, **lines):
    """`web` drops received packets, and its ring ran full; 400 are 1.2 %."""
    return dict(lines, web=QUIET["web"] + " errors=1",
                more=sent_drops() + field(269, '"s0" 9', 88, rate=drops) + more)


F12_IN, F12_OUT = "F12 serious received", "F12 warning sent"
ONE_QUEUE = line("uplink", filters="1,0,0,0")
NIC_LOSS = field(73, '"nic0"', 112, rate=250)
# Title, what differs from the quiet host, its findings, options of lan-meter and of lan-report.
HOSTS = [
    ("quiet", {}, []),
    ("counter went back", {"more": field(269, '"s0" 9', 72, rate=9000, then="15:5")}, ["F0 note values"]),
    ("narrow counter went back", {"more": field(342, '"s0" 9', 96, 4, rate=900, then="15:5")}, ["F0 note values"]),
    ("narrow counter runs fast", {"more": field(342, '"s0" 9', 96, 4, rate=200000000)}, []),
    ("shares of packets", {"more": field(342, '"s0" 9', 0, rate=40000)}, ["F0 note values"]),
    ("port went away", {"more": 'fault get 269 "s0" 9 from=3\n'}, ["F0 note empty"]),
    ("counts", {}, ["F0 warning shares"], "-a"),
    ("counts, and said so", lossy(**line("vm", ready=60)), ["F1 serious received"], "-a", "--counts"),
    ("waits", lossy(drops=40, **line("vm", ready=50)), ["F1 warning received"]),
    ("waits long", lossy(drops=4, **line("vm", ready=100)), ["F1 serious received"]),
    ("co-stopped", lossy(**line("vm", costop=30)), ["F1 serious received"]),
    ("waits a little", lossy(**line("vm", ready=49, costop=29)), [F12_IN]),
    ("waits without loss", line("vm", ready=300), []),
    ("waits, ring never full", {**line("vm", ready=90), "more": field(269, '"s0" 9', 88, rate=400)}, [F12_IN]),
    ("one vcpu", lossy(vcpu(2, 850)), ["F2 serious received"]),
    ("the only vcpu", lossy(**line("vm", vcpus=1, used=900)), ["F2 serious received"]),
    ("two vcpus", lossy(vcpu(2, 850) + vcpu(1, 850) + vcpu(3, 400)), [F12_IN]),
    ("one vcpu nearly", lossy(vcpu(2, 840)), [F12_IN]),
    ("small ring", lossy(), ["F3 serious received"]),
    ("ring of 20 ms", lossy(field(354, '"s0" 9 0', 6, 4, start=640)), [F12_IN]),
    ("worker full", lossy(**line("worker", used=800, wait=195), **line("vm", ready=30)),
     ["F4 serious received", "F4 note stops"]),
    ("worker waits", {**line("worker", ready=50, wait=850), "more": sent_drops(rate=20)}, ["F4 note sent"]),
    ("worker nearly", {**line("worker", used=790, ready=49, wait=161), "more": sent_drops(rate=20)},
     ["F12 note sent"]),
    ("worker stops", {**line("worker", used=900, wait=95), "more": field(341, '"s0" 9', 110, 4, rate=1)},
     ["F4 note stops"]),
    ("worker alone", line("worker", used=900, wait=95), []),
    ("pcpu full", {**line("nicworker", ready=50, wait=850), "pcpus": "pcpu 1 busy=900"}, ["F5 warning whole"]),
    ("other pcpu full", {**line("nicworker", ready=50, wait=850), "pcpus": "pcpu 2 busy=950\npcpu 1 busy=899"}, []),
    ("bound to a vcpu", {**line("worker", ready=50, wait=850), "pcpus": "pcpu 0..3 busy=950"}, []),
    ("link", {"more": field(73, '"nic0"', 32, rate=1)}, ["F6 note link"]),
    ("link nearly", {"more": field(73, '"nic0"', 32, then="25:18") + field(73, '"nic0"', 40, rate=90)}, []),
    ("one queue", {**ONE_QUEUE, **line("vector", time=700000), "more": NIC_LOSS}, ["F6 serious one-queue"]),
    ("one queue, idle", {**ONE_QUEUE, **line("vector", time=690000), "more": NIC_LOSS}, ["F6 serious link"]),
    ("uneven queues", {"more": field(132, '"nic0" 0', 0, 4, rate=90000)}, ["F8 note whole"]),
    ("uneven, few packets", {"more": field(132, '"nic0" 0', 0, 4, rate=89000)}, []),
    ("nearly uneven", {**line("uplink", tx=200000), "more": field(132, '"nic0" 0', 0, 4, rate=399000)}, []),
    ("three queues", {**line("uplink", txqueues=3), "more": field(132, '"nic0" 0', 0, 4, rate=90000)}, []),
    ("retransmits", {"stack": "stack tx=4000 rx=0", "more": field(33, "", 152, rate=32)}, ["F9 warning tcp"]),
    ("retransmits a little", {"stack": "stack tx=4000 rx=0", "more": field(33, "", 152, rate=31)}, []),
    ("retransmits seldom", {"stack": "stack tx=900 rx=0", "more": field(33, "", 152, rate=9)}, []),
    ("reader too slow", {"more": field(34, "", 56, rate=2)}, ["F9 warning udp"]),
    ("reader nearly", {"more": field(34, "", 56, rate=1)}, []),
    ("small packets", line("web", rx=200000, size=128), ["F10 note whole"]),
    ("not so small", line("web", rx=200000, size=129), []),
    ("not so many", line("web", rx=199000, size=64), []),
    ("overhead", line("self", used=100), ["F11 warning overhead"]),
    ("overhead nearly", line("self", used=99), []),
    ("loss both ways", lossy(sent_drops(rate=160), **line("vm", ready=60)), ["F1 serious received", F12_OUT]),
    ("one packet", {"more": sent_drops(rate=1), **line("web", tx=900)}, [F12_OUT]),
    ("less than one", {"more": sent_drops(then="9:18"), **line("web", tx=9)}, []),
    ("too small a share", {"more": sent_drops(rate=1)}, []),
    ("three records", {"more": sent_drops(then="25:900 then=35:1800 then=45:2700")}, [F12_OUT], "-n 90"),
    ("two records", {"more": sent_drops(then="25:900 then=35:1800")}, [], "-n 90"),
]


def run(*arguments, text=None, expected=0):
    done = subprocess.run([BUILD / "lan-report", "summary", *arguments], input=text, capture_output=True, text=True)
    assert done.returncode == expected, (arguments, done.returncode, done.stderr)
    return done.stdout


def report(lines, options):
    meter("\n".join({**QUIET, **lines}.values()), options)


def meter(host, options):
    """Of a described host, or of the built-in one, whose description is empty."""
    pathlib.Path("host.txt").write_text(host)
    environment = dict(os.environ, LD_PRELOAD=BUILD / "libfixed_clock.so", COREKIT_HOST="host.txt" if host else "demo",
                       ASAN_OPTIONS="verify_asan_link_order=0")
    arguments = f"-A -t vqiW -i 10 -n 6 -o report.json {options}".split()
    done = subprocess.run([BUILD / "lan-meter", *arguments], env=environment, capture_output=True, text=True)
    assert done.returncode == 0, (arguments, done.stderr)


def names(summary):
    return sorted(f"{found['rule']} {found['severity']} {found['aspect']}" for found in summary["findings"])


def check(title, found, wanted):
    assert found == wanted, f"{title}: {found}, not {wanted}"


def test_hosts():
    for title, lines, wanted, *options in HOSTS:
        collector, reader = options + [""] * (2 - len(options))
        report(lines, collector)
        check(title, names(json.loads(run("--json", *reader.split(), "report.json"))), sorted(wanted))


def port(number=1, name="tap0", **keys):
    return dict({"name": name, "switch": "s", "id": number, "uplink": "false"}, **keys)


def records(ports, count=6, step=10, host="h", **keys):
    """Lines of `records`; ports is a list, or a function of the record's number that makes one."""
    for number in range(count):
        record = {"host": host, "time": 1700000000 + step * number, "interval": step, "iteration": number}
        yield dict(record, ports=ports(number) if callable(ports) else ports, **keys)


def summary(lines, *arguments, expected=0):
    return json.loads(run("--json", *arguments, text="".join(json.dumps(line) + "\n" for line in lines),
                          expected=expected))


def uplink(mbps, stops=5):
    return lambda number: [port(2, "nic0", uplink="true", physnic={"txmbps": mbps(number), "txpps": 1000},
                                txqueue={"count": 1, "details": [{"pps": 9, "eps": 0, "qstops": stops}], "active": 0})]


def at_times(*times):
    return [dict(record, time=time) for record, time in zip(records([], len(times)), times)]


def vm_port(number, name, drops, ready):
    return port(number, name, rxpps=10000, rxeps=drops, vnic={"type": "parlan3", "ring1sz": 512, "r1full": 1},
                vcpu=[{"id": 18446744073709551615, "used": 9, "ready": ready, "cstp": 0},
                      {"id": 18446744073709551614, "used": 9, "ready": 0, "cstp": 0}])


def mixed(number):
    """Loss in three records of ninety, of which two have a cause and one has none."""
    return [vm_port(1, "web", 200 if number in (4, 5, 6) else 0, 7 if number < 6 else 3)]


def rare(number):
    """Serious in two records of ninety, a warning in five."""
    return [port(rxpps=10000, rxeps=200 if number < 2 else 20 if number < 5 else 0)]


top = [100 * (number % 9) for number in range(20)]
shared = [vm_port(3, "web", 50, 8), vm_port(4, "web", 90, 8)]
wide = {"name": "big", "used": 90, "ready": 0, "wait": 10, "afftype": "pcpu", "affval": -1}
RECORDS = [
    ("late record", at_times(0, 10, 20, 36), ["F11 note gaps"]),
    ("record nearly late", at_times(0, 10, 20, 35), []),
    ("seconds cut", at_times(0, 1, 3, 4), []),
    ("time went back", at_times(0, 10, 5, 15), ["F0 note times"]),
    ("flat top", records(uplink(lambda n: min(1000, 150 * n)), 20), ["F7 warning whole"]),
    ("no stops", records(uplink(lambda n: min(1000, 150 * n), 0), 20), []),
    ("a peak", records(uplink(lambda n: 100 * n), 20), []),
    ("level", records(uplink(lambda n: 1000), 20), []),
    ("link's speed", records(uplink(lambda n: 900, 0), 20), ["F7 warning whole"], "--link-mbps=1000"),
    ("link's speed nearly", records(uplink(lambda n: 899), 20), [], "--link-mbps=1000"),
    ("no figures", records([port()]), []),
    ("tap without a vnic", records([port(rxpps=1000, rxeps=20, vcpu=[{"id": 5, "used": 9, "ready": 30, "cstp": 0}])]),
     ["F12 serious received"]),
    ("one VM", records(shared), ["F1 warning received"]),
    ("one worker", records([port(n, f"p{n}", txpps=1000, txeps=20, wdt=[wide]) for n in (1, 2)]), ["F4 serious sent"]),
    ("two hosts", [*records(shared), *records(shared, host="g")], ["F1 warning received"] * 2),
    ("suspect loss", records([port(rxpps=1000, rxeps=1.8e19)]), ["F0 note values"]),
    ("between rules", records(mixed, 90), ["F12 serious received"]),
    ("a level too rare", records(rare, 90), ["F12 warning received"]),
    ("another port", records(shared), [], "-p7"),
    ("another time", records(shared), [], "--to=2000-01-01"),
    ("numbers without end", [{"host": "h", "time": n, "interval": n, "iteration": n, "ports": [port(n % 5, rxpps=n)]}
                             for n in (2**63 - 1, -2**63, 2**63 - 1)], ["F0 note times", "F0 note values"]),
]


def test_records():
    for title, lines, wanted, *options in RECORDS:
        check(title, names(summary(lines, *options)), wanted)


def test_values():
    """What a finding says, worked out by hand."""
    lines = [dict(record, ports=[vm_port(3, "web", 20 * n, 8), vm_port(4, "db", 200, 8)])
             for n, record in enumerate(records([], 3))]
    found = summary(lines, "-n1")["findings"][0]
    check("port", (found["port"]["id"], [other["id"] for other in found["others"]]), ("4", ["3"]))
    check("vcpu", found["vcpu"], str(2**64 - 1))
    check("counts", (found["records"], found["records_of"], found["lost"]), (3, 3, 10 * (600 + 20 + 40)))
    check("share", round(found["share"], 6), round(100 * 6600 / (6600 + 6 * 100000 - 100000), 6))
    check("worst", found["worst"]["time"], 1700000000)
    check("key", found["worst"]["values"]["vnic.r1full"], 1)
    check("severity", found["severity"], "serious")
    run("--exit-code", text=json.dumps(lines[0]), expected=3)
    run("--exit-code", text=json.dumps(at_times(0)[0]))


def test_silence():
    """What could not be judged is said, and no more than that."""
    report({}, "")
    missing = json.loads(run("--json", "report.json"))["not_judged"]
    check("all letters", [kind["rules"] for kind in missing], ["F7"])
    told = {missing["rules"].split(",")[0] for missing in summary(records([port()]))["not_judged"]}
    check("a tap", told, {"F1 F2 F3", "F4 F5", "F6 F7 F8", "F9"})
    assert "Nothing found" in run(text="".join(json.dumps(line) + "\n" for line in records([port()])))


def test_text():
    """A line as it is pasted; names can't steer a terminal, and stand in quotes where they are not plain."""
    names_of = {"a b": '"a b"', "\x1b[31m": '"\\x1b[31m"',
                '"\\': '"\\"\\\\"', "": '""', "\u202eweb": '"\\u{202e}web"',
                "n\u00e4": "n\u00e4", "x\n!! y": '"x\\x0a!! y"'}
    for name, shown in names_of.items():
        text = run(text=json.dumps(next(records([port(1, name, txpps=198, txeps=2)]))))
        assert f"\n!! {shown} (1) loses 1 % of sent packets in 1 of 1 record, 20 in all, which" in text, (name, text)
        check("JSON", summary(records([port(1, name, txpps=98, txeps=2)]))["findings"][0]["port"]["name"], name)
    meter((DATA / "trouble.host").read_text(), "-n 60")
    check("text", run("report.json"), (DATA / "trouble.txt").read_text())


def test_demo():
    """The built-in host has two things wrong, and nothing else."""
    meter("", "")
    findings = json.loads(run("--json", "report.json"))["findings"]
    check("demo", [found["rule"] + " " + found["port"]["name"] for found in findings], ["F1 db1", "F8 nic1"])


def test_interrupted():
    """A run without an end has its summary when it is interrupted."""
    lines = [json.dumps(line).encode() + b"\n" for line in records(shared)]
    with subprocess.Popen([BUILD / "lan-report", "summary"], stdin=subprocess.PIPE, stdout=subprocess.PIPE) as reader:
        reader.stdin.write(b"".join(lines[:3]))
        reader.stdin.flush()
        while struct.unpack("i", fcntl.ioctl(reader.stdin, termios.FIONREAD, b"1234"))[0]:
            time.sleep(0.01)
        reader.send_signal(signal.SIGTERM)
        reader.stdin.write(lines[3])
        reader.stdin.flush()
        text = reader.stdout.read().decode()
    assert " of 10 s" in text and "[F1]" in text and reader.returncode == 0, (reader.returncode, text)


def test_rules():
    """Every rule stands in the table, with figures for its thresholds, and so in the manual."""
    rules = json.loads(run("--rules", "--json"))
    check("numbers", [rule["number"] for rule in rules["rules"]], [f"F{number}" for number in range(13)])
    manual = " ".join(MANUAL.read_text().split())
    keys = ("condition", "reason", "wrong_if", "try")
    for text in [rules["loss"]] + [rule[key] for rule in rules["rules"] for key in keys]:
        assert text in manual, f"the manual does not say: {text}"
    text = run("--rules")
    assert "{" not in text.replace("{}", "") and "ready from 5 % (serious from 10)" in text, text


if __name__ == "__main__":
    with tempfile.TemporaryDirectory() as directory:
        os.chdir(directory)
        for test in (test_hosts, test_records, test_values, test_silence, test_text, test_demo, test_interrupted,
                     test_rules):
            test()

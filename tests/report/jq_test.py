#!/usr/bin/python3
"""Holds `lan-report records` against jq on reports of random hosts: `jq_test.py BUILD-DIRECTORY`.

Also what the program does as a process: files for the hours, ports as lines, a closed pipe, signals, -o.
"""
import json
import os
import pathlib
import random
import shutil
import signal
import subprocess
import sys
import tempfile
import time

BUILD = pathlib.Path(sys.argv[1]).resolve()
LINES = ".sysinfo.hostname as $h | .stats[] | {host:$h} + ."
REPORTS = 200
# What tells that each section was there, in each of its forms.
KEYS = {"ring2sz", "maxpend", "coalesce", "hck", "hckcall", "txwdt", "physnic", "txqueue", "rxqueue", "intr", "ipv4",
        "udp", "wdt", "vcpu", "buckets", "pktintervalout"}


def meter(host, arguments, **more):
    pathlib.Path("host.txt").write_text(host)
    return subprocess.Popen([BUILD / "lan-meter", *arguments.split()], stdout=subprocess.PIPE,
                            env=dict(os.environ, COREKIT_HOST="host.txt"), **more)


def report(*arguments, **more):
    return subprocess.run([BUILD / "lan-report", *arguments], capture_output=True, **more)


def random_host(dice):
    """A described host, and letters for it."""
    name = "".join(dice.choice("abcxyz-_. 09\u00e9\u4e2d") for _ in range(dice.randrange(12)))
    lines = [f'host name="{name}" pcpus={dice.choice([1, 2, 8, 64])} packages=1 cores=1', "stack tx=9 rx=7"]
    for vm in range(dice.randrange(3)):
        lines.append(f"vm vm{vm} leader={9000 + 100 * vm} vcpus={dice.randrange(1, 9)} used={dice.randrange(1000)}")
        lines += [f"worldlet NetWdt-Async-{9000 + 100 * vm}-{i} used={dice.randrange(500)} pcpu={i}"
                  for i in range(dice.randrange(4))]
    vms = [line.split()[1] for line in lines if line.startswith("vm ")]
    for switch in range(dice.randrange(1, 4)):
        lines.append(f"switch s{switch}")
        for port in range(dice.randrange(1, 9)):
            keys = f"switch=s{switch} port={1000 * switch + port + 2} tx={dice.randrange(10**6)} errors={dice.choice([0, 0, 3])}"
            kind = dice.randrange(4)
            if kind == 0 and vms:
                model = dice.choice(["parlan2", "parlan3", "5"])
                lines.append(f"vnic {keys} vm={dice.choice(vms)} model={model} scheme={dice.randrange(4)}")
            elif kind == 1:
                queues = dice.randrange(5)
                filters = ",".join(str(dice.randrange(3)) for _ in range(queues)) or "0"
                lines.append(f"uplink {keys} nic=n{switch}{port} device=d txqueues={queues} rxqueues={max(queues, 1)} "
                             f"filters={filters}")
                lines.append(f"vector {switch * 10 + port} names=n{switch}{port} rate=5 time=3")
            elif kind == 2:
                lines.append(f"hostnic {keys} name=h{switch}{port}")
            else:
                lines.append(f"plain {keys} type={dice.choice([2, 3, 7])} client=c{port}")
    letters = "".join(letter for letter in "cChqivWV" if dice.randrange(2))
    return "\n".join(lines) + "\n", letters


def agrees_with_jq():
    dice = random.Random(4711)
    with open("all.json", "wb") as file:
        for _ in range(REPORTS):
            host, letters = random_host(dice)
            arguments = f"-A -i 0 -n {dice.randrange(1, 4)}" + (f" -t {letters}" if letters else "")
            file.write(meter(host, arguments).communicate()[0])
    done = report("records", "all.json")
    assert done.returncode == 0 and not done.stderr, done.stderr
    ours = subprocess.run(["jq", "-cS", "."], input=done.stdout, capture_output=True, check=True).stdout
    theirs = subprocess.run(["jq", "-cS", LINES, "all.json"], capture_output=True, check=True).stdout
    assert ours.count(b"\n") >= REPORTS and ours == theirs, "jq reads other records"
    seen = {key for key in KEYS if f'"{key}"'.encode() in ours}
    assert seen == KEYS, f"no report has {KEYS - seen}"
    for ours, theirs in zip(done.stdout.splitlines(), theirs.splitlines()):
        assert list(json.loads(ours))[:4] == ["host", "time", "interval", "iteration"], ours[:99]
    ports = report("records", "--ports", "all.json").stdout
    there = subprocess.run(["jq", "-cS", f"{LINES} | . as $r | .ports[] | select(. != {{}}) | "
                            "{time:$r.time,host:$r.host,iteration:$r.iteration} + .", "all.json"],
                           capture_output=True, check=True).stdout
    assert subprocess.run(["jq", "-cS", "."], input=ports, capture_output=True, check=True).stdout == there
    assert ports.startswith(b'{"time": '), ports[:99]


HOST = """host name=h pcpus=1 packages=1 cores=1
switch s
plain switch=s port=7 type=2 client="a\\"b" tx=5
plain switch=s port=8 type=2 client=c tx=5
"""


def a_closed_pipe_is_no_error():
    text = b"".join(json.dumps({"host": "h", "time": i}).encode() + b"\n" for i in range(50000))
    pathlib.Path("lines").write_bytes(text)
    reader = subprocess.Popen([BUILD / "lan-report", "records", "lines"], stdout=subprocess.PIPE,
                              stderr=subprocess.PIPE)
    reader.stdout.close()
    assert not reader.stderr.read() and reader.wait() == 0


def hours_and_signals():
    """A pipe as in an unattended run, ended by one signal for both."""
    os.mkdir("hours")
    source = meter(HOST, "-A -i 0 -n 0")
    reader = subprocess.Popen([BUILD / "lan-report", "records", "--split", "hour", "-o", "hours"], stdin=source.stdout,
                              stderr=subprocess.PIPE)
    source.stdout.close()
    while sum(file.stat().st_size for file in pathlib.Path("hours").iterdir()) < 10000:
        assert reader.poll() is None
    reader.send_signal(signal.SIGTERM)
    source.send_signal(signal.SIGTERM)
    told = reader.communicate()[1]
    assert source.wait() == 1 and reader.returncode == 0, told
    files = sorted(pathlib.Path("hours").glob(f"lan-????????T??Z-{reader.pid}.ndjson"))
    records = [json.loads(line) for file in files for line in file.read_text().splitlines()]
    assert 1 <= len(files) <= 2 and [record["iteration"] for record in records] == list(range(len(records)))
    assert records[0]["ports"][0]["name"] == 'a"b'
    lines = b"".join(json.dumps({"host": "h", "time": time}).encode() + b"\n" for time in (7199, 7200, 7300, 7199, -1))
    os.mkdir("back")
    assert report("records", "--split", "hour", "-o", "back", input=lines).returncode == 0
    names = sorted(file.name.replace(file.name.split("-")[2].split(".")[0], "P") for file in
                   pathlib.Path("back").iterdir())
    assert names == ["lan-19691231T23Z-P.ndjson", "lan-19700101T01Z-P-2.ndjson", "lan-19700101T01Z-P.ndjson",
                     "lan-19700101T02Z-P.ndjson"], names


def output_is_put_into_its_place():
    pathlib.Path("out").write_text("before")
    os.symlink("out", "link")
    pathlib.Path("cut.json").write_bytes(meter(HOST, "-A -i 0 -n 2").communicate()[0][:-60])
    done = report("records", "-o", "link", "cut.json")
    assert done.returncode == 0 and b"is cut" in done.stderr, done.stderr
    assert pathlib.Path("out").read_text().count("\n") == 1 and os.path.islink("link")
    assert report("records", "-o", "/dev/stdout", "cut.json").stdout == pathlib.Path("out").read_bytes()
    assert report("records", "-o", ".", "cut.json").returncode == 1
    for command in ("records", "table", "summary"):
        reader = subprocess.Popen([BUILD / "lan-report", command, "-o", "new"], stdin=subprocess.PIPE)
        state = pathlib.Path(f"/proc/{reader.pid}/stat")
        while not list(pathlib.Path().glob("new.*")) or ") S " not in state.read_text():
            assert reader.poll() is None
        while reader.poll() is None:  # the first one waits for input, and two at once may come as one
            reader.terminate()
            time.sleep(0.05)
        assert reader.wait() == -signal.SIGTERM and not list(pathlib.Path().glob("new*")), command
    done = report("records", "--from", "1970-01-02", "--ports", "-p", "8", "-p", "9", "cut.json")
    assert b'"name": "c"' in done.stdout and b'"name": "a' not in done.stdout and b"port 9" in done.stderr, done
    assert report("records", "--to", "1", "cut.json").stdout == b""
    assert report("records", "-p", "8", "cut.json").returncode == 2


with tempfile.TemporaryDirectory() as directory:
    os.chdir(directory)
    a_closed_pipe_is_no_error()
    hours_and_signals()
    output_is_put_into_its_place()
    if shutil.which("jq") is None:
        print("skipped: jq is not installed")
        sys.exit(77)
    agrees_with_jq()

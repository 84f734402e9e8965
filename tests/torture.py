#!/usr/bin/env python3
"""Breaks every operation of a rich run, one by one, and holds each run to what the program promises.

torture.py [--quick] BUILD: the directory with lan-meter, libcorekit.so, libfixed_clock.so, lan-meter-libc-faults.
The host is the built-in one, all ports, all statistics, under a clock that moves only when the program waits, so that
a fault-free run is the same each time. The quick form takes every so-manieth case. Exit status 1 if a promise broke.
"""
import collections
import concurrent.futures
import json
import os
import random
import re
import signal
import subprocess
import sys
import tempfile
import time

ARGUMENTS = ["-A", "-t", "vqiWcCQhV", "-i", "1", "-n", "2"]
QUICK = "--quick" in sys.argv
BUILD = os.path.abspath(sys.argv[-1])
SIGNALS = (signal.SIGINT, signal.SIGTERM, signal.SIGHUP)
MESSAGE = re.compile(
    rb"(Log[012](?: Status: [\w ]+\. Message)?: |Panic: |Unable to |No Space in buffer|SchedStatsPcpuStats: |"
    rb"If you histograms|\t1\. Let |0x[0-9a-f]+: md5 signature mismatch)"
)
SOURCE = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..")
with open(os.path.join(SOURCE, "corekit/default_host.cpp"), encoding="utf-8") as text:
    HOST = text.read().split('R"(', 1)[1].split(')"', 1)[0]

Result = collections.namedtuple("Result", "status out err journal trace seconds")


def run(directory, program="lan-meter", host="", arguments=(), preload=True, wrapper=(), environment=None, act=None):
    """One run in a directory of its own. `act` is handed the process while it runs."""
    with open(os.path.join(directory, "host"), "w", encoding="utf-8") as file:
        file.write(HOST + "\n" + host + "\n")
    for name in ("journal", "trace"):
        if os.path.exists(os.path.join(directory, name)):
            os.unlink(os.path.join(directory, name))
    variables = {"COREKIT_HOST": "host", "COREKIT_JOURNAL": "journal",
                 "ASAN_OPTIONS": "exitcode=99:verify_asan_link_order=0", "UBSAN_OPTIONS": "halt_on_error=1",
                 **(environment or {})}
    if preload:
        variables["LD_PRELOAD"] = os.path.join(BUILD, "libfixed_clock.so")
    command = [*wrapper, *(f"-E{k}={v}" for k, v in variables.items() if wrapper), os.path.join(BUILD, program),
               *ARGUMENTS, *arguments]
    start = time.monotonic()
    process = subprocess.Popen(command, cwd=directory, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                               stderr=subprocess.PIPE, env={**os.environ, **({} if wrapper else variables)})
    if act:
        act(process)
    try:
        out, err = process.communicate(timeout=60)
    except subprocess.TimeoutExpired:
        process.kill()
        out, err = process.communicate()
        err += b"\nHUNG"
    files = []
    for name in ("journal", "trace"):
        path = os.path.join(directory, name)
        files.append(open(path, encoding="utf-8").read() if os.path.exists(path) else "")
    return Result(process.returncode, out, err, *files, time.monotonic() - start)


def ports(document):
    return [[port.get("id") for port in record["ports"]] for record in document["stats"]]


def left_on(journal):
    """What the writes that succeeded leave on in the kernel."""
    state = {}
    for line in journal.splitlines():
        words = line.split(" -> ")
        target, _, values = words[0].partition(" : ")
        if words[1] != "0x0":
            continue
        if "TrackHistos" in target:
            state[target] = values != "0"
        else:
            operation, direction = values.split()
            state[target + direction] = operation != '"stop"'
    return [target for target, on in state.items() if on]


def broken(result, reference, torn_down=None):
    """The promises that a run broke, each as a text."""
    found = []
    if result.status not in (0, 1):
        found.append(f"exit status {result.status}")
    if b"Sanitizer" in result.err or b"runtime error" in result.err or b"HUNG" in result.err:
        found.append("sanitizer or hang: " + result.err[-2000:].decode(errors="replace"))
    strange = [line for line in result.err.splitlines() if line and not MESSAGE.search(line)]
    if strange:
        found.append(f"not a message of the system: {strange[0]}")
    if result.status == 0:
        try:
            for expected, seen in zip(ports(json.loads(reference.out)), ports(json.loads(result.out))):
                kept = [number for number in seen if number is not None]
                if kept != [number for number in expected if number in kept]:
                    found.append(f"order of ports: {seen}")
        except ValueError as error:
            if b"Unable to write" not in result.err:
                found.append(f"not JSON: {error}")
    # A write that fails is logged and nothing can follow it: its histograms stay as they are.
    excused = b"Histogram op" in result.err or b"Disabling forever" in result.err or b"Panic" in result.err
    if (result.status == 0 if torn_down is None else torn_down) and not excused and left_on(result.journal):
        found.append(f"left on: {left_on(result.journal)[:3]}")
    return found


def every(cases, sample):
    return cases[:: max(1, len(cases) // sample)] if QUICK else cases


def library_calls(directory, reference):
    """Each library call fails once, and again with all calls behind it."""
    kinds = ("get", "list", "set", "create", "add")
    total = sum(line.startswith(kinds) for line in reference.trace.splitlines())
    cases = [f"fault any {when}={n}" for n in range(1, total + 1) for when in ("nth", "from")]
    return total, every(cases, 400), lambda where, case: broken(run(where, host=case), reference)


def c_library_calls(directory, reference):
    run(directory, "lan-meter-libc-faults", arguments=["-o", "report"], environment={"LIBC_COUNTS": "counts"})
    with open(os.path.join(directory, "counts"), encoding="utf-8") as file:
        counts = {name: int(count) for name, count in (line.split() for line in file)}
    counts["short"] = counts["interrupted"] = counts["write"]
    cases = [f"{name} {n}" for name, count in counts.items() for n in range(1, count + 1)]

    def check(where, case):
        result = run(where, "lan-meter-libc-faults", arguments=["-o", "report"], environment={"LIBC_FAULT": case})
        found = broken(result._replace(out=reference.out), reference)
        silent = not result.err or (result.status == 0 and b"Unable" not in result.err and b"cannot" not in result.err)
        if silent and case != "open 1":
            found.append("a failure without a word")
        if case.startswith("malloc") and (result.status != 1 or b"failed" not in result.err) and b"hostname" not in result.err:
            found.append(f"memory exhausted, yet status {result.status}")
        return found

    return sum(counts.values()), cases, check


def interrupted(result, reference, ends):
    """A run that a signal met."""
    found = broken(result, reference, torn_down=result.status in (0, 1))
    if result.status == 1 and (len(result.out) not in ends or not reference.out.startswith(result.out)):
        found.append(f"cut inside a text, at {len(result.out)}")
    if result.status == 1 and result.err:
        found.append(f"a message: {result.err[:200]}")
    return found


def signals_at_library_calls(directory, reference):
    total, _, _ = library_calls(directory, reference)
    ends = text_ends(directory)
    cases = [(number, n) for n in range(1, total + 1) for number in SIGNALS]

    def check(where, case):
        return interrupted(run(where, host=f"fault any nth={case[1]} signal={int(case[0])}"), reference, ends)

    return total, every(cases, 200), check


def text_ends(directory):
    """Where a cut may lie: the ends of the writes of a fault-free run."""
    traced = run(directory, wrapper=("strace", "-qq", "-f", "-o", "strace", "-e", "trace=write"),
                 environment={"ASAN_OPTIONS": "detect_leaks=0:verify_asan_link_order=0"})
    ends, position = {0}, 0
    with open(os.path.join(directory, "strace"), encoding="utf-8", errors="replace") as file:
        for line in file:
            size = re.search(r"write\(1,.*= (\d+)$", line)
            if size:
                position += int(size.group(1))
                ends.add(position)
    assert position == len(traced.out), "the fault-free run was not traced"
    return ends


def signals_at_system_calls(directory, reference):
    ends = text_ends(directory)
    leaks_off = {"ASAN_OPTIONS": "detect_leaks=0:exitcode=99:verify_asan_link_order=0"}
    run(directory, wrapper=("strace", "-qq", "-f", "-o", "strace"), environment=leaks_off)
    with open(os.path.join(directory, "strace"), encoding="utf-8", errors="replace") as file:
        calls = [line for line in file if re.search(r"^\d+ +\w+\(", line)]
    # Ahead of the handlers a signal has its default action; the handlers are there when SIGPIPE is ignored.
    ready = next(n for n, line in enumerate(calls) if "SIGPIPE" in line) + 2
    cases = [(number, n) for n in range(ready, len(calls)) for number in SIGNALS]

    def check(where, case):
        injected = f"inject=all:signal={int(case[0])}:when={case[1]}"
        result = run(where, wrapper=("strace", "-qq", "-f", "-o", "/dev/null", "-e", injected), environment=leaks_off)
        return interrupted(result, reference, ends)

    return len(calls), every(cases, 60), check


def signals_at_random(directory, reference):
    """Thousands of moments from the first microsecond on, some twice, some with a reader that takes nothing."""
    ends = text_ends(directory)
    generator = random.Random(1)
    cases = [(generator.choice(SIGNALS), generator.random() * 0.03, generator.random() < 0.3, generator.random() < 0.3)
             for _ in range(100 if QUICK else 4000)]

    def check(where, case):
        number, moment, twice, stalled = case

        def act(process):
            time.sleep(moment)
            process.send_signal(number)
            if twice:
                process.send_signal(number)
            sent = time.monotonic()
            while stalled and process.poll() is None and time.monotonic() - sent < 5:
                time.sleep(0.001)
            late.append(time.monotonic() - sent)

        late = []
        # Endless, so that only the signal ends it, and more than a pipe takes, so that a stalled reader shows.
        result = run(where, arguments=["-n", "0"] if stalled else [], act=act)
        # Ahead of the handlers the default action ends the process, which has then written nothing.
        if result.status == -number and not result.out and not result.journal:
            return []
        if stalled:
            result = result._replace(out=b"")
        return interrupted(result, reference, ends) + (["took over a second"] if late and late[0] > 1 else [])

    return len(cases), cases, check


def main():
    faults = 0
    print(f"{'operations made to fail or interrupted':42}{'operations':>12}{'runs':>8}{'faults':>8}")
    with tempfile.TemporaryDirectory() as directory, concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        reference = run(directory, environment={"COREKIT_TRACE": "trace"})
        assert reference.status == 0 and not reference.err, reference.err
        assert reference.journal and not broken(reference, reference), broken(reference, reference)

        def worker(check, case):
            with tempfile.TemporaryDirectory(dir=directory) as where:
                return check(where, case)

        for plan in (library_calls, c_library_calls, signals_at_library_calls, signals_at_system_calls,
                     signals_at_random):
            total, cases, check = plan(directory, reference)
            results = list(pool.map(lambda case, check=check: worker(check, case), cases))
            bad = [(case, found) for case, found in zip(cases, results) if found]
            print(f"{plan.__name__.replace('_', ' '):42}{total:12}{len(cases):8}{len(bad):8}", flush=True)
            for case, found in bad[:5]:
                print(f"  {case}: {'; '.join(found)}")
            faults += len(bad)
    sys.exit(1 if faults else 0)


main()

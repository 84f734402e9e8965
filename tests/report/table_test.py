#!/usr/bin/env python3
"""The rows of all tables, joined again, are the records that they came from; other forms and figures agree with them."""
import csv
import io
import json
import math
import os
import pty
import random
import subprocess
import sys
import tempfile

BUILD = sys.argv[1]
SECTIONS = "ports vnic physnic txqueue rxqueue intr vcpu wdt pcpu histograms hoststack overhead".split()
HOSTILE = ['a"b', "c,d", "e\tf\\n", "g\nh", "", "\x1b[31mred", "</script>", "=1+1", "漢字", "é\u0301", "\u202eabc", "\u009b7m"]


def run(*words, data=b"", status=0):
    done = subprocess.run([f"{BUILD}/lan-report", "table", *words], input=data, capture_output=True, check=False)
    assert done.returncode == status, (words, done.returncode, done.stderr[-500:])
    return done.stdout.decode()


class Number(str):
    """A number as it stands in a report."""


def text_of(value):
    if isinstance(value, Number):
        return str(value)
    if isinstance(value, dict):
        return "{" + ", ".join(json.dumps(k) + ": " + text_of(v) for k, v in value.items()) + "}"
    return "[" + ",".join(map(text_of, value)) + "]" if isinstance(value, list) else json.dumps(value)


def read(line):
    return json.loads(line, parse_int=str, parse_float=str)


class Host:
    """Random records by the schema, of one host whose ports come and go."""

    def __init__(self, dice, name):
        schema = json.load(open(f"{os.path.dirname(__file__)}/../../docs/report.schema.json", encoding="utf-8"))
        self.dice, self.name, self.defs, self.iteration = dice, name, schema["$defs"], 0
        self.ports = [self.port(i) for i in range(dice.randrange(1, 9))]

    def value(self, rule, key=""):
        dice = self.dice
        if "$ref" in rule:
            rule = {**self.defs[rule["$ref"].rsplit("/", 1)[1]], **{k: v for k, v in rule.items() if k != "$ref"}}
        if "oneOf" in rule:
            return self.value(dice.choice(rule["oneOf"]))
        if "const" in rule:
            return rule["const"] if isinstance(rule["const"], str) else Number(rule["const"])
        if "enum" in rule:
            return dice.choice(rule["enum"])
        if rule["type"] == "object":
            keys = [k for k in rule.get("properties", {}) if k in rule.get("required", []) or dice.random() < 0.6]
            return {k: self.value(rule["properties"][k], k) for k in keys}
        if rule["type"] == "array":
            if "prefixItems" in rule:
                return [self.value(r) for r in rule["prefixItems"]]
            least = rule.get("minItems", 0)
            return [self.value(rule["items"]) for _ in range(dice.randrange(least, max(least, min(rule.get("maxItems", 4), 4)) + 1))]
        if rule["type"] == "string":
            return "02:0a:02:00:00:02" if key == "mac" else dice.choice(HOSTILE)
        if rule["type"] == "integer":
            return Number(dice.choice([0, 7, dice.randrange(1 << 31), rule.get("maximum", 10**19), rule.get("minimum", 0)]))
        return Number(dice.choice(["0.00", "12.50", "-3.10", "18446744073709551616.00"]).lstrip("-" if "minimum" in rule else ""))

    def port(self, place):
        port = self.value({"$ref": "#/$defs/port"})
        port["id"] = Number(50331650 + place)  # what tells rows of ports apart
        for i, vcpu in enumerate(port.get("vcpu", [])):
            vcpu["id"] = Number((1 << 64) - 1 - i)
            for histogram in vcpu.get("histos", {}).get("values", []):
                histogram["values"] = [Number(j) for j in range(len(vcpu["histos"]["buckets"]))]
        return port

    def record(self):
        self.iteration += 1
        ports = [{} if self.dice.random() < 0.2 else self.port(i) for i in range(len(self.ports))]
        record = self.value({"$ref": "#/$defs/record"})
        record.update(time=Number(1795416700 + self.iteration), iteration=Number(self.iteration), ports=ports)
        return {"host": self.name, **record}


def put(target, flat, prefixes):
    for key, value in flat.items():
        parts = key.split(".")
        if parts[0] in prefixes:
            inner = target
            for part in parts[:-1]:
                inner = inner.setdefault(part, {})
            inner[parts[-1]] = value


def histogram_of(rows, pairs):
    head = {k.split(".")[1]: rows[0][k] for k in rows[0] if k.startswith("histos.") and k[7:] not in ("limit", "value")}
    rows = [row for row in rows if "histos.value" in row]
    return {**head, "values": [[r["histos.limit"], r["histos.value"]] if pairs else r["histos.value"] for r in rows]}


def rebuild(rows):
    """One record of its rows in all tables."""
    overhead = rows["overhead"][0]
    record = {"host": overhead["host"], "interval": overhead["interval"], "iteration": overhead["iteration"]}
    record["overhead"] = {"used": overhead["overhead.used"]}
    put(record, {k: v for k, v in rows["pcpu"][0].items() if "topology" in k}, ["cpu"])
    for key in ("used", "wdt"):
        record["cpu"][key] = [r["cpu." + key] for r in rows["pcpu"] if "cpu." + key in r]
    record["ports"] = []
    for flat in rows["ports"]:
        mine = {s: [r for r in rows[s] if "id" in r and r["id"] == flat.get("id")] for s in SECTIONS}
        port = {k: v for k, v in flat.items() if k not in ("time", "host", "interval", "iteration")}
        record["ports"].append(port if "mac" in port else {})
        for section in ("vnic", "physnic", "intr", "hoststack"):
            for row in mine[section]:
                put(port, row, "coalesce txwdt vnic physnic intr ipv4 ipv6 tcptx tcprx udp".split())
        for kind in ("txqueue", "rxqueue"):
            queues = [{k.split(".")[1]: v for k, v in r.items() if k.startswith(kind)} for r in mine[kind]]
            if queues:
                port[kind] = {k: queues[0][k] for k in ("count", "active", "filters", "ports") if k in queues[0]}
                queues = [q for q in queues if "queue" in q]
                port[kind]["details"] = [q["details"].split() if kind == "rxqueue" else
                                         {k: q[k] for k in ("pps", "eps", "qstops")} for q in queues]
        for kind in ("wdt", "vcpu"):
            if mine[kind]:
                port[kind] = [{k.split(".")[1]: v for k, v in r.items() if k.startswith(kind + ".")} for r in mine[kind]]
        for owner, target in [(None, port)] + [(v["id"], v) for v in port.get("vcpu", [])]:
            groups = []
            for row in (r for r in mine["histograms"] if r.get("vcpu.id") == owner):
                if not groups or groups[-1][0]["histos.name"] != row["histos.name"]:
                    groups.append([])
                groups[-1].append(row)
            if groups and owner is None:
                port["histos"] = [histogram_of(g, True) for g in groups]
            elif groups:
                target["histos"] = {"buckets": [r["histos.limit"] for r in groups[0] if "histos.limit" in r],
                                    "values": [histogram_of(g, False) for g in groups]}
    return record


def tables_of(data):
    return {s: [read(line) for line in run("-s", s, "--json", data=data).split("\n")[:-1]] for s in SECTIONS}


def check_join(data, records):
    tables = tables_of(data)
    found = {}
    for section, rows in tables.items():
        for row in rows:
            key = row["host"], row["iteration"]
            found.setdefault(key, {s: [] for s in SECTIONS})[section].append(row)
    assert len(found) == len(records)
    for rows, record in zip(found.values(), records):
        time = record.pop("time")
        assert all(r["time"] == subprocess_time(time) for s in SECTIONS for r in rows[s])
        assert rebuild(rows) == record, (rebuild(rows), record)
    for section, rows in tables.items():
        for form, unescape in (("--csv", None), ("--tsv", {"\\t": "\t", "\\n": "\n", "\\r": "\r", "\\\\": "\\"})):
            out = run("-s", section, form, data=data)
            if unescape is None:
                lines = list(csv.reader(io.StringIO(out, newline="")))
            else:
                lines = [[unescape_tsv(c, unescape) for c in line.split("\t")] for line in out.split("\n")[:-1]]
            assert [{k: c for k, c in zip(lines[0], line) if c} for line in lines[1:]] == \
                [{k: v for k, v in row.items() if v} for row in rows], section
    return tables


def unescape_tsv(cell, table):
    out, at = "", 0
    while at < len(cell):
        pair = cell[at:at + 2]
        out, at = (out + table[pair], at + 2) if pair in table else (out + cell[at], at + 1)
    return out


def subprocess_time(seconds):
    import datetime
    return datetime.datetime.fromtimestamp(int(seconds), datetime.timezone.utc).strftime("%Y-%m-%dT%H:%M:%SZ")


def check_figures(data, rows):
    """--stat, --sort and -n against the rows of the vcpus."""
    groups = {}
    for row in rows:
        groups.setdefault((row["host"], row["id"], row["vcpu.id"]), []).append(row["vcpu.used"])
    rank = {"max": max, "mean": lambda v: sum(v) / len(v), "last": lambda v: v[-1],
            "p95": lambda v: sorted(v)[math.ceil(0.95 * len(v)) - 1]}
    for stat, figure in rank.items():
        got = [read(line) for line in run("-s", "vcpu", "--stat", stat, "--json", data=data).split("\n")[:-1]]
        assert len(got) == len(groups)
        for row, values in zip(got, groups.values()):
            assert int(row["records"]) == len(values)
            assert math.isclose(float(row["vcpu.used"]), figure([float(v) for v in values]), abs_tol=1e-4), (stat, row)
    order = sorted(range(len(rows)), key=lambda i: (-float(rows[i]["vcpu.used"]), i))
    for limit in (len(rows), 5, 1):
        got = run("-s", "vcpu", "--sort=-used", "-n", str(limit), "--json", data=data).split("\n")[:-1]
        assert [read(line) for line in got] == [rows[i] for i in order[:limit]]
    assert run("-s", "vcpu", "--sort=-used", "--json", data=data).split("\n")[:-1][0] == got[0]


def check_terminal(data):
    """What a terminal gets: nothing that steers it but our own colours, no line wider than it where names can give way."""
    script = f"stty cols 60; exec {BUILD}/lan-report table -f name,switch,rxpps,txeps {sys.argv[2] if len(sys.argv) > 2 else ''}"
    for colour in (True, False):
        with tempfile.NamedTemporaryFile() as file:
            file.write(data)
            file.flush()
            master, slave = pty.openpty()
            env = {**os.environ, "TERM": "xterm", "NO_COLOR": "" if colour else "1"}
            child = subprocess.Popen(["sh", "-c", script + file.name], stdin=slave, stdout=slave, env=env)
            os.close(slave)
            out = b""
            try:
                while chunk := os.read(master, 65536):
                    out += chunk
            except OSError:
                pass
            assert child.wait() == 0
            out = out.decode()
            assert ("\x1b[1m" in out) == colour
            plain = out.replace("\x1b[1m", "").replace("\x1b[1;31m", "").replace("\x1b[0m", "")
            assert not any(c in plain for c in "\x1b\x9b\u202e\t"), plain
            assert "\\x1b[31mred" in plain and "漢字  " in plain and "…" in plain
            widths = {len(line) + sum(2 * (c in "漢字長い名前の仮想機械") for c in line) // 2 - line.count("\u0301")
                      for line in plain.split("\r\n")[:-1]}
            assert max(widths) <= 60, widths


def check_manual():
    """The manual page has each column with its unit and meaning."""
    with open(f"{os.path.dirname(__file__)}/../../docs/man/lan-report.1", encoding="utf-8") as file:
        manual = file.read().replace("\\(dq", '"')
    rows = list(csv.DictReader(io.StringIO(run("--columns", "--csv"))))
    assert {row["section"] for row in rows} == set(SECTIONS)
    for row in rows:
        unit = f' Pq {row["unit"]}' if row["unit"] else ""
        entry = f'.It Sy {row["column"]}{unit}\n{row["meaning"][0].upper()}{row["meaning"][1:]}.\n'
        assert entry in manual, entry


def main():
    check_manual()
    dice = random.Random(7)
    report = subprocess.run([f"{BUILD}/lan-meter", "-A", "-t", "cChqivWV", "-i", "0", "-n", "2"], check=True,
                            capture_output=True, env={**os.environ, "COREKIT_HOST": "demo"}).stdout
    document = read(report)
    check_join(report, [{"host": document["sysinfo"]["hostname"], **r} for r in document["stats"]])
    for _ in range(12):
        hosts = [Host(dice, name) for name in dice.sample(HOSTILE, dice.randrange(1, 4))]
        records = [dice.choice(hosts).record() for _ in range(dice.randrange(1, 12))]
        data = "".join(text_of(r) + "\n" for r in records).encode()
        tables = check_join(data, [read(text_of(r)) for r in records])
        if tables["vcpu"]:
            check_figures(data, tables["vcpu"])
    names = HOSTILE + ["長い名前の仮想機械" * 4]
    ports = ", ".join('{"name": %s, "switch": "s", "id": %d, "rxpps": 1, "txeps": 1.00}' % (json.dumps(n), i)
                      for i, n in enumerate(names))
    check_terminal(('{"host": "h", "time": 1, "interval": 1, "iteration": 0, "ports": [%s]}\n' % ports).encode())


main()

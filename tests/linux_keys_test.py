#!/usr/bin/python3
"""Holds what knf-source tells of a report's keys against the schema, the page and the manual: `... BUILD-DIRECTORY`."""
import collections
import json
import pathlib
import re
import subprocess
import sys

DOCS = pathlib.Path(__file__).parent.parent / "docs"
KNF_SOURCE = pathlib.Path(sys.argv[1]).resolve() / "knf-source"


def run(*arguments):
    done = subprocess.run([KNF_SOURCE, *arguments], capture_output=True, text=True)
    assert done.returncode == 0 and not done.stderr, (arguments, done)
    return done.stdout


def leaves(root, part, path=""):
    if "$ref" in part:
        part = root["$defs"][part["$ref"].removeprefix("#/$defs/")]
    below = [(f"{path}.{key}", value) for key, value in part.get("properties", {}).items()]
    below += [(path, value) for value in part.get("prefixItems", []) + part.get("oneOf", [])]
    below += [(path, part["items"])] if part.get("items") else []
    inner = set().union(*(leaves(root, value, name) for name, value in below))
    return inner or ({path.removeprefix(".stats").removeprefix(".")} if part.get("type") != "object" else set())


schema = json.loads((DOCS / "report.schema.json").read_text())
keys = leaves(schema, schema)
page = run("--page")
rows, zeros, worths, wanting, section = {}, set(), {}, collections.defaultdict(list), ""
for line in page.splitlines():
    if line.startswith("### "):
        section = "" if line == "### the record" else line[4:] + "."
    elif found := re.match(r"\| (?:all|`(\S+)`) \| (.*)", line):
        name = section + (found[1] or "*")
        assert name not in rows, f"{name} stands twice"
        rows[name] = {key for key in keys if key == name or (not found[1] and key.startswith(section))}
        cells = found[2].split(" | ")
        if need := re.fullmatch(r'(.*) without "(.*)" \|', cells[2]):
            wanting[need[2]].append(name)
            worths[name] = ("", cells[0], need[1])
        zeros |= {name} if re.search(r"\b(zero|not measured)\b", found[2]) else set()
for key in keys:
    assert sum(key in covered for covered in rows.values()) == 1, f"{key} has no row of its own"
assert all(rows.values()), f"no report has {[name for name, covered in rows.items() if not covered]}"
assert page in (DOCS / "linux.md").read_text(), "docs/linux.md does not hold what knf-source --page prints"
manual = (DOCS / "man/lan-meter.8").read_text().split("\n.Sh ON LINUX\n")[1].split("\n.Sh ")[0]
told = set(re.findall(r"^\.It Li (\S+)", manual, re.M))
assert told == zeros, f"the manual's list of zeros differs: {told ^ zeros}"


def told_here(name, here):
    """The worth of a key as the text for a host has it; "never there" when its section is not."""
    section, _, key = name.rpartition(".")
    section = re.sub(r"\.(topology|details)$", "", section) or "the record"
    state = re.search(rf"^{re.escape(section)}: (?:(not )?there|none now: )", here, re.M)
    assert state, f"{section} is not told"
    line = re.search(rf"^  \S*{re.escape(key)} +(exact|close|zero|not measured|by NIC) ", here.split(state[0])[1], re.M)
    assert state[1] or line, f"{name} is not told"
    return "never there" if state[1] else line[1]


all_there = [f"--assume={feature}=yes" for feature in wanting]
for answer, column in (("yes", 1), ("no", 2)):
    for feature, names in wanting.items():
        here = run(*all_there, f"--assume={feature}={answer}")
        for name in names:
            assert told_here(name, here) == worths[name][column], (name, feature, answer)
assert {told_here(name, run(*all_there)) for name in rows} == {"exact", "close", "zero", "not measured", "never there"}
print(f"{len(keys)} keys in {len(rows)} rows, {len(zeros)} of them 0 or not measured")

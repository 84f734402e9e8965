#!/usr/bin/python3
"""Holds reports of the real program against docs/report.schema.json: `schema_test.py BUILD-DIRECTORY`.

Each report must be valid, each place of the schema must be met by some report, each key of a report must have its
place, the required keys must be exactly those that all reports have there, and the schema must refuse a key too many
and a null at every place of every report.
"""
import json
import os
import pathlib
import subprocess
import sys
import tempfile

import jsonschema

BUILD = pathlib.Path(sys.argv[1]).resolve()
SCHEMA = json.loads((pathlib.Path(__file__).parent.parent / "docs/report.schema.json").read_text())
ALL = "cChqivWV"
SMALL = "host name=small pcpus=1 cores=1 packages=1\nswitch s\nplain switch=s port=7 type=2 client=probe tx=5\n"
HOSTS = {
    "port disabled": (SMALL + 'fault get 269 "s" 7 from=2\n', "-p 7 -n 2"),
    "pcpu 0 stands still": (SMALL + "field 797 0 at=48 width=8 start=9\n", "-p 7"),
    "counters go back": (SMALL + 'field 269 "s" 7 at=72 width=8 start=900 then=1:0\n'
                         "field 797 0 at=0 width=8 start=900 then=1:0\n", "-p 7"),
    "large numbers": (SMALL + 'field 266 "s" 7 at=3310 width=4 start=0xfffffff0\n'
                      'field 269 "s" 7 at=80 width=8 start=0 rate=0x7fffffffffff\n', "-p 7 -a"),
}
BUILT_IN = ["-A -n 2 -t " + ALL, "-A -n 2", "-A -t cChqivWVle", "-N nic0", "-N nic1 -a", "-V web1", "-V mail1 -t cv",
            "-A -i 0 -t " + ALL]


def run(arguments, host=None, program="lan-meter"):
    environment = dict(os.environ, LD_PRELOAD="build/libfixed_clock.so", ASAN_OPTIONS="verify_asan_link_order=0",
                       COREKIT_HOST="demo")
    if host:
        pathlib.Path("host.txt").write_text(host)
        environment["COREKIT_HOST"] = "host.txt"
    done = subprocess.run([BUILD / program, *arguments.split()], env=environment, capture_output=True, text=True)
    assert done.returncode == 0, (program, arguments, done.stderr)
    return done.stdout


def members(pairs):
    assert len({key for key, _ in pairs}) == len(pairs), f"a key twice in one object: {pairs}"
    return dict(pairs)


def parse(text):
    def refuse(word):
        raise ValueError(f"{word} is not JSON")
    return json.loads(text, object_pairs_hook=members, parse_constant=refuse)


def reports():
    for arguments in BUILT_IN:
        yield arguments, parse(run(arguments if "-i" in arguments else arguments + " -i 1"))
    for title, (host, arguments) in HOSTS.items():
        yield title, parse(run(arguments + " -i 1", host))
    if (BUILD / "knf-record").exists():
        run("-o snap -i 1 -n 3", program="knf-record")
        yield "replay", parse(run("-A -t " + ALL + " -c snap.0:snap.1:snap.2"))
        yield "replay of one snapshot", parse(run("-A -c snap.0"))


def step(schema, where):
    """The schema itself or what it refers to, and the name of its place."""
    name = schema.get("$ref", "").removeprefix("#/$defs/")
    return (SCHEMA["$defs"][name] | {k: v for k, v in schema.items() if k != "$ref"}, name) if name else (schema, where)


def below(schema, where):
    for key, part in schema.get("properties", {}).items():
        yield f"{where}/{key}", part
    for i, part in enumerate(schema.get("prefixItems", [])):
        yield f"{where}/{i}", part
    for i, part in enumerate(schema.get("oneOf", [])):
        yield f"{where}/form{i}", part
    if schema.get("items"):
        yield f"{where}/*", schema["items"]


def places(schema, where="#"):
    schema, where = step(schema, where)
    own = {where} | {f"{where}={value}" for value in schema.get("enum", [])}
    return own.union(*(places(part, name) | {name} for name, part in below(schema, where)))


def valid(schema, value):
    return ROOT.evolve(schema=schema).is_valid(value)


def walk(schema, value, where="#"):
    """Marks the places that the value meets and tries what the schema must refuse there."""
    schema, where = step(schema, where)
    met.update({where} | ({f"{where}={value}"} if "enum" in schema else set()))
    assert not valid(schema, None), f"null passes at {where}"
    if isinstance(value, dict) and "oneOf" not in schema:
        assert not valid(schema, {**value, "unheard-of": 0}), f"a key too many passes at {where}"
        assert value.keys() <= schema.get("properties", {}).keys(), f"{where} lacks a key of {value.keys()}"
        required[where] = set(schema.get("required", []))
        always[where] = always.get(where, value.keys()) & value.keys()
    for name, part in below(schema, where):
        last = name.rsplit("/", 1)[1]
        if last.startswith("form"):
            inner = [value] if valid(part, value) else []
        elif isinstance(value, dict):
            inner = [value[last]] if last in value else []
        else:
            inner = value if last == "*" else value[int(last):int(last) + 1]
        for each in inner:
            met.add(name)
            walk(part, each, name)


jsonschema.Draft202012Validator.check_schema(SCHEMA)
ROOT = jsonschema.Draft202012Validator(SCHEMA)
met, required, always = set(), {}, {}
with tempfile.TemporaryDirectory() as directory:
    os.chdir(directory)
    os.symlink(BUILD, "build")  # the path of a preloaded library may hold no blank
    for title, report in reports():
        for error in ROOT.iter_errors(report):
            sys.exit(f"{title}: {error.json_path}: {error.message}")
        walk(SCHEMA, report)
    os.chdir("/")
missing = places(SCHEMA) - met
assert not missing, f"no report has: {sorted(missing)}"
assert required == always, [(where, required[where] ^ always[where]) for where in always]
print(f"{len(met)} places of the schema met")

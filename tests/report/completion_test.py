#!/usr/bin/env python3
"""Completion in real shells: keys are typed into bash and zsh, and what the completed line hands to a program is seen."""
import os
import pty
import re
import select
import sys
import tempfile

BUILD = os.path.abspath(sys.argv[1])
PACKAGING = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../packaging")
ODD = """a $(echo no) 'b' `y` "q" \\z"""
LIST = f"""PortNum          Type SubType SwitchName       MACAddress         ClientName
5                   4       0 v switch 0       02:0a:00:00:00:05  nic 0
33554434            5       9 v switch 0       02:0b:02:00:00:02  web one
33554436            5       9 v switch 0       02:0b:02:00:00:02  web:two three
33554435            5       8 no/switch        02:0b:02:00:00:03  {ODD}
99                  3       0 no/switch        02:0a:00:00:00:63  host0
"""
RECORD = """{"host":"h","time":1,"interval":1,"iteration":0,"ports":[
{"name":"web one","switch":"v sw","id":77,"uplink":"false"},{"name":"nic 0","switch":"v sw","id":78,"uplink":"true"}]}
""".replace("\n", "") + "\n"
# What is typed, with a tab behind it, and what the program is given.
CASES = [
    ("lan-meter -V web\\ ", ["-V", "web one"]),
    ('lan-meter -V "web o', ["-V", "web one"]),
    ("lan-meter -V 'web o", ["-V", "web one"]),
    ("lan-meter --vm=web\\ o", ["--vm=web one"]),
    ("lan-meter -V web:", ["-V", "web:two three"]),
    ("lan-meter -V a", ["-V", ODD]),
    ('lan-meter -V "a', ["-V", ODD]),
    ("lan-meter -V 'a", ["-V", ODD]),
    ("lan-meter -V h", ["-V", "h"]),
    ("lan-meter -S v", ["-S", "v switch 0"]),
    ("lan-meter -S no", ["-S", "no/switch"]),
    ("lan-meter -N n", ["-N", "nic 0"]),
    ("lan-meter -p 9", ["-p", "99"]),
    ("lan-report ta", ["table"]),
    ("lan-report table --sect", ["table", "--section"]),
    ("lan-report table -s vc\t -f vcpu.id,vcpu.re", ["table", "-s", "vcpu", "-f", "vcpu.id,vcpu.ready"]),
    ("lan-report table --sort=-rxe", ["table", "--sort=-rxeps"]),
    ("lan-report table --stat ma", ["table", "--stat", "max"]),
    ("lan-report table re\t -V w", ["table", "re port", "-V", "web one"]),
    ("lan-report table re\t -V n", ["table", "re port", "-V", "n"]),
    ("lan-report table re\t -N 'n", ["table", "re port", "-N", "nic 0"]),
]
SHELLS = {
    "bash": (["bash", "--norc", "-i"], f". {PACKAGING}/lan-meter.bash; . {PACKAGING}/lan-report.bash"),
    "zsh": (["zsh", "-f", "-i"], f"fpath=({PACKAGING} $fpath); autoload -Uz compinit; compinit -u -D"),
}


def write(path, text):
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)
    os.chmod(path, 0o755)


def wait_for(terminal, pattern):
    out = ""
    while not (found := re.search(pattern, out, re.S)):
        assert select.select([terminal], [], [], 20)[0], f"no {pattern} in {out!r}"
        out += os.read(terminal, 65536).decode(errors="replace")
    return found


def try_shell(folder, words, start):
    child, terminal = pty.fork()
    if child == 0:
        os.chdir(folder)
        os.environ.update(PATH=f"{folder}:{os.environ['PATH']}", TERM="dumb", HISTFILE="/dev/null", HOME=folder, LC_ALL="C.UTF-8")
        os.execvp(words[0], words)
    os.write(terminal, f"PS1='> '; stty cols 300; {start}; echo rea''dy\n".encode())
    wait_for(terminal, "ready\r")
    for typed, expected in CASES:
        os.write(terminal, (typed + "\t\n").encode())
        given = wait_for(terminal, "GIVEN(.*?)END").group(1).split("\x01")[1:]
        assert given == expected, (words[0], typed, given)
    os.write(terminal, b"exit\n")
    os.close(terminal)
    os.waitpid(child, 0)


def main():
    given = "printf GIVEN; printf '\\001%s' \"$@\"; echo END"
    with tempfile.TemporaryDirectory() as folder:
        write(f"{folder}/list", LIST)
        write(f"{folder}/re port", RECORD)
        write(f"{folder}/lan-meter", f'#!/bin/sh\nif [ "$1" = -l ]; then cat {folder}/list; else {given}; fi\n')
        write(f"{folder}/lan-report", f'#!/bin/sh\ncase "$*" in *--columns*|*-h|*"-n 20000"*) exec {BUILD}/lan-report "$@";; esac\n{given}\n')
        for words, start in SHELLS.values():
            try_shell(folder, words, start)


main()

#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Compares what the programs say of themselves (--help) with the pages that describe them.

Every command, option and exit code of halvecctl stands in halvecctl(1), every command in the list of
client.md; every option and command of the simulated handset stands in handset.md.
"""
import pathlib
import re
import subprocess
import sys

OPTION = re.compile(r"(?<![\w-])--([a-z][a-z-]*)")


def help_of(*command):
    return subprocess.run([*command, "--help"], text=True, stdout=subprocess.PIPE, check=True).stdout


def commands_of(text):
    """The names in the list of commands of `halvecctl --help`."""
    listed = text.split("Commands:\n", 1)[1].split("\n\n", 1)[0]
    return [line.split()[0] for line in listed.splitlines()]


def manual_entries(page, command):
    """What the manual says of a command: its items, each up to the next one."""
    items = re.split(r"^\.It ", page, flags=re.MULTILINE)
    return "\n".join(item for item in items if item.startswith(f"Cm {command}\n") or
                     item.startswith(f"Cm {command} "))


def command_gaps(command, text, page):
    """The options and actions of one command's --help that its manual entries do not have."""
    entries = manual_entries(page, command)
    if not entries:
        yield f"{command}: is missing"
        return
    usage = text.split("\n", 1)[0].split(f"halvecctl {command}", 1)[1]
    own = text.split("Options for every command", 1)[0]
    for option in sorted(set(OPTION.findall(own)) - {"json"}):
        if not re.search(rf"Fl -{option}\b", entries):
            yield f"{command}: --{option} is missing"
    for action in re.findall(r"(?:^|\|)\s*([a-z]+)\b", usage):
        if not re.search(rf"\b{action}\b", entries):
            yield f"{command}: '{action}' is missing"


def halvecctl_gaps(program, manual, client):
    """What of halvecctl the manual page and client.md do not tell."""
    text = help_of(program)
    names = commands_of(text)
    for name in names:
        yield from command_gaps(name, help_of(program, name), manual)
        if not re.search(rf"^`halvecctl [^`]*\b{name}\b", client, re.MULTILINE):
            yield f"client.md: {name} is missing"
    for option in OPTION.findall(text.split("Options for every command:", 1)[1]):
        if f".It Fl -{option}" not in manual:
            yield f"--{option} is missing"
    for code in re.findall(r"^  (\d)  ", text, re.MULTILINE):
        if f"\n.It {code}\n" not in manual:
            yield f"exit code {code} is missing"


def handset_gaps(program, page):
    """What of the simulated handset its page does not tell."""
    text = help_of(program)
    for option in sorted(set(OPTION.findall(text)) - {"help"}):
        if f"--{option}" not in page:
            yield f"handset.md: --{option} is missing"
    for command in re.findall(r"^  handset ([a-z-]+)", text, re.MULTILINE):
        if f"`handset {command}" not in page:
            yield f"handset.md: handset {command} is missing"


def self_test():
    page = ".It Cm lasd update Op Fl -wait\nx\n.It Cm lasd status\n.It Cm list\n"
    text = "Usage: halvecctl lasd update [--wait] | status\n\nx --within S\n"
    assert list(command_gaps("lasd", text, page)) == ["lasd: --within is missing"]
    assert list(command_gaps("lasd", "Usage: halvecctl lasd reset | status\n", page)) == [
        "lasd: 'reset' is missing"]
    assert list(command_gaps("call", text, page)) == ["call: is missing"]


def main():
    self_test()
    if len(sys.argv) != 4:
        sys.exit("usage: help_test.py SOURCE HALVECCTL HANDSET")
    pages = pathlib.Path(sys.argv[1]) / "Documentation"
    read = lambda name: (pages / name).read_text(encoding="utf-8")
    gaps = [*halvecctl_gaps(sys.argv[2], read("man/halvecctl.1"), read("client.md")),
            *handset_gaps(sys.argv[3], read("handset.md"))]
    print("\n".join(gaps))
    print(f"{len(gaps)} gaps between the programs and their pages")
    return 1 if gaps else 0


if __name__ == "__main__":
    sys.exit(main())

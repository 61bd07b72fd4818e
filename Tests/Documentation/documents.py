# SPDX-License-Identifier: Apache-2.0
"""How the documents show commands.

In a page of text a fenced block marked `console` is a transcript for the simulated handset: a line
that begins with "$ " is a command, "> " continues it, what follows is its output. A fenced block
marked `sh` is a script for the machine that the tree was built on. Everything else, fenced or
indented by four blanks, is only shown; what in it looks like a command line must be run by something
else. In a manual page the commands of a transcript stand after ".Dl $ ", others after ".Dl " or
between ".Bd -literal" and ".Ed".
"""
import re

FENCE = re.compile(r"^( *)```(\w*)\n(.*?)^\1```$", re.MULTILINE | re.DOTALL)
INDENTED = re.compile(r"(?:^    .*\n)+", re.MULTILINE)
LITERAL = re.compile(r"^\.Bd -literal[^\n]*\n(.*?)^\.Ed$", re.MULTILINE | re.DOTALL)
DISPLAYED = re.compile(r"^\.Dl (.*)$", re.MULTILINE)
# The first word of a command line, of those that the documents show.
COMMAND = re.compile(r"(?:\$ |sudo )?(?:\./\w|(?:build|Packaging|Tests|Tools)/|(?:apt|apt-get|cc|cmake|"
                     r"ctest|for|groupadd|halvecctl|handset|journalctl|mkdir|systemctl|"
                     r"systemd-[a-z-]+)\s)")


def _without_indent(block, indent):
    return "".join(line[len(indent):] if line.startswith(indent) else line
                   for line in block.splitlines(keepends=True))


def blocks(name, text):
    """The (kind, content) of each block of a document: "console", "sh", or anything else."""
    if not name.endswith(".md"):
        for line in DISPLAYED.findall(text):
            yield ("console" if line.startswith("$ ") else ""), line + "\n"
        for block in LITERAL.findall(text):
            yield "", block
        return
    for indent, kind, block in FENCE.findall(text):
        yield kind, _without_indent(block, indent)
    for block in INDENTED.findall(FENCE.sub("", text)):
        yield "", _without_indent(block, "    ")


def transcripts(name, text):
    return [block for kind, block in blocks(name, text) if kind == "console"]


def scripts(name, text):
    return [block for kind, block in blocks(name, text) if kind == "sh"]


def shown_commands(name, text):
    """The command lines that are only shown, continued lines joined, without their comments."""
    for kind, block in blocks(name, text):
        if kind in ("console", "sh"):
            continue
        for line in re.sub(r"\\\n\s*", "", block).splitlines():
            if COMMAND.match(line):
                yield re.sub(r"\s+# .*$", "", line).rstrip()


def self_test():
    page = ("```console\n$ false\n```\n\n    cmake --preset x \\\n      -B y   # why\n    a file\n\n"
            "1. x\n\n   ```sh\n   cd /\n   ```\n")
    assert transcripts("a.md", page) == ["$ false\n"]
    assert scripts("a.md", page) == ["cd /\n"]
    assert list(shown_commands("a.md", page)) == ["cmake --preset x -B y"]
    manual = ".Dl $ halvecctl list\n.Dl systemctl stop x\n.Bd -literal -offset indent\nhandset run\n.Ed\n"
    assert transcripts("a.1", manual) == ["$ halvecctl list\n"]
    assert list(shown_commands("a.1", manual)) == ["systemctl stop x", "handset run"]

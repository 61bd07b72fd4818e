#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Fails when a document shows a command line that nothing runs.

Transcripts and scripts are run by transcripts.py, if their document is on its list; every other
command line is listed in the file `elsewhere` beside this one, with the test that runs it.
"""
import pathlib
import re
import sys

import documents

LISTED = re.compile(r"^  (.+?) <- (\S+): (.+)$")


def read_elsewhere(text):
    """{document: [(command, file, text in the file)]}"""
    listed, document = {}, None
    for line in text.splitlines():
        if line.startswith("#") or not line.strip():
            continue
        entry = LISTED.match(line)
        if entry:
            listed[document].append(entry.groups())
        else:
            document = line
            listed.setdefault(document, [])
    return listed


def faults_of(name, text, transcribed, entries):
    """What of one document nothing runs, and what of the list it does not show."""
    if (documents.transcripts(name, text) or documents.scripts(name, text)) and not transcribed:
        yield f"{name}: its transcripts are not run"
    shown = list(documents.shown_commands(name, text))
    commands = [command for command, _, _ in entries]
    for command in shown:
        if command not in commands and "*" not in commands:
            yield f"{name}: nobody runs: {command}"
    for command in commands:
        if command not in shown and (command != "*" or not shown):
            yield f"{name}: is said to show: {command}"


def self_test():
    listed = read_elsewhere("# x\na.md\n  cmake a <- run: cmake\n")
    assert listed == {"a.md": [("cmake a", "run", "cmake")]}
    page = "    cmake a\n    cmake b\n"
    assert list(faults_of("a.md", page, False, listed["a.md"])) == ["a.md: nobody runs: cmake b"]
    assert not list(faults_of("a.md", page, False, [("*", "run", "cmake")]))
    assert list(faults_of("a.md", "text\n", False, listed["a.md"]))
    assert list(faults_of("a.md", "```console\n$ true\n```\n", False, []))


def main():
    self_test()
    if len(sys.argv) < 2:
        sys.exit("usage: commands_test.py SOURCE TRANSCRIBED-DOCUMENT...")
    source, transcribed = pathlib.Path(sys.argv[1]), sys.argv[2:]
    here = pathlib.Path(__file__).parent
    listed = read_elsewhere((here / "elsewhere").read_text(encoding="utf-8"))
    faults = []
    pages = [*source.glob("*.md"), *source.glob("*/*.md"), *source.glob("Documentation/man/*.[1-8]")]
    names = sorted(str(page.relative_to(source)) for page in pages)
    for name in names:
        text = (source / name).read_text(encoding="utf-8")
        faults += faults_of(name, text, name in transcribed, listed.get(name, []))
    faults += [f"{name}: no such document" for name in {*listed, *transcribed} - {*names}]
    for name, entries in listed.items():
        for _, runner, text in entries:
            path = source / runner
            if not path.is_file() or text not in path.read_text(encoding="utf-8"):
                faults.append(f"{name}: {runner} has no: {text}")
    print("\n".join(faults))
    print(f"{len(names)} documents, {len(faults)} faults")
    return 1 if faults else 0


if __name__ == "__main__":
    sys.exit(main())

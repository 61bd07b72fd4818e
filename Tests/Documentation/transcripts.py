#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Runs what the documents show; documents.py says how they show it.

All transcripts of a document run in order in one simulated handset, in one shell, with halvecctl
entitled for root unless the document does that itself. Each command must end with 0, or with what a
comment "# exits N" behind it says, and print every line that the document shows, numbers apart: a
number stands for any number, and "..." for anything. Its scripts run beside the handset, in a folder
where build/debug is the tested build, and must end with 0.
"""
import argparse
import os
import pathlib
import re
import subprocess
import sys
import tempfile

import documents

EXITS = re.compile(r"\s+# exits (\d+)$")
MARK = "=== end of command "


class Step:
    def __init__(self, command):
        expected = EXITS.search(command)
        self.status = int(expected.group(1)) if expected else 0
        self.command = EXITS.sub("", command)
        self.output = []


def steps_of(name, text):
    """The commands of one document, each with the lines that it is said to print."""
    steps = []
    for block in documents.transcripts(name, text):
        for line in block.splitlines():
            if line.startswith("$ "):
                steps.append(Step(line[2:]))
            elif line.startswith("> ") and not steps[-1].output:
                steps[-1].command += "\n" + line[2:]
            elif line.strip():
                steps[-1].output.append(line)
    return steps


def pattern_of(line):
    parts = re.split(r"(\d[\d.]*|\.\.\.)", line.strip())
    return "".join(".*" if part == "..." else r"\d[\d.]*" if part[:1].isdigit() else
                   re.escape(part) for part in parts)


def failures(step, status, output):
    """What of one command is not as the document says."""
    if status != step.status:
        yield f"exits with {status} instead of {step.status}"
    lines = [line.strip() for line in output]
    for shown in step.output:
        if not any(re.fullmatch(pattern_of(shown), line) for line in lines):
            yield f"does not print: {shown}"


def script_of(steps):
    lines = ["exec 2>&1"]
    if not any("handset entitle" in step.command for step in steps):
        lines.append("handset entitle /usr/libexec/halvec/halvecctl root >/dev/null")
    for step in steps:
        lines += [step.command, f'status=$?; echo; echo "{MARK}$status"']
    return "\n".join(lines)


def run(handset, steps):
    """The (status, lines of output) of each command."""
    with tempfile.TemporaryDirectory() as web:
        command = [web if word == "WEB" else word for word in handset]
        done = subprocess.run(command + ["--", "sh", "-c", script_of(steps)], text=True, timeout=300,
                              stdout=subprocess.PIPE, stderr=subprocess.STDOUT, check=False)
    results, output = [], []
    for line in done.stdout.splitlines():
        if line.startswith(MARK):
            results.append((int(line[len(MARK):]), output))
            output = []
        else:
            output.append(line)
    return results + [(-1, output)] * (len(steps) - len(results))


def failed_scripts(build, scripts):
    """How many of a document's scripts do not end with 0."""
    failed = 0
    with tempfile.TemporaryDirectory() as folder:
        os.mkdir(folder + "/build")
        os.symlink(build, folder + "/build/debug")
        for script in scripts:
            done = subprocess.run(["sh", "-eu", "-c", script], cwd=folder, text=True, timeout=300,
                                  stdout=subprocess.PIPE, stderr=subprocess.STDOUT, check=False)
            if done.returncode != 0:
                failed += 1
                print(f"ends with {done.returncode}:\n{script}it printed:\n{done.stdout}")
    return failed


def self_test():
    documents.self_test()
    step = steps_of("a.md", "```console\n$ false  # exits 1\nit took 12.5 s ...\n```\n")[0]
    assert (step.command, step.status) == ("false", 1)
    assert not list(failures(step, 1, ["it took 7 s or so"]))
    assert list(failures(step, 0, ["it took 7 s or so"]))
    assert list(failures(step, 1, ["it took long"]))


def main():
    self_test()
    parser = argparse.ArgumentParser()
    parser.add_argument("--document", required=True)
    parser.add_argument("--build", required=True, help="the build that is tested")
    parser.add_argument("handset", nargs="+", help="handset run and its options; WEB: a new folder")
    options = parser.parse_args()
    text = pathlib.Path(options.document).read_text(encoding="utf-8")
    steps = steps_of(options.document, text)
    scripts = documents.scripts(options.document, text)
    bad = failed_scripts(options.build, scripts)
    for step, (status, output) in zip(steps, run(options.handset, steps) if steps else []):
        for failure in failures(step, status, output):
            bad += 1
            print(f"{step.command}\n  {failure}\n  it printed:")
            print("".join(f"    {line}\n" for line in output))
    print(f"{len(steps)} commands and {len(scripts)} scripts, {bad} not as shown")
    return 1 if bad or not steps + scripts else 0


if __name__ == "__main__":
    sys.exit(main())

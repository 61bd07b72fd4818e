#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Inside the handset: kills the helper just before each call to the system that an install makes,
and looks at what is left. Then lets the next check finish and looks again.

Prints one line per violation, and at the end how many calls there are, every second one tried. The
helper runs with the library of KillPoint.cpp; a web server answers for the manifest's host from the
folder WEB.
"""
import collections
import gzip
import os
import plistlib
import shutil
import subprocess
import sys

WEB, HOST, SCENARIO = sys.argv[1:4]
REMAINDER = int(sys.argv[4])  # 0: the even calls, 1: the odd ones
FOLDER = "/var/mobile/Library/LASD"
FILE = FOLDER + "/gsm.db"
RECORD = "/root/Library/Preferences/com.zarvo.lasd.plist"
# Large enough for several writes.
CONTENT = {version: os.urandom(100_000) for version in ("1", "2")}
notifications = 0
exits = 0
violations = 0


def run(*words):
    return subprocess.run(words, check=True, stdout=subprocess.PIPE, text=True).stdout


def offer(version):
    entry = {"Version": version, "ContentURL": f"https://{HOST}/gsm.db.gz"}
    with open(WEB + "/1/v3/lasd.plist", "wb") as manifest:
        plistlib.dump({"gsm": entry}, manifest)
    with open(WEB + "/gsm.db.gz", "wb") as database:
        database.write(gzip.compress(CONTENT[version], 1))


def helper_ends():
    global exits
    exits += 1
    run("handset", "wait-exit", "--exits", str(exits), "--timeout", "60")


def install(kill_at=0):
    """Has one check made by a new helper; that helper is gone afterwards."""
    global notifications
    with open("/tmp/kill-at", "w") as chosen:
        chosen.write(str(kill_at))
    if os.path.exists("/tmp/calls"):
        os.remove("/tmp/calls")
    # A helper that is killed early may be gone before its reply is out.
    subprocess.run(["halvecctl", "lasd", "update", "--types", "gsm"], check=kill_at == 0)
    if kill_at == 0:
        notifications += 1
        run("handset", "telephony", "log", "--count", "1", "--skip", str(notifications - 1),
            "--timeout", "60")
        run("handset", "kill", "KILL")
    helper_ends()
    notifications = len(run("handset", "telephony", "log").splitlines())
    with open("/tmp/calls") as calls:
        return calls.read().split()


def installed():
    """The version of the file, None without one; and the recorded version, None without one."""
    version = None
    if os.path.exists(FILE):
        with open(FILE, "rb") as database:
            content = database.read()
        version = next((v for v, c in CONTENT.items() if c == content), "partial")
    recorded = None
    if os.path.exists(RECORD):
        with open(RECORD, "rb") as record:
            recorded = plistlib.load(record).get("gsm", {}).get("Version")
    return version, recorded


def clear():
    shutil.rmtree(FOLDER, ignore_errors=True)
    if os.path.exists(RECORD):
        os.remove(RECORD)


def expect(holds, text):
    global violations
    if not holds:
        violations += 1
        print(text)


def try_every_call(restore, before):
    """Installs version 2 over what `restore` makes, once per call. Counts the outcomes."""
    outcomes = collections.Counter()
    restore()
    calls = install()
    expect(installed() == ("2", "2"), f"not installed without a kill: {installed()}")
    for number, call in enumerate(calls, start=1):
        if number % 2 != REMAINDER:
            continue
        restore()
        made = install(kill_at=number)
        where = f"killed before call {number} ({call}): "
        expect(len(made) == number, where + f"{len(made)} calls were made")
        version, recorded = installed()
        outcomes[version, recorded] += 1
        expect(version in (None, before, "2"), where + f"the file is {version}")
        expect(recorded in (before, "2"), where + f"the record is {recorded}")
        expect(recorded != "2" or version == "2", where + f"record 2 and file {version}")
        if version is None and before is not None:
            with open(FILE + ".tmp", "rb") as temporary:
                expect(temporary.read() == CONTENT["2"], where + "no whole temporary file")
        install()
        expect(installed() == ("2", "2"), where + f"the next check leaves {installed()}")
        expect(os.listdir(FOLDER) == ["gsm.db"], where + f"it leaves {os.listdir(FOLDER)}")
    return len(calls), outcomes


os.makedirs("/var/mobile/Library", exist_ok=True)
if SCENARIO == "first":
    offer("2")
    install()  # whatever the very first install of a system makes besides
    count, outcomes = try_every_call(clear, None)
else:
    offer("1")
    install()
    shutil.copytree(FOLDER, "/tmp/kept")
    shutil.copy2(RECORD, "/tmp/kept.plist")
    offer("2")

    def restore():
        clear()
        shutil.copytree("/tmp/kept", FOLDER)
        shutil.copy2("/tmp/kept.plist", RECORD)

    count, outcomes = try_every_call(restore, "1")
    # Every state that the documents name has been seen, the gap between removal and rename too.
    for state in (("1", "1"), (None, "1"), ("2", "1"), ("2", "2")):
        expect(outcomes[state] > 0, f"the state {state} was never left behind")
print(f"{violations} violations" if violations else f"{count} calls")

#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Uses the examples of the entitlement pages as they stand there.

Each property list is put where root puts it, in the simulated handset: without it the program that it
names is refused, with it admitted. The telephony daemon's user and unit are given to systemd's own
tools, where they are installed.
"""
import os
import pathlib
import plistlib
import re
import shutil
import subprocess
import sys
import tempfile

PAGES = ["entitlements.md", "handset.md", "man/halvec-entitlements.5"]
REFUSED, ADMITTED = 4, 0


def property_lists(text):
    return re.findall(r"<\?xml.*?</plist>\n", text, re.DOTALL)


def block(text, kind):
    """The one block of this kind."""
    (found,) = re.findall(rf"^```{kind}\n(.*?)^```$", text, re.MULTILINE | re.DOTALL)
    return found


def codes(handset, content):
    """What the example's program gets without and with the example."""
    facts = plistlib.loads(content.encode())
    program = facts["Executable"]
    request = f"handset as {facts['User']} -- {program} call CopyCountryCode >/dev/null 2>&1; echo $?\n"
    script = (f"[ -e {program} ] || install -D /usr/libexec/halvec/halvecctl {program}\n{request}"
              f"cat >/etc/halvec/entitlements.d/example.plist <<'END'\n{content}END\n{request}")
    done = subprocess.run([*handset, "--", "sh", "-c", script], text=True, stdout=subprocess.PIPE,
                          check=True)
    return [int(line) for line in done.stdout.split()]


def daemon_faults(page, units):
    """What systemd's tools say of the daemon's user and unit."""
    if not shutil.which("systemd-sysusers") or not shutil.which("systemd-analyze"):
        print("systemd is not installed: the daemon's user and unit are not tried")
        return
    with tempfile.TemporaryDirectory() as root:
        os.mkdir(root + "/etc")
        daemon = pathlib.Path(root, "daemon.conf")
        daemon.write_text(block(page, "sysusers"), encoding="utf-8")
        subprocess.run(["systemd-sysusers", f"--root={root}",
                        units / "sysusers.d/halvec-mobile-helper.conf", daemon],
                       check=True, stderr=subprocess.DEVNULL)
        groups = pathlib.Path(root, "etc/group").read_text(encoding="utf-8")
        if not re.search(r"^halvec:.*:halvecd$", groups, re.MULTILINE):
            yield f"the daemon's user is not in group halvec: {groups}"
        for unit in units.glob("*.s*"):
            if unit.is_file():
                shutil.copy(unit, root)
        # The programs are not installed here.
        for name, text in [("halvecd.service", block(page, "ini")),
                           ("halvec-mobile-helper.service",
                            (units / "halvec-mobile-helper.service").read_text(encoding="utf-8"))]:
            runnable = re.sub(r"^ExecStart=.*$", "ExecStart=/bin/true", text, flags=re.MULTILINE)
            pathlib.Path(root, name).write_text(runnable, encoding="utf-8")
        checked = subprocess.run(["systemd-analyze", "verify", "--man=no", "--recursive-errors=one",
                                  root + "/halvecd.service"], text=True, check=False,
                                 stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                                 env={**os.environ, "SYSTEMD_UNIT_PATH": root + ":"})
        if checked.returncode != 0:
            yield f"the daemon's unit: {checked.stdout}"


def main():
    if len(sys.argv) < 4:
        sys.exit("usage: entitlement_examples.py DOCUMENTATION UNITS HANDSET run ...")
    pages, units, handset = pathlib.Path(sys.argv[1]), pathlib.Path(sys.argv[2]), sys.argv[3:]
    faults = []
    for name in PAGES:
        examples = property_lists((pages / name).read_text(encoding="utf-8"))
        if not examples:
            faults.append(f"{name}: has no example")
        for content in examples:
            found = codes(handset, content)
            print(f"{name}: exit codes without and with the example: {found}")
            if found != [REFUSED, ADMITTED]:
                faults.append(f"{name}: {found}")
    faults += daemon_faults((pages / PAGES[0]).read_text(encoding="utf-8"), units)
    print("\n".join(faults))
    return 1 if faults else 0


if __name__ == "__main__":
    sys.exit(main())

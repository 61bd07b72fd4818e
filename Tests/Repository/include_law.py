#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Reads every #include of the tree and fails when a folder climbs.

Includes go one way: main, then the subsystems, then Shared/Server, then Platform, then
Shared/Interface. A rung may skip down. Sideways go only the one-call services of Proxies, to LASD
and Heartbeat. Platform/Linux is included by nobody above it; the clients see the wire contract and
the port layer and nothing of the server.
"""
import pathlib
import re
import sys

SUBSYSTEMS = ["Helper/Proxies", "Helper/Files", "Helper/Location", "Helper/LASD", "Helper/Heartbeat"]
SERVER = "Helper/Shared/Server"
PLATFORM = "Helper/Platform"
LINUX = "Helper/Platform/Linux"
INTERFACE = "Helper/Shared/Interface"
MAIN = "Helper/main"
CLIENT = "Client"
TOOLS = "Tools"

ALLOWED = {
    MAIN: SUBSYSTEMS + [SERVER, PLATFORM, INTERFACE],
    SERVER: [SERVER, PLATFORM, INTERFACE],
    PLATFORM: [PLATFORM, LINUX, INTERFACE],
    LINUX: [LINUX, PLATFORM, INTERFACE],
    INTERFACE: [INTERFACE],
    CLIENT: [CLIENT, PLATFORM, INTERFACE],
    TOOLS: [TOOLS, CLIENT, PLATFORM, INTERFACE],
}
for folder in SUBSYSTEMS:
    ALLOWED[folder] = [folder, SERVER, PLATFORM, INTERFACE]
ALLOWED["Helper/Proxies"] += ["Helper/LASD", "Helper/Heartbeat"]

INCLUDE = re.compile(r'^\s*#\s*include\s*"([^"]+)"', re.MULTILINE)


def folder_of(path):
    """The rung that a file belongs to: the longest folder that contains it."""
    rungs = [rung for rung in ALLOWED if path.startswith(rung + "/") or
             (rung == MAIN and path.startswith(MAIN + "."))]
    return max(rungs, key=len) if rungs else None


def violations(files):
    """Yields (file, include) for every include that the law does not allow."""
    for name, text in files:
        rung = folder_of(name)
        if rung is None:
            continue
        for include in INCLUDE.findall(text):
            target = folder_of(include)
            if target not in ALLOWED[rung]:
                yield name, include


def self_test():
    climbs = [
        ("Helper/Platform/A.h", "Helper/Shared/Server/B.h"),
        ("Helper/Shared/Interface/A.h", "Helper/Platform/B.h"),
        ("Helper/Shared/Server/A.h", "Helper/Proxies/B.h"),
        ("Helper/Shared/Server/A.h", "Helper/Platform/Linux/B.h"),
        ("Helper/Files/A.h", "Helper/Proxies/B.h"),
        ("Client/A.h", "Helper/Shared/Server/B.h"),
        ("Tools/x/A.h", "Helper/Proxies/B.h"),
        ("Helper/Proxies/A.h", "Relative.h"),
    ]
    for name, include in climbs:
        assert list(violations([(name, f'#include "{include}"\n')])) == [(name, include)], name
    falls = [
        ("Helper/main.cpp", "Helper/Proxies/B.h"),
        ("Helper/Proxies/A.h", "Helper/LASD/B.h"),
        ("Helper/Proxies/A.h", "Helper/Shared/Interface/B.h"),
        ("Helper/Platform/Linux/A.cpp", "Helper/Platform/B.h"),
    ]
    for name, include in falls:
        assert not list(violations([(name, f'#include "{include}"\n')])), name


def main():
    if sys.argv[1:] == ["--self-test"]:
        self_test()
        return 0
    root = pathlib.Path(sys.argv[1])
    paths = [path for top in ("Helper", "Client", "Tools")
             for path in (root / top).rglob("*") if path.suffix in (".h", ".cpp", ".c")]
    found = list(violations((str(path.relative_to(root)), path.read_text()) for path in paths))
    for name, include in found:
        print(f"{name} may not include {include}")
    print(f"{len(paths)} files read, {len(found)} climbs")
    return 1 if found or not paths else 0


if __name__ == "__main__":
    sys.exit(main())

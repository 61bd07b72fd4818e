#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""networks.py: gives the network namespace that it is started in a Wi-Fi and a cellular link.

Each link leads to a namespace of its own with a name server and the web servers 198.51.100.10 and
2001:db8:1::10 (port 80), so that traffic finds an answer whichever way it takes. The cellular one is
preferred by the routes. Prints "ready" and lives until standard input ends; then all is gone.
"""
import ctypes
import os
import select
import signal
import socket
import struct
import subprocess
import sys
import threading

import web_server

CLONE_NEWNET = 0x40000000
PR_SET_PDEATHSIG = 1
LIBC = ctypes.CDLL(None, use_errno=True)
WEB4, WEB6 = "198.51.100.10", "2001:db8:1::10"
TYPE_A, TYPE_CNAME, TYPE_AAAA = 1, 5, 28


def ip(*words):
    subprocess.run(["ip", *words], check=True)


def set_ipv6(interface, on):
    with open(f"/proc/sys/net/ipv6/conf/{interface}/disable_ipv6", "w", encoding="ascii") as file:
        file.write("0" if on else "1")


def encode(name):
    return b"".join(bytes([len(label)]) + label.encode() for label in name.split(".")) + b"\0"


def record(name, kind, data):
    return encode(name) + struct.pack(">HHIH", kind, 1, 60, len(data)) + data


def address(text):
    return socket.inet_pton(socket.AF_INET6 if ":" in text else socket.AF_INET, text)


def records(name, kind):
    """The answers for a name, or the number of an error, or None for no answer at all."""
    four = [record(name, TYPE_A, address(WEB4))] if kind == TYPE_A else []
    six = [record(name, TYPE_AAAA, address(WEB6))] if kind == TYPE_AAAA else []
    alias = record(name, TYPE_CNAME, encode("web.example"))
    target = [answer.replace(encode(name), encode("web.example")) for answer in four]
    stray = [record("other.example", kind, address("127.0.0.1" if kind == TYPE_A else "::1"))]
    return {
        "web.example": four,
        "both.example": four + six,
        "six.example": six,
        "alias.example": [alias] + target,
        "backwards.example": target + [alias],
        "circle.example": [record(name, TYPE_CNAME, encode(name))],
        "stray.example": stray,
        "long.example": (four or six) * 60,
        "forged.example": four,
        "failing.example": 2,
        "silent.example": None,
    }.get(name, 3)


def reply(query, over_tcp):
    at, labels = 12, []
    while query[at]:
        labels.append(query[at + 1:at + 1 + query[at]].decode().lower())
        at += 1 + query[at]
    question = query[12:at + 5]
    name, kind = ".".join(labels), struct.unpack(">H", query[at + 1:at + 3])[0]
    answers = records(name, kind)
    if answers is None:
        return []
    code, answers = (answers, []) if isinstance(answers, int) else (0, answers)
    truncated = name == "long.example" and not over_tcp
    flags = 0x8180 | code | (0x0200 if truncated else 0)
    body = b"" if truncated else b"".join(answers)

    def message(identifier):
        return struct.pack(">HHHHHH", identifier, flags, 1, 0 if truncated else len(answers), 0,
                           0) + question + body

    identifier = struct.unpack(">H", query[:2])[0]
    forged = [message(identifier ^ 1), b"", b"\0" * 5] if name == "forged.example" else []
    return forged + [message(identifier)]


def serve_names(host):
    datagrams = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
    datagrams.bind((host, 53))
    listener = socket.create_server((host, 53))
    while True:
        ready, _, _ = select.select([datagrams, listener], [], [])
        if datagrams in ready:
            query, sender = datagrams.recvfrom(4096)
            for message in reply(query, False):
                datagrams.sendto(message, sender)
        if listener in ready:
            connection, _ = listener.accept()
            with connection:
                query = connection.recv(4096)
                if len(query) > 2:
                    for message in reply(query[2:], True):
                        connection.sendall(struct.pack(">H", len(message)) + message)


def far_side(interface, host, network6, report, begin):
    """In a process of its own: the other end of one link, in a new namespace."""
    LIBC.prctl(PR_SET_PDEATHSIG, signal.SIGKILL)
    if LIBC.unshare(CLONE_NEWNET) != 0:
        os._exit(1)
    os.write(report, b"x")
    os.read(begin, 1)
    ip("link", "set", "lo", "up")
    ip("address", "add", f"{host}/24", "dev", interface)
    ip("address", "add", f"{network6}1/64", "dev", interface, "nodad")
    ip("link", "set", interface, "up")
    ip("address", "add", f"{WEB4}/32", "dev", "lo")
    ip("address", "add", f"{WEB6}/128", "dev", "lo", "nodad")
    for each in (WEB4, WEB6):
        web_server.listen((each, 80))
    threading.Thread(target=serve_names, args=(host,), daemon=True).start()
    os.write(report, b"x")
    signal.pause()


def wait_for(report):
    """Waits for the word of the far side; it says none when it has failed."""
    if not os.read(report, 1):
        sys.exit("the far side of a link has failed")


def link(name, far_name, network, metric, network6):
    report, reported = os.pipe()
    begun, begin = os.pipe()
    process = os.fork()
    if process == 0:
        far_side(far_name, f"{network}.1", network6, reported, begun)
    os.close(reported)
    wait_for(report)
    ip("link", "add", name, "type", "veth", "peer", "name", far_name, "netns", str(process))
    set_ipv6(name, False)  # until it is up, so that it says nothing by itself
    ip("address", "add", f"{network}.2/24", "dev", name)
    ip("link", "set", name, "up")
    os.write(begin, b"x")
    wait_for(report)
    ip("route", "add", "default", "via", f"{network}.1", "dev", name, "metric", str(metric))


ip("link", "set", "lo", "up")
link("wlan0", "ap0", "10.20.0", 600, "fd00:20::")
link("pdp_ip0", "tower0", "10.65.0", 50, "fd00:65::")
set_ipv6("wlan0", True)
ip("address", "add", "fd00:20::2/64", "dev", "wlan0", "nodad")
ip("route", "add", "default", "via", "fd00:20::1", "dev", "wlan0")
print("ready\n", flush=True)
sys.stdin.read()

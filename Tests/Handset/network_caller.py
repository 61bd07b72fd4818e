#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Echo requests by hand (RFC 792), one raw socket per call.

  send TARGET NUMBER [INTERFACE]   sends one with this sequence number
  ping TARGET NUMBER [INTERFACE]   sends one and waits for a reply; prints its source and number
  hear                             prints "ready", then the sources of echo replies until number 0
"""
import socket
import struct
import sys

IDENTIFIER = 4660


def checksum(data):
    total = sum(struct.unpack(f">{len(data) // 2}H", data))
    while total >> 16:
        total = (total & 0xFFFF) + (total >> 16)
    return total ^ 0xFFFF


def echo(number):
    body = struct.pack(">HH", IDENTIFIER, number) + bytes(range(8))
    return struct.pack(">BBH", 8, 0, checksum(b"\x08\x00\x00\x00" + body)) + body


def raw_socket():
    return socket.socket(socket.AF_INET, socket.SOCK_RAW, socket.IPPROTO_ICMP)


def reply(end):
    """The source and the number of the next reply."""
    while True:
        packet, (source, _) = end.recvfrom(65536)
        start = (packet[0] & 15) * 4
        kind, _, _, identifier, number = struct.unpack_from(">BBHHH", packet, start)
        if kind == 0 and identifier == IDENTIFIER:
            return source, number


def main(verb, *words):
    end = raw_socket()
    end.settimeout(30)
    if verb == "hear":
        print("ready", flush=True)
        number = None
        while number != 0:
            source, number = reply(end)
            print(source, number, flush=True)
        return
    if len(words) > 2:
        end.setsockopt(socket.SOL_SOCKET, socket.SO_BINDTODEVICE, words[2].encode())
    end.sendto(echo(int(words[1])), (words[0], 0))
    if verb == "ping":
        print(*reply(end), flush=True)


try:
    main(*sys.argv[1:])
except OSError as error:
    sys.exit(f"{error.strerror}")

#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Sends the telephony daemon's ports what the helper sends them, with a codec of its own.

  update NOTIFICATION [TYPE]     to the update port
  radio WORD                     to the radio manager's port
  connect NAME... -- CALL...     opens a connection; each CALL is COUNTRY,STATE,CITY,POSTCODE with
                                 "-" for an absent value, or "hold", which prints "held" and waits
                                 for a line of input; every packet that comes back until the answer
                                 is printed as ID or ID DOMAIN CODE
  raw PORT HEX                   the bytes as they are
"""
import array
import plistlib
import socket
import struct
import sys

PORTS = "/run/halvec/ports/"


def binary(value):
    return plistlib.dumps(value, fmt=plistlib.FMT_BINARY)


def message(number, payload, port=False):
    middle = struct.pack("<IIIHBB", 1, 0, 0, 0, 17, 0) if port else b""
    tail = struct.pack("<I", len(payload)) + payload + bytes(-len(payload) % 4)
    size = 24 + len(middle) + len(tail)
    return struct.pack("<IIIIII", 0x80000000 if port else 0, size, 0, 0, 0, number) + middle + tail


def send(port, packet, rights=()):
    sender = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
    sender.connect(PORTS + port)
    control = [(socket.SOL_SOCKET, socket.SCM_RIGHTS, array.array("i", rights))] if rights else []
    sender.sendmsg([packet], control, socket.MSG_DONTWAIT)


def read_until_answer(end):
    while True:
        packet = end.recv(65536)
        number = struct.unpack_from("<I", packet, 20)[0]
        assert struct.unpack_from("<I", packet, 4)[0] == len(packet)
        if number == 5501101:
            print(number, *struct.unpack_from("<ii", packet, 28), flush=True)
            return
        print(number, flush=True)


def call(end, text):
    keys = ("country", "state", "city", "postalCode")
    place = {key: value for key, value in zip(keys, text.split(",")) if value != "-"}
    end.send(message(5501001, binary(place)))
    read_until_answer(end)


def connect(words):
    split = words.index("--")
    own, other = socket.socketpair(socket.AF_UNIX, socket.SOCK_SEQPACKET)
    send("com.zarvo.Halvec.connection", message(5501000, binary(words[:split]), True),
         [other.fileno()])
    other.close()
    for word in words[split + 1:]:
        if word == "hold":
            print("held", flush=True)
            sys.stdin.readline()
        else:
            call(own, word)


def main(verb, *words):
    if verb == "update":
        keys = ("Notification", "DBType")
        send("com.zarvo.Halvec.lasd", message(0, binary(dict(zip(keys, words)))))
    elif verb == "radio":
        send("com.zarvo.radio-manager", message(1, struct.pack("<I", int(words[0]))))
    elif verb == "connect":
        connect(list(words))
    elif verb == "raw":
        send(words[0], bytes.fromhex(words[1]))
    else:
        sys.exit(f"unknown verb {verb}")


try:
    main(*sys.argv[1:])
except OSError as error:
    sys.exit(f"{error.strerror}")

#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Asks the world's servers.

  get URL                    prints status, Content-Type, Content-Encoding and the body's length, or
                             why there is no answer
  look NAME TYPE [SERVER]    sends one query to port 53; prints the code, the number of records, and
                             the last four bytes of a record as an address
  ask NAME TYPE              only sends it
  serve BODY                 an https server with the world's certificate at port 443: prints
                             "ready" and answers one connection with these bytes
"""
import socket
import ssl
import struct
import sys
import urllib.error
import urllib.request


def get(url):
    try:
        with urllib.request.urlopen(url, timeout=30) as answer:
            kind = answer.headers["Content-Type"]
            print(answer.status, kind, answer.headers["Content-Encoding"], len(answer.read()))
    except urllib.error.HTTPError as error:
        print(error.code)
    except urllib.error.URLError as error:
        print(getattr(error.reason, "reason", None) or error.reason.strerror)


def ask(name, kind, server="192.168.64.1"):
    labels = b"".join(bytes([len(part)]) + part.encode() for part in name.split("."))
    query = struct.pack(">HHHHHH", 77, 0x0100, 1, 0, 0, 0) + labels
    query += b"\0" + struct.pack(">HH", int(kind), 1)
    end = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
    end.settimeout(30)
    end.sendto(query, (server, 53))
    return end


def look(*words):
    answer = ask(*words).recv(1500)
    number, flags, _, records, _, _ = struct.unpack_from(">HHHHHH", answer)
    address = socket.inet_ntoa(answer[-4:]) if records else "-"
    print(number, flags & 15, records, address)


def serve(body):
    context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
    context.load_cert_chain("/run/handset/web-certificate.pem", "/run/handset/web-key.pem")
    listener = socket.socket()
    listener.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, 1)
    listener.bind(("", 443))
    listener.listen()
    print("ready", flush=True)
    with context.wrap_socket(listener.accept()[0], server_side=True) as end:
        end.recv(65536)
        end.sendall(body.encode().decode("unicode_escape").encode())


{"get": get, "look": look, "ask": ask, "serve": serve}[sys.argv[1]](*sys.argv[2:])

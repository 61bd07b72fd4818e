#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""web_server.py CERTIFICATES: well-behaved and misbehaving web servers for tests.

Prints the ports, one "NAME PORT" a line and an empty line, and serves until standard input ends.
The path of a request says how it is answered; see the functions below.
"""
import gzip
import os
import pathlib
import select
import socket
import ssl
import struct
import sys
import threading
import warnings

PIECE = b"x" * 65536


def head(status, *fields):
    return "\r\n".join([f"HTTP/1.1 {status}", *fields, "", ""]).encode()


def whole(body, *fields, status="200 OK"):
    return head(status, f"Content-Length: {len(body)}", *fields) + body


def chunk(data):
    return f"{len(data):x}\r\n".encode() + data + b"\r\n"


def wait_for_end(connection, seconds=None):
    """Waits until the client has gone, or so long; tells whether it has."""
    ready, _, _ = select.select([connection], [], [], seconds)
    return bool(ready) and not connection.recv(1)


def send_forever(connection, first, again):
    connection.sendall(first)
    while True:
        connection.sendall(again)


def drip(connection, first):
    connection.sendall(first)
    while not wait_for_end(connection, 0.02):
        connection.sendall(b"x")


def length(connection, count):
    connection.sendall(head("200 OK", f"Content-Length: {count}"))
    for done in range(0, count, len(PIECE)):
        connection.sendall(PIECE[:count - done])


def chunked(connection, count):
    connection.sendall(head("200 OK", "Transfer-Encoding: chunked"))
    for done in range(0, count, len(PIECE)):
        connection.sendall(chunk(PIECE[:count - done]))
    connection.sendall(b"0\r\n\r\n")


def until_close(connection, count):
    connection.sendall(head("200 OK"))
    for done in range(0, count, len(PIECE)):
        connection.sendall(PIECE[:count - done])


def reset(connection):
    connection.sendall(head("200 OK", "Content-Length: 100") + b"part")
    connection.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))


def redirects(connection, count):
    answer = whole(b"arrived") if count == 0 else whole(
        b"over there", f"Location: /redirects/{count - 1}", status="302 Found")
    connection.sendall(answer)


def encoded(connection, request):
    asked = b"accept-encoding: gzip\r\n" in request.lower()
    connection.sendall(whole(gzip.compress(b"hello"), "Content-Encoding: gzip") if asked else
                       whole(b"not asked"))


def bomb(connection):
    body = gzip.compress(bytes(64 << 20))
    connection.sendall(whole(body, "Content-Encoding: gzip"))


def answer(connection, request):
    target = request.split(b" ")[1].decode()
    path, _, query = target.partition("?")
    words = path.split("/")
    name, count = words[1], int(words[2]) if len(words) > 2 else 0
    send = connection.sendall
    {
        "hello": lambda: send(whole(b"hello", "Content-Type: text/plain")),
        "empty": lambda: send(whole(b"", "Content-Type: text/plain")),
        "status": lambda: send(whole(b"page", status=f"{count} Phrase")),
        "bare-304": lambda: send(head("304 Not Modified")),
        "request": lambda: send(whole(request)),
        "twice": lambda: send(whole(b"x", "X-Field: one", "X-Other: x", "x-field: two")),
        "length": lambda: length(connection, count),
        "chunked": lambda: chunked(connection, count),
        "until-close": lambda: until_close(connection, count),
        "encoded": lambda: encoded(connection, request),
        "gzip-type": lambda: send(whole(gzip.compress(b"hello"), "Content-Type: application/gzip")),
        "gzip-both": lambda: send(whole(gzip.compress(gzip.compress(b"hello")),
                                        "Content-Type: application/gzip",
                                        "Content-Encoding: gzip")),
        "bomb": lambda: bomb(connection),
        "bad-encoding": lambda: send(whole(b"plain", "Content-Encoding: gzip")),
        "redirect": lambda: send(whole(b"over there", f"Location: {query}", "Content-Type: wrong",
                                       "X-Redirect: yes", status=f"{count or 302} Found")),
        "redirects": lambda: redirects(connection, count),
        "interim": lambda: send(head("103 Early Hints", "X-Early: yes", "Content-Type: wrong") +
                                whole(b"hello", "Content-Type: text/plain")),
        "trailer": lambda: send(head("200 OK", "Transfer-Encoding: chunked", "Trailer: X-Late") +
                                chunk(b"hello") + b"0\r\nX-Late: yes\r\n"
                                b"Content-Type: application/gzip\r\n\r\n"),
        "silent": lambda: wait_for_end(connection),
        "drip-head": lambda: drip(connection, b"HTTP/1.1 200 OK\r\nX-Slow: "),
        "drip-body": lambda: drip(connection, head("200 OK", "Content-Length: 1000000")),
        "stall": lambda: (send(head("200 OK", "Content-Length: 100") + b"part"),
                          wait_for_end(connection)),
        "endless-head": lambda: send_forever(connection, b"HTTP/1.1 200 OK\r\n",
                                             b"X-More: " + b"y" * 50 + b"\r\n"),
        "endless-line": lambda: send_forever(connection, b"HTTP/1.1 200 OK\r\nX-More: ", PIECE),
        "endless-interim": lambda: send_forever(connection, b"", head("102 Processing")),
        "endless-body": lambda: send_forever(connection, head("200 OK"), PIECE),
        "endless-chunks": lambda: send_forever(
            connection, head("200 OK", "Transfer-Encoding: chunked"), chunk(PIECE)),
        "announced": lambda: send(head("200 OK", f"Content-Length: {count}") + b"short"),
        "longer": lambda: send(head("200 OK", "Content-Length: 5") + b"hello and more"),
        "two-lengths": lambda: send(head("200 OK", "Content-Length: 5", "Content-Length: 7") +
                                    b"hello"),
        "negative": lambda: send(head("200 OK", "Content-Length: -5") + b"hello"),
        "bad-chunk": lambda: send(head("200 OK", "Transfer-Encoding: chunked") + b"zz\r\nhello"),
        "cut-chunk": lambda: send(head("200 OK", "Transfer-Encoding: chunked") + b"10\r\nhello"),
        "close": lambda: None,
        "reset": lambda: reset(connection),
        "garbage": lambda: send(b"220 mail.example ESMTP\r\n"),
        "no-head": lambda: send(b"<html>HTTP/0.9</html>"),
        "half-line": lambda: send(b"HTTP/1.1 20"),
    }[name]()


def serve(connection, context, silent):
    try:
        with connection:
            if silent:
                while not wait_for_end(connection):
                    pass  # what the client says is not answered
                return
            if context:
                connection = context.wrap_socket(connection, server_side=True)
            with connection:
                request = b""
                while b"\r\n\r\n" not in request:
                    data = connection.recv(65536)
                    if not data:
                        return
                    request += data
                answer(connection, request)
    except OSError:
        pass  # the client has gone, which is its right


def accept(listener, context, silent):
    while True:
        connection, _ = listener.accept()
        threading.Thread(target=serve, args=(connection, context, silent), daemon=True).start()


def listen(address, certificate=None, silent=False, old=False):
    """Serves at (host, port) in threads; returns the port."""
    family = socket.AF_INET6 if ":" in address[0] else socket.AF_INET
    listener = socket.create_server(address, family=family, backlog=64)
    context = None
    if certificate:
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
        context.load_cert_chain(certificate)
    if old:
        warnings.simplefilter("ignore", DeprecationWarning)  # that it is old is its use
        context.minimum_version = ssl.TLSVersion.TLSv1
        context.maximum_version = ssl.TLSVersion.TLSv1_1
        context.set_ciphers("ALL:@SECLEVEL=0")
    threading.Thread(target=accept, args=(listener, context, silent), daemon=True).start()
    return listener.getsockname()[1]


def main():
    certificates = pathlib.Path(sys.argv[1])
    here = ("127.0.0.1", 0)
    print("http", listen(here))
    print("https", listen(here, certificates / "good.pem"))
    print("wrong-name", listen(here, certificates / "name.pem"))
    print("expired", listen(here, certificates / "expired.pem"))
    print("stranger", listen(here, certificates / "stranger.pem"))
    print("old-tls", listen(here, certificates / "good.pem", old=True))
    print("silent-tls", listen(here, silent=True))
    print(flush=True)
    sys.stdin.read()
    os._exit(0)  # a thread may be in the TLS library, which exit() takes down under it


if __name__ == "__main__":
    main()

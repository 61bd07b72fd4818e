#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""An https server for the handset's world: the manifest at once, half of the database and no more.

stalling_server.py MANIFEST READY HALF: creates the file READY when it listens and HALF when half of
the database has been sent.
"""
import http.server
import pathlib
import ssl
import sys
import threading

MANIFEST, READY, HALF = map(pathlib.Path, sys.argv[1:])
SIZE = 1_000_000


class Handler(http.server.BaseHTTPRequestHandler):
    def do_GET(self):
        manifest = self.path.endswith("/lasd.plist")
        body = MANIFEST.read_bytes() if manifest else bytes(SIZE // 2)
        self.send_response(200)
        self.send_header("Content-Type", "application/x-plist" if manifest else "application/gzip")
        self.send_header("Content-Length", str(len(body) if manifest else SIZE))
        self.end_headers()
        self.wfile.write(body)
        if not manifest:
            HALF.touch()
            threading.Event().wait()

    def log_message(self, *_):
        pass


server = http.server.ThreadingHTTPServer(("198.51.100.1", 443), Handler)
context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
context.load_cert_chain("/run/handset/web-certificate.pem", "/run/handset/web-key.pem")
server.socket = context.wrap_socket(server.socket, server_side=True)
READY.touch()
server.serve_forever()

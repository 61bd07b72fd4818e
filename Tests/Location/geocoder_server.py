#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""geocoder_server.py CERTIFICATE [KEY ADDRESS PORT]: an https geocoder for tests.

Serves on a free port of this machine unless it is told where. Prints its port and an empty line, and serves until standard input ends. It answers only what is
asked exactly as a reverse look-up should be; the whole degrees of latitude say how.
"""
import http.server
import json
import os
import select
import ssl
import sys
import threading
import urllib.parse

EXPECTED = {"format": "jsonv2", "zoom": "18", "addressdetails": "1", "layer": "address",
            "accept-language": "en"}


class Geocoder(http.server.BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"

    def do_GET(self):
        url = urllib.parse.urlsplit(self.path)
        query = dict(urllib.parse.parse_qsl(url.query, strict_parsing=True))
        latitude, longitude = query.pop("lat", ""), query.pop("lon", "")
        if url.path != "/base/reverse" or query != EXPECTED:
            return self.send(400, b"{}")
        kind = latitude.split(".")[0]
        if kind == "1":
            return self.send(200, b'{"error":"Unable to geocode"}')
        if kind == "2":
            return self.send(200, b"<html>not json</html>")
        if kind == "3":
            return self.send(503, b"{}")
        if kind == "4":  # says nothing, until the client has gone
            select.select([self.connection], [], [])
            return None
        if kind == "5":
            return self.send(302, b"", ("Location", "http://127.0.0.1:1/base/reverse"))
        if kind == "6":  # never ends, a little at a time, until the client has gone
            self.send_response(200)
            self.end_headers()
            while not select.select([self.connection], [], [], 0.02)[0]:
                self.wfile.write(b" " * 100)
            return None
        if kind == "7":
            return self.send(200, b" " * (256 * 1024 + 1))
        return self.send(200, json.dumps({
            "lat": latitude, "lon": longitude, "address": {
                "country_code": "ch", "state": "Z\u00fcrich", "city": latitude + " " + longitude,
                "postcode": self.headers["User-Agent"]}}).encode())

    def send(self, status, body, *fields):
        self.send_response(status)
        for name, value in fields:
            self.send_header(name, value)
        self.send_header("Content-Length", str(len(body)))
        self.end_headers()
        self.wfile.write(body)

    def log_message(self, *arguments):
        pass  # the test looks at the answers


class Server(http.server.ThreadingHTTPServer):
    daemon_threads = True

    def handle_error(self, request, client_address):
        pass  # a client may go away, or not trust this server


def main():
    key, address, port = sys.argv[2:5] if len(sys.argv) > 2 else (None, "127.0.0.1", 0)
    server = Server((address, int(port)), Geocoder)
    context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
    context.load_cert_chain(sys.argv[1], key)
    server.socket = context.wrap_socket(server.socket, server_side=True,
                                        do_handshake_on_connect=False)
    threading.Thread(target=server.serve_forever, daemon=True).start()
    print(server.server_address[1], flush=True)
    print(flush=True)
    sys.stdin.read()
    os._exit(0)  # a thread may be in the TLS library, which exit() takes down under it


if __name__ == "__main__":
    main()

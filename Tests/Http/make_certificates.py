#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""make_certificates.py FOLDER: a certificate authority and the certificates of the test servers.

authority.pem is what a client trusts; good.pem, name.pem (another host's) and expired.pem come from
it, stranger.pem does not. Each server file holds its key too.
"""
import pathlib
import subprocess
import sys

folder = pathlib.Path(sys.argv[1])
folder.mkdir(parents=True, exist_ok=True)
KEY = ["-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:prime256v1", "-nodes"]


def openssl(*arguments):
    subprocess.run(["openssl", *arguments], cwd=folder, check=True, stdout=subprocess.DEVNULL,
                   stderr=subprocess.PIPE)


def authority(name):
    openssl("req", "-x509", *KEY, "-keyout", f"{name}.key", "-out", f"{name}.pem", "-subj",
            f"/CN={name}", "-days", "36500", "-addext", "keyUsage=critical,keyCertSign")


def server(name, issuer, names, dates):
    (folder / f"{name}.extensions").write_text(f"subjectAltName={names}\n")
    openssl("req", *KEY, "-keyout", f"{name}.key", "-out", f"{name}.request", "-subj", f"/CN={name}")
    openssl("x509", "-req", "-in", f"{name}.request", "-CA", f"{issuer}.pem", "-CAkey",
            f"{issuer}.key", "-CAcreateserial", "-extfile", f"{name}.extensions", *dates, "-out",
            f"{name}.crt")
    (folder / f"{name}.pem").write_text((folder / f"{name}.crt").read_text() +
                                        (folder / f"{name}.key").read_text())


LOCAL = "DNS:localhost,DNS:web.example,IP:127.0.0.1,IP:::1"
authority("authority")
authority("other")
server("good", "authority", LOCAL, ["-days", "36500"])
server("name", "authority", "DNS:elsewhere.example", ["-days", "36500"])
server("expired", "authority", LOCAL, ["-days", "-1"])
server("stranger", "other", LOCAL, ["-days", "36500"])

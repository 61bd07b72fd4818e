# SPDX-License-Identifier: Apache-2.0
#
# Reads every FILE.in of the folder named as the argument with Python's own property-list reader and
# writes what it understood as FILE.bin and, where it can, as FILE.xml. FILE.bad holds the complaint
# about a file that it does not accept.
import pathlib
import plistlib
import sys

for source in sorted(pathlib.Path(sys.argv[1]).glob("*.in")):
    try:
        value = plistlib.loads(source.read_bytes())
        source.with_suffix(".bin").write_bytes(plistlib.dumps(value, fmt=plistlib.FMT_BINARY))
    except Exception as complaint:
        source.with_suffix(".bad").write_text(f"{type(complaint).__name__}: {complaint}")
        continue
    try:
        source.with_suffix(".xml").write_bytes(plistlib.dumps(value, fmt=plistlib.FMT_XML))
    except Exception:
        pass

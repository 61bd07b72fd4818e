#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Reads a whole atlas by the format in Documentation/atlas.md, with no code in common with builder or
reader, and fails where it does not hold: checksums, tables, every node, leaf, place and name."""
import struct
import sys
import zlib

ROWS, COLUMNS = 360, 720
KINDS = ["CODE", "CNOD", "CLEA", "STAT", "SNOD", "SLEA", "GRID", "PLAC", "NAME", "INFO"]


def require(holds, what):
    if not holds:
        sys.exit(f"not an atlas by its format: {what}")


def sections(file):
    magic, version, count, size, _, crc, zero = struct.unpack_from("<8sIIQqII", file)
    require((magic, version, count, size, zero) == (b"HVATLAS1", 1, 10, len(file), 0), "header")
    require(zlib.crc32(file[:32] + bytes(4) + file[36:200]) == crc, "checksum of the header")
    found = {}
    for index, expected in enumerate(KINDS):
        kind, offset, length, crc = struct.unpack_from("<4sIII", file, 40 + 16 * index)
        data = file[offset:offset + length]
        require(kind.decode() == expected and offset % 8 == 0, f"table entry {index}")
        require(len(data) == length and zlib.crc32(data) == crc, f"checksum of {expected}")
        found[expected] = data
    return found


def check_tree(nodes, leaves, ids, name):
    """Every node is reached once, every record ends inside the leaves."""
    pending, blocks = [(0, 1)], 0
    while pending:
        block, depth = pending.pop()
        blocks += 1
        require(depth <= 32 and block % 4 == 0 and block * 4 < len(nodes), f"{name}: block {block}")
        for (node,) in struct.iter_unpack("<I", nodes[block * 4:block * 4 + 16]):
            kind, value = node >> 30, node & 0x3FFFFFFF
            require(kind != 3 and (kind != 1 or value <= ids), f"{name}: node {node:#x}")
            if kind == 0:
                pending.append((value, depth + 1))
            elif kind == 2:
                check_leaf(leaves, value * 4, ids, name)
    require(blocks * 16 == len(nodes), f"{name}: nodes that nothing leads to")


def check_leaf(leaves, offset, ids, name):
    (count,) = struct.unpack_from("<I", leaves, offset)
    require(count > 0, f"{name}: leaf without entries")
    offset += 4
    for _ in range(count):
        area, vertices = struct.unpack_from("<HH", leaves, offset)
        require(1 <= area <= ids and vertices != 1, f"{name}: entry at {offset}")
        offset += 4 + 4 * vertices
    require(offset <= len(leaves), f"{name}: leaf that is cut off")


def check_places(data, starts, states):
    places = list(struct.iter_unpack("<iiIHH", data))
    require(len(starts) == ROWS * COLUMNS + 1 and starts[-1] == len(places), "grid")
    cell = 0
    for index, (latitude, longitude, name, state, _) in enumerate(places):
        while index >= starts[cell + 1]:
            cell += 1
        row = min((latitude + 9_000_000) // 50_000, ROWS - 1)
        column = min((longitude + 18_000_000) // 50_000, COLUMNS - 1)
        require(row * COLUMNS + column == cell, f"place {index} is in another cell")
        require(name > 0 and 1 <= state < states, f"place {index}")
    return {name for _, _, name, _, _ in places}


def main():
    with open(sys.argv[1], "rb") as file:
        found = sections(file.read())
    countries = len(found["CODE"]) // 2 - 1
    states = list(struct.iter_unpack("<IHH", found["STAT"]))
    require(all(1 <= country <= countries and zero == 0 for _, country, zero in states[1:]), "STAT")
    check_tree(found["CNOD"], found["CLEA"], countries, "countries")
    check_tree(found["SNOD"], found["SLEA"], len(states) - 1, "states")
    starts = [start for (start,) in struct.iter_unpack("<I", found["GRID"])]
    names = check_places(found["PLAC"], starts, len(states)) | {name for name, _, _ in states}
    for offset in names:
        length = found["NAME"][offset]
        text = found["NAME"][offset + 1:offset + 1 + length]
        require(len(text) == length and text.decode() is not None, f"name at {offset}")
    require(found["INFO"].decode().startswith("Atlas of "), "attributions")
    print(f"{countries} countries, {len(states) - 1} states, {len(found['PLAC']) // 16} places")


main()

# SPDX-License-Identifier: Apache-2.0
"""Writes the atlas file; Documentation/location.md gives its format byte for byte."""

import struct
import zlib

import tree

MAGIC = b"HVATLAS1"
VERSION = 1
_HEADER = "<8sIIQqII"
_ENTRY = "<4sIII"
_GRID_ROWS, _GRID_COLUMNS = 360, 720
_WEIGHT_UNITS = 256


class _Names:
    """The name pool: each distinct name once, behind its length. Offset 0 is the empty name."""

    def __init__(self):
        self.data = bytearray(b"\0")
        self._offsets = {"": 0}

    def offset(self, name):
        if name not in self._offsets:
            text = name.encode()
            if len(text) > 255:
                raise ValueError(f"name of {len(text)} bytes: {name}")
            self._offsets[name] = len(self.data)
            self.data += bytes((len(text),)) + text
        return self._offsets[name]


def build(country_root, state_root, places, division_names, about, date):
    """The bytes of an atlas. `date` is in seconds since 1970, `about` the text that tells where
    the data come from."""
    countries = sorted(tree.labels(country_root) | {place.country for place in places})
    labels = sorted(tree.labels(state_root) | {place.label for place in places})
    country_ids = {code: index + 1 for index, code in enumerate(countries)}
    state_ids = {label: index + 1 for index, label in enumerate(labels)}
    names = _Names()
    states = bytes(8) + b"".join(
        struct.pack("<IHH", names.offset(division_names.get(label, "")), country_ids[label[:2]], 0)
        for label in labels)
    country_nodes, country_leaves = tree.Encoder(country_ids).encode(country_root)
    state_nodes, state_leaves = tree.Encoder(state_ids).encode(state_root)
    grid, records = _places(places, state_ids, names)
    return _file(((b"CODE", b"\0\0" + "".join(countries).encode()),
                  (b"CNOD", country_nodes), (b"CLEA", country_leaves),
                  (b"STAT", states), (b"SNOD", state_nodes), (b"SLEA", state_leaves),
                  (b"GRID", grid), (b"PLAC", records), (b"NAME", bytes(names.data)),
                  (b"INFO", about.encode())), date)


def _places(places, state_ids, names):
    """The grid of first places, and the places in the order of its cells."""
    ordered = sorted(places, key=_cell)
    counts = [0] * (_GRID_ROWS * _GRID_COLUMNS + 1)
    records = bytearray()
    for place in ordered:
        counts[_cell(place) + 1] += 1
        weight = round((0.5 + place.radius) * _WEIGHT_UNITS) if place.is_city else 0
        records += struct.pack("<iiIHH", round(place.latitude * 1e5), round(place.longitude * 1e5),
                               names.offset(place.name), state_ids[place.label], weight)
    for index in range(1, len(counts)):
        counts[index] += counts[index - 1]
    return struct.pack(f"<{len(counts)}I", *counts), bytes(records)


def _cell(place):
    row = min(int((place.latitude + 90) * 2), _GRID_ROWS - 1)
    column = min(int((place.longitude + 180) * 2), _GRID_COLUMNS - 1)
    return row * _GRID_COLUMNS + column


def _file(sections, date):
    offset = struct.calcsize(_HEADER) + struct.calcsize(_ENTRY) * len(sections)
    table, body = b"", b""
    for kind, data in sections:
        padding = -(offset + len(body)) % 8
        body += bytes(padding)
        table += struct.pack(_ENTRY, kind, offset + len(body), len(data), zlib.crc32(data))
        body += data

    def header(crc):
        return struct.pack(_HEADER, MAGIC, VERSION, len(sections), offset + len(body), date, crc, 0)

    return header(zlib.crc32(header(0) + table)) + table + body

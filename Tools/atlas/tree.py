# SPDX-License-Identifier: Apache-2.0
"""The quad-trees of the atlas: from partitions of cells to the numbers of the file.

A node is None (no label anywhere in the cell), a label (the whole cell), a list of entries (a leaf),
or a tuple of four nodes: south-west, south-east, north-west, north-east. An entry is (label, path): the path
is a closed line in units of 1/65535 of the cell that is crossed an odd number of times by any ray
from a point of that label; an empty path means the rest of the cell."""

import struct

from partition import quarters, rings_of

# The box that every tree divides: that of the zone outlines, a hair inside the whole world.
WEST, SOUTH = -179.9999, -89.9999
WIDTH, HEIGHT = 359.9998, 179.9998

_UNITS = 65535
_ALL = 0.999999  # of the area of a cell: what rounding leaves of it
_LEAF_VERTICES = 300
_DEEPEST = 15

WHOLE_CELL = 1 << 30
LEAF = 2 << 30


def bounds(path):
    """West, south, east and north of the cell that is reached by these quarters from the root."""
    west, south, width, height = WEST, SOUTH, WIDTH, HEIGHT
    for quarter in path:
        width, height = width / 2, height / 2
        west += width * (quarter & 1)
        south += height * (quarter >> 1)
    return west, south, west + width, south + height


def node(partition, width, height, depth):
    """The node for a partition of a cell of this size. Where everything is covered, the label with
    the longest border is the rest of the cell, and its border is left out."""
    if not partition:
        return None
    if len(partition) == 1 and next(iter(partition.values())).area > _ALL * width * height:
        return next(iter(partition))
    found = entries(partition, width, height)
    if sum(len(path) for _, path in found) > _LEAF_VERTICES and depth < _DEEPEST:
        return joined([node(part, width / 2, height / 2, depth + 1)
                       for part in quarters(partition, width, height)])
    if sum(part.area for part in partition.values()) > _ALL * width * height:
        longest = max(range(len(found)), key=lambda index: len(found[index][1]))
        found.append((found.pop(longest)[0], []))
    return simplest(found)


def entries(partition, width, height):
    """The entries of a leaf for a partition, each with its whole border."""
    result = []
    for label in sorted(partition):
        rings = _rings(partition[label], width, height)
        if rings:
            result.append((label, _path(rings)))
    return result


def simplest(leaf):
    """The leaf of these entries, or what says the same in less."""
    if not leaf:
        return None
    return leaf[0][0] if len(leaf) == 1 and not leaf[0][1] else leaf


def joined(children):
    """A node with these four children, or what says the same in less."""
    first = children[0]
    if all(child == first for child in children) and not isinstance(first, (list, tuple)):
        return first
    return tuple(children)


def labels(root):
    """Every label in a tree."""
    if isinstance(root, tuple):
        return set().union(*map(labels, root))
    if isinstance(root, list):
        return {label for label, _ in root}
    return {root} - {None}


def _rings(geometry, width, height):
    """The rings in units of the cell, without those that vanish in them."""
    rings = []
    for ring in rings_of(geometry):
        points = []
        for x, y in ring.coords[:-1]:
            point = (min(max(round(x / width * _UNITS), 0), _UNITS),
                     min(max(round(y / height * _UNITS), 0), _UNITS))
            if not points or point != points[-1]:
                points.append(point)
        if len(points) > 2:
            rings.append(points)
    return rings


def _path(rings):
    """One closed line through all rings. The way from the first ring to another is gone there and
    back, so that it counts twice for every ray: not at all."""
    path = list(rings[0])
    for ring in rings[1:]:
        path += [rings[0][0], *ring, ring[0]]
    return path


class Encoder:
    """Collects the numbers of one tree: 32-bit nodes in blocks of four, and leaf records."""

    def __init__(self, ids):
        self._ids = ids
        self._nodes = [0, 0, 0, 0]  # the first block is the root's
        self._leaves = bytearray()
        self._known = {}

    def encode(self, root):
        """The bytes of the node section and of the leaf section."""
        self._fill(0, root if isinstance(root, tuple) else (root,) * 4)
        return struct.pack(f"<{len(self._nodes)}I", *self._nodes), bytes(self._leaves)

    def _fill(self, block, children):
        for index, child in enumerate(children):
            self._nodes[block + index] = self._value(child)

    def _value(self, child):
        if isinstance(child, tuple):
            block = len(self._nodes)
            self._nodes += [0, 0, 0, 0]
            self._fill(block, child)
            return block
        if isinstance(child, list):
            return LEAF | self._leaf(child)
        return WHOLE_CELL | (0 if child is None else self._ids[child])

    def _leaf(self, entries):
        """The place of the record of these entries, in units of four bytes."""
        record = struct.pack("<I", len(entries))
        for label, path in entries:
            record += struct.pack("<HH", self._ids[label], len(path))
            record += b"".join(struct.pack("<HH", x, y) for x, y in path)
        if record not in self._known:
            self._known[record] = len(self._leaves) // 4
            self._leaves += record
        return self._known[record]

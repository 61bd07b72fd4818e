# SPDX-License-Identifier: Apache-2.0
"""The country of every place: the time zones of the world, exact to the border and out to the limit
of the territorial waters, each taken for the country that the time-zone table gives it."""

import json
import multiprocessing

import numpy
from shapely.geometry import box

import geobuf
import partition
import tree
from partition import METRE

_BORDER = 22 * METRE
_LIMIT_AT_SEA = 150 * METRE
_SOURCE_QUARTERS = {"c": 0, "d": 1, "b": 2, "a": 3}

# Where zones of two countries overlap, the earlier of this list wins; zones without a place here
# come after it, in alphabetical order. Most of these borders are disputed: the administration that
# is there wins.
_PRECEDENCE = ("Asia/Hebron", "Asia/Gaza", "Asia/Tbilisi", "Africa/Khartoum", "Asia/Thimphu",
               "Asia/Kolkata", "America/Moncton", "America/Anchorage")
# Zones that also cover land of a second country, and how far (in degrees) that one's outline is to
# be grown to reach the limit of its waters.
_SHARED_ZONES = {"Europe/Belgrade": ("XK", 0.05), "Asia/Bangkok": ("VN", 0.7),
                 "America/New_York": ("CU", 0.2)}  # the naval base at Guantánamo
# The same, where the source of outlines does not have the second country: west, south, east, north.
_SHARED_BOXES = {"Europe/Oslo": ("SJ", (-12, 70, -5, 73))}  # Jan Mayen


def zone_countries(path):
    """The country code of each zone, from a zone.tab of the time-zone database."""
    with open(path, encoding="utf-8") as table:
        rows = [line.split("\t") for line in table if not line.startswith("#")]
    return {row[2].strip(): row[0] for row in rows}


class Builder:
    """Builds the country tree. `outline_of(code)` gives the outline of a country, for the
    zones that two countries share."""

    def __init__(self, folder, zone_table, outline_of):
        with open(folder / "timezones.geojson.index.json", encoding="utf-8") as file:
            index = json.load(file)
        self._zones = index["timezones"]
        self._index = index["lookup"]
        self._data = (folder / "timezones.geojson.geo.dat").read_bytes()
        self._countries = zone_countries(zone_table)
        self._second = {}
        for zone, (country, reach) in _SHARED_ZONES.items():
            grown = outline_of(country).buffer(reach).difference(
                outline_of(self._countries[zone]))
            self._second[zone] = (country, grown)
        for zone, (country, corners) in _SHARED_BOXES.items():
            self._second[zone] = (country, box(*corners))

    def build(self):
        """The root of the country tree."""
        cells = list(self._cells((), self._index))
        with multiprocessing.Pool(initializer=_serve, initargs=(self,)) as pool:
            nodes = pool.map(_node, cells, chunksize=64)
        return _assemble(dict(zip((path for path, _ in cells), nodes)))

    def _cells(self, path, node):
        if isinstance(node, list) or "pos" in node:
            yield path, node
            return
        for name, child in sorted(node.items()):
            yield from self._cells(path + (_SOURCE_QUARTERS[name],), child)

    def node(self, cell):
        """The node of one cell of the source."""
        path, leaf = cell
        west, south, east, north = tree.bounds(path)
        scale = partition.cosine(south, north)
        width, height = (east - west) * scale, north - south
        if isinstance(leaf, list):
            corners = ((0, 0), (width, 0), (width, height), (0, height))
            outlines = [(self._zones[zone], [[corners]]) for zone in leaf]
        else:
            data = self._data[leaf["pos"]:leaf["pos"] + leaf["len"]]
            outlines = [(zone, [[_in_plane(ring, west, south, scale, width, height)
                                 for ring in rings] for rings in shape])
                        for zone, shape in geobuf.polygons(data)]
        shapes = self._shapes(outlines, west, south, scale)
        return tree.node(partition.divide(shapes, width, height, _tolerance), width, height,
                         len(path))

    def _shapes(self, outlines, west, south, scale):
        shapes = []
        for zone, shape in sorted(outlines, key=lambda outline: _rank(outline[0])):
            for rings in shape:
                for polygon in partition.valid(rings[0], rings[1:]):
                    shapes += self._shared(zone, polygon, west, south, scale)
        return shapes

    def _shared(self, zone, polygon, west, south, scale):
        """The parts of a zone's polygon with their countries, the second country's first."""
        shapes = [(self._countries[zone], polygon)] if zone in self._countries else []
        if zone in self._second:
            country, area = self._second[zone]
            parts = polygon.intersection(partition.to_plane(area, west, south, scale))
            shapes = [(country, part) for part in partition.polygons_of(parts)] + shapes
        return shapes


_builder = None


def _serve(builder):
    """Gives each worker process the builder once; sent with each task, it would be copied anew."""
    global _builder
    _builder = builder


def _node(cell):
    return _builder.node(cell)


def _rank(zone):
    return (_PRECEDENCE.index(zone) if zone in _PRECEDENCE else len(_PRECEDENCE), zone)


def _in_plane(ring, west, south, scale, width, height):
    """A ring of millionths of a degree in the plane of its cell. What the source cut at the frame
    of the cell and rounded is put back on the frame."""
    x = (ring[:, 0] * 1e-6 - west) * scale
    y = ring[:, 1] * 1e-6 - south
    for values, limit in ((x, width), (y, height)):
        values[numpy.abs(values) < 2e-6] = 0
        values[numpy.abs(values - limit) < 2e-6] = limit
    return numpy.column_stack((x, y))


def _tolerance(one, other):
    return _LIMIT_AT_SEA if one is None or other is None else _BORDER


def _assemble(nodes):
    """The tree above `nodes`, a dictionary from path to node; where no path leads, nothing is."""
    root = {}
    for path, node in nodes.items():
        place = root
        for quarter in path[:-1]:
            place = place.setdefault(quarter, {})
        place[path[-1]] = node
    return _joined(root)


def _joined(place):
    if not isinstance(place, dict):
        return place
    return tree.joined([_joined(place.get(quarter)) for quarter in range(4)])

# SPDX-License-Identifier: Apache-2.0
"""The first-level division of every place. The outlines are coarse, so only the borders between two
divisions of one country are kept; which country it is, the country tree knows exactly. A division is
named after the places inside its outlines, because the outlines' own names are often out of date."""

import collections
import json

import numpy
from shapely.geometry import MultiPolygon, Point, box, shape
from shapely.ops import unary_union
from shapely.prepared import prep

import partition
import tree
from partition import METRE

_MAJORITY = 0.75
_INNER_BORDER = 100 * METRE
_OUTER_BORDER = 1500 * METRE
_SHALLOWEST = 6  # keeps the unit of a leaf below ten metres
_RAW_VERTICES = 1500
_LEAF_VERTICES = 300
_DEEPEST = 14


class Outlines:
    """The outlines of the source, each with the country that it names."""

    def __init__(self, file_name):
        with open(file_name, encoding="utf-8") as file:
            features = json.load(file)["features"]
        self.features = []
        for feature in features:
            outline = shape(feature["geometry"])
            properties = feature["properties"]
            self.features.append((properties["iso_a2"], properties["gn_a1_code"],
                                  outline if outline.is_valid else outline.buffer(0)))

    def of_country(self, code):
        """The outline of a whole country."""
        return unary_union([outline for country, _, outline in self.features if country == code])

    def divisions(self, places, names):
        """The outline of each division: a dictionary from label to geometry. The label is
        COUNTRY.CODE as in `names`, or "COUNTRY." where the places inside an outline belong to
        several divisions. Antarctica has none."""
        positions = numpy.array([(place.longitude, place.latitude) for place in places])
        parts = collections.defaultdict(list)
        for country, code, outline in self.features:
            area = prep(outline)
            west, south, east, north = outline.bounds
            near = numpy.flatnonzero(((positions >= (west, south)) &
                                      (positions <= (east, north))).all(axis=1))
            inside = [places[index] for index in near if area.contains(Point(positions[index]))]
            if inside:
                parts[_majority(inside)].append(outline)
            elif code in names and code.startswith(country):
                parts[code].append(outline)
        return {label: unary_union(parts[label]) for label in sorted(parts)
                if not label.startswith("AQ")}


def country_of(label):
    """The country code in a division's label."""
    return label[:2]


def _majority(inside):
    """The label of an outline with these places."""
    country, _ = _most_frequent(place.country for place in inside)
    division, share = _most_frequent(place.division for place in inside
                                     if place.country == country)
    return f"{country}.{division if share >= _MAJORITY else ''}"


def _most_frequent(values):
    counts = collections.Counter(values)
    value = max(sorted(counts), key=counts.get)
    return value, counts[value] / sum(counts.values())


def build(divisions):
    """The root of the tree of divisions."""
    return _node(divisions, ())


def _node(parts, path):
    """The node for the parts of divisions inside the cell at `path`, in degrees."""
    of_country = collections.Counter(map(country_of, parts))
    divided = {label: part for label, part in parts.items() if of_country[country_of(label)] > 1}
    alone = [(label, []) for label in sorted(parts) if label not in divided]
    if not divided:
        return tree.simplest(alone)
    raw = sum(len(ring.coords) for part in divided.values() for ring in partition.rings_of(part))
    if len(path) >= _SHALLOWEST and raw <= _RAW_VERTICES:
        entries = _entries(divided, path)
        if len(path) == _DEEPEST or sum(len(line) for _, line in entries) <= _LEAF_VERTICES:
            return tree.simplest(alone + entries)
    children = []
    for quarter in range(4):
        frame = box(*tree.bounds(path + (quarter,)))
        clipped = {label: MultiPolygon(partition.polygons_of(part.intersection(frame)))
                   for label, part in parts.items() if part.intersects(frame)}
        children.append(_node({label: part for label, part in clipped.items()
                               if not part.is_empty}, path + (quarter,)))
    return tree.joined(children)


def _entries(divided, path):
    west, south, east, north = tree.bounds(path)
    scale = partition.cosine(south, north)
    width, height = (east - west) * scale, north - south
    shapes = [(label, polygon) for label in sorted(divided) for polygon in partition.polygons_of(
        partition.to_plane(divided[label], west, south, scale))]
    faces = partition.divide(shapes, width, height, _tolerance)
    return tree.entries(faces, width, height)


def _tolerance(one, other):
    """Coasts and borders to another country matter only as far as they tell what is nearest."""
    inner = one and other and country_of(one) == country_of(other)
    return _INNER_BORDER if inner else _OUTER_BORDER

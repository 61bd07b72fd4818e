# SPDX-License-Identifier: Apache-2.0
"""Cuts one cell of the world into faces without gaps or overlaps, and simplifies the borders between
them. Neighbours share every simplified border, so a point beside it is always in exactly one face.

A cell is worked on in its own plane: x in degrees of longitude times the cosine of the middle
latitude, y in degrees of latitude, both from the south-west corner. A partition is a dictionary from
label to geometry; what it does not cover has no label."""

import math

from shapely.affinity import affine_transform, translate
from shapely.geometry import LineString, MultiPolygon, Point, Polygon, box
from shapely.ops import linemerge, polygonize, unary_union
from shapely.prepared import prep

METRE = 1 / 111_320  # in degrees of latitude
_SLIVER_WIDTH = 150 * METRE
# Which label lies on a side of a border is asked this far from it, beyond any sliver.
_SIDE = 200 * METRE


def cosine(south, north):
    """The scale of a cell's plane; never zero, so that cells at the poles keep a width."""
    return max(math.cos(math.radians((south + north) / 2)), 0.01)


def to_plane(geometry, west, south, scale):
    """A geometry in degrees, moved to the plane of the cell with this corner."""
    return affine_transform(geometry, (scale, 0, 0, 1, -west * scale, -south))


def polygons_of(geometry):
    """The polygons of `geometry`, without the lines and points that clipping leaves behind."""
    if geometry.geom_type == "Polygon":
        return [] if geometry.is_empty else [geometry]
    return [polygon for part in getattr(geometry, "geoms", ()) for polygon in polygons_of(part)]


def rings_of(geometry):
    """Every ring of the polygons of `geometry`."""
    return [ring for polygon in polygons_of(geometry)
            for ring in (polygon.exterior, *polygon.interiors)]


def valid(outline, holes=()):
    """The polygons of an outline with holes, mended where its rings cross themselves."""
    polygon = Polygon(outline, holes)
    return polygons_of(polygon if polygon.is_valid else polygon.buffer(0))


def divide(shapes, width, height, tolerance):
    """The partition of the cell of `width` by `height` into the faces of `shapes`, a list of
    (label, polygon) of which the first that holds a point wins. `tolerance(one, other)` says how
    far a border between two labels may be simplified; a label is None outside all shapes. Slivers
    between shapes go to the neighbour with the longest common border."""
    prepared = [(label, prep(polygon)) for label, polygon in shapes]

    def label_at(x, y):
        point = Point(x, y)
        return next((label for label, polygon in prepared if polygon.contains(point)), None)

    frame = box(0, 0, width, height).exterior
    lines = [LineString(ring.coords) for _, polygon in shapes for ring in rings_of(polygon)]
    borders = []
    for chain in _chains(lines + [frame]):
        if not _is_along(chain, width, height):
            chain = _simplified(chain, tolerance(*(label_at(x, y) for x, y in _sides(chain))))
        borders.append(chain)
    faces = list(polygonize(unary_union(borders)))
    labels = [label_at(*face.representative_point().coords[0]) for face in faces]
    _close_slivers(faces, labels)
    partition = {}
    for label, face in zip(labels, faces):
        if label is not None:
            partition.setdefault(label, []).append(face)
    return {label: parts[0] if len(parts) == 1 else unary_union(parts)
            for label, parts in partition.items()}


def quarters(partition, width, height):
    """The partitions of the four quarters of a cell: south-west, south-east, north-west,
    north-east, each moved to its own corner."""
    result = []
    for row in (0, 1):
        for column in (0, 1):
            x, y = column * width / 2, row * height / 2
            frame = box(x, y, x + width / 2, y + height / 2)
            parts = {label: MultiPolygon(polygons_of(geometry.intersection(frame)))
                     for label, geometry in partition.items()}
            result.append({label: translate(part, -x, -y)
                           for label, part in parts.items() if not part.is_empty})
    return result


def _chains(lines):
    """The line work as maximal chains between the points where three or more borders meet."""
    lines = unary_union(lines)
    if lines.geom_type == "LineString":
        return [lines]
    merged = linemerge(lines)
    return list(getattr(merged, "geoms", (merged,)))


def _is_along(chain, width, height):
    """Whether the chain runs along the frame of the cell: those must meet the next cell's."""
    west, south, east, north = chain.bounds
    return (east == west and west in (0, width)) or (south == north and south in (0, height)) or (
        all(x in (0, width) or y in (0, height) for x, y in chain.coords))


def _sides(chain):
    """One point to the left and one to the right of the middle of the chain."""
    middle = chain.interpolate(0.5, normalized=True)
    ahead = chain.interpolate(chain.length * 0.5 + min(_SIDE, chain.length * 0.1))
    dx, dy = ahead.x - middle.x, ahead.y - middle.y
    scale = _SIDE / (math.hypot(dx, dy) or 1)
    return ((middle.x - dy * scale, middle.y + dx * scale),
            (middle.x + dy * scale, middle.y - dx * scale))


def _simplified(chain, tolerance):
    if chain.is_ring:
        west, south, east, north = chain.bounds
        tolerance = min(tolerance, max(east - west, north - south) / 8)
    return chain.simplify(tolerance, preserve_topology=False)


def _close_slivers(faces, labels):
    labelled = [index for index, label in enumerate(labels) if label is not None]
    for index, face in enumerate(faces):
        if labels[index] is not None or 2 * face.area / face.length > _SLIVER_WIDTH:
            continue
        common = {}
        for other in labelled:
            if faces[other].intersects(face):
                length = face.boundary.intersection(faces[other].boundary).length
                common[labels[other]] = common.get(labels[other], 0) + length
        if common and max(common.values()) > 0:
            labels[index] = max(sorted(common), key=common.get)

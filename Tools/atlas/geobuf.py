# SPDX-License-Identifier: Apache-2.0
"""Reads polygons out of geobuf data: a protocol-buffer form of GeoJSON whose coordinates are packed
differences. Only what polygon collections need is understood; anything else is an error."""

import numpy

import protobuf

_DIMENSIONS = 2
_DEFAULT_PRECISION = 6
_POLYGON = 4
_MULTI_POLYGON = 5


def polygons(data):
    """The features of a collection, each as (text of its first property, list of polygons); a
    polygon is a list of rings, a ring an array of (x, y) in units of 10^-6 degree without the
    repeated first point."""
    result = []
    for number, value in protobuf.fields(memoryview(data)):
        if number == 2 and value != _DIMENSIONS:
            raise ValueError("coordinates are not pairs")
        if number == 3 and value != _DEFAULT_PRECISION:
            raise ValueError("precision is not six digits")
        if number == 4:
            result += [_feature(feature) for kind, feature in protobuf.fields(value) if kind == 1]
    return result


def _feature(data):
    shape, name = [], None
    for number, value in protobuf.fields(data):
        if number == 1:
            shape = _geometry(value)
        elif number == 13 and name is None:
            name = bytes(dict(protobuf.fields(value))[1]).decode()
    return name, shape


def _geometry(data):
    kind, lengths, coordinates = 0, None, numpy.zeros(0, dtype=numpy.uint64)
    for number, value in protobuf.fields(data):
        if number == 1:
            kind = value
        elif number == 2:
            lengths = [int(length) for length in protobuf.packed(value)]
        elif number == 3:
            coordinates = protobuf.packed(value)
    steps = ((coordinates >> numpy.uint64(1)).astype(numpy.int64) ^
             -(coordinates & numpy.uint64(1)).astype(numpy.int64)).reshape(-1, _DIMENSIONS)
    if kind not in (_POLYGON, _MULTI_POLYGON):
        raise ValueError(f"geometry of type {kind}")
    if kind == _POLYGON or lengths is None:
        return [_rings(steps, lengths or [len(steps)])[0]]
    shape, numbers = [], lengths[1:]
    for _ in range(lengths[0]):
        count, numbers = numbers[0], numbers[1:]
        rings, steps = _rings(steps, numbers[:count])
        shape.append(rings)
        numbers = numbers[count:]
    return shape


def _rings(steps, lengths):
    rings = []
    for length in lengths:
        rings.append(numpy.cumsum(steps[:length], axis=0))
        steps = steps[length:]
    return rings, steps

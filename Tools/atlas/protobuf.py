# SPDX-License-Identifier: Apache-2.0
"""Reads protocol-buffer messages whose shape the caller knows: varints, length-delimited fields and
packed varints. Any other wire type is an error, not a guess."""

import numpy


def fields(data):
    """Yields (number, value) of each field of a message: an int for a varint, a memoryview for a
    length-delimited field."""
    position = 0
    while position < len(data):
        key, position = _varint(data, position)
        if key & 7 == 0:
            value, position = _varint(data, position)
        elif key & 7 == 2:
            value, position = _delimited(data, position)
        else:
            raise ValueError(f"wire type {key & 7} in a protocol-buffer message")
        yield key >> 3, value


def messages(data):
    """Yields each message of a file that holds one after the other, each behind its length."""
    position = 0
    while position < len(data):
        message, position = _delimited(data, position)
        yield message


def signed(value):
    """Undoes the zig-zag coding of a varint."""
    return (value >> 1) ^ -(value & 1)


def packed(data):
    """The varints of a packed field, as an array of unsigned 64-bit numbers."""
    raw = numpy.frombuffer(data, dtype=numpy.uint8)
    if raw.size == 0:
        return numpy.zeros(0, dtype=numpy.uint64)
    ends = numpy.flatnonzero(raw < 0x80)
    starts = numpy.concatenate(([0], ends[:-1] + 1))
    shifts = numpy.arange(raw.size) - numpy.repeat(starts, ends - starts + 1)
    parts = (raw & 0x7F).astype(numpy.uint64) << (shifts * 7).astype(numpy.uint64)
    return numpy.add.reduceat(parts, starts)


def _varint(data, position):
    value = shift = 0
    while True:
        byte = data[position]
        position += 1
        value |= (byte & 0x7F) << shift
        if byte < 0x80:
            return value, position
        shift += 7


def _delimited(data, position):
    length, position = _varint(data, position)
    return data[position:position + length], position + length

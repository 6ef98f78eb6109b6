"""Weight files ("mvw"): reading and writing of named, typed values.

A file is a plain run of records without header or padding, all little-endian: name length (u32),
name, type code (i32), value. Type codes: 0 float, 1 int, 2 bytes, 3 vector, 4 matrix, 5 list of
vectors, 6 list of matrices. Matrices are row-major float32. The reader here is for our own files
and raises on damage; the engine has its own forgiving one.
"""

from __future__ import annotations

import struct
from pathlib import Path
from typing import Union

import numpy as np

Value = Union[float, int, bytes, np.ndarray, list]
Weight = dict[str, Value]

FLOAT, INT, BYTES, VECTOR, MATRIX, VECTORS, MATRICES = range(7)


def type_code(value: Value) -> int:
    """The record type a Python value is stored as."""
    if isinstance(value, (bool, np.bool_)):
        raise TypeError('a switch is stored as b"t" or b"f"')
    if isinstance(value, (float, np.floating)):
        return FLOAT
    if isinstance(value, (int, np.integer)):
        return INT
    if isinstance(value, bytes):
        return BYTES
    if isinstance(value, np.ndarray) and value.ndim in (1, 2):
        return VECTOR if value.ndim == 1 else MATRIX
    if isinstance(value, list) and value and all(isinstance(v, np.ndarray) for v in value):
        if all(v.ndim == 1 for v in value):
            return VECTORS
        if all(v.ndim == 2 for v in value):
            return MATRICES
    raise TypeError(f"no record type holds {type(value).__name__}")


def _vector(values: np.ndarray) -> bytes:
    return struct.pack("<I", len(values)) + np.ascontiguousarray(values, "<f4").tobytes()


def _matrix(values: np.ndarray) -> bytes:
    return struct.pack("<Ii", *values.shape) + np.ascontiguousarray(values, "<f4").tobytes()


def encode_value(value: Value) -> bytes:
    code = type_code(value)
    if code == FLOAT:
        return struct.pack("<f", value)
    if code == INT:
        return struct.pack("<i", value)
    if code == BYTES:
        return struct.pack("<I", len(value)) + value
    if code == VECTOR:
        return _vector(value)
    if code == MATRIX:
        return _matrix(value)
    encode = _vector if code == VECTORS else _matrix
    return struct.pack("<I", len(value)) + b"".join(encode(v) for v in value)


def encode(weight: Weight) -> bytes:
    """The bytes of a weight file, records in the order of the dictionary."""
    records = []
    for name, value in weight.items():
        key = name.encode()
        records.append(struct.pack("<I", len(key)) + key + struct.pack("<i", type_code(value)) + encode_value(value))
    return b"".join(records)


def write(path: Path, weight: Weight) -> None:
    """Writes to a neighbour first, so that a crash never leaves half a model."""
    partial = Path(f"{path}.partial")
    partial.write_bytes(encode(weight))
    partial.replace(path)


class _Cursor:
    def __init__(self, data: bytes) -> None:
        self.data = data
        self.position = 0

    def take(self, count: int) -> bytes:
        if count < 0 or count > len(self.data) - self.position:
            raise ValueError("the weight file ends inside a record")
        self.position += count
        return self.data[self.position - count : self.position]

    def number(self, form: str):
        return struct.unpack(form, self.take(4))[0]

    def floats(self, count: int) -> np.ndarray:
        return np.frombuffer(self.take(4 * count), "<f4").copy()

    def vector(self) -> np.ndarray:
        return self.floats(self.number("<I"))

    def matrix(self) -> np.ndarray:
        rows, cols = self.number("<I"), self.number("<i")
        return self.floats(rows * cols).reshape(rows, cols)


def decode(data: bytes) -> Weight:
    """Every record of a weight file; of a name that occurs twice the first value counts."""
    cursor = _Cursor(data)
    weight: Weight = {}
    while cursor.position < len(data):
        name = cursor.take(cursor.number("<I")).decode()
        code = cursor.number("<i")
        if code == FLOAT:
            value: Value = cursor.number("<f")
        elif code == INT:
            value = cursor.number("<i")
        elif code == BYTES:
            value = cursor.take(cursor.number("<I"))
        elif code == VECTOR:
            value = cursor.vector()
        elif code == MATRIX:
            value = cursor.matrix()
        elif code == VECTORS:
            value = [cursor.vector() for _ in range(cursor.number("<I"))]
        elif code == MATRICES:
            value = [cursor.matrix() for _ in range(cursor.number("<I"))]
        else:
            raise ValueError(f"unknown type code {code} of {name!r}")
        weight.setdefault(name, value)
    return weight


def read(path: Path) -> Weight:
    return decode(Path(path).read_bytes())

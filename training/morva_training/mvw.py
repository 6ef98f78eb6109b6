"""Weight files ("mvw"): reading and writing of named, typed values.

A file is a plain run of records without header or padding, all little-endian: name length (u32),
name, type code (i32), value. Type codes: 0 float, 1 int, 2 bytes, 3 vector, 4 matrix, 5 list of
vectors, 6 list of matrices. Matrices are row-major float32. Bytes named "half:NAME" hold type code and
value of NAME with floats of 16 bits: packages carry models so. The reader here is for our own files
and raises on damage; the engine has its own forgiving one.

    python -m morva_training.mvw MODEL.mvw HALVED.mvw
"""

from __future__ import annotations

import struct
import sys
from pathlib import Path
from typing import Union

import numpy as np

Value = Union[float, int, bytes, np.ndarray, list]
Weight = dict[str, Value]

FLOAT, INT, BYTES, VECTOR, MATRIX, VECTORS, MATRICES = range(7)
HALF = "half:"


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


def _array(values: np.ndarray, floats: str) -> bytes:
    counts = struct.pack("<I" if values.ndim == 1 else "<Ii", *values.shape)
    return counts + np.ascontiguousarray(values, floats).tobytes()


def encode_value(value: Value, floats: str = "<f4") -> bytes:
    code = type_code(value)
    if code == FLOAT:
        return struct.pack("<f", value)
    if code == INT:
        return struct.pack("<i", value)
    if code == BYTES:
        return struct.pack("<I", len(value)) + value
    if code in (VECTOR, MATRIX):
        return _array(value, floats)
    return struct.pack("<I", len(value)) + b"".join(_array(v, floats) for v in value)


def _fits_halves(value: Value) -> bool:
    if type_code(value) < VECTOR:
        return False
    arrays = value if isinstance(value, list) else [value]
    with np.errstate(over="ignore"):
        return all(np.isfinite(v).all() and np.array_equal(v, v.astype("<f2")) for v in arrays)


def _half(name: str, value: Value) -> tuple[str, Value]:
    if not _fits_halves(value):
        return name, value
    return HALF + name, struct.pack("<i", type_code(value)) + encode_value(value, "<f2")


def halved(weight: Weight) -> Weight:
    """The same weight in less room: what 16 bits hold without loss is kept in them."""
    return dict(_half(name, value) for name, value in weight.items())


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
    def __init__(self, data: bytes, floats: str = "<f4") -> None:
        self.data = data
        self.position = 0
        self.form = np.dtype(floats)

    def take(self, count: int) -> bytes:
        if count < 0 or count > len(self.data) - self.position:
            raise ValueError("the weight file ends inside a record")
        self.position += count
        return self.data[self.position - count : self.position]

    def number(self, form: str):
        return struct.unpack(form, self.take(4))[0]

    def floats(self, count: int) -> np.ndarray:
        return np.frombuffer(self.take(self.form.itemsize * count), self.form).astype("<f4")

    def vector(self) -> np.ndarray:
        return self.floats(self.number("<I"))

    def matrix(self) -> np.ndarray:
        rows, cols = self.number("<I"), self.number("<i")
        return self.floats(rows * cols).reshape(rows, cols)

    def value(self, code: int) -> Value:
        if code == FLOAT:
            return self.number("<f")
        if code == INT:
            return self.number("<i")
        if code == BYTES:
            return self.take(self.number("<I"))
        if code == VECTOR:
            return self.vector()
        if code == MATRIX:
            return self.matrix()
        if code == VECTORS:
            return [self.vector() for _ in range(self.number("<I"))]
        if code == MATRICES:
            return [self.matrix() for _ in range(self.number("<I"))]
        raise ValueError(f"unknown type code {code}")

    def record(self) -> tuple[str, Value]:
        name = self.take(self.number("<I")).decode()
        value = self.value(self.number("<i"))
        if isinstance(value, bytes) and name.startswith(HALF):
            inside = _Cursor(value, "<f2")
            return name.removeprefix(HALF), inside.value(inside.number("<i"))
        return name, value


def decode(data: bytes) -> Weight:
    """Every record of a weight file; of a name that occurs twice the first value counts."""
    cursor = _Cursor(data)
    weight: Weight = {}
    while cursor.position < len(data):
        weight.setdefault(*cursor.record())
    return weight


def read(path: Path) -> Weight:
    return decode(Path(path).read_bytes())


if __name__ == "__main__":
    write(Path(sys.argv[2]), halved(read(Path(sys.argv[1]))))

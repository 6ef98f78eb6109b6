"""The weight file format: what is written is what is read, byte for byte as described."""

from __future__ import annotations

import struct

import numpy as np
import pytest

from morva_training import mvw

MATRIX = np.arange(6, dtype=np.float32).reshape(2, 3)
WEIGHT = {
    "float": 0.5,
    "int": -7,
    "bytes": b"text",
    "vector": MATRIX[0],
    "matrix": MATRIX,
    "vectors": [MATRIX[0], MATRIX[1, :0]],
    "matrices": [MATRIX, MATRIX.T, MATRIX[:, :0]],
}


def equal(a: mvw.Value, b: mvw.Value) -> bool:
    if isinstance(a, list):
        return len(a) == len(b) and all(map(equal, a, b))
    return type(a) is type(b) and np.array_equal(a, b)


def test_round_trip_and_every_cut() -> None:
    data = mvw.encode(WEIGHT)
    back = mvw.decode(data)
    assert list(back) == list(WEIGHT) and all(equal(WEIGHT[key], back[key]) for key in WEIGHT)
    between = {len(mvw.encode(dict(list(WEIGHT.items())[:n]))) for n in range(len(WEIGHT))}
    for cut in range(len(data)):
        if cut in between:
            assert len(mvw.decode(data[:cut])) < len(WEIGHT)
        else:
            with pytest.raises((ValueError, struct.error)):
                mvw.decode(data[:cut])


def test_bytes_of_a_matrix_record() -> None:
    expected = struct.pack("<I", 1) + b"W" + struct.pack("<iIi6f", 4, 2, 3, *range(6))
    assert mvw.encode({"W": MATRIX.astype(np.float64)}) == expected


def test_first_of_two_equal_names_counts() -> None:
    assert mvw.decode(mvw.encode({"a": 1}) + mvw.encode({"a": 2}))["a"] == 1


@pytest.mark.parametrize("value", [True, None, [], np.zeros((1, 1, 1)), "text"])
def test_values_without_a_record_type_are_refused(value: object) -> None:
    with pytest.raises(TypeError):
        mvw.encode({"x": value})

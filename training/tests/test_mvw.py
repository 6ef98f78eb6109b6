"""The weight file format: what is written is what is read, byte for byte as described."""

from __future__ import annotations

import struct

import numpy as np
import pytest

from morva_training import mvw


def random_value(rng: np.random.Generator) -> mvw.Value:
    def vector() -> np.ndarray:
        return rng.standard_normal(rng.integers(0, 9)).astype(np.float32)

    def matrix() -> np.ndarray:
        return rng.standard_normal((rng.integers(0, 5), rng.integers(0, 5))).astype(np.float32)

    kind = rng.integers(7)
    if kind == mvw.FLOAT:
        return float(np.float32(rng.standard_normal()))
    if kind == mvw.INT:
        return int(rng.integers(-(2**31), 2**31))
    if kind == mvw.BYTES:
        return rng.bytes(int(rng.integers(0, 12)))
    if kind == mvw.VECTOR:
        return vector()
    if kind == mvw.MATRIX:
        return matrix()
    return [vector() if kind == mvw.VECTORS else matrix() for _ in range(rng.integers(1, 4))]


def same(a: mvw.Value, b: mvw.Value) -> bool:
    if isinstance(a, list):
        return len(a) == len(b) and all(same(x, y) for x, y in zip(a, b))
    if isinstance(a, np.ndarray):
        return a.shape == b.shape and np.array_equal(a, b)
    return type(a) is type(b) and a == b


@pytest.mark.parametrize("seed", range(20))
def test_round_trip(seed: int) -> None:
    rng = np.random.default_rng(seed)
    weight = {f"name {n}": random_value(rng) for n in range(rng.integers(1, 9))}
    back = mvw.decode(mvw.encode(weight))
    assert list(back) == list(weight)
    assert all(same(weight[k], back[k]) for k in weight)


def test_bytes_of_a_matrix_record() -> None:
    matrix = np.array([[1.0, 2.0, 3.0], [4.0, 5.0, 6.0]])
    expected = struct.pack("<I", 1) + b"W" + struct.pack("<iIi6f", 4, 2, 3, 1, 2, 3, 4, 5, 6)
    assert mvw.encode({"W": matrix}) == expected


def test_first_of_two_equal_names_counts() -> None:
    data = mvw.encode({"a": 1}) + mvw.encode({"a": 2})
    assert mvw.decode(data)["a"] == 1


def test_every_cut_is_noticed_or_lies_between_records() -> None:
    weight = {"a": 1, "b": np.ones(3, np.float32), "c": [np.ones((2, 2), np.float32)], "d": b"text"}
    data = mvw.encode(weight)
    whole = {len(mvw.encode(dict(list(weight.items())[:n]))) for n in range(5)}
    for cut in range(len(data)):
        if cut in whole:
            assert len(mvw.decode(data[:cut])) < 4
        else:
            with pytest.raises((ValueError, struct.error)):
                mvw.decode(data[:cut])


@pytest.mark.parametrize("value", [True, None, [], np.zeros((1, 1, 1)), "text"])
def test_values_without_a_record_type_are_refused(value: object) -> None:
    with pytest.raises(TypeError):
        mvw.encode({"x": value})

"""Frames, bands, level gain: whole-recording code against the frame-by-frame reference."""

from __future__ import annotations

import numpy as np
import pytest

from morva_training.engine import ActiveEnergy, pooling_starts
from morva_training.spectra import (
    FULL_32K,
    SMALL_8K,
    SMALL_16K,
    Layout,
    analyse,
    compress_bands,
    frame_energies,
    frames_of,
    hamming_window,
    level_gains,
    log_features,
    synthesise,
    vorbis_window,
    with_context,
)

LAYOUTS = [FULL_32K, SMALL_16K, SMALL_8K, Layout(16000, 512, 0), Layout(16000, 512, 4)]


def test_windows() -> None:
    assert np.allclose(vorbis_window(4), [0, np.sqrt(0.5), 1, np.sqrt(0.5)])
    assert np.allclose(hamming_window(5), [0.08, 0.54, 1, 0.54, 0.08])
    for size in (160, 320, 640):
        squares = np.square(vorbis_window(size).astype(np.float64))
        assert np.allclose(squares[: size // 2] + squares[size // 2 :], 1)


@pytest.mark.parametrize("layout", LAYOUTS)
def test_groups_double_their_width_once_per_octave(layout: Layout) -> None:
    """Against a literal walk over the bins."""
    single, widths, position, width = layout.bins >> layout.compress, [], 0, 1
    boundary = 2 * single
    while position < layout.bins:
        if position == single and layout.compress:
            width = 2
        if position == boundary and width > 1:
            width, boundary = 2 * width, 2 * boundary
        widths.append(width)
        position += width
    assert layout.band_widths().tolist() == widths
    assert len(widths) == layout.bands
    assert layout.band_widths().sum() == layout.bins


@pytest.mark.parametrize(("layout", "bands"), [(FULL_32K, 100), (SMALL_16K, 80), (SMALL_8K, 60)])
def test_shipped_band_counts(layout: Layout, bands: int) -> None:
    assert layout.bands == bands


@pytest.mark.parametrize(("bins", "features"), [(121, 61), (129, 65)])
def test_voice_pooling_counts(bins: int, features: int) -> None:
    assert len(pooling_starts(bins)) == features


@pytest.mark.parametrize("layout", LAYOUTS)
def test_a_mask_of_one_returns_the_input_one_hop_later(layout: Layout) -> None:
    rng = np.random.default_rng(3)
    samples = rng.standard_normal(layout.hop * 30).astype(np.float32) * 1000
    result = synthesise(analyse(samples, layout), layout)
    assert len(result) == len(samples)
    assert np.abs(result[layout.hop :] - samples[: -layout.hop]).max() < 0.01
    assert np.abs(result[: layout.hop]).max() < 0.01


def test_sums_of_bands_keep_the_power() -> None:
    power = np.random.default_rng(1).random((7, 320))
    bands = compress_bands(power, FULL_32K)
    assert np.allclose(bands.sum(-1), power.sum(-1))
    assert np.allclose(bands[:, :40], power[:, :40])
    assert np.allclose(bands[:, 40], power[:, 40:42].sum(-1))


@pytest.mark.parametrize("seed", range(6))
def test_level_gain_equals_the_stream(seed: int) -> None:
    rng = np.random.default_rng(seed)
    active = int(rng.integers(3, 40))
    loud = rng.random(120) < 0.6
    frames = rng.standard_normal((120, 64)) * np.where(loud, 10 ** rng.uniform(0, 4, 120), 0.5)[:, None]
    stream = ActiveEnergy(active, 100.0, 4e6)
    expected = [2000.0 / np.sqrt(stream(frame)) for frame in frames]
    gains = level_gains(np.square(frames).mean(1), active)
    assert np.allclose(gains, expected, rtol=1e-5)


def test_a_long_history_outweighs_the_start() -> None:
    gains = level_gains(np.full(50, 1e4), 300, history=1e4)
    assert np.allclose(gains, 20.0)


def test_frame_energy_from_spectra() -> None:
    samples = np.random.default_rng(2).standard_normal(320 * 400).astype(np.float32) * 300
    estimate = frame_energies(analyse(samples, FULL_32K), FULL_32K.frame)[1:]
    true = np.square(frames_of(samples, 320)).mean(-1)[1:]
    assert abs(np.mean(estimate / true) - 1) < 0.02


def test_features_of_silence_are_the_offset() -> None:
    features = log_features(np.zeros((3, 321), np.complex64), np.ones(3, np.float32), FULL_32K)
    assert np.allclose(features, np.log(1000))


def test_context_is_oldest_first() -> None:
    features = np.arange(8, dtype=np.float32).reshape(4, 2)
    joined = with_context(features, 3)
    assert joined[3].tolist() == [2, 3, 4, 5, 6, 7]
    assert joined[0].tolist() == [0, 0, 0, 0, 0, 1]

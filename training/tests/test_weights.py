"""Weight files: what is written is what is read, and what training computes with the values over whole
recordings is what the engine computes frame by frame."""

from __future__ import annotations

import struct
from pathlib import Path

import numpy as np
import pytest
import torch
from tree import ROOT

import morva
from morva_training import mvw
from morva_training.clean import cleaned
from morva_training.convert import half_precision, layout_of, network_of, noise_weight, voice_weight
from morva_training.corpus import read_audio
from morva_training.describe import described
from morva_training.networks import BandNetwork, LayerNormGatedNetwork, PlainGatedNetwork, Shape, network_input
from morva_training.spectra import (
    BANDS_16K,
    BANDS_48K,
    FULL_32K,
    SMALL_8K,
    SMALL_16K,
    analyse,
    frame_energies,
    frames_of,
)
from morva_training.spectra import level_gains, power_of
from morva_training.voice import stream_features


def test_every_cut_is_noticed_or_lies_between_records() -> None:
    m = np.arange(6, dtype=np.float32).reshape(2, 3)
    weight = {"f": 0.5, "i": -7, "b": b"b", "v": m[0] / 3, "m": m, "vs": [m[0], m[1, :0]], "ms": [m, m.T, m[:, :0]]}
    data = mvw.encode(weight)
    assert repr(mvw.decode(data + mvw.encode({"i": 9}))) == repr(weight), "of two equal names the first counts"
    halved = mvw.halved(weight)
    assert set(weight) - set(halved) == {"m", "vs", "ms"} and repr(mvw.decode(mvw.encode(halved))) == repr(weight)
    between = {len(mvw.encode(dict(list(weight.items())[:n]))) for n in range(len(weight))}
    for cut in range(len(data)):
        if cut in between:
            assert len(mvw.decode(data[:cut])) < len(weight)
        else:
            with pytest.raises((ValueError, struct.error)):
                mvw.decode(data[:cut])


@pytest.mark.parametrize("value", [True, None, [], np.zeros((1, 1, 1)), "text"])
def test_values_without_a_record_type_are_refused(value: object) -> None:
    with pytest.raises(TypeError):
        mvw.encode({"x": value})


def recording(rate: int) -> np.ndarray:
    """Speech in noise with a silent stretch, 16-bit scale."""
    samples = read_audio(ROOT / "examples/audio/noisy.flac", rate)[: 3 * rate] * 32768
    samples[rate : rate + rate // 5] = 0
    return samples


def assert_same_sound(weight: mvw.Weight, path: Path, frame_ms: int) -> None:
    layout = layout_of(weight)
    samples = recording(layout.rate)
    expected = cleaned(samples, network_of(weight), layout, *(torch.from_numpy(weight[k]) for k in ("MU", "SD")))
    result = morva.denoise(samples / 32768, layout.rate, frame_ms=frame_ms, model=str(path)) * 32768
    assert np.abs(expected - samples).max() > 100 and np.abs(expected).max() > 100, "it must be heard to do something"
    assert np.abs(result - expected)[: -4 * layout.frame].max() < 0.1


def assert_same_scores(weight: mvw.Weight, path: Path, frame_ms: int) -> None:
    samples = recording(8000)
    features = torch.from_numpy(stream_features(samples[None], 8 * frame_ms)[0])
    network, scale = network_of(weight), torch.sqrt(torch.from_numpy(weight["SD"]) + 1e-7)
    x = network_input(features[None], torch.from_numpy(weight["MU"]), scale, 5)
    y = network(x, network.initial_state(1))[0][0, :, 0].detach().numpy()
    low, high = weight["Test_MINMAX"]
    expected = np.interp(y, [low, weight["Test_BestF1"][0], high], [0, 0.5, 1]).clip(1e-5, 0.99999)
    scores = morva.voice(samples / 32768, 8000, frame_ms=frame_ms, model=str(path))
    assert np.ptp(expected) > 1e-3 and np.abs(scores[: len(expected)] - expected).max() < 1e-3


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
@pytest.mark.parametrize(
    "kind", [(LayerNormGatedNetwork, 3), (PlainGatedNetwork, 2), (PlainGatedNetwork, 4), (BandNetwork, 2), "voice"]
)
def test_random_weight(kind: tuple[type, int] | str, frame_ms: int, tmp_path: Path) -> None:
    """The engine agrees with what is written, the card says its cost, and halves are halves."""
    torch.manual_seed(frame_ms)
    rng, path = np.random.default_rng(frame_ms), tmp_path / "random.mvw"
    layout = (FULL_32K, SMALL_16K, SMALL_8K, SMALL_8K)[frame_ms // 10 - 1]
    if kind == "voice":
        network = PlainGatedNetwork(305, 16, 1, linear_output=True)
    elif kind[0] is BandNetwork:
        layout = (BANDS_48K, BANDS_16K)[frame_ms % 20 // 10]
        network = BandNetwork(Shape(layout.bands, 3, channels=20, across=12 * (frame_ms % 20 > 0)))
    else:
        network = kind[0](layout.preview * layout.bands, 24, layout.bands, kind[1])
    for parameter in network.parameters():  # biases and gains included
        torch.nn.init.normal_(parameter, float(parameter.detach().mean()), 0.1)
    if kind == "voice":
        weight = voice_weight(network, rng.uniform(8, 12, 61), rng.uniform(4, 9, 61), [-3.0, 0.1, 4.0])
    else:
        count = layout.features
        weight = noise_weight(network, layout, rng.uniform(10, 15, count), rng.uniform(2, 4, count), "")
    weight["ModelName"] = f"random {kind} {frame_ms}".encode()  # equal names are one model
    mvw.write(path, weight)
    (assert_same_scores if kind == "voice" else assert_same_sound)(mvw.read(path), path, frame_ms)
    if isinstance(network, BandNetwork):
        return
    matrices = [p for p in network.parameters() if p.dim() == 2]
    assert described(weight)["multiply-adds per frame"] == sum(p.numel() for p in matrices)
    halves = half_precision(weight)["WeightGRU"]
    assert np.array_equal(halves, halves.astype(np.float16)) and np.allclose(halves, weight["WeightGRU"], 1e-3, 1e-6)


@pytest.mark.parametrize("path", sorted((ROOT / "models").glob("*.mvw")), ids=lambda path: path.stem)
def test_shipped_weight(path: Path) -> None:
    weight = mvw.read(path)
    (assert_same_scores if b"VAD" in weight["Version"] else assert_same_sound)(weight, path, 10)


def test_level_gain_follows_the_last_active_frames() -> None:
    """The energies come from the spectra, silence does not count, and a long history outweighs the start."""
    samples = torch.randn(320 * 400, generator=torch.Generator().manual_seed(2)) * 300
    estimate = frame_energies(power_of(analyse(samples, FULL_32K)), FULL_32K.frame)[1:]
    assert (estimate / frames_of(samples, 320).square().mean(-1)[1:]).mean().item() == pytest.approx(1, abs=0.02)
    energies = torch.cat([torch.full((2, 50), 1e4), torch.zeros(2, 20), torch.full((2, 90), 4e4)], 1)
    gains = level_gains(energies, 60, history=torch.tensor([np.nan, 1e4]))
    assert np.allclose(gains[1, :50], 20.0) and np.allclose(gains[0, 49], 2000 / np.sqrt((4e6 + 50e4) / 51), rtol=1e-5)
    assert np.allclose(gains[:, -1], 10.0), "after sixty active frames nothing else is left"

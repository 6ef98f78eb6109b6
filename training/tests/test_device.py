"""Mixtures drawn many at once, state carried from piece to piece, and stores that travel."""

from __future__ import annotations

from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest
import torch

from morva_training import drift, pack, recurrence, train_noise, unpack
from morva_training.batches import Batch
from morva_training.corpus import Corpus
from morva_training.drawing import active_levels, interpolated
from morva_training.mixing import RECIPES, Recipe
from morva_training.pool import Pool
from morva_training.scenes import SceneMaker

CPU = torch.device("cpu")
BARE = Recipe(
    seconds=2.0, clean_share=0.0, noise_only_share=0.0, room_share=0.0, clip_share=0.0, level_db=(-30.0, -30.0)
)


def maker(store: Path, recipe: Recipe, seed: int = 1) -> SceneMaker:
    return SceneMaker(Pool.of(store, recipe, seed, 0.0, 1, CPU), recipe, seed, CPU)


@pytest.mark.parametrize("snr", [-5.0, 25.0])
def test_scenes_have_the_levels_and_ratios_of_their_recipe(store: Path, snr: float) -> None:
    made = maker(store, replace(BARE, snr_db=(snr, snr), second_noise_share=0.5, gain_step_share=0.5)).draw(12)
    speech, noise = (active_levels(x, 640) for x in (made["speech"], made["heard"] - made["speech"]))
    assert torch.allclose(20 * torch.log10(speech / 32768), torch.tensor(-30.0), atol=0.05)
    assert torch.allclose(20 * torch.log10(speech / noise), torch.tensor(snr), atol=0.1)
    assert len({tuple(row) for row in made["speech"][:, :9000:1000].tolist()}) > 10, "no two alike"
    assert 0 < made["wideband"].sum() < 12


def test_scenes_without_speech_and_without_noise(store: Path) -> None:
    nobody = maker(store, replace(BARE, noise_only_share=1.0)).draw(4)
    assert not nobody["has_speech"].any() and not nobody["speech"].any() and nobody["wideband"].all()
    clean = maker(store, replace(BARE, clean_share=1.0)).draw(4)
    assert (active_levels(clean["heard"] - clean["speech"], 640) < 0.03 * active_levels(clean["speech"], 640)).all()


def test_every_part_of_a_recipe_is_heard_and_sound(store: Path) -> None:
    """All shares at one or half: what is late is not wanted, full scale is the limit, nothing is without a number."""
    shares = dict.fromkeys((name for name in vars(BARE) if name.endswith("_share")), 1.0)
    shares |= {"noise_only_share": 0.0, "clean_share": 0.0, "synthetic_share": 0.2, "babble_share": 0.1}
    shares |= {"made_share": 0.3, "texture_share": 0.2, "whisper_share": 0.5}
    every = replace(RECIPES["widened"], seconds=2.0, **shares)
    for batch in (maker(store, every).draw(8), maker(store, replace(every, codec_share=0.0, gap_share=0.0)).draw(8)):
        assert all(torch.isfinite(batch[name]).all() for name in ("speech", "heard"))
        assert batch["heard"].abs().max() <= 32768.0
        assert (active_levels(batch["heard"], 640) > 10.0).all() and (active_levels(batch["speech"], 640) > 1.0).all()


@pytest.mark.parametrize("speed", [0.75, 1.35])
def test_other_speeds_keep_the_level_and_add_nothing(speed: float) -> None:
    tone = (10000 * torch.sin(2 * torch.pi * 7000.0 / 32000 * torch.arange(40000))).to(torch.int16)
    since = torch.arange(20000)
    heard = interpolated(tone, torch.full_like(since, 100), since, torch.full((20000,), speed))
    spectrum = np.abs(np.fft.rfft(heard.numpy() * np.hanning(20000))) / 20000 * 4
    frequency = np.arange(len(spectrum)) * 32000 / 20000
    assert frequency[spectrum.argmax()] == pytest.approx(7000 * speed, rel=1e-3)
    assert spectrum.max() == pytest.approx(10000, rel=0.05)
    assert spectrum[np.abs(frequency - 7000 * speed) > 40].max() < 30.0


@pytest.mark.parametrize("network", [["8k", "--hidden", "8"], ["16k", "--band-shared", "--channels", "8"]])
def test_a_state_that_is_carried_is_that_of_the_whole(
    store: Path, tmp_path: Path, capsys: pytest.CaptureFixture, network: list[str]
) -> None:
    """And a run on the device goes on from part to part."""
    options = ["--store", store, "--run", tmp_path, "--on-device", "--carry", 3, "--seconds", 1, "--batch", 4]
    options += ["--made-hours", 0, "--steps", 4, "--workers", 0, *network]
    arguments = [*map(str, options)]
    task = train_noise.NoiseTask(train_noise.parse(arguments))
    batch = next(iter(task.batches(1)))
    whole, parts = Batch.of(batch, task.layout, CPU), list(task.prepared(batch))
    count = task.layout.features
    task.standardise([5.0] * count, [2.0] * count)
    model = task.network(None)
    at_once = task.outputs(model, vars(whole))
    assert torch.allclose(torch.cat([task.outputs(model, part) for part in parts], 1), at_once, atol=1e-4)
    train_noise.main(arguments)
    drift.main([str(tmp_path), "--store", str(store), "--seconds", "2", "--stretch", "1", "--pieces", "1"])
    first, second = capsys.readouterr().out.splitlines()[1:]
    assert first.split()[3:6] == first.split()[6:], "both have heard all there was"
    assert float(second.split()[3]) == pytest.approx(float(second.split()[6]), abs=1e-3), (
        "a second is less than --before"
    )


@pytest.mark.parametrize("dim,both_ways,state", [(0, False, True), (-2, True, False)])
def test_compiled_recurrence_is_that_of_the_framework(dim: int, both_ways: bool, state: bool) -> None:
    """Results and all gradients, over rows that fill no whole block and sizes that fill no whole vector."""
    torch.manual_seed(1)
    gru, x = torch.nn.GRU(11, 7, bidirectional=both_ways), torch.randn(9, 5, 13, 11, requires_grad=True)
    before = torch.randn(65, 7) if state else None
    ours = recurrence.recurrent(gru, x, dim, before)
    moved = x.movedim(dim, 0)
    theirs = gru(moved.flatten(1, 2), before if before is None else before[None])[0]
    theirs = theirs.unflatten(1, moved.shape[1:3]).movedim(0, dim)
    assert recurrence.library() and torch.allclose(ours, theirs, atol=1e-6)
    wanted = torch.randn_like(ours)
    gradients = [torch.autograd.grad((y * wanted).sum(), [x, *gru.parameters()]) for y in (ours, theirs)]
    for one, other in zip(*gradients):
        assert torch.allclose(one, other, atol=2e-5)


def test_a_store_travels_in_parts(store: Path, tmp_path: Path) -> None:
    """Everybody's sentences and noises arrive, whole and what they were; nothing held out leaves."""
    pack.main(["--store", str(store), "--out", str(tmp_path), "--megabytes", "0.35", "--parts", "9"])
    found = sorted(tmp_path.glob("*.zip"))
    assert len(found) > 1 and all(part.stat().st_size <= 350e3 for part in found)
    unpack.unpack(found, tmp_path / "store", 1)
    home, away = Corpus(store), Corpus(tmp_path / "store")
    for kind in ("speech", "noise"):
        for split in ("train", "dev"):
            arrived = {clip.path: clip for clip in away.clips(kind, split)}
            assert arrived.keys() == {clip.path for clip in home.clips(kind, split)}
            for clip in home.clips(kind, split)[:1]:
                had, got = home.read(clip), away.read(arrived[clip.path])
                assert (clip.group, clip.band) == (arrived[clip.path].group, arrived[clip.path].band)
                assert len(had) == len(got) and np.corrcoef(had, got)[0, 1] > (0.95 if kind == "speech" else 0.5)
        assert not away.clips(kind, "heldout")
    assert len(away.rooms("train")) == len(home.rooms("train"))

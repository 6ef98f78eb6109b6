"""Whole runs on a synthetic store: they learn, they resume, and what they write can be used."""

from __future__ import annotations

import json
import socket
from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest
import soundfile
import torch

import morva
from morva_training import clean, mvw, together, train_noise, train_voice
from morva_training.convert import network_of
from morva_training.loop import Run, Schedule
from morva_training.optimisers import orthogonalised
from morva_training.reshape import grown
from morva_training.spectra import BANDS_16K, BANDS_48K


def run(program, store: Path, folder: Path, out: Path | None, *arguments: object) -> None:
    common = ("--store", store, "--run", folder, "--batch", 6, "--rate", 0.01, "--workers", 0)
    program.main([*map(str, (*arguments, *common, *(("--out", out) if out else ())))])


def entries(folder: Path, key: str) -> list[float]:
    rows = map(json.loads, (folder / "log.jsonl").read_text().splitlines())
    return [row[key] for row in rows if key in row]


def test_noise_model_learns_resumes_and_grows(store: Path, tmp_path: Path) -> None:
    folder, other, out, copy = (tmp_path / name for name in ("run", "other", "model.mvw", "copy.mvw"))
    for steps in (12, 24):
        run(train_noise, store, folder, out, "8k", "--hidden", 16, "--steps", steps)
    losses = entries(folder, "dev_loss")
    assert losses[-1] < losses[0] - 0.3, "24 steps on tones in white noise must help"
    assert len(morva.denoise(np.zeros(800, np.float32), 8000, model=str(out))) == 800
    run(train_noise, store, folder, copy, "8k", "--hidden", 16, "--steps", 0)
    assert all(np.array_equal(a, b) for a, b in zip(*(mvw.read(file)["WeightLinear"] for file in (out, copy))))
    for steps in (0, 8):
        run(train_noise, store, other, copy, "8k", "--start", out, "--hidden", 24, "--steps", steps)
    others = entries(other, "dev_loss")
    assert others[0] == pytest.approx(min(losses), abs=0.2) and others[-1] < min(losses)
    assert mvw.read(copy)["WeightGRU"].shape[1] == 24


def test_network_shared_over_bands_learns_and_cleans(store: Path, tmp_path: Path) -> None:
    """Frames do not depend on later ones; one for 48 kHz, with more blocks and a filter, starts from one for 16 kHz."""
    out, small = tmp_path / "bands.mvw", ("--channels", 8, "--across", 4, "--decoded", 8)
    run(train_noise, store, tmp_path, out, "16k", "--band-shared", *small, "--steps", 12)
    losses = entries(tmp_path, "dev_loss")
    assert losses[-1] < losses[0]
    network = network_of(mvw.read(out))
    x = torch.randn(2, 9, BANDS_16K.features)
    early, late = (network(x[:, :count], network.initial_state(2))[0][:, :5] for count in (5, 9))
    assert torch.allclose(early, late, atol=1e-5)
    soundfile.write(tmp_path / "in.wav", 0.1 * np.random.default_rng(3).standard_normal(8000), 16000)
    clean.main([str(tmp_path / name) for name in ("", "in.wav", "out.wav")])
    result, _ = soundfile.read(tmp_path / "out.wav")
    assert 0 < np.std(result) < 0.1 and len(result) == 8000
    wider = grown(network, replace(network.shape, bands=BANDS_48K.bands, depth=4, taps=2, filtered=96))
    low, y = slice(0, BANDS_16K.bands - 4), torch.zeros(1, 3, 3, BANDS_48K.bands)
    y[..., : BANDS_16K.bands] = x[:1, :3].unflatten(-1, (3, -1))
    known, more = (n(v, n.initial_state(1))[0][..., low] for n, v in ((network, x[:1, :3]), (wider, y.flatten(-2))))
    assert torch.allclose(known[..., :80], more[..., :80], atol=0.5)


def test_parts_that_are_only_compared_learn(store: Path, tmp_path: Path) -> None:
    parts = ("--channels", 8, "--taps", 2, "--ahead", 1, "--kernels", 2)
    run(train_noise, store, tmp_path, None, "16k", "--band-shared", *parts, "--steps", 12)
    ratios = entries(tmp_path, "dev_ratio_db")
    assert ratios[-1] > ratios[0] and entries(tmp_path, "dev_loss")[-1] < entries(tmp_path, "dev_loss")[0]
    with pytest.raises(SystemExit):
        run(train_noise, store, tmp_path, tmp_path / "x.mvw", "16k", "--band-shared", *parts, "--steps", 0)


def test_level_model_with_its_own_loss_weights(store: Path, tmp_path: Path) -> None:
    options = ["16k", "--plain", "--level", "--hidden", "8", "--ratio", "0.5", "--lost-speech", "7"]
    run(train_noise, store, tmp_path, tmp_path / "level.mvw", *options, "--steps", 2)
    levels = morva.noise_level(np.zeros(800), 16000, model=str(tmp_path / "level.mvw"))
    assert levels == pytest.approx([-60.0] * 5)
    args = train_noise.parse([*options, "--store", "", "--run", ""])
    weights = train_noise.NoiseTask(args).criterion.mask_loss.weights
    assert (weights.ratio, weights.lost_speech, weights.loudness) == (0.5, 7.0, 0.0)


def test_voice_model_learns_and_grows(store: Path, tmp_path: Path) -> None:
    out = tmp_path / "voice.mvw"
    run(train_voice, store, tmp_path, out, "--hidden", 12, "--layers", 3, "--steps", 12)
    areas = entries(tmp_path, "dev_auc")
    assert areas[-1] > 0.6 and mvw.read(out)["Test_MINMAX"][0] < mvw.read(out)["Test_BestF1"][0]
    assert 0 < morva.voice(np.zeros(80), 8000, model=str(out))[0] < 1
    grown = ("--start", out, "--hidden", 16, "--layers", 4, "--bfloat16", "--steps", 1)
    run(train_voice, store, tmp_path / "grown", tmp_path / "grown.mvw", *grown)
    assert entries(tmp_path / "grown", "dev_auc")[0] == pytest.approx(areas[-1], abs=0.1)


def test_orthogonal_steps_are_even_in_all_directions() -> None:
    matrix = torch.randn(40, 15, generator=torch.Generator().manual_seed(1)) * torch.logspace(-2, 0, 15)
    values = torch.linalg.svdvals(orthogonalised(matrix))
    assert values.min() > 0.3 and values.max() < 1.3


def trained(folder: Path, targets: list[float]) -> Run:
    """A one-number network that is told the targets, one after the other."""
    torch.manual_seed(1)
    one = Run(torch.nn.Linear(1, 1), folder, Schedule(len(targets), peak=0.1, warm_up=1, average=0.9))
    told = iter(targets)
    one.train(iter([{}] * len(targets)), lambda model, _: ((model(torch.ones(1, 1)) - next(told)).square().sum(), {}))
    return one


def test_the_average_follows_and_a_loss_that_is_not_finite_changes_nothing(tmp_path: Path) -> None:
    assert trained(tmp_path / "good", [3.0] * 200).averaged(torch.ones(1, 1)).item() == pytest.approx(3.0, abs=0.1)
    before, after = (trained(tmp_path / str(n), [float("nan")] * n).network.weight for n in (0, 3))
    assert torch.equal(before, after) and entries(tmp_path / "3", "ran_away") == [3]


def train_with_others(number: int, port: int, folder: Path) -> None:
    patch = pytest.MonkeyPatch()
    for name, value in {"RANK": number, "WORLD_SIZE": 2, "MASTER_ADDR": "127.0.0.1", "MASTER_PORT": port}.items():
        patch.setenv(name, str(value))
    with together.together() as rank:
        assert rank == number
        one = trained(folder, [2.0 if number else float("nan"), *([2.0 if number else 4.0] * 299)])
    torch.save([*one.network.parameters()], folder / f"{number}.pt")


def test_two_processes_train_one_network(tmp_path: Path) -> None:
    """One is told 4, the other 2, and one of them once a loss that nobody may follow."""
    with socket.create_server(("127.0.0.1", 0)) as free:
        port = free.getsockname()[1]
    torch.multiprocessing.spawn(train_with_others, (port, tmp_path), nprocs=2)
    first, second = (torch.load(tmp_path / f"{number}.pt") for number in (0, 1))
    assert all(map(torch.equal, first, second)) and abs(sum(p.item() for p in first) - 3.0) < 0.1
    assert (tmp_path / "log.jsonl").read_text().count('"step": 300') == 1

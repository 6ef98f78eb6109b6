"""Whole runs on a synthetic store: they learn, they resume, and what they write can be used."""

from __future__ import annotations

import json
import socket
import sys
from pathlib import Path

import numpy as np
import pytest
import torch

import morva
from morva_training import mvw, together, train_noise, train_voice
from morva_training.loop import Run, Schedule
from morva_training.optimisers import orthogonalised


def run_main(module, monkeypatch: pytest.MonkeyPatch, *arguments: object) -> None:
    monkeypatch.setattr(sys, "argv", ["train", *map(str, arguments)])
    module.main()


def entries(folder: Path, key: str) -> list[float]:
    rows = map(json.loads, (folder / "log.jsonl").read_text().splitlines())
    return [row[key] for row in rows if key in row]


def test_noise_model_learns_and_resumes(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    folder, out, copy = tmp_path / "run", tmp_path / "model.mvw", tmp_path / "copy.mvw"
    common = ("8k", "--store", store, "--batch", 6, "--hidden", 16, "--workers", 0, "--rate", 0.01)
    for steps in (12, 24):
        run_main(train_noise, monkeypatch, *common, "--run", folder, "--out", out, "--steps", steps)
    ratios = entries(folder, "dev_ratio_db")
    assert ratios[-1] > ratios[0] + 1.0, "24 steps on tones in white noise must help"
    assert torch.load(folder / "checkpoint.pt")["step"] == 24
    assert len(morva.denoise(np.zeros(800, np.float32), 8000, model=str(out))) == 800

    run_main(train_noise, monkeypatch, *common, "--run", folder, "--out", copy, "--steps", 0)
    a, b = mvw.read(out), mvw.read(copy)
    assert all(np.array_equal(x, y) for x, y in zip(a["WeightLinear"], b["WeightLinear"]))

    wider = (*common, "--start", out, "--hidden", 24, "--run", tmp_path / "other", "--out", copy)
    for steps in (0, 8):
        run_main(train_noise, monkeypatch, *wider, "--steps", steps)
    others = entries(tmp_path / "other", "dev_ratio_db")
    assert others[0] == pytest.approx(ratios[-1], abs=0.5) and others[-1] > ratios[-1]
    assert mvw.read(copy)["WeightGRU"].shape[1] == 24


def test_level_model(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    out, run = tmp_path / "level.mvw", tmp_path / "run"
    arguments = ["16k", "--plain", "--level", "--store", store, "--run", run, "--out", out, "--hidden", 8, "--batch", 4]
    run_main(train_noise, monkeypatch, *arguments, "--steps", 3, "--workers", 0)
    assert mvw.read(out)["Version"] == b"0.0.5"
    assert morva.noise_level(np.zeros(800), 16000, model=str(out)) == pytest.approx([-60.0] * 5)
    arguments = [*map(str, arguments), "--ratio", "0.5", "--lost-speech", "7"]
    weights = train_noise.NoiseTask(train_noise.parse(arguments)).criterion.mask_loss.weights
    assert (weights.ratio, weights.lost_speech, weights.loudness) == (0.5, 7.0, 0.0)


def test_voice_model(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    run, out = tmp_path / "run", tmp_path / "voice.mvw"
    common = ("--store", store, "--batch", 6, "--layers", 3, "--rate", 0.01, "--workers", 0)
    run_main(train_voice, monkeypatch, *common, "--run", run, "--out", out, "--hidden", 12, "--steps", 12)
    assert entries(run, "dev_auc")[-1] > 0.6
    weight = mvw.read(out)
    low, high = weight["Test_MINMAX"]
    assert low < weight["Test_BestF1"][0] < high
    assert 0 < morva.voice(np.zeros(80), 8000, model=str(out))[0] < 1
    grown = (*common, "--start", out, "--hidden", 16, "--bfloat16", "--run", tmp_path / "other")
    run_main(train_voice, monkeypatch, *grown, "--steps", 1)
    assert entries(tmp_path / "other", "dev_auc")[0] == pytest.approx(entries(run, "dev_auc")[-1], abs=0.1)


def test_orthogonal_steps_are_even_in_all_directions() -> None:
    matrix = torch.randn(40, 15, generator=torch.Generator().manual_seed(1)) * torch.logspace(-2, 0, 15)
    values = torch.linalg.svdvals(orthogonalised(matrix))
    assert values.min() > 0.3 and values.max() < 1.3


def test_schedule() -> None:
    schedule = Schedule(steps=1000, peak=1.0, warm_up=50, decay_share=0.2)
    rates = [schedule.rate(step) for step in range(1001)]
    assert rates[0] == pytest.approx(0.02) and rates[400] == 1.0
    assert rates[1000] < 1e-6 and all(a >= b for a, b in zip(rates[60:], rates[61:]))


def trained(folder: Path, steps: int, targets: list[float]) -> torch.nn.Module:
    """The average of a one-number network that is told the targets, one after the other."""
    torch.manual_seed(1)
    run = Run(torch.nn.Linear(1, 1), folder, Schedule(steps, peak=0.1, warm_up=1, average=0.9))
    told = iter(targets)
    run.train(iter([{}] * steps), lambda model, _: ((model(torch.ones(1, 1)) - next(told)).square().sum(), {}))
    torch.save(run.network.state_dict(), folder / f"{together.rank()}.pt")
    return run.averaged


def test_the_average_follows_and_a_loss_that_is_not_finite_changes_nothing(tmp_path: Path) -> None:
    assert trained(tmp_path / "good", 200, [3.0] * 200)(torch.ones(1, 1)).item() == pytest.approx(3.0, abs=0.1)
    before, after = (trained(tmp_path / f"{n}", n, [float("nan")] * n).state_dict() for n in (0, 3))
    assert all(torch.equal(before[name], after[name]) for name in before)
    assert entries(tmp_path / "3", "ran_away") == [3]


def train_with_others(number: int, port: int, folder: Path) -> None:
    patch = pytest.MonkeyPatch()
    for name, value in {"RANK": number, "WORLD_SIZE": 2, "MASTER_ADDR": "127.0.0.1", "MASTER_PORT": port}.items():
        patch.setenv(name, str(value))
    assert together.join() == number
    trained(folder, 300, [2.0 if number else float("nan"), *([2.0 if number else 4.0] * 299)])


def test_two_processes_train_one_network(tmp_path: Path) -> None:
    """One is told 4, the other 2, and one of them once a loss that nobody may follow."""
    with socket.create_server(("127.0.0.1", 0)) as free:
        port = free.getsockname()[1]
    torch.multiprocessing.spawn(train_with_others, (port, tmp_path), nprocs=2)
    first, second = (torch.load(tmp_path / f"{number}.pt") for number in (0, 1))
    assert all(torch.equal(first[name], second[name]) for name in first)
    assert abs(first["weight"].item() + first["bias"].item() - 3.0) < 0.1
    assert (tmp_path / "log.jsonl").read_text().count('"step": 300') == 1

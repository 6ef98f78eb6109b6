"""Whole runs on a synthetic store: they learn, they resume, and what they write can be used."""

from __future__ import annotations

import json
import socket
import sys
from pathlib import Path

import numpy as np
import pytest
import torch

from morva_training import mvw, snapshot, together, train_noise, train_voice
from morva_training.engine import NoiseLevelModel, NoiseModel, VoiceModel
from morva_training.loop import Run, Schedule
from morva_training.optimisers import orthogonalised


def run_main(module, monkeypatch: pytest.MonkeyPatch, *arguments: object) -> None:
    monkeypatch.setattr(sys, "argv", ["train", *map(str, arguments)])
    module.main()


def entries(folder: Path, key: str) -> list[float]:
    rows = map(json.loads, (folder / "log.jsonl").read_text().splitlines())
    return [row[key] for row in rows if key in row]


def test_noise_model_learns_and_resumes(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    folder, out = tmp_path / "run", tmp_path / "model.mvw"
    common = ("8k", "--store", store, "--out", out, "--batch", 6, "--hidden", 16, "--workers", 0)
    run_main(train_noise, monkeypatch, *common, "--run", folder, "--steps", 12, "--rate", 0.01)
    run_main(train_noise, monkeypatch, *common, "--run", folder, "--steps", 24, "--rate", 0.01)
    ratios = entries(folder, "dev_ratio_db")
    assert ratios[-1] > ratios[0] + 1.0, "24 steps on tones in white noise must help"
    assert torch.load(folder / "checkpoint.pt")["step"] == 24
    assert NoiseModel(mvw.read(out)).process(np.zeros(800, np.float32)).shape == (800,)

    copy = tmp_path / "copy.mvw"
    run_main(snapshot, monkeypatch, "8k", "--run", folder, "--out", copy)
    a, b = mvw.read(out), mvw.read(copy)
    assert all(np.array_equal(x, y) for x, y in zip(a["WeightLinear"], b["WeightLinear"]))
    assert np.array_equal(a["WeightGRU"], a["WeightGRU"].astype(np.float16)), "the engine packs such matrices tighter"

    wider = ("--start", out, "--hidden", 24, "--run", tmp_path / "other")
    run_main(train_noise, monkeypatch, *common, *wider, "--steps", 0)
    assert entries(tmp_path / "other", "dev_ratio_db")[0] == pytest.approx(ratios[-1], abs=0.5)
    for steps in (4, 8):
        run_main(train_noise, monkeypatch, *common, *wider, "--steps", steps, "--rate", 0.01)
    assert entries(tmp_path / "other", "dev_ratio_db")[-1] > ratios[-1]
    assert mvw.read(out)["WeightGRU"].shape[1] == 24


def test_level_model(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    out = tmp_path / "level.mvw"
    run_main(
        train_noise, monkeypatch, "16k", "--plain", "--level", "--store", store, "--run", tmp_path / "run",
        "--out", out, "--batch", 4, "--hidden", 8, "--steps", 3, "--workers", 0,
    )  # fmt: skip
    weight = mvw.read(out)
    assert weight["Version"] == b"0.0.5" and "WeightGRU_reset" not in weight
    model = NoiseLevelModel(weight)
    levels = [model.level(np.zeros(160, np.float32)) for _ in range(5)]
    assert levels == [pytest.approx(-60.0)] * 5


def test_voice_model(store: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    out = tmp_path / "voice.mvw"
    run_main(
        train_voice, monkeypatch, "--store", store, "--run", tmp_path / "run", "--out", out,
        "--batch", 6, "--hidden", 12, "--layers", 3, "--steps", 12, "--rate", 0.01, "--workers", 0,
    )  # fmt: skip
    assert entries(tmp_path / "run", "dev_auc")[-1] > 0.6
    weight = mvw.read(out)
    low, high = weight["Test_MINMAX"]
    assert low < weight["Test_BestF1"][0] < high
    assert 0 < VoiceModel(weight).score(np.zeros(80, np.float32)) < 1


def test_orthogonal_steps_are_even_in_all_directions() -> None:
    matrix = torch.randn(40, 15, generator=torch.Generator().manual_seed(1)) * torch.logspace(-2, 0, 15)
    values = torch.linalg.svdvals(orthogonalised(matrix))
    assert values.min() > 0.3 and values.max() < 1.3


def test_schedule() -> None:
    schedule = Schedule(steps=1000, peak=1.0, warm_up=50, decay_share=0.2)
    rates = [schedule.rate(step) for step in range(1001)]
    assert rates[0] == pytest.approx(0.02) and rates[400] == 1.0
    assert rates[1000] < 1e-6 and all(a >= b for a, b in zip(rates[60:], rates[61:]))


def test_a_loss_that_is_not_finite_changes_nothing(tmp_path: Path) -> None:
    network = torch.nn.Linear(2, 1)
    before = [p.clone() for p in network.parameters()]
    run = Run(network, tmp_path, Schedule(steps=3, checkpoint_every=1))

    def loss_of(model, _):
        return model(torch.ones(1, 2)).sum() * float("nan"), {}

    run.train(iter([{}] * 3), loss_of)
    assert all(torch.equal(a, b) for a, b in zip(before, network.parameters()))


def test_the_average_follows_the_network(tmp_path: Path) -> None:
    network = torch.nn.Linear(1, 1)
    run = Run(network, tmp_path, Schedule(steps=200, peak=0.1, warm_up=1, average=0.9))

    def loss_of(model, _):
        return (model(torch.ones(1, 1)) - 3.0).square().sum(), {}

    run.train(iter([{}] * 200), loss_of)
    result = run.averaged(torch.ones(1, 1)).item()
    assert abs(result - 3.0) < 0.1


def train_with_others(number: int, port: int, folder: Path) -> None:
    patch = pytest.MonkeyPatch()
    for name, value in {"RANK": number, "WORLD_SIZE": 2, "MASTER_ADDR": "127.0.0.1", "MASTER_PORT": port}.items():
        patch.setenv(name, str(value))
    assert together.join() == number
    torch.manual_seed(1)
    network = torch.nn.Linear(1, 1)
    run = Run(network, folder, Schedule(steps=300, peak=0.1, warm_up=1))
    targets = iter([2.0 if number else float("nan"), *([2.0 if number else 4.0] * 299)])

    def loss_of(model, _):
        return (model(torch.ones(1, 1)) - next(targets)).square().sum(), {}

    run.train(iter([{}] * 300), loss_of)
    torch.save(network.state_dict(), folder / f"{number}.pt")


def test_two_processes_train_one_network(tmp_path: Path) -> None:
    """One is told 4, the other 2, and one of them once a loss that nobody may follow."""
    with socket.create_server(("127.0.0.1", 0)) as free:
        port = free.getsockname()[1]
    torch.multiprocessing.spawn(train_with_others, (port, tmp_path), nprocs=2)
    first, second = (torch.load(tmp_path / f"{number}.pt") for number in (0, 1))
    assert all(torch.equal(first[name], second[name]) for name in first)
    assert abs(first["weight"].item() + first["bias"].item() - 3.0) < 0.1
    assert (tmp_path / "log.jsonl").read_text().count('"step": 300') == 1

"""The bench end to end on synthetic material: pairs, systems and the table."""

from __future__ import annotations

import json
import sys
from pathlib import Path

import numpy as np
import pytest
import torch

soundfile = pytest.importorskip("soundfile")
pytest.importorskip("pesq")
pytest.importorskip("pystoi")

import mixtures  # noqa: E402
import noise_level  # noqa: E402
import score  # noqa: E402
import systems  # noqa: E402
import voice  # noqa: E402

from morva_training import mvw  # noqa: E402
from morva_training.convert import noise_weight  # noqa: E402
from morva_training.mixing import active_level  # noqa: E402
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork  # noqa: E402
from morva_training.spectra import SMALL_16K  # noqa: E402
from morva_training.train_voice import voice_weight  # noqa: E402


@pytest.fixture(scope="module")
def pairs(store: Path, tmp_path_factory: pytest.TempPathFactory) -> Path:
    out = tmp_path_factory.mktemp("pairs")
    with pytest.MonkeyPatch.context() as patch:
        patch.setattr(mixtures, "babble_of", lambda rng, _store, _voices: rng.standard_normal(256000) * 100)
        mixtures.make(store, out, count=6, clean_count=1, seed=1, split="heldout")
    return out


def open_mask(layout, kind=LayerNormGatedNetwork):
    """A weight whose mask is one everywhere."""
    torch.manual_seed(1)
    network = kind(3 * layout.bands, 8, layout.bands)
    with torch.no_grad():
        network.output.zero_()
        network.output_bias.fill_(20.0)
    ones = np.ones(layout.bands)
    return noise_weight(network, layout, 10 * ones, 3 * ones, "open")


def test_pairs_have_the_named_ratio(pairs: Path) -> None:
    listing = json.loads((pairs / "pairs.json").read_text())
    assert [p["clean_only"] for p in listing] == [False] * 6 + [True]
    for pair in listing:
        noisy, clean = (soundfile.read(pairs / part / f"{pair['name']}.wav")[0] for part in ("noisy", "clean"))
        assert len(noisy) == 256000 and np.abs(clean[:30000]).max() < 1e-4
        if pair["clean_only"]:
            assert np.array_equal(noisy, clean)
            continue
        ratio = 20 * np.log10(active_level(clean) / active_level(noisy - clean))
        assert abs(ratio - pair["snr_db"]) < 0.5


def test_an_open_mask_changes_nothing(pairs: Path, tmp_path: Path) -> None:
    """Delay, scale and rate conversion of the model path are right."""
    path = tmp_path / "open.mvw"
    mvw.write(path, open_mask(SMALL_16K))
    _, process = systems.parse(f"open={path}")
    rng = np.random.default_rng(1)
    samples = (0.1 * np.convolve(rng.standard_normal(32000), np.hanning(20), "same")).astype(np.float32)
    result = process(samples, 32000)
    assert len(result) == len(samples)
    assert score.metrics.si_sdr(samples, result) > 30


def test_table_of_two_systems(pairs: Path, capsys: pytest.CaptureFixture, monkeypatch: pytest.MonkeyPatch) -> None:
    copy = f'copy={sys.executable} -c "import shutil,sys; shutil.copy(sys.argv[1], sys.argv[2])"'
    monkeypatch.setattr(sys, "argv", ["score", str(pairs), "none", copy])
    score.main()
    rows = [line for line in capsys.readouterr().out.splitlines() if line.startswith("| ")]
    assert rows[1].split("|")[2:] == rows[2].split("|")[2:], "a program that copies scores like no program"
    cells = [float(c) for c in rows[1].split("|")[2:-1]]
    assert cells[3] == 0.0 and cells[6] > 4.5


def test_a_mask_of_one_removes_nothing() -> None:
    weight = open_mask(SMALL_16K, PlainGatedNetwork)
    tone = 3000 * np.sin(2 * np.pi * 440 * np.arange(48000) / 16000)
    assert noise_level.reported(weight, tone.astype(np.float32)) < -20


def test_onset_is_counted_from_the_words_start() -> None:
    voice_blocks = np.zeros(200, bool)
    voice_blocks[[*range(50, 70), *range(75, 90), *range(130, 160), *range(195, 200)]] = True
    scores = np.zeros(200)
    scores[52:70] = scores[131:160] = 0.9
    assert voice.onset_delays(scores, voice_blocks) == [30.0, 20.0, 500.0]
    assert voice.rises(scores, voice_blocks) == [True, True, False]


def test_voice_tables(pairs: Path, tmp_path: Path) -> None:
    torch.manual_seed(2)
    network = PlainGatedNetwork(305, 6, 1, linear_output=True)
    weight = tmp_path / "voice.mvw"
    mvw.write(weight, voice_weight(network, np.full(61, 10.0), np.full(61, 5.0), [-1.0, 0.0, 1.0]))
    chosen = dict([voice.parse(f"ours={weight}"), voice.parse("peer=printf 'time,score\n0,0.2\n4,0.7\n'")])
    recordings = voice.read_recordings(pairs, 2)
    text = voice.frame_table(chosen, recordings) + voice.snr_table(chosen, recordings)
    assert all(f"| ours | {ms} ms |" in text for ms in (10, 20, 30, 40))
    assert all(f"| {name} | {recordings[0].snr_db:g} dB |" in text for name in chosen)
    scores = chosen["peer"](recordings[0].noisy, recordings[0].rate, 2)
    assert scores[0] == scores[199] == pytest.approx(0.2) and scores[200] == scores[-1] == pytest.approx(0.7)
    with pytest.raises(SystemExit, match="neither"):
        voice.parse("nothing")


def test_voice_labels_of_ones_own(store: Path, tmp_path: Path) -> None:
    (tmp_path / "audio").mkdir()
    (tmp_path / "labels").mkdir()
    soundfile.write(tmp_path / "audio" / "talk.flac", np.zeros((48000, 2)), 16000)
    (tmp_path / "labels" / "talk.txt").write_text("0.500000\t1.250000\tyes\n\n2.0,2.1\n")
    (recording,) = voice.read_recordings(tmp_path, 0)
    assert np.flatnonzero(np.diff(recording.voice.astype(int))).tolist() == [49, 124, 199, 209]
    told = {
        "told": lambda samples, rate, blocks: np.repeat(recording.voice, 1)[: 300 // blocks * blocks : blocks] * 1.0
    }
    assert "| told | 10 ms | 1.0000 | 1.0000 | 1.0000 | 1.0000 |" in voice.frame_table(told, [recording])
    assert "| 100.0% |" in voice.false_alarms({"click": [np.ones(32000)]}, {"always": lambda *_: np.ones(100)})

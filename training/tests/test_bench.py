"""The bench: its scores where the right answer is known, its programs end to end, the shipped models in short."""

from __future__ import annotations

import json
import sys
from pathlib import Path

import composite
import lost_speech
import metrics
import mixtures
import noise_level
import numpy as np
import pytest
import score
import soundfile
import systems
import voice
from tree import ROOT

from morva_training.corpus import Corpus
from morva_training.measures import active_level, best_f1, block_labels, pauses_of, quick_threshold, roc_auc, si_sdr


def noise(seconds: float, seed: int, rate: int = 16000) -> np.ndarray:
    return 0.1 * np.random.default_rng(seed).standard_normal(int(seconds * rate)).astype(np.float32)


@pytest.mark.parametrize("snr", [-5.0, 20.0])
def test_si_sdr_is_the_ratio_and_ignores_scale_mean_and_delay(snr: float) -> None:
    clean = noise(12, 1)
    result = 0.1 * (clean + noise(12, 2) * 10 ** (-snr / 20))
    assert si_sdr(clean, result + 5) == pytest.approx(snr, abs=0.1)
    reference, shifted = metrics.aligned(clean, np.concatenate([np.zeros(320), result]), 16000)
    assert len(reference) == len(clean) and si_sdr(reference, shifted) == pytest.approx(snr, abs=0.1)


@pytest.mark.parametrize("late", [-7, 0, 1, 100])
def test_alignment_takes_fractions_of_a_sample_out(late: int) -> None:
    """Sound below a quarter of the rate, `late` sevenths of a sample late."""
    low = np.fft.rfft(noise(1, 4))[:4000] * 7
    fine = np.fft.irfft(low, 7 * 16000)
    reference, shifted = metrics.aligned(fine[::7], np.roll(fine, late)[::7], 16000)
    assert si_sdr(reference[200:-200], shifted[200:-200]) > 40


def test_what_is_lost_of_the_speech_whatever_noise_is_left() -> None:
    """Bursts of hiss; above 4 kHz and in their first 30 ms halved, and noise of their own level added."""
    rate = 32000
    gates = np.repeat(np.arange(40) % 4 == 3, rate // 10)
    speech = np.where(gates, noise(4, 5, rate), 0)
    heard = speech.copy()
    for start in np.flatnonzero(np.diff(gates.astype(int)) == 1):
        heard[start : start + rate * 3 // 100] *= 0.5
    spectrum = np.fft.rfft(heard)
    spectrum[4 * 4000 :] *= 0.5
    lost = lost_speech.losses(speech, np.fft.irfft(spectrum) + noise(4, 6, rate), rate)
    assert lost.octaves[2000] == pytest.approx(lost.octaves[8000] - 6.0, abs=0.5)
    assert lost.octaves[8000] == pytest.approx(lost.treble, abs=0.3)
    assert 6 < lost.consonants < 8.5 and 8 < lost.onsets < 9.5


def test_composite_ratings_fall_with_noise_and_with_a_bent_envelope() -> None:
    clean, rate = score.read(ROOT / "examples/audio/clean.flac", 16000)
    bent = np.append(clean[0], clean[1:] - 0.9 * clean[:-1])
    same, noisy, tilted = (composite.composite(clean, x, rate, 4.5) for x in (clean, clean + noise(10, 7), bent))
    assert same[:3] == pytest.approx((5, 5, 5), abs=0.6) and same.llr == pytest.approx(0, abs=1e-6)
    assert noisy.cbak < same.cbak - 1 and tilted.llr > 0.5 and tilted.csig < same.csig


def test_pauses() -> None:
    rate = 16000
    speech = np.concatenate([np.zeros(rate, np.float32), noise(1, 3), np.zeros(rate, np.float32)])
    assert np.flatnonzero(np.diff(pauses_of(speech, rate).astype(int))).tolist() == [96, 233]
    noisy = speech + 0.1 * noise(3, 2)
    result = np.where(np.arange(3 * rate) // rate == 1, noisy, 0.1 * noisy)
    assert metrics.pause_attenuation(speech, noisy, result, rate) == pytest.approx(20, abs=0.5)
    assert np.isnan(metrics.pause_attenuation(speech[rate : 2 * rate], noisy, noisy, rate))


def test_areas_and_thresholds() -> None:
    ties = np.array([0.9, 0.4, 0.4, 0.1]), np.array([True, True, False, False])
    assert roc_auc(*ties) == pytest.approx(0.875) and best_f1(*ties) == pytest.approx((0.8, 0.4))
    rising, labels = np.arange(100.0), np.arange(100) >= 50
    assert [roc_auc(scores, labels) for scores in (rising, -rising)] == [1.0, 0.0]
    assert [quick_threshold(rising, labels, slack) for slack in (0.0, 0.02)] == [50.0, 48.0]


def test_voice_labels() -> None:
    """A gap of 190 ms is voice and one of 220 ms none, islands are dropped, a soft ending is voice until it is over;
    a hum below all voices, as loud as the words, is none."""
    parts = [(60, 0), (20, 1), (19, 0), (10, 1), (22, 0), (5, 1), (12, 0.02), (30, 0), (1, 1), (60, 0)]
    gain = np.repeat([level for _, level in parts], [80 * blocks for blocks, _ in parts])
    words = np.random.default_rng(1).standard_normal(len(gain)) * (3000 * gain + 1)
    voice, weight = block_labels(words, 80)
    assert np.flatnonzero(np.diff(voice.astype(int))).tolist() == [59, 108, 130, 147]
    assert weight[60] == 2.0 and weight[0] == 1.0
    humming, weight = block_labels(words + 3000 * np.sin(2 * np.pi * 30 / 8000 * np.arange(len(words))), 80)
    assert not humming[:59].any() and (humming & ~voice).sum() <= 6 and weight[1:50].min() == 1.0
    assert humming[62:107].all(), "the words are still heard"


@pytest.fixture(scope="module")
def pairs(store: Path, tmp_path_factory: pytest.TempPathFactory) -> Path:
    out = tmp_path_factory.mktemp("pairs")
    mixtures.make(store, out, count=4, clean_count=1, seed=1, split="heldout")
    return out


def test_pairs_have_the_named_ratio(pairs: Path) -> None:
    listed = json.loads((pairs / "pairs.json").read_text())
    assert [p["place"] for p in listed].count("room") == 2 and sum(p["faint"] for p in listed) == 1
    for pair in listed:
        noisy, clean = (soundfile.read(pairs / part / f"{pair['name']}.wav")[0] for part in ("noisy", "clean"))
        assert len(noisy) == 256000 and np.abs(clean[:30000]).max() < 1e-4, "a second of noise before the first word"
        if pair["place"] == "dry":
            share = 0.0 if pair["snr_db"] is None else 10 ** (-pair["snr_db"] / 20)
            assert active_level(noisy - clean, 32000) == pytest.approx(share * active_level(clean, 32000), rel=0.05)


def test_a_reference_in_a_room_keeps_its_early_reflections_only(store: Path) -> None:
    draw = mixtures.Draw(Corpus(store), "heldout", 2.0, 1)
    draw.rooms = [np.zeros(10000, np.float32)]
    draw.rooms[0][[80, 1000, 5000]] = 1.0, 0.5, 0.25
    whole, early = draw.in_room(np.eye(1, 64000, dtype=np.float32)[0])
    assert whole[[80, 1000, 5000]] == pytest.approx([1, 0.5, 0.25], abs=1e-5)
    assert early[[80, 1000, 5000]] == pytest.approx([1, 0.5, 0], abs=1e-5)


def test_tables(pairs: Path, tmp_path: Path, capsys: pytest.CaptureFixture, monkeypatch: pytest.MonkeyPatch) -> None:
    """A program that copies, and its earlier figures, score like no program; worse than the input is nobody."""
    copy = f'copy={sys.executable} -c "import shutil,sys; shutil.copy(sys.argv[1], sys.argv[2])"'
    kept = str(tmp_path / "scores.json")
    monkeypatch.setattr(sys, "argv", ["score", str(pairs), copy, f"made={pairs}/noisy", "--json", kept])
    score.main()
    monkeypatch.setattr(sys, "argv", ["score", str(pairs), "none", "--with", kept, "--by", "place"])
    capsys.readouterr()
    score.main()
    tables = [[line.split("|")[1:-1] for line in t.splitlines()] for t in capsys.readouterr().out.split("\n\n")]
    sound, _, losses, worse, dry, room = (t[0][:1] + t[2:] for t in tables)
    assert all(t[1][1:] == t[2][1:] == t[3][1:] for t in (sound, losses, worse)), "copy, made, none"
    assert float(sound[1][4]) == 0.0 and float(sound[1][7]) > 4.5 and worse[1][1:] == [" 0 "] * 3
    assert int(sound[4][1]) == 4 and int(sound[4][6]) == int(sound[4][9]) == 1, "recordings that count"
    both = np.mean([[float(part[1][column]) for column in (2, 3)] for part in (dry, room)], axis=0)
    assert both == pytest.approx([float(sound[1][1]), float(sound[1][2])], abs=0.002)


def test_systems_are_compared_over_the_same_recordings_digital_silence_or_not() -> None:
    silent = score.score_pair(noise(2, 2), noise(2, 1), np.zeros(32000, np.float32), 16000)
    assert np.isnan(silent["pesq"]) and np.isnan(silent["si_sdr"])
    results = {
        "good": [{"name": "a", "pesq": 2.0}, {"name": "b", "pesq": 4.0}],
        "bad": [{"name": "a", "pesq": 1.0}, {"name": "b", **silent}],
    }
    assert [values["pesq"] for values in score.middles(results).values()] == [2.0, 1.0]
    assert "bad has no PESQ on 1 recordings: b" in score.omissions(results)


@pytest.mark.parametrize(("stem", "rate"), [("NC_small_8k", 8000), ("NC_small_16k", 16000), ("c6.xs.f.ca03f4", 32000)])
def test_shipped_suppressors_help_and_do_no_harm(stem: str, rate: int) -> None:
    """On the bundled pair. The real figures come from bench/quality; here only what must never break is held."""
    _, process = systems.parse(f"ours={ROOT / 'models' / stem}.mvw")
    noisy, clean = (score.read(ROOT / f"examples/audio/{name}.flac", rate)[0] for name in ("noisy", "clean"))
    row = score.score_pair(noisy, clean, process(noisy, rate, ""), rate)
    assert row["si_sdr_gain"] > 3 and row["pause"] > 15
    assert score.score_pair(clean, clean, process(clean, rate, ""), rate)["clean_si_sdr"] > 15


@pytest.mark.parametrize("slope", [0.0, -0.5])
def test_the_shipped_level_of_steady_noise(slope: float) -> None:
    hiss = noise_level.coloured(np.random.default_rng(1), slope)
    hiss *= 10 ** (45 / 20) / np.sqrt(np.mean(hiss**2))
    assert noise_level.reported(ROOT / "models/noise_level_16k.mvw", hiss) == pytest.approx(45, abs=1)


def test_onset_is_counted_from_the_words_start() -> None:
    blocks, scores = np.zeros(200, bool), np.zeros(200)
    blocks[[*range(50, 70), *range(75, 90), *range(130, 160), *range(195, 200)]] = True
    scores[52:70] = scores[131:160] = 0.9
    assert voice.onset_delays(scores, blocks) == [30.0, 20.0, 500.0]
    assert voice.rises(scores, blocks) == [True, True, False]


def test_voice_tables(pairs: Path, tmp_path: Path) -> None:
    """On pairs, and on recordings with labels of one's own."""
    peer = "peer=printf 'time,score\n0,0.2\n4,0.7\n'"
    chosen = dict([voice.parse(f"ours={ROOT}/models/VAD_weight.mvw"), voice.parse(peer)])
    recordings = voice.read_recordings(pairs, 2)
    text = voice.frame_table(chosen, recordings) + voice.snr_table(chosen, recordings)
    assert all(f"| ours | {ms} ms |" in text for ms in (10, 20, 30, 40))
    assert all(f"| {name} | {recordings[-1].snr_db:g} dB |" in text for name in chosen)
    scores = chosen["peer"](recordings[0].noisy, recordings[0].rate, 2)
    assert scores[[0, 199, 200, -1]] == pytest.approx([0.0, 0.1, 0.2, 0.45]), "a score is there when its frame is over"
    assert "| 100.0% |" in voice.false_alarms({"click": [np.ones(32000)]}, 32000, {"always": lambda *_: np.ones(100)})

    for name in ("audio", "labels"):
        (tmp_path / name).mkdir()
    soundfile.write(tmp_path / "audio/talk.flac", np.zeros((48000, 2)), 16000)
    (tmp_path / "labels/talk.txt").write_text("0.500000\t1.250000\tyes\n\n2.0,2.1\n")
    (recording,) = voice.read_recordings(tmp_path, 0)
    assert np.flatnonzero(np.diff(recording.voice.astype(int))).tolist() == [49, 124, 199, 209]

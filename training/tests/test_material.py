"""Made noise, textures, rooms, channels and altered voices, and data folders from published recordings."""

from __future__ import annotations

import csv
import sys
from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest
import soundfile

from morva_training import originals
from morva_training.channels import CODECS, Channel
from morva_training.measures import active_level, level_db, si_sdr
from morva_training.mixing import RECIPES, MixtureMaker
from morva_training.synthesis import KINDS, texture
from morva_training.synthesis.sources import moving_noise
from morva_training.voices import formants_moved

RATE = 32000


@pytest.mark.parametrize("rate", [8000, 32000])
def test_made_noise_is_sound_and_new_each_time(rate: int) -> None:
    for kind in KINDS:
        rng = np.random.default_rng(5)
        first, second = (kind(rng, 3 * rate, rate) for _ in range(2))
        for samples in (first, second):
            assert samples.shape == (3 * rate,) and samples.dtype == np.float32, kind
            assert np.isfinite(samples).all() and active_level(samples, rate) > 0.0, kind
        assert abs(np.corrcoef(first, second)[0, 1]) < 0.9, kind


def test_a_texture_has_the_statistics_of_its_recording_and_no_period() -> None:
    """Bands that are loud and soft in turns; the fresh noise resembles the recording in nothing but that."""
    rng = np.random.default_rng(6)
    wave = 1.5 * np.sin(2 * np.pi * 2.0 * np.arange(320) / 62.5)[:, None]
    gains = np.where(np.arange(26) < 12, wave, -wave - 1.0)
    clip = 1000 * moving_noise(rng, gains, 5 * RATE, RATE)
    made = texture.played(rng, texture.measured(clip, RATE), 6 * RATE, RATE)
    had, got = (texture.measured(samples, RATE) for samples in (clip, made))
    for statistics in (np.ptp, np.median):
        difference = [statistics(t.levels[2:15, 3:24], axis=0) for t in (had, got)]
        difference = (difference[0] - difference[1]) * 8.7
        assert np.abs(difference - np.median(difference)).mean() < 2.5
    assert (got.together @ got.together)[4, 20] < -0.4, "the two halves take turns"
    spectrum = np.abs(np.fft.rfft(made, 2 * len(made))) ** 2
    repeats = np.fft.irfft(spectrum)[RATE // 4 : 5 * RATE]
    assert repeats.max() < 0.15 * np.sum(made**2)


def test_recordings_are_joined_without_a_seam(store: Path) -> None:
    maker = MixtureMaker(store, 3, replace(RECIPES["plain"], seconds=12.0, noise_speed_share=0.0))
    tone = 1000 * np.sin(2 * np.pi * 100 * np.arange(96000) / RATE)
    maker.corpus.read = lambda clip, offset, length: tone[offset : offset + length].astype(np.float32)
    joined = maker.recorded()
    assert np.abs(np.diff(joined)).max() < 2.2 * np.abs(np.diff(tone)).max()
    assert min(np.square(joined[:-640].reshape(-1, 640)).mean(1)[3:]) > 0.0, "and without a hole"


def test_what_is_late_is_heard_and_not_wanted(store: Path) -> None:
    rooms = replace(RECIPES["widened"], seconds=2.0, room_share=1.0, codec_share=0.0, noise_only_share=0.0)
    maker = MixtureMaker(store, 4, rooms)
    for waves in [maker.draw() for _ in range(8)]:
        assert waves.late is not None and waves.late.any() and np.isfinite(waves.heard()).all()
        other = waves.remixed(maker.draw(), 40.0)
        assert np.array_equal(other.heard(), other.channel.heard(other.speech + other.noise + other.late, RATE))


@pytest.mark.parametrize("codec", CODECS)
def test_codecs_coarsen_what_is_heard(store: Path, codec: str) -> None:
    speech = MixtureMaker(store, 5).draw().heard().astype(np.float32)
    fine, coarse = (si_sdr(speech, Channel(None, codec, c).heard(speech, RATE)) for c in (0.0, 1.0))
    assert 40.0 > fine > coarse > 0.0, (fine, coarse)


def test_a_moved_formant_leaves_the_pitch() -> None:
    time = np.arange(RATE) / RATE
    voice = sum(np.exp(-(((150 * k - 1000) / 300) ** 2)) * np.sin(2 * np.pi * 150 * k * time) for k in range(1, 30))
    voice = (1000 * voice).astype(np.float32)
    moved = formants_moved(voice, RATE, 1.18, 14000.0)
    before, after = (np.abs(np.fft.rfft(x)) ** 2 for x in (voice, moved))
    hertz = np.arange(len(before))
    assert (after @ hertz / after.sum()) / (before @ hertz / before.sum()) == pytest.approx(1.15, abs=0.1)
    assert after[hertz % 150 == 0].sum() > 0.95 * after.sum()


def test_originals_take_the_place_of_copies_and_keep_the_split(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    rng, old, out = np.random.default_rng(8), tmp_path / "old", tmp_path / "out"
    old.mkdir()
    (old / "speech.tsv").write_text("path\tsource\tspeaker\tsplit\na.opus\tx\ts1\ttrain\nb.opus\ty\ts2\ttrain\n")
    rows = []
    for speaker, split, floor in (("s1", "train", 3e-3), ("s3", "heldout", 3e-3), ("s4", "train", 0.05)):
        said = floor * rng.standard_normal(48000)
        said[16000:32000] += 0.3 * rng.standard_normal(16000)
        soundfile.write(tmp_path / f"{speaker}.wav", said, 16000)
        path = str(tmp_path / f"{speaker}.wav")
        rows.append(f"speech\t{path}\tx\t{speaker}\t{split}\tx\n")
    (tmp_path / "t.tsv").write_text("kind\tpath\tsource\tspeaker\tsplit\treplaces\n" + "".join(rows))
    arguments = ["--table", str(tmp_path / "t.tsv"), "--data", str(old), "--out", str(out)]
    monkeypatch.setattr(sys, "argv", ["originals", *arguments])
    originals.main()
    speech, noise = (list(csv.DictReader((out / f"{kind}.tsv").open(), delimiter="\t")) for kind in ("speech", "noise"))
    assert [(r["speaker"], r["split"]) for r in speech] == [("s1", "train"), ("s3", "heldout"), ("s2", "train")]
    assert float(speech[0]["seconds"]) == pytest.approx(1.3, abs=0.05), "without the silence around it"
    assert [r["recording"] for r in noise] == ["room of s1"], "nobody's who is held out, nothing that is too loud"
    tone = originals.read({"path": str(out / noise[0]["path"])})[0]
    assert level_db(tone) == pytest.approx(20 * np.log10(3e-3), abs=1.0)

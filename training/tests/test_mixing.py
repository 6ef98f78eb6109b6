"""Mixtures: who may be heard, at which ratio, and that a seed says it all."""

from __future__ import annotations

import json
from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest

from morva_training import corpus
from morva_training.batches import MixtureBatches, make_item
from morva_training.mixing import (
    MixtureMaker,
    Recipe,
    Warped,
    active_level,
    in_dev,
    simulated_room,
    smooth_gain,
    whispered,
)
from morva_training.spectra import FULL_32K, SMALL_8K, SMALL_16K

PLAIN = Recipe(seconds=2.0, clean_share=0.0, noise_only_share=0.0, room_share=0.0, clip_share=0.0, band_limit_share=0.0)


def maker(store: Path, recipe: Recipe = PLAIN, seed: int = 1, **options) -> MixtureMaker:
    return MixtureMaker(store, seed, recipe, **options)


def test_a_seed_gives_the_same_mixtures(store: Path) -> None:
    first, second, other = maker(store), maker(store), maker(store, seed=2)
    for _ in range(3):
        a, b, c = first.draw(), second.draw(), other.draw()
        assert np.array_equal(a.speech, b.speech) and np.array_equal(a.noise, b.noise)
        assert not np.array_equal(a.speech, c.speech)


def test_held_out_and_validation_material_is_never_drawn(store: Path) -> None:
    heard = {clip.path for group in maker(store).speakers.values() for clip in group}
    noises = {clip.path for group in maker(store).categories.values() for clip in group}
    speech, noise = corpus.Store(store, "speech"), corpus.Store(store, "noise")
    allowed = {c.path for c in speech.clips if c.split == "train" and not in_dev(c, "speech")}
    assert heard == allowed and heard
    assert noises == {c.path for c in noise.clips if c.split == "train" and not in_dev(c, "noise")}
    held_out = maker(store, split="heldout")
    assert {c.split for group in held_out.speakers.values() for c in group} == {"heldout"}


def test_the_customary_test_speakers_are_dropped(tmp_path: Path) -> None:
    table = tmp_path / "speech.tsv"
    speakers = ["vctk_p231", "vctk_p232", "p257", "vctk_p258"]
    table.write_text("path\tspeaker\n" + "".join(f"x\t{s}\n" for s in speakers))
    assert [row["speaker"] for row in corpus.read_manifest(table)] == ["vctk_p231", "vctk_p258"]


@pytest.mark.parametrize("snr", [-5.0, 10.0, 25.0])
def test_signal_to_noise_ratio(store: Path, snr: float) -> None:
    recipe = replace(PLAIN, snr_db=(snr, snr), second_noise_share=0.0, synthetic_share=1.0)
    waves = maker(store, recipe).draw_waves()
    measured = 20 * np.log10(active_level(waves.speech) / active_level(waves.noise))
    assert abs(measured - snr) < 0.5


def test_shares_of_silence_and_clean_speech(store: Path) -> None:
    noise_only = maker(store, replace(PLAIN, noise_only_share=1.0)).draw_waves()
    assert not noise_only.has_speech and not noise_only.speech.any() and noise_only.noise.any()
    clean = maker(store, replace(PLAIN, clean_share=1.0)).draw_waves()
    assert not clean.noisy
    assert active_level(clean.noise) < 0.03 * active_level(clean.speech)


def test_clipping_counts_as_disturbance(store: Path) -> None:
    waves = maker(store, replace(PLAIN, clip_share=1.0, clean_share=1.0)).draw_waves()
    noisy = np.abs(waves.speech + waves.noise)
    assert np.sum(noisy > 0.999 * noisy.max()) > 5
    assert noisy.max() < 0.95 * np.abs(waves.speech).max()


def test_remixing_keeps_the_speech(store: Path) -> None:
    make = maker(store)
    first, second = make.draw(), make.draw()
    mixed = first.remixed(second, 5.0)
    assert mixed.speech is first.speech
    scale = mixed.noise[50, 40:50] / second.noise[50, 40:50]
    assert np.allclose(scale, scale[0])
    power = [np.mean(np.abs(x[:, :256]) ** 2) for x in (mixed.speech, mixed.noise)]
    assert abs(10 * np.log10(power[0] / power[1]) - 5.0) < 0.1


def test_lower_rates_come_from_the_same_store(store: Path) -> None:
    low, high = corpus.Store(store, "speech", 8000), corpus.Store(store, "speech")
    for a, b in zip(low.clips, high.clips):
        x, y = low.read(a), high.read(b)
        assert len(x) == len(y) // 4
        level = [np.sqrt(np.mean(np.square(v))) for v in (x, y)]
        assert abs(20 * np.log10(level[0] / level[1])) < 3.0


def test_a_whisper_keeps_the_words_and_loses_the_voice() -> None:
    """Loudness over time stays, the harmonics go."""
    rng = np.random.default_rng(6)
    rate = 32000
    time = np.arange(2 * rate) / rate
    voice = sum(np.sin(2 * np.pi * 150 * k * time) for k in range(1, 40)) * (np.sin(2 * np.pi * 2 * time) > 0)
    whisper = whispered(rng, voice.astype(np.float32), rate)
    assert len(whisper) == len(voice)
    blocks = [np.square(x.reshape(-1, 640)).mean(1) for x in (voice, whisper)]
    assert np.corrcoef(*blocks)[0, 1] > 0.7
    lag = rate // 150

    def periodicity(x: np.ndarray) -> float:
        x = x[2000:14000]
        return float(np.corrcoef(x[:-lag], x[lag:])[0, 1])

    assert periodicity(voice) > 0.9 and abs(periodicity(whisper)) < 0.3


def test_rooms_and_equalisers_keep_their_scale() -> None:
    rng = np.random.default_rng(4)
    for _ in range(20):
        room = simulated_room(rng, 32000)
        assert room[0] == 1.0 and np.isfinite(room).all() and np.sum(room**2) < 3.0
        gain = smooth_gain(rng, 321, 32000, 3.0)
        assert (gain > 0).all() and np.abs(np.diff(20 * np.log10(gain))).max() < 6.0


def test_equalisers_have_the_same_shape_for_any_number_of_bins() -> None:
    fine, coarse = (20 * np.log10(smooth_gain(np.random.default_rng(7), bins, 8000, 4.5)) for bins in (20001, 81))
    assert np.abs(fine[::250] - coarse).max() < 0.01
    assert np.ptp(fine[1000:19000]) > 3.0, "200 to 3800 Hz are what it is for"


@pytest.mark.parametrize("factor", [0.7, 1.4])
def test_a_warped_recording_keeps_its_level_and_has_no_images(store: Path, factor: float) -> None:
    """A tone moves by the factor, and nothing else appears."""
    rate = 8000
    warped = Warped(store, "speech", rate)
    tone = 1000 * np.sin(2 * np.pi * 2700.0 / 16000 * np.arange(32000)).astype(np.float32)
    warped.fine.read = lambda clip, offset, length: tone[:length]
    piece = warped.read(warped.fine.clips[0], 0, 8000, factor)
    assert abs(len(piece) - 8000) < 100
    spectrum = np.abs(np.fft.rfft(piece[500:7500] * np.hanning(7000))) / 7000 * 4
    peak = np.argmax(spectrum) * rate / 7000
    assert peak == pytest.approx(2700 * factor, rel=0.02)
    assert np.sqrt(2 * np.mean(np.square(piece[500:-500]))) == pytest.approx(1000, rel=0.02)
    away = np.abs(np.arange(len(spectrum)) * rate / 7000 - peak) > 60
    assert spectrum[away].max() < 3.0


@pytest.mark.parametrize("layout", [FULL_32K, SMALL_16K, SMALL_8K], ids=lambda layout: str(layout.rate))
def test_batch_shapes(store: Path, layout) -> None:
    recipe = replace(PLAIN, noise_only_share=0.3, clean_share=0.2)
    batch = next(iter(MixtureBatches(store, layout, recipe, 6, seed=3)))
    for name, value in batch.items():
        assert value.shape[0] == 6 and (value.dim() == 1 or value.shape[1:] == (200, layout.bands)), name
        assert value.isfinite().all(), name


def test_features_do_not_depend_on_the_loss_scale(store: Path) -> None:
    """Louder by 20 dB in a long stream: the level gain makes the features the same."""
    mixture = maker(store).draw()
    louder = replace(mixture, speech=mixture.speech * 10, noise=mixture.noise * 10)

    class Late:  # a stream that has been running, with the same history every time
        def random(self) -> float:
            return 0.0

        def uniform(self, *_: float) -> float:
            return 0.0

    a = make_item(mixture, SMALL_16K, Late())["features"]
    b = make_item(louder, SMALL_16K, Late())["features"]
    assert (a - b).abs().max() < 0.05


def test_store_index_is_complete(store: Path) -> None:
    clips = json.loads((store / "speech.json").read_text())
    total = (store / "speech-32000.i16").stat().st_size // 2
    assert sum(c["length"] for c in clips) == total

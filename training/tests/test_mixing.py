"""Mixtures: at which ratio, with what say, and that a seed says it all."""

from __future__ import annotations

from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest

from morva_training.batches import MixtureBatches
from morva_training.measures import active_level
from morva_training.mixing import MixtureMaker, Recipe, Warped, Waves, simulated_room, smooth_gain, whispered
from morva_training.spectra import FULL_32K, SMALL_8K, SMALL_16K

PLAIN = Recipe(seconds=2.0, clean_share=0.0, noise_only_share=0.0, room_share=0.0, clip_share=0.0, band_limit_share=0.0)


def maker(store: Path, seed: int = 1, **changes) -> MixtureMaker:
    return MixtureMaker(store, seed, replace(PLAIN, **changes))


def test_a_seed_gives_the_same_mixtures(store: Path) -> None:
    first, second, other = maker(store), maker(store), maker(store, 2)
    for _ in range(3):
        a, b, c = first.draw(), second.draw(), other.draw()
        assert np.array_equal(a.speech, b.speech) and np.array_equal(a.noise, b.noise)
        assert not np.array_equal(a.speech, c.speech)


@pytest.mark.parametrize("snr", [-5.0, 25.0])
def test_drawn_and_remixed_ratios_are_measured_alike(store: Path, snr: float) -> None:
    """With everything that changes levels: a second noise, equalisers, band limits."""
    make = maker(store, snr_db=(snr, snr), second_noise_share=1.0, band_limit_share=1.0)
    first, second = make.draw(), make.draw()
    for waves in (first, second, first.remixed(second, snr)):
        measured = 20 * np.log10(active_level(waves.speech, 32000) / active_level(waves.noise, 32000))
        assert measured == pytest.approx(snr, abs=0.1)
    assert first.remixed(second, snr).speech is first.speech


def test_shares_of_silence_and_clean_speech(store: Path) -> None:
    for seed in range(4):  # whoever would have spoken: nobody is heard, and all bands are known
        nobody = maker(store, seed, noise_only_share=1.0).draw()
        assert not nobody.has_speech and not nobody.speech.any() and nobody.noise.any() and nobody.wideband
    clean = maker(store, clean_share=1.0).draw()
    assert not clean.noisy
    assert active_level(clean.noise, 32000) < 0.03 * active_level(clean.speech, 32000)


def test_clipped_pieces_are_clipped_sound_and_pass_nothing_on(store: Path) -> None:
    make = maker(store, clip_share=1.0, snr_db=(5.0, 5.0))
    first, second = make.draw(), make.draw()
    for waves in (first, first.remixed(second, 5.0)):
        total, heard = waves.speech + waves.noise, waves.heard()
        limit = np.abs(heard).max()
        assert limit < 0.91 * np.abs(total).max() and np.sum(np.abs(heard) == limit) > 5
        assert np.array_equal(heard, np.clip(total, -limit, limit))
    ratio = first.remixed(second, 5.0).noise / second.noise
    assert np.allclose(ratio, ratio[0], rtol=1e-3), "the other's noise, without what clipping did to the other"
    assert np.abs(Waves(np.full(640, 4e4), np.zeros(640), 32000, True, True, True).heard()).max() == 32768


def test_a_whisper_keeps_the_words_and_loses_the_voice() -> None:
    """Loudness over time stays, the harmonics go."""
    rate, time = 32000, np.arange(64000) / 32000
    voice = sum(np.sin(2 * np.pi * 150 * k * time) for k in range(1, 40)) * (np.sin(2 * np.pi * 2 * time) > 0)
    whisper = whispered(np.random.default_rng(6), voice.astype(np.float32), rate)
    assert np.corrcoef(*[np.square(x.reshape(-1, 640)).mean(1) for x in (voice, whisper)])[0, 1] > 0.7
    lag = rate // 150
    periodicity = [np.corrcoef(x[2000 : 14000 - lag], x[2000 + lag : 14000])[0, 1] for x in (voice, whisper)]
    assert periodicity[0] > 0.9 and abs(periodicity[1]) < 0.3


def test_rooms_and_equalisers_keep_their_scale() -> None:
    rng = np.random.default_rng(4)
    for _ in range(20):
        room = simulated_room(rng, 32000)
        assert room[0] == 1.0 and np.isfinite(room).all() and np.sum(room**2) < 3.0
    fine, coarse = (20 * np.log10(smooth_gain(np.random.default_rng(7), bins, 8000, 4.5)) for bins in (20001, 81))
    assert np.abs(fine[::250] - coarse).max() < 0.01, "the same shape for any number of bins"
    assert np.ptp(fine[1000:19000]) > 3.0 and np.abs(np.diff(coarse)).max() < 6.0


@pytest.mark.parametrize("factor", [0.7, 1.4])
def test_a_warped_recording_keeps_its_level_and_has_no_images(store: Path, factor: float) -> None:
    """A tone moves by the factor, and nothing else appears."""
    rate = 8000
    warped = Warped(store, rate)
    tone = 1000 * np.sin(2 * np.pi * 2700.0 / 16000 * np.arange(32000)).astype(np.float32)
    warped.fine.read = lambda clip, offset, length: tone[:length]
    piece = warped.read(warped.fine.clips("speech", "train")[0], 0, 8000, factor)
    assert abs(len(piece) - 8000) < 100
    spectrum = np.abs(np.fft.rfft(piece[500:7500] * np.hanning(7000))) / 7000 * 4
    peak = np.argmax(spectrum) * rate / 7000
    assert peak == pytest.approx(2700 * factor, rel=0.02)
    assert np.sqrt(2 * np.mean(np.square(piece[500:-500]))) == pytest.approx(1000, rel=0.02)
    assert spectrum[np.abs(np.arange(len(spectrum)) * rate / 7000 - peak) > 60].max() < 3.0


@pytest.mark.parametrize("layout", [FULL_32K, SMALL_16K, SMALL_8K], ids=lambda layout: str(layout.rate))
def test_batches(store: Path, layout) -> None:
    recipe = replace(PLAIN, noise_only_share=0.3, clean_share=0.2)
    batch = next(iter(MixtureBatches(store, layout, recipe, 6, seed=3)))
    for name, value in batch.items():
        assert value.shape[0] == 6 and (value.dim() == 1 or value.shape[1:] == (200, layout.bands)), name
        assert value.isfinite().all(), name

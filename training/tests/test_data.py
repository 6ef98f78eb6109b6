"""The corpus, a store that is one whole, and its mixtures: who is heard where, at which ratio, with what say."""

from __future__ import annotations

from dataclasses import replace
from pathlib import Path

import numpy as np
import pytest
import soundfile

from morva_training import corpus
from morva_training.corpus import Corpus
from morva_training.measures import active_level
from morva_training.channels import smooth_gain
from morva_training.mixing import MixtureMaker, Recipe, Warped
from morva_training.rooms import parted, simulated_room
from morva_training.voices import whispered

PLAIN = Recipe(seconds=2.0, clean_share=0.0, noise_only_share=0.0, room_share=0.0, clip_share=0.0, band_limit_share=0.0)


def test_a_rebuilt_store_is_heard_at_every_rate(tmp_path: Path) -> None:
    """Low-rate copies are made on demand, hold what fits below half their rate, and go with their recordings."""
    time = np.arange(48000) / 48000
    for level in (0.1, 0.4):
        sound = level * np.sin(2 * np.pi * 300 * time) + 0.3 * np.sin(2 * np.pi * 11000 * time)
        soundfile.write(tmp_path / "a.wav", sound, 48000, "PCM_16")
        corpus.build({"speech": [{"path": "a.wav"}], "noise": []}, tmp_path, tmp_path / "store")
        for rate, power in ((32000, level**2 + 0.3**2), (16000, level**2), (8000, level**2)):
            low = Corpus(tmp_path / "store", rate)
            samples = low.read(*low.clips("speech", "train"))
            assert len(samples) == rate
            assert np.mean(samples**2) * 2 / 32768**2 == pytest.approx(power, rel=0.02)
    contents = [file.stem.split("-")[2] for file in (tmp_path / "store").glob("speech-*")]
    assert len(contents) == 3 and len(set(contents)) == 1, "of one store, and named so"


def test_two_processes_may_make_the_same_copy(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    soundfile.write(tmp_path / "a.wav", np.full(3200, 0.1), 32000)
    corpus.build({"speech": [{"path": "a.wav"}], "noise": []}, tmp_path, tmp_path)
    publish = Path.replace

    def overtaken(self: Path, target: Path) -> Path:
        monkeypatch.setattr(Path, "replace", publish)
        Corpus(tmp_path, 8000)  # the other, between this one's writing and naming
        return publish(self, target)

    monkeypatch.setattr(Path, "replace", overtaken)
    low = Corpus(tmp_path, 8000)
    assert np.abs(low.read(*low.clips("speech", "train"))).max() > 3000
    assert not list(tmp_path.glob("*.partial"))


def test_validation_has_both_bands_and_no_recording_of_the_training(store: Path) -> None:
    heard = Corpus(store)
    assert {c.band for c in heard.clips("speech", "dev")} == {"full", "8k"}
    for kind, clips in (("speech", 1), ("noise", 2)):  # of one recording, in the order of their numbers
        splits = [heard.clips(kind, split) for split in ("train", "dev", "heldout")]
        numbers = [{int(clip.path[len(kind) : -5]) // clips for clip in split} for split in splits]
        assert all(numbers) and sum(map(len, numbers)) == len(set.union(*numbers)), "no recording in two splits"


def test_unseen_collections_are_no_training_material(tmp_path: Path) -> None:
    soundfile.write(tmp_path / "a.wav", np.full(48000, 0.1), 48000)
    unseen = {"path": "a.wav", "split": corpus.UNSEEN}
    with pytest.raises(ValueError, match="a store of their own"):
        corpus.build({"speech": [unseen], "noise": [{"path": "a.wav"}]}, tmp_path, tmp_path / "store")
    corpus.build({"speech": [unseen], "noise": [unseen]}, tmp_path, tmp_path / "store", 48000)
    heard = Corpus(tmp_path / "store")
    assert len(heard.read(*heard.clips("speech", corpus.UNSEEN))) == 48000
    for split in ("train", "dev", "heldout"):
        with pytest.raises(ValueError, match="unseen collections"):
            Corpus(tmp_path / "store", 16000).groups("noise", split)


def test_clips_of_one_recording_are_known() -> None:
    row = {"path": "a/rain_02.opus"}
    for author in ("x http://freesound.org/people/x/sounds/123/", "x fs123"):
        assert corpus.recording_of({**row, "author": author}) == "sound 123"
    assert corpus.recording_of({**row, "recording": "r7"}) == "r7"
    assert corpus.recording_of({**row, "author": "somebody"}) == "a/rain"


def test_the_customary_test_speakers_are_dropped(tmp_path: Path) -> None:
    (tmp_path / "speech.tsv").write_text("path\tspeaker\nx\tvctk_p231\nx\tvctk_p232\nx\tp257\n")
    assert [row["speaker"] for row in corpus.read_manifest(tmp_path / "speech.tsv")] == ["vctk_p231"]


def maker(store: Path, seed: int = 1, **changes) -> MixtureMaker:
    return MixtureMaker(store, seed, replace(PLAIN, **changes))


def test_a_seed_gives_the_same_mixtures(store: Path) -> None:
    a, b, c = (maker(store, seed).draw() for seed in (1, 1, 2))
    assert np.array_equal(a.heard(), b.heard()) and not np.array_equal(a.speech, c.speech)


@pytest.mark.parametrize("snr", [-5.0, 25.0])
def test_drawn_and_remixed_ratios_are_measured_alike(store: Path, snr: float) -> None:
    """With everything that changes levels: a second noise, equalisers, band limits."""
    make = maker(store, snr_db=(snr, snr), second_noise_share=1.0, band_limit_share=1.0)
    first, second = make.draw(), make.draw()
    for waves in (first, second, first.remixed(second, snr)):
        measured = 20 * np.log10(active_level(waves.speech, 32000) / active_level(waves.noise, 32000))
        assert measured == pytest.approx(snr, abs=0.1)
    assert first.remixed(second, snr).speech is first.speech


def test_talkers_in_the_background_stay_below_the_near_one(store: Path) -> None:
    """Also in the speech of other pieces, whatever ratios noise may have."""
    pieces = maker(store, far_share=0.5, snr_db=(-5.0, 0.0), second_noise_share=0.0).draws(16, 2)
    assert {waves.far for waves in pieces} == {True, False}
    for waves in pieces:
        ratio = 20 * np.log10(active_level(waves.speech, 32000) / active_level(waves.noise, 32000))
        assert (9.9 < ratio < 30.1) if waves.far else ratio < 0.1


def test_pieces_without_speech_and_without_noise(store: Path) -> None:
    for seed in range(4):  # whoever would have spoken: nobody is heard, and all bands are known
        nobody = maker(store, seed, noise_only_share=1.0).draw()
        assert not nobody.has_speech and not nobody.speech.any() and nobody.noise.any() and nobody.wideband
    clean = maker(store, clean_share=1.0).draw()
    assert not clean.noisy and active_level(clean.noise, 32000) < 0.03 * active_level(clean.speech, 32000)


def test_clipped_pieces_are_clipped_sound_and_pass_nothing_on(store: Path) -> None:
    make = maker(store, clip_share=1.0, snr_db=(5.0, 5.0))
    first, second = make.draw(), make.draw()
    for waves in (first, first.remixed(second, 5.0)):
        total, heard = waves.speech + waves.noise, waves.heard()
        limit = np.abs(heard).max()
        assert limit < 0.91 * np.abs(total).max() and np.array_equal(heard, np.clip(total, -limit, limit))
    ratio = first.remixed(second, 5.0).noise / second.noise
    assert np.allclose(ratio, ratio[0], rtol=1e-3), "the other's noise, without what clipping did to the other"


def test_a_whisper_keeps_the_words_and_loses_the_voice() -> None:
    """Loudness over time stays, the harmonics go."""
    time = np.arange(64000) / 32000
    voice = sum(np.sin(2 * np.pi * 150 * k * time) for k in range(1, 40)) * (np.sin(2 * np.pi * 2 * time) > 0)
    both = voice, whispered(np.random.default_rng(6), voice.astype(np.float32), 32000)
    assert np.corrcoef(*[np.square(x.reshape(-1, 640)).mean(1) for x in both])[0, 1] > 0.7
    periodicity = [np.corrcoef(x[2000:13787], x[2213:14000])[0, 1] for x in both]
    assert periodicity[0] > 0.9 and abs(periodicity[1]) < 0.3


def test_rooms_and_equalisers_keep_their_scale() -> None:
    rooms = [simulated_room(np.random.default_rng(seed), 32000) for seed in range(9)]
    assert all(room[0] == 1.0 and 1.05 < np.sum(room**2) < 16.0 for room in rooms)
    for early, late in (parted(room, 32000) for room in rooms):
        assert not early[1600:].any() and not late[:1280].any() and late.any()
    fine, coarse = (20 * np.log10(smooth_gain(np.random.default_rng(7), bins, 8000, 4.5)) for bins in (20001, 81))
    assert np.abs(fine[::250] - coarse).max() < 0.01, "the same shape for any number of bins"
    assert np.ptp(fine[1000:19000]) > 3.0 and np.abs(np.diff(coarse)).max() < 6.0


@pytest.mark.parametrize("factor", [0.7, 1.4])
def test_a_warped_recording_keeps_its_level_and_has_no_images(store: Path, factor: float) -> None:
    """A tone moves by the factor, and nothing else appears."""
    warped = Warped(store, 8000)
    tone = 1000 * np.sin(2 * np.pi * 2700.0 / 16000 * np.arange(32000)).astype(np.float32)
    warped.fine.read = lambda clip, offset, length: tone[:length]
    piece = warped.read(warped.fine.clips("speech", "train")[0], 0, 8000, factor)[500:7500]
    spectrum = np.abs(np.fft.rfft(piece * np.hanning(7000))) / 7000 * 4
    frequency = np.arange(len(spectrum)) * 8000 / 7000
    assert frequency[np.argmax(spectrum)] == pytest.approx(2700 * factor, rel=0.02)
    assert spectrum.max() == pytest.approx(1000, rel=0.1)
    assert spectrum[np.abs(frequency - frequency[np.argmax(spectrum)]) > 60].max() < 3.0

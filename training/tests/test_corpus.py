"""What may be heard where, and that a store is one whole."""

from __future__ import annotations

from pathlib import Path

import numpy as np
import pytest
import soundfile
from conftest import write_wav

from morva_training import corpus
from morva_training.corpus import Corpus


def tables_of(*speech: corpus.Row) -> dict[str, list[corpus.Row]]:
    return {"speech": list(speech), "noise": []}


def test_a_rebuilt_store_is_heard_at_every_rate(tmp_path: Path) -> None:
    """Low-rate copies are made on demand, hold what fits below half their rate, and go with their recordings."""
    time = np.arange(48000) / 48000
    for level in (0.1, 0.4):
        sound = level * np.sin(2 * np.pi * 300 * time) + 0.3 * np.sin(2 * np.pi * 11000 * time)
        soundfile.write(tmp_path / "a.wav", sound, 48000, "PCM_16")
        corpus.build(tables_of({"path": "a.wav"}), tmp_path, tmp_path / "store")
        for rate, power in ((32000, level**2 + 0.3**2), (16000, level**2), (8000, level**2)):
            low = Corpus(tmp_path / "store", rate)
            samples = low.read(*low.clips("speech", "train"))
            assert len(samples) == rate
            assert np.mean(samples**2) * 2 / 32768**2 == pytest.approx(power, rel=0.02)
    contents = [file.stem.split("-")[2] for file in (tmp_path / "store").glob("speech-*")]
    assert len(contents) == 3 and len(set(contents)) == 1, "of one store, and named so"


def test_two_processes_may_make_the_same_copy(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    write_wav(tmp_path / "a.wav", np.full(3200, 0.1))
    corpus.build(tables_of({"path": "a.wav"}), tmp_path, tmp_path)
    publish = Path.replace

    def overtaken(self: Path, target: Path) -> Path:
        monkeypatch.setattr(Path, "replace", publish)
        Corpus(tmp_path, 8000)  # the other, between this one's writing and naming
        return publish(self, target)

    monkeypatch.setattr(Path, "replace", overtaken)
    clip = Corpus(tmp_path, 8000).clips("speech", "train")[0]
    assert np.abs(Corpus(tmp_path, 8000).read(clip)).max() > 3000
    assert not list(tmp_path.glob("*.partial"))


def test_validation_has_both_bands_and_no_recording_of_the_training(store: Path) -> None:
    heard = Corpus(store)
    assert {c.band for c in heard.clips("speech", "dev")} == {"full", "8k"}
    for kind, identity in (("speech", lambda clip: clip.group), ("noise", lambda clip: int(clip.path[7:-5]) // 2)):
        splits = [{identity(c) for c in heard.clips(kind, split)} for split in ("train", "dev", "heldout")]
        assert all(splits) and sum(map(len, splits)) == len(set.union(*splits)), "no recording in two splits"
    assert {c.path for c in heard.clips("speech", "heldout")} == {"speech/s6.wav", "speech/s7.wav"}


@pytest.mark.parametrize(
    ("row", "recording"),
    [
        ({"path": "a/rain_2.opus", "recording": "r7"}, "r7"),
        ({"path": "a/rain_2.opus", "author": "x http://freesound.org/people/x/sounds/123/"}, "sound 123"),
        ({"path": "a/rain_2.opus", "author": "x fs123"}, "sound 123"),
        ({"path": "a/rain_02.opus", "author": "somebody"}, "a/rain"),
    ],
)
def test_clips_of_one_recording_are_known(row: corpus.Row, recording: str) -> None:
    assert corpus.recording_of(row) == recording


def test_the_customary_test_speakers_are_dropped(tmp_path: Path) -> None:
    table = tmp_path / "speech.tsv"
    speakers = ["vctk_p231", "vctk_p232", "p257", "vctk_p258"]
    table.write_text("path\tspeaker\n" + "".join(f"x\t{s}\n" for s in speakers))
    assert [row["speaker"] for row in corpus.read_manifest(table)] == ["vctk_p231", "vctk_p258"]

"""morva denoise on real files: what comes out has the place, length, shape and format of what went in."""

import itertools

import numpy as np
import pytest
import soundfile

from conftest import SOURCE, constant_mask, lag_and_likeness, speechlike

RATES = [4000, 8000, 11025, 12000, 16000, 22050, 24000, 32000, 37800, 44100, 48000, 64000, 88200, 96000]
RATES += [192000, 384000]


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("i, name", enumerate(["NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4"]))
def test_identity_keeps_time_and_length_at_every_rate(morva, model, recording, tmp_path, rate, i, name):
    before = speechlike(rate, 1.0, seed=rate + i)
    source = recording(before, rate, subtype="FLOAT")
    frame = [10, 20, 30, 40][(rate // 100 + i) % 4]
    weight = model(constant_mask(name=name + ".mvw"))
    morva("denoise", source, tmp_path / "out.wav", "--model", weight, "--frame", frame)
    after, out_rate = soundfile.read(tmp_path / "out.wav")
    assert (out_rate, len(after)) == (rate, len(before))
    lag, likeness = lag_and_likeness(before[:, 0], after, rate)
    assert abs(lag) <= 0.02
    assert likeness > 0.999


def test_a_folder_of_all_kinds(morva, model, recording, tmp_path):
    """Any length, rate, number of channels and name; files and channels do not mix, whatever the number of threads."""
    kinds = itertools.product([1, 2, 159, 160, 161, 319, 4096, 12345], [16000, 22050, 48000], ["wav", "flac", "ogg"])
    sounds, channels = {}, itertools.cycle([1, 2, 3, 6])
    for i, (n, rate, ending) in enumerate(kinds):
        sound = speechlike(rate, n / rate, i, next(channels)) if n > 4000 else np.full((n, next(channels)), 0.1)
        name = f"{['', 'a/', 'a/größe 音/'][i % 3]}{i}.{ending}"
        recording(sound, rate, "in/" + name)
        sounds[name] = sound, rate
    for i, ending in enumerate(["mp3", "opus", "aiff"]):  # which are written as WAV
        recording(
            np.full((4800, 1), 0.1),
            48000,
            f"in/other{i}.{ending}",
            **({"format": "OGG", "subtype": "OPUS"} if i == 1 else {}),
        )
        sounds[f"other{i}.wav"] = np.zeros((4800, 1)), 48000
    recording(np.zeros(10), 400000, "in/a/fast.wav")
    (tmp_path / "in/broken.wav").write_bytes(b"RIFF nonsense")
    (tmp_path / "in/notes.txt").write_text("not a sound")
    weight = model(constant_mask(), "Gewichte für 音声.mvw")
    for jobs in (1, 4):
        out = tmp_path / f"out{jobs}"
        said = morva("denoise", tmp_path / "in", "-o", out, "--model", weight, "-j", jobs, status=1).stderr
        failed = f"2 of {len(sounds) + 2} files failed"
        for text in (
            "fast.wav: a rate of",
            "broken.wav: cannot be read",
            failed,
            "1 file skipped: ",
            "notes.txt is no",
        ):
            assert text in said
        assert {str(p.relative_to(out)) for p in out.rglob("*") if p.is_file()} == set(sounds)
    for name, (before, rate) in sounds.items():
        after, out_rate = soundfile.read(out / name, always_2d=True)
        assert (out_rate, after.shape) == (rate, before.shape), name
        if name.endswith(".wav"):
            assert (tmp_path / "out1" / name).read_bytes() == (out / name).read_bytes()
        if len(before) > 5000 and not name.endswith(".ogg"):  # Vorbis couples channels
            count = before.shape[1]
            likeness = np.corrcoef(before.T, after.T)[:count, count:]
            assert np.abs(likeness - np.eye(count)).max() < 0.1, name
    ages = {path: path.stat().st_mtime_ns for path in out.rglob("*")}
    said = morva("denoise", tmp_path / "in", "-o", out, "--model", weight, "--skip-existing", status=1).stderr
    assert f"{len(sounds)} files skipped: cleaned already" in said
    assert {path: path.stat().st_mtime_ns for path in out.rglob("*")} == ages


def test_a_folder_of_one_file_into_a_new_folder(morva, recording, tmp_path):
    recording(np.zeros(100), 16000, "in/a/one.wav")
    morva("denoise", tmp_path / "in", "-o", tmp_path / "new/out")
    assert (tmp_path / "new/out/a/one.wav").is_file()


@pytest.mark.parametrize("limit", [0, 12])
def test_the_limit(morva, model, recording, tmp_path, limit):
    before = speechlike(48000, 1.0, seed=1)[:, 0]
    source, weight = recording(before, 48000, subtype="FLOAT"), model(constant_mask(0, "c6.xs.f.ca03f4.mvw"))
    morva("denoise", source, tmp_path / "out.wav", "--model", weight, "--limit", limit)
    after, _ = soundfile.read(tmp_path / "out.wav")
    assert np.abs(after - before * 10 ** (-limit / 20)).max() < 1e-3


@pytest.mark.parametrize(
    ("container", "subtype"), [("wav", "PCM_16"), ("wav", "FLOAT"), ("aiff", "PCM_24"), ("ogg", "VORBIS")]
)
@pytest.mark.parametrize("unknown", [False, True])
def test_standard_input_and_output(morva, model, recording, tmp_path, container, subtype, unknown):
    """What goes through pipes is what goes through files, also where the header does not tell the length."""
    source = recording(speechlike(16000, 1.0, seed=1, channels=2), 16000, f"in.{container}", subtype=subtype)
    weight, data = model(constant_mask()), source.read_bytes()
    if unknown and container == "wav":
        at = data.index(b"data") + 4
        data = data[:at] + b"\xff\xff\xff\xff" + data[at + 4 :]
    morva("denoise", source, tmp_path / "file.wav", "--model", weight)
    wanted, _ = soundfile.read(tmp_path / "file.wav")
    piped = morva("denoise", "-q", "-", "-", "--model", weight, input=data, text=False).stdout
    with open(tmp_path / "redirected.wav", "wb") as out:
        morva("denoise", "-", "-", "--model", weight, capture_output=False, stdout=out, stdin=source.open("rb"))
    (tmp_path / "piped.wav").write_bytes(piped)
    for name in ("piped", "redirected"):
        with soundfile.SoundFile(tmp_path / f"{name}.wav") as file:
            assert (file.format, file.channels, file.samplerate) == ("WAV", 2, 16000)
            np.testing.assert_array_equal(file.read(), wanted)
    assert soundfile.info(tmp_path / "redirected.wav").frames == 16000


FORMATS = [("wav", s) for s in ("PCM_U8", "PCM_16", "PCM_24", "PCM_32", "FLOAT", "DOUBLE", "ULAW")]
FORMATS += [("flac", s) for s in ("PCM_S8", "PCM_16", "PCM_24")] + [("ogg", "VORBIS")]
CASES = [(*kind, *kind) for kind in FORMATS]
CASES += [("wav", "FLOAT", "flac", "PCM_24"), ("wav", "PCM_24", "ogg", "VORBIS"), ("flac", "PCM_S8", "wav", "PCM_U8")]


@pytest.mark.parametrize(("container", "subtype", "ending", "known"), CASES)
def test_output_format_follows_the_ending(morva, model, tmp_path, container, subtype, ending, known):
    source, out = tmp_path / f"in.{container}", tmp_path / f"out.{ending}"
    sound = speechlike(16000, 0.3, seed=1)[:, 0]
    sound /= -sound[np.abs(sound).argmax()]  # to the end of the scale
    with soundfile.SoundFile(source, "w", 16000, 1, subtype) as file:
        file.title = "Interview 7"
        file.write(sound)
    morva("denoise", source, out, "--model", model(constant_mask()))
    before, after = (soundfile.read(path)[0] for path in (source, out))
    with soundfile.SoundFile(out) as file:
        assert (file.format, file.subtype, file.title) == (ending.upper(), known, "Interview 7")
    if {known, subtype} & {"VORBIS", "ULAW"}:
        assert np.corrcoef(before, after)[0, 1] > 0.95
    else:  # half a step, and the engine's single precision on its 16-bit scale
        bits = int(known.rpartition("_")[2].strip("SU")) if "PCM" in known else 32
        assert np.abs(after - before).max() <= 2.0**-bits + 2.0**-18


@pytest.mark.parametrize(
    ("name", "rates"),
    [("NC_small_8k", [4000, 8000]), ("NC_small_16k", [11025, 16000]), ("c6.xs.f.ca03f4", [22050, 96000])],
)
def test_the_shipped_model_follows_the_rate(morva, recording, tmp_path, name, rates):
    for rate in rates:
        source = recording(np.zeros(rate // 10), rate)
        assert name + ".mvw" in morva("denoise", source, tmp_path / "o.wav", "--models", SOURCE / "models").stderr


@pytest.mark.parametrize("text", ["MORVA_VOLUME_UP_v1_0_0 TRUE\nMORVA_VOLUME_UP_PERCENT_v1_0_0 100\n", ""])
@pytest.mark.parametrize("option", ["--model", "--control"])
def test_control_files(morva, model, recording, tmp_path, option, text):
    """Laid over a weight, or naming one beside themselves, wherever one stands."""
    before = 0.3 * speechlike(16000, 0.5, seed=9)
    source = recording(before, 16000, subtype="FLOAT")
    (tmp_path / "sub").mkdir()
    weight, control = model(constant_mask(), "sub/quiet.mvw"), tmp_path / "sub/model.cfg"
    over = option == "--control" and text
    control.write_text(text if over else "WEIGHT quiet.mvw\n" + text)
    morva("denoise", source, tmp_path / "out.wav", option, control, *(["--model", weight] if over else []))
    after, _ = soundfile.read(tmp_path / "out.wav")
    assert np.abs(after - (2 if text else 1) * before[:, 0]).max() < 1e-5

"""The LV2 plugins through their library file, as hosts load it, and plugins of all kinds in real hosts."""

import ctypes
import json
import os
import pathlib
import subprocess
from ctypes import CFUNCTYPE, POINTER, c_char_p, c_double, c_uint32, c_void_p, c_wchar_p

import numpy as np
import pytest
import soundfile

from conftest import BUILD, SOURCE

RATES = [8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000]
os.environ["MORVA_MODELS"] = str(SOURCE / "models")
CONTROLS = ["limit", "bypass", "latency", "voice", "level"]


class Descriptor(ctypes.Structure):
    _fields_ = [
        *[("URI", c_char_p), ("instantiate", CFUNCTYPE(c_void_p, c_void_p, c_double, c_char_p, c_void_p))],
        *[
            ("connect", CFUNCTYPE(None, c_void_p, c_uint32, c_void_p)),
            ("activate", CFUNCTYPE(None, c_void_p)),
        ],
        *[("run", CFUNCTYPE(None, c_void_p, c_uint32)), ("deactivate", c_void_p)],
        *[("cleanup", CFUNCTYPE(None, c_void_p)), ("extension_data", c_void_p)],
    ]


@pytest.fixture(scope="module")
def library():
    """What the engine library makes of sound, a row per channel, and how late; the process uses the plugins beside it."""
    engine = ctypes.CDLL(BUILD / "libmorva.so", ctypes.RTLD_GLOBAL)
    engine.Morva_NC_CreateSession.restype = c_void_p
    engine.Morva_SDK_GlobalInit(None, 1)
    models = [model for model in json.loads((SOURCE / "models/shipped.json").read_text()) if model["kind"] == "NC"]
    for model in models:
        engine.Morva_SDK_SetModel(c_wchar_p(str(SOURCE / "models" / model["file"])), model["file"].encode())

    def clean(channel, rate):
        model = next(model["file"] for model in models if rate <= model["maxSampleRate"]).encode()
        session = c_void_p(engine.Morva_NC_CreateSession(rate, rate, 10, model))
        late, frame = engine.MorvaExt_SessionLatencySamples(session), rate // 100
        padded = np.concatenate([channel, np.zeros(late + frame, "f4")])
        for at in range(0, len(channel) + late, frame):
            data = padded[at:].ctypes.data_as(c_void_p)
            assert engine.Morva_NC_CleanAmbientNoiseFloat(session, data, frame, data, frame) == 0
        engine.Morva_NC_CloseSession(session)
        return padded[late : late + len(channel)], late + frame

    def clean_all(sound, rate):
        cleaned, late = zip(*(clean(channel, rate) for channel in sound), strict=True)
        return np.array(cleaned), late[0]

    yield clean_all
    assert engine.MorvaExt_ListModels(None, 0) == len(models)  # the plugins' engines are not the library's
    engine.Morva_SDK_GlobalDestroy()


class Instance:
    """A host's side of one instance."""

    def __init__(self, channels, rate):
        function = ctypes.CDLL(BUILD / "lv2/morva.lv2/morva.so", ctypes.RTLD_GLOBAL).lv2_descriptor
        function.restype = POINTER(Descriptor)
        self.plugin = function(channels - 1).contents
        self.handle = self.plugin.instantiate(ctypes.byref(self.plugin), rate, b"", None)
        if self.handle:
            self.controls = {name: np.zeros(1, "f4") for name in CONTROLS}
            for port, control in enumerate(self.controls.values(), 2 * channels):
                self.plugin.connect(self.handle, port, control.ctypes.data)
            self.controls["limit"][0] = 100
            self.plugin.activate(self.handle)

    def __del__(self):
        if self.handle:
            self.plugin.cleanup(self.handle)

    def clean(self, sound, longest):
        """Cleans a row per channel in blocks of up to `longest` samples, each into the memory of the other one."""
        sound, rng, at = np.array(sound, "f4", ndmin=2), np.random.default_rng(longest), 0
        while at < sound.shape[1]:
            n = min(rng.integers(longest + 1), sound.shape[1] - at)
            for port, row in enumerate([*sound, *sound[::-1]]):
                self.plugin.connect(self.handle, port, row[at:].ctypes.data)
            self.plugin.run(self.handle, n)
            at += n
        return sound[::-1].squeeze()


def noise(samples, seed):
    return np.clip(0.1 * np.random.default_rng(seed).standard_normal(samples), -0.9, 0.9).astype("f4")


@pytest.mark.parametrize("rate", RATES)
def test_sound_is_the_librarys_and_bypass_as_late(rate, library):
    sound = np.array([noise(rate // 2, seed) for seed in (1, 2)])
    wanted, late = library(sound, rate)
    instance = Instance(2, rate)
    for longest in (1, 64, 5000):  # samples of a host's block
        instance.plugin.activate(instance.handle)  # forgets what it heard
        out = instance.clean(sound, longest)
        assert instance.controls["latency"][0] == late and np.all(out[:, : rate // 100] == 0)
        assert np.array_equal(out[:, late:], wanted[:, :-late])
    instance.controls["bypass"][0] = 1
    out = instance.clean(sound, 256)[:, late + rate // 50 :]  # behind the cross-fade
    assert np.abs(out - sound[:, rate // 50 : -late]).max() < 1e-6


def test_limit_is_followed_and_nonsense_is_survived():
    sound, instance = noise(16000, 3), Instance(1, 16000)

    def lowered(limit):
        instance.controls["limit"][0] = limit
        return -10 * np.log10(np.mean(np.square(instance.clean(sound, 512)[8000:], dtype=float)))

    everything = lowered(0)
    assert lowered(12) - everything == pytest.approx(12, abs=0.5)
    assert min(lowered(100), lowered(np.inf)) - everything > 20
    assert [lowered(limit) for limit in (-5, -np.inf, np.nan)] == pytest.approx([everything] * 3, abs=0.01)


def test_meters_are_those_of_the_loudest_channel():
    voice, rate = soundfile.read(SOURCE / "examples/audio/clean.flac", dtype="f4")
    instance, scores = Instance(2, rate), []
    for block in np.split(voice[: 3 * rate], 300):
        instance.clean([np.zeros_like(block), block], len(block))
        scores.append(instance.controls["voice"][0])
    assert min(scores) < 0.1 and 0.9 < max(scores) <= 1
    instance.clean([noise(rate, 1), np.zeros(rate)], 512)  # of an RMS of 0.1
    assert instance.controls["voice"][0] < 0.5
    assert instance.controls["level"][0] == pytest.approx(20 * np.log10(0.1 * 32768), abs=1)


def test_other_rates_are_refused_on_standard_error(capfd):
    for rate in [0, 11025, 47999, 192000]:
        assert not Instance(1, rate).handle
        out, err = capfd.readouterr()
        assert f"no session at {rate} Hz" in err and not out


HOSTS = {  # each with whether it takes the latency out, and how far its sound may differ
    "sox -D in.wav out.wav ladspa -l libmorva_ladspa morva_stereo 100 0": (True, 2**-15),
    "lv2apply -i in.wav -o out.wav urn:morva:stereo": (False, 0),
    "gst-launch-1.0 -q filesrc location=in.f32 ! rawaudioparse use-sink-caps=false format=pcm pcm-format=f32le "
    "sample-rate=48000 num-channels=2 ! morvadenoise ! filesink location=out.f32": (True, 0),
}


@pytest.mark.parametrize("host", HOSTS, ids=lambda host: host.split()[0])
def test_in_real_hosts(host, library, tmp_path):
    sound, rate = soundfile.read(SOURCE / "examples/audio/noisy.flac", dtype="f4", frames=100001)
    sound = np.stack([sound, sound[::-1]])
    sound.T.tofile(tmp_path / "in.f32")
    soundfile.write(tmp_path / "in.wav", sound.T, rate, subtype="FLOAT")
    places = {"LADSPA_PATH": str(BUILD), "LV2_PATH": f"{BUILD}/lv2"}
    places |= {"GST_PLUGIN_PATH": f"{BUILD}/gstreamer-1.0", "GST_REGISTRY": str(tmp_path / "registry")}
    subprocess.run(host.split(), check=True, cwd=tmp_path, env=os.environ | places)
    if (raw := tmp_path / "out.f32").exists():
        out = np.fromfile(raw, "f4").reshape(-1, 2).T
    else:
        out = soundfile.read(tmp_path / "out.wav", dtype="f4")[0].T
    wanted, late = library(sound, rate)
    in_place, difference = HOSTS[host]
    late = 0 if in_place else late
    assert out.shape == wanted.shape
    assert np.abs(out[:, late:] - wanted[:, : wanted.shape[1] - late]).max() <= difference


def test_lv2_description_is_valid():
    files = [str(file) for folder in (BUILD / "lv2", "/usr/lib/lv2") for file in pathlib.Path(folder).rglob("*.ttl")]
    subprocess.run(["sord_validate", *files], check=True)

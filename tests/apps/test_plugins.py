"""The LADSPA plugin through its library file, as hosts load it, and in a real host."""

import ctypes
import os
import shutil
import subprocess
from ctypes import CFUNCTYPE, POINTER, c_char_p, c_int, c_ulong, c_void_p

import numpy as np
import pytest
import soundfile

from conftest import BUILD, SOURCE

RATES = [8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000]
os.environ["MORVA_MODELS"] = str(SOURCE / "models")


class Descriptor(ctypes.Structure):
    _fields_ = [
        *[("UniqueID", c_ulong), ("Label", c_char_p), ("Properties", c_int)],
        *[("Name", c_char_p), ("Maker", c_char_p), ("Copyright", c_char_p)],
        *[("ports", c_ulong), ("kinds", POINTER(c_int)), ("names", POINTER(c_char_p))],
        *[("hints", c_void_p), ("data", c_void_p), ("instantiate", CFUNCTYPE(c_void_p, c_void_p, c_ulong))],
        *[("connect", CFUNCTYPE(None, c_void_p, c_ulong, c_void_p)), ("activate", CFUNCTYPE(None, c_void_p))],
        *[("run", CFUNCTYPE(None, c_void_p, c_ulong)), ("run_adding", c_void_p), ("set_gain", c_void_p)],
        *[("deactivate", c_void_p), ("cleanup", CFUNCTYPE(None, c_void_p))],
    ]


@pytest.fixture(scope="module")
def plugins():
    """The mono and the stereo plugin; the process uses the engine library itself too."""
    engine = ctypes.CDLL(BUILD / "libmorva.so", ctypes.RTLD_GLOBAL)
    function = ctypes.CDLL(BUILD / "libmorva_ladspa.so", ctypes.RTLD_GLOBAL).ladspa_descriptor
    function.restype = POINTER(Descriptor)
    assert not function(2)
    yield [function(i).contents for i in range(2)]
    assert engine.MorvaExt_ListModels(None, 0) < 0  # the plugin's engine was never the library's


class Instance:
    """A host's side of one instance; control ports are found by name, as hosts do."""

    def __init__(self, plugin, rate):
        self.plugin, self.handle = plugin, plugin.instantiate(ctypes.byref(plugin), rate)
        if self.handle:
            names = [plugin.names[port].decode() for port in range(plugin.ports)]
            self.controls = {name: np.zeros(1, "f4") for name in names[-3:]}
            for port, control in enumerate(self.controls.values(), plugin.ports - 3):
                plugin.connect(self.handle, port, control.ctypes.data)
            self.controls["Attenuation limit (dB)"][0] = 100
            plugin.activate(self.handle)

    def __del__(self):
        if self.handle:
            self.plugin.cleanup(self.handle)

    def clean(self, sound, longest):
        """Cleans a row per channel in place, in blocks of up to `longest` samples."""
        sound, rng, at = np.array(sound, "f4", ndmin=2), np.random.default_rng(longest), 0
        while at < sound.shape[1]:
            n = min(rng.integers(longest + 1), sound.shape[1] - at)
            for port in range(2 * len(sound)):
                self.plugin.connect(self.handle, port, sound[port % len(sound), at:].ctypes.data)
            self.plugin.run(self.handle, n)
            at += n
        return sound.squeeze()


def noise(samples, seed):
    return np.clip(0.1 * np.random.default_rng(seed).standard_normal(samples), -0.9, 0.9).astype("f4")


@pytest.mark.parametrize("rate", RATES)
def test_sound_is_the_command_lines_and_bypass_as_late(plugins, morva, recording, tmp_path, rate):
    sound = np.array([noise(rate // 2, seed) for seed in (1, 2)])
    morva("denoise", recording(sound.T, rate, subtype="FLOAT"), tmp_path / "out.wav")
    wanted = soundfile.read(tmp_path / "out.wav", dtype="f4")[0].T
    instance = Instance(plugins[1], rate)
    for longest in (1, 64, 5000):  # samples of a host's block
        plugins[1].activate(instance.handle)  # forgets what it heard
        out = instance.clean(sound, longest)
        late = int(instance.controls["latency"][0])
        assert rate / 100 < late < rate / 10 and np.all(out[:, : rate // 100] == 0)
        assert np.array_equal(out[:, late:], wanted[:, :-late])
    instance.controls["Bypass"][0] = 1
    out = instance.clean(sound, 256)[:, late + rate // 50 :]  # behind the cross-fade
    assert np.abs(out - sound[:, rate // 50 : -late]).max() < 1e-6


def test_limit_is_followed_and_nonsense_is_survived(plugins):
    sound, instance = noise(16000, 3), Instance(plugins[0], 16000)

    def lowered(limit):
        instance.controls["Attenuation limit (dB)"][0] = limit
        return -10 * np.log10(np.mean(np.square(instance.clean(sound, 512)[8000:], dtype=float)))

    everything = lowered(0)
    assert lowered(12) - everything == pytest.approx(12, abs=0.5)
    assert min(lowered(100), lowered(np.inf)) - everything > 20
    assert [lowered(limit) for limit in (-5, -np.inf, np.nan)] == pytest.approx([everything] * 3, abs=0.01)


@pytest.mark.parametrize("rate", [0, 11025, 22050, 47999, 192000])
def test_other_rates_are_refused_on_standard_error(plugins, capfd, rate):
    assert not Instance(plugins[0], rate).handle
    out, err = capfd.readouterr()
    assert "morva_ladspa: " in err and not out


@pytest.mark.skipif(not shutil.which("sox"), reason="sox is not installed")
def test_in_a_real_host(morva, tmp_path):
    library, noisy = BUILD / "libmorva_ladspa.so", SOURCE / "examples/audio/noisy.flac"
    morva("denoise", noisy, tmp_path / "wanted.wav")
    wanted = soundfile.read(tmp_path / "wanted.wav", dtype="i2")[0].astype(int)
    command = f"sox -D {noisy} {tmp_path}/out.wav remix 1 1 ladspa -l {library} morva_stereo 100 0"
    subprocess.run(command.split(), check=True)  # -l takes the latency out
    out = soundfile.read(tmp_path / "out.wav", dtype="i2")[0]
    assert np.abs(out.T - wanted)[:, 4800:-4800].max() <= 1

"""The shipped microphone in a real PipeWire without devices, session manager and bus."""

import json
import os
import subprocess
import tempfile
import time

import pytest

from conftest import BUILD, SOURCE

NODE = "capture.morva"
LIMIT = "morva:Attenuation limit (dB)"


@pytest.fixture
def pipewire():
    """Starts PipeWire with the shipped file, the text of which may be changed; returns how to call its tools."""
    with tempfile.TemporaryDirectory() as home:  # the socket's path must be short

        def start(places, change=lambda text: text):
            environment = os.environ | {"XDG_RUNTIME_DIR": home, "XDG_CONFIG_HOME": home, "HOME": home} | places
            shipped = (SOURCE / "examples/pipewire/morva-microphone.conf").read_text()
            os.makedirs(f"{home}/pipewire/pipewire.conf.d")
            with open(f"{home}/pipewire/pipewire.conf.d/microphone.conf", "w") as file:
                file.write(change(shipped))
            daemons.append(subprocess.Popen(["pipewire"], env=environment))

            def call(*command):
                done = subprocess.run(command, env=environment, capture_output=True, text=True, timeout=60)
                return done.stdout if done.returncode == 0 else None

            while daemons[0].poll() is None and call("pw-cli", "info", "0") is None:
                time.sleep(0.05)
            assert daemons[0].poll() is None, "PipeWire does not start"
            return call

        daemons = []
        yield start
        for daemon in daemons:
            daemon.terminate()
            daemon.wait()


def nodes(call):
    found = {}
    for thing in json.loads(call("pw-dump")):
        info = thing.get("info") or {}
        found[info.get("props", {}).get("node.name")] = info
    return found


def test_without_the_plugin_all_else_works(pipewire, tmp_path):
    found = nodes(pipewire({"LADSPA_PATH": str(tmp_path)}))
    assert NODE not in found and "Dummy-Driver" in found


@pytest.mark.parametrize("by_path", [False, True])
def test_with_the_plugin_the_microphone_is_there_and_its_limit_can_be_changed(pipewire, by_path):
    library = f"{BUILD}/libmorva_ladspa.so"
    places = {"MORVA_MODELS": str(SOURCE / "models")} | ({} if by_path else {"LADSPA_PATH": str(BUILD)})
    call = pipewire(places, lambda text: text.replace("= libmorva_ladspa", f"= {library}") if by_path else text)
    assert nodes(call)["morva_microphone"]["props"]["media.class"] == "Audio/Source"

    def limit():
        params = [item["params"] for item in nodes(call)[NODE]["params"]["Props"] if LIMIT in item.get("params", [])]
        return params[0][params[0].index(LIMIT) + 1]

    assert limit() == 100
    call("pw-cli", "set-param", NODE, "Props", '{ params = [ "%s" 12 ] }' % LIMIT)
    for _ in range(600):  # it answers before it is done
        if limit() == 12:
            return
        time.sleep(0.05)
    raise AssertionError(f"the limit is {limit()}")

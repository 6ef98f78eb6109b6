"""The shipped microphone in a real PipeWire without devices, session manager and bus."""

import json
import os
import subprocess
import tempfile
import time

import pytest

from conftest import BUILD, SOURCE

LIMIT = "morva:Attenuation limit (dB)"


@pytest.mark.parametrize("plugin", ["absent", "searched for", "named by its path"])
def test_microphone_is_there_with_the_plugin_and_all_else_works_without(plugin):
    config = (SOURCE / "examples/pipewire/morva-microphone.conf").read_text()
    if plugin == "named by its path":
        config = config.replace("= libmorva_ladspa", f"= {BUILD}/libmorva_ladspa.so")
    with tempfile.TemporaryDirectory() as home:  # the socket's path must be short
        os.makedirs(f"{home}/pipewire/pipewire.conf.d")
        with open(f"{home}/pipewire/pipewire.conf.d/microphone.conf", "w") as file:
            file.write(config)
        places = dict.fromkeys(["HOME", "XDG_RUNTIME_DIR", "XDG_CONFIG_HOME"], home)
        places |= {"MORVA_MODELS": str(SOURCE / "models")}
        places |= {"LADSPA_PATH": str(BUILD) if plugin == "searched for" else home}
        options = {"env": os.environ | places, "text": True}

        def answer(*command):
            return subprocess.run(command, capture_output=True, **options).stdout

        def nodes():
            infos = [thing.get("info") or {} for thing in json.loads(answer("pw-dump"))]
            return {info.get("props", {}).get("node.name"): info for info in infos}

        def limit():
            lists = [item.get("params", []) for item in nodes()["capture.morva"]["params"]["Props"]]
            return next(values[values.index(LIMIT) + 1] for values in lists if LIMIT in values)

        def wait_until(condition):
            while not condition():
                assert daemon.poll() is None, "PipeWire does not start"
                time.sleep(0.05)

        daemon = subprocess.Popen(["pipewire"], **options)
        try:
            wait_until(lambda: answer("pw-cli", "info", "0"))
            assert "Dummy-Driver" in nodes()
            assert ("morva_microphone" in nodes()) == (plugin != "absent")
            if plugin != "absent":
                assert limit() == 100
                answer("pw-cli", "set-param", "capture.morva", "Props", '{ params = [ "%s" 12 ] }' % LIMIT)
                wait_until(lambda: limit() == 12)
        finally:
            daemon.kill()
            daemon.wait()

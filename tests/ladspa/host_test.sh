#!/usr/bin/env bash
# usage: host_test.sh PLUGIN MORVA SOURCE_DIR - runs the plugin in two real hosts (sox, applyplugin) and compares
# the sound with the command line's.
set -euo pipefail
plugin=$1 morva=$2 source=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
export LADSPA_PATH=${plugin%/*} MORVA_MODELS=$source/models

analyseplugin "$plugin" | tee "$work/analysis"
for line in 'Plugin Label: "morva_mono"' 'Plugin Label: "morva_stereo"' '"latency" output, control' \
    '"Attenuation limit (dB)" input, control, 0 to 100, default 100' '"Bypass" input, control, toggled, default 0' \
    'Environment: Normal or Hard Real-Time'; do
    grep -qF "$line" "$work/analysis" || { echo "analyseplugin does not say: $line" >&2 && exit 1; }
done

sox -D "$source/examples/audio/noisy.flac" -b 16 -c 1 "$work/in.wav" trim 0 8
"$morva" denoise -q --models "$MORVA_MODELS" "$work/in.wav" "$work/wanted.wav"
# applyplugin leaves the latency in; sox's -l takes it out.
sox -D "$work/in.wav" "$work/sox.wav" ladspa -l "$plugin" morva_mono 100 0
applyplugin "$work/in.wav" "$work/apply.wav" "$plugin" morva_mono 100 0
sox -D -M "$work/in.wav" "$work/in.wav" "$work/stereo.wav"
sox -D "$work/stereo.wav" "$work/sox-stereo.wav" ladspa -l "$plugin" morva_stereo 100 0 remix 2

/usr/bin/python3 - "$work" <<'PY'
import sys
import wave

import numpy as np


def read(name):
    with wave.open(f"{sys.argv[1]}/{name}.wav") as file:
        assert file.getsampwidth() == 2 and file.getnchannels() == 1, name
        return np.frombuffer(file.readframes(file.getnframes()), "<i2").astype(float)


wanted = read("wanted")
rate = 48000
late = range(rate // 100, rate // 20)
for host, latencies in {"sox": [0], "sox-stereo": [0], "apply": late}.items():
    got = read(host)
    middle = np.arange(rate, len(wanted) - rate)
    worst, latency = min((np.abs(got[middle + d] - wanted[middle]).max(), d) for d in latencies)
    print(f"{host}: latency {latency} samples, largest difference {worst:g} of 32768")
    assert worst <= 1.0, host
PY

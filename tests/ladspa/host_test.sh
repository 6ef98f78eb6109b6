#!/usr/bin/env bash
# usage: host_test.sh PLUGIN MORVA SOURCE_DIR - runs the plugin in two real hosts (analyseplugin, sox) and compares
# the sound with the command line's.
set -euo pipefail
plugin=$1 morva=$2 source=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
export LADSPA_PATH=${plugin%/*} MORVA_MODELS=$source/models

analyseplugin "$plugin" | tee "$work/analysis"
for line in 'Plugin Label: "morva_mono"' 'Plugin Label: "morva_stereo"' '"latency" output, control' \
    '"Attenuation limit (dB)" input, control, 0 to 100, default 100' '"Bypass" input, control, toggled, default 0' \
    '"Input (right)" input, audio' '"Output (right)" output, audio' 'Environment: Normal or Hard Real-Time'; do
    grep -qF "$line" "$work/analysis" || { echo "analyseplugin does not say: $line" >&2 && exit 1; }
done

sox -D "$source/examples/audio/noisy.flac" -b 16 -c 1 "$work/in.wav" trim 0 8
"$morva" denoise -q --models "$MORVA_MODELS" "$work/in.wav" "$work/wanted.wav"
sox -D "$work/in.wav" "$work/mono.wav" ladspa -l "$plugin" morva_mono 100 0 # -l takes the latency out
sox -D -M "$work/in.wav" "$work/in.wav" "$work/two.wav"
sox -D "$work/two.wav" "$work/stereo.wav" ladspa -l "$plugin" morva_stereo 100 0 remix 2
for got in mono stereo; do # the same but for one step of 16 bits
    sox -m -v 1 "$work/wanted.wav" -v -1 "$work/$got.wav" -n trim 1 =7 stat 2>"$work/difference"
    awk '/^M.*amplitude/ { if ($3 ^ 2 > (1.5 / 32768) ^ 2) exit 1 }' "$work/difference" ||
        { echo "$got differs from the command line" >&2 && cat "$work/difference" >&2 && exit 1; }
done

#!/usr/bin/env bash
# usage: deb_test.sh BUILD_DIR SOURCE_DIR - makes the Debian package, has it judged by lintian, and uses the
# plugins as they lie in it.
set -euo pipefail
build=$1 source=$2
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work"

cpack --config "$build/CPackConfig.cmake" -G DEB -B . >log 2>&1 || { cat log && exit 1; }
lintian --allow-root --fail-on error,warning ./*.deb
dpkg-deb -x ./*.deb .
dpkg-deb -f ./*.deb Depends | grep 'libgstreamer1.0-0.*libsndfile1'

unset MORVA_MODELS # found from where the plugins lie
sox "$source/examples/audio/noisy.flac" in.wav trim 0 1
LADSPA_PATH=$work/usr/lib/ladspa sox in.wav ladspa.wav ladspa -l libmorva_ladspa morva_mono 100 0
LV2_PATH=$work/usr/lib/lv2 lv2apply -i in.wav -o lv2.wav urn:morva:mono
GST_PLUGIN_PATH=$(echo "$work"/usr/lib/*/gstreamer-1.0) GST_REGISTRY=registry gst-launch-1.0 -q \
    audiotestsrc num-buffers=9 ! audioconvert ! morvadenoise ! filesink location=gstreamer.f32
[ "$(stat -c %s ladspa.wav lv2.wav gstreamer.f32 | sort -n | head -1)" -gt 30000 ]

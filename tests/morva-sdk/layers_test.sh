#!/bin/sh
# usage: layers_test.sh SRC - includes point downward: no layer of the engine sees one above it, but
# for the words of the C interface that all of them speak.
set -eu
cd "$1"
words='morva-sdk/\(morva-sdk\|vocabulary\)\.h'
above='kernels/\|statistics/\|resampler/\|weights/\|noise_canceller/\|morva-sdk/'
for layer in utils kernels statistics resampler weights noise_canceller; do
    above=${above#"$layer/\\|"}
    if grep -rn "#include \"\($above\)" "$layer" | grep -v "\"$words\""; then
        echo "upward include in src/$layer"
        exit 1
    fi
done

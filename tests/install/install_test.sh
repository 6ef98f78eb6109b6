#!/usr/bin/env bash
# usage: install_test.sh BUILD_DIR SOURCE_DIR - installs into an empty folder and uses what lies there as
# people outside the project do: CMake package, pkg-config, command line, man page, completion.
set -euo pipefail
build=$1 source=$2
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
fail() { printf 'FAILED: %s\n' "$*" >&2 && exit 1; }

cmake --install "$build" --prefix "$work/first" >/dev/null
mv "$work/first" "$work/moved" # nothing may depend on the place
prefix=$work/moved
readelf -d "$prefix"/lib*/libmorva.so | grep -q 'SONAME.*libmorva\.so\.1\]' || fail "SONAME"

echo "-- find_package"
cmake -S "$source/examples/cmake" -B "$work/user" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" >"$work/log" ||
    fail "$(cat "$work/log")"
cmake --build "$work/user" >"$work/log" || fail "$(cat "$work/log")"
"$work/user/hush" | tee "$work/said" | grep 'hiss lowered' || fail "$(cat "$work/said")"

echo "-- pkg-config"
PKG_CONFIG_PATH=$(echo "$prefix"/lib*/pkgconfig)
export PKG_CONFIG_PATH
# shellcheck disable=SC2046
cc -std=c11 -D_POSIX_C_SOURCE=200809L "$source/examples/c/denoise.c" -o "$work/denoise" \
    $(pkg-config --cflags --libs morva)
models=$(pkg-config --variable=modelsdir morva)
clean() { LD_LIBRARY_PATH=$(echo "$prefix"/lib*) "$work/denoise" "$models/c6.xs.f.ca03f4.mvw" "$1"; }
for size in 0 2 96002; do # no whole number of frames
    [ "$(head -c $size /dev/urandom | clean 48000 2>"$work/log" | wc -c)" = $size ] || fail "C example: $(cat "$work/log")"
done

echo "-- command line"
"$prefix/bin/morva" --version | grep -qx "$(pkg-config --modversion morva)" || fail "versions differ"
"$prefix/bin/morva" denoise -q "$source/examples/audio/noisy.flac" "$work/clean.wav" # finds its models

# Every command and option that the program has stands in the man page and is completed.
page=$(sed 's/\\-/-/g' "$prefix/share/man/man1/morva.1")
completion=$prefix/share/bash-completion/completions/morva
bash -n "$completion"
for command in $("$prefix/bin/morva" --help | sed -n '/^Subcommands/,$s/^  \([a-z]*\) .*/\1/p'); do
    grep -qx ".B $command" <<<"$page" || fail "the man page lacks $command"
    for word in "$command" $("$prefix/bin/morva" "$command" --help | grep -oE '^ .*--[a-z-]+' | grep -oE -- '--[a-z-]+'); do
        grep -qF -- "$word" <<<"$page" || fail "the man page lacks $word"
        grep -qF -- "$word" "$completion" || fail "the completion lacks $word"
    done
done
echo "installed, moved and used"

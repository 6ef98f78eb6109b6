#!/usr/bin/env bash
# usage: deb_in_bare_debian.sh PACKAGE.deb SOURCE_DIR [MIRROR] - installs the package in a fresh minimal Debian
# folder, uses it there and removes it. Needs root, debootstrap and a Debian mirror; some minutes.
# Run by hand; the package comes from scripts/package deb.
set -euo pipefail
package=$1 source=$2 mirror=${3:-}
bare=$(mktemp -d)
cleanup() { umount "$bare/proc" 2>/dev/null || true; rm -rf --one-file-system "$bare"; }
trap cleanup EXIT

debootstrap --variant=minbase bookworm "$bare" ${mirror:+"$mirror"} >/dev/null
mount -t proc proc "$bare/proc" # the command line finds its models beside itself
cp "$package" "$bare/tmp/morva.deb"
cp "$source/examples/audio/noisy.flac" "$bare/tmp/"
chroot "$bare" env DEBIAN_FRONTEND=noninteractive \
    apt-get install -y -qq --no-install-recommends /tmp/morva.deb >/dev/null
chroot "$bare" sh -euc '
    morva --version
    morva denoise /tmp/noisy.flac /tmp/clean.wav
    test -s /tmp/clean.wav
    morva vad /tmp/noisy.flac
    ldconfig -p | grep -q libmorva.so.1
    ls /usr/lib/ladspa/libmorva_ladspa.so /usr/lib/lv2/morva.lv2/morva.so /usr/lib/*/gstreamer-1.0/libgstmorva.so
    apt-get purge -y -qq morva >/dev/null'
left=$(find "$bare/usr" -name '*morva*')
[ -z "$left" ] || { echo "left behind: $left" >&2 && exit 1; }
echo "installed, used and removed"

#!/bin/sh
# usage: exports_test.sh LIBRARY HEADER... - the library exports what the headers declare, and
# nothing else.
set -eu
library=$1
shift
declared=$(cat "$@" | grep -oE '\b(Morva_[A-Za-z0-9_]+|MorvaExt_[A-Za-z0-9_]+)\(' | tr -d '(' | sort -u)
case $library in
    *.dylib) # and two names of the file's own head, which Zig's linker adds
        exported=$(llvm-objdump --macho --exports-trie "$library" | sed -n 's/^0x[0-9A-F]* *_//p' |
            grep -vE '^_(_dso_handle|_mh_dylib_header|mh_dylib_header)$' | sort -u) ;;
    *.dll) exported=$(objdump -p "$library" | sed -n 's/^.*\[ *[0-9]*\] .*\(Morva\)/\1/p' | sort -u) ;;
    *) exported=$(nm -D --defined-only "$library" | awk '{ print $3 }' | sort -u) ;;
esac
if [ "$declared" != "$exported" ]; then
    printf 'declared:\n%s\n\nexported:\n%s\n' "$declared" "$exported"
    exit 1
fi

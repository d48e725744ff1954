#!/bin/sh
# usage: install_test.sh BUILD CONSUMER COMPILER: installs the library into a folder of its own, moves that, builds a
# consumer there both ways and runs it.
set -eu
build=$1 consumer=$2 compiler=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

cmake --install "$build" --component kelvokit --prefix "$work/first" >"$work/log"
mv "$work/first" "$work/prefix"
test -z "$(find "$work/prefix" -name kelvod -type f)"
# Nothing is exported that applications cannot use.
library=$(find "$work/prefix" -name 'libKelvoKit.so.*' -type f)
inner=$(nm -DC --defined-only "$library" | grep -E 'kelvo::|Core>|Content' || true)
[ -z "$inner" ] || { echo "exported: $inner"; exit 1; }

expected="-5814 There is no valid connection to the recording service."
check() {
    said=$(LANG=C LANGUAGE='' LC_ALL='' KELVO_SOCKET="$work/nobody" "$@")
    [ "$said" = "$expected" ] || { echo "$1 says: $said"; exit 1; }
}

cmake -S "$consumer" -B "$work/cmake" -G Ninja -DCMAKE_CXX_COMPILER="$compiler" -DCMAKE_PREFIX_PATH="$work/prefix" \
    >"$work/log"
cmake --build "$work/cmake" >"$work/log" || { cat "$work/log"; exit 1; }
check "$work/cmake/consumer"

PKG_CONFIG_PATH=$(dirname "$(find "$work/prefix" -name kelvokit.pc)")
export PKG_CONFIG_PATH
# shellcheck disable=SC2046  # flags are words
"$compiler" "$consumer/consumer.cpp" -o "$work/consumer" $(pkg-config --cflags --libs kelvokit)
check env LD_LIBRARY_PATH="$(pkg-config --variable=libdir kelvokit)" "$work/consumer"

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
# The public classes are exported, and nothing else: not even another library's templates.
library=$(find "$work/prefix" -name 'libKelvoKit.so.*' -type f)
name=$(readelf -d "$library" | sed -n 's/.*SONAME.*\[\(.*\)\]/\1/p')
[ "$name" = libKelvoKit.so.0 ] || { echo "it calls itself $name"; exit 1; }
public=' ([A-Z] (typeinfo for )?kelvokit::(Recorder|Frame|AudioBuffer)(::|@@).*|A KELVOKIT_0)$'
exported=$(nm -DC --defined-only "$library")
echo "$exported" | grep -qE 'kelvokit::Recorder::start\('
inner=$(echo "$exported" | grep -vE "$public" || true)$(echo "$exported" | grep -E 'kelvo::|Core|Content' || true)
[ -z "$inner" ] || { echo "exported: $inner"; exit 1; }

# Finds the texts that were installed with it, in whichever language.
english="-5814 There is no valid connection to the recording service."
german="-5814 Es besteht keine gültige Verbindung zum Aufnahmedienst."
check() {
    said=$(LANG=C LANGUAGE='' LC_ALL='' KELVO_SOCKET="$work/nobody" "$@")
    [ "$said" = "$english" ] || { echo "$1 says: $said"; exit 1; }
    said=$(LANG=C LANGUAGE=de LC_ALL='' KELVO_SOCKET="$work/nobody" "$@")
    [ "$said" = "$german" ] || { echo "$1 says in German: $said"; exit 1; }
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

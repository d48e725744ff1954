#!/bin/sh
# usage: record_test.sh RECORD BUILD: records two seconds of the virtual display, with a videos folder of the test's
# own, and looks at what is said and made.
set -eu
record=$1 build=$2
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

fail() { echo "$1"; cat "$work/said"; exit 1; }

env -u DISPLAY XDG_VIDEOS_DIR="$work/videos" "$record" --seconds 2 --build "$build" >"$work/said" 2>&1 ||
    fail "the script failed"
movie=$(sed -n 's/^movie:  //p' "$work/said")
sheet=$(sed -n 's/^sheet:  //p' "$work/said")
[ "$(dirname "$movie")" = "$work/videos/Screen Recordings" ] || fail "the movie is not in the videos folder"
[ -s "$movie" ] || fail "there is no movie"
complaints=$(ffmpeg -nostdin -v error -i "$movie" -fps_mode passthrough -enc_time_base -1 -f null - 2>&1)
[ "$complaints" = "" ] || fail "the movie does not decode"
grep -q '^track:  video h264 1080x1920$' "$work/said" || fail "no video track"
grep -q '^track:  sound aac 44100 Hz, 2 channels$' "$work/said" || fail "no sound track"
grep -qE '^length: [0-9]\.[0-9]+ s$' "$work/said" || fail "the length is wrong"
[ "$(sed -n 's/^frames: \([0-9]*\),.*/\1/p' "$work/said")" -gt 1 ] || fail "the scene does not move"
loudest=$(ffmpeg -nostdin -i "$movie" -map 0:a -af volumedetect -f null - 2>&1 |
    sed -n 's/.*max_volume: -\([0-9]*\)\..*/\1/p')
[ "${loudest:-99}" -lt 30 ] || fail "nothing is heard"
[ "$(ffprobe -v error -of csv=p=0 -show_entries stream=width,height "$sheet")" = 826,580 ] || fail "the sheet is wrong"

# Wrong arguments are told, and nothing is started for them.
refused() {
    said=$1
    shift
    if "$record" "$@" >"$work/said" 2>&1; then fail "$* is taken"; fi
    grep -qxF "record: $said" "$work/said" || fail "it is not said what is wrong with $*"
}
refused "--seconds needs a number above 0, not soon" --seconds soon
refused "--seconds needs a number above 0, not 0.0" --seconds 0.0
refused "there is no folder for $work/none/sheet.png" --sheet "$work/none/sheet.png"
refused "there is no kelvod in $work" --build "$work"

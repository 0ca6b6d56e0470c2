#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# external_capturer_test.sh BINARY PNG_PIXEL CASE
#
# Runs the external_capturer example as a user would, on virtual X servers of its own. Without CASE, every case.
# Ends with 0 when all hold, 77 when the machine lacks what is needed.

set -u
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)
# shellcheck disable=SC1091  # The sourced file is checked by itself.
. "$root/examples/external_capturer/virtual_display.sh"

readonly limit=60  # Seconds that anything may take before it counts as hanging.
failures=0
run_pid=

fail() {
    echo "FAILED: $1" >&2
    [[ -n ${work:-} && -s $work/out ]] && sed 's/^/    out: /' "$work/out" >&2
    [[ -n ${work:-} && -s $work/err ]] && sed 's/^/    err: /' "$work/err" >&2
    failures=$((failures + 1))
}

expect_equal() { [[ $2 == "$3" ]] || fail "$1: expected '$2', got '$3'"; }
expect_line() { grep -qE -- "$2" "$work/out" || fail "$1: no line matches '$2'"; }
out_has() { grep -qE -- "$1" "$work/out"; }

# Root colour with three different channels, so that a swapped one shows; a window that is something else.
open_display() {
    start_virtual_display "$@" || exit 1
    work=$VIRTUAL_DISPLAY_DIR
    xsetroot -solid '#c02040'
    start_client xlogo -bg '#00ff00' -fg '#00ff00' -bw 0 -geometry 100x100+200+50
    wait_until $limit window_is_shown xlogo || fail "the window of xlogo does not appear"
}

close_display() {
    if [[ -n $run_pid ]]; then
        end_process "$run_pid"
        run_pid=
    fi
    stop_virtual_display
}

# run ARGUMENT...: to the end, with no input.
run() {
    timeout $limit "$binary" --out "$work/frames" "$@" </dev/null >"$work/out" 2>"$work/err"
}

# start ARGUMENT...: in the background; `say` types a line.
start() {
    rm -f "$work/input" "$work/out" "$work/err" # what the run before has said is not said by this one
    mkfifo "$work/input"
    "$binary" --out "$work/frames" "$@" <"$work/input" >"$work/out" 2>"$work/err" &
    run_pid=$!
    exec 9>"$work/input"
}

say() { echo "$1" >&9; }

expect_answer() {
    say "$1"
    wait_until $limit out_has "$2" || fail "'$1' gets no line that matches '$2'"
}

# expect_end CODE: the program ends by itself.
expect_end() {
    wait_until $limit has_ended "$run_pid" || fail "the program does not end"
    end_process "$run_pid"
    wait "$run_pid"
    expect_equal "exit code" "$1" "$?"
    run_pid=
    exec 9>&-
}

picture_count() { find "$work/frames" -name 'frame-*.png' | wc -l; }
last_picture() { find "$work/frames" -name 'frame-*.png' | sort | tail -1; }
pixel() { "$png_pixel" "$1" "$2" "$3" 2>&1; }
out_has_lines_of_help() { [[ $(grep -c '^commands:' "$work/out") == "$1" ]]; }
some_picture_is() { [[ $(pixel "$(last_picture)" 0 0) == "$1" ]]; }

expect_true_pictures() {
    local picture
    for picture in "$work"/frames/frame-*.png; do
        expect_equal "root in $picture" "$1 #c02040ff" "$(pixel "$picture" 5 5)"
        expect_equal "window in $picture" "$1 #00ff00ff" "$(pixel "$picture" 250 100)"
    done
}

case_frames() {
    open_display 640x480x24
    run --frames 5 --fps 10
    expect_equal "exit code" 0 $?
    expect_equal "pictures" 5 "$(picture_count)"
    expect_true_pictures 640x480
    expect_line "events" '^event: status 1 \(started\)$'
    expect_line "statistics" '^  frames delivered +[5-9]$'
    expect_equal "lines of statistics" 10 "$(grep -c '^  ' "$work/out")"
    expect_line "last line" "^5 PNG files in $work/frames$"
    expect_equal "standard error" "" "$(cat "$work/err")"

    rm -rf "$work/frames"
    run --frames 7 --every 3 --fps 20
    expect_equal "pictures of every third frame" "frame-000001.png frame-000004.png frame-000007.png" \
        "$(cd "$work/frames" && echo frame-*)"
    run --frames 2 --fps 20 --check-duplicates
    expect_line "duplicates" '^  duplicates found +[1-9]'
    close_display
}

case_without_shared_memory() {
    open_display 640x480x24 -extension MIT-SHM
    expect_equal "probe" "display \"$DISPLAY\" can be captured: 640x480, without shared memory" \
        "$("$binary" --probe)"
    run --frames 3 --fps 10
    expect_equal "exit code" 0 $?
    expect_true_pictures 640x480
    close_display
}

case_refusals() {
    local answer
    open_display 320x240x16
    run --display :7777 --frames 1
    expect_equal "exit code without a display" 1 $?
    expect_equal "line without a display" 'external_capturer: cannot open display ":7777"' "$(cat "$work/err")"
    run --frames 1
    expect_equal "exit code with 16 bits a pixel" 1 $?
    expect_equal "lines with 16 bits a pixel" 1 "$(grep -c 'has depth 16' "$work/err")"
    (unset DISPLAY && run --frames 1)
    expect_equal "exit code without DISPLAY" 1 $?
    expect_equal "lines without DISPLAY" 1 "$(wc -l <"$work/err")"
    run --frames nonsense
    expect_equal "exit code of a bad option" 2 $?
    expect_equal "lines of a bad option" 1 "$(wc -l <"$work/err")"
    close_display

    open_display 320x240x24
    touch "$work/file"
    run --frames 1 --out "$work/file/frames"
    expect_equal "exit code with no folder" 1 $?
    expect_equal "lines with no folder" 1 "$(wc -l <"$work/err")"
    # Where no file may get longer than nothing, as on a full disk.
    answer=$( (ulimit -f 0 && trap '' XFSZ && exec timeout $limit "$binary" --out "$work/full") 2>&1 </dev/null)
    expect_equal "exit code with a full disk" 1 $?
    expect_equal "pictures on a full disk" 0 "$(find "$work/full" -type f | wc -l)"
    expect_equal "lines about a full disk" 1 "$(grep -c 'cannot write' <<<"$answer")"
    expect_equal "last line with a full disk" "0 PNG files in $work/full" "$(tail -1 <<<"$answer")"
    close_display
}

case_debug_file() {
    open_display 320x240x24
    export SCREENSHARE_DEBUG_DIR=$work/debug SCREENSHARE_TRACE=debug
    mkdir -p "$SCREENSHARE_DEBUG_DIR/img-dump"
    cat >"$SCREENSHARE_DEBUG_DIR/share_config.json" <<'END'
{ "dummy_point": true, "trace_one_by_frames": 1, "dump_raw_data_every_x_frames": 1, "dump_raw_data_ring_size": 2 }
END
    run --frames 4 --fps 20 --dump
    expect_equal "exit code" 0 $?
    expect_equal "dummy pointers" 1 "$(grep -c 'CreateSharePointing() create dummy object' "$work/err")"
    expect_equal "dumped pictures" "0_combined.png 1_combined.png 2_combined.png" \
        "$(cd "$SCREENSHARE_DEBUG_DIR/img-dump" && echo *)"
    expect_equal "a dumped pixel" "320x240 #c02040ff" "$(pixel "$SCREENSHARE_DEBUG_DIR/img-dump/1_combined.png" 0 0)"
    run --frames 2 --fps 20
    expect_equal "dumps without --dump" 3 "$(find "$SCREENSHARE_DEBUG_DIR/img-dump" -type f -newer "$work/debug/share_config.json" | wc -l)"
    unset SCREENSHARE_DEBUG_DIR SCREENSHARE_TRACE
    close_display
}

case_commands() {
    open_display 640x480x24
    start --fps 10
    wait_until $limit out_has '^frame 1:' || fail "no first frame"
    expect_answer "fps 30" '^fps 30: ok$'
    expect_answer "dup on" '^dup on: ok$'
    expect_answer "force" '^force: ok$'
    expect_answer "dup off" '^dup off: ok$'
    expect_answer "max 320x200" '^max 320x200: ok$'
    wait_until $limit some_picture_is "266x200 #c02040ff" || fail "pictures keep their size"
    expect_answer "pause" '^event: status 3 \(paused\)$'
    expect_answer "resume" '^resume: ok$'
    expect_answer "stats" '^  width +266$'
    expect_answer "fps 0" '^commands: fps N, max'
    say "help"
    wait_until $limit out_has_lines_of_help 2 || fail "'help' does not list the commands again"
    printf 'st' >&9
    expect_answer "op" '^event: status 2 \(stopped\)$'
    expect_end 0

    # The end of the input does not end the run; a signal does, with everything that belongs to an end.
    run_on_signal INT
    run_on_signal TERM
    close_display
}

run_on_signal() {
    start --fps 10
    exec 9>&-
    wait_until $limit out_has '^frame 1:' || fail "no frame after the end of the input"
    kill -s "$1" "$run_pid"
    expect_end 0
    expect_line "end by $1" '^[0-9]+ PNG files in '
}

case_new_size() {
    open_display 640x480x24
    start --fps 20
    wait_until $limit out_has '^frame 1:' || fail "no first frame"
    xrandr --newmode small 12.0 400 408 448 512 300 301 304 312
    xrandr --addmode screen small
    xrandr --output screen --mode small
    wait_until $limit some_picture_is "400x300 #c02040ff" || fail "pictures keep their size"
    expect_line "size" '^event: size 400x300$'
    say stop
    expect_end 0
    close_display
}

case_lost_display() {
    open_display 640x480x24
    start --fps 20
    wait_until $limit out_has '^frame 1:' || fail "no first frame"
    end_process "$VIRTUAL_DISPLAY_PID"
    wait_until $limit out_has '^event: error -203 \(the display has gone\)$' || fail "the loss is not told"
    expect_answer "stats" '^statistics$'
    say stop
    expect_end 0
    expect_equal "losses told" 1 "$(grep -c 'error -203' "$work/out")"
    close_display
}

case_frozen_display() {
    open_display 640x480x24
    export SCREENSHARE_TRACE=error
    start --fps 20
    unset SCREENSHARE_TRACE
    wait_until $limit out_has '^frame 1:' || fail "no first frame"
    kill -STOP "$VIRTUAL_DISPLAY_PID"
    wait_until $limit grep -q 'Fail Capture Content' "$work/err" || fail "a grab waits without end"
    say stop
    expect_end 0
    kill -CONT "$VIRTUAL_DISPLAY_PID"
    close_display
}

binary=${1:?usage: external_capturer_test.sh BINARY PNG_PIXEL [CASE]}
png_pixel=${2:?usage: external_capturer_test.sh BINARY PNG_PIXEL [CASE]}
for program in Xvfb xlogo xwininfo xsetroot xrandr; do
    command -v $program >/dev/null || { echo "skipped: $program is not installed"; exit 77; }
done

trap close_display EXIT
trap 'exit 130' INT TERM HUP
for name in ${3:-frames without_shared_memory refusals commands new_size lost_display frozen_display}; do
    echo "case $name"
    "case_$name"
done
((failures == 0))

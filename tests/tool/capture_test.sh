#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs `screenshare capture` on the simulated desktop, in real time. Called with the program and the name of a case.
set -uo pipefail
readonly program=$1 limit=60 # Seconds that anything may take before it counts as hanging.
work=$(mktemp -d)
job='' # What runs in the background.
trap '[[ -z $job ]] || kill -KILL $job 2>/dev/null; rm -rf "$work"' EXIT
unset SCREENSHARE_TRACE DISPLAY WAYLAND_DISPLAY
export SCREENSHARE_PLATFORM=simulated SCREENSHARE_DEBUG_DIR=$work

readonly frame_bytes=$((1280 * 800 * 4)) planes_bytes=$((1280 * 800 * 3 / 2))

fail() {
    echo "FAILED: $*"
    sed 's/^/    err: /' "$work/err"
    exit 1
}

capture() { timeout $limit "$program" capture "$@" </dev/null 2>"$work/err"; }

# expect_exit CODE ARGUMENT...
expect_exit() {
    capture "${@:2}" >"$work/out"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}
expect_refusal() { # CODE TEXT ARGUMENT...
    expect_exit "$1" "${@:3}"
    [[ ! -s $work/out ]] || fail "'${*:3}' writes to standard output"
    grep -qF -- "$2" "$work/err" || fail "'${*:3}' does not say '$2'"
    ! grep -q 'delivered' "$work/err" || fail "'${*:3}' captures all the same"
}
expect_said() { grep -qE -- "$1" "$work/err" || fail "it does not say '$1'"; }
expect_size() { [[ $(stat -c %s "$1") -eq $2 ]] || fail "$1 has $(stat -c %s "$1") bytes and not $2"; }
expect_many_bytes() { [[ -s $1 ]] || fail "$1 is empty"; }

# Waits for the end of what runs in the background.
expect_end() { # CODE
    local code
    wait "$job"
    code=$?
    job=''
    [[ $code -eq $1 ]] || fail "it ends with $code and not with $1"
}
wait_for_bytes() { # FILE
    local tries
    for ((tries = 0; tries < limit * 10; ++tries)); do
        [[ -s $1 ]] && return
        sleep 0.1
    done
    fail "nothing gets into $1"
}

wait_for_text() { # FILE TEXT
    local tries
    for ((tries = 0; tries < limit * 10; ++tries)); do
        grep -qF "$2" "$1" 2>/dev/null && return
        sleep 0.1
    done
    fail "'$2' doesn't come in $1"
}

# pixel FILE OFFSET-OF-PICTURE BYTES-A-PIXEL X Y: three bytes, in decimal
pixel() { od -An -v -tu1 -j $(($2 + ($5 * 1280 + $4) * $3)) -N 3 "$1" | xargs; }
expect_raw_pixel() { # X Y "BLUE GREEN RED"
    local found
    found=$(pixel "$work/raw" 0 4 "$1" "$2")
    [[ $found == "$3" ]] || fail "the pixel at $1,$2 is $found and not $3"
}
count_raw_pixels() { od -An -v -tx4 -w4 "$work/raw" | grep -c "$1"; } # AARRGGBB

case_png() {
    expect_exit 0 --frames 3 --png "$work/new/pictures"
    [[ $(cd "$work/new/pictures" && echo *) == 'frame-000001.png frame-000002.png frame-000003.png' ]] ||
        fail "there are $(ls "$work/new/pictures")"
    local file
    for file in "$work"/new/pictures/*; do
        # The signature, and width and height behind it.
        [[ $(od -An -tx1 -N 24 "$file" | tr -d ' \n') == 89504e470d0a1a0a0000000d494844520000050000000320 ]] ||
            fail "$file is no PNG file of 1280x800"
    done
    expect_said "^  written     3 frames, .*, $work/new/pictures$"
    [[ ! -s $work/out ]] || fail "something gets to standard output"
}

# Through a decoder that is not ours: places of one colour, within what limited range and rounding leave.
case_y4m_read_by_a_stock_tool() {
    command -v y4mtoppm >/dev/null || { echo "skipped: y4mtoppm is not installed"; exit 77; }
    capture --frames 2 --y4m - | timeout $limit y4mtoppm >"$work/ppm" 2>"$work/tool" || fail "$(cat "$work/tool")"
    local header x y red green blue found
    header=$'P6\n1280 800 255'
    [[ $(head -c ${#header} "$work/ppm") == "$header" ]] || fail "the tool reads another size"
    expect_size "$work/ppm" $((2 * (${#header} + 1 + 1280 * 800 * 3)))
    while read -r x y red green blue; do
        read -r -a found <<<"$(pixel "$work/ppm" $((${#header} + 1)) 3 "$x" "$y")"
        [[ $((found[0] - red)) =~ ^-?[0-4]$ && $((found[1] - green)) =~ ^-?[0-4]$ &&
            $((found[2] - blue)) =~ ^-?[0-4]$ ]] || fail "$x,$y is ${found[*]} and not $red $green $blue"
    done <<'END'
1000 4 242 243 245
100 300 238 240 243
500 200 252 252 253
20 100 84 132 184
560 770 78 165 217
610 774 95 184 120
700 600 203 225 160
END
}

case_raw_is_what_it_says() {
    expect_exit 0 --frames 2 --raw -
    expect_size "$work/out" $((2 * frame_bytes))
    expect_said "raw frames: 1280x800 BGRA, 5120 bytes a line, $frame_bytes bytes a frame"
    expect_exit 0 --monitor 2 --frames 1 --max 400x400 --raw "$work/raw"
    expect_said 'raw frames: 400x300 BGRA'
    expect_size "$work/raw" $((400 * 300 * 4))
}

case_y4m_has_as_many_frames_as_are_wanted() {
    expect_exit 0 --frames 7 --y4m "$work/y4m" --fps 20
    local header
    header=$(head -n 1 "$work/y4m")
    [[ $header == 'YUV4MPEG2 W1280 H800 F20:1 Ip A1:1 C420jpeg XYSCSS=420JPEG XCOLORRANGE=LIMITED' ]] ||
        fail "the header is '$header'"
    expect_size "$work/y4m" $((${#header} + 1 + 7 * (6 + planes_bytes)))
    # Nothing moves there: a picture that stays is repeated, and doesn't wait for one that comes each second.
    expect_exit 0 --monitor 2 --frames 30 --y4m "$work/y4m"
    expect_size "$work/y4m" $(($(head -n 1 "$work/y4m" | wc -c) + 30 * (6 + 800 * 600 * 3 / 2)))
    expect_said '^  written     30 frames'
}

case_seconds() {
    expect_exit 0 --seconds 2
    expect_said '^  delivered   [1-9][0-9]* frames in [2-9]\.[0-9] s'
    ! grep -q written "$work/err" || fail "nothing was to be written"
    ! grep -q $'\r' "$work/err" || fail "there is a changing line without a terminal"
    expect_said '^screenshare: started$'
}

case_json() {
    command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }
    expect_exit 0 --json --frames 3 --raw "$work/raw"
    python3 - "$work/out" "$work/raw" $((3 * frame_bytes)) <<'END' || fail "the statistics are not what they should be"
import json, sys
told = json.loads(open(sys.argv[1]).read())
assert told["written"] == {"frames": 3, "bytes": int(sys.argv[3]), "target": sys.argv[2]}, told
assert told["delivered"] >= 3 and told["width"] == 1280 and told["height"] == 800 and told["seconds"] > 0, told
assert told["mode"] == "default" and told["fell_back"] is False, told
END
    ! grep -q delivered "$work/err" || fail "they are told twice"
    # Frames have standard output for themselves.
    expect_exit 0 --json --frames 1 --raw -
    expect_size "$work/out" $frame_bytes
    expect_said '^\{"delivered": [1-9].*"target": "standard output"\}\}$'
    expect_exit 0 --json --seconds 1
    grep -q '"written": null}$' "$work/out" || fail "something is said to be written"
}

case_json_that_nobody_gets() {
    local code
    capture --json --seconds 1 | :
    code=${PIPESTATUS[0]}
    [[ $code -eq 4 ]] || fail "a closed pipe ends it with $code and not with 4"
    expect_said 'the reader of standard output has closed the pipe'
    [[ -w /dev/full ]] || return 0
    capture --json --seconds 1 >/dev/full
    code=$?
    [[ $code -eq 5 ]] || fail "a full disk ends it with $code and not with 5"
}

case_what_is_kept_out_is_not_there() {
    expect_exit 0 --monitor main --frames 1 --no-pointer --raw "$work/raw"
    expect_raw_pixel 100 300 '243 240 238' # the editor's edge
    [[ $(count_raw_pixels fffcfcfd) -gt 100000 ]] || fail "the editor's paper is not there"
    [[ $(count_raw_pixels ff39424e) -gt 10000 ]] || fail "the editor's text is not there"
    expect_raw_pixel 700 600 '160 225 203' # the note, with what shines through
    expect_exit 0 --frames 1 --no-pointer --exclude-app 5000101 --exclude-window 7 --raw "$work/raw"
    expect_raw_pixel 100 300 '201 160 112' # the sky behind it
    [[ $(count_raw_pixels fffcfcfd) -eq 0 ]] || fail "the editor's paper can be seen"
    [[ $(count_raw_pixels ff39424e) -eq 0 ]] || fail "the editor's text can be seen"
    [[ $(pixel "$work/raw" 0 4 700 600) != '160 225 203' ]] || fail "the note can be seen"
    [[ $(count_raw_pixels ff2e86ab) -gt 500 ]] || fail "what was not kept out is gone, too"
}

case_shares_of_applications_and_windows() {
    expect_exit 0 --app 5000105 5000101 --frames 1 --no-pointer --raw "$work/raw"
    expect_size "$work/raw" $frame_bytes
    expect_raw_pixel 100 300 '243 240 238' # the editor's edge
    [[ $(count_raw_pixels fffcfcfd) -gt 100000 ]] || fail "the editor's paper is not there"
    expect_raw_pixel 20 300 '158 158 0' # what is not shared
    expect_exit 0 --window 5 --frames 1 --no-pointer --raw "$work/raw"
    expect_size "$work/raw" $frame_bytes
    expect_raw_pixel 100 300 '243 240 238'
    expect_raw_pixel 20 300 '158 158 0'
}

case_shares_by_name() {
    expect_exit 0 --app Editor --frames 1 --no-pointer --raw "$work/raw"
    expect_raw_pixel 100 300 '243 240 238' # the editor's edge
    expect_raw_pixel 20 300 '158 158 0'    # what is not shared
    [[ $(count_raw_pixels ff39424e) -gt 10000 ]] || fail "the editor's text is not there"
    expect_exit 0 --window Shopping --frames 1 --no-pointer --raw "$work/raw"
    [[ $(count_raw_pixels ff39424e) -eq 0 ]] || fail "the editor's text is there"
    expect_raw_pixel 100 300 '158 158 0'
    expect_refusal 1 "there is no application with a window 'Painter'" --app Painter
    expect_refusal 1 "there is no window 'Chapter'" --window Chapter
    expect_refusal 1 "there is more than one window ''" --window ''
}

# What is handed over there was taken a little before.
case_queued() {
    local share
    for share in --monitor=main --app=Editor --window=5; do
        expect_exit 0 --mode queued "$share" --frames 2 --no-pointer --raw "$work/raw"
        expect_size "$work/raw" $((2 * frame_bytes))
        expect_raw_pixel 100 300 '243 240 238'
        expect_said '^  mode        queued$'
    done
    expect_exit 0 --mode queued --frames 1 --no-pointer --exclude-app 5000101 --raw "$work/raw"
    [[ $(count_raw_pixels ff39424e) -eq 0 ]] || fail "the editor's text can be seen"
}

case_pointer() {
    expect_exit 0 --frames 1 --exclude-app 5000101 --raw "$work/raw"
    expect_raw_pixel 642 386 '0 0 0'
    expect_exit 0 --frames 1 --exclude-app 5000101 --no-pointer --raw "$work/raw"
    [[ $(pixel "$work/raw" 0 4 642 386) != '0 0 0' ]] || fail "the pointer is there"
}

case_closed_pipe() {
    capture --raw - | head -c 100 >"$work/out"
    local code=${PIPESTATUS[0]}
    [[ $code -eq 4 ]] || fail "it ends with $code and not with 4"
    expect_size "$work/out" 100
    expect_said 'the reader of standard output has closed the pipe'
    expect_said '^  delivered '
}

# Frames are far between there: the end of the reader must not wait for the next one, and at the end of a y4m stream it
# is the main thread that finds nobody to read what it repeats.
case_closed_pipe_while_nothing_moves() {
    local form first_frame=$((800 * 600 * 4))
    for form in --raw --y4m; do
        capture --monitor 2 $form - | {
            head -c $first_frame >"$work/out"
            sleep 0.3
        }
        local code=${PIPESTATUS[0]}
        [[ $code -eq 4 ]] || fail "$form ends with $code and not with 4"
        expect_size "$work/out" $first_frame
        expect_said '^  delivered '
        first_frame=$((78 + 6 + 800 * 600 * 3 / 2)) # The header, a frame's mark, its planes.
    done
}

# A signal ends it as a limit does: the last frame is whole.
case_signals() {
    local signal
    for signal in INT TERM; do
        rm -f "$work/y4m"
        "$program" capture --y4m "$work/y4m" </dev/null 2>"$work/err" &
        job=$!
        wait_for_bytes "$work/y4m"
        kill -s $signal $job
        expect_end 0
        expect_said '^  written     [1-9]'
        local size
        size=$(($(stat -c %s "$work/y4m") - $(head -n 1 "$work/y4m" | wc -c)))
        [[ $((size % (6 + planes_bytes))) -eq 0 && $size -gt 0 ]] || fail "SIG$signal leaves half a frame"
    done
}

case_signal_while_a_reader_takes_nothing() {
    mkfifo "$work/pipe"
    exec 9<>"$work/pipe"
    "$program" capture --raw "$work/pipe" </dev/null 2>"$work/err" 9<&- &
    job=$!
    wait_for_text "$work/err" "raw frames" # the first one is being written
    kill -s TERM $job
    expect_end 5
    expect_said "the reader of $work/pipe takes nothing any more"
}

case_full_disk() {
    [[ -w /dev/full ]] || { echo "skipped: there is no /dev/full"; exit 77; }
    local form
    for form in --y4m --raw; do
        expect_exit 5 $form /dev/full
        [[ $(grep -c 'No space left on device' "$work/err") -eq 1 ]] || fail "it is not said once"
    done
    capture --y4m - >/dev/full
    local code=$?
    [[ $code -eq 5 ]] || fail "it ends with $code and not with 5"
    expect_said 'cannot write standard output: No space left on device'
}

case_places_that_cannot_be_written() {
    expect_refusal 5 "cannot write $work/none/file: No such file or directory" --y4m "$work/none/file"
    expect_refusal 5 "cannot write $work: Is a directory" --raw "$work"
    touch "$work/file"
    expect_refusal 5 "cannot make folder $work/file: Not a directory" --png "$work/file"
}

case_sessions() {
    local mode share
    for mode in session mix; do
        for share in --monitor=main --app=Editor --window=5; do
            expect_exit 0 --mode $mode "$share" --frames 2 --no-pointer --raw "$work/raw"
            expect_size "$work/raw" $((2 * frame_bytes))
            expect_raw_pixel 100 300 '243 240 238'
            expect_said "^  mode        $mode\$"
        done
        expect_exit 0 --mode $mode --frames 1 --no-pointer --exclude-app 5000101 --raw "$work/raw"
        [[ $(count_raw_pixels ff39424e) -eq 0 ]] || fail "the editor's text can be seen"
    done
}

case_ids_that_are_not_there() {
    expect_refusal 1 'there is no monitor 9; there are: 1, 2' --monitor 9
    expect_refusal 1 'there is no application with a window 77;' --exclude-app 77
    expect_refusal 1 'there is no window 99;' --exclude-window 5 99
    expect_refusal 1 'there is no window 99;' --window 99
}

case_command_lines_that_make_no_sense() {
    expect_refusal 2 "--monitor: 'one' is neither a number nor 'main'" --monitor one
    expect_refusal 2 '--monitor excludes --app' --monitor main --app 5000101
    expect_refusal 2 '--fps: Value 0 not in range' --fps 0
    expect_refusal 2 '--fps: Value 241 not in range' --fps 241
    expect_refusal 2 "--max: '10' is no size such as 1280x720" --max 10
    expect_refusal 2 "--max: '0x5' is no size such as 1280x720" --max 0x5
    expect_refusal 2 '--mode: fast not in' --mode fast
    expect_refusal 2 '--seconds: Value 0 not in range' --seconds 0
    expect_refusal 2 '--frames: Value -1 not in range' --frames -1
    expect_refusal 2 '--seconds excludes --frames' --seconds 1 --frames 1
    expect_refusal 2 'excludes' --png "$work/pictures" --raw "$work/raw"
    expect_refusal 2 'excludes' --y4m - --raw -
    expect_refusal 2 '--y4m' --y4m
    expect_refusal 2 '--exclude-menu-bar' --exclude-menu-bar
    [[ ! -e $work/pictures && ! -e $work/raw ]] || fail "a refused line leaves something"
}

case_help() {
    capture --help >"$work/out" || fail "there is no help"
    local word
    for word in --monitor --window --app --exclude-app --exclude-window --fps --max --mode --no-pointer --seconds \
        --frames --png --y4m --raw Examples: 'Exit code:'; do
        grep -qF -- "$word" "$work/out" || fail "help does not name $word"
    done
}

"case_$2"

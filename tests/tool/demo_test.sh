#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs `screenshare demo` on its built-in scene and on X servers of its own. Called with the program, a program that
# reads pixels of PNG files, an X client that does what it is told, and the name of a case.
set -uo pipefail
readonly program=$1 png_pixel=$2 x11_client=$3 limit=60 # Seconds that anything may take before it counts as hanging.
work=$(mktemp -d)
jobs=() # What runs in the background, by id; the first one is the server.
end_jobs() {
    local job
    for job in "${jobs[@]}"; do
        kill "$job" 2>/dev/null
        wait "$job" 2>/dev/null
    done
}
trap 'end_jobs; rm -rf "$work"' EXIT
unset SCREENSHARE_TRACE SCREENSHARE_PLATFORM DISPLAY WAYLAND_DISPLAY XDG_SESSION_TYPE
export SCREENSHARE_DEBUG_DIR=$work XAUTHORITY=$work/authority
readonly folder=$work/new/demo

# Top edges of the two rows of pictures, and the left one of the screen's, as the sheet has them.
readonly row_1=72 row_2=404 screen_left=20

fail() {
    echo "FAILED: $*"
    sed 's/^/    out: /' "$work/out"
    sed 's/^/    err: /' "$work/err"
    exit 1
}

demo() { timeout $limit "$program" demo "$@" </dev/null >"$work/out" 2>"$work/err"; }
# The output as one line: where it is broken is not what the cases are about.
expect_exit() { # CODE ARGUMENT...
    demo "${@:2}"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
    tr -s ' \n' ' ' <"$work/out" >"$work/line"
}
expect_printed() { grep -qF -- "$1" "$work/line" || fail "it does not print '$1'"; }
expect_row() { grep -qxE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_complaint() { # TEXT
    [[ $(wc -l <"$work/err") -eq 1 ]] || fail "it does not complain in one line"
    grep -qF -- "$1" "$work/err" || fail "it does not say '$1'"
}
expect_no_complaint() { [[ ! -s $work/err ]] || fail "it complains"; }
expect_no_files() { [[ ! -e $folder || -z $(ls -A "$folder") ]] || fail "it leaves files"; }

pixel() { # X Y
    local found
    found=$("$png_pixel" "$folder/demo.png" "$1" "$2" 2>&1)
    echo "${found##* }"
}
expect_pixel() { # X Y COLOUR
    local found
    found=$(pixel "$1" "$2")
    [[ $found == "#$3ff" ]] || fail "demo.png at $1,$2 is '$found' and not '#$3ff'"
}
expect_both_files() {
    [[ $(find "$folder" -mindepth 1 -printf '%f\n' | LC_ALL=C sort | xargs) == 'demo.png demo.svg' ]] ||
        fail "there is $(ls -A "$folder")"
    grep -qF '</svg>' "$folder/demo.svg" || fail "demo.svg is not whole"
    expect_printed "$folder/demo.png "
    expect_printed "$folder/demo.svg "
}

start_server() {
    command -v Xvfb >/dev/null || { echo "skipped: Xvfb is not installed"; exit 77; }
    mkfifo "$work/number"
    exec 7<>"$work/number"
    Xvfb -displayfd 7 -noreset -nolisten tcp -screen 0 1280x800x24 >"$work/log" 2>&1 &
    jobs+=($!)
    local number
    read -r -t $limit -u 7 number || { sed 's/^/    log: /' "$work/log"; echo "FAILED: no server"; exit 1; }
    exec 7>&-
    export DISPLAY=:$number
}

start_client() {
    mkfifo "$work/orders" "$work/answers"
    exec 8<>"$work/orders" 9<>"$work/answers"
    "$x11_client" editor <&8 >&9 &
    jobs+=($!)
    take_answer
}
take_answer() {
    read -r -t $limit -u 9 answer || fail "the client does not answer"
    [[ $answer == ok* ]] || fail "the client says '$answer'"
}
tell_client() { # ORDER
    echo "$1" >&8
    take_answer
}

wait_for_first_line() {
    local tries
    for ((tries = 0; tries < limit * 20; ++tries)); do
        [[ -s $work/out ]] && return
        sleep 0.05
    done
    fail "it prints nothing"
}

# At the place of the secret window, clear of what is written on it and behind it.
expect_scene() {
    expect_both_files
    [[ $("$png_pixel" "$folder/demo.png" 0 0) == '1588x684 #f4f5f7ff' ]] || fail "the sheet is another one"
    expect_pixel $((screen_left + 175)) $((row_1 + 162)) c0392b
    local left top
    for left in 716 1152; do
        for top in $row_1 $row_2; do
            expect_pixel $((left + 175)) $((top + 162)) fcfcfd
        done
    done
}

case_scene_without_display() {
    expect_exit 0 --out "$folder"
    expect_no_complaint
    expect_scene
    expect_printed 'No X display can be captured here: DISPLAY is not set'
    expect_printed 'This is a built-in scene: two monitors and a few applications. Shared: the application "Editor"'
    expect_printed 'Look at the window "Keys" (id 6) of another application: it is on the screen'
    expect_printed 'Counted: 62700 of its pixels are on the screen; among the 4096000 that others see there are 0.'
    expect_row '\(screen\) +2080x800 +- +62700 +-'
    local mode
    for mode in default queued session mix; do
        expect_row "$mode +1280x800 +[0-9]+ +0 +(-|sends more when something moves)" # on a slow machine
    done
}

# The default folder, with an old picture in it.
case_scene_that_is_asked_for() {
    mkdir -p "$work/here/out/demo"
    echo old >"$work/here/out/demo/demo.png"
    (cd "$work/here" && timeout $limit "$program" --platform simulated demo </dev/null >"$work/text" 2>"$work/err") ||
        fail "it fails"
    grep -qF 'As asked for, nothing is captured of a real desktop.' "$work/text" || fail "it does not say why"
    [[ $("$png_pixel" "$work/here/out/demo/demo.png" 0 0) == 1588x684* ]] || fail "the picture is the old one"
}

show_two_windows() {
    start_server
    start_client
    tell_client 'create page 100 100 600 400 2060A0'
    page=${answer#ok }
    tell_client 'create keys 300 200 200 150 E03020'
}

case_frontmost_window_kept_out() {
    show_two_windows
    expect_exit 0 --out "$folder"
    expect_no_complaint
    expect_both_files
    expect_printed "This is your X display $DISPLAY. Shared: monitor "
    expect_printed "(id ${answer#ok })"
    # In the middle of the front window; what it covers is there in all but one mode, which has a plain colour.
    expect_pixel $((screen_left + 130)) $((row_1 + 89)) e03020
    expect_pixel $((460 + 130)) $((row_1 + 89)) 2060a0
    expect_pixel $((896 + 130)) $((row_1 + 89)) 2060a0
    expect_pixel $((460 + 130)) $((row_2 + 89)) 009e9e
    expect_pixel $((896 + 130)) $((row_2 + 89)) 2060a0
}

case_named_window_kept_out() {
    show_two_windows
    expect_exit 0 --out "$folder" --exclude-window "$page"
    expect_printed "(id $page)"
    expect_both_files
    expect_pixel $((screen_left + 49)) $((row_1 + 49)) 2060a0
    local left top
    for left in 460 896; do
        for top in $row_1 $row_2; do
            [[ $(pixel $((left + 49)) $((top + 49))) != '#2060a0ff' ]] || fail "the window shows at $left,$top"
            expect_pixel $((left + 130)) $((top + 89)) e03020
        done
    done
}

case_window_that_is_not_there() {
    start_server
    expect_exit 1 --out "$folder" --exclude-window 77
    expect_complaint 'there is no window 77; there are: none'
    expect_no_files
    DISPLAY='' expect_exit 1 --out "$folder" --exclude-window 77
    expect_complaint 'there is no window 77 to keep out. No X display can be captured here: DISPLAY is not set'
    expect_no_files
}

case_display_that_goes_away() {
    local code
    start_server
    start_client
    tell_client 'create page 100 100 600 400 2060A0'
    : >"$work/out"
    timeout $limit "$program" demo --out "$folder" </dev/null >"$work/out" 2>"$work/err" &
    local job=$!
    wait_for_first_line
    kill "${jobs[0]}"
    wait $job
    code=$?
    [[ $code -eq 1 ]] || fail "it ends with $code and not with 1"
    expect_complaint 'the window server went away'
    [[ $(wc -l <"$work/out") -eq 1 ]] || fail "it goes on"
    expect_no_files
}

case_signals() {
    local signal code
    for signal in INT TERM; do
        : >"$work/out"
        "$program" demo --out "$folder" </dev/null >"$work/out" 2>"$work/err" &
        jobs=($!)
        wait_for_first_line
        kill -s $signal "${jobs[0]}" || fail "it has ended before"
        wait "${jobs[0]}"
        code=$?
        jobs=()
        [[ $code -eq 0 ]] || fail "SIG$signal ends it with $code"
        expect_complaint 'nothing is written'
        expect_no_files
    done
}

case_folders_that_cannot_be_written() {
    echo kept >"$work/file"
    expect_exit 5 --out "$work/file"
    expect_complaint "cannot make folder $work/file: "
    [[ ! -s $work/out ]] || fail "it prints something"
    [[ $(cat "$work/file") == kept ]] || fail "the file is another one"
}

# A limit on the size of files stands for a disk that has so little room.
case_full_disk() {
    (
        trap '' XFSZ
        ulimit -f 4
        expect_exit 5 --out "$folder"
    ) || exit 1
    expect_complaint "cannot write $folder/demo.png: File too large"
    expect_no_files
}

case_a_reader_that_has_gone() {
    local code
    mkfifo "$work/pipe"
    exec 9<>"$work/pipe"
    exec 8>"$work/pipe" 9<&-
    : >"$work/out"
    timeout $limit "$program" demo --out "$folder" </dev/null 2>"$work/err" >&8
    code=$?
    [[ $code -eq 4 ]] || fail "it ends with $code and not with 4"
    expect_complaint 'the reader of standard output has closed the pipe'
}

case_command_lines_that_make_no_sense() {
    expect_exit 2 --scene --exclude-window 5 --out "$folder"
    expect_complaint '--scene excludes --exclude-window'
    expect_exit 2 --exclude-window front
    expect_complaint '--exclude-window'
    expect_exit 2 --out
    expect_complaint '--out needs a value'
    expect_exit 2 another
    expect_complaint 'another'
    expect_no_files
}

"case_$4"

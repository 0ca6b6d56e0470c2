#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# picker_test.sh PICKER PNG_PIXEL CASE
#
# Runs the picker on the simulated desktop, as a user would.
set -uo pipefail
readonly program=$1 png_pixel=$2 limit=60 # Seconds that anything may take before it counts as hanging.
work=$(mktemp -d)
run_pid=
trap '[[ -z $run_pid ]] || kill -KILL "$run_pid" 2>/dev/null; rm -rf "$work"' EXIT
unset SCREENSHARE_TRACE DISPLAY WAYLAND_DISPLAY
export SCREENSHARE_PLATFORM=simulated SCREENSHARE_DEBUG_DIR=$work

fail() {
    echo "FAILED: $*"
    sed 's/^/    out: /' "$work/out"
    sed 's/^/    err: /' "$work/err"
    exit 1
}

# wait_until COMMAND...: repeats the command until it succeeds; fails when the time is over.
wait_until() {
    local deadline=$((SECONDS + limit))
    until "$@" >/dev/null 2>&1; do
        ((SECONDS < deadline)) || return 1
        sleep 0.02
    done
}

# expect_exit CODE ARGUMENT...
expect_exit() {
    timeout $limit "$program" "${@:2}" </dev/null >"$work/out" 2>"$work/err"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}

# start ARGUMENT...: in the background.
start() {
    rm -f "$work/out" "$work/err" # what the run before has said is not said by this one
    "$program" "$@" </dev/null >"$work/out" 2>"$work/err" &
    run_pid=$!
}

has_ended() { ! jobs -pr | grep -qx "$run_pid"; }

# expect_end CODE: the program that was started ends by itself.
expect_end() {
    wait_until has_ended || fail "it does not end"
    wait "$run_pid"
    local code=$?
    run_pid=
    [[ $code -eq $1 ]] || fail "it ends with $code and not with $1"
}

out_has() { grep -qE -- "$1" "$work/out"; }
expect_line() { grep -qxE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_no_complaint() { [[ ! -s $work/err ]] || fail "it complains"; }
expect_one_complaint() { # TEXT
    [[ $(wc -l <"$work/err") -eq 1 ]] || fail "it does not complain in one line"
    grep -qE -- "^picker: .*$1" "$work/err" || fail "the complaint does not say '$1'"
}
expect_pixel() { # FILE X Y SIZE AND COLOUR
    local seen
    seen=$("$png_pixel" "$work/pictures/$1" "$2" "$3" 2>&1)
    [[ $seen == "$4" ]] || fail "$1 at $2,$3 is '$seen' and not '$4'"
}

readonly told_of=10 # Thumbnails of five applications and of as many windows.
all_pictures_told() { [[ $(grep -c '^thumbnail of ' "$work/out") -eq $told_of ]]; }

case_lists() {
    start
    wait_until out_has '; now what changes$' || fail "there is no end of the lists"
    kill -TERM "$run_pid"
    expect_end 0
    expect_no_complaint
    expect_line '\+ monitor 1 "Simulated Display" at 0,0, 1280x800'
    expect_line '\+ monitor 2 "Simulated Side Display" at 1280,100, 800x600'
    local name
    for name in Terminal Editor Keys Notes 'Bouncing Ball'; do
        expect_line "\\+ app [0-9]+ $name"
    done
    expect_line '\+ app 5000101 Editor'
    expect_line '\+ window 4 "Terminal" of 5000105, 520x340 on monitor 2'
    expect_line '\+ window 5 "Chapter One" of 5000101, 620x460 on monitor 1'
    expect_line '\+ window 7 "Shopping" of 5000103, 250x200 on monitor 1'
    expect_line '\+ window 8 "Bouncing Ball" of 5000102, 320x220 on monitor 1'
    out_has 'window 6 ' && fail "a window that cannot be shared is listed"
    expect_line '2 monitors, 5 applications, 5 windows; now what changes'
    [[ $(grep -c '^[~-] ' "$work/out") -eq 0 ]] || fail "something changes where nothing does"
}

case_thumbnails() {
    start --out "$work/pictures"
    wait_until all_pictures_told || fail "pictures are missing"
    kill -INT "$run_pid"
    expect_end 0
    expect_no_complaint
    expect_line 'thumbnail of app 5000104: none yet' # nobody may see its window
    expect_line "thumbnail of window 5: 620x460, $work/pictures/window-5.png"
    expect_line "thumbnail of app 5000105: 520x340, $work/pictures/app-5000105.png"
    expect_pixel window-5.png 10 100 '620x460 #eef0f3ff'
    expect_pixel app-5000101.png 10 100 '620x460 #eef0f3ff'
    expect_pixel window-4.png 5 25 '520x340 #10161dff'
    expect_pixel app-5000105.png 250 2 '520x340 #d9dce1ff'
    [[ $(find "$work/pictures" -name '*.png' | wc -l) -eq $((told_of - 1)) ]] || fail "not every picture is there"
    [[ $(find "$work/pictures" -type f | wc -l) -eq $((told_of - 1)) ]] || fail "there is more than the pictures"
}

case_thumbnails_without_files() {
    mkdir "$work/empty"
    cd "$work/empty" || exit 1
    start
    wait_until all_pictures_told || fail "pictures are missing"
    kill -INT "$run_pid"
    expect_end 0
    expect_line 'thumbnail of window 5: 620x460'
    [[ -z $(ls -A "$work/empty") ]] || fail "it writes files"
}

# In whatever moment the signal comes.
case_end_amid_thumbnails() {
    local round
    for round in 1 2 3 4 5 6 7 8; do
        start --out "$work/pictures"
        wait_until out_has '^\+ monitor ' || fail "it says nothing"
        ((round > 1)) && { wait_until out_has '^thumbnail of ' || fail "no first picture"; }
        sleep "0.0$round"
        kill -INT "$run_pid"
        local begin=$SECONDS
        expect_end 0
        ((SECONDS - begin < 10)) || fail "the end takes $((SECONDS - begin)) s"
        expect_no_complaint
    done
}

case_end_by_time() {
    local begin=$SECONDS
    expect_exit 0 --seconds 5
    ((SECONDS - begin < 40)) || fail "five seconds take $((SECONDS - begin)) s"
    expect_no_complaint
    expect_line 'thumbnail of window 5: 620x460'
}

# However the reader of its output goes away: it ends by itself, and says why.
case_closed_pipe() {
    mkfifo "$work/pipe"
    "$program" </dev/null >"$work/pipe" 2>"$work/err" &
    run_pid=$!
    local line
    { read -r line; } <"$work/pipe"
    [[ $line == '+ monitor '* ]] || fail "its first line is '$line'"
    : >"$work/out"
    expect_end 1
    expect_one_complaint 'standard output'

    # Nothing to say is no reason to stay.
    "$program" </dev/null >"$work/pipe" 2>"$work/err" &
    run_pid=$!
    local told=0
    exec 7<"$work/pipe"
    while ((told < told_of)) && read -r -t $limit line <&7; do
        [[ $line != 'thumbnail of '* ]] || told=$((told + 1))
    done
    exec 7<&-
    ((told == told_of)) || fail "pictures are missing"
    expect_end 1
    expect_one_complaint 'nobody reads standard output'

    "$program" </dev/null >&- 2>"$work/err"
    [[ $? -eq 1 ]] || fail "it runs without an output"
    expect_one_complaint 'is closed'
    [[ -e /dev/full ]] || return 0
    "$program" </dev/null >/dev/full 2>"$work/err"
    [[ $? -eq 1 ]] || fail "it runs on when nothing can be written"
    expect_one_complaint 'cannot write to standard output'
}

case_unwritable_folder() {
    touch "$work/file"
    expect_exit 1 --out "$work/file/pictures"
    expect_one_complaint "$work/file/pictures"
    expect_exit 1 --out "$work/file"
    expect_one_complaint "$work/file"

    # Where no file may get longer than nothing, as on a full disk.
    (ulimit -f 0 && trap '' XFSZ && exec timeout $limit "$program" --out "$work/full" 2>&1 </dev/null) \
        | tee "$work/err" >/dev/null
    local code=${PIPESTATUS[0]}
    : >"$work/out"
    [[ $code -eq 1 ]] || fail "it ends with $code on a full disk"
    [[ $(grep -c '^picker: cannot write ' "$work/err") -eq 1 ]] || fail "a full disk is not told of"
    [[ -z $(ls -A "$work/full") ]] || fail "it leaves a part of a picture"
}

case_bad_arguments() {
    local arguments
    for arguments in --seconds '--seconds 0' '--seconds -1' '--seconds 1x' '--seconds 99999999999999' --out \
        --nonsense picker '--seconds 1 more'; do
        # shellcheck disable=SC2086  # Each is several words.
        expect_exit 2 $arguments
        expect_one_complaint 'try --help'
        [[ ! -s $work/out ]] || fail "'$arguments' starts it"
    done
    expect_exit 2 --out ''
    expect_exit 0 --help
    expect_line 'picker - .*'
    expect_no_complaint
}

# Where there is no screen there is nothing to pick.
case_no_screen() {
    export SCREENSHARE_PLATFORM=none
    expect_exit 0 --seconds 1
    expect_line '0 monitors, 0 applications, 0 windows; now what changes'
    expect_no_complaint
}

"case_$3"

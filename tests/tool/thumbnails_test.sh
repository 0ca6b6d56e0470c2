#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs `screenshare thumbnails` on the simulated desktop. Called with the program, a program that reads pixels of PNG
# files, and the name of a case.
# shellcheck source=tests/tool/simulated_case.sh
. "$(dirname "${BASH_SOURCE[0]}")/simulated_case.sh"
readonly program=$1 png_pixel=$2
readonly pictures=$work/new/pictures

thumbnails() { timeout $limit "$program" thumbnails "$@" </dev/null 2>"$work/err"; }

# expect_exit CODE ARGUMENT...
expect_exit() {
    thumbnails "${@:2}" >"$work/out"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}
expect_refusal() { # CODE TEXT ARGUMENT...
    expect_exit "$1" "${@:3}"
    [[ ! -s $work/out ]] || fail "'${*:3}' writes to standard output"
    expect_said "$2"
}
expect_said() { grep -qF -- "$1" "$work/err" || fail "it does not say '$1'"; }
expect_all_said() { [[ $(cat "$work/err") == "$1" ]] || fail "it does not say '$1', and nothing else"; }
expect_line() { grep -qxE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_lines() { [[ $(wc -l <"$work/out") -eq $1 ]] || fail "there are not $1 lines"; }
files() { find "$pictures" -mindepth 1 -printf '%f\n' | LC_ALL=C sort | xargs; }
expect_files() { [[ $(files) == "$*" ]] || fail "there are $(files)"; }
expect_pixel() { # FILE X Y "SIZE #COLOUR"
    local found
    found=$("$png_pixel" "$pictures/$1" "$2" "$3" 2>&1)
    [[ $found == "$4" ]] || fail "$1 at $2,$3 is '$found' and not '$4'"
}
need_python() { command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }; }

readonly apps='app-5000101.png app-5000102.png app-5000103.png app-5000104.png app-5000105.png'
readonly windows='window-2.png window-4.png window-5.png window-7.png window-8.png'

case_all() {
    expect_exit 0 "$pictures"
    expect_all_said "10 thumbnails into $pictures"
    # shellcheck disable=SC2086  # Each is several words.
    expect_files $apps $windows
    expect_lines 11
    expect_line 'KIND +ID +SIZE +FILE +NAME'
    expect_line "app +5000101 +620x460 +$pictures/app-5000101\.png +Editor"
    expect_line "window +7 +250x200 +$pictures/window-7\.png +Shopping"
    expect_line "window +2 +1280x24 +$pictures/window-2\.png +Menu Bar"
}

case_pixels() {
    expect_exit 0 "$pictures"
    local file
    for file in app-5000101 window-5; do
        expect_pixel $file.png 10 300 '620x460 #eef0f3ff' # the edge
        expect_pixel $file.png 14 11 '620x460 #4ea5d9ff'  # a button
        expect_pixel $file.png 600 450 '620x460 #fcfcfdff' # paper
    done
    # It lies over no other window there, however much it is covered on the desktop.
    expect_pixel window-4.png 519 339 '520x340 #10161dff'
    expect_pixel window-2.png 1279 23 '1280x24 #f2f3f5ff'
    # What must not be shared has a size, and nothing to see.
    expect_pixel app-5000104.png 100 100 '260x160 #00000000'
    [[ ! -e $pictures/window-6.png ]] || fail "it is offered"
}

case_one_kind() {
    expect_exit 0 --apps "$pictures"
    # shellcheck disable=SC2086
    expect_files $apps
    expect_lines 6
    expect_all_said "5 thumbnails into $pictures"
    rm -r "$pictures"
    expect_exit 0 --windows "$pictures"
    # shellcheck disable=SC2086
    expect_files $windows
    expect_lines 6
    expect_all_said "5 thumbnails into $pictures"
}

case_json() {
    need_python
    expect_exit 0 --json "$pictures"
    expect_all_said "10 thumbnails into $pictures"
    python3 - "$work/out" "$pictures" <<'END' || fail "the lines are not what they should be"
import json, os, sys
lines = [json.loads(line) for line in open(sys.argv[1])]
assert len(lines) == 10, lines
assert {"kind": "app", "id": 5000101, "name": "Editor", "file": sys.argv[2] + "/app-5000101.png", "width": 620,
        "height": 460} in lines, lines
assert all(os.path.isfile(each["file"]) for each in lines), lines
END
}

case_pictures_are_replaced() {
    mkdir -p "$pictures"
    echo old >"$pictures/window-5.png"
    echo mine >"$pictures/other"
    expect_exit 0 --windows "$pictures"
    expect_pixel window-5.png 10 300 '620x460 #eef0f3ff'
    [[ $(cat "$pictures/other") == mine ]] || fail "what was there is gone"
}

case_folders_that_cannot_be_written() {
    echo kept >"$work/file"
    expect_refusal 5 "cannot make folder $work/file: Not a directory" "$work/file"
    expect_refusal 5 "cannot make folder $work/file/deep: Not a directory" "$work/file/deep"
    [[ $(cat "$work/file") == kept ]] || fail "the file is another one"
    # One that only looks as if; where there is none, the system refuses earlier.
    expect_exit 5 /proc/self
    [[ $(grep -c '^screenshare: cannot write ' "$work/err") -eq 1 ]] || fail "it is not said once"
}

case_a_file_that_cannot_be_written_ends_it() {
    mkdir -p "$pictures/window-5.png"
    expect_exit 5 --windows "$pictures"
    expect_said "screenshare: cannot write $pictures/window-5.png: it is no plain file"
    # Front first: what lies behind it is not asked for any more.
    expect_files window-2.png window-5.png window-7.png window-8.png
    expect_said "3 thumbnails into $pictures"
}

# A limit on the size of files stands for a disk that has so little room.
case_full_disk() {
    (
        trap '' XFSZ
        ulimit -f 1
        expect_exit 5 --windows "$pictures"
    ) || exit 1
    grep -qE "^screenshare: cannot write $pictures/window-[0-9]+\.png: File too large$" "$work/err" ||
        fail "it does not say which file"
    local file
    file=$(sed -n 's/^screenshare: cannot write \(.*\): File too large$/\1/p' "$work/err")
    [[ ! -e $file && -z $(find "$pictures" -name '.*') ]] || fail "half a file is left"
}

case_a_reader_that_has_gone() {
    local code
    mkfifo "$work/pipe"
    exec 9<>"$work/pipe"
    exec 8>"$work/pipe" 9<&-
    : >"$work/out"
    thumbnails "$pictures" >&8
    code=$?
    [[ $code -eq 4 ]] || fail "it ends with $code and not with 4"
    expect_said 'the reader of standard output has closed the pipe'
}

# The pipe has room for the headings, and the first line waits for a reader then.
case_signals_in_the_middle() {
    need_python
    : >"$work/out"
    local signal
    for signal in SIGINT SIGTERM; do
        rm -rf "$pictures"
        timeout $limit python3 - "$program" "$pictures" $signal 2>"$work/err" <<'END' || fail "$signal is no good end"
import fcntl, glob, os, signal, subprocess, sys, time
program, folder, name = sys.argv[1:]
F_SETPIPE_SZ = 1031
reader, writer = os.pipe()
fcntl.fcntl(writer, F_SETPIPE_SZ, 4096)
child = subprocess.Popen([program, "thumbnails", folder], stdout=writer)
while not glob.glob(folder + "/app-*.png"):
    time.sleep(0.05)
child.send_signal(getattr(signal, name))
sys.exit(child.wait())
END
        expect_all_said "1 thumbnail into $pictures"
        [[ $(files) == app-*.png && $(files) != *' '* ]] || fail "there is more than what was being written"
    done
}

case_nothing_to_ask_for() {
    SCREENSHARE_PLATFORM=none expect_refusal 1 'there is no desktop to look at' "$pictures"
    [[ ! -e $pictures ]] || fail "a folder is made for nothing"
}

case_command_lines_that_make_no_sense() {
    expect_refusal 2 'DIR is required'
    expect_refusal 2 'DIR is required' --apps
    expect_refusal 2 'excludes' --apps --windows "$pictures"
    expect_refusal 2 'there is no option --jason' --jason "$pictures"
    expect_refusal 2 'another' "$pictures" another
    [[ ! -e $pictures ]] || fail "a refused line leaves something"
}

case_help() {
    expect_exit 0 --help
    local word
    for word in --apps --windows DIR Examples: 'Exit code:' 'no picture'; do
        grep -qF -- "$word" "$work/out" || fail "help does not name $word"
    done
}

"case_$3"

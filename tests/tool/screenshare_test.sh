#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs the program `screenshare` on the simulated desktop. Called with the program and the name of a case.
# shellcheck source=tests/tool/simulated_case.sh
. "$(dirname "${BASH_SOURCE[0]}")/simulated_case.sh"
readonly program=$1

# expect_exit CODE ARGUMENT...
expect_exit() {
    timeout $limit "$program" "${@:2}" </dev/null >"$work/out" 2>"$work/err"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}

# What is said is said once, in one place.
expect_answer() { # ARGUMENT...
    expect_exit 0 "$@"
    [[ ! -s $work/err ]] || fail "'$*' complains"
}
expect_refusal() { # CODE TEXT ARGUMENT...
    expect_exit "$1" "${@:3}"
    [[ ! -s $work/out ]] || fail "'${*:3}' writes to standard output"
    grep -qF -- "$2" "$work/err" || fail "'${*:3}' does not say '$2'"
}
expect_line() { grep -qxE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_lines() { [[ $(wc -l <"$work/out") -eq $1 ]] || fail "there are not $1 lines"; }

case_list_monitors() {
    expect_answer list monitors
    expect_lines 3
    expect_line 'ID +POSITION +SIZE +SCALE +NAME'
    expect_line '1 +0,0 +1280x800 +1 +Simulated Display'
    expect_line '2 +1280,100 +800x600 +1 +Simulated Side Display'
}

case_list_windows() {
    expect_answer list windows
    expect_lines 9
    expect_line '8 +5000102 +Bouncing Ball +820,330 +320x220 +0 +1 +read +Bouncing Ball'
    expect_line '7 +5000103 +Notes +600,420 +250x200 +0 +0.9 +read +Shopping'
    expect_line '6 +5000104 +Keys +860,120 +260x160 +0 +1 +none +Keys'
    [[ $(awk 'NR > 1 { printf "%s ", $1 }' "$work/out") == '2 3 8 7 6 5 4 1 ' ]] || fail "not front first"
}

case_json() {
    command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }
    expect_answer list monitors --json
    python3 - "$work/out" <<'END' || fail "the monitors are not what they should be"
import json, sys
monitors = json.load(open(sys.argv[1]))
assert [m["id"] for m in monitors] == [1, 2], monitors
assert monitors[0] == {"id": 1, "name": "Simulated Display", "x": 0, "y": 0, "width": 1280, "height": 800,
                       "scale": 1, "main": True}, monitors[0]
assert monitors[1]["main"] is False
END
    expect_answer list windows --json
    python3 - "$work/out" <<'END' || fail "the windows are not what they should be"
import json, sys
windows = json.load(open(sys.argv[1]))
assert [w["id"] for w in windows] == [2, 3, 8, 7, 6, 5, 4, 1], windows
assert windows[3] == {"id": 7, "pid": 5000103, "application": "Notes", "title": "Shopping", "x": 600, "y": 420,
                      "width": 250, "height": 200, "level": 0, "alpha": windows[3]["alpha"],
                      "sharing": "read"}, windows[3]
assert abs(windows[3]["alpha"] - 0.9) < 1e-6
END
}

case_explain() {
    local share
    for share in '' '--monitor 2' '--app 5000101 5000105' '--app 5000101,5000105 --exclude-window 5' '--window 5 7' \
        '--exclude-app 5000103' '--window 2 --exclude-menu-bar'; do
        rm -f "$work/share.svg"
        # shellcheck disable=SC2086  # Each is several words.
        expect_answer explain $share "$work/share.svg"
        expect_lines 0
        grep -q '^</svg>$' "$work/share.svg" || fail "'$share' leaves half a picture"
        grep -q 'Bouncing Ball (8)' "$work/share.svg" || fail "'$share' tells nothing of window 8"
    done
    expect_answer explain --app 5000101 5000105 "$work/share.svg"
    grep -q '>Share of applications 5000101, 5000105<' "$work/share.svg" || fail "the title is not the share's"
    expect_answer explain "$work/share.svg"
    grep -q '>Share of monitor 1<' "$work/share.svg" || fail "an old picture is not replaced"
}

case_explain_as_json() {
    command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }
    expect_answer explain --json --app 5000101 --exclude-window 8
    cp "$work/out" "$work/printed"
    python3 - "$work/printed" <<'END' || fail "the verdicts are not what they should be"
import json, sys
told = json.load(open(sys.argv[1]))
assert told["share"] == "Share of application 5000101" and told["kept_out"] == "window 8", told
assert told["monitors"] == [1, 2], told
windows = {each["id"]: each for each in told["windows"]}
assert windows[5]["verdict"] == "kept" and windows[5]["reason"] == "shared application", windows[5]
assert windows[8]["verdict"] == "kept out" and windows[8]["reason"] == "unshared window", windows[8]
assert windows[5]["width"] == 620 and windows[5]["application"] == "Editor", windows[5]
area = lambda rects: sum(each["width"] * each["height"] for each in rects)
assert 0 < area(told["visible"]) < 620 * 460 and area(told["background"]) > 0, told
assert area(told["visible"]) + area(told["overlap"]) == 620 * 460, told
END
    expect_answer explain --json "$work/share.json" --app 5000101 --exclude-window 8
    expect_lines 0
    cmp -s "$work/printed" "$work/share.json" || fail "a file has something else"
    expect_answer explain -
    grep -q '^</svg>$' "$work/out" || fail "the picture does not come to standard output"
}

case_picture_is_well_formed() {
    command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }
    expect_answer explain --window 5 "$work/share.svg"
    python3 -c 'import sys, xml.dom.minidom; xml.dom.minidom.parse(sys.argv[1])' "$work/share.svg" ||
        fail "the picture is no XML"
}

case_help() {
    expect_answer --help
    grep -qE '^ +list ' "$work/out" || fail "help does not name 'list'"
    grep -qE '^ +explain ' "$work/out" || fail "help does not name 'explain'"
    expect_answer explain --help
    grep -qE '^ +--exclude-window ID' "$work/out" || fail "help does not name the option"
    expect_answer list windows --help
}

case_ids_that_are_not_there() {
    expect_refusal 1 'there is no monitor 9; there are: 1, 2' explain --monitor 9 "$work/share.svg"
    expect_refusal 1 'there is no window 99; there are: 2, 3, 8,' explain --window 5 99 "$work/share.svg"
    expect_refusal 1 'there is no application with a window 77;' explain --app 77 "$work/share.svg"
    expect_refusal 1 'there is no window 98;' explain --exclude-window 98 "$work/share.svg"
    expect_refusal 1 'there is no application with a window 78;' explain --exclude-app 78 "$work/share.svg"
    [[ ! -e $work/share.svg ]] || fail "a refused request leaves a picture"
}

case_files_that_cannot_be_written() {
    expect_refusal 5 "cannot write $work/none/share.svg: No such file or directory" explain "$work/none/share.svg"
    expect_refusal 5 "cannot write $work: Is a directory" explain "$work"
    [[ -w /dev/full ]] || return 0
    expect_refusal 5 'cannot write /dev/full: No space left on device' explain /dev/full
    timeout $limit "$program" list windows >/dev/full 2>"$work/err"
    [[ $? -eq 5 ]] || fail "a list that nobody gets is a success"
    grep -qF 'cannot write standard output: No space left on device' "$work/err" || fail "it does not say why"
}

case_command_lines_that_make_no_sense() {
    expect_refusal 2 'a command is missing; there are: list,'
    expect_refusal 2 'list: a command is missing; there are: apps, windows, monitors;' list
    expect_refusal 2 'FILE.svg is required' explain
    expect_refusal 2 'FILE.svg is required' explain --app 5000101
    expect_refusal 2 '' explain --monitor one "$work/share.svg"
    expect_refusal 2 '' explain --window -5 "$work/share.svg"
    expect_refusal 2 '' explain --monitor 4294967297 "$work/share.svg"
    expect_refusal 2 'excludes' explain --monitor 1 --app 5000101 "$work/share.svg"
    expect_refusal 2 'excludes' explain --app 5000101 --window 5 -- "$work/share.svg"
    expect_refusal 2 '' list monitors --platform windows
    expect_refusal 2 '' nonsense
}

case_platform() {
    expect_refusal 1 'there is no desktop to look at' --platform none list monitors
    expect_refusal 1 'there is no desktop to look at' list windows --platform none --json
    SCREENSHARE_PLATFORM=none expect_answer --platform simulated list monitors
    expect_lines 3
    (unset SCREENSHARE_PLATFORM && expect_refusal 1 'there is no desktop' explain "$work/share.svg") || exit 1
}

"case_$2"

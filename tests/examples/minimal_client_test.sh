#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs the minimal client as its script does. Called with the program, the script and the name of a case.
set -uo pipefail
readonly program=$1 script=$2

fail() {
    echo "FAILED: $*"
    exit 1
}

expect_line() { grep -qE "$1" <<<"$said" || fail "no line matches '$1' in:"$'\n'"$said"; }

case_dummies() {
    said=$(timeout 60 "$script" "$program") || fail "it ends with $?"
    expect_line '^status 1$'
    expect_line '^frame 640x480, line 2560 bytes, format 1, at [0-9]+ ms, shared part 0,0 to 640,480$'
    expect_line '^status 2$'
    expect_line '^result 0$'
    [[ $(grep -c '^frame ' <<<"$said") -ge 5 ]] || fail "fewer than five frames"
}

# Without a debug file there is nothing to capture on a machine without a screen: an answer, and no crash.
case_nothing_to_share() {
    said=$(SCREENSHARE_PLATFORM=none SCREENSHARE_DEBUG_DIR=/nonexistent timeout 60 "$program")
    [[ $? -eq 1 ]] || fail "it ends with $?"
    expect_line '^result -[0-9]+$'
}

"case_$3"

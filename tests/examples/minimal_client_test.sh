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
    said=$(timeout 60 "$script" "$program") || fail "it ends with $?:"$'\n'"$said"
    expect_line '^status 1$'
    expect_line '^frame 640x480, line 2560 bytes, format 1, at [0-9]+ ms, shared part 0,0 to 640,480$'
    expect_line '^status 2$'
    expect_line '^result 0$'
    [[ $(grep -c '^frame ' <<<"$said") -ge 5 ]] || fail "fewer than five frames"
}

# Where there is no screen, frames come without pixels.
case_no_screen() {
    said=$(SCREENSHARE_PLATFORM=none SCREENSHARE_DEBUG_DIR=/nonexistent timeout 60 "$program") || fail "it ends with $?:"$'\n'"$said"
    expect_line '^frame 0x0, line 0 bytes,'
    expect_line '^result 0$'
}

case_simulated_screen() {
    said=$(SCREENSHARE_PLATFORM=simulated SCREENSHARE_DEBUG_DIR=/nonexistent timeout 60 "$program") ||
        fail "it ends with $?:"$'\n'"$said"
    expect_line '^frame [1-9][0-9]*x[1-9][0-9]*, line '
    expect_line '^result 0$'
}

"case_$3"

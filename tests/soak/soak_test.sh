#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# The short form of the soak. Called with the program and the name of a case. A second shows no leak that takes hours;
# it shows that the long form runs, and that it would notice: something is lost on purpose, and has to be found.
set -uo pipefail
readonly program=$1 limit=120 # Seconds that a run may take before it counts as hanging.
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

fail() {
    echo "FAILED: $*"
    sed 's/^/    /' "$work/out" "$work/err"
    exit 1
}

# Small monitors and a sample each 20 ms; half of the samples are judged.
soak() { # EXIT-CODE OPTION...
    local code=0
    timeout $limit "$program" --seconds=1 --interval=20 --warm-up=500 --size=200x120 --json="$work/json" "${@:2}" \
        >"$work/out" 2>"$work/err" || code=$?
    [[ $code -ne 77 ]] || { cat "$work/out"; exit 77; }
    [[ $code -eq $1 ]] || fail "it ends with $code and not with $1"
}
expect_line() { grep -qE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_found() { # COUNTER LOSS
    soak 1 "--lose=$2"
    expect_line "^GROWS: $1 by "
    grep -qE '"good": false' "$work/json" || fail "its JSON says otherwise"
}

case_finds_lost_memory() { expect_found 'heap KiB' memory; }
case_finds_lost_descriptors() {
    expect_found descriptors descriptor
    expect_line '^LEFT OVER: descriptors: '
}
case_finds_lost_threads() {
    expect_found threads thread
    expect_line '^LEFT OVER: threads: '
}
case_finds_lost_resources_of_the_server() {
    expect_found 'X PIXMAP' resource
    expect_line '^LEFT OVER: X PIXMAP: '
}

# Each share gets frames, and what the client asked for is told.
case_finds_nothing_where_nothing_is_lost() {
    soak 0
    expect_line '^level: '
    local share
    for share in 'desktop, default' 'desktop, session' 'desktop, queued' 'desktop, mix' 'application, default' \
        'application, mix' 'window, queued' 'window, session'; do
        expect_line "^\| $share +\| [0-9]+ +\| [1-9]"
    done
    expect_line '^\| EnumWindowThumbnail +\| [1-9]'
    python3 -c 'import json, sys; assert json.load(open(sys.argv[1]))["good"] is True' "$work/json" ||
        fail "its JSON says otherwise"
}

case_refuses_what_cannot_be_judged() {
    soak 2 --seconds=0
    grep -qF 'too short' "$work/err" || fail "it doesn't say why"
}

"case_$2"

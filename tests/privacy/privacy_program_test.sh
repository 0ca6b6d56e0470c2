#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# The short form of the histories by thousands. Called with the program and the name of a case. That shares show nothing
# that they must not is for the cases of privacy_tests; this shows that the long form runs, and that it would notice.
set -uo pipefail
readonly program=$1 limit=120 # Seconds that a run may take before it counts as hanging.
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

fail() {
    echo "FAILED: $*"
    sed 's/^/    /' "$work/out" "$work/err"
    exit 1
}
run() { # EXIT-CODE OPTION...
    local code=0
    timeout $limit "$program" "${@:2}" >"$work/out" 2>"$work/err" || code=$?
    [[ $code -eq $1 ]] || fail "it ends with $code and not with $1"
}
expect_line() { grep -qE -- "$1" "$work/out" || fail "no line is '$1'"; }

case_counts_every_kind_and_finds_nothing() {
    run 0 --histories 12 --steps 15 --jobs 2
    local mode share
    for mode in '1, default' '7, session' '8, queued' '10, mix'; do
        for share in desktop applications windows; do
            expect_line "^\| $mode \| $share \| 1 \| [1-9]"
        done
    done
    expect_line '^\| all \|  \| 12 \|'
}

# And the command that it prints shows the same leak.
case_tells_a_leak_and_how_to_see_it_again() {
    run 1 --kind DesktopByDefault --histories 4 --jobs 2 --fault ExclusionForgotten
    expect_line '^LEAK: DesktopByDefault, seed [1-4], step [0-9]+: '
    local leak replay
    leak=$(grep -m 1 -oE '^LEAK: [^:]*' "$work/out")
    replay=$(grep -m 1 -oE 'privacy_program --.*' "$work/out")
    read -ra replay <<<"${replay#privacy_program }"
    run 1 "${replay[@]}"
    expect_line "^$leak: "
    [[ $(grep -c '^LEAK' "$work/out") -eq 1 ]] || fail "it isn't one history"
    # How long it was to be seen, in the last column.
    expect_line '^\| all \| .* \| [1-9][0-9]* \|$'
}

case_tells_a_share_that_shows_nothing() {
    run 1 --kind DesktopByDefault --histories 4 --fault NothingShown
    expect_line '^DEAD: DesktopByDefault, seed '
}

case_refuses_what_it_does_not_know() {
    local arguments
    for arguments in '--kind Nothing' '--fault Nothing' '--histories 0' '--histories x' '--seed' '--colour red'; do
        read -ra arguments <<<"$arguments"
        run 2 "${arguments[@]}"
    done
    run 0 --help
    expect_line '^privacy_program \[--histories N\]'
}

"case_$2"

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# The comparison's ratios are judged by what is stored, and its results can be drawn and published. Called with a
# program that it does not need and the name of a case. No server runs: the results are made up.
set -uo pipefail
root=$(dirname "$(readlink -f "${BASH_SOURCE[0]}")")/../..
folder=$(mktemp -d) || exit 1
readonly root folder
trap 'rm -rf "$folder"' EXIT

fail() {
    echo "FAILED: $*"
    exit 1
}

# Results of one row, in which ours costs so much and the other one 1.
results() { # FILE LOWEST MEDIAN HIGHEST [REPEATS]
    cat >"$1" <<END
{"benchmarks": [
{"name": "compare/screen/static/screenshare", "client_ms": $3, "server_ms": 0, "total_ms": $3, "total_ms_lowest": $2,
 "total_ms_highest": $4, "peak_megabytes": 30, "repeats": ${5:-5}, "ratio": $3, "ratio_lowest": $2, "ratio_highest": $4, "goal": 0.5},
{"name": "compare/list/50/screenshare", "wall_us": 2, "repeats": 5}, {"name": "compare/list/50/webrtc", "wall_us": 30, "repeats": 5},
{"name": "compare/screen/static/webrtc", "client_ms": 1, "server_ms": 0, "total_ms": 1, "total_ms_lowest": 0.9,
 "total_ms_highest": 1.1, "peak_megabytes": 31, "repeats": 5}]}
END
}

check() { # LOWEST MEDIAN HIGHEST [REPEATS]
    results "$folder/now.json" "$@"
    "$root/bench/compare/check_ratios" --limits "$folder/stored.json" "$folder/now.json"
}

store() {
    results "$folder/before.json" 0.45 0.5 0.6
    "$root/bench/compare/check_ratios" --store --limits "$folder/stored.json" "$folder/before.json" || fail "not stored"
}

case_ratios_within_the_noise_pass() {
    store
    check 0.45 0.5 0.6 || fail "the same ratios"
    check 0.3 0.3 0.3 || fail "lower ratios"
    check 0.5 0.58 0.9 || fail "a high median of repeats that lie as low as before"
    check 0.59 0.65 0.7 || fail "the lowest one lies where the highest one was"
}

case_worse_ratios_fail() {
    store
    check 0.61 0.65 0.7 && fail "worse ratios pass"
    echo '{"benchmarks": [{"name": "compare/screen/video/screenshare", "repeats": 5, "ratio": 1,
        "ratio_lowest": 1, "ratio_highest": 1}]}' >"$folder/now.json"
    "$root/bench/compare/check_ratios" --limits "$folder/stored.json" "$folder/now.json" && fail "a missing row passes"
    return 0
}

case_results_that_are_too_little_tell_nothing() {
    store
    echo '{"benchmarks": [{"name": "compare/screen/static/screenshare", "total_ms": 1}]}' >"$folder/now.json"
    "$root/bench/compare/check_ratios" --limits "$folder/stored.json" "$folder/now.json"
    [[ $? -eq 77 ]] || fail "something was told"
    check 0.61 0.65 0.7 4
    [[ $? -eq 77 ]] || fail "something was told of few repeats"
}

case_results_are_drawn_and_published() {
    local page=$folder/page.md
    results "$folder/now.json" 0.45 0.512 0.6 4
    "$root/bench/compare/plot" "$folder/now.json" "$folder" || fail "not drawn"
    grep -q '>0.51</text>' "$folder/compare_scenes.svg" || fail "the plot doesn't show the cost"
    printf 'before\n<!-- compare scenes -->\nold\n<!-- end -->\nafter\n' >"$page"
    "$root/bench/compare/publish" "$folder/now.json" "$page" || fail "not published"
    grep -q '| 0.51 (0.45 .. 0.60) |' "$page" || fail "the table lacks the cost"
    grep -q 'Repeats of each: 4, too few' "$page" || fail "the table doesn't tell how few repeats there were"
    grep -q '^old$' "$page" && fail "the old table is still there"
    printf '<!-- compare more -->\n<!-- end -->\n' >"$folder/more.md"
    "$root/bench/compare/publish" "$folder/now.json" "$folder/more.md" || fail "not published"
    grep -q '| 0.0020 | 0.0300 |' "$folder/more.md" || fail "the table lacks the list"
    [[ $(head -n 1 "$page") == before && $(tail -n 1 "$page") == after ]] || fail "the rest of the page has changed"
}

"case_${*: -1}"

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# No pass, walk or composition takes more instructions than are stored. Called with counted_passes and the name of a
# case.
set -uo pipefail
root=$(dirname "$(readlink -f "${BASH_SOURCE[0]}")")/../..
readonly root program=$1

check() { # STEP...
    "$root/bench/check_counts" "$program" "$@"
    exit
}

case_passes() { check pass_static pass_standing pass_standing_typing pass_typing pass_full; }
case_composition() { check composition_full; }
case_walks() { check walk_10 walk_200 walk_200_moving; }

# A limit that is too low has to be noticed, or the others say nothing.
case_notices_what_costs_more() {
    local limits verdict=0
    limits=$(mktemp) || exit 1
    trap 'rm -f "$limits"' EXIT
    echo '{"tolerance": 0.03, "instructions": {"walk_10": 10}}' >"$limits"
    "$root/bench/check_counts" --limits "$limits" "$program" walk_10 || verdict=$?
    case $verdict in
        1) exit 0 ;;
        77) exit 77 ;;
        *) echo "a walk of ten instructions was believed"; exit 1 ;;
    esac
}

"case_${*: -1}"

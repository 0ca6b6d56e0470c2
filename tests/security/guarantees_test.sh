#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Looks whether the tests and fuzzers that docs/security.md names exist. Called with a program of the build, the root of
# the project, and the name of a case.
set -uo pipefail
readonly root=$2 page=$2/docs/security.md

fail() {
    echo "FAILED: $*"
    exit 1
}

# Suite.Case, as the page has them. A suite with parameters goes by its own name.
# shellcheck disable=SC2016 # code in a page stands between backticks
named_cases() { grep -oE '`[A-Z][A-Za-z0-9]+\.[A-Z][A-Za-z0-9]+`' "$1" | tr -d '`' | sort -u; }
# shellcheck disable=SC2016
named_fuzzers() { grep -oE 'fuzzers? `[^|]*' "$1" | grep -oE '`[a-z0-9_]+`' | tr -d '`' | sort -u; }
is_a_case() { grep -rqE "^(TEST|TEST_F|TEST_P|TYPED_TEST)\(${1%.*}, ${1#*.}\)" --include='*.cpp' "$root/tests"; }

case_every_named_test_exists() {
    local name count=0
    while read -r name; do
        is_a_case "$name" || fail "$page names $name, and no test is called so"
        count=$((count + 1))
    done < <(named_cases "$page")
    [[ $count -ge 20 ]] || fail "only $count tests were found in $page"
    ! is_a_case Settings.ComeFromNowhere || fail "a test that doesn't exist was found"
}

case_every_fuzzer_is_named_and_exists() {
    diff <(named_fuzzers "$page") <(cd "$root/tests/fuzz" && printf '%s\n' *_fuzz.cpp | sed 's/_fuzz.cpp//' | sort) ||
        fail "the fuzzers that $page names (<) are not those that there are (>)"
}

"case_$3"

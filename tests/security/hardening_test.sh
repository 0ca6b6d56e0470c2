#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Looks whether what is shipped was built to make flaws hard to use. Called with the shared library, the program, the
# archive of each layer, and the name of a case.
set -uo pipefail
readonly shipped=("${@:1:2}") layers=("${@:3:$#-3}")
work=$(mktemp -d) || exit 1
trap 'rm -rf "$work"' EXIT

fail() {
    echo "FAILED: $*"
    exit 1
}

# ---- Each tells of one file

segments() { readelf -lW "$1"; }
dynamic() { readelf -dW "$1"; }
# Without pipes that grep closes early: what feeds them would fail.
asks_for() { grep -qE "$2" <<<"$(nm --undefined-only "$1" 2>/dev/null; nm -D --undefined-only "$1" 2>/dev/null)"; }

has_plain_stack() { awk '$1 == "GNU_STACK" { seen = 1; open = /RWE/ } END { exit !seen || open }' <<<"$(segments "$1")"; }
has_no_writable_code() {
    awk '$1 == "LOAD" { seen = 1; open = open || / RWE / } END { exit !seen || open }' <<<"$(segments "$1")" &&
        ! grep -q TEXTREL <<<"$(dynamic "$1")"
}
has_sealed_relocations() {
    grep -q '^ *GNU_RELRO ' <<<"$(segments "$1")" && grep -qE 'BIND_NOW|FLAGS_1.*NOW' <<<"$(dynamic "$1")"
}
lies_anywhere() { grep -qE '^ +Type: +DYN' <<<"$(readelf -hW "$1")"; }
guards_its_stack() { asks_for "$1" ' __stack_chk_fail'; }
# Each object of an archive. What is linked of them has the mark only where the compiler's own start files have it.
marks_branch_targets() {
    local objects marked
    objects=$(ar t "$1" | wc -l)
    marked=$(readelf -nW "$1" 2>/dev/null | grep -c 'x86 feature:.*IBT')
    [[ $objects -gt 0 && $objects -eq $marked ]]
}
checks_lengths() { asks_for "$1" ' __[a-z]+_chk(@|$)'; }

# ---- Cases

each_shipped() { # PREDICATE
    local file
    for file in "${shipped[@]}"; do
        "$1" "$file" || fail "$file: not $1"
    done
}

case_stacks_hold_no_code() { each_shipped has_plain_stack; }
case_no_code_can_be_written() { each_shipped has_no_writable_code; }
case_relocations_are_sealed() { each_shipped has_sealed_relocations; }
case_code_lies_anywhere() { each_shipped lies_anywhere; }
case_lengths_are_checked() { each_shipped checks_lengths; }
case_stacks_are_guarded() {
    local file
    [[ ${#layers[@]} -gt 0 ]] || fail "no layer was named"
    for file in "${shipped[@]}" "${layers[@]}"; do
        guards_its_stack "$file" || fail "$file: not guards_its_stack"
    done
}

case_branch_targets_are_marked() {
    [[ $(uname -m) == x86_64 ]] || exit 77
    local file
    for file in "${layers[@]}"; do
        marks_branch_targets "$file" || fail "$file: not marks_branch_targets"
    done
}

# A library that was built without any of it has none of these properties.
case_what_lacks_it_is_found() {
    cat >"$work/bare.cpp" <<'END'
#include <cstring>
void Fill(char*);
int main(int count, char** words) {
    char text[64];
    Fill(text);
    std::memcpy(text, words[0], static_cast<unsigned>(count));
    return text[3];
}
void Fill(char* text) { *text = 0; }
END
    g++ -O2 -fno-stack-protector -U_FORTIFY_SOURCE -fno-pie -no-pie -Wl,-z,norelro,-z,lazy,-z,execstack \
        "$work/bare.cpp" -o "$work/bare" 2>"$work/log" || fail "g++: $(cat "$work/log")"
    local property
    for property in has_plain_stack has_sealed_relocations lies_anywhere guards_its_stack checks_lengths; do
        ! "$property" "$work/bare" || fail "$property, says the test of a program that was built without it"
    done
    echo 'int number = 1; extern "C" int _start() { return ++number; }' >"$work/open.cpp"
    g++ -nostdlib -static -fno-pie -no-pie -Wl,-N "$work/open.cpp" -o "$work/open" 2>"$work/log" ||
        fail "g++: $(cat "$work/log")"
    ! has_no_writable_code "$work/open" || fail "the test sees no writable code where there is some"
}

case_what_is_not_there_has_no_property() {
    local property
    for property in has_plain_stack has_no_writable_code has_sealed_relocations lies_anywhere guards_its_stack \
        checks_lengths; do
        ! "$property" "$work/nothing" 2>"$work/log" || fail "$property, says the test of a file that isn't there"
    done
}

"case_${!#}"

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# The manual page and bash's completion, as the program prints them. Called with the program and the name of a case.
# shellcheck source=tests/tool/simulated_case.sh
. "$(dirname "${BASH_SOURCE[0]}")/simulated_case.sh"
readonly program=$1
need() {
    command -v "$1" >/dev/null || { echo "skipped: $1 is not installed"; exit 77; }
}
print() { # FORM
    timeout $limit "$program" manual "$1" >"$work/$1" || fail "there is no $1"
    [[ -s $work/$1 ]] || fail "$1 is empty"
}

case_page_renders_without_warnings() {
    need groff
    print man
    groff -man -ww -Tutf8 "$work/man" >"$work/page" 2>"$work/warnings" || fail "groff refuses it"
    [[ ! -s $work/warnings ]] || fail "groff warns: $(cat "$work/warnings")"
    [[ $(wc -l <"$work/page") -gt 150 ]] || fail "the page is short"
}

# What can be typed can be read of: each option of each command, and no roff in the way of what is copied.
case_page_tells_every_option() {
    need groff
    print man
    groff -man -Tascii -P-cbou "$work/man" >"$work/page" 2>/dev/null
    local command option
    for command in '' 'list apps' thumbnails explain capture doctor demo; do
        # shellcheck disable=SC2086
        timeout $limit "$program" $command --help >"$work/help" || fail "there is no help of '$command'"
        while read -r option; do
            grep -qE -- "^ +(-h, )?$option( |\$)" "$work/page" || fail "the page has no $option of '$command'"
        done < <(grep -oE '^  (-h, )?--[a-z0-9-]+' "$work/help" | grep -oE -- '--[a-z0-9-]+')
    done
    local heading
    for heading in NAME SYNOPSIS DESCRIPTION OPTIONS COMMANDS 'EXIT STATUS' ENVIRONMENT FILES EXAMPLES; do
        grep -qx "$heading" "$work/page" || fail "the page has no $heading"
    done
    grep -qF "screenshare list windows --watch | grep --line-buffered '^+'" "$work/page" ||
        fail "an example is not as it is typed"
    ! grep -q 'manual' "$work/page" || fail "the page tells of what it is made with"
}

# complete_line WORD...: what bash would offer for the last one, sorted, in one line.
complete_line() {
    COMP_WORDS=("$@")
    COMP_CWORD=$(($# - 1))
    COMPREPLY=()
    _screenshare "$program" 2>"$work/complaint"
    # Outside of a real completion there is none to have options.
    ! grep -v compopt "$work/complaint" || fail "completion of '$*' complains"
    found=$(printf '%s\n' "${COMPREPLY[@]}" | LC_ALL=C sort | xargs)
}
expect_completion() { # "WHAT IS OFFERED" WORD...
    complete_line "${@:2}"
    [[ $found == "$1" ]] || fail "'${*:2}' offers '$found' and not '$1'"
}

load_completion() {
    print bash
    # shellcheck disable=SC1091  # It is made by the program.
    source "$work/bash" || fail "bash does not take it"
    [[ $(complete -p screenshare) == 'complete -F _screenshare screenshare' ]] || fail "nothing completes screenshare"
}

case_completion_knows_commands_options_and_values() {
    load_completion
    expect_completion 'capture' screenshare cap
    expect_completion 'demo doctor' screenshare d
    expect_completion 'apps monitors windows' screenshare list ''
    expect_completion '--json' screenshare list windows --j
    expect_completion '--seconds' screenshare --platform simulated capture --se
    expect_completion 'default mix queued session' screenshare capture --mode ''
    expect_completion 'queued' screenshare capture --mode q
    expect_completion 'queued' screenshare capture --mode = q
    expect_completion 'default mix queued session' screenshare capture --mode =
    expect_completion 'auto none simulated x11' screenshare --platform ''
    expect_completion 'simulated' screenshare list apps --platform s
    expect_completion '' screenshare capture --fps ''
    expect_completion '' screenshare nonsense --mode
}

case_completion_knows_what_the_desktop_has() {
    load_completion
    expect_completion '1 2 main' screenshare capture --monitor ''
    expect_completion '5000101 5000102 5000103 5000104 5000105' screenshare explain --app 5
    expect_completion '1 2 3 4 5 6 7 8' screenshare capture --exclude-window ''
    export SCREENSHARE_PLATFORM=none
    expect_completion '' screenshare capture --window ''
    expect_completion '1 2 3 4 5 6 7 8' screenshare --platform simulated capture --window ''
    expect_completion '1 2 3 4 5 6 7 8' screenshare --platform = simulated capture --window ''
}

case_completion_knows_files_and_folders() {
    load_completion
    mkdir "$work/place"
    touch "$work/place/share one.svg" "$work/place/film.y4m"
    mkdir "$work/place/frames"
    cd "$work/place" || exit 1
    expect_completion 'film.y4m frames share one.svg' screenshare explain ''
    expect_completion 'frames' screenshare thumbnails ''
    expect_completion 'frames' screenshare capture --png fr
    expect_completion 'film.y4m' screenshare capture --y4m 'fi'
    complete_line screenshare explain sh
    [[ ${#COMPREPLY[@]} -eq 1 && ${COMPREPLY[0]} == 'share one.svg' ]] || fail "a name with a blank is torn apart"
}

case_completion_is_sound_shell() {
    need shellcheck
    print bash
    shellcheck -s bash "$work/bash" || fail "shellcheck complains"
}

"case_$2"

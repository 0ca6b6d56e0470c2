#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# What the program makes of its command line, on the simulated desktop, in a terminal and in pipes. Called with the
# program, the page that describes it, and the name of a case.
# shellcheck source=tests/tool/simulated_case.sh
. "$(dirname "${BASH_SOURCE[0]}")/simulated_case.sh"
readonly program=$1 page=$2

run() { (cd "$work" && timeout $limit "$program" "$@" </dev/null >"$work/out" 2>"$work/err"); }

expect_exit() { # CODE ARGUMENT...
    run "${@:2}"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}
# All that is said is this line.
expect_line() { # CODE LINE ARGUMENT...
    expect_exit "$1" "${@:3}"
    [[ ! -s $work/out ]] || fail "'${*:3}' writes to standard output"
    [[ $(cat "$work/err") == "screenshare: $2" ]] || fail "'${*:3}' does not say '$2', and nothing else"
}
# A command line that makes no sense, and the help that is pointed to.
expect_misuse() { # PROBLEM COMMAND ARGUMENT...
    local about="$2: "
    [[ -n $2 ]] || about=''
    expect_line 2 "$about$1; see screenshare ${2:+$2 }--help" "${@:3}"
}

readonly commands='list, thumbnails, explain, capture, doctor, demo'

case_misuse_of_the_program() {
    expect_misuse "a command is missing; there are: $commands" ''
    expect_misuse "there is no command 'nonsense'; there are: $commands" '' nonsense
    expect_misuse "there is no command 'nonsense'; there are: $commands" '' --json nonsense
    expect_misuse 'a command is missing; there are: apps, windows, monitors' list list
    expect_misuse "there is no command 'apples'; there are: apps, windows, monitors" list list apples
    expect_misuse "--platform: windows not in {auto,x11,simulated,none}" 'list apps' list apps --platform windows
    expect_misuse "--platform needs a value: NAME" '' --platform
}

case_misuse_of_commands() {
    expect_misuse "'5' is one argument too many" 'list apps' list apps 5
    expect_misuse 'there is no option --wach' 'list windows' list windows --wach
    expect_misuse 'FILE.svg is required' explain explain --app 5000101
    expect_misuse "--exclude-window: 'share.svg' is no number" explain explain share.svg --exclude-window 5 share.svg --json
    expect_misuse "--exclude-app: 'Editor' is no number" capture capture --exclude-app Editor
    expect_misuse "'two' is one argument too many" explain explain one two
    expect_misuse 'DIR is required' thumbnails thumbnails
    expect_misuse '--apps excludes --windows' thumbnails thumbnails --apps --windows pictures
    expect_misuse "'now' is one argument too many" doctor doctor now
    expect_misuse 'there is no option --seconds' doctor doctor --seconds 5
    expect_misuse '--json takes no value' capture capture --json=5 --seconds 1
    expect_misuse '--fps: Value 0 not in range 1 to 240' capture capture --fps 0
    expect_misuse '--mode: fast not in {default,queued,session,mix}' capture capture --mode fast
    expect_misuse '--y4m needs a value: FILE|-' capture capture --y4m
    expect_misuse "--monitor: 'one' is neither a number nor 'main'" capture capture --monitor one
    expect_misuse '--monitor excludes --app' capture capture --monitor 1 --app 2
    expect_misuse "there is no option --scenes" demo demo --scenes
    [[ -z $(find "$work" -mindepth 1 ! -name out ! -name err) ]] || fail "a refused line leaves something"
}

case_failures_are_one_line() {
    local command
    for command in 'list apps' 'list windows --json' 'list monitors --watch' 'thumbnails pictures' 'explain share.svg' \
        'explain --json' 'capture --seconds 1'; do
        # shellcheck disable=SC2086  # Each is several words.
        expect_line 1 'there is no desktop to look at (screenshare doctor tells why); --platform simulated shows an invented one' \
            --platform none $command
    done
}

# Neither breaks the line, nor reaches the terminal as it is.
case_what_was_typed_is_told_without_control_characters() {
    expect_misuse '--mode: fa st [31m not in {default,queued,session,mix}' capture capture --mode $'fa\nst\e[31m'
    expect_misuse "there is no command 'x [2J'; there are: $commands" '' $'x\e[2J'
    expect_line 1 "there is no window 'a b'" explain --window $'a\nb' -- share.svg
    expect_line 1 "there is no application with a window 'a [0m'" capture --app $'a\e[0m' --seconds 1
}

case_version() {
    expect_exit 0 --version
    grep -qxE 'screenshare [0-9]+\.[0-9]+\.[0-9]+' "$work/out" || fail "it is no version"
    [[ $(wc -l <"$work/out") -eq 1 && ! -s $work/err ]] || fail "it says more"
}

case_help() {
    local command word
    for command in '' list 'list apps' 'list windows' 'list monitors' thumbnails explain capture doctor demo; do
        # shellcheck disable=SC2086  # None is no argument.
        expect_exit 0 $command --help
        [[ ! -s $work/err ]] || fail "help of '$command' complains"
        for word in "Usage: screenshare${command:+ $command} " 'Examples:' 'Exit code:' '  2  the command line' \
            '-h, --help ' '--platform NAME '; do
            grep -qF -- "$word" "$work/out" || fail "help of '$command' has no '$word'"
        done
        # An example is as long as it is.
        ! grep -v '^  screenshare ' "$work/out" | grep -qE '.{81}' || fail "help of '$command' is wider than a terminal"
        mv "$work/out" "$work/long"
        # shellcheck disable=SC2086
        expect_exit 0 $command -h
        cmp -s "$work/out" "$work/long" || fail "-h of '$command' is another help"
    done
}

# Every command line that help shows is one that the program takes, as far as the shell's part of it goes.
case_examples_make_sense() {
    local command example
    : >"$work/examples"
    for command in '' list thumbnails explain capture doctor demo; do
        # shellcheck disable=SC2086
        expect_exit 0 $command --help
        grep '^  screenshare ' "$work/out" >>"$work/examples"
    done
    [[ $(wc -l <"$work/examples") -ge 15 ]] || fail "there are few examples"
    while read -r example; do
        read -r -a words <<<"${example%%[|]*}"
        # Without a desktop nothing is done, and nothing but the line's sense is judged.
        run --platform none "${words[@]:1}"
        [[ $? -ne 2 ]] || fail "'$example' makes no sense"
    done < <(sed 's/ 2>form.txt//; s/^ *//' "$work/examples" | grep -v -e '--platform' -e 'screenshare demo')
}

# One table, wherever it is told.
case_exit_codes_are_the_same_everywhere() {
    local code text
    expect_exit 0 --help
    sed -n '/^Exit code:/,/^$/s/^  \([0-9]\)  /\1 /p' "$work/out" >"$work/codes"
    [[ $(wc -l <"$work/codes") -eq 5 ]] || fail "there are not 5 codes"
    expect_exit 0 manual man
    sed 's/[\]//g' <"$work/out" >"$work/man"
    while read -r code text; do
        grep -qxF "| $code | $text |" "$page" || fail "the page does not tell '$code $text'"
        grep -qxF "$text" "$work/man" || fail "the manual does not tell '$code $text'"
    done <"$work/codes"
}

case_closed_pipes() {
    local command
    mkfifo "$work/pipe"
    for command in --help --version 'list apps' 'list windows --json' 'explain --json' 'explain -' doctor 'manual man'; do
        exec 9<>"$work/pipe"
        exec 8>"$work/pipe" 9<&-
        # shellcheck disable=SC2086
        timeout $limit "$program" $command </dev/null >&8 2>"$work/err"
        local code=$?
        exec 8>&-
        : >"$work/out"
        [[ $code -eq 4 ]] || fail "'$command' ends with $code and not with 4"
        [[ $(cat "$work/err") == 'screenshare: the reader of standard output has closed the pipe' ]] ||
            fail "'$command' does not say why"
    done
}

case_output_that_cannot_be_written() {
    [[ -w /dev/full ]] || { echo "skipped: there is no /dev/full"; exit 77; }
    local command
    : >"$work/out"
    for command in --help --version 'list apps' 'explain --json' 'explain -' doctor 'manual bash'; do
        # shellcheck disable=SC2086
        timeout $limit "$program" $command </dev/null >/dev/full 2>"$work/err"
        local code=$?
        [[ $code -eq 5 ]] || fail "'$command' ends with $code and not with 5"
        [[ $(cat "$work/err") == 'screenshare: cannot write standard output: No space left on device' ]] ||
            fail "'$command' does not say why"
    done
    timeout $limit "$program" list apps </dev/null >&- 2>"$work/err"
    [[ $? -eq 5 ]] || fail "no standard output at all is a success"
}

# The same to read as in a pipe, but for lines' ends, and what a capture shows of its progress.
case_in_a_terminal() {
    command -v script >/dev/null || { echo "skipped: script is not installed"; exit 77; }
    local command code
    for command in --help 'list windows' 'list monitors --json' 'explain --json' doctor; do
        # shellcheck disable=SC2086
        run $command
        code=$?
        mv "$work/out" "$work/piped"
        timeout $limit script -qec "'$program' $command" /dev/null </dev/null >"$work/out" 2>"$work/err"
        [[ $? -eq $code ]] || fail "'$command' ends otherwise"
        tr -d '\r' <"$work/out" | cmp -s - "$work/piped" || fail "'$command' says something else"
    done
    timeout $limit script -qec "'$program' capture --seconds 2" /dev/null </dev/null >"$work/out" 2>"$work/err" ||
        fail "the capture fails"
    grep -q $'\r\e\\[K.* fps ' "$work/out" || fail "nothing shows how it goes"
    grep -qE 'delivered   [1-9][0-9]* frames in ' "$work/out" || fail "there are no statistics"
    timeout $limit script -qec "'$program' capture --raw -" /dev/null </dev/null >"$work/out" 2>"$work/err"
    [[ $? -eq 2 ]] || fail "a terminal gets frames"
    tr -d '\r' <"$work/out" | grep -qxF 'screenshare: standard output is a terminal; frames need a file or a pipe' ||
        fail "it does not say why"
}

"case_$3"

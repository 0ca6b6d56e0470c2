#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs `screenshare list apps` and `screenshare list ... --watch` on the simulated desktop. Called with the program and
# the name of a case.
# shellcheck source=tests/tool/simulated_case.sh
. "$(dirname "${BASH_SOURCE[0]}")/simulated_case.sh"
readonly program=$1
job='' # What runs in the background.
trap '[[ -z $job ]] || kill -KILL $job 2>/dev/null; rm -rf "$work"' EXIT

list() { timeout $limit "$program" list "$@" </dev/null 2>"$work/err"; }

# expect_exit CODE ARGUMENT...
expect_exit() {
    list "${@:2}" >"$work/out"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
}
expect_refusal() { # TEXT ARGUMENT...
    expect_exit 2 "${@:2}"
    [[ ! -s $work/out ]] || fail "'${*:2}' writes to standard output"
    grep -qF -- "$1" "$work/err" || fail "'${*:2}' does not say '$1'"
}
expect_line() { grep -qxE -- "$1" "$work/out" || fail "no line is '$1'"; }
expect_lines() { [[ $(wc -l <"$work/out") -eq $1 ]] || fail "there are not $1 lines"; }
expect_no_complaint() { [[ ! -s $work/err ]] || fail "it complains"; }
expect_said() { grep -qF -- "$1" "$work/err" || fail "it does not say '$1'"; }
need_python() { command -v python3 >/dev/null || { echo "skipped: python3 is not installed"; exit 77; }; }

# watch_until SIGNAL LINES ARGUMENT...: has to end well.
watch_until() {
    local tries code
    : >"$work/out"
    "$program" list "${@:3}" --watch </dev/null >"$work/out" 2>"$work/err" &
    job=$!
    for ((tries = 0; tries < limit * 10; ++tries)); do
        [[ $(wc -l <"$work/out") -ge $2 ]] && break
        kill -0 $job 2>/dev/null || break
        sleep 0.1
    done
    kill -s "$1" $job || fail "it doesn't watch"
    wait $job
    code=$?
    job=''
    [[ $code -eq 0 ]] || fail "SIG$1 ends '${*:3}' with $code"
    expect_lines "$2"
    expect_no_complaint
}

case_apps() {
    expect_exit 0 apps
    expect_no_complaint
    expect_lines 6
    expect_line 'PID +NAME +WINDOWS'
    expect_line '5000101 +Editor +1'
    expect_line '5000102 +Bouncing Ball +1'
    expect_line '5000104 +Keys +1'
}

case_apps_as_json() {
    need_python
    expect_exit 0 apps --json
    python3 - "$work/out" <<'END' || fail "the applications are not what they should be"
import json, sys
apps = json.load(open(sys.argv[1]))
assert sorted(a["pid"] for a in apps) == [5000101, 5000102, 5000103, 5000104, 5000105], apps
assert {"pid": 5000103, "name": "Notes", "windows": 1} in apps, apps
END
}

case_watch_ends_well() {
    local signal
    for signal in INT TERM; do
        watch_until $signal 6 apps
        expect_line '   PID +NAME +WINDOWS'
        expect_line '\+  5000101  Editor +1'
        watch_until $signal 9 windows
        expect_line '\+  7 +5000103 +Notes +600,420 +250x200 +0 +0.9 +read +Shopping'
        watch_until $signal 3 monitors
        expect_line '\+  2 +1280,100 +800x600 +1 +Simulated Side Display'
    done
}

case_watch_as_json() {
    need_python
    watch_until TERM 5 apps --json
    python3 - "$work/out" <<'END' || fail "the lines are not what they should be"
import json, sys
apps = [json.loads(line) for line in open(sys.argv[1])]
assert all(list(a)[0] == "change" and a["change"] == "added" for a in apps), apps
assert {"change": "added", "pid": 5000103, "name": "Notes", "windows": 1} in apps, apps
END
}

case_watch_with_a_reader_that_goes() {
    local kind
    for kind in apps windows monitors; do
        list $kind --watch | head -n 1 >"$work/out"
        local code=${PIPESTATUS[0]}
        [[ $code -eq 4 ]] || fail "'$kind' ends with $code and not with 4"
        expect_said 'the reader of standard output has closed the pipe'
    done
}

# The pipe is full before it begins.
case_watch_ends_beside_a_reader_that_takes_nothing() {
    need_python
    : >"$work/out"
    timeout $limit python3 - "$program" 2>"$work/err" <<'END' || fail "it does not end well"
import os, signal, subprocess, sys, time
reader, writer = os.pipe()
os.set_blocking(writer, False)
try:
    while True:
        os.write(writer, b"x" * 4096)
except BlockingIOError:
    os.set_blocking(writer, True)
child = subprocess.Popen([sys.argv[1], "list", "windows", "--watch"], stdout=writer)
folder = f"/proc/{child.pid}/fd"
def is_for_signals(fd):
    try:
        return "signalfd" in os.readlink(f"{folder}/{fd}")
    except FileNotFoundError:
        return False
while not any(is_for_signals(fd) for fd in os.listdir(folder)):
    time.sleep(0.05)
child.send_signal(signal.SIGINT)
sys.exit(child.wait())
END
    expect_no_complaint
}

case_watch_into_a_full_disk() {
    [[ -w /dev/full ]] || { echo "skipped: there is no /dev/full"; exit 77; }
    : >"$work/out"
    list monitors --watch >/dev/full
    local code=$?
    [[ $code -eq 5 ]] || fail "it ends with $code and not with 5"
    expect_said 'cannot write standard output: No space left on device'
}

case_command_lines_that_make_no_sense() {
    expect_refusal '--wach' apps --wach
    expect_refusal '5' apps 5
    expect_refusal 'a command is missing; there are: apps, windows, monitors' --watch
    expect_refusal "there is no command 'applications'; there are: apps, windows, monitors" applications
    expect_refusal 'a command is missing'
}

case_help() {
    local kind word
    for kind in '' apps windows monitors; do
        # shellcheck disable=SC2086  # None is no argument.
        expect_exit 0 $kind --help
        for word in 'Examples:' 'Exit code:' 'list apps'; do
            grep -qF -- "$word" "$work/out" || fail "help of '$kind' does not name $word"
        done
    done
    grep -qE '^ +--watch ' "$work/out" || fail "help does not name --watch"
}

"case_$2"

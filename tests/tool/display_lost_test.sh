#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# What becomes of each command of `screenshare` when its X server dies, or stops to answer, before or while it runs: it
# ends or goes on as it says, never by a signal. Called with the program and the name of a case. Each case starts a
# server of its own.
set -uo pipefail
readonly program=$1 limit=60 # Seconds that anything may take before it counts as hanging.
readonly soon=10             # Seconds in which a command that has lost its display has to end.
work=$(mktemp -d)
server='' job='' # What runs in the background.
traces=() # Of servers that have been killed.
end_process() { # PID
    [[ -n $1 ]] || return
    kill -CONT "$1" 2>/dev/null
    kill -KILL "$1" 2>/dev/null
    wait "$1" 2>/dev/null
}
trap 'end_process "$job"; end_process "$server"; rm -rf "$work" "${traces[@]}"' EXIT
unset SCREENSHARE_TRACE DISPLAY WAYLAND_DISPLAY XDG_SESSION_TYPE
export SCREENSHARE_PLATFORM=x11 SCREENSHARE_DEBUG_DIR=$work XAUTHORITY=$work/authority

fail() {
    echo "FAILED: $*"
    sed 's/^/    out: /' "$work/out"
    sed 's/^/    err: /' "$work/err"
    exit 1
}

start_server() {
    command -v Xvfb >/dev/null || { echo "skipped: Xvfb is not installed"; exit 77; }
    rm -f "$work/number"
    mkfifo "$work/number"
    exec 7<>"$work/number"
    Xvfb -displayfd 7 -screen 0 640x480x24 -noreset -nolisten tcp >"$work/log" 2>&1 &
    server=$!
    local number
    read -r -t $limit -u 7 number || { sed 's/^/    log: /' "$work/log"; echo "FAILED: no server"; exit 1; }
    exec 7>&-
    export DISPLAY=:$number
}
# The number of a dead server is anybody's: in its lock stands a process that lives on.
keep_number() {
    local number=${DISPLAY#:}
    traces+=("/tmp/.X$number-lock" "/tmp/.X11-unix/X$number")
    printf '%10d\n' $$ >"$work/lock"
    mv -f "$work/lock" "/tmp/.X$number-lock"
}
kill_server() {
    keep_number
    kill -KILL "$server"
    wait "$server" 2>/dev/null
    server=''
}

run() { timeout $soon "$program" "$@" </dev/null >"$work/out" 2>"$work/err"; }
start() {
    # Emptied at once, and not when the program begins: somebody waits for what it will say.
    : >"$work/out"
    : >"$work/err"
    # Not through timeout: signals are for the program.
    "$program" "$@" </dev/null >"$work/out" 2>"$work/err" &
    job=$!
}
expect_end() { # CODE
    local tries code
    for ((tries = 0; tries < soon * 10; ++tries)); do
        kill -0 "$job" 2>/dev/null || break
        sleep 0.1
    done
    ! kill -0 "$job" 2>/dev/null || fail "it goes on and on"
    wait "$job"
    code=$?
    job=''
    [[ $code -eq $1 ]] || fail "it ends with $code and not with $1"
}
wait_for_text() { # FILE TEXT
    local tries
    for ((tries = 0; tries < limit * 10; ++tries)); do
        grep -qF -- "$2" "$1" 2>/dev/null && return
        kill -0 "$job" 2>/dev/null || break
        sleep 0.1
    done
    fail "'$2' doesn't come"
}
# Code 1, nothing but one line, and that one.
expect_refusal() { # PATTERN ARGUMENT...
    run "${@:2}"
    local code=$?
    [[ $code -eq 1 ]] || fail "'${*:2}' ends with $code and not with 1"
    [[ ! -s $work/out ]] || fail "'${*:2}' answers all the same"
    [[ $(wc -l <"$work/err") -eq 1 ]] || fail "'${*:2}' does not say one line"
    grep -qE -- "^screenshare: $1( \(screenshare doctor tells |\$)" "$work/err" || fail "'${*:2}' does not say '$1'"
}

expect_refusal_beside_others() { # PATTERN COMMAND ARGUMENT...
    local work=$work/$2
    mkdir "$work"
    expect_refusal "$@"
}

readonly lookers=('list apps' 'list windows --json' 'list monitors' 'thumbnails pictures' 'explain share.svg'
    'explain --json' 'capture --seconds 1')

case_killed_before() {
    start_server
    kill_server
    cd "$work" || exit 1
    local command
    for command in "${lookers[@]}"; do
        # shellcheck disable=SC2086  # Each is several words.
        expect_refusal 'no window server answers' $command
        # shellcheck disable=SC2086
        SCREENSHARE_PLATFORM=auto expect_refusal 'there is no desktop to look at' $command
    done
    [[ ! -e share.svg && ! -e pictures ]] || fail "something is written for nothing"
    run doctor
    [[ $? -eq 1 ]] || fail "doctor finds nothing wrong"
    grep -qF 'no X server answers' "$work/out" || fail "doctor does not say why"
}

# What is stopped takes calls and answers none: each command waits for a deadline, and ends.
case_stopped_before() {
    start_server
    kill -STOP "$server"
    cd "$work" || exit 1
    local command jobs=() each
    for command in 'list windows' 'thumbnails pictures' 'explain --json' 'capture --seconds 1'; do
        # shellcheck disable=SC2086
        expect_refusal_beside_others '(no window server answers|the window server does not answer)' $command &
        jobs+=($!)
    done
    for each in "${jobs[@]}"; do
        wait "$each" || exit 1
    done
}

case_killed_while_a_list_is_watched() {
    start_server
    start list monitors --watch --json
    wait_for_text "$work/out" '"change": "added"'
    kill_server
    wait_for_text "$work/out" '"change": "removed"'
    kill -INT "$job"
    expect_end 0
    [[ ! -s $work/err ]] || fail "it complains"
}

case_stopped_while_a_list_is_watched() {
    start_server
    start list monitors --watch
    wait_for_text "$work/out" '+  '
    kill -STOP "$server"
    sleep 1
    kill -0 "$job" || fail "it does not go on"
    kill -TERM "$job"
    expect_end 0
    ! grep -q '^-' "$work/out" || fail "what only waits is told as gone"
}

case_killed_while_capturing() {
    local mode
    for mode in default queued session mix; do
        start_server
        start capture --mode $mode --raw "$work/raw"
        wait_for_text "$work/err" 'raw frames: 640x480'
        kill_server
        wait_for_text "$work/err" 'the captured monitor has gone'
        kill -0 "$job" || fail "it does not go on"
        kill -INT "$job"
        expect_end 0
        grep -qE '^  written +[1-9]' "$work/err" || fail "there are no statistics"
    done
}

# A limit of time holds, too, when nothing comes any more.
case_killed_while_capturing_to_a_limit() {
    start_server
    start capture --seconds 3 --json
    wait_for_text "$work/err" 'started'
    kill_server
    expect_end 0
    grep -qF 'the captured monitor has gone' "$work/err" || fail "it does not say that the desktop went"
    grep -q '^{"delivered": ' "$work/out" || fail "there are no statistics"
}

case_stopped_while_capturing() {
    local mode
    for mode in default session; do
        start_server
        start capture --mode $mode --raw "$work/raw"
        wait_for_text "$work/err" 'raw frames: 640x480'
        kill -STOP "$server"
        sleep 1
        kill -TERM "$job"
        expect_end 0
        grep -qE '^  written +[1-9]' "$work/err" || fail "there are no statistics"
        end_process "$server"
        server=''
    done
}

# The pipe has room for the headings; the first line waits for a reader, and the server goes meanwhile. RETURNS is 1 when
# another one comes in its place.
lose_server_between_thumbnails() { # RETURNS
    local each
    for each in python3 xclock xwininfo; do
        command -v $each >/dev/null || { echo "skipped: $each is not installed"; exit 77; }
    done
    start_server
    : >"$work/out"
    # They end with the server.
    xclock -geometry 100x100+10+10 -title first >"$work/log" 2>&1 &
    xclock -geometry 100x100+210+10 -title second >"$work/log" 2>&1 &
    wait_for_window first
    wait_for_window second
    keep_number
    timeout $limit python3 - "$program" "$work/pictures" "$server" "$1" 2>"$work/err" <<'END'
import fcntl, glob, os, signal, subprocess, sys, time
program, folder, server, returns = sys.argv[1:]
F_SETPIPE_SZ = 1031
reader, writer = os.pipe()
fcntl.fcntl(writer, F_SETPIPE_SZ, 4096)
child = subprocess.Popen([program, "thumbnails", "--windows", folder], stdout=writer)
os.close(writer)
while not glob.glob(folder + "/*.png"):
    assert child.poll() is None, "it ends without a picture"
    time.sleep(0.05)
os.kill(int(server), signal.SIGKILL)
second = None
if returns == "1":
    display = os.environ["DISPLAY"]
    os.remove(f"/tmp/.X{display[1:]}-lock")
    second = subprocess.Popen(["Xvfb", display, "-displayfd", "1", "-noreset", "-nolisten", "tcp"],
                              stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
    second.stdout.readline()
    time.sleep(1) # It is looked for after 0.1, 0.3 and 0.7 s.
else:
    time.sleep(0.5)
while os.read(reader, 4096):
    pass
code = child.wait(10)
if second:
    second.terminate()
    second.wait(10)
sys.exit(code)
END
    local code=$?
    [[ $code -eq 1 ]] || fail "it ends with $code and not with 1"
    grep -qF '1 without a picture' "$work/err" || fail "it does not count what is missing"
    grep -qxF 'screenshare: the window server went away (screenshare doctor tells more)' "$work/err" ||
        fail "it does not say why"
}
case_killed_while_thumbnails_are_written() {
    lose_server_between_thumbnails 0
}
# What was to be looked at isn't there.
case_replaced_while_thumbnails_are_written() {
    lose_server_between_thumbnails 1
}
wait_for_window() { # TITLE
    local tries
    for ((tries = 0; tries < limit * 10; ++tries)); do
        xwininfo -name "$1" 2>/dev/null | grep -q 'Map State: IsViewable' && return
        sleep 0.1
    done
    fail "window $1 is not to be seen"
}

"case_$2"

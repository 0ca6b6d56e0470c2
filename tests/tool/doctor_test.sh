#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs `screenshare doctor` where there is a desktop and where there is none. Called with the program and the name of
# a case. Cases that need an X server start one of their own.
set -uo pipefail
readonly program=$1 limit=60 # Seconds that anything may take before it counts as hanging.
work=$(mktemp -d)
jobs=() # What runs in the background, by id; the first one is the server.
end_jobs() {
    local job
    for job in "${jobs[@]}"; do
        kill -CONT "$job" 2>/dev/null
        kill "$job" 2>/dev/null
        wait "$job" 2>/dev/null
    done
}
trap 'end_jobs; rm -rf "$work"' EXIT
unset SCREENSHARE_TRACE SCREENSHARE_PLATFORM DISPLAY WAYLAND_DISPLAY XDG_SESSION_TYPE
export SCREENSHARE_DEBUG_DIR=$work XAUTHORITY=$work/authority

fail() {
    echo "FAILED: $*"
    sed 's/^/    out: /' "$work/out"
    sed 's/^/    err: /' "$work/err"
    exit 1
}

# The output as one line: where it is broken is not what the cases are about.
doctor() { # ARGUMENT...
    timeout $limit "$program" doctor "$@" </dev/null >"$work/out" 2>"$work/err"
    local code=$?
    tr -s ' \n' ' ' <"$work/out" >"$work/line"
    return $code
}
expect_exit() { # CODE ARGUMENT...
    doctor "${@:2}"
    local code=$?
    [[ $code -eq $1 ]] || fail "'${*:2}' ends with $code and not with $1"
    [[ ! -s $work/err ]] || fail "'${*:2}' complains"
}
expect_said() { grep -qF -- "$1" "$work/line" || fail "it does not say '$1'"; }
expect_not_said() { ! grep -qF -- "$1" "$work/line" || fail "it says '$1'"; }

need() { # PROGRAM...
    local each
    for each in "$@"; do
        command -v "$each" >/dev/null || { echo "skipped: $each is not installed"; exit 77; }
    done
}

start_server() { # ARGUMENT...
    need Xvfb
    mkfifo "$work/number"
    exec 7<>"$work/number"
    Xvfb -displayfd 7 -noreset -nolisten tcp "$@" >"$work/log" 2>&1 &
    jobs+=($!)
    local number
    read -r -t $limit -u 7 number || { sed 's/^/    log: /' "$work/log"; echo "FAILED: no server"; exit 1; }
    exec 7>&-
    export DISPLAY=:$number
}
# Waits until the doctor says so: programs on a server take their time to get ready.
wait_for() { # TEXT
    local tries
    for ((tries = 0; tries < limit; ++tries)); do
        doctor
        grep -qF -- "$1" "$work/line" && return
        sleep 0.5
    done
    fail "it never says '$1'"
}

case_simulated() {
    expect_exit 0 --platform simulated
    expect_said 'Window server: simulated Chosen because SCREENSHARE_PLATFORM (or --platform) asks for it.'
    expect_said '1 0,0 1280x800 1 Simulated Display'
    expect_said 'Windows: 8 (8 on the screen). Applications: 8.'
    expect_said 'an invented desktop'
    expect_said 'Verdict: all that sharing monitors and windows needs is there.'
    expect_not_said ' no '
}

case_none() {
    expect_exit 1 --platform none
    expect_said 'Window server: none'
    expect_said 'asks for none; mend it by unsetting it, or setting it to auto.'
    expect_said 'Verdict: something that sharing needs is missing: Monitors, List of windows, Pictures of windows.'
}

case_without_display() {
    expect_exit 1
    expect_said 'because DISPLAY is not set'
    expect_exit 1 --platform x11
    expect_said 'Window server: X11, display not named, lost'
    expect_said 'because DISPLAY is not set'
}

case_unknown_word() {
    export SCREENSHARE_PLATFORM=$'x12\e[31m'
    expect_exit 1
    expect_said 'which names no window server; mend it by'
    ! grep -q $'\e' "$work/out" || fail "it passes control characters on to the terminal"
}

case_wrong_displays() {
    DISPLAY=:98765 expect_exit 1
    expect_said 'because no X server answers at display :98765'
    DISPLAY=localhost:59000 expect_exit 1
    expect_said 'because no X server answers at display localhost:59000'
    DISPLAY=elsewhere.invalid:0 expect_exit 1
    expect_said 'on another machine'
    DISPLAY=nonsense expect_exit 1
    expect_said 'because DISPLAY is nonsense, which is no name of a display'
    DISPLAY=:98765 expect_exit 1 --platform x11
    expect_said 'Window server: X11, display :98765, lost'
    expect_said 'because no X server answers at display :98765'
}

case_wayland() {
    WAYLAND_DISPLAY=wayland-7 expect_exit 1
    expect_said 'because this is a Wayland session (WAYLAND_DISPLAY is wayland-7)'
    expect_not_said 'SCREENSHARE_PLATFORM=x11'
    XDG_SESSION_TYPE=wayland expect_exit 1
    expect_said 'because this is a Wayland session (XDG_SESSION_TYPE is wayland)'
    start_server
    WAYLAND_DISPLAY=wayland-7 expect_exit 1
    expect_said 'because this is a Wayland session (WAYLAND_DISPLAY is wayland-7)'
    expect_said "X display $DISPLAY, not in use"
    expect_said 'setting SCREENSHARE_PLATFORM=x11'
    WAYLAND_DISPLAY=wayland-7 expect_exit 0 --platform x11
    expect_said 'Windows of Wayland programs are not shown'
}

case_x11() {
    start_server -screen 0 800x600x24
    expect_exit 0
    expect_said "Window server: X11, display $DISPLAY (The X.Org Foundation "
    expect_said "Chosen because display $DISPLAY answers and this is no Wayland session."
    expect_said 'Screen 800x600, depth 24'
    expect_said 'Window manager none'
    expect_said 'Compositor none'
    expect_not_said 'Good to know'
    DISPLAY=$DISPLAY.7 expect_exit 1
    expect_said "the X server of display $DISPLAY.7 has no screen of that number"
}

case_missing_extensions() {
    start_server -extension COMPOSITE -extension MIT-SHM
    expect_exit 1
    expect_said 'Composite missing'
    expect_said 'Pictures of windows no for every share'
    expect_said 'because the X server has no Composite extension; mend it by starting the X server with +extension COMP'
    expect_said 'Pictures come slowly, because the X server has no MIT-SHM extension'
    expect_said 'is missing: Pictures of windows.'
}

case_unreadable_depth() {
    start_server -screen 0 640x480x8
    expect_exit 1
    expect_said "because the screen's depth is 8"
}

case_window_manager_and_compositor() {
    need openbox picom
    start_server
    HOME=$work openbox >"$work/log" 2>&1 &
    jobs+=($!)
    wait_for 'Window manager Openbox'
    expect_said 'Compositor none'
    HOME=$work picom --config /dev/null --backend xrender >"$work/log" 2>&1 &
    jobs+=($!)
    wait_for 'Compositor picom'
    kill -KILL "${jobs[1]}"
    wait "${jobs[1]}" 2>/dev/null
    wait_for 'Window manager none'
}

case_hostile_window_manager() {
    need xprop xwininfo
    start_server
    local root
    root=$(xwininfo -root | grep -o -m1 '0x[0-9a-f]*')
    # The root claims to be its own window manager, with a name that is neither short nor harmless.
    xprop -root -f _NET_SUPPORTING_WM_CHECK 32x -set _NET_SUPPORTING_WM_CHECK "$root"
    xprop -root -f _NET_WM_NAME 8s -set _NET_WM_NAME $'evil\e[31m'"$(printf '%05000d' 0)"
    expect_exit 0
    expect_said 'Window manager evil [31m000'
    [[ $(wc -c <"$work/out") -lt 4000 ]] || fail "it passes on all of a huge name"
    ! grep -q $'\e' "$work/out" || fail "it passes control characters on to the terminal"
    # A window that is not there, and no window at all.
    xprop -root -f _NET_SUPPORTING_WM_CHECK 32x -set _NET_SUPPORTING_WM_CHECK 0xffffffff
    expect_exit 0
    expect_said 'Window manager none'
    xprop -root -f _NET_SUPPORTING_WM_CHECK 8s -set _NET_SUPPORTING_WM_CHECK text
    expect_exit 0
    expect_said 'Window manager none'
}

case_missing_and_wrong_keys() {
    need xauth
    xauth -q -f "$work/other" add :0 . 0123456789abcdef0123456789abcdef
    start_server -auth "$work/other"
    expect_exit 1
    expect_said "display $DISPLAY lets nobody in without a key, and your authority file has none for it"
    xauth -q add "$DISPLAY" . 00000000000000000000000000000000
    expect_exit 1
    expect_said "display $DISPLAY refuses the key in your authority file"
    xauth -q add "$DISPLAY" . 0123456789abcdef0123456789abcdef
    expect_exit 0
}

case_server_that_is_stopped() {
    start_server
    kill -STOP "${jobs[0]}"
    expect_exit 1
    expect_said "the X server of display $DISPLAY takes calls, but doesn't answer within 2 seconds"
    kill -CONT "${jobs[0]}"
    expect_exit 0
}

case_monitors_of_a_wayland_session() {
    need xrandr
    start_server
    xrandr --setmonitor XWAYLAND0 auto screen
    expect_exit 1 --platform x11
    expect_said 'Monitors XWAYLAND0 1280x1024+0+0'
    expect_said 'belongs to a Wayland session (its monitors are named XWAYLAND)'
    expect_said 'is missing: Monitors.'
}

case_debug_file() {
    expect_exit 0 --platform simulated
    expect_said 'Debug file none'
    echo '{}' >"$work/share_config.json"
    chmod 644 "$work/share_config.json"
    expect_exit 0 --platform simulated
    expect_said 'Debug file share_config.json is there and counts'
    chmod 666 "$work/share_config.json"
    expect_exit 0 --platform simulated
    expect_said "The debug file in $work is not read, because others may have written it"
}

case_json() {
    need python3
    start_server
    expect_exit 0 --json
    python3 - "$work/out" "$DISPLAY" <<'END' || fail "the facts are not what they should be"
import json, sys
facts = json.load(open(sys.argv[1]))
assert facts["can_share"] is True
assert facts["window_server"]["name"] == "x11" and facts["window_server"]["life"] == "alive"
assert facts["window_server"]["monitors"][0]["width"] == 1280
assert facts["environment"]["DISPLAY"] == sys.argv[2] == facts["x11"]["display"]
assert facts["x11"]["window_manager"] is None and facts["x11"]["wayland_bridge"] is False
assert {each["name"]: each["suffices"] for each in facts["x11"]["extensions"]}["Composite"] is True
assert all(each["works"] for each in facts["abilities"]) and len(facts["abilities"]) == 8
assert facts["hints"] == []
END
    expect_exit 1 --json --platform none
    python3 - "$work/out" <<'END' || fail "the verdict is not what it should be"
import json, sys
facts = json.load(open(sys.argv[1]))
assert facts["can_share"] is False
assert all("asks for none" in each["because"] and each["remedy"] for each in facts["abilities"])
END
}

case_help() {
    expect_exit 0 --help
    expect_said 'screenshare doctor --json'
    expect_exit 0 --platform simulated
}

case_output_that_nobody_gets() {
    [[ -w /dev/full ]] || exit 77
    : >"$work/out"
    timeout $limit "$program" --platform simulated doctor >/dev/full 2>"$work/err"
    [[ $? -eq 5 ]] || fail "an answer that nobody gets is a success"
    grep -qF 'cannot write standard output: No space left on device' "$work/err" || fail "it does not say why"
}

"case_$2"

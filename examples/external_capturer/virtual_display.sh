#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# A virtual X server for a script to source: start_virtual_display, then run clients with start_client, and
# stop_virtual_display at the end, in whatever way it comes. Nothing is left running, no file is left behind.
#
# Sets DISPLAY, XAUTHORITY, VIRTUAL_DISPLAY_PID and VIRTUAL_DISPLAY_DIR, a folder for the script's own use, too.

# shellcheck disable=SC2034  # For those who source this.
VIRTUAL_DISPLAY_PID=
VIRTUAL_DISPLAY_DIR=

# wait_until SECONDS COMMAND...: repeats the command until it succeeds; fails when the time is over.
wait_until() {
    local deadline=$((SECONDS + $1))
    shift
    until "$@" >/dev/null 2>&1; do
        ((SECONDS < deadline)) || return 1
        sleep 0.05
    done
}

# A number that is no running child of this shell any more may belong to somebody else by now.
has_ended() { ! jobs -pr | grep -qx "$1"; }

# end_process PID: politely, then not.
end_process() {
    has_ended "$1" && return
    kill "$1" 2>/dev/null
    wait_until 5 has_ended "$1" || kill -KILL "$1" 2>/dev/null
    wait "$1" 2>/dev/null
    return 0
}

# An X authority file that fits any display, since its number is known only after the start: family "wild" (FF FF),
# empty address and number, the name and sixteen random bytes, each with its length in front.
write_authority() {
    printf '\377\377\0\0\0\0\0\22MIT-MAGIC-COOKIE-1\0\20'
    head -c 16 /dev/urandom
}

# start_virtual_display SCREEN [XVFB ARGUMENT...]: SCREEN is WIDTHxHEIGHTxDEPTH.
start_virtual_display() {
    local screen=$1 number=
    shift
    command -v Xvfb >/dev/null || { echo "Xvfb is not installed (Debian package xvfb)" >&2; return 1; }
    # Named first and made then, so that a signal in between finds the name.
    VIRTUAL_DISPLAY_DIR=$(mktemp -d -u)
    mkdir -m 700 "$VIRTUAL_DISPLAY_DIR" || { VIRTUAL_DISPLAY_DIR=; return 1; }
    write_authority >"$VIRTUAL_DISPLAY_DIR/authority" || return 1
    mkfifo "$VIRTUAL_DISPLAY_DIR/number" || return 1

    # The server picks a free number and writes it when it is ready. Without -noreset it would forget everything
    # whenever its last client leaves.
    setsid Xvfb -displayfd 3 -screen 0 "$screen" -noreset -nolisten tcp -auth "$VIRTUAL_DISPLAY_DIR/authority" "$@" \
        3>"$VIRTUAL_DISPLAY_DIR/number" </dev/null >"$VIRTUAL_DISPLAY_DIR/log" 2>&1 &
    VIRTUAL_DISPLAY_PID=$!
    read -r -t 30 number <"$VIRTUAL_DISPLAY_DIR/number"
    if [[ -z $number ]]; then
        echo "the virtual X server does not start:" >&2
        cat "$VIRTUAL_DISPLAY_DIR/log" >&2
        return 1
    fi
    export DISPLAY=:$number XAUTHORITY=$VIRTUAL_DISPLAY_DIR/authority
}

# start_client COMMAND...: an X program in the background, ended with the display. Ctrl-C is for the script alone:
# some programs never end when it reaches them as well.
start_client() {
    setsid "$@" </dev/null >>"$VIRTUAL_DISPLAY_DIR/log" 2>&1 &
}

# window_is_shown NAME
window_is_shown() { xwininfo -name "$1" 2>/dev/null | grep -q 'Map State: IsViewable'; }

# Ends whatever the script runs in the background. Asked of the shell and not kept in a list, which a signal could
# find one program short.
stop_virtual_display() {
    local pid
    for pid in $(jobs -pr); do
        end_process "$pid"
    done
    if [[ -n $VIRTUAL_DISPLAY_DIR ]]; then
        rm -rf "$VIRTUAL_DISPLAY_DIR"
        VIRTUAL_DISPLAY_DIR=
    fi
}

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# demo.sh BINARY [--out DIR] [OPTION...]
#
# Captures five seconds of the user's X display with the external_capturer program BINARY. Without one that can be
# captured, does so on a virtual X server with a few stock X programs on it. Further options go to the program.
# Ends with 0 when at least ten pictures were written.

set -u
# shellcheck disable=SC1091  # The sourced file is checked by itself.
. "$(dirname "${BASH_SOURCE[0]}")/virtual_display.sh"

readonly wanted_pictures=10
capturer_pid=

clean_up() {
    if [[ -n $capturer_pid ]]; then
        end_process "$capturer_pid"
    fi
    stop_virtual_display
}

# Why the user's own display won't do; nothing when it will.
reason_against_own_display() {
    if [[ -n ${WAYLAND_DISPLAY:-} || ${XDG_SESSION_TYPE:-} == wayland ]]; then
        echo "this is a Wayland session, whose X server shows black"
    elif [[ -z ${DISPLAY:-} ]]; then
        echo "DISPLAY is not set"
    else
        "$binary" --probe 2>&1 >/dev/null | sed 's/^external_capturer: //'
    fi
}

# Counts up until its terminal goes away. For another shell to expand.
# shellcheck disable=SC2016
readonly moving_output='
n=0
while printf "%6d  The quick brown fox jumps over the lazy dog\n" "$n"; do
    n=$((n + 1))
    sleep 0.1
done'

start_programs() {
    if command -v xsetroot >/dev/null; then
        xsetroot -solid '#2f4f6f'
    fi
    start_client xclock -update 1 -geometry 320x320+40+40
    start_client xeyes -geometry 360x240+420+60
    start_client xlogo -fg '#b03030' -geometry 300x300+860+40
    start_client xterm -T counting -fg white -bg black -fn 10x20 -geometry 118x14+40+400 -e sh -c "$moving_output"
    local name
    for name in xclock xeyes xlogo counting; do
        if ! wait_until 60 window_is_shown "$name"; then
            echo "the window of $name does not appear:" >&2
            cat "$VIRTUAL_DISPLAY_DIR/log" >&2
            return 1
        fi
    done
}

prepare_display() {
    local reason
    reason=$(reason_against_own_display)
    if [[ -z $reason ]]; then
        echo "capturing your display $DISPLAY"
        return 0
    fi
    start_virtual_display 1280x720x24 || return 1
    echo "capturing a virtual X server, $DISPLAY: $reason"
    start_programs
}

# In the background, because a shell hears no signal while it waits for a program in the foreground.
capture() {
    "$binary" --seconds 5 --fps 5 --out "$directory" "$@" <&0 &
    capturer_pid=$!
    wait "$capturer_pid"
    local result=$?
    capturer_pid=
    return $result
}

binary=${1:?usage: demo.sh BINARY [--out DIR] [OPTION...]}
[[ -x $binary ]] || { echo "demo.sh: no program $binary" >&2; exit 1; }
shift
directory=out/demo-$(date +%Y%m%d-%H%M%S)
options=()
while (($# > 0)); do
    if [[ $1 == --out ]]; then
        directory=${2:?--out needs a folder}
        shift 2
    else
        options+=("$1")
        shift
    fi
done

trap clean_up EXIT
trap 'exit 129' HUP
trap 'exit 130' INT
trap 'exit 143' TERM

prepare_display || exit 1
start=$(date +%s.%N)
capture "${options[@]}"
result=$?
if ((result != 0)); then
    exit "$result"
fi

pictures=$(find "$directory" -maxdepth 1 -name 'frame-*.png' -newermt "@$start" | wc -l)
echo "$pictures pictures in $(realpath "$directory")"
if ((pictures < wanted_pictures)); then
    echo "that is less than $wanted_pictures" >&2
    exit 1
fi

# shellcheck shell=bash
# SPDX-License-Identifier: Apache-2.0
#
# What scripts have in common that try the program on the simulated desktop: a folder, the desktop, and how they fail.
# To be sourced.
set -uo pipefail
# shellcheck disable=SC2034 # read by those who source this
readonly limit=60 # Seconds that anything may take before it counts as hanging.
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
unset SCREENSHARE_TRACE DISPLAY WAYLAND_DISPLAY
export SCREENSHARE_PLATFORM=simulated SCREENSHARE_DEBUG_DIR=$work

# Shows what the program has said.
fail() {
    echo "FAILED: $*"
    [[ ! -e $work/out ]] || sed 's/^/    out: /' "$work/out"
    [[ ! -e $work/err ]] || sed 's/^/    err: /' "$work/err"
    exit 1
}

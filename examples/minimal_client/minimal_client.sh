#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Runs minimal_client on dummies: a debug file, read from a folder of its own, puts a painted test picture in the place
# of the screen. Called with the program's file.
set -euo pipefail

SCREENSHARE_DEBUG_DIR=$(mktemp -d)
export SCREENSHARE_DEBUG_DIR
trap 'rm -rf "$SCREENSHARE_DEBUG_DIR"' EXIT

cat >"$SCREENSHARE_DEBUG_DIR/share_config.json" <<'END'
{
    "dummy_capture": true,
    "dummy_capture_width": 640,
    "dummy_capture_height": 480,
    "dummy_enumerator": true,
    "dummy_point": true
}
END
"$1"

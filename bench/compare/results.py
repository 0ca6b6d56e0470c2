# SPDX-License-Identifier: Apache-2.0
"""What compare_bench has written: rows by name, and in each what was measured of every peer."""

import json

OURS = "screenshare"
WEBRTC = "webrtc"
SCENES = ["static", "typing", "video", "full_motion"]


def load(path):
    """{"screen/static": {"screenshare": {"total_ms": ...}, ...}, ...}"""
    with open(path, encoding="utf-8") as file:
        found = json.load(file)["benchmarks"]
    rows = {}
    for entry in found:
        _, *row, peer = entry["name"].split("/")
        rows.setdefault("/".join(row), {})[peer] = entry
    return rows


def best_webrtc(peers):
    """The name of WebRTC's cheapest configuration in a row of shares; None without one."""
    names = [name for name, entry in peers.items() if name.split()[0] == WEBRTC and "total_ms" in entry]
    return min(names, key=lambda name: peers[name]["total_ms"], default=None)


def rows_below(rows, group):
    """The rows of a group that grows with a number, as pairs of it and the row, in its order."""
    found = [(float(name.split("/")[1]), peers) for name, peers in rows.items() if name.split("/")[0] == group]
    return sorted(found, key=lambda pair: pair[0])

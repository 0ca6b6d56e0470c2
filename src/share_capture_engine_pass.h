// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capture_engine_impl.h"

#include <cstdint>
#include <string>

/// What one pass works out on its way from the tick to the sink.
struct CShareCaptureEngine::Pass {
    unsigned mask = 0;
    IShareFrame* frame = nullptr; // the current frame; the previous one when that is sent again
    bool dumpContent = false;
    bool dumpPoint = false;
    std::string dumpName;
    unsigned startTick = 0; // ms
    bool wantCursor = false;
    bool gotContent = false;
    int result = SHARE_CAPTURE_FAILED;
    float scale = 1.0F; // frame pixels per point
    bool reused = false;
    std::uint64_t withdrawals = 0; // of the context when the pass began
    bool cursorOk = true;

    bool IsTemporaryResult() const {
        return result == SHARE_CAPTURE_NO_DATA || result == SHARE_CAPTURE_DRAGGING;
    }
};

/// The engine's tick, ms; differences are taken modulo 2^32.
unsigned ShareTickNow();

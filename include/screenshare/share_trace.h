// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

/// What the library says about its work, line by line. It is silent until it is asked.
///
/// There are two doors. A client sets a threshold and a receiver with the functions below. Who cannot change
/// the client sets the environment variable SCREENSHARE_TRACE to `error`, `warning`, `info`, `debug` or
/// `detail` (anything else counts as not set): it is read once, when the library first looks for it, and
/// lines up to that level go to standard error. Each door has its own threshold, and neither opens the other.
///
/// Lines:    "[[ScreenShare],[Core]] INFO: what happened". ERROR and WARNING lines end with the place in the
///           source, such as "[src/share_capture_engine_impl:123]". Errors that could come with every picture
///           are thinned out to the first and then each 100th, some to each 10th, and have another form:
///           "[UTIL] ERROR: what happened[ScreenShare],[Core]" with the place behind it. No line is longer
///           than 1023 bytes (what is longer is cut) or ends with a line break.
/// Threads:  each function may be called from any thread, and none throws.
/// Fork:     a forked process keeps threshold and receiver, and waits for none of the threads left behind.

/// Levels of lines. A line is written when its level is at most the threshold.
enum SHARE_TRACE_LEVEL : int {
    SHARE_TRACE_LEVEL_NONE = -1,   ///< As a threshold: silent. The default; no line has it.
    SHARE_TRACE_LEVEL_ERROR = 0,   ///< Something failed that should not.
    SHARE_TRACE_LEVEL_WARNING = 1, ///< The library goes on differently than wanted.
    SHARE_TRACE_LEVEL_INFO = 2,    ///< Calls, changes of state, settings.
    SHARE_TRACE_LEVEL_DEBUG = 3,   ///< Decisions inside.
    SHARE_TRACE_LEVEL_DETAIL = 4,  ///< Also what happens with every picture.
};

extern "C" {

/// Takes a line. `tag` is "[ScreenShare],[Core]", or null for the thinned-out form and failed checks. `text`
/// has `length` bytes and a terminator; both texts may be read during the call only.
///
/// Threads:  called on the thread that has something to say, the library's or the client's, also on several
///           at once. Returns soon: a capture may wait for it.
/// May do:   call the functions of this header, and nothing else of the library: it traces in the midst of
///           its work, with locks of its own held.
/// Errors:   should not throw; what it throws is dropped.
typedef void (*ShareTraceReceiver)(void* context, int level, const char* tag, const char* text, int length);

/// Lines up to this SHARE_TRACE_LEVEL go to the receiver. Any number will do: below 0 none, above 4 all.
SCREENSHARE_API void ShareSetTraceThreshold(int threshold);

/// What was set last, or SHARE_TRACE_LEVEL_NONE.
SCREENSHARE_API int ShareGetTraceThreshold();

/// Puts a receiver in place of the one before; null for none. `context` is handed back with every line and
/// stays the client's. When the call has returned, no thread is inside a receiver of before, nor will one
/// call it again, so whatever it uses may go. The caller holds no lock that an old receiver wants. From
/// inside a receiver the call doesn't wait: calls of the old receiver that are under way may outlast it.
SCREENSHARE_API void ShareSetTraceReceiver(ShareTraceReceiver receiver, void* context);

} // extern "C"

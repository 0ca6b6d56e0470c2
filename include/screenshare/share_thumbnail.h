// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

/// Pixels of a thumbnail, in points of the window that it shows. All four bytes are 0 where there is nothing
/// to show: outside of its shape, and in a window that hasn't painted yet or that its owner lets nobody see.
/// Lifetime: `data` belongs to the library and holds for the one call that hands it over; copy what you keep.
struct ImageData {
    SHARE_FRAME_FORMAT format; ///< SHARE_FRAME_FORMAT_RGBA, or 0 for an empty one.
    int width;
    int height;
    int lineBytes; ///< width * 4
    unsigned char* data;
};

/// Takes thumbnails in.
///
/// Threads:  called on the library's thumbnail thread, one call at a time. Inside a call everything may be
///           asked for and cancelled, for this callback and for others. CancelThumbnail, a new request and
///           ShareEngineUninit from another thread wait for a call under way: keep it short, and hold no lock
///           around them that a call wants.
/// Lifetime: neither owned nor counted; CancelThumbnail it before it is destroyed. Once that has returned
///           there is no further call, so a callback may also cancel and destroy itself inside one.
/// Order:    one request for each callback; a new one replaces it. Callbacks are served in the order of their
///           addresses. A cancelled request tells nothing any more, no last item either.
class ThumbnailCallback {
public:
    /// `failed`: there is no picture, the image is all zeros. `last`: the last item of the request. False
    /// ends the request.
    virtual bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) = 0;
    virtual bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) = 0;
    /// -1: thumbnails can't be made at all. The result is not looked at.
    virtual bool onThumbnailError(int code) = 0;

protected:
    ~ThumbnailCallback() = default;
};

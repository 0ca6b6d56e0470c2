// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

/// Pixels of a thumbnail, in points of the window that it shows.
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
/// Threads:  called on the library's thumbnail thread, one call at a time.
/// Lifetime: neither owned nor counted; CancelThumbnail it before it is destroyed.
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

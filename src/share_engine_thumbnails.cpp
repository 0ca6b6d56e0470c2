// SPDX-License-Identifier: Apache-2.0
#include <screenshare/share_engine.h>

/// The exported functions of thumbnails. Nobody makes thumbnails yet, so no request is taken.

int EnumAppThumbnail(const unsigned*, int, ThumbnailCallback*) {
    return SHARE_RESULT_FAILED;
}

int EnumWindowThumbnail(const unsigned*, int, ThumbnailCallback*) {
    return SHARE_RESULT_FAILED;
}

void CancelThumbnail(ThumbnailCallback*) {}

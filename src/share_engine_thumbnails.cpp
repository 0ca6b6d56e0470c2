// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include <screenshare/share_engine.h>

/// The exported functions of thumbnails.

int EnumAppThumbnail(const unsigned* pids, int count, ThumbnailCallback* callback) {
    return CThumbnailCaptureEngine::get().requestForApps(pids, count, callback) ? SHARE_RESULT_OK
                                                                                : SHARE_RESULT_FAILED;
}

int EnumWindowThumbnail(const unsigned* windows, int count, ThumbnailCallback* callback) {
    return CThumbnailCaptureEngine::get().requestForWindows(windows, count, callback) ? SHARE_RESULT_OK
                                                                                      : SHARE_RESULT_FAILED;
}

void CancelThumbnail(ThumbnailCallback* callback) {
    CThumbnailCaptureEngine::get().cancel(callback);
}

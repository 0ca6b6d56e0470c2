// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capture_engine.h>
#include <screenshare/share_capturer.h>
#include <screenshare/share_capturer_base.h>
#include <screenshare/share_capturer_types.h>
#include <screenshare/share_convert.h>
#include <screenshare/share_frame.h>
#include <screenshare/share_graphic_util.h>
#include <screenshare/share_pointing.h>
#include <screenshare/share_source.h>
#include <screenshare/share_source_enumerator.h>
#include <screenshare/share_thumbnail.h>
#include <screenshare/share_trace.h>
#include <screenshare/share_types.h>
#include <screenshare/share_window_info.h>

#include <memory>

/// The exported functions. Each may be called from any thread, and none throws.

extern "C" {

/// Holds the library, counted. Every engine holds it, too; only the first holder in and the last one out are
/// traced.
SCREENSHARE_API void UseShareLib();
SCREENSHARE_API void ReleaseShareLib();

/// Builds an engine; null for a number that is no kind. End it with DestroyShareCaptureEngine.
SCREENSHARE_API IShareCaptureEngine* CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE type);

/// Stops and deletes an engine. -2 for null; -1 where Stop is refused, and the engine goes on living.
SCREENSHARE_API int DestroyShareCaptureEngine(IShareCaptureEngine* engine);

/// Sets what holds for the whole process. Always 0; a bad argument is traced and changes nothing. `value`
/// points to four bytes whatever `value_size` says.
SCREENSHARE_API int ShareConfig(SHARE_CONFIG selector, const void* value, unsigned value_size);

/// The client's hold on the library, UseShareLib and ReleaseShareLib. Any ShareEngineUninit, not only the
/// last one, ends the making of thumbnails for good. Always 0.
SCREENSHARE_API int ShareEngineInit();
SCREENSHARE_API int ShareEngineUninit();

/// Builds a capturer on its own, a dummy when the debug file says so; null for a number that is no kind. End
/// it with DestroyShareCapture, which gives -2 for null. The capturer keeps a share of the context.
SCREENSHARE_API IShareCapturer* CreateShareCapture(SHARE_CAPTURER_TYPE type,
                                                   std::shared_ptr<ShareCapturerContext>& context);
SCREENSHARE_API int DestroyShareCapture(IShareCapturer* capturer);

/// Builds a list of what can be shared, empty until its Refresh; null for a number that is no kind. With
/// `bWatchChanges` it follows the desktop and calls its sinks. End it with DestroyShareSourceEnumerator, -2
/// for null, and not from inside one of its events.
SCREENSHARE_API IShareSourceEnumerator* CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE type,
                                                                    bool bWatchChanges);
SCREENSHARE_API int DestroyShareSourceEnumerator(IShareSourceEnumerator* enumerator);

/// Builds a pointing object; null for a number that is no kind. End it with DestroySharePointing, which gives
/// 0 for null, too.
SCREENSHARE_API ISharePointing* CreateSharePointing(SHARE_POINTING_TYPE type, unsigned baseDisplay);
SCREENSHARE_API int DestroySharePointing(ISharePointing* pointing);

/// Turns dumps of frames and pointer images on or off for the whole process, see docs/configuration.md.
/// Always 0.
SCREENSHARE_API int EnableScreenShareDump(bool bEnableScreenShareDump);

/// Accepted and without effect. Always 0.
SCREENSHARE_API int EnableChangeAeroMode(bool bEnableChangeAeroMode);

/// Always -5: nothing here encodes.
SCREENSHARE_API int EnableScreenShareHWEncode();

/// Ask for pictures of applications or windows; they come to the callback, one by one, on a thread of the
/// library. Without ids all applications are meant. 0 when the request was taken, -1 when not.
SCREENSHARE_API int EnumAppThumbnail(const unsigned* pids, int count, ThumbnailCallback* callback);
SCREENSHARE_API int EnumWindowThumbnail(const unsigned* windows, int count, ThumbnailCallback* callback);
SCREENSHARE_API void CancelThumbnail(ThumbnailCallback* callback);

/// Calls back for each window, front first, on the calling thread. -2 for a null callback, else 0.
/// ShareGetWindowInfo (share_window_info.h) tells more of each.
SCREENSHARE_API int TvlEnumWindows(ITvlEnumWindowsCallback* callback, unsigned mode);

} // extern "C"

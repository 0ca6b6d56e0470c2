// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capture_engine.h>
#include <screenshare/share_capturer.h>
#include <screenshare/share_capturer_base.h>
#include <screenshare/share_capturer_types.h>
#include <screenshare/share_frame.h>
#include <screenshare/share_pointing.h>
#include <screenshare/share_source.h>
#include <screenshare/share_trace.h>
#include <screenshare/share_types.h>

/// The exported functions. Each may be called from any thread, and none throws.

extern "C" {

/// Holds the library, counted. Every engine holds it, too; only the first holder in and the last one out are
/// traced.
SCREENSHARE_API void UseShareLib();
SCREENSHARE_API void ReleaseShareLib();

/// Builds an engine; null for a number that is no kind. End it with DestroyShareCaptureEngine.
SCREENSHARE_API IShareCaptureEngine* CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE type);

/// Stops and deletes an engine. -2 for null; -1 from inside a callback of that engine, which goes on living.
SCREENSHARE_API int DestroyShareCaptureEngine(IShareCaptureEngine* engine);

/// Sets what holds for the whole process. Always 0; a bad argument is traced and changes nothing. `value`
/// points to four bytes whatever `value_size` says.
SCREENSHARE_API int ShareConfig(SHARE_CONFIG selector, const void* value, unsigned value_size);

} // extern "C"

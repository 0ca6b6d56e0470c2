// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

/// A frame's picture as video encoders take it.
///
/// Form:     8 bits a sample, BT.601, limited range (luma 16 to 235, chroma 16 to 240). Chroma is the mean of
///           each block of two by two pixels, seated in its middle. Alpha is dropped: what shines through
///           comes out as on black.
/// Shapes:   `width` and `height` are those of the frame, in pixels; the caller says them because its planes
///           are made for them, and a frame of another size is refused. The luma plane has `height` rows of
///           `width` bytes. Chroma has (height + 1) / 2 rows of (width + 1) / 2 samples: odd sizes round up.
/// Strides:  bytes from one row to the next, at least those of a row. The last row of a plane needs no more
///           than its samples. What lies between two rows is left alone.
/// Frames:   every format but SHARE_FRAME_FORMAT_NONE, lines as long as GetFrameLineBytes says. A client's
///           own kind of frame answers for its figures.
/// Threads:  any; a frame belongs to one thread at a time, so inside OnCaptureData, or on a copy of it.
/// Memory:   planes are the caller's, and share no byte with each other or with the frame. Nothing is kept.
/// Errors:   0; or -2, and nothing is written: null, a size that isn't the frame's or is below 1, a stride
///           that is too short, a frame with no format, or with less memory than its geometry needs. -1 when
///           a client's own frame throws. Neither throws.
extern "C" {

/// Three planes. A row of `u` and of `v` has (width + 1) / 2 bytes.
SCREENSHARE_API int ShareFrameToI420(IShareFrame* frame, unsigned char* y, int yStride, unsigned char* u,
                                     int uStride, unsigned char* v, int vStride, int width, int height);

/// Two planes. A row of `uv` has (width + 1) / 2 pairs of bytes, u before v.
SCREENSHARE_API int ShareFrameToNV12(IShareFrame* frame, unsigned char* y, int yStride, unsigned char* uv,
                                     int uvStride, int width, int height);

} // extern "C"

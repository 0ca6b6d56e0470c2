// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/cg_image.h"
#include "platform/core_types.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <span>

/// Images of chosen windows, put together from the windows' own pictures: what lies in front of them, behind
/// them or beside them and wasn't chosen is not there.
///
/// Threads: any; a call may wait for the desktop, DEFAULT_IMAGE_DEADLINE at most.
/// Errors:  null for an image; nothing throws.
namespace platform {

enum CGWindowImageOption : unsigned {
    kCGWindowImageDefault = 0,             ///< With what is drawn around the frames, such as shadows.
    kCGWindowImageBoundsIgnoreFraming = 1, ///< The frames only.
};

/// What chosen windows show within a rectangle, of one moment: still the single pictures, so that drawing it
/// is the only time that pixels are moved. Immutable; pins the pictures.
struct CGWindowImage;
using CGWindowImageRef = std::shared_ptr<const CGWindowImage>;

/// An image of windows to be had again without holding on to its pictures meanwhile: the window server may
/// write over them, or let them go.
/// Threads: one at a time.
class CGWindowImageMemo {
public:
    CGWindowImageMemo();
    ~CGWindowImageMemo();
    CGWindowImageMemo(const CGWindowImageMemo&) = delete;
    CGWindowImageMemo& operator=(const CGWindowImageMemo&) = delete;

    void Keep(const CGWindowImage* image) noexcept;
    /// The image; null once the window server's moment is another than when it was taken, when it had none,
    /// and when memory runs out.
    CGWindowImageRef Recall() const noexcept;

private:
    struct Kept;
    std::unique_ptr<Kept> m_kept; // null for none
};

/// `rect` is in global points. Windows that don't exist any more are left out. `keepsOut` tells whether the
/// asker keeps anything out, listed or not: a window server that can only give whole displays then gives
/// nothing. Null for no window, for a rectangle without an area, and when the window server gives no picture.
CGWindowImageRef CGWindowListTakeImage(const CGRect& rect, std::span<const CGWindowID> windows,
                                       unsigned options, bool keepsOut) noexcept;

/// Pixels at the scale of the finest picture in it; 0 for null.
int CGWindowImageGetWidth(const CGWindowImage* image) noexcept;
int CGWindowImageGetHeight(const CGWindowImage* image) noexcept;

/// Where the pointer was when it was taken, in global points, if the window server has told; nothing for
/// null.
std::optional<CGPoint> CGWindowImageGetPointer(const CGWindowImage* image) noexcept;

/// The window server's moment when it was taken: while CGWindowServerGetMoment gives the same, it would be
/// taken again as it is (WindowServer::GetMoment). 0 when that can't be told, and for null.
std::uint64_t CGWindowImageGetMoment(const CGWindowImage* image) noexcept;
/// Costs next to nothing and never waits. 0 when only asking tells.
std::uint64_t CGWindowServerGetMoment() noexcept;

/// Whether drawing it leaves nothing of what was there before. False for null.
bool CGWindowImageIsOpaque(const CGWindowImage* image) noexcept;

/// Draws it into `rect` as one image would be drawn, and nothing outside of it. What the windows don't cover
/// stays. The context's clip is as before afterwards. False when memory ran out and something may be missing.
bool CGContextDrawWindowImage(CGContext* context, const CGRect& rect, const CGWindowImage* image) noexcept;

/// Whether drawing it into `rect` leaves nothing of what is where the context can be painted on now. False
/// for null.
bool CGContextIsCovered(const CGContext* context, const CGRect& rect, const CGWindowImage* image) noexcept;

/// In one block, transparent where nothing is. A window that fills it is not copied. Null for null and when
/// memory runs out.
CGImageRef CGWindowImageCreateImage(const CGWindowImage* image) noexcept;

/// Both in one, for an asker who keeps things out.
CGImageRef CGWindowListCreateImageFromArray(const CGRect& rect, std::span<const CGWindowID> windows,
                                            unsigned options) noexcept;

} // namespace platform

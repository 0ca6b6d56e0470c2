// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/cg_image.h"
#include "platform/core_graphics_images.h"
#include "platform/core_types.h"

#include <screenshare/share_types.h>

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

class CShareFrame;
class IShareFrame;
class ShareCapturerContext;
class ShareCompositionNote;

namespace platform {
class PixelRegion;
} // namespace platform

/// Makes one finished picture from the window server on demand: of the windows that are shared and of no
/// other, scaled, centred, on its background, with the pointer on top.
///
/// Frame:    RGBA without alpha, drawn straight into its memory. Whatever a pass doesn't draw on is painted
///           over first, so that a frame that is used again shows nothing of before. A frame that has kept a
///           note on what it shows (src/share_frame_note.h) is drawn only where it is to show something else,
///           with the same pixels in the end; where that isn't known for certain, all of it is drawn.
/// Lifetime: keeps a bitmap context on the memory of the frame that it drew into last, and touches that only
///           in a pass that is given the same memory.
/// Threads:  one at a time.
/// Units:    the desktop in global points, bitmaps in pixels.
/// Errors:   SHARE_CAPTURE_RESULT codes. May throw std::bad_alloc.
class CShareCGSCapturer {
public:
    /// Without a context the share counts as one of the desktop, with every window shared.
    explicit CShareCGSCapturer(const std::shared_ptr<ShareCapturerContext>& context);
    virtual ~CShareCGSCapturer();
    CShareCGSCapturer(const CShareCGSCapturer&) = delete;
    CShareCGSCapturer& operator=(const CShareCGSCapturer&) = delete;

    // The size of a frame and that of the picture in it. They differ only where a fixed size is set, in which
    // the picture keeps its ratio.
    static void calcScreenSize(unsigned display, TVLSize max, platform::CGRect& rect, TVLSize& bitmap,
                               TVLSize& capture);
    static void calcCaptureSize(TVLSize source, TVLSize max, TVLSize& bitmap, TVLSize& capture);

    /// 0 with the frame filled; anything else leaves it as it was. A share without windows is no failure: it
    /// gives its background.
    int capture(IShareFrame* frame, unsigned display, TVLSize bitmap, TVLSize capture);
    /// The same picture as the last one, in this frame. False, and the frame as it was, when the window
    /// server may have another by now. The caller answers for all else that it was made from.
    bool captureAgain(IShareFrame& frame);
    /// A new picture of the same windows at the same places. False, and the frame as it was, without one. The
    /// caller answers for it that a whole capture would choose these.
    bool captureSameWindows(IShareFrame& frame);

    /// Has the bitmap context lie on that memory, `length` bytes; there is none if that is too short.
    void initCapturerByData(unsigned char* data, unsigned long length, TVLSize size);

    /// What is shared of `rect`. -302 when no window is, -1 when there is no picture. `outRect` becomes what
    /// the image shows.
    int createShareImage(const platform::CGRect& rect, platform::CGWindowImageRef& image,
                         platform::CGRect& outRect);
    bool isDesktopSharing() const;
    /// Replaces `windows` by those on screen that are shared, front first. Always true.
    bool getCaptureWindows(std::vector<int>& windows);
    /// Null for no windows. `outRect` is what is wanted of an application or a window, and becomes what the
    /// image shows.
    platform::CGWindowImageRef createScreenShot(const unsigned* windows, unsigned long count,
                                                const platform::CGRect& rect, platform::CGRect& outRect);
    /// The box of what the windows have within `rect`.
    static platform::CGRect getAppRect(std::span<const platform::CGWindowID> windows,
                                       const platform::CGRect& rect);
    /// Null for no windows.
    static platform::CGImageRef captureRect(const unsigned* windows, unsigned long count,
                                            const platform::CGRect& rect, bool ignoreFraming);
    bool isWindowShared(unsigned window) const;
    /// Only for pictures that are cut to the shared windows.
    void setMaxSize(TVLSize size) { m_szMaxCapture = size; }

    /// Of the last pass: the pointer is in the picture, or need not be.
    bool PointerCaptured() const { return m_bPointerCaptured; }
    /// Of the last pass: the window server's moment of what was drawn, 0 when none is known
    /// (platform::CGWindowImageGetMoment).
    std::uint64_t DrawnMoment() const { return m_nDrawnMoment; }

private:
    /// What a pass has found out so far.
    struct Pass;

    bool IsWindowArea() const;
    void FitToWindows(Pass& pass);
    platform::CGRect PlaceOf(const Pass& pass) const;
    void FindPointer(Pass& pass);
    static std::unique_ptr<ShareCompositionNote> TakeNote(CShareFrame& frame);
    void PrepareFrame(IShareFrame& frame, const Pass& pass);
    void FindPlaces(Pass& pass);
    void PutInto(IShareFrame& frame, Pass& pass);
    void KeepPass(const Pass& pass);

    /// Makes the frame show what the pass has found.
    void Show(const Pass& pass, CShareFrame* frame, const ShareCompositionNote* before);
    bool Describe(const Pass& pass) noexcept;
    void Number();
    bool DrawChanges(const Pass& pass, const ShareCompositionNote& before);
    bool DrawPart(const Pass& pass, const platform::PixelRegion& part);
    bool DrawAll(const Pass& pass);
    void PaintBackground(const Pass& pass);
    bool DrawPointer(const Pass& pass);

    std::shared_ptr<ShareCapturerContext> m_shareCapturerContext;
    TVLSize m_sizeBmpContext{};
    TVLSize m_szMaxCapture{};
    unsigned m_nCapturedDisplayId;
    float m_fDisplayScale; // pixels per point
    platform::CGRect m_rectCapturedDisplay;
    const unsigned m_nBitmapInfo = platform::kCGImageAlphaNoneSkipLast;
    platform::CGContextRef m_bmpContext; // on m_pFrameData
    unsigned char* m_pFrameData = nullptr;
    platform::CGRect m_rectLastCapture;
    std::vector<unsigned> m_windows; // of the last picture
    /// Of this pass while it lasts, then any that can be written over.
    std::unique_ptr<ShareCompositionNote> m_note;
    std::unique_ptr<ShareCompositionNote> m_lastDescribed; // has a number
    std::unique_ptr<Pass> m_lastPass; // without its image; null where that can't be had again
    platform::CGWindowImageMemo m_lastImage;
    std::uint64_t m_nDrawnMoment = 0;
    bool m_bPointerCaptured = false;
};

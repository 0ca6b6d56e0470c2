// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/cg_image.h"
#include "platform/core_types.h"

#include <screenshare/share_types.h>

#include <optional>
#include <string>
#include <vector>

class IShareFrame;
class TVLRegion;

/// A cursor on its way into a bitmap context.
struct ShareCursorDrawing {
    platform::CGImageRef image; // the same object as long as the pixels are the same
    platform::CGRect rect;      // where all of it goes, in the space of the context
};

/// What the platform-bound classes ask the window server in one breath.
/// Units: global points. Threads: any; nothing is kept. Errors: nothing throws but for want of memory; a
/// window server that fails or is gone gives zeros, empty lists and the main display, which is 0 when there
/// is none.
class ShareUtilMac {
public:
    /// Cuts the origin toward zero, and adds the size to the origin that is already cut.
    static TVLRect CGRectToTVLRect(const platform::CGRect& rect);
    static platform::CGRect TVLRectToCGRect(const TVLRect& rect);
    /// Whether `cgRect` is cut to `rect`.
    static bool RectIsEqual(const TVLRect& rect, const platform::CGRect& cgRect);
    /// "{x=… y=… w=… h=…}"
    static std::string CGRectToString(const platform::CGRect& rect);

    /// Each channel of 0xRRGGBB from 0 to 1.
    static void GetRGBfromInt(int colour, float& red, float& green, float& blue);

    /// The windows on screen, front first; replaces `windows` and gives their number.
    static int GetOnScreenWindowList(std::vector<int>& windows);
    /// Whether a window of that level is part of the desktop itself.
    static bool need_skip_window(unsigned window, int level);
    /// The same, and true for a window whose level can't be told.
    static bool need_skip_window(unsigned window);

    /// The edge at the top of a display that is kept free for a menu bar; its height is 0 when there is none.
    static platform::CGRect GetMenuBarRect(unsigned display);
    /// The edge that is kept free for a dock, at the right, the left or the bottom; its height is 0 when
    /// there is none.
    static platform::CGRect GetDockBarRect(unsigned display);
    /// The same, and false when the display isn't known: whether there is a dock can't be told then.
    static bool FindDockBarRect(unsigned display, platform::CGRect& bar);

    // ---- Pixels, in share_util_mac_frame.cpp

    /// Paints what a region in frame coordinates covers of an RGBA or ARGB frame, or the whole frame without
    /// a region, in an opaque 0xRRGGBB. -2 for no frame, one without pixels or of another format; -1 for an
    /// empty region and for a frame with too little memory.
    static int FillFrame(IShareFrame* frame, int colour, const TVLRegion* region);

    /// How the cursor on screen is drawn with its hot spot at `position`, in pixels from the top left,
    /// `scale` pixels for each of its points. Nothing without a context and without a cursor; both are traced
    /// now and then.
    static std::optional<ShareCursorDrawing> FindCursor(const platform::CGContext* context,
                                                        platform::CGPoint position, float scale);

    /// Finds and draws it. False where there is nothing to be found.
    static bool CaptureCursorToCGContext(platform::CGContext* context, platform::CGPoint position,
                                         float scale);

    /// Writes a PNG file. False for null and when it can't be written, which is traced.
    static bool CGImageWriteToFile(const platform::CGImageRef& image, const char* path);

    /// "null" or "{w=… h=…}"
    static std::string CGImageToString(const platform::CGImageRef& image);
};

/// Where a display lies, in global points.
struct ShareDisplayPlace {
    unsigned id;
    TVLRect rect;
};

/// The online displays, the main one first.
std::vector<ShareDisplayPlace> ListDisplayPlaces();

/// The display that holds the largest piece of any one window of the application.
unsigned GetAppDisplayID(int pid);

/// The display that holds the largest piece of the window, the main one of a window that isn't there.
unsigned GetWindowDisplayID(unsigned window);

/// The same among those displays, of which the first one is the main one; nothing for a window that isn't
/// there.
std::optional<unsigned> FindWindowDisplay(unsigned window, const std::vector<ShareDisplayPlace>& displays);

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_pixels.h"

#include <chrono>
#include <cstdint>
#include <map>
#include <utility>
#include <vector>

namespace platform {

/// Makes the pictures of a simulated desktop and keeps each one as long as its pixels stay the same.
/// Threads: one at a time. Errors: throws what contents throw, std::bad_alloc and std::length_error.
class DesktopPainter {
public:
    /// One moment of a desktop that is to be painted.
    struct Moment {
        const SimulatedDesktop& desktop;
        const std::vector<SimulatedWindow>& stack; ///< The windows to paint, the front one first.
        std::chrono::nanoseconds now{0};
        std::chrono::nanoseconds elapsed{0}; ///< Since the desktop's beginning.
    };

    /// A window's own picture; null when there is nothing to show. The same object as long as its pixels are.
    PicturePtr WindowPicture(const Moment& moment, const SimulatedWindow& window, bool withShadow);

    /// A display as it is seen; the same object as long as nothing is different. The display is there.
    SimulatedPixelsPtr DisplayPixels(const Moment& moment, const SimulatedDisplay& display, bool withPointer);

    /// The same, without the pointer, as a picture.
    PicturePtr DisplayPicture(const Moment& moment, const SimulatedDisplay& display);

    /// Gives the pictures that it has instead of newer ones.
    void KeepOldPixels(bool keep) { m_keepOld = keep; }

    /// Leaves the last rectangle out of what made a picture different from the one before.
    void ForgetChanges(bool forget) { m_forgetChanges = forget; }

    /// Lets go of windows and displays that are gone.
    void Forget(const SimulatedDesktop& desktop);

private:
    /// What a picture was painted from. Equal sources give equal pixels.
    struct Source {
        SimulatedContent content;
        std::uint64_t frame = 0;
        int width = 0;
        int height = 0;
        PixelRect inner; // where the content lies; around it is shadow
        SimulatedPictureShape shape;

        bool SameAs(const Source& other) const;
    };

    /// The last picture that was made of pixels that change.
    struct Pictured {
        SimulatedPixelsPtr pixels;
        PicturePtr picture;
    };

    struct Painted {
        Source source;
        SimulatedPixelsPtr pixels;
        Pictured pictured; // no newer than the pixels
    };

    static Source SourceOf(const Moment& moment, const SimulatedWindow& window, bool withShadow);
    static SimulatedPixels Paint(const Source& source);
    PicturePtr PictureOf(const SimulatedPixelsPtr& pixels, const SimulatedPictureShape& shape,
                         std::chrono::nanoseconds now, Pictured& pictured) const;
    Painted* PaintedWindow(const Moment& moment, const SimulatedWindow& window, bool withShadow);
    SimulatedPixelsPtr Background(const Moment& moment, const SimulatedDisplay& display);
    void LayWindow(const Moment& moment, const SimulatedWindow& window, const SimulatedDisplay& display,
                   SimulatedPixels& target);
    static void LayPointer(const Moment& moment, const SimulatedDisplay& display, SimulatedPixels& target);

    std::map<std::pair<CGWindowID, bool>, Painted> m_windows; // by window and shadow
    std::map<CGDirectDisplayID, Painted> m_backgrounds;
    std::map<std::pair<CGDirectDisplayID, bool>, SimulatedPixelsPtr> m_displays; // by display and pointer
    std::map<CGDirectDisplayID, Pictured> m_displayPictures;
    bool m_keepOld = false;
    bool m_forgetChanges = false;
};

/// The frame with what is drawn around it.
CGRect WithShadow(const SimulatedWindow& window);

/// Whether they have a point in common.
bool Touch(const CGRect& one, const CGRect& other);

} // namespace platform

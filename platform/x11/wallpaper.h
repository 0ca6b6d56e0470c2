// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/pixel_formats.h"
#include "platform/x11/window_storage_fetch.h"

#include <chrono>
#include <cstddef>
#include <optional>

namespace platform::x11 {

/// The picture of the root's background. Nobody tells when its pixels change, so it is looked at again when
/// it is another one, and from time to time.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class Wallpaper {
public:
    static constexpr std::chrono::nanoseconds FRESH_TIME = std::chrono::seconds(5);

    /// Null when there is none. The same object as long as it looks the same. `fetched` is how many bytes
    /// were fetched for it.
    PicturePtr Take(const FetchTools& tools, const ServerPixels& pixels, xcb_pixmap_t pixmap,
                    const CGRect& frame, std::size_t& fetched);
    /// Until then the same is given; at once where there is none.
    std::chrono::nanoseconds FreshUntil() const;
    std::size_t KeptBytes() const { return m_picture != nullptr ? m_bytes : 0; }
    /// When it is to be dropped, since nobody has asked for it.
    std::optional<std::chrono::nanoseconds> NextDue() const;
    void DoDue(std::chrono::nanoseconds now);
    void Drop() { m_picture.reset(); }

private:
    PicturePtr Fetch(const FetchTools& tools, const ServerPixels& pixels, xcb_pixmap_t pixmap,
                     const CGRect& frame, std::size_t& fetched);

    xcb_pixmap_t m_pixmap = 0;
    CGSize m_root;
    PicturePtr m_picture;
    std::size_t m_bytes = 0;
    std::chrono::nanoseconds m_asked{0};
    std::chrono::nanoseconds m_fetched{0};
};

} // namespace platform::x11

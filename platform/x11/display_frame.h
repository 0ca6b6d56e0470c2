// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/window_server.h"
#include "platform/x11/pixel_formats.h"
#include "platform/x11/shared_pixels.h"
#include "platform/x11/sheets.h"
#include "platform/x11/x11_connection.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

namespace platform::x11 {

/// Which stacks a picture may show, see Picture.
struct ShownStacks {
    std::uint64_t before = 0;
    std::uint64_t after = 0;

    bool operator==(const ShownStacks&) const = default;
};

/// What a display looks like: the last picture of it, which is one for all who look, and what of that is out
/// of date.
/// Threads: the X thread.
/// Errors:  those of X11Connection; what was out of date then still is.
class DisplayFrame {
public:
    /// `place` in the root, not empty; `bounds` the display's, of which it is all or a part.
    DisplayFrame(X11Connection& connection, SharedPixelsPool& pool, const PixelRect& place,
                 const CGRect& bounds);

    const PixelRect& Place() const { return m_place; }
    const CGRect& Bounds() const { return m_bounds; }
    PixelRect Whole() const { return {0, 0, m_width, m_height}; }
    /// What of a region of the root lies here, in pixels of the picture.
    PixelRegion PartOf(const PixelRegion& ofRoot) const;

    void AddStale(const PixelRegion& region) { m_sheets.AddStale(region); }
    bool IsStale() const { return m_sheets.Newest() == nullptr || !m_sheets.Newest()->behind.IsEmpty(); }

    /// Asks for the rows that are out of date. False when there is no memory, or the root's pixels are of a
    /// kind that can't be given out.
    bool Ask();
    /// Takes in what was asked for. False when the server has refused: the root is smaller.
    bool Finish();
    /// Tells of when the picture is.
    void Stamp(std::chrono::nanoseconds time, const ShownStacks& stacks);
    const ShownStacks& Stacks() const { return m_stacks; }

    /// The picture, without changes. After the first Finish.
    Picture Show() const;

    /// Lets go of memory that isn't needed for a picture that was made before.
    void Drop(std::chrono::nanoseconds before);

private:
    struct Band {
        int top = 0;
        int bottom = 0;
    };
    struct Fetch {
        std::vector<Band> bands;
        std::vector<RowsRead> reads;
        Sheets::Sheet* target = nullptr;
        std::shared_ptr<SharedPixels> packed; // where pixels of two bytes wait to be unpacked
    };

    static std::vector<Band> BandsOf(const PixelRegion& region);

    X11Connection& m_connection;
    SharedPixelsPool& m_pool;
    const PixelRect m_place;
    const CGRect m_bounds;
    const int m_width;
    const int m_height;
    const std::optional<ServerPixels> m_server;
    Sheets m_sheets;
    Fetch m_fetch; // on its way
    std::chrono::nanoseconds m_time{0};
    ShownStacks m_stacks;
};

} // namespace platform::x11

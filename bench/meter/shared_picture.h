// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/shm.h>
#include <xcb/xcb.h>

#include <cstddef>
#include <cstdint>

/// Memory that an X server and we share, for pixels of 32 bits. Throws std::runtime_error when it can't be
/// had. Lifetime: the connection outlives it.
class SharedPicture {
public:
    SharedPicture(xcb_connection_t* connection, int width, int height);
    ~SharedPicture();
    SharedPicture(const SharedPicture&) = delete;
    SharedPicture& operator=(const SharedPicture&) = delete;

    int Width() const { return m_width; }
    int Height() const { return m_height; }
    std::uint32_t* Pixels() const { return m_pixels; }

    /// Sends the pixels to the drawable's (x, y).
    void Put(xcb_drawable_t drawable, xcb_gcontext_t context, int x, int y) const;
    /// The drawable's top left, with nothing done to it: what every way of taking pictures pays at least.
    /// Waits for it; false when it fails.
    bool Fetch(xcb_drawable_t drawable) const { return FetchPart(drawable, 0, 0, m_width, m_height); }
    /// The same of a part, whose rows follow each other without gaps.
    bool FetchPart(xcb_drawable_t drawable, int x, int y, int width, int height) const;

private:
    xcb_connection_t* const m_connection;
    const int m_width;
    const int m_height;
    const std::size_t m_size;
    const xcb_shm_seg_t m_segment;
    std::uint32_t* m_pixels = nullptr;
};

/// Squares of colours that look random, others for each seed: no two pictures have a square in common.
void PaintSquares(const SharedPicture& picture, std::uint32_t seed);
/// What PaintSquares paints at a place: 0xRRGGBB.
std::uint32_t ColourOfSquares(int x, int y, std::uint32_t seed);

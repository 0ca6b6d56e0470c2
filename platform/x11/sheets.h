// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/x11/shared_pixels.h"

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>

namespace platform::x11 {

/// Pictures of one thing, of which the newest is shown. Whoever looks at it keeps it as it is, so while he
/// does an older one is brought up to date in its place; each knows how far it is behind.
/// Threads: the X thread; shares in a picture may be dropped anywhere.
class Sheets {
public:
    struct Sheet {
        std::uint8_t* Bytes() const { return pixels->Bytes(); }

        std::shared_ptr<const void> share;
        SharedPixels* pixels = nullptr; // as long as the share
        PixelRegion behind;             ///< What of it is out of date.
    };

    /// Of `width` times `height` pixels of 4 bytes.
    Sheets(SharedPixelsPool& pool, int width, int height);
    Sheets(const Sheets&) = delete;
    Sheets& operator=(const Sheets&) = delete;

    /// The thing has changed there.
    void AddStale(const PixelRegion& region);

    /// One that nobody else looks at, to be written to; the newest if it may be. Null without memory.
    Sheet* Choose();
    /// It has been brought up to date.
    void SetNewest(Sheet* sheet);
    /// Null before the first.
    const Sheet* Newest() const { return m_newest; }

    /// Lets go of all but the newest.
    void DropOthers();

private:
    static constexpr std::size_t MOST = 3;

    SharedPixelsPool& m_pool;
    const PixelRect m_whole;
    std::list<Sheet> m_sheets;
    const Sheet* m_newest = nullptr;
};

} // namespace platform::x11

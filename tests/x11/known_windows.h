// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_thumbnail.h>

#include <gtest/gtest.h>
#include <sys/types.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

/// Windows whose pixels a test knows, and thumbnails that are kept to be looked at.

/// A window of one colour with a corner of another one, so that it tells which way up it is. Neither colour
/// has two channels alike, and together they have every bit of each.
struct KnownWindow {
    pid_t owner = 0;
    std::string name;
    unsigned id = 0;
    TVLRect place{};
    std::uint32_t colour = 0;

    int Width() const { return place.right - place.left; }
    int Height() const { return place.bottom - place.top; }
    std::uint32_t Mark() const { return ~colour & 0xFFFFFFU; }
    std::uint32_t PixelAt(int x, int y) const {
        return x < Width() / 3 && y < Height() / 4 ? Mark() : colour;
    }
};

/// What a callback was told, with a copy of the pixels as 0xRRGGBB.
struct ThumbnailTold {
    bool isApp = false;
    unsigned id = 0;
    bool failed = false;
    bool last = false;
    int width = 0;
    int height = 0;
    std::vector<std::uint32_t> pixels;
};

/// Keeps what it is told. Threads: any.
class CPictureLog final : public ThumbnailCallback {
public:
    CPictureLog() = default;
    ~CPictureLog() { CancelThumbnail(this); } // waits for the call that told the last one
    CPictureLog(const CPictureLog&) = delete;
    CPictureLog& operator=(const CPictureLog&) = delete;

    /// Called from inside each call.
    std::function<void(std::size_t count)> during;

    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override {
        return Take({true, pid, failed, last, 0, 0, {}}, image);
    }
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override {
        return Take({false, window, failed, last, 0, 0, {}}, image);
    }
    bool onThumbnailError(int) override {
        ADD_FAILURE() << "no thumbnails at all";
        return true;
    }

    bool HasEnded() const { return m_lasts.Reaches(1); }
    std::vector<ThumbnailTold> Calls() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_calls;
    }

private:
    bool Take(ThumbnailTold told, const ImageData& image) {
        told.width = image.width;
        told.height = image.height;
        for (int y = 0; y < image.height; ++y) {
            const unsigned char* at = image.data + static_cast<std::ptrdiff_t>(y) * image.lineBytes;
            for (int x = 0; x < image.width; ++x, at += 4) {
                told.pixels.push_back(static_cast<std::uint32_t>(at[0]) << 16 |
                                      static_cast<std::uint32_t>(at[1]) << 8 | at[2]);
            }
        }
        const bool last = told.last;
        std::size_t count = 0;
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_calls.push_back(std::move(told));
            count = m_calls.size();
        }
        if (during)
            during(count);
        if (last)
            m_lasts.Add();
        return true;
    }

    mutable std::mutex m_mutex;
    std::vector<ThumbnailTold> m_calls; // guarded by m_mutex
    CTally m_lasts;
};

/// As x11_client takes colours.
inline std::string HexOf(std::uint32_t rgb) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%06x", static_cast<unsigned>(rgb));
    return text.data();
}

/// Every pixel of it.
inline testing::AssertionResult ShowsWindow(const ThumbnailTold& told, const KnownWindow& window) {
    if (told.failed)
        return testing::AssertionFailure() << window.name << " has failed";
    if (told.width != window.Width() || told.height != window.Height())
        return testing::AssertionFailure() << window.name << " is " << told.width << "x" << told.height
                                           << " and not " << window.Width() << "x" << window.Height();
    std::size_t at = 0;
    for (int y = 0; y < told.height; ++y) {
        for (int x = 0; x < told.width; ++x, ++at) {
            if (told.pixels[at] != window.PixelAt(x, y))
                return testing::AssertionFailure()
                       << window.name << " shows " << HexOf(told.pixels[at]) << " and not "
                       << HexOf(window.PixelAt(x, y)) << " at " << x << "," << y;
        }
    }
    return testing::AssertionSuccess();
}

/// The items in the order asked for, and which is the last one.
inline void ExpectThumbnails(const std::vector<ThumbnailTold>& calls, const std::vector<unsigned>& asked,
                             bool areApps) {
    ASSERT_EQ(calls.size(), asked.size());
    for (std::size_t i = 0; i < calls.size(); ++i) {
        EXPECT_EQ(calls[i].id, asked[i]) << i;
        EXPECT_EQ(calls[i].isApp, areApps) << i;
        EXPECT_EQ(calls[i].last, i + 1 == calls.size()) << i;
    }
}

/// Asks for them, and comes back when all have come.
inline std::vector<ThumbnailTold> ThumbnailsOfWindows(const std::vector<unsigned>& windows) {
    CPictureLog log;
    EXPECT_EQ(EnumWindowThumbnail(windows.data(), static_cast<int>(windows.size()), &log), 0);
    EXPECT_TRUE(log.HasEnded());
    return log.Calls();
}

inline std::vector<ThumbnailTold> ThumbnailsOfApps(const std::vector<unsigned>& pids) {
    CPictureLog log;
    EXPECT_EQ(EnumAppThumbnail(pids.data(), static_cast<int>(pids.size()), &log), 0);
    EXPECT_TRUE(log.HasEnded());
    return log.Calls();
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_rows.h"

#include <libyuv.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <bit>
#include <cstring>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace platform {

namespace {

using Piece = std::array<std::uint8_t, PIXELS_PER_PIECE * 4>;

/// Where the components of a 4-byte pixel lie.
struct Order {
    std::size_t red, green, blue, alpha;

    bool operator==(const Order&) const = default;
};

constexpr Order RGBA_ORDER{0, 1, 2, 3};

Order OrderOf(CGPixelLayout layout) {
    switch (layout) {
        case CGPixelLayout::ARGB:
            return {1, 2, 3, 0};
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return {2, 1, 0, 3};
        default:
            return RGBA_ORDER;
    }
}

/// The layout with alpha that has the same order.
CGPixelLayout WithAlpha(CGPixelLayout layout) {
    switch (layout) {
        case CGPixelLayout::ARGB:
            return CGPixelLayout::ARGB;
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return CGPixelLayout::BGRA;
        default:
            return CGPixelLayout::RGBA;
    }
}

/// Calls `work(offset, count)` for one piece of a row after the other.
template <class Work>
void ForEachPiece(std::size_t count, Work work) {
    for (std::size_t done = 0; done < count; done += PIXELS_PER_PIECE)
        work(done, std::min(count - done, PIXELS_PER_PIECE));
}

// ---- Loops, each with a Run that is compiled for any processor and once more for those with wider
// registers. They are written so that compilers work on many pixels at once.

std::atomic<bool> g_mayRunWide{true};

#if defined(__x86_64__)
bool IsWide() {
    return g_mayRunWide.load(std::memory_order_relaxed) && __builtin_cpu_supports("avx2");
}

template <class Loop, class... Arguments>
[[gnu::target("avx2")]] void RunWide(Arguments... arguments) {
    Loop::Run(arguments...);
}
#else
bool IsWide() {
    return false;
}

template <class Loop, class... Arguments>
void RunWide(Arguments... arguments) {
    Loop::Run(arguments...);
}
#endif

template <class Loop, class... Arguments>
void RunLoop(Arguments... arguments) {
    if (IsWide())
        RunWide<Loop>(arguments...);
    else
        Loop::Run(arguments...);
}

static_assert(std::endian::native == std::endian::little,
              "the first byte of a pixel is the lowest of its word");

[[gnu::always_inline]] inline std::uint32_t ReadPixel(const std::uint8_t* pixels, std::size_t index) {
    std::uint32_t pixel = 0;
    std::memcpy(&pixel, pixels + index * 4, 4);
    return pixel;
}

[[gnu::always_inline]] inline void WritePixel(std::uint8_t* pixels, std::size_t index, std::uint32_t pixel) {
    std::memcpy(pixels + index * 4, &pixel, 4);
}

/// Pixels that are worked on together, wherever they lie.
using SomePixels [[gnu::vector_size(32), gnu::aligned(1), gnu::may_alias]] = std::uint32_t;
constexpr std::size_t SOME = sizeof(SomePixels) / sizeof(std::uint32_t);

/// How the bytes of a pixel are put into another order, and those of several.
struct Same {
    static std::uint32_t Turned(std::uint32_t pixel) { return pixel; }
    [[gnu::always_inline]] static void Turn(SomePixels& /*pixels*/) {}
};
struct FirstAndThirdSwapped {
    static std::uint32_t Turned(std::uint32_t pixel) { return std::rotr(__builtin_bswap32(pixel), 8); }
    [[gnu::always_inline]] static void Turn(SomePixels& pixels) {
        const SomePixels halvesSwapped = (pixels >> 16U) | (pixels << 16U);
        pixels = (pixels & 0xff00ff00U) | (halvesSwapped & 0x00ff00ffU);
    }
};
struct Reversed {
    static std::uint32_t Turned(std::uint32_t pixel) { return __builtin_bswap32(pixel); }
    [[gnu::always_inline]] static void Turn(SomePixels& pixels) {
        const SomePixels halvesSwapped = (pixels >> 16U) | (pixels << 16U);
        pixels = ((halvesSwapped >> 8U) & 0x00ff00ffU) | ((halvesSwapped & 0x00ff00ffU) << 8U);
    }
};
struct LastToFront {
    static std::uint32_t Turned(std::uint32_t pixel) { return std::rotl(pixel, 8); }
    [[gnu::always_inline]] static void Turn(SomePixels& pixels) { pixels = (pixels << 8U) | (pixels >> 24U); }
};
struct FrontToLast {
    static std::uint32_t Turned(std::uint32_t pixel) { return std::rotr(pixel, 8); }
    [[gnu::always_inline]] static void Turn(SomePixels& pixels) { pixels = (pixels >> 8U) | (pixels << 24U); }
};

/// What a processor's cache has of memory at once.
constexpr std::size_t PIXELS_PER_LINE = 2 * SOME;
/// So far ahead of the writing it is fetched. What is nearer comes too late, what is farther is no better.
constexpr std::size_t BYTES_AHEAD = 1024;
constexpr std::size_t BYTES_AHEAD_PAST_CACHE = 2048;
/// What is larger doesn't stay in the part of the cache that a processor has to itself.
constexpr std::size_t BYTES_OF_LARGE_PICTURE = std::size_t{1} << 20U;
/// In shorter rows too much would be fetched beyond the end.
constexpr std::size_t PIXELS_OF_LONG_ROW = 512;

/// Processors guess from what is read what will be read next, but wait for each line that is written.
template <bool ForWriting>
[[gnu::always_inline]] inline void FetchAhead(const std::uint8_t* pixels, std::size_t distance) {
    // A number, since it may lie beyond the end.
    const auto ahead = reinterpret_cast<std::uintptr_t>(pixels) + distance;
    __builtin_prefetch(reinterpret_cast<const void*>(ahead), ForWriting ? 1 : 0);
}

/// Pixels on their way to a picture that is small enough for the cache.
struct ThroughCache {
    [[gnu::always_inline]] static void FetchNext(const std::uint8_t* /*source*/, const std::uint8_t* target) {
        FetchAhead<true>(target, BYTES_AHEAD);
    }
    [[gnu::always_inline]] static void Write(const SomePixels& pixels, std::uint8_t* target) {
        *reinterpret_cast<SomePixels*>(target) = pixels;
    }
};

/// Pixels on their way to a larger one. The target is where a vector of that size may begin.
struct PastCache {
    [[gnu::always_inline]] static void FetchNext(const std::uint8_t* source, const std::uint8_t* /*target*/) {
        FetchAhead<false>(source, BYTES_AHEAD_PAST_CACHE);
    }
    [[gnu::always_inline]] static void Write(const SomePixels& pixels, std::uint8_t* target) {
#if defined(__SSE2__)
        const auto lower = __builtin_shufflevector(pixels, pixels, 0, 1, 2, 3);
        const auto upper = __builtin_shufflevector(pixels, pixels, 4, 5, 6, 7);
        _mm_stream_si128(reinterpret_cast<__m128i*>(target), std::bit_cast<__m128i>(lower));
        _mm_stream_si128(reinterpret_cast<__m128i*>(target) + 1, std::bit_cast<__m128i>(upper));
#else
        *reinterpret_cast<SomePixels*>(target) = pixels;
#endif
    }
};

/// Other threads may see what was written past the cache later than what is written afterwards, unless it has
/// arrived by then.
void AwaitWritesPastCache() {
#if defined(__SSE2__)
    _mm_sfence();
#endif
}

template <class Order, class Way>
[[gnu::always_inline]] inline void TurnSome(const std::uint8_t* source, std::uint8_t* target,
                                            std::uint32_t set) {
    SomePixels pixels = *reinterpret_cast<const SomePixels*>(source);
    Order::Turn(pixels);
    pixels |= set;
    Way::Write(pixels, target);
}

/// One line is asked for at a time: of several at once, the next pixels have to wait for all.
template <class Order, class Way>
[[gnu::always_inline]] inline void TurnLine(const std::uint8_t* source, std::uint8_t* target,
                                            std::uint32_t set) {
    Way::FetchNext(source, target);
    TurnSome<Order, Way>(source, target, set);
    TurnSome<Order, Way>(source + SOME * 4, target + SOME * 4, set);
}

/// Reads and writes all memory once, which is what it takes its time for. `set` has the bits that are set in
/// each pixel. Compilers have to see where source and target are one.
template <class Order>
struct TurnLoop {
    [[gnu::always_inline]] static void Run(const std::uint8_t* source, std::uint8_t* target,
                                           std::size_t count, std::uint32_t set) {
        if (source == target) {
            for (std::size_t i = 0; i < count; ++i)
                TurnOne(target, target, i, set);
            return;
        }
        std::size_t done = 0;
        for (; count >= PIXELS_OF_LONG_ROW && done + PIXELS_PER_LINE <= count; done += PIXELS_PER_LINE)
            TurnLine<Order, ThroughCache>(source + done * 4, target + done * 4, set);
        for (; done < count; ++done)
            TurnOne(source, target, done, set);
    }

private:
    [[gnu::always_inline]] static void TurnOne(const std::uint8_t* source, std::uint8_t* target,
                                               std::size_t index, std::uint32_t set) {
        WritePixel(target, index, Order::Turned(ReadPixel(source, index)) | set);
    }
};

/// Writes whole lines of the cache straight to memory. Memory is read no slower afterwards, whereas a line
/// that is written by way of the cache has to be fetched first, and drives out another one.
template <class Order>
struct TurnPastCacheLoop {
    [[gnu::always_inline]] static void Run(const std::uint8_t* source, std::uint8_t* target,
                                           std::size_t count, std::uint32_t set) {
        const std::size_t before = std::min(PixelsToLine(target), count);
        TurnLoop<Order>::Run(source, target, before, set);
        std::size_t done = before;
        for (; done + PIXELS_PER_LINE <= count; done += PIXELS_PER_LINE)
            TurnLine<Order, PastCache>(source + done * 4, target + done * 4, set);
        TurnLoop<Order>::Run(source + done * 4, target + done * 4, count - done, set);
    }

private:
    static constexpr std::size_t BYTES_PER_LINE = PIXELS_PER_LINE * 4;

    /// Up to where a line begins; more than any row has if no pixel stands there.
    static std::size_t PixelsToLine(const std::uint8_t* target) {
        const auto address = reinterpret_cast<std::uintptr_t>(target);
        const std::size_t bytes = (0 - address) % BYTES_PER_LINE;
        return bytes % 4 == 0 ? bytes / 4 : SIZE_MAX;
    }
};

/// The bits of a byte within a pixel's word.
constexpr std::uint32_t BitsOf(std::size_t byte) {
    return std::uint32_t{0xff} << (byte * 8);
}

/// With `isOpaque`, the target's byte for alpha becomes 255.
template <template <class> class Loop>
void Reorder(Order from, const std::uint8_t* source, Order to, std::uint8_t* target, std::size_t count,
             bool isOpaque) {
    const std::uint32_t set = isOpaque ? BitsOf(to.alpha) : 0;
    if (from == to) {
        if (isOpaque)
            RunLoop<Loop<Same>>(source, target, count, set);
        else if (source != target)
            std::memcpy(target, source, count * 4);
    } else if (from.alpha == to.alpha) {
        RunLoop<Loop<FirstAndThirdSwapped>>(source, target, count, set);
    } else if (to.red == from.red + 1 && to.green == from.green + 1) {
        RunLoop<Loop<LastToFront>>(source, target, count, set);
    } else if (to.red + 1 == from.red && to.green + 1 == from.green) {
        RunLoop<Loop<FrontToLast>>(source, target, count, set);
    } else {
        RunLoop<Loop<Reversed>>(source, target, count, set);
    }
}

void MakeOpaque(std::uint8_t* pixels, Order order, std::size_t count) {
    Reorder<TurnLoop>(order, pixels, order, pixels, count, true);
}

/// libyuv tells the first component's byte by names of its own: what it calls RGB24 and ARGB share it.
void ExpandTo4Bytes(CGPixelLayout from, const std::uint8_t* source, std::uint8_t* rgba, std::size_t count) {
    if (from == CGPixelLayout::RGB)
        libyuv::RGB24ToARGB(source, 0, rgba, 0, static_cast<int>(count), 1);
    else
        libyuv::AR30ToABGR(source, 0, rgba, 0, static_cast<int>(count), 1);
}

void ContractTo3Bytes(const std::uint8_t* rgba, std::uint8_t* rgb, std::size_t count) {
    libyuv::ARGBToRGB24(rgba, 0, rgb, 0, static_cast<int>(count), 1);
}

/// `alpha` has the alpha of each byte's pixel.
struct BlendLoop {
    [[gnu::always_inline]] static void Run(const std::uint8_t* source, const std::uint8_t* alpha,
                                           std::uint8_t* target, std::size_t count) {
        for (std::size_t i = 0; i < count; ++i) {
            const auto product = static_cast<std::uint16_t>(target[i] * (255 - alpha[i]) + 128);
            const auto rest = static_cast<std::uint16_t>((product + (product >> 8)) >> 8);
            // A colour above its alpha is nothing that premultiplied pixels may hold, but they come from
            // outside.
            target[i] = static_cast<std::uint8_t>(std::min<std::uint16_t>(source[i] + rest, 255));
        }
    }
};

/// The bits that all pixels have, and those that any has.
struct Bits {
    std::uint32_t all = 0xffffffff;
    std::uint32_t any = 0;
};

struct BitsLoop {
    [[gnu::always_inline]] static void Run(const std::uint8_t* pixels, std::size_t count, Bits* bits) {
        Bits found;
        for (std::size_t i = 0; i < count; ++i) {
            const std::uint32_t pixel = ReadPixel(pixels, i);
            found.all &= pixel;
            found.any |= pixel;
        }
        *bits = found;
    }
};

/// Most of a window that has alpha is opaque, and most of the rest is empty: to lay the one over a row is to
/// copy it, and of the other nothing comes. A byte that isn't alpha in the target becomes 255 there.
void Blend4Bytes(const std::uint8_t* source, CGPixelLayout layout, std::uint8_t* target, std::size_t count) {
    const Order order = OrderOf(layout);
    std::array<std::uint8_t, 16> onlyAlpha{};
    for (std::size_t i = 0; i < onlyAlpha.size(); ++i)
        onlyAlpha[i] = static_cast<std::uint8_t>(i - i % 4 + order.alpha);
    ForEachPiece(count, [&](std::size_t offset, std::size_t pixels) {
        const std::uint8_t* const from = source + offset * 4;
        std::uint8_t* const to = target + offset * 4;
        Bits bits;
        RunLoop<BitsLoop>(from, pixels, &bits);
        if ((bits.all & BitsOf(order.alpha)) == BitsOf(order.alpha)) {
            std::memcpy(to, from, pixels * 4);
            return;
        }
        if (bits.any != 0) {
            Piece alpha;
            libyuv::ARGBShuffle(from, 0, alpha.data(), 0, onlyAlpha.data(), static_cast<int>(pixels), 1);
            RunLoop<BlendLoop>(static_cast<const std::uint8_t*>(from),
                               static_cast<const std::uint8_t*>(alpha.data()), to, pixels * 4);
        }
        if (!CGHasAlpha(layout))
            MakeOpaque(to, order, pixels);
    });
}

} // namespace

void AllowWideLoops(bool allowed) noexcept {
    g_mayRunWide = allowed;
}

void ConvertRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
                std::size_t count) noexcept {
    if (from == to && from == CGPixelLayout::RGB) {
        std::memcpy(target, source, count * 3);
    } else if (to == CGPixelLayout::RGB) {
        ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
            Piece rgba;
            ConvertRow(from, source + offset * 4, CGPixelLayout::RGBX, rgba.data(), pixels);
            ContractTo3Bytes(rgba.data(), target + offset * 3, pixels);
        });
    } else {
        const Order order = OrderOf(to);
        const bool isOpaque = !CGHasAlpha(from) || !CGHasAlpha(to);
        if (CGHasFourBytes(from)) {
            Reorder<TurnLoop>(OrderOf(from), source, order, target, count, isOpaque);
        } else {
            ExpandTo4Bytes(from, source, target, count);
            Reorder<TurnLoop>(RGBA_ORDER, target, order, target, count, isOpaque);
        }
    }
}

void BlendRow(const std::uint8_t* source, CGPixelLayout layout, std::uint8_t* target,
              std::size_t count) noexcept {
    if (layout != CGPixelLayout::RGB) {
        Blend4Bytes(source, layout, target, count);
        return;
    }
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece rgba;
        ExpandTo4Bytes(CGPixelLayout::RGB, target + offset * 3, rgba.data(), pixels);
        Blend4Bytes(source + offset * 4, CGPixelLayout::RGBX, rgba.data(), pixels);
        ContractTo3Bytes(rgba.data(), target + offset * 3, pixels);
    });
}

void DrawRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
             std::size_t count) noexcept {
    if (!CGHasAlpha(from)) {
        ConvertRow(from, source, to, target, count);
        return;
    }
    const Order sourceOrder = OrderOf(from);
    const Order targetOrder = OrderOf(to);
    if (sourceOrder == targetOrder) {
        BlendRow(source, to, target, count);
        return;
    }
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece reordered;
        Reorder<TurnLoop>(sourceOrder, source + offset * 4, targetOrder, reordered.data(), pixels, false);
        BlendRow(reordered.data(), to, target + offset * CGBytesPerPixel(to), pixels);
    });
}

void DrawRows(CGPixelLayout from, const PixelRowsIn& source, CGPixelLayout to, const PixelRowsOut& target,
              std::size_t count, std::size_t rows) noexcept {
    const bool isTurned = CGHasFourBytes(from) && !CGHasAlpha(from) && to != CGPixelLayout::RGB;
    if (!isTurned || count * rows * 4 < BYTES_OF_LARGE_PICTURE) {
        for (std::size_t y = 0; y < rows; ++y)
            DrawRow(from, source.Row(y), to, target.Row(y), count);
        return;
    }
    for (std::size_t y = 0; y < rows; ++y)
        Reorder<TurnPastCacheLoop>(OrderOf(from), source.Row(y), OrderOf(to), target.Row(y), count, true);
    AwaitWritesPastCache();
}

void DrawFadedRow(CGPixelLayout from, const std::uint8_t* source, std::uint8_t alpha, CGPixelLayout to,
                  std::uint8_t* target, std::size_t count) noexcept {
    if (alpha == 255) {
        DrawRow(from, source, to, target, count);
        return;
    }
    const CGPixelLayout between = WithAlpha(to);
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece faded;
        ConvertRow(from, source + offset * CGBytesPerPixel(from), between, faded.data(), pixels);
        for (std::size_t i = 0; i < pixels * 4; ++i)
            faded[i] = static_cast<std::uint8_t>((faded[i] * alpha + 127) / 255);
        BlendRow(faded.data(), to, target + offset * CGBytesPerPixel(to), pixels);
    });
}

} // namespace platform

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <vector>

/// The raw blend, step by step and without any thought for speed: what the fast one is held against.

/// The arguments of one raw blend, with buffers of its own.
struct RawBlend {
    std::vector<unsigned char> dst;
    TVLSize dstSize{};
    TVLRect dstRect{};
    unsigned dstLineBytes = 0;
    bool isDstPremultiplied = false;
    bool isDstReserved = false;
    std::vector<unsigned char> src;
    TVLSize srcSize{};
    TVLRect srcRect{};
    unsigned srcLineBytes = 0;
    bool isSrcPremultiplied = false;
    bool isAlphaLast = true;
};

/// How many pixels a model has met, by what it did with them.
struct RawBlendCounts {
    long long kept = 0;
    long long replaced = 0;
    long long mixed = 0;

    long long All() const { return kept + replaced + mixed; }
};

class RawBlendModel {
public:
    explicit RawBlendModel(RawBlendCounts& counts) : m_counts(counts) {}

    bool Run(RawBlend& call) {
        if (call.dstRect.right - call.dstRect.left != call.srcRect.right - call.srcRect.left)
            return false;
        if (call.dstRect.bottom - call.dstRect.top != call.srcRect.bottom - call.srcRect.top)
            return false;
        if (Clip(call.dstRect, call.dstSize)) {
            call.srcRect.right = call.srcRect.left + (call.dstRect.right - call.dstRect.left);
            call.srcRect.top = call.srcRect.bottom - (call.dstRect.bottom - call.dstRect.top);
        }
        if (Clip(call.srcRect, call.srcSize)) {
            call.dstRect.right = call.dstRect.left + (call.srcRect.right - call.srcRect.left);
            call.dstRect.bottom = call.dstRect.top + (call.srcRect.bottom - call.srcRect.top);
        }
        if (IsEmpty(call.dstRect) || IsEmpty(call.srcRect))
            return false;
        const unsigned srcBpp = call.srcLineBytes / static_cast<unsigned>(call.srcSize.cx);
        const unsigned dstBpp = call.dstLineBytes / static_cast<unsigned>(call.dstSize.cx);
        if (srcBpp != 4 || (dstBpp != 3 && dstBpp != 4))
            return false;
        for (int y = 0; y < call.srcRect.bottom - call.srcRect.top; ++y) {
            for (int x = 0; x < call.srcRect.right - call.srcRect.left; ++x) {
                const std::size_t from = Place(call.srcRect, x, y, call.srcLineBytes, 4);
                const std::size_t to = Place(call.dstRect, x, y, call.dstLineBytes, dstBpp);
                Pixel(call, &call.dst[to], &call.src[from], dstBpp);
            }
        }
        return true;
    }

private:
    static bool IsEmpty(const TVLRect& rect) { return rect.right <= rect.left || rect.bottom <= rect.top; }

    /// Whether it changed anything.
    static bool Clip(TVLRect& rect, TVLSize size) {
        const TVLRect before = rect;
        if (rect.left >= size.cx || rect.top >= size.cy || rect.right <= 0 || rect.bottom <= 0) {
            rect = {0, 0, 0, 0};
            return rect != before;
        }
        rect.left = rect.left < 0 ? 0 : rect.left;
        rect.top = rect.top < 0 ? 0 : rect.top;
        rect.right = rect.right > size.cx ? size.cx : rect.right;
        rect.bottom = rect.bottom > size.cy ? size.cy : rect.bottom;
        return rect != before;
    }

    static std::size_t Place(const TVLRect& rect, int x, int y, unsigned lineBytes, unsigned bpp) {
        return static_cast<std::size_t>(rect.top + y) * lineBytes +
               static_cast<std::size_t>(rect.left + x) * bpp;
    }

    void Pixel(const RawBlend& call, unsigned char* d, const unsigned char* s, unsigned dstBpp) {
        const int alphaIdx = call.isAlphaLast ? 3 : 0;
        const int firstIdx = call.isAlphaLast ? 0 : 3;
        const int a = s[alphaIdx];
        if (a == 0) {
            ++m_counts.kept;
            return;
        }
        if (a == 255) {
            ++m_counts.replaced;
            for (unsigned i = 0; i < (dstBpp < 4 ? dstBpp : 4); ++i)
                d[i] = s[i];
            return;
        }
        ++m_counts.mixed;
        const int da = d[alphaIdx];
        const int places[3] = {firstIdx, 1, 2};
        float f[3];
        float g[3];
        for (int i = 0; i < 3; ++i) {
            const double c = d[places[i]];
            f[i] = static_cast<float>(call.isDstPremultiplied ? c : c * da / 255.0);
        }
        for (int i = 0; i < 3; ++i) {
            const double c = s[places[i]];
            g[i] = static_cast<float>(call.isSrcPremultiplied ? c : c * a / 255.0);
        }
        const int outA = ((da * (255 - a)) / 255 + a) & 255;
        for (int i = 0; i < 3; ++i) {
            const double under = static_cast<double>(f[i]) * (255 - a) / 255.0;
            const double value = (static_cast<double>(g[i]) + under) * 255.0 / outA;
            d[places[i]] = static_cast<unsigned char>(static_cast<int>(std::floor(value)) & 255);
        }
        d[alphaIdx] = static_cast<unsigned char>(outA);
        if (call.isDstPremultiplied) {
            for (const int place : places)
                d[place] = static_cast<unsigned char>((d[place] * outA) & 255);
        }
    }

    RawBlendCounts& m_counts;
};

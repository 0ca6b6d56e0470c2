// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_region.h"

#include <gtest/gtest.h>

#include <ostream>
#include <vector>

/// What tests of regions say often.

using Rects = std::vector<TVLRect>;

constexpr RegionCombinOpt kEveryOption[] = {REGION_COMBINE_AND, REGION_COMBINE_COPY, REGION_COMBINE_DIFF,
                                            REGION_COMBINE_OR, REGION_COMBINE_XOR};

inline void PrintTo(const TVLRect& rect, std::ostream* out) {
    *out << "{" << rect.left << "," << rect.top << "," << rect.right << "," << rect.bottom << "}";
}

inline TVLRegion Region(const Rects& rects) {
    TVLRegion region;
    for (const TVLRect& rect : rects)
        EXPECT_TRUE(region.AddRect(rect));
    return region;
}

inline Rects RectsOf(const TVLRegion& region) {
    Rects rects;
    EXPECT_TRUE(region.GetRects(rects));
    return rects;
}

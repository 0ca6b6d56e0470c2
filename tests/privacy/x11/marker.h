// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

#include <cstddef>
#include <cstdint>
#include <functional>

/// What shows in a picture of the desktop of RealDesk: secrets are of pure magenta, #ff00ff, and nothing that
/// may be seen has anything near it.

/// 4 bytes a pixel.
struct MarkerPicture {
    const std::uint8_t* pixels = nullptr;
    std::size_t stride = 0;
    int width = 0;
    int height = 0;
    int red = 0; ///< Where in a pixel; green and blue follow.
};

/// Pixels of each kind.
struct MarkerCount {
    long all = 0;
    long magenta = 0; ///< Pure, or nearly.
    long inside = 0;  ///< Of these, those with some magenta all around: no edge of a picture that was scaled.
    long through = 0; ///< Of those inside, those where somebody who may be seen is in front.
    long mixed = 0;   ///< Magenta with something else.
    // Of those who may be seen.
    long terminal = 0;
    long toolkit = 0;
    long browser = 0;
    long menu = 0;

    long Shown() const { return terminal + toolkit + browser + menu; }
};

/// `isShownInFront` tells of a place in the picture whether somebody who may be seen is in front of it.
MarkerCount CountMarkers(const MarkerPicture& picture,
                         const std::function<bool(int x, int y)>& isShownInFront = {});

/// Null pixels for a picture of another format than 1 and 2.
MarkerPicture MarkerPictureOf(const std::uint8_t* pixels, int width, int height, int lineBytes,
                              SHARE_FRAME_FORMAT format);

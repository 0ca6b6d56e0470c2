// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

/// Marks what the shared library shows to its clients.
#if defined(__GNUC__)
#define SCREENSHARE_API __attribute__((visibility("default")))
#else
#define SCREENSHARE_API
#endif

/// A rectangle of whole units; right and bottom are exclusive.
/// Unit: points of the global display space (origin at the top left of the main display) where it speaks of
/// the desktop, pixels where it speaks of a frame.
struct TVLRect {
    std::int32_t left;
    std::int32_t top;
    std::int32_t right;
    std::int32_t bottom;
};

struct TVLSize {
    std::int32_t cx;
    std::int32_t cy;
};

inline bool operator==(const TVLRect& a, const TVLRect& b) {
    return a.left == b.left && a.top == b.top && a.right == b.right && a.bottom == b.bottom;
}
inline bool operator!=(const TVLRect& a, const TVLRect& b) {
    return !(a == b);
}
inline bool operator==(const TVLSize& a, const TVLSize& b) {
    return a.cx == b.cx && a.cy == b.cy;
}
inline bool operator!=(const TVLSize& a, const TVLSize& b) {
    return !(a == b);
}

/// The null pointer, by the name that the traces use.
constexpr std::nullptr_t TVLNull = nullptr;

/// What operations answer. Operations that move data give the number of bytes moved instead, or 0.
enum SHARE_RESULT : int {
    SHARE_RESULT_OK = 0,
    SHARE_RESULT_FAILED = -1,        ///< General failure, or not allowed now or for this kind.
    SHARE_RESULT_INVALID_PARAM = -2, ///< Null pointer, zero size or an invalid value below.
    SHARE_RESULT_NOT_AVAILABLE = -3, ///< Not available on this kind of engine, capturer or pointing object.
    SHARE_RESULT_NO_CAPTURER = -4,   ///< No capturer, or no context.
    SHARE_RESULT_NOT_SUPPORTED = -5, ///< Not supported.
    SHARE_RESULT_NOTHING_TO_SHARE = -6, ///< Start refused.
};

/// Values that name nothing.
constexpr unsigned SHARE_INVALID_WINDOW = 0;
constexpr unsigned SHARE_INVALID_PROCESS = 0x80000000u;
constexpr unsigned SHARE_INVALID_DISPLAY = 0xFFFFFFFFu;

/// Layout of a frame's pixels: bytes in memory order, byte 0 first.
enum SHARE_FRAME_FORMAT : int {
    SHARE_FRAME_FORMAT_NONE = 0, ///< Not set; lines and data count as empty.
    SHARE_FRAME_FORMAT_RGBA = 1, ///< 4 bytes, premultiplied alpha.
    SHARE_FRAME_FORMAT_ARGB = 2, ///< 4 bytes, premultiplied alpha.
    SHARE_FRAME_FORMAT_RGB = 3,  ///< 3 bytes.
    SHARE_FRAME_FORMAT_BGRA = 4, ///< 4 bytes.
    SHARE_FRAME_FORMAT_ABGR = 5, ///< 4 bytes.
    SHARE_FRAME_FORMAT_BGR = 6,  ///< 3 bytes.
};

/// The capture mode: which method fetches the picture.
enum SCREEN_CAPTURER_TYPE : int {
    SCREEN_CAPTURER_TYPE_DEFAULT = 1,      ///< Window images, fetched inside the pass.
    SCREEN_CAPTURER_TYPE_MAG = 6,          ///< Refused everywhere.
    SCREEN_CAPTURER_TYPE_AVFOUNDATION = 7, ///< A capture session, the unshared parts painted over.
    SCREEN_CAPTURER_TYPE_CGS_GCD = 8,      ///< Window images, several in flight.
    SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX =
        10 ///< A capture session, covered parts redrawn from window images.
};

/// What is being shared.
enum SHARE_TYPE : int {
    SHARE_TYPE_DESKTOP = 1,
    SHARE_TYPE_APP = 2,
    SHARE_TYPE_WINDOW = 3,
};

/// Flags of ShareConfig(SHARE_CONFIG_FLAG), a 32-bit word. They hold for the whole process.
enum SHARE_CONFIG_FLAGS : unsigned {
    SHARE_CONFIG_FLAG_NO_POINTER = 1u << 0,    ///< The pointer is kept out of the picture.
    SHARE_CONFIG_FLAG_DUMMY_CAPTURE = 1u << 5, ///< Capturers are dummies, whatever the debug file says.
    SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET =
        1u << 6, ///< Displays of an application are those shared, not looked up.
    SHARE_CONFIG_FLAG_NO_WINDOW_WALK = 1u << 7,    ///< The window stack is not examined.
    SHARE_CONFIG_FLAG_PERFORMANCE_TRACE = 1u << 8, ///< Timing lines marked [Performance] are traced.
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "x11_connection.h"
#include "x11_shared_memory.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

/// Order in memory of the four bytes of a pixel; X is padding.
enum class X11PixelOrder {
    BGRX,
    RGBX,
    XRGB,
    XBGR
};

/// A picture of the screen. Its pixels are valid until the next grab.
struct X11Picture {
    const std::uint8_t* pixels;
    int lineBytes;
    int width;
    int height;
};

/// Grabs what an X server shows: the root window with everything on it, but without the pointer.
///
/// Threads: one at a time.
/// Errors:  a failed grab may be tried again as long as IsConnected; after that it fails at once and for
///          ever.
class X11Grabber {
public:
    /// Null when there is no such display or its pixels are not four bytes each; `problem` then says so.
    static std::unique_ptr<X11Grabber> Open(const std::string& display, std::string& problem);

    /// True when the picture has been filled in. Follows the screen's size.
    bool Grab(X11Picture& picture);

    X11PixelOrder GetPixelOrder() const { return m_order; }
    int GetWidth() const { return m_width; }
    int GetHeight() const { return m_height; }
    bool IsConnected() const { return m_connection->IsAlive(); }
    /// The pictures come through shared memory and not through the connection. Known after the first grab.
    bool UsesSharedMemory() const { return m_memory != nullptr; }
    /// The server is only a front to a Wayland session: grabs succeed, and are black.
    bool IsFrontOfWayland();
    const std::string& GetDisplayName() const { return m_connection->GetName(); }

private:
    X11Grabber(std::unique_ptr<X11Connection> connection, X11PixelOrder order);
    bool ReadSize();
    bool GrabThroughMemory(X11Picture& picture);
    bool GrabThroughConnection(X11Picture& picture);
    bool HasMemoryFor(std::size_t size);
    X11Picture MakePicture(const std::uint8_t* pixels) const;

    const std::unique_ptr<X11Connection> m_connection;
    const X11PixelOrder m_order;
    int m_width;
    int m_height;
    bool m_memoryRefused = false;
    std::unique_ptr<X11SharedMemory> m_memory;          // Null until needed, and when the server refuses.
    XcbPointer<xcb_get_image_reply_t> m_lastImageReply; // Holds the last picture that came without it.
};

// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/bare_loop.h"

#include <xcb/composite.h>

#include <cstdlib>
#include <stdexcept>
#include <utility>

namespace {

struct Extent {
    int width;
    int height;
};

Extent ExtentOf(const XLink& link, xcb_drawable_t drawable) {
    xcb_get_geometry_reply_t* const reply =
        xcb_get_geometry_reply(link.Get(), xcb_get_geometry(link.Get(), drawable), nullptr);
    if (reply == nullptr)
        throw std::runtime_error("nothing there to fetch");
    const Extent extent{reply->width, reply->height};
    std::free(reply);
    return extent;
}

SharedPicture PictureFor(const XLink& link, xcb_drawable_t drawable) {
    const Extent extent = ExtentOf(link, drawable);
    return {link.Get(), extent.width, extent.height};
}

/// A window's storage stays the same until its size changes.
xcb_drawable_t DrawableOf(const XLink& link, xcb_window_t window) {
    if (window == 0)
        return link.Root();
    xcb_composite_query_version(link.Get(), 0, 4);
    xcb_composite_redirect_window(link.Get(), window, XCB_COMPOSITE_REDIRECT_AUTOMATIC);
    const xcb_pixmap_t storage = xcb_generate_id(link.Get());
    xcb_composite_name_window_pixmap(link.Get(), window, storage);
    return storage;
}

} // namespace

BareLoop::BareLoop(const std::string& display, xcb_window_t window,
                   std::function<void(const SharedPicture&)> look)
    : m_link(display),
      m_drawable(DrawableOf(m_link, window)),
      m_picture(PictureFor(m_link, m_drawable)),
      m_look(std::move(look)),
      m_thread([this] { return Tick(); }) {}

bool BareLoop::Tick() {
    if (!m_picture.Fetch(m_drawable))
        return false;
    ++m_frames;
    if (m_look)
        m_look(m_picture);
    return true;
}

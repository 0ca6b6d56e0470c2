// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/window_storages.h"
#include "platform/x11/window_tree.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"
#include "tests/support/threads.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>
#include <xcb/shape.h>
#include <xcb/xcb.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// Storages and the tree that tells them of windows, on a server, as the X thread has them; and a client.
class StoragesBench {
public:
    explicit StoragesBench(XServerOptions options = {})
        : m_server(std::move(options)),
          m_client(m_server.Display()),
          m_connection(platform::x11::ConnectToDisplay(m_server.Display(), CmSteadyNow() + PATIENCE, -1), -1),
          m_storages(Introduced(m_connection)),
          m_tree(m_connection, m_memory, m_storages) {}

    /// Windows that are made before it are found as they are.
    void Begin(bool composited = false) {
        m_tree.Select();
        {
            const platform::x11::ServerGrab grab(m_connection);
            m_storages.Redirect(composited);
            m_tree.Begin();
        }
        m_tree.SetComposited(composited);
        CatchUp();
    }

    void CatchUp() {
        while (const platform::x11::Event event = m_connection.NextEvent()) {
            m_tree.OnEvent(*event);
            m_storages.OnEvent(*event);
        }
    }

    /// All that the client has asked for is done, and has been heard of; and what has been asked for then is
    /// done too.
    void Settle() {
        m_client.RoundTrip();
        m_connection.RoundTrip();
        CatchUp();
        m_tree.Settle();
        m_connection.RoundTrip();
        CatchUp();
    }

    platform::WindowPictureResult Take(std::vector<platform::CGWindowID> windows,
                                       const platform::CGRect& rect = {{-40000, -40000}, {80000, 80000}}) {
        platform::WindowPictureRequest request;
        request.windows = std::move(windows);
        request.rect = rect;
        m_connection.SetDeadline(CmSteadyNow() + PATIENCE);
        platform::x11::TakenPicture taken = m_storages.Take(request, m_tree, {}, [this] { CatchUp(); });
        return {taken.outcome, std::move(taken.picture)};
    }

    /// The only layer of a picture; an empty one when there is none.
    platform::PictureLayer TakeLayer(platform::CGWindowID window) {
        const auto picture = Take({window}).picture;
        return picture != nullptr && picture->layers.size() == 1 ? picture->layers[0]
                                                                 : platform::PictureLayer();
    }
    platform::PicturePtr TakeOne(platform::CGWindowID window) { return TakeLayer(window).picture; }

    /// Lets the storages do what is due until it comes true.
    bool ComesTrueMeanwhile(const std::function<bool()>& condition) {
        return ComesTrue([&] {
            Settle();
            m_storages.DoDue();
            AnswerExposures();
            return condition();
        });
    }

    // The client.
    struct Look {
        std::optional<std::uint32_t> background = 0x00FF00; ///< Nothing for None.
        int border = 0;
        std::uint8_t depth = 0; ///< 0 for the root's.
        bool overrideRedirect = true;
    };

    xcb_window_t Create(const platform::PixelRect& place, const Look& look) {
        return CreateIn(m_client.Root(), place, look);
    }
    xcb_window_t Create(const platform::PixelRect& place) { return Create(place, Look()); }
    xcb_window_t CreateIn(xcb_window_t parent, const platform::PixelRect& place, const Look& look) {
        xcb_connection_t* const xcb = m_client.Get();
        const std::uint8_t depth = look.depth != 0 ? look.depth : m_client.Screen().root_depth;
        const xcb_visualid_t visual = VisualOf(depth);
        const xcb_colormap_t colours = xcb_generate_id(xcb);
        xcb_create_colormap(xcb, XCB_COLORMAP_ALLOC_NONE, colours, m_client.Root(), visual);
        std::uint32_t mask =
            XCB_CW_BORDER_PIXEL | XCB_CW_OVERRIDE_REDIRECT | XCB_CW_EVENT_MASK | XCB_CW_COLORMAP;
        std::vector<std::uint32_t> values;
        if (look.background) {
            mask |= XCB_CW_BACK_PIXEL;
            values.push_back(*look.background);
        }
        values.insert(values.end(),
                      {0x0000FF, look.overrideRedirect ? 1U : 0U, XCB_EVENT_MASK_EXPOSURE, colours});
        const xcb_window_t window = xcb_generate_id(xcb);
        xcb_create_window(
            xcb, depth, window, parent, static_cast<std::int16_t>(place.left),
            static_cast<std::int16_t>(place.top), static_cast<std::uint16_t>(place.right - place.left),
            static_cast<std::uint16_t>(place.bottom - place.top), static_cast<std::uint16_t>(look.border),
            XCB_WINDOW_CLASS_INPUT_OUTPUT, visual, mask, values.data());
        return window;
    }
    /// Mapped when everybody has heard that it is there, so that its painting is watched.
    xcb_window_t Show(const platform::PixelRect& place, const Look& look) {
        const xcb_window_t window = Create(place, look);
        Settle();
        xcb_map_window(m_client.Get(), window);
        Settle();
        return window;
    }
    xcb_window_t Show(const platform::PixelRect& place) { return Show(place, Look()); }
    void Configure(xcb_window_t window, std::uint16_t mask, const std::vector<std::uint32_t>& values) {
        xcb_configure_window(m_client.Get(), window, mask, values.data());
    }
    void Resize(xcb_window_t window, std::uint32_t width, std::uint32_t height) {
        Configure(window, XCB_CONFIG_WINDOW_WIDTH | XCB_CONFIG_WINDOW_HEIGHT, {width, height});
    }
    void Move(xcb_window_t window, int x, int y) {
        Configure(window, XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y,
                  {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y)});
    }
    void Fill(xcb_window_t window, std::uint32_t pixel, const platform::PixelRect& rect) {
        xcb_connection_t* const xcb = m_client.Get();
        const xcb_gcontext_t context = xcb_generate_id(xcb);
        xcb_create_gc(xcb, context, window, XCB_GC_FOREGROUND, &pixel);
        const xcb_rectangle_t area{static_cast<std::int16_t>(rect.left), static_cast<std::int16_t>(rect.top),
                                   static_cast<std::uint16_t>(rect.right - rect.left),
                                   static_cast<std::uint16_t>(rect.bottom - rect.top)};
        xcb_poly_fill_rectangle(xcb, window, context, 1, &area);
        xcb_free_gc(xcb, context);
    }
    /// From now on it paints what it is told that it has to.
    void PaintOnExposure(xcb_window_t window, std::uint32_t pixel) { m_painted.emplace_back(window, pixel); }
    void AnswerExposures() {
        while (xcb_generic_event_t* const event = xcb_poll_for_event(m_client.Get())) {
            if ((event->response_type & 0x7F) == XCB_EXPOSE)
                OnExpose(*reinterpret_cast<const xcb_expose_event_t*>(event),
                         (event->response_type & 0x80) != 0);
            std::free(event);
        }
        m_client.RoundTrip();
    }
    unsigned ToldExposures() const { return m_toldExposures; }

    xcb_connection_t* Client() { return m_client.Get(); }
    const XLink& Link() const { return m_client; }
    XServer& Server() { return m_server; }
    platform::x11::X11Connection& Connection() { return m_connection; }
    platform::x11::WindowStorages& Storages() { return m_storages; }
    platform::x11::WindowTree& Tree() { return m_tree; }

private:
    static platform::x11::X11Connection& Introduced(platform::x11::X11Connection& connection) {
        connection.SetDeadline(CmSteadyNow() + PATIENCE);
        connection.Introduce();
        return connection;
    }

    xcb_visualid_t VisualOf(std::uint8_t depth) const {
        if (depth == m_client.Screen().root_depth)
            return m_client.Screen().root_visual;
        xcb_depth_iterator_t each = xcb_screen_allowed_depths_iterator(&m_client.Screen());
        for (; each.rem != 0; xcb_depth_next(&each)) {
            if (each.data->depth == depth && xcb_depth_visuals_length(each.data) > 0)
                return xcb_depth_visuals(each.data)->visual_id;
        }
        return 0;
    }

    void OnExpose(const xcb_expose_event_t& event, bool isTold) {
        m_toldExposures += isTold ? 1 : 0;
        for (const auto& [window, pixel] : m_painted) {
            if (window == event.window)
                Fill(window, pixel,
                     {event.x, event.y, event.x + int{event.width}, event.y + int{event.height}});
        }
    }

    XServer m_server;
    XLink m_client;
    platform::x11::X11Connection m_connection;
    platform::x11::Memory m_memory;
    platform::x11::WindowStorages m_storages;
    platform::x11::WindowTree m_tree;
    std::vector<std::pair<xcb_window_t, std::uint32_t>> m_painted;
    unsigned m_toldExposures = 0;
};

/// A pixel as 0xAARRGGBB; opaque where the format has no alpha. 10-bit colours lose two bits.
inline std::uint32_t PixelAt(const platform::Picture& picture, int x, int y) {
    std::uint32_t word = 0;
    std::memcpy(
        &word,
        picture.pixels + static_cast<std::size_t>(y) * picture.stride + static_cast<std::size_t>(x) * 4,
        sizeof(word));
    switch (picture.format) {
        case platform::PixelFormat::BGRA:
            return word;
        case platform::PixelFormat::X2R10G10B10:
            return 0xFF000000U | (word >> 22U & 0xFFU) << 16U | (word >> 12U & 0xFFU) << 8U |
                   (word >> 2U & 0xFFU);
        default:
            return word | 0xFF000000U;
    }
}

inline int CountOf(const platform::Picture& picture, std::uint32_t argb) {
    int count = 0;
    for (int y = 0; y < picture.height; ++y) {
        for (int x = 0; x < picture.width; ++x)
            count += PixelAt(picture, x, y) == argb ? 1 : 0;
    }
    return count;
}

inline bool IsAll(const platform::PicturePtr& picture, std::uint32_t argb) {
    return picture != nullptr && CountOf(*picture, argb) == picture->width * picture->height;
}

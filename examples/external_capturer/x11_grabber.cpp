// SPDX-License-Identifier: Apache-2.0
#include "x11_grabber.h"

#include <xcb/randr.h>

#include <cstring>
#include <optional>
#include <utility>

namespace {

constexpr int grabbedPixelBytes = 4;

int BitsPerPixel(const xcb_setup_t* setup, std::uint8_t depth) {
    for (auto formats = xcb_setup_pixmap_formats_iterator(setup); formats.rem > 0;
         xcb_format_next(&formats)) {
        if (formats.data->depth == depth) {
            return formats.data->bits_per_pixel;
        }
    }
    return 0;
}

const xcb_visualtype_t* FindVisual(const xcb_screen_t* screen, xcb_visualid_t id) {
    for (auto depths = xcb_screen_allowed_depths_iterator(screen); depths.rem > 0; xcb_depth_next(&depths)) {
        auto visuals = xcb_depth_visuals_iterator(depths.data);
        for (; visuals.rem > 0; xcb_visualtype_next(&visuals)) {
            if (visuals.data->visual_id == id) {
                return visuals.data;
            }
        }
    }
    return nullptr;
}

// A server may keep red or blue in the low byte of the pixel word, and that word in either byte order.
std::optional<X11PixelOrder> FindPixelOrder(const xcb_setup_t* setup, const xcb_screen_t* screen) {
    const xcb_visualtype_t* visual = FindVisual(screen, screen->root_visual);
    if (visual == nullptr || BitsPerPixel(setup, screen->root_depth) != 8 * grabbedPixelBytes ||
        visual->green_mask != 0x00FF00) {
        return std::nullopt;
    }
    const bool lowByteFirst = setup->image_byte_order == XCB_IMAGE_ORDER_LSB_FIRST;
    if (visual->red_mask == 0xFF0000 && visual->blue_mask == 0x0000FF) {
        return lowByteFirst ? X11PixelOrder::BGRX : X11PixelOrder::XRGB;
    }
    if (visual->red_mask == 0x0000FF && visual->blue_mask == 0xFF0000) {
        return lowByteFirst ? X11PixelOrder::RGBX : X11PixelOrder::XBGR;
    }
    return std::nullopt;
}

bool HasOutputNamed(X11Connection& connection, const std::string& prefix) {
    const auto resources = connection.Await<xcb_randr_get_screen_resources_current_reply_t>(
        xcb_randr_get_screen_resources_current(connection.Get(), connection.GetScreen()->root));
    if (!resources) {
        return false;
    }
    const xcb_randr_output_t* outputs = xcb_randr_get_screen_resources_current_outputs(resources.get());
    for (int i = 0; i < resources->num_outputs; ++i) {
        const auto info = connection.Await<xcb_randr_get_output_info_reply_t>(
            xcb_randr_get_output_info(connection.Get(), outputs[i], resources->config_timestamp));
        if (info && info->name_len >= prefix.size() &&
            std::memcmp(xcb_randr_get_output_info_name(info.get()), prefix.data(), prefix.size()) == 0) {
            return true;
        }
    }
    return false;
}

} // namespace

std::unique_ptr<X11Grabber> X11Grabber::Open(const std::string& display, std::string& problem) {
    auto connection = X11Connection::Open(display, problem);
    if (!connection) {
        return nullptr;
    }
    const xcb_screen_t* screen = connection->GetScreen();
    const auto order = FindPixelOrder(xcb_get_setup(connection->Get()), screen);
    if (!order) {
        problem = "display \"" + connection->GetName() + "\" has depth " +
                  std::to_string(screen->root_depth) +
                  ": only depth 24 or 32 with eight bits a colour in four bytes can be captured";
        return nullptr;
    }
    return std::unique_ptr<X11Grabber>(new X11Grabber(std::move(connection), *order));
}

X11Grabber::X11Grabber(std::unique_ptr<X11Connection> connection, X11PixelOrder order)
    : m_connection(std::move(connection)),
      m_order(order),
      m_width(m_connection->GetScreen()->width_in_pixels),
      m_height(m_connection->GetScreen()->height_in_pixels) {}

bool X11Grabber::Grab(X11Picture& picture) {
    m_connection->DropEvents();
    // The screen may change its size between our look at it and the grab, which the server then refuses.
    for (int attempt = 0; attempt < 2; ++attempt) {
        if (!ReadSize()) {
            return false;
        }
        const auto size =
            static_cast<std::size_t>(m_width) * static_cast<std::size_t>(m_height) * grabbedPixelBytes;
        if (HasMemoryFor(size) ? GrabThroughMemory(picture) : GrabThroughConnection(picture)) {
            return true;
        }
    }
    return false;
}

bool X11Grabber::IsFrontOfWayland() {
    // Newer servers have an extension that says so; older ones only name their outputs after it.
    return m_connection->HasExtension("XWAYLAND") ||
           (m_connection->HasExtension("RANDR") && HasOutputNamed(*m_connection, "XWAYLAND"));
}

bool X11Grabber::ReadSize() {
    const auto cookie = xcb_get_geometry(m_connection->Get(), m_connection->GetScreen()->root);
    const auto geometry = m_connection->Await<xcb_get_geometry_reply_t>(cookie);
    if (!geometry) {
        return false;
    }
    m_width = geometry->width;
    m_height = geometry->height;
    return true;
}

bool X11Grabber::HasMemoryFor(std::size_t size) {
    if (m_memoryRefused) {
        return false;
    }
    if (!m_memory || m_memory->GetSize() < size) {
        m_memory = X11SharedMemory::Create(*m_connection, size);
        m_memoryRefused = !m_memory;
    }
    return !m_memoryRefused;
}

bool X11Grabber::GrabThroughMemory(X11Picture& picture) {
    const auto cookie = xcb_shm_get_image(
        m_connection->Get(), m_connection->GetScreen()->root, 0, 0, static_cast<std::uint16_t>(m_width),
        static_cast<std::uint16_t>(m_height), ~0U, XCB_IMAGE_FORMAT_Z_PIXMAP, m_memory->GetSegment(), 0);
    if (!m_connection->Await<xcb_shm_get_image_reply_t>(cookie)) {
        return false;
    }
    picture = MakePicture(m_memory->GetData());
    return true;
}

bool X11Grabber::GrabThroughConnection(X11Picture& picture) {
    const auto cookie =
        xcb_get_image(m_connection->Get(), XCB_IMAGE_FORMAT_Z_PIXMAP, m_connection->GetScreen()->root, 0, 0,
                      static_cast<std::uint16_t>(m_width), static_cast<std::uint16_t>(m_height), ~0U);
    m_lastImageReply = m_connection->Await<xcb_get_image_reply_t>(cookie);
    if (!m_lastImageReply) {
        return false;
    }
    picture = MakePicture(xcb_get_image_data(m_lastImageReply.get()));
    return true;
}

X11Picture X11Grabber::MakePicture(const std::uint8_t* pixels) const {
    return {pixels, m_width * grabbedPixelBytes, m_width, m_height};
}

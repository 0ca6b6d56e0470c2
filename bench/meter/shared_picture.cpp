// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/shared_picture.h"

#include <sys/mman.h>
#include <unistd.h>

#include <cstdlib>
#include <stdexcept>

namespace {

std::uint32_t ColourOf(std::uint32_t column, std::uint32_t row, std::uint32_t seed) {
    std::uint32_t value = column * 0x9E3779B1U ^ row * 0x85EBCA77U ^ seed * 0xC2B2AE3DU;
    value ^= value >> 15;
    // Two bits tell the seed, so that neighbours in time differ everywhere.
    return ((value * 0x2C1B3C6DU) & 0xFFFFFCU) | (seed & 3U);
}

} // namespace

SharedPicture::SharedPicture(xcb_connection_t* connection, int width, int height)
    : m_connection(connection),
      m_width(width),
      m_height(height),
      m_size(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4),
      m_segment(xcb_generate_id(connection)) {
    const int descriptor = memfd_create("screenshare-bench", MFD_CLOEXEC);
    if (descriptor < 0 || ftruncate(descriptor, static_cast<off_t>(m_size)) != 0)
        throw std::runtime_error("no memory to share");
    void* const memory = mmap(nullptr, m_size, PROT_READ | PROT_WRITE, MAP_SHARED, descriptor, 0);
    // The descriptor is the connection's from here on.
    const auto attached = xcb_shm_attach_fd_checked(connection, m_segment, descriptor, 0);
    xcb_generic_error_t* const error = xcb_request_check(connection, attached);
    const bool refused = error != nullptr;
    std::free(error);
    if (memory == MAP_FAILED || refused)
        throw std::runtime_error("the X server shares no memory");
    m_pixels = static_cast<std::uint32_t*>(memory);
}

SharedPicture::~SharedPicture() {
    xcb_shm_detach(m_connection, m_segment);
    xcb_flush(m_connection);
    munmap(m_pixels, m_size);
}

void SharedPicture::Put(xcb_drawable_t drawable, xcb_gcontext_t context, int x, int y) const {
    const auto width = static_cast<std::uint16_t>(m_width);
    const auto height = static_cast<std::uint16_t>(m_height);
    xcb_shm_put_image(m_connection, drawable, context, width, height, 0, 0, width, height,
                      static_cast<std::int16_t>(x), static_cast<std::int16_t>(y), 24,
                      XCB_IMAGE_FORMAT_Z_PIXMAP, 0, m_segment, 0);
}

bool SharedPicture::FetchPart(xcb_drawable_t drawable, int x, int y, int width, int height) const {
    const auto asked =
        xcb_shm_get_image(m_connection, drawable, static_cast<std::int16_t>(x), static_cast<std::int16_t>(y),
                          static_cast<std::uint16_t>(width), static_cast<std::uint16_t>(height), 0xFFFFFFFFU,
                          XCB_IMAGE_FORMAT_Z_PIXMAP, m_segment, 0);
    xcb_shm_get_image_reply_t* const reply = xcb_shm_get_image_reply(m_connection, asked, nullptr);
    const bool fetched = reply != nullptr;
    std::free(reply);
    return fetched;
}

std::uint32_t ColourOfSquares(int x, int y, std::uint32_t seed) {
    constexpr int SIDE = 8;
    return ColourOf(static_cast<std::uint32_t>(x / SIDE), static_cast<std::uint32_t>(y / SIDE), seed);
}

void PaintSquares(const SharedPicture& picture, std::uint32_t seed) {
    std::uint32_t* pixel = picture.Pixels();
    for (int y = 0; y < picture.Height(); ++y) {
        for (int x = 0; x < picture.Width(); ++x)
            *pixel++ = ColourOfSquares(x, y, seed);
    }
}

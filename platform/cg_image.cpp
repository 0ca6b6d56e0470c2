// SPDX-License-Identifier: Apache-2.0
#include "platform/cg_image.h"

#include "platform/window_server.h"

#include <cstring>
#include <new>
#include <utility>

namespace platform {

CGPixelLayout CGPixelLayoutOf(PixelFormat format) noexcept {
    switch (format) {
        case PixelFormat::BGRX:
            return CGPixelLayout::BGRX;
        case PixelFormat::BGRA:
            return CGPixelLayout::BGRA;
        case PixelFormat::RGBX:
            return CGPixelLayout::RGBX;
        case PixelFormat::RGBA:
            return CGPixelLayout::RGBA;
        case PixelFormat::X2R10G10B10:
            return CGPixelLayout::X2R10G10B10;
    }
    return CGPixelLayout::BGRX;
}

CGImageRef CGImageCreate(int width, int height, std::size_t bytesPerRow, CGPixelLayout layout,
                         const std::uint8_t* pixels, std::shared_ptr<const void> memory) noexcept {
    if (width < 1 || height < 1 || pixels == nullptr)
        return nullptr;
    if (bytesPerRow < static_cast<std::size_t>(width) * CGBytesPerPixel(layout))
        return nullptr;
    try {
        CGImage image;
        image.width = width;
        image.height = height;
        image.bytesPerRow = bytesPerRow;
        image.layout = layout;
        image.pixels = pixels;
        image.memory = std::move(memory);
        return std::make_shared<const CGImage>(std::move(image));
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

CGImageRef CGImageCreateWithPicture(std::shared_ptr<const Picture> picture) noexcept {
    if (picture == nullptr)
        return nullptr;
    const Picture& shown = *picture;
    return CGImageCreate(shown.width, shown.height, shown.stride, CGPixelLayoutOf(shown.format), shown.pixels,
                         std::move(picture));
}

int CGImageGetWidth(const CGImage* image) noexcept {
    return image != nullptr ? image->width : 0;
}

int CGImageGetHeight(const CGImage* image) noexcept {
    return image != nullptr ? image->height : 0;
}

std::size_t CGImageGetBytesPerRow(const CGImage* image) noexcept {
    return image != nullptr ? image->bytesPerRow : 0;
}

CGDataProviderRef CGImageGetDataProvider(const CGImageRef& image) noexcept {
    return image;
}

std::vector<std::uint8_t> CGDataProviderCopyData(const CGDataProviderRef& provider) noexcept {
    if (provider == nullptr)
        return {};
    try {
        const std::size_t rowBytes =
            static_cast<std::size_t>(provider->width) * CGBytesPerPixel(provider->layout);
        const auto height = static_cast<std::size_t>(provider->height);
        std::vector<std::uint8_t> bytes(rowBytes * height);
        for (std::size_t y = 0; y < height; ++y)
            std::memcpy(bytes.data() + y * rowBytes, provider->pixels + y * provider->bytesPerRow, rowBytes);
        return bytes;
    } catch (const std::bad_alloc&) {
        return {};
    }
}

std::size_t CGBytesPerPixel(CGPixelLayout layout) noexcept {
    return layout == CGPixelLayout::RGB ? 3 : 4;
}

bool CGHasAlpha(CGPixelLayout layout) noexcept {
    return layout == CGPixelLayout::RGBA || layout == CGPixelLayout::ARGB || layout == CGPixelLayout::BGRA;
}

bool CGHasFourBytes(CGPixelLayout layout) noexcept {
    return layout != CGPixelLayout::RGB && layout != CGPixelLayout::X2R10G10B10;
}

} // namespace platform

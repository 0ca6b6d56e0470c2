// SPDX-License-Identifier: Apache-2.0
#include "src/share_image_save.h"

#include "platform/bitmap_context.h"
#include "platform/image_codec.h"
#include "platform/search_path.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace {

constexpr std::size_t BMP_HEADER_SIZE = 54;
/// What is saved here mostly shows somebody's screen.
constexpr unsigned OWNER_ONLY = 0600;

struct CloseFile {
    void operator()(std::FILE* file) const { std::fclose(file); }
};
using File = std::unique_ptr<std::FILE, CloseFile>;

void PutLittleEndian(std::uint8_t* target, std::uint32_t value, int bytes) {
    for (int i = 0; i < bytes; ++i)
        target[i] = static_cast<std::uint8_t>(value >> (8 * i));
}

/// The size leaves out what pads the rows; readers ignore it.
std::array<std::uint8_t, BMP_HEADER_SIZE> BmpHeader(std::uint32_t width, std::uint32_t height) {
    std::array<std::uint8_t, BMP_HEADER_SIZE> header{'B', 'M'};
    PutLittleEndian(&header[2], width * 3 * height + std::uint32_t{BMP_HEADER_SIZE}, 4);
    PutLittleEndian(&header[10], BMP_HEADER_SIZE, 4); // where the pixels begin
    PutLittleEndian(&header[14], 40, 4);              // size of the second half of this header
    PutLittleEndian(&header[18], width, 4);
    PutLittleEndian(&header[22], height, 4); // positive: the rows run from the bottom up
    PutLittleEndian(&header[26], 1, 2);      // planes
    PutLittleEndian(&header[28], 24, 2);     // bits a pixel
    return header;
}

void WriteBmpLine(std::FILE* file, const unsigned char* line, int width, std::size_t bytesPerPixel) {
    const auto pixels = static_cast<std::size_t>(width);
    if (bytesPerPixel == 3) {
        std::fwrite(line, 3, pixels, file);
    } else {
        for (std::size_t x = 0; x < pixels; ++x)
            std::fwrite(line + x * bytesPerPixel, 3, 1, file);
    }
    constexpr std::array<unsigned char, 3> padding{};
    std::fwrite(padding.data(), 1, (4 - pixels * 3 % 4) % 4, file);
}

std::optional<unsigned> BitmapInfoOf(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_RGBA:
            return platform::kCGImageAlphaPremultipliedLast;
        case SHARE_FRAME_FORMAT_ARGB:
            return platform::kCGImageAlphaPremultipliedFirst;
        case SHARE_FRAME_FORMAT_RGB:
            return platform::kCGImageAlphaNone;
        default:
            return std::nullopt;
    }
}

std::size_t BytesOf(int height, int lineBytes) {
    return height > 0 && lineBytes > 0
               ? static_cast<std::size_t>(height) * static_cast<std::size_t>(lineBytes)
               : 0;
}

bool EncodeAndWrite(platform::CGImageRef image, platform::NSBitmapImageFileType type,
                    const platform::NSImageProperties& properties, const char* path) {
    if (image == nullptr)
        return false;
    const platform::NSBitmapImageRep representation(std::move(image));
    const std::vector<std::uint8_t> file = representation.representationUsingType(type, properties);
    if (file.empty())
        return false;
    platform::writeToFile(file, path, true, OWNER_ONLY);
    return true;
}

} // namespace

bool SaveRawDataToBmp(unsigned char* data, int width, int height, int lineBytes, SHARE_FRAME_FORMAT format,
                      const char* path) {
    const bool isKnownFormat = format == SHARE_FRAME_FORMAT_RGBA || format == SHARE_FRAME_FORMAT_RGB;
    if (!isKnownFormat || width < 1 || height < 1 || data == nullptr || path == nullptr)
        return false;
    const File file(std::fopen(path, "wbe"));
    if (file == nullptr)
        return false;

    const std::size_t bytesPerPixel = format == SHARE_FRAME_FORMAT_RGBA ? 4 : 3;
    const std::ptrdiff_t lineLength =
        lineBytes != 0 ? lineBytes : std::ptrdiff_t{width} * static_cast<std::ptrdiff_t>(bytesPerPixel);
    const auto header = BmpHeader(static_cast<std::uint32_t>(width), static_cast<std::uint32_t>(height));
    std::fwrite(header.data(), 1, header.size(), file.get());
    for (std::ptrdiff_t y = height - 1; y >= 0; --y)
        WriteBmpLine(file.get(), data + y * lineLength, width, bytesPerPixel);
    return true;
}

platform::CGImageRef RawDataToImage(unsigned char* data, int width, int height, int lineBytes,
                                    SHARE_FRAME_FORMAT format) {
    const std::optional<unsigned> bitmapInfo = BitmapInfoOf(format);
    if (data == nullptr || !bitmapInfo)
        return nullptr;
    const platform::CGContextRef context = platform::CGBitmapContextCreate(
        data, BytesOf(height, lineBytes), width, height, 8, lineBytes, *bitmapInfo);
    return platform::CGBitmapContextCreateImage(context.get());
}

platform::CGImageRef ShareFrameToImage(IShareFrame* frame) {
    if (frame == nullptr)
        return nullptr;
    TVLSize size{};
    frame->GetFrameSize(size);
    const int lineBytes = frame->GetFrameLineBytes();
    try {
        // Copied by the frame itself: its geometry may ask for more than its memory holds.
        const std::size_t bytes = BytesOf(size.cy, lineBytes);
        if (bytes == 0 || bytes > static_cast<std::size_t>(std::numeric_limits<int>::max()))
            return nullptr;
        std::vector<unsigned char> pixels(bytes);
        const int length = static_cast<int>(bytes);
        if (frame->ReadFrameData(pixels.data(), length) != length)
            return nullptr;
        return RawDataToImage(pixels.data(), size.cx, size.cy, lineBytes, frame->GetFrameDataFormat());
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

bool SaveRawDataToJPEG(unsigned char* data, int width, int height, int lineBytes, SHARE_FRAME_FORMAT format,
                       const char* path, float quality) {
    return EncodeAndWrite(RawDataToImage(data, width, height, lineBytes, format),
                          platform::NSBitmapImageFileTypeJPEG, {quality}, path);
}

bool SaveFrameToJPEG(IShareFrame* frame, float quality, const char* path) {
    if (frame == nullptr || path == nullptr)
        return false;
    return EncodeAndWrite(ShareFrameToImage(frame), platform::NSBitmapImageFileTypeJPEG, {quality}, path);
}

bool SaveFrameToPNG(IShareFrame* frame, const char* path) {
    return EncodeAndWrite(ShareFrameToImage(frame), platform::NSBitmapImageFileTypePNG, {}, path);
}

bool GetDocumentDir(char* buffer, int length) {
    const std::vector<std::string> folders = platform::NSSearchPathForDirectoriesInDomains(
        platform::NSDocumentDirectory, platform::NSUserDomainMask);
    if (folders.empty() || buffer == nullptr || length < 0)
        return false;
    const std::string& folder = folders.front();
    const std::size_t count = std::min(folder.size() + 1, static_cast<std::size_t>(length));
    std::memcpy(buffer, folder.c_str(), count);
    buffer[count] = '\0';
    return true;
}

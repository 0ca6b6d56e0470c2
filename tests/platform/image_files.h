// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/platform/bitmap_tools.h"

#include <png.h>
#include <turbojpeg.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

/// Image files as somebody else's decoder reads them, and folders to write them to.

/// A folder of the test's own, gone with it.
class TemporaryFolder {
public:
    TemporaryFolder() {
        std::string name = (std::filesystem::temp_directory_path() / "screenshare-test-XXXXXX").string();
        m_path = mkdtemp(name.data()) != nullptr ? name : std::string();
    }
    ~TemporaryFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(m_path, ignored);
    }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    const std::filesystem::path& Path() const { return m_path; }
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }
    std::size_t CountFiles() const {
        return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator(m_path),
                                                      std::filesystem::directory_iterator()));
    }

private:
    std::filesystem::path m_path;
};

inline Bytes ReadWholeFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

inline void WriteWholeFile(const std::string& path, const std::string& text) {
    std::ofstream(path, std::ios::binary) << text;
}

/// A decoded file, red, green, blue, alpha, not premultiplied. No width when it could not be decoded.
struct DecodedImage {
    int width = 0;
    int height = 0;
    bool hasAlpha = false;
    Bytes pixels;

    Colour At(int x, int y) const {
        return ReadPixel(CGPixelLayout::RGBA, &pixels[static_cast<std::size_t>(y * width + x) * 4]);
    }
};

inline DecodedImage DecodePng(const Bytes& file) {
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    if (png_image_begin_read_from_memory(&image, file.data(), file.size()) == 0)
        return {};
    DecodedImage decoded;
    decoded.hasAlpha = (image.format & PNG_FORMAT_FLAG_ALPHA) != 0;
    image.format = PNG_FORMAT_RGBA;
    decoded.pixels.resize(PNG_IMAGE_SIZE(image));
    if (png_image_finish_read(&image, nullptr, decoded.pixels.data(), 0, nullptr) == 0)
        return {};
    decoded.width = static_cast<int>(image.width);
    decoded.height = static_cast<int>(image.height);
    return decoded;
}

inline DecodedImage DecodeJpeg(const Bytes& file) {
    struct End {
        void operator()(void* handle) const { tjDestroy(handle); }
    };
    const std::unique_ptr<void, End> decoder(tjInitDecompress());
    DecodedImage decoded;
    int subsampling = 0;
    int colourSpace = 0;
    if (tjDecompressHeader3(decoder.get(), file.data(), file.size(), &decoded.width, &decoded.height,
                            &subsampling, &colourSpace) != 0)
        return {};
    decoded.pixels.resize(static_cast<std::size_t>(decoded.width) * static_cast<std::size_t>(decoded.height) *
                          4);
    if (tjDecompress2(decoder.get(), file.data(), file.size(), decoded.pixels.data(), decoded.width, 0,
                      decoded.height, TJPF_RGBA, 0) != 0)
        return {};
    return decoded;
}

/// How far apart two colours are in the component in which they differ most.
inline int Distance(const Colour& a, const Colour& b) {
    return std::max({std::abs(a.red - b.red), std::abs(a.green - b.green), std::abs(a.blue - b.blue)});
}

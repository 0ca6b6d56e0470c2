// SPDX-License-Identifier: Apache-2.0
#include "platform/image_codec.h"

#include "platform/pixel_rows.h"
#include "util/cm_numeric.h"

#include <fcntl.h>
#include <png.h>
#include <sys/stat.h>
#include <turbojpeg.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <new>
#include <utility>

namespace platform {

namespace {

using Bytes = std::vector<std::uint8_t>;

// ---- Encoding

/// The pixels of an image in another layout, row after row without gaps.
Bytes PixelsAs(const CGImage& image, CGPixelLayout layout) {
    const auto width = static_cast<std::size_t>(image.width);
    const auto height = static_cast<std::size_t>(image.height);
    const std::size_t rowBytes = width * CGBytesPerPixel(layout);
    Bytes pixels(rowBytes * height);
    for (std::size_t y = 0; y < height; ++y)
        ConvertRow(image.layout, image.pixels + y * image.bytesPerRow, layout, pixels.data() + y * rowBytes,
                   width);
    return pixels;
}

void Unpremultiply(Bytes& rgba) {
    for (std::size_t i = 0; i < rgba.size(); i += 4) {
        const unsigned alpha = rgba[i + 3];
        if (alpha == 0 || alpha == 255)
            continue;
        for (std::size_t c = i; c < i + 3; ++c)
            rgba[c] = static_cast<std::uint8_t>(std::min((rgba[c] * 255u + alpha / 2) / alpha, 255u));
    }
}

/// libpng's writer for whole pictures: it keeps its long jumps to itself.
Bytes EncodePng(const CGImage& image) {
    const bool hasAlpha = CGHasAlpha(image.layout);
    Bytes pixels = PixelsAs(image, hasAlpha ? CGPixelLayout::RGBA : CGPixelLayout::RGB);
    if (hasAlpha)
        Unpremultiply(pixels);

    png_image picture{};
    picture.version = PNG_IMAGE_VERSION;
    picture.width = static_cast<png_uint_32>(image.width);
    picture.height = static_cast<png_uint_32>(image.height);
    picture.format = hasAlpha ? PNG_FORMAT_RGBA : PNG_FORMAT_RGB;
    // Speed before size: dumps are written between two captures.
    picture.flags = PNG_IMAGE_FLAG_FAST;
    png_alloc_size_t size = PNG_IMAGE_PNG_SIZE_MAX(picture);
    Bytes file(size);
    if (png_image_write_to_memory(&picture, file.data(), &size, 0, pixels.data(), 0, nullptr) == 0)
        return {};
    file.resize(size);
    return file;
}

struct EndTurboJpeg {
    void operator()(void* handle) const { tjDestroy(handle); }
};

Bytes EncodeJpeg(const CGImage& image, float factor) {
    const Bytes pixels = PixelsAs(image, CGPixelLayout::RGB);
    const std::unique_ptr<void, EndTurboJpeg> encoder(tjInitCompress());
    // Text in colour loses its edges when colours are stored at half the size.
    constexpr int SUBSAMPLING = TJSAMP_444;
    unsigned long size = tjBufSize(image.width, image.height, SUBSAMPLING);
    if (encoder == nullptr || size == static_cast<unsigned long>(-1))
        return {};
    const int quality = std::clamp(CmTruncate(factor * 100.0 + 0.5), 1, 100);
    Bytes file(size);
    unsigned char* start = file.data();
    if (tjCompress2(encoder.get(), pixels.data(), image.width, 0, image.height, TJPF_RGB, &start, &size,
                    SUBSAMPLING, quality, TJFLAG_NOREALLOC) != 0)
        return {};
    file.resize(size);
    return file;
}

// ---- Files

/// A file that is being written.
class OutputFile {
public:
    OutputFile(const std::string& path, int flags, mode_t mode)
        : m_fd(open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | O_NOCTTY | flags, mode)) {}
    ~OutputFile() { Close(); }
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    bool IsOpen() const { return m_fd >= 0; }

    bool Write(const Bytes& data) {
        std::size_t done = 0;
        while (done < data.size()) {
            const ssize_t written = write(m_fd, data.data() + done, data.size() - done);
            if (written < 0 && errno == EINTR)
                continue;
            if (written <= 0)
                return false;
            done += static_cast<std::size_t>(written);
        }
        return true;
    }

    /// False when the system tells only now that the data could not be kept.
    bool Close() {
        const int fd = std::exchange(m_fd, -1);
        return fd < 0 || close(fd) == 0;
    }

private:
    int m_fd;
};

/// A device or a pipe under that name must not be replaced by a file.
bool IsReplaceable(const std::string& path) {
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0)
        return errno == ENOENT;
    return S_ISREG(status.st_mode) || S_ISLNK(status.st_mode);
}

/// A name in the same folder that no other thread or process takes, whatever the length of the target's own.
std::string TemporaryNameBeside(const std::string& path) {
    static std::atomic<unsigned> count{0};
    const std::size_t slash = path.find_last_of('/');
    const std::string folder = slash == std::string::npos ? std::string() : path.substr(0, slash + 1);
    return folder + ".screenshare-" + std::to_string(getpid()) + "-" + std::to_string(count++) + ".tmp";
}

bool WriteAtomically(const Bytes& data, const std::string& path, mode_t mode) {
    if (!IsReplaceable(path))
        return false;
    const std::string temporary = TemporaryNameBeside(path);
    // One that is there already belongs to somebody else, or is a trap.
    OutputFile file(temporary, O_EXCL, mode);
    if (!file.IsOpen())
        return false;
    if (file.Write(data) && file.Close() && rename(temporary.c_str(), path.c_str()) == 0)
        return true;
    unlink(temporary.c_str());
    return false;
}

bool WriteDirectly(const Bytes& data, const std::string& path, mode_t mode) {
    OutputFile file(path, O_TRUNC, mode);
    return file.IsOpen() && file.Write(data) && file.Close();
}

} // namespace

NSBitmapImageRep::NSBitmapImageRep(CGImageRef image) noexcept : m_image(std::move(image)) {}

Bytes NSBitmapImageRep::representationUsingType(NSBitmapImageFileType type,
                                                const NSImageProperties& properties) const noexcept {
    if (m_image == nullptr)
        return {};
    try {
        switch (type) {
            case NSBitmapImageFileTypeJPEG:
                return EncodeJpeg(*m_image, properties.NSImageCompressionFactor.value_or(1.0F));
            case NSBitmapImageFileTypePNG:
                return EncodePng(*m_image);
        }
    } catch (const std::exception&) {
        // Out of memory, or a picture whose file would be longer than memory can be.
    }
    return {};
}

bool writeToFile(const Bytes& data, const char* path, bool atomically, mode_t mode) noexcept {
    if (path == nullptr || *path == '\0')
        return false;
    try {
        return atomically ? WriteAtomically(data, path, mode) : WriteDirectly(data, path, mode);
    } catch (const std::bad_alloc&) {
        return false;
    }
}

CGImageDestinationRef CGImageDestinationCreateWithURL(const char* path, const char* type,
                                                      std::size_t count) noexcept {
    if (path == nullptr || *path == '\0' || type == nullptr || std::strcmp(type, kUTTypePNG) != 0 ||
        count != 1)
        return nullptr;
    try {
        auto destination = std::make_unique<CGImageDestination>();
        destination->path = path;
        destination->count = count;
        return destination;
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

void CGImageDestinationAddImage(CGImageDestination* destination, CGImageRef image) noexcept {
    if (destination == nullptr || image == nullptr || destination->images.size() >= destination->count)
        return;
    try {
        destination->images.push_back(std::move(image));
    } catch (const std::bad_alloc&) {
        return; // which Finalize notices
    }
}

bool CGImageDestinationFinalize(const CGImageDestination* destination) noexcept {
    if (destination == nullptr || destination->images.size() != destination->count)
        return false;
    const Bytes file =
        NSBitmapImageRep(destination->images.front()).representationUsingType(NSBitmapImageFileTypePNG);
    return !file.empty() && writeToFile(file, destination->path.c_str(), true);
}

} // namespace platform

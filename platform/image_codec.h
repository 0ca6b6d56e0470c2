// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// Image files. Threads: any. Errors: told by the result; nothing is traced or thrown.
namespace platform {

enum NSBitmapImageFileType : int {
    NSBitmapImageFileTypeJPEG = 3,
    NSBitmapImageFileTypePNG = 4,
};

struct NSImageProperties {
    /// Of a JPEG file: 0 the smallest, 1 the best. Held within these; NaN counts as 0.
    std::optional<float> NSImageCompressionFactor;
};

/// An image that is to become a file.
class NSBitmapImageRep {
public:
    explicit NSBitmapImageRep(CGImageRef image) noexcept;

    /// The bytes of a file, or none when the image is null or more than the file type can take (65535 pixels
    /// a side for JPEG, a million for PNG), or when memory runs out.
    ///
    /// PNG keeps every colour and the alpha, which such files hold with colours that are not premultiplied;
    /// an image without alpha becomes one without. JPEG has no alpha: the image lies on black there.
    std::vector<std::uint8_t> representationUsingType(
        NSBitmapImageFileType type, const NSImageProperties& properties = {}) const noexcept;

private:
    CGImageRef m_image;
};

/// Writes a file. `atomically` means to write under another name in the same folder and rename: who looks
/// sees the file before or the file after, and nothing is left of an attempt that failed. A link under that
/// name is then replaced, not followed; anything else that is no plain file is left alone and makes it false.
/// `mode` is what a new file lets people do, less the umask; a file written atomically is always a new one.
bool writeToFile(const std::vector<std::uint8_t>& data, const char* path, bool atomically,
                 mode_t mode = 0666) noexcept;

/// The type of PNG files.
constexpr const char* kUTTypePNG = "public.png";

/// A file that images are added to. Lifetime: its owner's; nothing is written before it is finalized.
struct CGImageDestination {
    std::string path;
    std::size_t count = 0; ///< How many images there have to be.
    std::vector<CGImageRef> images;
};
using CGImageDestinationRef = std::unique_ptr<CGImageDestination>;

/// Null for no path, a type other than PNG, a count other than 1, and when memory runs out.
CGImageDestinationRef CGImageDestinationCreateWithURL(const char* path, const char* type,
                                                      std::size_t count) noexcept;
/// Null and images beyond the count are ignored.
void CGImageDestinationAddImage(CGImageDestination* destination, CGImageRef image) noexcept;
/// Writes the file as writeToFile does, atomically. False unless all images were added.
bool CGImageDestinationFinalize(const CGImageDestination* destination) noexcept;

} // namespace platform

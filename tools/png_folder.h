// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"
#include "tools/capture_output.h"

#include <cstdint>
#include <string>
#include <utility>

/// A folder that PNG files are put into. Threads: one at a time.
class PngFolder {
public:
    explicit PngFolder(std::string folder) : m_folder(std::move(folder)) {}

    /// Makes it where it isn't there. Fails, too, when nothing can be put into it.
    WriteResult Open();
    /// The file appears whole or not at all, and takes the place of one of that name. `image` may be null:
    /// that is a failure.
    WriteResult Write(const std::string& name, platform::CGImageRef image);

    std::string PathOf(const std::string& name) const;
    std::uint64_t BytesWritten() const { return m_bytes; }

private:
    const std::string m_folder;
    std::uint64_t m_bytes = 0;
};

// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_png_writer.h"

#include "src/share_image_save.h"

#include <array>
#include <cinttypes>
#include <cstdio>

WriteResult PngFolderWriter::Write(IShareFrame& frame) {
    std::array<char, 40> name{};
    std::snprintf(name.data(), name.size(), "frame-%06" PRId64 ".png", m_frames + 1);
    WriteResult failure = m_folder.Write(name.data(), ShareFrameToImage(&frame));
    if (!failure)
        ++m_frames;
    return failure;
}

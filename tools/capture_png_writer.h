// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_writer.h"
#include "tools/png_folder.h"

/// A file a frame: frame-000001.png and so on.
class PngFolderWriter : public FrameWriter {
public:
    explicit PngFolderWriter(std::string folder) : m_folder(std::move(folder)) {}

    WriteResult Open() override { return m_folder.Open(); }
    WriteResult Write(IShareFrame& frame) override;
    WriteResult Finish(unsigned) override { return std::nullopt; }
    std::uint64_t BytesWritten() const override { return m_folder.BytesWritten(); }

private:
    PngFolder m_folder;
};

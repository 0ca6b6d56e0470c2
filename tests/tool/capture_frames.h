// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/platform/image_files.h"
#include "tests/src/share_frame_tools.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <fstream>
#include <iterator>
#include <string>
#include <utility>

/// Frames for writers, and places that they write to.

/// Of one colour, with a timestamp.
inline Held<> PlainFrame(TVLSize size, std::array<unsigned char, 4> rgba, unsigned timestamp) {
    auto frame = NewFrame(size.cx, size.cy, SHARE_FRAME_FORMAT_RGBA);
    frame->SetTimestamp(timestamp);
    for (int i = 0; i < frame->GetFrameDataLen(); ++i)
        frame->GetFrameData()[i] = rgba[static_cast<std::size_t>(i) % 4];
    return frame;
}

inline std::string ReadText(const std::string& file) {
    std::ifstream stream(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
}

/// A named pipe with a reader that has read nothing yet.
class CapturePipe {
public:
    explicit CapturePipe(std::string path)
        : m_path(std::move(path)),
          m_made(mkfifo(m_path.c_str(), 0600)),
          m_reader(open(m_path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC)) {}
    ~CapturePipe() { CloseReader(); }
    CapturePipe(const CapturePipe&) = delete;
    CapturePipe& operator=(const CapturePipe&) = delete;

    bool IsThere() const { return m_made == 0 && m_reader >= 0; }
    const std::string& Path() const { return m_path; }
    void CloseReader() {
        if (m_reader >= 0)
            close(m_reader);
        m_reader = -1;
    }

private:
    const std::string m_path;
    const int m_made;
    int m_reader;
};

// SPDX-License-Identifier: Apache-2.0
#include "png_sink.h"

#include <png.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <utility>

namespace {

// libpng knows every order of channels that a frame can have.
unsigned PngFormatOf(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_RGBA:
            return PNG_FORMAT_RGBA;
        case SHARE_FRAME_FORMAT_ARGB:
            return PNG_FORMAT_ARGB;
        case SHARE_FRAME_FORMAT_RGB:
            return PNG_FORMAT_RGB;
        case SHARE_FRAME_FORMAT_BGRA:
            return PNG_FORMAT_BGRA;
        case SHARE_FRAME_FORMAT_ABGR:
            return PNG_FORMAT_ABGR;
        case SHARE_FRAME_FORMAT_BGR:
            return PNG_FORMAT_BGR;
        case SHARE_FRAME_FORMAT_NONE:
            break;
    }
    return 0;
}

bool WritePng(IShareFrame& frame, const std::string& path, std::string& problem) {
    TVLSize size{};
    frame.GetFrameSize(size);
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    image.width = static_cast<png_uint_32>(size.cx);
    image.height = static_cast<png_uint_32>(size.cy);
    image.format = PngFormatOf(frame.GetFrameDataFormat());
    image.flags = PNG_IMAGE_FLAG_FAST;
    const int written = png_image_write_to_file(&image, path.c_str(), 0, frame.GetFrameData(),
                                                frame.GetFrameLineBytes(), nullptr);
    problem = image.message;
    return written != 0;
}

const char* StatusName(int status) {
    switch (status) {
        case SHARE_CAPTURE_ENGINE_STATUS_STARTED:
            return "started";
        case SHARE_CAPTURE_ENGINE_STATUS_STOPPED:
            return "stopped";
        case SHARE_CAPTURE_ENGINE_STATUS_PAUSED:
            return "paused";
        default:
            return "unknown";
    }
}

const char* ErrorName(int code) {
    switch (code) {
        case SHARE_CAPTURE_DISPLAY_GONE:
            return "the display has gone";
        case SHARE_CAPTURE_NO_SHARED_APP:
            return "no shared application is left";
        default:
            return "told by the capturer";
    }
}

const char* EventName(int type) {
    switch (type) {
        case SHARE_CAPTURE_EVENT_APPS_CROSS_MONITORS:
            return "shared windows lie on several monitors";
        case SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE:
            return "content unavailable";
        default:
            return "told by the capturer";
    }
}

} // namespace

PngSink::PngSink(std::string directory, int every, int frameLimit)
    : m_directory(std::move(directory)),
      m_every(every),
      m_frameLimit(frameLimit),
      m_endFd(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

PngSink::~PngSink() {
    close(m_endFd);
}

void PngSink::OnCaptureDisplaySizeChanged(TVLSize size) {
    std::printf("event: size %dx%d\n", size.cx, size.cy);
}

void PngSink::OnCapturedWindowListChanged(const unsigned* windows, int count) {
    std::string line = "event: " + std::to_string(count) + " windows";
    for (int i = 0; i < count; ++i) {
        line += ' ' + std::to_string(windows[i]);
    }
    std::printf("%s\n", line.c_str());
}

void PngSink::OnCaptureStatusChanged(int status) {
    std::printf("event: status %d (%s)\n", status, StatusName(status));
}

void PngSink::OnCaptureError(int code) {
    std::printf("event: error %d (%s)\n", code, ErrorName(code));
}

void PngSink::OnCapturePositionChanged(int x, int y, int width, int height) {
    std::printf("event: position %d,%d size %dx%d\n", x, y, width, height);
}

void PngSink::OnCaptureEvent(int type, int value, void*) {
    std::printf("event: type %d (%s), value %d\n", type, EventName(type), value);
}

void PngSink::OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    // A frame that is sent again may be one that was never filled.
    if (m_closed || frame == nullptr || frame->GetFrameData() == nullptr || frame->GetFrameDataLen() == 0) {
        return;
    }
    ++m_frames;
    PrintProgress(*frame, rcUpdate);
    if ((m_frames - 1) % m_every == 0) {
        TakePicture(*frame);
    }
    if (m_failed || m_frames == m_frameLimit) {
        CloseLocked();
    }
}

void PngSink::Close() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    CloseLocked();
}

void PngSink::TakePicture(IShareFrame& frame) {
    std::array<char, 32> name{};
    std::snprintf(name.data(), name.size(), "/frame-%06d.png", m_frames);
    const std::string path = m_directory + name.data();
    std::string problem;
    if (WritePng(frame, path, problem)) {
        ++m_files;
        return;
    }
    m_failed = true;
    std::fprintf(stderr, "external_capturer: cannot write %s: %s\n", path.c_str(), problem.c_str());
}

void PngSink::PrintProgress(IShareFrame& frame, const TVLRect& rcUpdate) {
    const auto now = std::chrono::steady_clock::now();
    if (now < m_nextProgress) {
        return;
    }
    m_nextProgress = now + std::chrono::seconds(1);
    TVLSize size{};
    frame.GetFrameSize(size);
    std::printf("frame %d: %dx%d at %u ms, updated %d,%d to %d,%d, %d files so far\n", m_frames, size.cx,
                size.cy, frame.GetTimestamp(), rcUpdate.left, rcUpdate.top, rcUpdate.right, rcUpdate.bottom,
                m_files.load());
}

void PngSink::CloseLocked() {
    m_closed = true;
    const std::uint64_t one = 1;
    if (write(m_endFd, &one, sizeof(one)) < 0) {
        std::perror("external_capturer: cannot end by itself");
    }
}

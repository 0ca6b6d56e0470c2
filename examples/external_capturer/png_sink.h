// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_engine.h>

#include <atomic>
#include <chrono>
#include <mutex>
#include <string>

/// Writes the frames that it gets as numbered PNG files and prints what it hears.
///
/// Encodes inside the callback, which keeps this program short and holds up the next pass for that time; a
/// client with more to do copies the frame and returns. Threads: pictures come on the engine's worker, events
/// on the assist thread, the questions from anywhere. Errors:  the first picture that can't be written is
/// told on standard error and ends the writing: a disk that is
///          full stays full.
class PngSink final : public IShareCaptureEngineSink {
public:
    /// Writes every `every`th frame. With a `frameLimit` above 0, frames after that many are ignored.
    PngSink(std::string directory, int every, int frameLimit);
    ~PngSink();
    PngSink(const PngSink&) = delete;
    PngSink& operator=(const PngSink&) = delete;

    /// No picture is written any more when this has returned.
    void Close();

    /// Readable once no further picture will be written, for whatever reason.
    int GetEndFd() const { return m_endFd; }
    bool HasFailed() const { return m_failed; }
    int GetFileCount() const { return m_files; }
    const std::string& GetDirectory() const { return m_directory; }

    void OnCaptureDisplaySizeChanged(TVLSize size) override;
    void OnCapturedWindowListChanged(const unsigned* windows, int count) override;
    void OnCaptureStatusChanged(int status) override;
    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override;
    void OnCaptureError(int code) override;
    void OnCapturePositionChanged(int x, int y, int width, int height) override;
    void OnCaptureEvent(int type, int value, void* data) override;

private:
    void TakePicture(IShareFrame& frame);
    void PrintProgress(IShareFrame& frame, const TVLRect& rcUpdate);
    void CloseLocked();

    const std::string m_directory;
    const int m_every;
    const int m_frameLimit;
    const int m_endFd;

    std::atomic<bool> m_failed{false};
    std::atomic<int> m_files{0};

    // Held while a picture is being written.
    std::mutex m_mutex;
    int m_frames = 0;
    bool m_closed = false;
    std::chrono::steady_clock::time_point m_nextProgress{};
};

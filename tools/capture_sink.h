// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_writer.h"

#include <screenshare/share_capture_engine.h>

#include <cstdint>
#include <deque>
#include <mutex>
#include <string>
#include <vector>

/// Gives an engine's frames to a writer, and keeps what else it tells until somebody asks.
/// Threads: any. A frame that is being written holds up nothing but the frames behind it, and Close.
/// Lifetime: writer and flag stay longer.
class CaptureSink : public IShareCaptureEngineSink {
public:
    /// `ended` is raised when the writer has `frameLimit` frames (0 for no limit), or failed.
    CaptureSink(FrameWriter& writer, std::int64_t frameLimit, StopFlag& ended)
        : m_writer(writer),
          m_frameLimit(frameLimit),
          m_ended(ended) {}

    void OnCaptureDisplaySizeChanged(TVLSize size) override;
    void OnCapturedWindowListChanged(const unsigned* windows, int count) override;
    void OnCaptureStatusChanged(int status) override;
    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override;
    void OnCaptureError(int code) override;
    void OnCapturePositionChanged(int x, int y, int width, int height) override;
    void OnCaptureEvent(int type, int value, void* data) override;

    /// A line for people, beside the engine's.
    void AddNote(const std::string& text);
    /// What came since the last call, the oldest first. What is told over and over again comes once.
    std::vector<std::string> TakeNotes();
    /// How many events the engine has told.
    std::int64_t EventCount() const;

    /// No frame reaches the writer any more; waits for one that is being written. Gives why writing ended, if
    /// it failed.
    WriteResult Close();

private:
    void AddEvent(const std::string& text);
    WriteResult WriteGuarded(IShareFrame& frame);

    FrameWriter& m_writer;
    const std::int64_t m_frameLimit;
    StopFlag& m_ended;

    std::mutex m_writerMutex;
    bool m_isClosed = false; // guarded by m_writerMutex
    WriteResult m_failure;   // guarded by m_writerMutex

    mutable std::mutex m_notesMutex; // may be taken inside m_writerMutex
    std::deque<std::string> m_notes;
    std::string m_lastEvent;
    std::int64_t m_events = 0;
};

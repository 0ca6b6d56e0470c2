// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_sink.h"

#include "tools/capture_words.h"

#include <exception>
#include <iterator>

namespace {

/// Nobody reads more than that at once; what is older goes.
constexpr std::size_t MOST_NOTES = 1000;

std::string SizeWords(int width, int height) {
    return std::to_string(width) + "x" + std::to_string(height);
}

} // namespace

void CaptureSink::OnCaptureDisplaySizeChanged(TVLSize size) {
    AddEvent("what is shared measures " + SizeWords(size.cx, size.cy));
}

void CaptureSink::OnCapturedWindowListChanged(const unsigned*, int count) {
    AddEvent("windows in the picture: " + std::to_string(count));
}

void CaptureSink::OnCaptureStatusChanged(int status) {
    AddEvent(StatusWords(status));
}

void CaptureSink::OnCaptureError(int code) {
    AddEvent(ErrorWords(code));
}

void CaptureSink::OnCapturePositionChanged(int x, int y, int width, int height) {
    AddEvent("what is shared lies at " + std::to_string(x) + "," + std::to_string(y) + ", " +
             SizeWords(width, height));
}

void CaptureSink::OnCaptureEvent(int type, int value, void*) {
    AddEvent(EventWords(type, value));
}

void CaptureSink::OnCaptureData(IShareFrame* frame, TVLRect&) {
    TVLSize size{};
    frame->GetFrameSize(size);
    const std::lock_guard<std::mutex> lock(m_writerMutex);
    // Where there is no screen to capture just now, frames have no pixels.
    if (m_isClosed || size.cx < 1 || size.cy < 1)
        return;
    m_failure = WriteGuarded(*frame);
    if (m_failure || (m_frameLimit != 0 && m_writer.FrameCount() >= m_frameLimit)) {
        m_isClosed = true;
        m_ended.Raise();
    }
}

WriteResult CaptureSink::WriteGuarded(IShareFrame& frame) {
    try {
        return m_writer.Write(frame);
    } catch (const std::exception& error) {
        return WriteFailure{EXIT_CODE_FAILED, std::string("a frame cannot be written: ") + error.what()};
    }
}

void CaptureSink::AddNote(const std::string& text) {
    const std::lock_guard<std::mutex> lock(m_notesMutex);
    m_notes.push_back(text);
    if (m_notes.size() > MOST_NOTES)
        m_notes.pop_front();
}

void CaptureSink::AddEvent(const std::string& text) {
    {
        const std::lock_guard<std::mutex> lock(m_notesMutex);
        ++m_events;
        // During a drag, the same comes with every picture that is held back.
        if (text == m_lastEvent)
            return;
        m_lastEvent = text;
    }
    AddNote(text);
}

std::vector<std::string> CaptureSink::TakeNotes() {
    const std::lock_guard<std::mutex> lock(m_notesMutex);
    std::vector<std::string> notes(std::make_move_iterator(m_notes.begin()),
                                   std::make_move_iterator(m_notes.end()));
    m_notes.clear();
    return notes;
}

std::int64_t CaptureSink::EventCount() const {
    const std::lock_guard<std::mutex> lock(m_notesMutex);
    return m_events;
}

WriteResult CaptureSink::Close() {
    const std::lock_guard<std::mutex> lock(m_writerMutex);
    m_isClosed = true;
    return m_failure;
}

// SPDX-License-Identifier: Apache-2.0
#include "tests/support/fake_capturer.h"

#include <cstddef>
#include <cstring>
#include <string>
#include <utility>

namespace {

void Paint(IShareFrame& frame, const CFakeCapturer::Answers& picture) {
    frame.SetFrameDataFormat(picture.format);
    frame.SetFrameSize(picture.size);
    frame.SetTimestamp(picture.timestamp);
    frame.SetMetaInfo({picture.rectCapture, false});
    if (frame.GetFrameData() != nullptr)
        std::memset(frame.GetFrameData(), picture.fill, static_cast<std::size_t>(frame.GetFrameDataLen()));
}

} // namespace

void CFakeCapturer::SetResult(int result) {
    Change([result](Answers& answers) { answers.result = result; });
}

void CFakeCapturer::SetFill(unsigned char fill) {
    Change([fill](Answers& answers) { answers.fill = fill; });
}

void CFakeCapturer::ScriptResults(const std::vector<int>& results) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_scripted.assign(results.begin(), results.end());
}

void CFakeCapturer::SetHook(Hook hook) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_hook = std::move(hook);
}

void CFakeCapturer::SetFpsHook(std::function<void()> hook) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_fpsHook = std::move(hook);
}

std::vector<IShareFrame*> CFakeCapturer::CapturedInto() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_capturedInto;
}

CFakeCapturer::Answers CFakeCapturer::Now() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_answers;
}

int CFakeCapturer::LogControl(const char* operation, unsigned value) {
    m_calls.Add(operation + (" " + std::to_string(value)));
    return Now().controlResult;
}

int CFakeCapturer::Capture(IShareFrame* frame) {
    m_calls.Add("Capture");
    Hook hook;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_capturedInto.push_back(frame);
        hook = m_hook;
    }
    if (hook)
        hook(frame);
    Answers answers = Now();
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (!m_scripted.empty()) {
            answers.result = m_scripted.front();
            m_scripted.pop_front();
        }
    }
    if (answers.result == SHARE_CAPTURE_OK)
        Paint(*frame, answers);
    return answers.result;
}

int CFakeCapturer::SetCaptureMaxSize(TVLSize size) {
    m_calls.Add("SetCaptureMaxSize " + std::to_string(size.cx) + "x" + std::to_string(size.cy));
    return Now().maxSizeResult;
}

unsigned CFakeCapturer::GetCurrentCaptureDisplayId() {
    m_calls.Add("GetCurrentCaptureDisplayId");
    return Now().display;
}

int CFakeCapturer::GetCurrentCaptureSourceSize(TVLSize& size) {
    m_calls.Add("GetCurrentCaptureSourceSize");
    size = Now().sourceSize;
    return SHARE_RESULT_OK;
}

int CFakeCapturer::GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) {
    m_calls.Add("GetCurrentCaptureSourcePosition");
    const TVLRect position = Now().sourcePosition;
    x = position.left;
    y = position.top;
    width = position.right;
    height = position.bottom;
    return SHARE_RESULT_OK;
}

int CFakeCapturer::GetCaptureShareSourceCount() {
    return Now().sourceCount;
}

int CFakeCapturer::AddSharedWindow(unsigned window) {
    return LogControl("AddSharedWindow", window);
}

int CFakeCapturer::AddSharedProcess(unsigned pid) {
    return LogControl("AddSharedProcess", pid);
}

int CFakeCapturer::RemoveSharedProcess(unsigned pid) {
    return LogControl("RemoveSharedProcess", pid);
}

int CFakeCapturer::AddUnSharedProcess(unsigned pid) {
    return LogControl("AddUnSharedProcess", pid);
}

int CFakeCapturer::SelectSharedDisplay(unsigned display) {
    return LogControl("SelectSharedDisplay", display);
}

bool CFakeCapturer::PointerCaptured() {
    m_calls.Add("PointerCaptured");
    return Now().pointerCaptured;
}

int CFakeCapturer::SetFPS(int fps) {
    std::function<void()> hook;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        hook = m_fpsHook;
    }
    if (hook)
        hook();
    return LogControl("SetFPS", static_cast<unsigned>(fps));
}

bool CFakeCapturer::IsWindowAreaBaseContentSupport() {
    m_calls.Add("IsWindowAreaBaseContentSupport");
    return Now().windowAreaSupport;
}

float CFakeCapturer::GetScaleFactor() const {
    m_calls.Add("GetScaleFactor");
    return Now().scaleFactor;
}

void CFakeCapturer::Stop() {
    m_calls.Add("capturer Stop");
}

int CFakeCapturer::AddSink(IShareCapturerSink* sink) {
    m_calls.Add("capturer AddSink");
    return CShareCapturerBase::AddSink(sink);
}

int CFakeCapturer::RemoveSink(IShareCapturerSink* sink) {
    m_calls.Add("capturer RemoveSink");
    return CShareCapturerBase::RemoveSink(sink);
}

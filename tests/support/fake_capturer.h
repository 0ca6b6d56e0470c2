// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/call_log.h"

#include <screenshare/share_capturer_base.h>

#include <deque>
#include <functional>
#include <mutex>
#include <vector>

/// A capturer that answers what it was told to, and logs what it was asked.
/// Threads: any; the answers may change while a worker captures.
class CFakeCapturer : public CShareCapturerBase {
public:
    /// What it answers, and the picture that a good capture leaves in the frame.
    struct Answers {
        int result = SHARE_CAPTURE_OK;
        TVLSize size{8, 4};
        SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_BGRA;
        unsigned char fill = 1;
        TVLRect rectCapture{};
        unsigned timestamp = 0;
        int maxSizeResult = SHARE_RESULT_OK;
        bool pointerCaptured = false;
        float scaleFactor = 1.0F;
        TVLSize sourceSize{};
        TVLRect sourcePosition{}; // x, y, width, height
        unsigned display = SHARE_INVALID_DISPLAY;
        int sourceCount = 0;
        bool windowAreaSupport = false;
        int controlResult = SHARE_RESULT_OK; // of every operation that sets or adds something
    };
    using Hook = std::function<void(IShareFrame*)>;

    explicit CFakeCapturer(CCallLog& calls) : m_calls(calls) {}
    ~CFakeCapturer() override { m_calls.Add("capturer deleted"); }

    template <class Setter>
    void Change(Setter change) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        change(m_answers);
    }
    void SetResult(int result);
    void SetFill(unsigned char fill);
    /// The results of the next captures; when they are used up, Answers::result holds again.
    void ScriptResults(const std::vector<int>& results);
    /// Runs inside Capture, before the picture is made; may throw or block.
    void SetHook(Hook hook);
    /// Runs inside SetFPS.
    void SetFpsHook(std::function<void()> hook);

    /// The frames that captures were asked to fill, in order.
    std::vector<IShareFrame*> CapturedInto() const;
    /// What AddSink was given last, null after RemoveSink.
    IShareCapturerSink* Sink() const { return GetSink(); }

    int Capture(IShareFrame* frame) override;
    int SetCaptureMaxSize(TVLSize size) override;
    unsigned GetCurrentCaptureDisplayId() override;
    int GetCurrentCaptureSourceSize(TVLSize& size) override;
    int GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) override;
    int GetCaptureShareSourceCount() override;
    int AddSharedWindow(unsigned window) override;
    int AddSharedProcess(unsigned pid) override;
    int RemoveSharedProcess(unsigned pid) override;
    int AddUnSharedProcess(unsigned pid) override;
    int SelectSharedDisplay(unsigned display) override;
    bool PointerCaptured() override;
    int SetFPS(int fps) override;
    bool IsWindowAreaBaseContentSupport() override;
    float GetScaleFactor() const override;
    void Stop() override;
    int AddSink(IShareCapturerSink* sink) override;
    int RemoveSink(IShareCapturerSink* sink) override;

private:
    Answers Now() const;
    int LogControl(const char* operation, unsigned value);

    CCallLog& m_calls;
    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    Answers m_answers;
    std::deque<int> m_scripted;
    Hook m_hook;
    std::function<void()> m_fpsHook;
    std::vector<IShareFrame*> m_capturedInto;
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capturer.h>

/// Where a client's own capturer starts: derive from it and override Capture, and whatever else matters.
///
/// Keeps no sources and one sink, the engine's, which a capturer reaches through GetSink. Nothing here takes
/// a lock; the engine never makes two calls at once. GetSink is for the thread that Capture runs on.
class CShareCapturerBase : public IShareCapturer {
public:
    int AddCaptureShareSource(IShareSource*) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveCaptureShareSource(IShareSource*) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int GetCaptureShareSourceCount() override { return 0; }
    IShareSource* GetCaptureShareSource(int) override { return nullptr; }

    int Capture(IShareFrame* frame) override = 0;

    int SetCaptureMaxSize(TVLSize) override { return SHARE_RESULT_OK; }
    unsigned GetCurrentCaptureDisplayId() override { return SHARE_INVALID_DISPLAY; }
    int GetCurrentCaptureSourceSize(TVLSize&) override { return SHARE_RESULT_FAILED; }
    int GetCurrentCaptureSourcePosition(int&, int&, int&, int&) override { return SHARE_RESULT_FAILED; }
    int SetFilterSelf(bool) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int AddSharedWindow(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveSharedWindow(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int AddUnSharedWindow(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveUnSharedWindow(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int AddSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int AddUnSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveUnSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int SelectSharedDisplay(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    bool IsAppShared(unsigned) override { return false; }
    bool IsWindowShared(unsigned) override { return false; }
    bool PointerCaptured() override { return false; }
    int SetFPS(int) override { return SHARE_RESULT_NOT_SUPPORTED; }
    bool Reinit() override { return false; }
    bool IsWindowAreaBaseContentSupport() override { return false; }
    int SetCaptureThreadCount(unsigned) override { return SHARE_RESULT_NOT_SUPPORTED; }
    float GetScaleFactor() const override { return 1.0F; }
    void Stop() override {}

    int AddSink(IShareCapturerSink* sink) override {
        if (sink == nullptr || m_sink != nullptr)
            return SHARE_RESULT_FAILED;
        m_sink = sink;
        return SHARE_RESULT_OK;
    }
    int RemoveSink(IShareCapturerSink* sink) override {
        if (sink == nullptr || m_sink != sink)
            return SHARE_RESULT_FAILED;
        m_sink = nullptr;
        return SHARE_RESULT_OK;
    }
    int CleanSink() override {
        m_sink = nullptr;
        return SHARE_RESULT_OK;
    }

    int RemoveCaptureShareSourceApp(unsigned) override { return SHARE_RESULT_FAILED; }
    bool IsIpcCapturer() const override { return false; }

protected:
    /// The engine, between its Start and its Stop; null otherwise.
    IShareCapturerSink* GetSink() const { return m_sink; }

private:
    IShareCapturerSink* m_sink = nullptr;
};

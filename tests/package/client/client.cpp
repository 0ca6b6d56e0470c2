// SPDX-License-Identifier: Apache-2.0
// Uses the installed library as a stranger would: a capturer and a sink of its own, three frames, the end.
#include <screenshare/share_engine.h>

#include <condition_variable>
#include <cstdio>
#include <mutex>

namespace {

class WhiteCapturer : public CShareCapturerBase {
public:
    int Capture(IShareFrame* frame) override {
        unsigned char pixels[8 * 4 * 4];
        for (unsigned char& byte : pixels)
            byte = static_cast<unsigned char>(m_pass);
        ++m_pass;
        frame->SetFrameSize(8, 4);
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
        frame->WriteFrameData(pixels, sizeof pixels);
        return SHARE_CAPTURE_OK;
    }

private:
    int m_pass = 0;
};

class CountingSink : public IShareCaptureEngineSink {
public:
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame* frame, TVLRect&) override {
        const std::lock_guard<std::mutex> lock(m_mutex);
        TVLSize size = {0, 0};
        frame->GetFrameSize(size);
        if (size.cx == 8 && size.cy == 4)
            ++m_frames;
        m_arrived.notify_one();
    }
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    void WaitForFrames(int count) {
        std::unique_lock<std::mutex> lock(m_mutex);
        m_arrived.wait(lock, [&] { return m_frames >= count; });
    }

private:
    std::mutex m_mutex;
    std::condition_variable m_arrived;
    int m_frames = 0;
};

} // namespace

int main() {
    ShareEngineInit();
    WhiteCapturer capturer;
    CountingSink sink;
    IShareCaptureEngine* engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    engine->SetExternalIShareCapturer(&capturer);
    engine->SetSink(&sink);
    engine->SetCaptureFps(60);
    if (engine->Start() != SHARE_RESULT_OK)
        return 1;
    sink.WaitForFrames(3);
    if (DestroyShareCaptureEngine(engine) != SHARE_RESULT_OK)
        return 1;
    ShareEngineUninit();
    std::puts("three frames");
    return 0;
}

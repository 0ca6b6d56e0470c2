// SPDX-License-Identifier: Apache-2.0
// The shortest whole client: shares a desktop and prints what arrives. Put a debug file that asks for dummies
// into SCREENSHARE_DEBUG_DIR, and it needs no screen: minimal_client.sh does that.
#include <screenshare/share_engine.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <mutex>

namespace {

class PrintingSink : public IShareCaptureEngineSink {
public:
    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override {
        TVLSize size = {0, 0};
        frame->GetFrameSize(size);
        std::printf("frame %dx%d, line %d bytes, format %d, at %u ms, shared part %d,%d to %d,%d\n", size.cx,
                    size.cy, frame->GetFrameLineBytes(), frame->GetFrameDataFormat(), frame->GetTimestamp(),
                    rcUpdate.left, rcUpdate.top, rcUpdate.right, rcUpdate.bottom);
        const std::lock_guard<std::mutex> lock(m_mutex);
        --m_left;
        m_arrived.notify_one();
    }
    void OnCaptureStatusChanged(int status) override { std::printf("status %d\n", status); }
    void OnCaptureError(int code) override { std::printf("error %d\n", code); }
    void OnCaptureEvent(int type, int value, void*) override { std::printf("event %d: %d\n", type, value); }
    void OnCaptureDisplaySizeChanged(TVLSize size) override { std::printf("size %dx%d\n", size.cx, size.cy); }
    void OnCapturePositionChanged(int x, int y, int width, int height) override {
        std::printf("position %d,%d %dx%d\n", x, y, width, height);
    }
    void OnCapturedWindowListChanged(const unsigned*, int count) override {
        std::printf("%d windows\n", count);
    }

    bool Wait() {
        std::unique_lock<std::mutex> lock(m_mutex);
        return m_arrived.wait_for(lock, std::chrono::seconds(30), [this] { return m_left <= 0; });
    }

private:
    std::mutex m_mutex;
    std::condition_variable m_arrived;
    int m_left = 5; // frames
};

int Share(IShareCaptureEngine* engine, IShareSource* monitor) {
    PrintingSink sink;
    engine->AddCaptureShareSource(monitor);
    engine->SetSink(&sink);
    engine->SetCaptureFps(10);
    int result = engine->Start();
    if (result == SHARE_RESULT_OK && !sink.Wait())
        result = SHARE_RESULT_FAILED;
    DestroyShareCaptureEngine(engine); // stops it first: no call of the sink comes after this
    return result;
}

} // namespace

int main() {
    ShareEngineInit();
    // The first engine reads the debug file, so it comes before what should be a dummy.
    IShareCaptureEngine* engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    IShareSourceEnumerator* monitors =
        CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
    monitors->Refresh();
    IShareSource* monitor = nullptr;
    monitors->GetSource(0, &monitor);
    const int result = Share(engine, monitor);
    if (monitor != nullptr)
        monitor->Release();
    DestroyShareSourceEnumerator(monitors);
    ShareEngineUninit();
    std::printf("result %d\n", result);
    return result == SHARE_RESULT_OK ? EXIT_SUCCESS : EXIT_FAILURE;
}

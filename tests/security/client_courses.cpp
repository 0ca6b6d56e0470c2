// SPDX-License-Identifier: Apache-2.0
#include "tests/security/client_courses.h"

#include "src/share_frame.h"
#include "tests/security/scarce_memory.h"

#include <screenshare/share_engine.h>

#include <sys/types.h>
#include <array>
#include <memory>

namespace {

constexpr unsigned MAIN = 1;
constexpr unsigned EDITOR = 5'000'100;
constexpr unsigned TEXT = 2;
constexpr unsigned SECRET = 3;

class CHearsSources final : public IShareSourceEnumSink {
public:
    int OnShareSourceEvent(SHARE_SOURCE_EVENT, IShareSource*) override { return 0; }
};

class CHearsPointer final : public ISharePointingSink {
public:
    int OnPointingPosChanged(int, int) override { return 0; }
    int OnPointingImgChanged(ISharePointingImg*) override { return 0; }
};

class CHearsWindows final : public ITvlEnumWindowsCallback {
public:
    bool OnWindow(unsigned) override { return true; }
};

class CTakesThumbnails final : public ThumbnailCallback {
public:
    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return true; }
    bool onWindowThumbnail(unsigned, ImageData, bool, bool) override { return true; }
    bool onThumbnailError(int) override { return true; }
};

void LookAtSource(IShareSource& source) {
    std::array<char, SHARE_SOURCE_TEXT_SIZE + 1> text{};
    source.GetName(text.data(), SHARE_SOURCE_TEXT_SIZE);
    source.GetDeviceName(text.data(), SHARE_SOURCE_TEXT_SIZE);
    source.GetSourceRect(true);
}

void ListSources(SHARE_SOURCE_ENUMERATOR_TYPE type) {
    IShareSourceEnumerator* const list = CreateShareSourceEnumerator(type, true);
    if (list == nullptr)
        return;
    CHearsSources sink;
    list->AddSink(&sink);
    list->Refresh();
    int number = 0;
    list->GetNumber(number);
    for (int i = 0; i < number; ++i) {
        IShareSource* source = nullptr;
        if (list->GetSource(i, &source) != 0 || source == nullptr)
            continue;
        LookAtSource(*source);
        source->Release();
    }
    IShareSource* removed = nullptr;
    if (list->RemoveSourceById(type == SHARE_SOURCE_ENUMERATOR_TYPE_APP ? EDITOR : MAIN, &removed))
        removed->Release();
    list->Refresh();
    list->RemoveSink(&sink);
    list->Cleanup();
    DestroyShareSourceEnumerator(list);
}

void PollPointer() {
    ISharePointing* const pointing = CreateSharePointing(SHARE_POINTING_TYPE_MOUSE, MAIN);
    if (pointing == nullptr)
        return;
    CHearsPointer sink;
    pointing->AddSink(&sink);
    pointing->Start();
    pointing->SetBaseDisplayID(MAIN);
    pointing->CapturePoint(SHARE_FRAME_FORMAT_BGRA);
    pointing->CapturePoint(SHARE_FRAME_FORMAT_BGRA);
    pointing->Stop();
    pointing->RemoveSink(&sink);
    DestroySharePointing(pointing);
}

IShareFrame* NewClientFrame() {
    const CPlentyScope plenty; // the client's own
    IShareFrame* const frame = new CShareFrame;
    frame->AddRef();
    return frame;
}

void CaptureAlone(SHARE_CAPTURER_TYPE type) {
    std::shared_ptr<ShareCapturerContext> context;
    IShareCapturer* const capturer = CreateShareCapture(type, context);
    if (capturer == nullptr)
        return;
    IShareFrame* const frame = NewClientFrame();
    capturer->SelectSharedDisplay(MAIN);
    capturer->AddSharedProcess(EDITOR);
    capturer->AddSharedWindow(TEXT);
    capturer->AddUnSharedWindow(SECRET);
    capturer->SetFilterSelf(true);
    capturer->SetCaptureMaxSize({200, 120});
    capturer->SetFPS(5);
    capturer->SetCaptureThreadCount(1);
    capturer->Capture(frame);
    TVLSize size{};
    capturer->GetCurrentCaptureSourceSize(size);
    capturer->RemoveSharedProcess(EDITOR);
    capturer->Stop();
    DestroyShareCapture(capturer);
    frame->Release();
}

void RunAnotherEngine() {
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    if (engine == nullptr)
        return;
    engine->SelectSharedDisplay(MAIN);
    engine->AddUnSharedWindow(SECRET);
    engine->Start();
    engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD);
    engine->Pause();
    engine->Resume();
    engine->Stop();
    DestroyShareCaptureEngine(engine);
}

void AskForThumbnails() {
    CTakesThumbnails takes;
    const unsigned windows[] = {TEXT, SECRET};
    EnumWindowThumbnail(windows, 2, &takes);
    EnumAppThumbnail(&EDITOR, 1, &takes);
    EnumAppThumbnail(nullptr, 0, &takes);
    CancelThumbnail(&takes);
}

void SetForAll() {
    const unsigned flags = 0;
    ShareConfig(SHARE_CONFIG_FLAG, &flags, sizeof flags);
    EnableScreenShareDump(false);
    EnableChangeAeroMode(false);
    EnableScreenShareHWEncode();
    ShareEngineInit();
    UseShareLib();
    ReleaseShareLib();
    ReleaseShareLib();
}

void LookAtWindows() {
    CHearsWindows hears;
    TvlEnumWindows(&hears, 0);
    ShareWindowInfo info{};
    ShareGetWindowInfo(TEXT, &info);
}

} // namespace

const std::vector<ClientCourse>& ClientCourses() {
    static const std::vector<ClientCourse> courses{
        {"monitors", [] { ListSources(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR); }},
        {"applications", [] { ListSources(SHARE_SOURCE_ENUMERATOR_TYPE_APP); }},
        {"pointer", PollPointer},
        {"desktop capturer", [] { CaptureAlone(SHARE_CAPTURER_TYPE_DESKTOP); }},
        {"application capturer", [] { CaptureAlone(SHARE_CAPTURER_TYPE_APP); }},
        {"window capturer", [] { CaptureAlone(SHARE_CAPTURER_TYPE_WINDOW); }},
        {"dummy capturer", [] { CaptureAlone(SHARE_CAPTURER_TYPE_DUMMY); }},
        {"engine", RunAnotherEngine},
        {"thumbnails", AskForThumbnails},
        {"windows", LookAtWindows},
        {"settings", SetForAll},
    };
    return courses;
}

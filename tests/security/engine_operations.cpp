// SPDX-License-Identifier: Apache-2.0
#include "tests/security/engine_operations.h"

namespace {

constexpr unsigned NO_WINDOW = 777;
constexpr unsigned NO_PROCESS = 5'000'900;
constexpr unsigned MAIN = 1;

template <SHARE_CAPTURE_ENGINE_CONFIG selector, class Value>
int Configure(IShareCaptureEngine& engine) {
    Value value{};
    return engine.Config(selector, &value, sizeof value);
}

/// The first monitor, as a client picks it.
int AddMonitor(IShareCaptureEngine& engine) {
    IShareSourceEnumerator* const monitors =
        CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
    if (monitors == nullptr)
        return SHARE_RESULT_FAILED;
    monitors->Refresh();
    IShareSource* source = nullptr;
    int result = monitors->GetSourceBySourceId(MAIN, &source);
    if (result == SHARE_RESULT_OK) {
        result = engine.AddCaptureShareSource(source);
        source->Release();
    }
    DestroyShareSourceEnumerator(monitors);
    return result;
}

int RemoveFirstSource(IShareCaptureEngine& engine) {
    IShareSource* const source = engine.GetCaptureShareSource(0);
    return source != nullptr ? engine.RemoveCaptureShareSource(source) : SHARE_RESULT_OK;
}

/// Another limit each time, all of them larger than the picture.
int Limit(IShareCaptureEngine& engine) {
    static unsigned calls = 0;
    return engine.SetCaptureMaxFrameSize(400 + ++calls % 50, 400);
}

int ChangeMode(IShareCaptureEngine& engine) {
    SHARE_CAPTURE_STATISTIC statistic{};
    engine.GetShareCaptureStatistic(statistic);
    return engine.SetCaptureMode(statistic.eCaptureMode == SCREEN_CAPTURER_TYPE_DEFAULT
                                     ? SCREEN_CAPTURER_TYPE_AVFOUNDATION
                                     : SCREEN_CAPTURER_TYPE_DEFAULT);
}

int Ask(IShareCaptureEngine& engine) {
    SHARE_CAPTURE_STATISTIC statistic{};
    TVLSize size{};
    engine.GetCaptureEngineType();
    engine.GetCaptureStatus();
    engine.GetCaptureSize(size);
    engine.IsAppShared(NO_PROCESS);
    engine.IsWindowShared(NO_WINDOW);
    engine.GetCaptureShareSourceCount();
    engine.GetCaptureShareSource(0);
    return engine.GetShareCaptureStatistic(statistic);
}

int ConfigureAll(IShareCaptureEngine& engine) {
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_WINDOW_BASE_AREA, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_EXCLUDE_MENUBAR, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_DISABLE_SYSTEM_ANIMATION, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_MAG_CATCH_EXCEPTION, bool>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_MAG_MAX_EXCLUDE_WINDOW_COUNT, int>(engine);
    Configure<SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_IPC_SCREEN_CAPTURER, bool>(engine);
    return Configure<SHARE_CAPTURE_ENGINE_CONFIG_SHARE_CONTENT_TYPE, unsigned>(engine);
}

} // namespace

const std::vector<EngineOperation>& EngineOperations() {
    using Engine = IShareCaptureEngine;
    static const std::vector<EngineOperation> operations{
        {"Start", [](Engine& engine) { return engine.Start(); }},
        {"Pause", [](Engine& engine) { return engine.Pause(); }},
        {"Resume", [](Engine& engine) { return engine.Resume(); }},
        {"SetCaptureFps", [](Engine& engine) { return engine.SetCaptureFps(5); }},
        {"SetCaptureMaxFrameSize", Limit},
        {"SetFilterSelf", [](Engine& engine) { return engine.SetFilterSelf(true); }},
        {"AddSharedWindow", [](Engine& engine) { return engine.AddSharedWindow(NO_WINDOW); }},
        {"RemoveSharedWindow", [](Engine& engine) { return engine.RemoveSharedWindow(NO_WINDOW); }},
        {"AddUnSharedWindow", [](Engine& engine) { return engine.AddUnSharedWindow(NO_WINDOW); }},
        {"RemoveUnSharedWindow", [](Engine& engine) { return engine.RemoveUnSharedWindow(NO_WINDOW); }},
        {"AddSharedProcess", [](Engine& engine) { return engine.AddSharedProcess(NO_PROCESS); }},
        {"RemoveSharedProcess", [](Engine& engine) { return engine.RemoveSharedProcess(NO_PROCESS); }},
        {"AddUnSharedProcess", [](Engine& engine) { return engine.AddUnSharedProcess(NO_PROCESS); }},
        {"RemoveUnSharedProcess", [](Engine& engine) { return engine.RemoveUnSharedProcess(NO_PROCESS); }},
        {"SelectSharedDisplay", [](Engine& engine) { return engine.SelectSharedDisplay(MAIN); }},
        {"AddCaptureShareSource", AddMonitor},
        {"RemoveCaptureShareSource", RemoveFirstSource},
        {"SetCaptureMode", ChangeMode},
        {"SetCaptureMode back", ChangeMode},
        {"SetAppShareBackgroundColor", [](Engine& engine) { return engine.SetAppShareBackgroundColor(1); }},
        {"SetCaptureThreadCount", [](Engine& engine) { return engine.SetCaptureThreadCount(2); }},
        {"SetExternalIShareCapturer",
         [](Engine& engine) { return engine.SetExternalIShareCapturer(nullptr); }},
        {"EnableExternalISharePointing",
         [](Engine& engine) { return engine.EnableExternalISharePointing(false); }},
        {"Config", ConfigureAll},
        {"the questions", Ask},
        {"SetSink", [](Engine& engine) { return engine.SetSink(nullptr); }},
        {"Stop", [](Engine& engine) { return engine.Stop(); }},
    };
    return operations;
}

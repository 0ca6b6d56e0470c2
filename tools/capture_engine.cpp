// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_engine.h"

#include <screenshare/share_engine.h>

#include <functional>
#include <utility>

namespace {

int ShareMonitor(IShareCaptureEngine& engine, unsigned monitor) {
    IShareSourceEnumerator* const monitors =
        CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
    if (monitors == nullptr)
        return SHARE_RESULT_FAILED;
    monitors->Refresh();
    IShareSource* source = nullptr;
    int result = monitors->GetSourceBySourceId(monitor, &source);
    if (result == SHARE_RESULT_OK) {
        result = engine.AddCaptureShareSource(source);
        source->Release();
    }
    DestroyShareSourceEnumerator(monitors);
    return result;
}

using TakeId = int (IShareCaptureEngine::*)(unsigned);

/// The first result that isn't 0.
int Take(IShareCaptureEngine& engine, TakeId take, const std::vector<unsigned>& ids) {
    for (const unsigned id : ids) {
        if (const int result = (engine.*take)(id); result != SHARE_RESULT_OK)
            return result;
    }
    return SHARE_RESULT_OK;
}

int TakeShared(IShareCaptureEngine& engine, const ShareRequest& request) {
    switch (EngineTypeOf(request)) {
        case SHARE_CAPTURE_ENGINE_TYPE_WINDOW:
            return Take(engine, &IShareCaptureEngine::AddSharedWindow, request.windows);
        case SHARE_CAPTURE_ENGINE_TYPE_APP:
            return Take(engine, &IShareCaptureEngine::AddSharedProcess, request.apps);
        default:
            return ShareMonitor(engine, *request.monitor);
    }
}

int TakeKeptOut(IShareCaptureEngine& engine, const ShareRequest& request) {
    const int result = Take(engine, &IShareCaptureEngine::AddUnSharedProcess, request.excludedApps);
    return result != SHARE_RESULT_OK
               ? result
               : Take(engine, &IShareCaptureEngine::AddUnSharedWindow, request.excludedWindows);
}

EngineAnswer AnswerOf(int result, const std::string& what) {
    if (result == SHARE_RESULT_OK)
        return {};
    return {EXIT_CODE_FAILED, what + ": the engine answers " + std::to_string(result)};
}

int SetForm(IShareCaptureEngine& engine, const CaptureOptions& options) {
    if (!options.showsPointer) {
        const unsigned flags = SHARE_CONFIG_FLAG_NO_POINTER;
        ShareConfig(SHARE_CONFIG_FLAG, &flags, sizeof flags);
    }
    // Its answer is the capturer's, of which the way by window images has no rate of its own and says so.
    engine.SetCaptureFps(options.fps);
    bool holdsDuplicates = true;
    const int result =
        engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &holdsDuplicates, sizeof holdsDuplicates);
    if (result != SHARE_RESULT_OK || options.maxSize == TVLSize{})
        return result;
    return engine.SetCaptureMaxFrameSize(static_cast<unsigned>(options.maxSize.cx),
                                         static_cast<unsigned>(options.maxSize.cy));
}

} // namespace

void DestroyEngine::operator()(IShareCaptureEngine* engine) const {
    DestroyShareCaptureEngine(engine);
}

SHARE_CAPTURE_ENGINE_TYPE EngineTypeOf(const ShareRequest& request) {
    if (!request.windows.empty())
        return SHARE_CAPTURE_ENGINE_TYPE_WINDOW;
    return request.apps.empty() ? SHARE_CAPTURE_ENGINE_TYPE_DESKTOP : SHARE_CAPTURE_ENGINE_TYPE_APP;
}

EngineAnswer SetUpEngine(IShareCaptureEngine& engine, const CaptureOptions& options,
                         IShareCaptureEngineSink& sink) {
    const ShareRequest& request = options.request;
    const std::pair<const char*, std::function<int()>> steps[] = {
        {"this way of capturing is refused", [&] { return engine.SetCaptureMode(options.mode); }},
        {"it cannot be shared", [&] { return TakeShared(engine, request); }},
        {"it cannot be kept out", [&] { return TakeKeptOut(engine, request); }},
        {"frames cannot be made like that", [&] { return SetForm(engine, options); }},
        {"frames have nowhere to go", [&] { return engine.SetSink(&sink); }},
    };
    for (const auto& [problem, take] : steps) {
        if (const int result = take(); result != SHARE_RESULT_OK)
            return AnswerOf(result, problem);
    }
    return {};
}

EngineAnswer StartEngine(IShareCaptureEngine& engine) {
    return AnswerOf(engine.Start(), "the capture does not start");
}

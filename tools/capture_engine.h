// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_options.h"
#include "tools/exit_code.h"

#include <screenshare/share_capture_engine.h>

#include <memory>
#include <string>

struct DestroyEngine {
    void operator()(IShareCaptureEngine* engine) const;
};
/// Stopped and destroyed at its end, on a thread that is not inside one of its callbacks.
using EngineHandle = std::unique_ptr<IShareCaptureEngine, DestroyEngine>;

struct EngineAnswer {
    ExitCode code = EXIT_CODE_DONE;
    std::string problem{}; ///< For people; empty when there is none.
};

/// The kind of engine that a completed request is for.
SHARE_CAPTURE_ENGINE_TYPE EngineTypeOf(const ShareRequest& request);

/// Tells the engine what to share, what to keep out and how. What can't be kept out is a problem, so that
/// nothing is captured then.
EngineAnswer SetUpEngine(IShareCaptureEngine& engine, const CaptureOptions& options,
                         IShareCaptureEngineSink& sink);

EngineAnswer StartEngine(IShareCaptureEngine& engine);

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_engine.h>

#include <memory>

/// A capturer that ends itself with DestroyShareCapture when the last share goes; null when there is none:
/// the engine then refuses to start.
std::shared_ptr<IShareCapturer> MakeOwnCapturer(SHARE_CAPTURER_TYPE type,
                                                std::shared_ptr<ShareCapturerContext>& context);

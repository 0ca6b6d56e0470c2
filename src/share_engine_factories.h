// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capturer_types.h>

#include <memory>

class IShareCapturer;
class ISharePointing;

/// The makers of an engine's parts. Null where no such part exists: the engine then refuses to start, or runs
/// without a pointer.
IShareCapturer* CreateShareCapture(SHARE_CAPTURER_TYPE type, std::shared_ptr<ShareCapturerContext>& context);
int DestroyShareCapture(IShareCapturer* capturer);
ISharePointing* CreateSharePointing(SHARE_POINTING_TYPE type, unsigned baseDisplay);
int DestroySharePointing(ISharePointing* pointing);

/// A capturer that ends itself with DestroyShareCapture when the last share goes; null when there is none.
std::shared_ptr<IShareCapturer> MakeOwnCapturer(SHARE_CAPTURER_TYPE type,
                                                std::shared_ptr<ShareCapturerContext>& context);

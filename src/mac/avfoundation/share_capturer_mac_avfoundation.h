// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/avfoundation/share_capturer_session.h"

#include <memory>

/// The session back-end: the session's whole picture, with flat colours over what must not be seen. The
/// pointer is in the session's picture.
/// Threads: those of the protocol.
class ShareCapturerAVFoundation : public ShareCapturerSession {
public:
    ShareCapturerAVFoundation() : ShareCapturerSession("ShareCapturerAVFoundation") {}
    ~ShareCapturerAVFoundation() override;

    using ShareCapturerSession::init;
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;
    void initCapturer();
    /// Does nothing.
    void initCapturerByData(unsigned char* data, unsigned long length);

    unsigned captureToIShareFrame(IShareFrame* frame) override;
    /// False when the session can't go over to it; the display has changed all the same.
    bool setCaptureDisplay(unsigned display) override;
    platform::CGRect getCaptureRect() override;
    unsigned char pointerCaptured() override { return 1; }

private:
    int _captureToIShareFrame(IShareFrame* frame);
    bool HideUnshared(IShareFrame& frame, const TVLRect& box) const;
};

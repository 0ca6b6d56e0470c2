// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_mac.h"

/// A back-end that captures nothing and answers with fixed values, for whoever needs some back-end. No
/// capturer chooses it. Threads: one at a time.
class ShareCapturerDummy : public ShareCapturerMac {
public:
    /// With a context that it makes itself.
    bool init();
    /// The context is not looked at.
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;

    void initScreenSize() {}
    void initCapturer() {}
    void initCapturerByData(unsigned char*, int) {}

    unsigned char* capture() override { return nullptr; }
    unsigned captureToIShareFrame(IShareFrame* frame) override;
    bool setCaptureDisplay(unsigned display) override;
    unsigned getCaptureDisplay() override { return m_nCapturedDisplayId; }
    void setMaxSize(TVLSize size) override;
    platform::CGRect getCaptureRect() override { return m_rectCapturedDisplay; }
    unsigned getSharedAppCount() override { return 0; }
    TVLSize getFrameSize() override { return m_sizeCapture; }
    unsigned char pointerCaptured() override { return 0; }
    unsigned setCaptureThreadCount(unsigned count) override;
    bool IsWindowAreaBaseContentSupport() override { return false; }

protected:
    unsigned m_nCapturedDisplayId = 0;
    platform::CGRect m_rectCapturedDisplay;
    TVLSize m_sizeCapture{};
    TVLSize m_szMaxCapture{};
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_cgs.h"
#include "src/mac/share_standing_picture.h"

#include <memory>
#include <mutex>
#include <optional>

/// The default back-end, which every other one falls back to: each picture is made inside the capture that
/// asks for it, of window images. What a frame shows already is not made again while nothing has changed.
/// Threads: those of the protocol.
class ShareCapturerTovel : public ShareCapturerCGS {
public:
    ShareCapturerTovel() : ShareCapturerCGS("ShareCapturerTovel") {}
    ~ShareCapturerTovel() override;

    using ShareCapturerCGS::init;
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;

    unsigned captureToIShareFrame(IShareFrame* frame) override;
    unsigned char pointerCaptured() override;

private:
    /// Nothing while each capture has to be made.
    std::optional<ShareStandingPicture::Terms> TermsInForce();
    bool CaptureShort(IShareFrame& frame);
    bool CaptureSameWindows(IShareFrame& frame, const ShareStandingPicture::Terms& terms);
    int CaptureAnew(IShareFrame& frame);
    void Keep(IShareFrame& frame, const std::optional<ShareStandingPicture::Terms>& terms);

    std::mutex m_bmpContextLock; // held throughout a picture
    ShareStandingPicture m_standing;
    unsigned m_nRgbValue = 0; // the background when it was made; passes look at the one in force
    std::unique_ptr<CShareCGSCapturer> m_cgsCapturer;
};

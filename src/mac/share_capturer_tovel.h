// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_mac.h"
#include "src/mac/share_monitor_draging_mac.h"
#include "src/share_atomic.h"

#include <memory>
#include <mutex>

namespace platform {
struct NSNotification;
} // namespace platform

/// A rectangle of the desktop whose parts may be of neighbouring writes.
class ShareRelaxedCGRect {
public:
    operator platform::CGRect() const { // NOLINT(google-explicit-constructor)
        return {{m_x, m_y}, {m_width, m_height}};
    }
    ShareRelaxedCGRect& operator=(const platform::CGRect& rect) {
        m_x = rect.origin.x;
        m_y = rect.origin.y;
        m_width = rect.size.width;
        m_height = rect.size.height;
        return *this;
    }

private:
    ShareRelaxed<float> m_x;
    ShareRelaxed<float> m_y;
    ShareRelaxed<float> m_width;
    ShareRelaxed<float> m_height;
};

/// The default back-end, which every other one falls back to: each picture is made inside the capture that
/// asks for it, of window images.
/// Threads: those of the protocol. A change of the display or the limit that comes during a capture holds
///          from the next one on.
class ShareCapturerTovel : public ShareCapturerMac {
public:
    ShareCapturerTovel() = default;
    ~ShareCapturerTovel() override;

    /// With a context that it makes itself.
    bool init();
    /// The context may be empty: everything on the display is then shared.
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;

    unsigned char* capture() override { return nullptr; }
    unsigned captureToIShareFrame(IShareFrame* frame) override;
    bool setCaptureDisplay(unsigned display) override;
    unsigned getCaptureDisplay() override { return m_nCapturedDisplayId; }
    void setMaxSize(TVLSize size) override;
    platform::CGRect getCaptureRect() override { return m_rectCapturedDisplay; }
    unsigned getSharedAppCount() override;
    TVLSize getFrameSize() override { return m_sizeBmpContext; }
    int getCaptureFormat() override { return SHARE_FRAME_FORMAT_RGBA; }
    unsigned char pointerCaptured() override;
    unsigned setCaptureThreadCount(unsigned count) override;
    bool IsWindowAreaBaseContentSupport() override;
    int onDisplayPlugin(unsigned display) override;
    int onDisplayPlugout(unsigned display) override;
    int onScreenResolutionChanged(unsigned display) override;

private:
    /// Works out the sizes and publishes the scale that they make.
    void initScreenSize();
    void initCapturer();
    /// False when the sizes are what they were.
    bool FollowScreenSize();
    void installProcessMonitor();
    void uninstallProcessMonitor();
    /// Its application isn't shared any more; on a notice thread.
    void appTerminated(const platform::NSNotification& notification);

    ShareRelaxed<unsigned> m_nCapturedDisplayId;
    ShareRelaxedCGRect m_rectCapturedDisplay;
    ShareRelaxedSize m_sizeBmpContext;
    ShareRelaxedSize m_sizeCaptureContext;
    std::mutex m_bmpContextLock; // held throughout a picture
    ShareRelaxedSize m_szMaxCapture;
    unsigned m_nRgbValue = 0; // the background when it was made; passes look at the one in force
    std::shared_ptr<ShareCapturerContext> m_capturerContext;
    std::unique_ptr<CShareCGSCapturer> m_cgsCapturer;
    ShareUtilMacMonitorDraging shareUtilMacMonitorDraging{nullptr};
};

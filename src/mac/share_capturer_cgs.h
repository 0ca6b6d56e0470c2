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

/// What the back-ends that make their pictures of window images have in common: which display is captured and
/// how large, and that an application that has ended isn't shared any more.
/// Threads: those of the protocol. A change of the display or the limit that comes during a capture holds
///          from the next one on.
class ShareCapturerCGS : public ShareCapturerMac {
public:
    ~ShareCapturerCGS() override;

    /// With a context that it makes itself.
    bool init();
    using ShareCapturerMac::init;

    unsigned char* capture() override { return nullptr; }
    bool setCaptureDisplay(unsigned display) override;
    unsigned getCaptureDisplay() override { return m_nCapturedDisplayId; }
    void setMaxSize(TVLSize size) override;
    platform::CGRect getCaptureRect() override { return m_rectCapturedDisplay; }
    unsigned getSharedAppCount() override;
    TVLSize getFrameSize() override { return m_sizeBmpContext; }
    int getCaptureFormat() override { return SHARE_FRAME_FORMAT_RGBA; }
    unsigned setCaptureThreadCount(unsigned count) override;
    bool IsWindowAreaBaseContentSupport() override { return IsOfWindows(); }
    int onDisplayPlugin(unsigned display) override;
    int onDisplayPlugout(unsigned display) override;
    int onScreenResolutionChanged(unsigned display) override;

protected:
    /// `name` is the class's, for traces; it must outlive the object.
    explicit ShareCapturerCGS(const char* name) : m_name(name) {}

    // The two halves of making it ready.
    /// The context may be empty: everything on the display is then shared.
    void KeepContext(const std::shared_ptr<ShareCapturerContext>& context);
    /// Captures the main display from here on, and hears of the ends of applications.
    void BeginOnMainDisplay();

    const std::shared_ptr<ShareCapturerContext>& Context() const { return m_capturerContext; }
    /// Windows are shared, and not all that is on a display.
    bool IsOfWindows() const;
    /// Walks the windows, unless they have moved just now. On the capture thread.
    bool IsDraging();
    /// What is captured, and how large.
    struct Target {
        unsigned display = 0;
        TVLSize bitmap{};
        TVLSize capture{};
        TVLSize max{};

        bool operator==(const Target&) const = default;
    };
    Target CurrentTarget();
    /// One picture as `composition` makes it; its code. The frame is stamped whatever becomes of it.
    int CaptureWith(CShareCGSCapturer& composition, IShareFrame& frame);

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

    const char* const m_name;
    ShareRelaxed<unsigned> m_nCapturedDisplayId;
    ShareRelaxedCGRect m_rectCapturedDisplay;
    ShareRelaxedSize m_sizeBmpContext;
    ShareRelaxedSize m_sizeCaptureContext;
    ShareRelaxedSize m_szMaxCapture;
    std::mutex m_captureMutex; // the sizes and the rectangle change together
    std::shared_ptr<ShareCapturerContext> m_capturerContext;
    ShareUtilMacMonitorDraging shareUtilMacMonitorDraging{nullptr};
};

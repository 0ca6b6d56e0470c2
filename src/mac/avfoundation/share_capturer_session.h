// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/avfoundation/share_avf_capturer.h"
#include "src/mac/share_capturer_mac.h"
#include "src/mac/share_monitor_draging_mac.h"
#include "src/share_atomic.h"
#include "src/share_capturer_context.h"
#include "src/share_region.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

/// What the back-ends whose pictures come from a capture session have in common. Such a picture shows all
/// that is on the display; what must not be seen is painted over afterwards, by what a walk over the windows
/// in the same pass has found. So a sample is only looked at when it shows the very windows that were walked,
/// unless nothing is kept out.
/// Threads: those of the protocol.
class ShareCapturerSession : public ShareCapturerMac {
public:
    ~ShareCapturerSession() override;

    /// With a context that it makes itself.
    bool init();
    using ShareCapturerMac::init;

    unsigned char* capture() override { return nullptr; }
    unsigned getCaptureDisplay() override { return m_nCapturedDisplayId; }
    unsigned getSharedAppCount() override { return 0; }
    TVLSize getFrameSize() override { return m_sizeCapture; }
    int getCaptureFormat() override { return SHARE_FRAME_FORMAT_BGRA; }
    unsigned setCaptureThreadCount(unsigned count) override;
    bool IsWindowAreaBaseContentSupport() override { return false; }
    int setFPS(int fps) override;
    void setMaxSize(TVLSize size) override;
    int onDisplayPlugin(unsigned display) override;
    int onDisplayPlugout(unsigned display) override;
    /// Whichever display changed, the captured one begins anew.
    int onScreenResolutionChanged(unsigned display) override;

protected:
    static constexpr int BLACK = 0;

    /// `name` is the class's, for traces; it must outlive the object.
    explicit ShareCapturerSession(const char* name) : m_name(name) {}

    /// Keeps the context, has its walks note what is exposed, and makes the session's object.
    void KeepContext(const std::shared_ptr<ShareCapturerContext>& context);
    /// Ends the session for good. For destructors.
    void EndSession();

    const std::shared_ptr<ShareCapturerContext>& Context() const { return m_shareCapturerContext; }
    ShareAVFCapturer* Session() const { return m_ShareAVFCapturer.get(); }
    bool IsDesktop() const;

    /// Walks the windows, unless they have moved just now. On the capture thread.
    bool IsDraging();
    /// A sample that the last walk fits, copied into the frame; the session's code.
    unsigned CopySample(IShareFrame* frame);
    /// Timestamp, capture rectangle, which it gives, and pointer flag of a frame.
    TVLRect Stamp(IShareFrame& frame, bool pointer) const;
    /// Pixels of the frame per point of `box`, the requested scale for one without a width.
    float ScaleOf(IShareFrame& frame, const TVLRect& box) const;

    /// Paints a region in points over. False, and the frame is black, when that can't be done.
    static bool Hide(IShareFrame& frame, TVLRegion region, const TVLRect& box, float scale, int colour);
    /// Hides the background of applications and windows, and what is exposed beside the overlap.
    bool HideAroundShare(IShareFrame& frame, const TVLRect& box, float scale) const;
    /// What a pass gives whose picture is painted: nothing if something was withdrawn since the pass began,
    /// which its masks may lack, or the displays have changed, for which they are in the wrong place.
    int Give();

    ShareRelaxed<unsigned> m_nCapturedDisplayId;
    ShareRelaxedCGRect m_rectCapturedDisplay;
    ShareRelaxedSize m_sizeCapture; // never set
    ShareRelaxedSize m_szMaxCapture;
    ShareRelaxed<float> m_fScale{1.0F};

private:
    /// What pictures are painted over by.
    struct Masks {
        std::vector<TVLRect> overlap;
        std::vector<TVLRect> exposed;
        std::vector<TVLRect> background;

        bool operator==(const Masks&) const = default;
    };

    bool KeepsOut() const;
    std::optional<ShareSampleGate> Gate() const;
    bool IsOutdated() const;
    TVLRect BoxNow() const;
    Masks MasksNow() const;
    void BeginAnew();
    void BeginAnewAfterInterruption();
    void BeginAnewWhenSilent();

    const char* const m_name;
    std::shared_ptr<ShareAVFCapturer> m_ShareAVFCapturer;
    std::shared_ptr<ShareCapturerContext> m_shareCapturerContext;
    ShareUtilMacMonitorDraging shareUtilMacMonitorDraging{nullptr};
    std::uint64_t m_interruptions = 0; // those that the session has begun anew after
    std::uint64_t m_admissions = 0;    // likewise
    std::uint64_t m_withdrawals = 0;   // when the pass began
    TVLRect m_box{};                   // of the displays then; they change on the notice thread
    bool m_isFresh = true;             // the session has just begun: its first sample is yet to come
    std::optional<Masks> m_shown;      // of the last picture; nothing when a sample after it was lost
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "src/mac/avfoundation/share_capturer_session.h"
#include "src/share_atomic.h"
#include "src/share_ref.h"

#include <screenshare/share_frame.h>

#include <memory>
#include <vector>

/// The mix: the session's picture, and where something that isn't shared lies on top, images of the shared
/// windows drawn over it. The session runs without a pointer; the mix draws it last.
/// Threads: those of the protocol.
class ShareCapturerAVFoundationCGSMix : public ShareCapturerSession {
public:
    ShareCapturerAVFoundationCGSMix() : ShareCapturerSession("ShareCapturerAVFoundationCGSMix") {}
    ~ShareCapturerAVFoundationCGSMix() override;

    using ShareCapturerSession::init;
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;
    void initCapturer();
    // Nothing to do here.
    void initScreenSize() {}
    void initCapturerByData(unsigned char* data, unsigned long length);

    unsigned captureToIShareFrame(IShareFrame* frame) override;
    /// Always true.
    bool setCaptureDisplay(unsigned display) override;
    /// What it gives is where the pointer is measured from until the next call.
    platform::CGRect getCaptureRect() override;
    /// Of the last pass; a frame's own flag is that of the pass before it.
    unsigned char pointerCaptured() override { return m_bPointerCaptured ? 1 : 0; }

private:
    /// Where a pass draws.
    struct Target {
        IShareFrame* frame;
        platform::CGContextRef context;
        TVLRect box; ///< The displays, in points.
        float scale; ///< Pixels per point.
    };

    int _captureToIShareFrame(IShareFrame* frame);
    bool HideUnshared(const Target& target) const;
    void DrawOverlap(const Target& target) const;
    void DrawOverlapRect(const Target& target, const std::vector<unsigned>& windows,
                         const TVLRect& rcItem) const;
    TVLRect WithShadow(const TVLRect& rcItem, const TVLRect& box) const;
    void DrawPointer(const Target& target);

    ShareRef<IShareFrame> m_pIShareFrameFilter; // nothing writes into it
    ShareRelaxed<bool> m_bPointerCaptured{false};
    ShareRelaxed<int> m_nShadowWidth{25}; // points that a shadow can reach beyond its window
};

// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_pass.h"
#include "src/share_region.h"
#include "src/share_util.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cmath>

/// From the client's limit to the size that the capturer has to produce, and what the client is told of sizes
/// and places.

TVLSize CShareCaptureEngine::_GetCurCaptureMaxSize() {
    const AppShareConfig& config = *AppShareConfig::Instance();
    if (config.m_bCaptureResampleFixSizeEnable)
        return {config.GetResampleScreenCaptureWidth(), config.GetResampleScreenCaptureHeight()};
    TVLSize size{};
    m_spShareCapturerContext->GetCaptureMaxSize(size);
    return size;
}

int CShareCaptureEngine::SetCaptureMaxFrameSize(unsigned width, unsigned height) {
    if (width == 0 || height == 0)
        return SHARE_RESULT_INVALID_PARAM;
    const TVLSize size{static_cast<int>(width), static_cast<int>(height)};
    if (size == TVLSize(m_sizeCaptureMax))
        return SHARE_RESULT_OK;
    CmTraceInfo("[CShareCaptureEngine::SetCaptureMaxFrameSize] nWidth=", width, ",nHeight=", height);
    const TVLSize former = m_sizeCaptureMax;
    m_sizeCaptureMax = size;
    const bool isHandedOver = CmCallGuarded("[CShareCaptureEngine::SetCaptureMaxFrameSize]>>fail>>",
                                            [&] { _UpdateCaptureMaxFrameSize(size); });
    if (isHandedOver)
        return SHARE_RESULT_OK;
    m_sizeCaptureMax = former; // or the client could not ask for it again
    return SHARE_RESULT_FAILED;
}

void CShareCaptureEngine::_UpdateCaptureMaxFrameSize(TVLSize size) {
    if (size == TVLSize(m_sizeCurCaptureMax))
        return;
    RunOnCaptureThread([this, size] {
        m_sizeCurCaptureMax = size;
        CmTraceInfo("[CShareCaptureEngine::_UpdateCaptureMaxFrameSize] w=", size.cx, ",h=", size.cy);
        return static_cast<unsigned>(m_spShareCapturerContext->SetCaptureMaxSize(size));
    });
}

namespace {

bool LiesInside(const TVLRect& rect, int width, int height) {
    return rect.left >= 0 && rect.top >= 0 && rect.right <= width && rect.bottom <= height &&
           rect.left < rect.right && rect.top < rect.bottom;
}

} // namespace

/// The update rectangle is the whole frame unless the size limit is for the box of the shared windows.
bool CShareCaptureEngine::_IsWindowAreaWanted() {
    if (m_eSHARE_CAPTURE_ENGINE_TYPE == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        return false;
    if (m_spShareCapturerContext->m_bNoWindowBaseArea)
        return false;
    const CCmMutexGuard guard(_CapturerMutex());
    const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    return capturer != nullptr && !capturer->IsWindowAreaBaseContentSupport();
}

void CShareCaptureEngine::_CalculateUpdateRect(const Pass& pass, int width, int height, TVLRect& rcUpdate) {
    if (!_IsWindowAreaWanted())
        return;
    if (pass.reused) {
        rcUpdate = m_rcLastUpdate;
        return;
    }
    TVLRegion region;
    m_spShareCapturerContext->GetSharedWindowRegion(region);
    region.ProjectRgn(pass.frame->GetMetaInfo().rectCapture, pass.scale);
    const bool isKnown = region.GetRgnBox(rcUpdate);
    // Never cut to the frame: a box that sticks out counts as none.
    if (!isKnown || !LiesInside(rcUpdate, width, height))
        rcUpdate = TVLRect{};
    _CalculateNewCaptureMaxFrameSize(rcUpdate, TVLSize{width, height});
}

int CShareCaptureEngine::_CalculateNewCaptureMaxFrameSize(const TVLRect& rcUpdate, TVLSize size) {
    // So close to the wanted size the limit stays: it would only hunt around the target.
    constexpr float DEAD_BAND = 0.09F;
    if (size.cx <= 0 || size.cy <= 0)
        return SHARE_RESULT_FAILED;
    const int width = ShareUtil::Extent(rcUpdate.left, rcUpdate.right);
    const int height = ShareUtil::Extent(rcUpdate.top, rcUpdate.bottom);
    if (width > 0 && height > 0) {
        const TVLSize wanted = m_sizeCaptureMax;
        const float scaleX = static_cast<float>(wanted.cx) / static_cast<float>(width);
        const float scaleY = static_cast<float>(wanted.cy) / static_cast<float>(height);
        const float scaleMax = std::min(scaleX, scaleY);
        // A scale of 0 means that the client has set no limit.
        if (std::fabs(scaleMax - 1.0F) >= DEAD_BAND && scaleMax != 0) {
            const TVLSize limit{CmTruncate(static_cast<float>(size.cx) * scaleMax),
                                CmTruncate(static_cast<float>(size.cy) * scaleMax)};
            _UpdateCaptureMaxFrameSize(limit);
            CmTraceDetail("[CShareCaptureEngine::_CaptureProcess]>>", ",scaleMax=", scaleMax,
                          ",scaleX=", scaleX, ",scaleY=", scaleY, ",w=", limit.cx, ",h=", limit.cy);
        }
    }
    // Only the extent counts: a box that moves without changing its size is not news.
    if (width == ShareUtil::Extent(m_rcLastUpdate.left, m_rcLastUpdate.right) &&
        height == ShareUtil::Extent(m_rcLastUpdate.top, m_rcLastUpdate.bottom))
        return SHARE_RESULT_OK;
    m_rcLastUpdate = rcUpdate;
    CmTraceInfo("[CShareCaptureEngine::_CaptureProcess]>>rcUpdate changed w=", width, ",h=", height);
    return SHARE_RESULT_OK;
}

void CShareCaptureEngine::_UpdateIShareFrameSize(TVLSize size) {
    if (m_pShareFrameA != nullptr)
        m_pShareFrameA->SetFrameSize(size);
    if (m_pShareFrameB != nullptr)
        m_pShareFrameB->SetFrameSize(size);
}

void CShareCaptureEngine::_UpdateShareDisplaySize(TVLSize size) {
    const bool changed = TVLSize(m_sizeShareDisplay) != size;
    m_sizeShareDisplay = size;
    // A capturer may call from a thread of its own, while a pass is writing into a frame.
    _HandToCaptureThread([this, size] {
        _UpdateIShareFrameSize(size);
        return static_cast<unsigned>(SHARE_RESULT_OK);
    });
    if (_GetOwnCapturer() != nullptr) {
        _HandToCaptureThread([this] {
            const std::shared_ptr<IShareCapturer> own = _GetOwnCapturer();
            if (own == nullptr)
                return static_cast<unsigned>(SHARE_RESULT_NO_CAPTURER);
            return static_cast<unsigned>(
                m_spShareCapturerContext->UpdateSharedDisplay(own->GetCurrentCaptureDisplayId()));
        });
    }
    if (changed)
        _NotifyDisplaySize(size);
    _UpdateShareCapturePosition();
}

void CShareCaptureEngine::_UpdateShareCapturePosition() {
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
    {
        const CCmMutexGuard guard(_CapturerMutex());
        if (const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer())
            capturer->GetCurrentCaptureSourcePosition(x, y, width, height);
    }
    const TVLRect position{x, y, ShareUtil::Sum(x, width), ShareUtil::Sum(y, height)};
    if (position == TVLRect(m_rcSharePosition))
        return;
    m_rcSharePosition = position;
    OnCapturePositionChanged(x, y, width, height);
}

void CShareCaptureEngine::_UpdateShareCaptureSize() {
    const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    if (capturer == nullptr)
        return;
    TVLSize size{};
    unsigned display = SHARE_INVALID_DISPLAY;
    {
        const CCmMutexGuard guard(_CapturerMutex());
        capturer->GetCurrentCaptureSourceSize(size);
        display = capturer->GetCurrentCaptureDisplayId();
    }
    _UpdateShareDisplaySize(size);
    if (m_pISharePointing != nullptr)
        m_pISharePointing->SetBaseDisplayID(display);
}

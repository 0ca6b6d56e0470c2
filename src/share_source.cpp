// SPDX-License-Identifier: Apache-2.0
#include "src/share_source.h"

#include "src/share_util.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

namespace {

/// `edge` as far beyond `origin`, an edge that is scaled already, as the scaled distance of the two.
int ScaledEdge(int origin, int edge, float scale) {
    const float distance = static_cast<float>(ShareUtil::Extent(origin, edge)) * scale;
    return ShareUtil::Sum(CmTruncate(distance), origin);
}

} // namespace

ShareSourceType CShareSource::GetSourceType() {
    CmTraceDebug("[CShareSource::GetSourceType]>>type=", static_cast<int>(m_info.eType));
    return m_info.eType;
}

bool CShareSource::IsShared() {
    CmTraceInfo("[CShareSource::IsShared]", m_info.bShared);
    return m_info.bShared;
}

TVLRect CShareSource::GetSourceRect(bool bScaled) {
    const TVLRect& rect = m_info.rect;
    CmTraceDebug("[CShareSource::GetSourceRect] left = ", rect.left, " top = ", rect.top,
                 " right = ", rect.right, " bottom = ", rect.bottom);
    const float scale = m_info.fScale;
    if (!bScaled || !(scale > 1.0F))
        return rect;
    TVLRect scaled{};
    scaled.left = CmTruncate(static_cast<float>(rect.left) * scale);
    scaled.top = CmTruncate(static_cast<float>(rect.top) * scale);
    scaled.right = ScaledEdge(scaled.left, rect.right, scale);
    scaled.bottom = ScaledEdge(scaled.top, rect.bottom, scale);
    return scaled;
}

int CShareSource::GetDeviceName(char* /*out*/, int /*length*/) {
    return SHARE_RESULT_FAILED;
}

int CShareSource::GetDeviceId(char* /*out*/, int /*length*/) {
    return SHARE_RESULT_FAILED;
}

void CShareSource::SetInfo(const ShareSourceInfo* info) {
    if (info == nullptr)
        return;
    CmTraceDebug("[CShareSource::SetInfo]>>sourceId=", info->sourceId);
    m_info.SetShareSourceInfo(info);
}

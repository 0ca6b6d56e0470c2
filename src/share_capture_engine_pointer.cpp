// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"
#include "src/share_image_save.h"
#include "src/share_util.h"

#include <screenshare/share_graphic_util.h>

#include <string>

/// The pointer of a pass: polled from the pointing object, which answers through the two sink operations
/// here, and blended into the frame.

void CShareCaptureEngine::_ComposePointer(Pass& pass) {
    if (!pass.wantCursor || m_bUseExternalPoint)
        return;
    pass.cursorOk =
        m_pISharePointing != nullptr &&
        m_pISharePointing->CapturePoint(pass.frame->GetFrameDataFormat(), pass.scale) == SHARE_RESULT_OK &&
        m_pCursorImg != nullptr;
    if (!pass.cursorOk)
        return;

    IShareFrame* cursor = m_pCursorImg->GetImgData();
    const int hotX = m_pCursorImg->GetHotPointX();
    const int hotY = m_pCursorImg->GetHotPointY();
    const int x = ShareUtil::Extent(hotX, m_nPointX);
    const int y = ShareUtil::Extent(hotY, m_nPointY);
    if (pass.dumpPoint) {
        const std::string name = pass.dumpName + "_point_" + std::to_string(x) + "_" + std::to_string(y) +
                                 "_hot_" + std::to_string(hotX) + "_" + std::to_string(hotY) + ".png";
        SaveFrameToPNG(cursor, name.c_str());
    }
    if (cursor != nullptr)
        TvlGraphicUtil::TvlAlphaBlend(pass.frame, x, y, cursor);

    IShareFrame::MetaInfo info = pass.frame->GetMetaInfo();
    info.bPointerCaptured = true;
    pass.frame->SetMetaInfo(info);
}

int CShareCaptureEngine::OnPointingPosChanged(int x, int y) {
    m_nPointX = x;
    m_nPointY = y;
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnPointingImgChanged(ISharePointingImg* image) {
    if (image == m_pCursorImg)
        return SHARE_RESULT_OK;
    if (m_pCursorImg != nullptr)
        m_pCursorImg->Release();
    m_pCursorImg = image;
    if (m_pCursorImg != nullptr)
        m_pCursorImg->AddRef();
    return SHARE_RESULT_OK;
}

// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer_dummy.h"

#include "src/app_share_config.h"
#include "src/share_capturer_context.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"

#include <cstddef>
#include <cstring>
#include <limits>
#include <new>

namespace {

constexpr unsigned char WHITE = 255;
constexpr unsigned char BLACK = 0; // with its alpha

/// A frame counts its bytes in an int.
bool FitsIntoAFrame(std::size_t bytes) {
    return bytes <= static_cast<std::size_t>(std::numeric_limits<int>::max());
}

} // namespace

CShareCapturerDummy::CShareCapturerDummy(const std::shared_ptr<ShareCapturerContext>& context)
    : CShareCapturer(context),
      m_nDummyWidth(AppShareConfig::Instance()->GetDummyCaptureWidth()),
      m_nDummyHeight(AppShareConfig::Instance()->GetDummyCaptureHeight()) {
    const std::size_t bytes =
        static_cast<std::size_t>(m_nDummyWidth) * static_cast<std::size_t>(m_nDummyHeight) * BYTES_PER_PIXEL;
    if (!FitsIntoAFrame(bytes))
        return;
    m_pDummyImage.reset(new (std::nothrow) unsigned char[bytes]);
    if (m_pDummyImage != nullptr)
        std::memset(m_pDummyImage.get(), WHITE, bytes);
}

CShareCapturerDummy::~CShareCapturerDummy() = default;

int CShareCapturerDummy::Capture(IShareFrame* frame) {
    if (frame == nullptr || m_pDummyImage == nullptr)
        return SHARE_CAPTURE_FAILED;
    const bool captured = CmCallGuarded("[CShareCapturerDummy::Capture]>>fail>>", [&] {
        // Regions stay as live as they are with a real picture.
        if (m_shareCapturerContext != nullptr)
            m_shareCapturerContext->UpdateShareCapturerContext();
        _MoveLine();
        _FillFrame(*frame);
    });
    return captured ? SHARE_CAPTURE_OK : SHARE_CAPTURE_FAILED;
}

void CShareCapturerDummy::_PaintLine(int line, unsigned char value) {
    const auto lineBytes = static_cast<std::size_t>(_LineBytes());
    std::memset(m_pDummyImage.get() + static_cast<std::size_t>(line) * lineBytes, value, lineBytes);
}

void CShareCapturerDummy::_MoveLine() {
    _PaintLine(m_nDummyLine, WHITE);
    ++m_nDummyLine;
    if (m_nDummyLine == m_nDummyHeight)
        m_nDummyLine = 0;
    _PaintLine(m_nDummyLine, BLACK);
}

void CShareCapturerDummy::_FillFrame(IShareFrame& frame) {
    frame.SetFrameSize(m_nDummyWidth, m_nDummyHeight);
    frame.SetFrameLineBytes(_LineBytes());
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.WriteFrameData(m_pDummyImage.get(), m_nDummyHeight * _LineBytes());
    frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
}

// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstring>
#include <typeinfo>
#include <utility>

namespace {

constexpr int MIN_BYTES_PER_PIXEL = 3;

int BytesPerPixel(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_NONE:
            return 0;
        case SHARE_FRAME_FORMAT_RGB:
        case SHARE_FRAME_FORMAT_BGR:
            return 3;
        default:
            return 4;
    }
}

int WrappingProduct(int a, int b) {
    return static_cast<int>(static_cast<std::uint32_t>(a) * static_cast<std::uint32_t>(b));
}

// A line may lie outside the buffer, where pointer arithmetic is not defined.
unsigned char* AddressAt(unsigned char* buffer, std::int64_t offset) {
    return reinterpret_cast<unsigned char*>(reinterpret_cast<std::uintptr_t>(buffer) +
                                            static_cast<std::uintptr_t>(offset));
}

TVLRect LineRect(int line, int width) {
    const int behind = static_cast<int>(static_cast<std::uint32_t>(line) + 1);
    return {0, line, width, behind};
}

} // namespace

// Setters call this last and don't look at the result: attached memory can't grow, and whoever attached it
// answers for its length.
bool CShareFrame::_ExpandFrameData() {
    const int needed = _GetFrameDataLen();
    if (m_nBufLen >= needed) {
        return true;
    }
    if (m_pExternalBuf != nullptr) {
        return false;
    }
    // The old memory goes first: a large picture is never held twice, and an allocation that throws leaves
    // a frame without pixels and not one with freed ones.
    _DropNote();
    m_pOwnBuf.reset();
    m_nBufLen = 0;
    m_pOwnBuf = platform::NewPixelMemory(static_cast<std::size_t>(needed));
    m_nBufLen = needed;
    return true;
}

int CShareFrame::_GetLineByteLen() const {
    if (m_eFormat == SHARE_FRAME_FORMAT_NONE) {
        return 0;
    }
    if (m_nLineBytes != 0) {
        return m_nLineBytes;
    }
    return WrappingProduct(m_nWidth, BytesPerPixel(m_eFormat));
}

int CShareFrame::_GetFrameDataLen() const {
    return WrappingProduct(_GetLineByteLen(), m_nHeight);
}

int CShareFrame::SetExternalBuf(unsigned char* buf, int len) {
    if (buf == nullptr && m_pExternalBuf != nullptr) {
        _DropNote();
        m_pExternalBuf = nullptr;
        _ExpandFrameData();
        return 0;
    }
    if (len < 1 || buf == m_pOwnBuf.get()) {
        return -1;
    }
    _DropNote();
    m_pOwnBuf.reset();
    m_pExternalBuf = buf;
    m_nBufLen = len;
    return 0;
}

unsigned char* CShareFrame::_BufferInForce() const {
    return m_pExternalBuf != nullptr ? m_pExternalBuf : m_pOwnBuf.get();
}

unsigned char* CShareFrame::GetFrameLineData(int line) {
    unsigned char* const buffer = _BufferInForce();
    if (buffer == nullptr || m_eFormat == SHARE_FRAME_FORMAT_NONE) {
        return buffer;
    }
    const std::int64_t offset = std::int64_t{line} * _GetLineByteLen();
    return offset > _GetFrameDataLen() ? nullptr : AddressAt(buffer, offset);
}

int CShareFrame::SetFrameLineBytes(int bytes) {
    if (!_CanSetExternalLineLen() || bytes < 1 || bytes < WrappingProduct(m_nWidth, MIN_BYTES_PER_PIXEL)) {
        return -1;
    }
    _DropNote();
    m_nLineBytes = bytes;
    _ExpandFrameData();
    return 0;
}

SHARE_FRAME_FORMAT CShareFrame::SetFrameDataFormat(SHARE_FRAME_FORMAT format) {
    if (format >= SHARE_FRAME_FORMAT_NONE && format <= SHARE_FRAME_FORMAT_BGR) {
        if (m_eFormat != format) {
            _DropNote();
        }
        m_eFormat = format;
        _ExpandFrameData();
    }
    return m_eFormat;
}

int CShareFrame::GetFrameSize(int& width, int& height) {
    width = m_nWidth;
    height = m_nHeight;
    return 0;
}

int CShareFrame::SetFrameSize(int width, int height) {
    const TVLSize before{m_nWidth, m_nHeight};
    m_nWidth = std::max(width, 0);
    m_nHeight = std::max(height, 0);
    if (before != TVLSize{m_nWidth, m_nHeight}) {
        _DropNote();
    }
    _ExpandFrameData();
    return 0;
}

int CShareFrame::WriteFrameData(const unsigned char* data, int len) {
    unsigned char* const buffer = _BufferInForce();
    if (_IsEmptyFrame() || data == nullptr || buffer == nullptr) {
        return 0;
    }
    // Since a Reset the geometry may ask for more than was allocated for it.
    if (len < 0 || len > _GetFrameDataLen() || _ExceedsOwnBuf(len)) {
        return 0;
    }
    _DropNote();
    std::memmove(buffer, data, static_cast<std::size_t>(len));
    return len;
}

int CShareFrame::ReadFrameData(unsigned char* data, int len) {
    const unsigned char* const buffer = _BufferInForce();
    if (_IsEmptyFrame() || data == nullptr || buffer == nullptr || len < 0) {
        return 0;
    }
    std::memmove(data, buffer, static_cast<std::size_t>(std::min(len, m_nBufLen)));
    return len;
}

int CShareFrame::WriteFrameLineData(int line, const unsigned char* data, int len) {
    if (_IsEmptyFrame()) {
        return 0;
    }
    TVLRect rect = LineRect(line, m_nWidth);
    return WriteFrameAreaData(rect, data, len);
}

int CShareFrame::ReadFrameLineData(int line, unsigned char* data, int len) {
    TVLRect rect = LineRect(line, m_nWidth);
    return ReadFrameAreaData(rect, data, len);
}

int CShareFrame::WriteFrameAreaData(TVLRect& rect, const unsigned char* data, int len) {
    return _FrameAreaDataIO(rect, const_cast<unsigned char*>(data), len, false);
}

int CShareFrame::ReadFrameAreaData(TVLRect& rect, unsigned char* data, int len) {
    return _FrameAreaDataIO(rect, data, len, true);
}

bool CShareFrame::_IsRectInFrame(const TVLRect& rect) const {
    return rect.left >= 0 && rect.top >= 0 && rect.left < rect.right && rect.top < rect.bottom &&
           rect.right <= m_nWidth && rect.bottom <= m_nHeight;
}

int CShareFrame::_FrameAreaDataIO(TVLRect rect, unsigned char* data, int len, bool bRead) {
    unsigned char* const buffer = _BufferInForce();
    if (_IsEmptyFrame() || buffer == nullptr || data == nullptr || len < 0 || !_IsRectInFrame(rect)) {
        return 0;
    }

    const std::int64_t lineBytes = GetFrameLineBytes();
    const std::int64_t bytesPerPixel = lineBytes / m_nWidth;
    const std::int64_t rowBytes = (rect.right - rect.left) * bytesPerPixel;
    if (rowBytes < 1 || rowBytes > len) {
        return 0;
    }

    if (!bRead) {
        _DropNote();
    }
    const std::int64_t leftBytes = rect.left * bytesPerPixel;
    std::int64_t moved = 0;
    for (std::int64_t y = rect.top; y < rect.bottom; ++y) {
        const std::int64_t rowStart = y * lineBytes + leftBytes;
        if (rowStart + rowBytes > m_nBufLen) {
            return 0;
        }
        unsigned char* const row = buffer + rowStart;
        std::memmove(bRead ? data : row, bRead ? row : data, static_cast<std::size_t>(rowBytes));
        data += rowBytes;
        moved += rowBytes;
        // Both tests come behind the copy. A caller whose `len` is less than the area still holds the whole
        // area, and finds the rows up to there moved. The other test looks at the start of the next row, so
        // that an area off the left edge gives 0 on the last line of a frame without spare memory.
        if (moved > len || rowStart + lineBytes > m_nBufLen) {
            return 0;
        }
    }
    return static_cast<int>(moved);
}

int CShareFrame::CopyIShareFrame(IShareFrame* source) {
    if (source == nullptr) {
        return -2;
    }
    _DropNote();
    TVLSize size{};
    source->GetFrameSize(size);
    SetFrameSize(size);
    SetTimestamp(source->GetTimestamp());
    SetFrameLineBytes(source->GetFrameLineBytes());
    SetFrameDataFormat(source->GetFrameDataFormat());

    int len = std::min(GetFrameDataLen(), source->GetFrameDataLen());
    // Since a Reset a frame of ours may have less than its geometry asks for. Others answer for their
    // figures.
    const CShareFrame* const frame = OwnOf(source);
    if (frame != nullptr && frame->_ExceedsOwnBuf(len)) {
        len = frame->m_nBufLen;
    }
    WriteFrameData(source->GetFrameData(), len);
    return 0;
}

int CShareFrame::_GetBackedDataLen() const {
    return std::min(_GetFrameDataLen(), m_nBufLen);
}

/// Asked several times a tick. Nearly all frames are just of this class, which is told by one comparison.
CShareFrame* CShareFrame::OwnOf(IShareFrame* frame) {
    if (frame != nullptr && typeid(*frame) == typeid(CShareFrame)) {
        return static_cast<CShareFrame*>(frame);
    }
    return dynamic_cast<CShareFrame*>(frame);
}

int CShareFrame::BackedDataLen(IShareFrame& frame) {
    const CShareFrame* const ours = OwnOf(&frame);
    return std::max(ours != nullptr ? ours->_GetBackedDataLen() : frame.GetFrameDataLen(), 0);
}

bool CShareFrame::HasSameData(CShareFrame& other) {
    const int len = _GetBackedDataLen();
    if (_GetFrameDataLen() != other._GetFrameDataLen() || len != other._GetBackedDataLen()) {
        return false;
    }
    if (m_pNote != nullptr && other.m_pNote != nullptr &&
        ((NoteNumber() != 0 && NoteNumber() == other.NoteNumber()) || m_pNote->IsSameAs(*other.m_pNote))) {
        return true;
    }
    const unsigned char* const data = _BufferInForce();
    const unsigned char* const otherData = other._BufferInForce();
    if (len <= 0 || data == nullptr || otherData == nullptr) {
        return data == otherData || len <= 0;
    }
    return std::memcmp(data, otherData, static_cast<std::size_t>(len)) == 0;
}

int CShareFrame::SwapOrCopy(IShareFrame* other) {
    CShareFrame* const frame = OwnOf(other);
    if (frame == nullptr || m_pExternalBuf != nullptr || frame->m_pExternalBuf != nullptr) {
        return CopyIShareFrame(other);
    }
    _SwapFields(*frame);
    return 0;
}

void CShareFrame::_SwapFields(CShareFrame& other) {
    std::swap(m_nWidth, other.m_nWidth);
    std::swap(m_nHeight, other.m_nHeight);
    std::swap(m_pOwnBuf, other.m_pOwnBuf);
    std::swap(m_nBufLen, other.m_nBufLen);
    std::swap(m_nLineBytes, other.m_nLineBytes);
    std::swap(m_eFormat, other.m_eFormat);
    std::swap(m_nTimestamp, other.m_nTimestamp);
    std::swap(m_metaInfo, other.m_metaInfo);
    _SwapNotes(other);
}

// ---- The note

std::uint64_t ShareFrameNote::NewNumber() noexcept {
    static std::atomic<std::uint64_t> last{0};
    return ++last;
}

/// It goes with the pixels, unless they go where somebody else may write to them.
void CShareFrame::_SwapNotes(CShareFrame& other) {
    std::swap(m_pNote, other.m_pNote);
    std::swap(m_bNoteIsOfThisFilling, other.m_bNoteIsOfThisFilling);
    if (!m_bAllowsNote || !other.m_bAllowsNote) {
        _DropNote();
        other._DropNote();
    }
}

std::unique_ptr<ShareFrameNote> CShareFrame::TakeNote() {
    return std::move(m_pNote);
}

void CShareFrame::PutNote(std::unique_ptr<ShareFrameNote> note) {
    m_pNote = AllowsNote() ? std::move(note) : nullptr;
    m_bNoteIsOfThisFilling = true;
}

void CShareFrame::DropNoteOf(IShareFrame& frame) {
    if (CShareFrame* const ours = OwnOf(&frame)) {
        ours->_DropNote();
    }
}

void CShareFrame::BeginFilling(CShareFrame* partner) {
    m_bNoteIsOfThisFilling = false;
    m_pPartner = partner;
}

void CShareFrame::EndFilling() {
    m_pPartner = nullptr;
    if (!m_bNoteIsOfThisFilling) {
        _DropNote();
    }
}

bool CShareFrame::ChangeWithPartner(std::uint64_t noteNumber) {
    const bool isThere = m_pPartner != nullptr && noteNumber != 0 && m_pPartner->NoteNumber() == noteNumber;
    if (!isThere || !AllowsNote()) {
        return false;
    }
    _SwapFields(*m_pPartner);
    ConfirmNote();
    return true;
}

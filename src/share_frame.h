// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_memory.h"
#include "src/share_frame_note.h"
#include "util/qvn_unknown_impl.h"

#include <screenshare/share_frame.h>

#include <cstdint>
#include <memory>

/// The frame that the library itself fills, keeps and hands out.
///
/// Lifetime: built with a reference count of 0; its creator calls AddRef at once. Memory:   grows with the
///           geometry, keeps no picture across a growth, never shrinks. New memory is zeroed: nobody sees
///           what the heap held before. No operation leaves memory that the frame owns, whatever the
///           geometry says; of attached memory the attached length is believed. Lengths:  32-bit signed and
///           wrapping, as clients see them.
/// Threads:  one at a time; only the reference count is atomic.
/// Errors:   an allocation that fails throws std::bad_alloc out of the operation that set the geometry. The
///           geometry is stored then, the frame has no pixels, and the next setter tries again.
class CShareFrame : public IShareFrame, public qvn::CQvnUnknownImpl {
public:
    CShareFrame() = default;

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** object) override {
        return QueryInterfaceImpl(iid, object);
    }
    unsigned GetReference() override { return GetReferenceImpl(); }

    int SetExternalBuf(unsigned char* buf, int len) override;

    void SetTimestamp(unsigned timestamp) override { m_nTimestamp = timestamp; }
    unsigned GetTimestamp() override { return m_nTimestamp; }

    unsigned char* GetFrameData() override { return _BufferInForce(); }
    unsigned char* GetFrameLineData(int line) override;
    int GetFrameDataLen() override { return _GetFrameDataLen(); }
    int GetFrameLineBytes() override { return _GetLineByteLen(); }

    int SetFrameLineBytes(int bytes) override;
    SHARE_FRAME_FORMAT SetFrameDataFormat(SHARE_FRAME_FORMAT format) override;
    SHARE_FRAME_FORMAT GetFrameDataFormat() override { return m_eFormat; }
    int GetFrameSize(int& width, int& height) override;
    int GetFrameSize(TVLSize& size) override { return GetFrameSize(size.cx, size.cy); }
    int SetFrameSize(int width, int height) override;
    int SetFrameSize(TVLSize size) override { return SetFrameSize(size.cx, size.cy); }

    int WriteFrameData(const unsigned char* data, int len) override;
    int WriteFrameLineData(int line, const unsigned char* data, int len) override;
    int WriteFrameAreaData(TVLRect& rect, const unsigned char* data, int len) override;
    int ReadFrameData(unsigned char* data, int len) override;
    int ReadFrameLineData(int line, unsigned char* data, int len) override;
    int ReadFrameAreaData(TVLRect& rect, unsigned char* data, int len) override;

    int CopyIShareFrame(IShareFrame* source) override;
    int SwapOrCopy(IShareFrame* other) override;
    void Reset() override {
        m_nLineBytes = 0;
        _DropNote();
    }

    /// Whether both have the same data length and the same pixels. Compares no more than there is: after a
    /// Reset the geometry of a frame may ask for more than its memory holds. Notes that are the same save the
    /// comparison.
    bool HasSameData(CShareFrame& other);

    /// The frame, if it is one of ours; else null, as for null.
    static CShareFrame* OwnOf(IShareFrame* frame);

    /// How much of its data length a frame has memory for, in bytes: after a Reset that may be less than all.
    /// Others than ours answer for their figures.
    static int BackedDataLen(IShareFrame& frame);

    // ---- The note on what the pixels show
    //
    // A frame keeps one only if AllowNote has been called: whoever does that answers for it that nobody
    // writes to the pixels without the frame knowing. Everything here that changes the memory, its pixels or
    // how they lie drops the note. Who writes by way of the address calls DropNoteOf before.

    void AllowNote() { m_bAllowsNote = true; }
    bool AllowsNote() const { return m_bAllowsNote && m_pExternalBuf == nullptr; }
    bool HasNote() const { return m_pNote != nullptr; }
    /// 0 without a note, or one without a number.
    std::uint64_t NoteNumber() const { return m_pNote != nullptr ? m_pNote->Number() : 0; }
    /// Whoever fills the frame leaves its pixels, and so its note, as they are.
    void ConfirmNote() { m_bNoteIsOfThisFilling = true; }
    /// Null when nothing is known of the pixels. The frame has none any more.
    std::unique_ptr<ShareFrameNote> TakeNote();
    /// To be called when all pixels are as `note` says. Given up by a frame that doesn't keep any.
    void PutNote(std::unique_ptr<ShareFrameNote> note);
    /// Of any frame, of ours or not.
    static void DropNoteOf(IShareFrame& frame);

    /// Between these two somebody fills the frame. A note that he hasn't put there is none of his pixels.
    /// `partner`: another frame, or null, that nobody looks at any more; it may be left with what is in this
    /// one. It has to last that long.
    void BeginFilling(CShareFrame* partner = nullptr);
    void EndFilling();
    /// Fills it with what its partner shows, if that has a note of this number: they change their pixels and
    /// all that belongs to them. False if it doesn't, or there is no partner.
    bool ChangeWithPartner(std::uint64_t noteNumber);

    void SetMetaInfo(const MetaInfo& info) override { m_metaInfo = info; }
    MetaInfo GetMetaInfo() const override { return m_metaInfo; }

protected:
    ~CShareFrame() override = default;

private:
    bool _ExpandFrameData();
    unsigned char* _BufferInForce() const;
    int _GetLineByteLen() const;
    int _GetFrameDataLen() const;
    bool _IsEmptyFrame() const { return m_nHeight < 1 || m_nWidth < 1; }
    bool _CanSetExternalLineLen() const { return true; }
    bool _IsRectInFrame(const TVLRect& rect) const;
    int _GetBackedDataLen() const;
    bool _ExceedsOwnBuf(int len) const { return m_pOwnBuf != nullptr && len > m_nBufLen; }
    void _SwapFields(CShareFrame& other);
    void _SwapNotes(CShareFrame& other);
    void _DropNote() { m_pNote.reset(); }

    /// Moves a rectangle between the frame and the dense rows of `data`, which is only read unless `bRead`.
    int _FrameAreaDataIO(TVLRect rect, unsigned char* data, int len, bool bRead);

    int m_nWidth = 0;
    int m_nHeight = 0;
    platform::PixelMemory m_pOwnBuf;
    /// The client's memory; takes precedence over ours.
    unsigned char* m_pExternalBuf = nullptr;
    /// Bytes of the buffer in force, exactly so when that is ours. A detached buffer leaves its length here.
    int m_nBufLen = 0;
    /// 0 when the width and the format tell it.
    int m_nLineBytes = 0;
    SHARE_FRAME_FORMAT m_eFormat = SHARE_FRAME_FORMAT_NONE;
    std::uint32_t m_nTimestamp = 0;
    MetaInfo m_metaInfo{};
    std::unique_ptr<ShareFrameNote> m_pNote;
    bool m_bAllowsNote = false;
    bool m_bNoteIsOfThisFilling = false;
    CShareFrame* m_pPartner = nullptr; // while it is being filled
};

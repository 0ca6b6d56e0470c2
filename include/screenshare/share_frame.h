// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/qvn_unknown.h>
#include <screenshare/share_types.h>

/// A picture: a geometry, one block of pixels, a timestamp and a little meta information.
///
/// Threads:   one thread at a time; only the reference count is atomic. A frame that a sink receives may be
///            read during that call and no longer. It is not to be written to by way of GetFrameData and
///            GetFrameLineData, not even then: only what is different is drawn into it the next time. Whoever
///            has pixels to change swaps or copies them into a frame of his own.
/// Lifetime:  by reference count, see qvn::IQvnUnknown.
/// Units:     pixels for sizes and rectangles, bytes for lengths.
/// Alpha:     premultiplied wherever a frame with alpha is turned into an image.
/// Errors:    a refused operation changes nothing and tells so by its result (0 bytes, -1, -2, null). What
///            is odd is told at the operation.
class IShareFrame : public qvn::IQvnUnknown {
public:
    /// What is known about the picture besides its pixels.
    struct MetaInfo {
        /// The captured part of the desktop in unscaled global points; all zero when nobody set it. Frame
        /// width divided by its width is the scale of the picture.
        TVLRect rectCapture;
        /// The pointer is already in the pixels.
        bool bPointerCaptured;
    };

    /// Lays the caller's memory under the frame, which never frees it; the frame's own pixels are given up.
    /// `len` is trusted and the frame cannot grow while it is attached: setters go on giving 0, and the
    /// caller answers for it that the geometry fits. A null `buf` detaches; the frame then has no memory
    /// until its geometry needs more than the detached length. -1 for a `len` below 1 or for the frame's own
    /// memory.
    virtual int SetExternalBuf(unsigned char* buf, int len) = 0;

    /// A frame that is used again keeps its timestamp until it gets another; 0 lets the engine stamp it.
    /// Milliseconds of a monotonic clock (std::chrono::steady_clock), cut to 32 bits; never 0 once stamped.
    virtual void SetTimestamp(unsigned timestamp) = 0;
    virtual unsigned GetTimestamp() = 0;

    /// First byte of the first line, or null.
    virtual unsigned char* GetFrameData() = 0;
    /// First byte of a line, or null behind the picture. `line` equal to the height gives the address just
    /// behind the last line. Not checked: a negative `line` gives an address before the picture, which must
    /// not be used.
    virtual unsigned char* GetFrameLineData(int line) = 0;
    /// Line length times height.
    virtual int GetFrameDataLen() = 0;
    /// Bytes from one line to the next: what SetFrameLineBytes set, else width times bytes per pixel.
    virtual int GetFrameLineBytes() = 0;

    /// -1 below 1 and below three times the width. Stays in force across SetFrameSize until Reset.
    virtual int SetFrameLineBytes(int bytes) = 0;
    /// Gives the format in force afterwards; a value that is no format is ignored.
    virtual SHARE_FRAME_FORMAT SetFrameDataFormat(SHARE_FRAME_FORMAT format) = 0;
    virtual SHARE_FRAME_FORMAT GetFrameDataFormat() = 0;
    virtual int GetFrameSize(int& width, int& height) = 0;
    virtual int GetFrameSize(TVLSize& size) = 0;
    /// Negative values count as 0. The pixels are lost when the picture grows beyond the memory it has;
    /// memory is never given back before the frame ends.
    virtual int SetFrameSize(int width, int height) = 0;
    virtual int SetFrameSize(TVLSize size) = 0;

    /// Copies a block to the start of the pixels, whatever the line length. A block longer than
    /// GetFrameDataLen is refused whole. Gives the bytes written, or 0.
    virtual int WriteFrameData(const unsigned char* data, int len) = 0;
    /// Writes one line. `data` is dense.
    virtual int WriteFrameLineData(int line, const unsigned char* data, int len) = 0;
    /// Writes a rectangle that lies inside the frame; `data` holds its rows one after the other, all of them
    /// whatever `len` says: up to a row behind `len` is moved before it is noticed. Bytes per pixel are taken
    /// as line length divided by width. 0 when refused, and also when it had to stop on the way: the rows
    /// moved until then stay. An area with a left edge above 0 that reaches the last line gives 0 on a frame
    /// without spare memory although all its rows were moved.
    virtual int WriteFrameAreaData(TVLRect& rect, const unsigned char* data, int len) = 0;
    /// Copies from the start of the pixels at most what the frame's memory holds, and gives `len`, also when
    /// it copied less; 0 when refused.
    virtual int ReadFrameData(unsigned char* data, int len) = 0;
    virtual int ReadFrameLineData(int line, unsigned char* data, int len) = 0;
    /// The counterpart of WriteFrameAreaData.
    virtual int ReadFrameAreaData(TVLRect& rect, unsigned char* data, int len) = 0;

    /// Takes over size, timestamp, line length, format and pixels of another frame, not its meta information.
    /// 0, or -2 for null.
    virtual int CopyIShareFrame(IShareFrame* source) = 0;
    /// Exchanges everything with the other frame in constant time where both frames own their memory;
    /// otherwise copies from it.
    virtual int SwapOrCopy(IShareFrame* other) = 0;
    /// Forgets an explicit line length, nothing else. Memory follows with the next setter, so set the
    /// geometry right after it.
    virtual void Reset() = 0;

    virtual void SetMetaInfo(const MetaInfo& info) = 0;
    virtual MetaInfo GetMetaInfo() const = 0;

protected:
    ~IShareFrame() override = default;
};

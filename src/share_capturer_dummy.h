// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capturer.h"

#include <memory>

/// A capturer without a screen: a black line that moves down a white picture, one row a pass, and starts
/// again at the top. The first picture has its line in row 1; two in a row are never equal, unless they are
/// one row high.
///
/// The picture has the size that the settings gave when the capturer was made: a debug file that is read
/// again later changes the next capturer. Threads: Capture belongs to one thread; the rest as in the base.
class CShareCapturerDummy : public CShareCapturer {
public:
    explicit CShareCapturerDummy(const std::shared_ptr<ShareCapturerContext>& context);
    ~CShareCapturerDummy() override;

    /// -1 for a null frame, and without memory for the picture.
    int Capture(IShareFrame* frame) override;

private:
    int _LineBytes() const { return m_nDummyWidth * BYTES_PER_PIXEL; }
    void _PaintLine(int line, unsigned char value);
    void _MoveLine();
    void _FillFrame(IShareFrame& frame);

    static constexpr int BYTES_PER_PIXEL = 4;

    const int m_nDummyWidth;
    const int m_nDummyHeight;
    /// Null when there was no memory for it, or when it is more than a frame can hold.
    std::unique_ptr<unsigned char[]> m_pDummyImage;
    int m_nDummyLine = 0; // the black row
};

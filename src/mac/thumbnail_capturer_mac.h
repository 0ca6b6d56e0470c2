// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/thumbnail_capturer.h"

#include <vector>

/// Pictures of single windows, alone and whole, in their size in points.
class CThumbnailCapturerMac : public CThumbnailCapturer {
public:
    bool captureWindowImage(unsigned window, ImageData& image) override;

private:
    std::vector<unsigned char> m_buffer; // behind each image that is handed out; never shrinks
};

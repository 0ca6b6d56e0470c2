// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context_clip.h"
#include "platform/pixel_region.h"
#include "platform/window_image_drawing.h"
#include "src/mac/share_util_mac.h"
#include "src/share_frame_note.h"

#include <screenshare/share_types.h>

#include <optional>

/// What is composed in a frame.
struct ShareComposition {
    TVLSize size{};                // of the frame, pixels
    std::optional<int> background; // 0xRRGGBB; nothing where none of it is seen
    platform::CGRect place;        // where the image goes, counted from the bottom of the frame
    const platform::CGWindowImage* image = nullptr; // null for the plain background
    std::optional<ShareCursorDrawing> pointer;
};

/// What the pixels of a composed frame come from. It keeps none of the windows' pictures.
/// Threads: one at a time. Errors: std::bad_alloc.
class ShareCompositionNote final : public ShareFrameNote {
public:
    bool IsSameAs(const ShareFrameNote& other) const override;

    /// Becomes that of a composition on such a context, whose clip is the whole of it. False when it can't be
    /// told from others. After an exception it is none.
    bool Describe(const platform::CGContext* context, const ShareComposition& composition);

    /// The pixels of this composition, of that image, which are different from an earlier one and can be
    /// drawn without the others. Nothing when all have to be drawn.
    std::optional<platform::PixelRegion> ChangesSince(const ShareCompositionNote& before,
                                                      const platform::CGWindowImage* image) const;

    /// Whether the pointer lies in such a part: as a whole, if those are changes.
    bool HasPointerIn(const platform::PixelRegion& part) const { return m_pointer.Touches(part); }

private:
    struct Pointer {
        platform::CGImageRef image; // null for none
        platform::CGRect rect;
        platform::PixelBox box; // within the frame

        platform::PixelRect Rect() const;
        bool Touches(const platform::PixelRegion& region) const;
        bool operator==(const Pointer&) const = default;
    };

    bool IsSameGround(const ShareCompositionNote& other) const {
        return m_size == other.m_size && m_background == other.m_background;
    }

    TVLSize m_size{};
    std::optional<int> m_background;
    platform::WindowImageDrawing m_drawing;
    Pointer m_pointer;
};

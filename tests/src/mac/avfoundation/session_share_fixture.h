// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_context_mac.h"
#include "src/share_region.h"
#include "tests/src/mac/followed_share_fixture.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

/// Shares in the modes of sessions, on a desktop of any kind. Each pixel of a frame is held against a walk of
/// the test's own over the same windows.
class SessionShare : public FollowedShare {
protected:
    static constexpr std::uint32_t FILL = 0x002060; // of overlaps
    static constexpr std::uint32_t BLACK = 0;

    explicit SessionShare(SHARE_CAPTURE_ENGINE_TYPE type) : FollowedShare(type) {}

    /// What the client has listed.
    virtual void ListTo(ShareCapturerContext& context) const = 0;
    virtual bool IsOfDesktop() const { return false; }

    bool IsMix() const { return GetParam().mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX; }

    void SetUp() override {
        FollowedShare::SetUp();
        if (IsSkipped())
            return;
        settings->m_nOverlapFillColor = static_cast<int>(FILL);
        client.Watch([this](const DeliveredShot& shot) { m_red += CountReddish(shot); });
        EXPECT_EQ(client->SetCaptureMode(GetParam().mode), 0);
    }
    void TearDown() override {
        client.Watch(nullptr);
        if (m_desk == nullptr)
            return;
        EXPECT_EQ(client.Statistic().eCaptureMode, GetParam().mode);
        EXPECT_EQ(client.Statistic().nFlags, 0u) << "it has fallen back";
    }

    /// Pixels with any red in all frames so far.
    int RedSoFar() const { return m_red; }
    /// What was seen before it was kept out doesn't count.
    void ForgetRed() { m_red = 0; }

    /// Until the last frame shows what it has to, pixel by pixel.
    [[nodiscard]] bool RunUntilRight(TVLSize size) {
        std::optional<std::string> wrong;
        const bool isRight = RunUntil([&] {
            const DeliveredShot shot = client.Last();
            wrong = shot.Size() == size ? WhatIsWrongWith(shot) : "another size";
            return !wrong;
        });
        EXPECT_TRUE(isRight) << wrong.value_or("");
        return isRight;
    }

    /// A window that is in the picture, in front of those that were told before.
    void ExpectToSee(const platform::CGRect& frame, std::uint32_t rgb) { m_seen.push_back({frame, rgb}); }
    void ExpectToSeeText(std::uint32_t rgb) {
        m_textColour = rgb;
        ExpectToSee(TextFrame(), rgb);
    }
    /// A picture that has the text in its new colour is from behind the move.
    void MoveSecretOverRepaintedText(const platform::CGPoint& place) {
        Move(secret, {place, {60, 40}});
        EXPECT_TRUE(m_desk->Raise(secret)); // who shares an application brings it to the front
        ExpectToSeeText(m_textColour == GREEN ? BLUE : GREEN);
        EXPECT_TRUE(m_desk->Recolour(text, m_textColour));
        m_desk->Settle();
    }
    void ExpectToSeeNothing() { m_seen.clear(); }

private:
    struct SeenWindow {
        platform::CGRect frame;
        std::uint32_t rgb;
    };
    enum class Place : std::uint8_t {
        Visible,
        Overlap,
        Background,
        Edge,
    };

    static int CountReddish(const DeliveredShot& shot) {
        const TVLSize size = shot.Size();
        int count = 0;
        for (int y = 0; y < size.cy; ++y) {
            for (int x = 0; x < size.cx; ++x)
                count += (shot.At(x, y).rgb & 0xFF0000) != 0 ? 1 : 0;
        }
        return count;
    }

    /// In a smaller picture what lies on an edge is mixed, and what is very small isn't hidden at all.
    static void Mark(std::vector<Place>& places, TVLSize size, TVLRegion& region, const TVLRect& box,
                     Place place) {
        const float scale = static_cast<float>(size.cx) / static_cast<float>(box.right - box.left);
        if (scale < 1) {
            TVLRegion around;
            std::vector<TVLRect> rects;
            region.GetRects(rects);
            const int pixel = static_cast<int>(1 / scale);
            for (const TVLRect& rect : rects)
                around.AddRect(
                    {rect.left - pixel, rect.top - pixel, rect.right + pixel, rect.bottom + pixel});
            around.ProjectRgn(box, scale);
            Write(places, size, around, Place::Edge);
        }
        region.ProjectRgn(box, scale);
        Write(places, size, region, place);
    }
    static void Write(std::vector<Place>& places, TVLSize size, const TVLRegion& region, Place place) {
        std::vector<TVLRect> rects;
        region.GetRects(rects);
        for (const TVLRect& rect : rects) {
            for (int y = std::max(rect.top, 0); y < std::min(rect.bottom, size.cy); ++y) {
                for (int x = std::max(rect.left, 0); x < std::min(rect.right, size.cx); ++x)
                    places[static_cast<std::size_t>(y) * static_cast<std::size_t>(size.cx) +
                           static_cast<std::size_t>(x)] = place;
            }
        }
    }

    std::vector<Place> PlacesOf(TVLSize size, TVLRect& box) const {
        ShareCapturerContextMac walk;
        ListTo(walk);
        walk.UpdateShareCapturerContext();
        walk.GetDisplayBoxRect(box);
        std::vector<Place> places(static_cast<std::size_t>(size.cx) * static_cast<std::size_t>(size.cy));
        TVLRegion region;
        if (!IsOfDesktop()) {
            walk.GetBackgroundInvisiableRegion(region);
            Mark(places, size, region, box, Place::Background);
        }
        walk.GetOverlapRegion(region);
        Mark(places, size, region, box, Place::Overlap);
        return places;
    }

    /// Of the front window there; nothing beside all of them.
    std::optional<std::uint32_t> ColourOf(const platform::CGPoint& point) const {
        std::optional<std::uint32_t> rgb;
        for (const SeenWindow& window : m_seen) {
            const platform::CGRect& frame = window.frame;
            if (point.x >= frame.origin.x && point.x < frame.origin.x + frame.size.width &&
                point.y >= frame.origin.y && point.y < frame.origin.y + frame.size.height)
                rgb = window.rgb;
        }
        return rgb;
    }

    bool IsAmidOne(const platform::CGPoint& point) const {
        constexpr float MARGIN = 6;
        const auto rgb = ColourOf(point);
        return ColourOf({point.x - MARGIN, point.y - MARGIN}) == rgb &&
               ColourOf({point.x + MARGIN, point.y - MARGIN}) == rgb &&
               ColourOf({point.x - MARGIN, point.y + MARGIN}) == rgb &&
               ColourOf({point.x + MARGIN, point.y + MARGIN}) == rgb;
    }

    /// Nothing where any colour will do.
    std::optional<std::uint32_t> Expected(Place place, const std::optional<std::uint32_t>& shown) const {
        if (place == Place::Edge)
            return std::nullopt;
        if (place == Place::Background)
            return BACKGROUND;
        if (place == Place::Overlap && !IsMix())
            return FILL;
        return shown;
    }

    std::optional<std::string> WhatIsWrongWith(const DeliveredShot& shot) const {
        const TVLSize size = shot.Size();
        TVLRect box{};
        const std::vector<Place> places = PlacesOf(size, box);
        if (shot.meta.rectCapture != box)
            return "of another place";
        const float scale = static_cast<float>(size.cx) / static_cast<float>(box.right - box.left);
        std::size_t index = 0;
        for (int y = 0; y < size.cy; ++y) {
            for (int x = 0; x < size.cx; ++x, ++index) {
                const platform::CGPoint point{static_cast<float>(box.left) + static_cast<float>(x) / scale,
                                              static_cast<float>(box.top) + static_cast<float>(y) / scale};
                if (IsMix() && scale < 1 && !IsAmidOne(point))
                    continue; // what is drawn again is scaled with its neighbours
                const auto rgb = Expected(places[index], ColourOf(point));
                if (rgb && shot.At(x, y) != FramePixel{*rgb})
                    return "at " + std::to_string(x) + "," + std::to_string(y) + " it is " +
                           testing::PrintToString(shot.At(x, y)) + " and not " +
                           testing::PrintToString(FramePixel{*rgb});
            }
        }
        return std::nullopt;
    }

    std::vector<SeenWindow> m_seen; // the front one last
    std::uint32_t m_textColour = GREEN;
    std::atomic<int> m_red{0};
};

/// Every kind of desktop in either mode.
inline std::vector<ShareDeskKind> SessionShareDeskKinds() {
    std::vector<ShareDeskKind> kinds;
    for (ShareDeskKind kind : ShareDeskKinds()) {
        for (const SCREEN_CAPTURER_TYPE mode :
             {SCREEN_CAPTURER_TYPE_AVFOUNDATION, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX}) {
            kind.mode = mode;
            kinds.push_back(kind);
        }
    }
    return kinds;
}

inline std::string SessionShareDeskName(const testing::TestParamInfo<ShareDeskKind>& each) {
    return std::string(each.param.name) + "_mode_" + std::to_string(each.param.mode);
}

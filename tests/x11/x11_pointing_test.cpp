// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/share_pointing_mouse_mac.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/support/settings_scope.h"
#include "tests/x11/x11_desk.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>
#include <xcb/xfixes.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// The pointer of a real X server, against what its own extension for cursors says of it.

namespace {

using Bytes = std::vector<std::uint8_t>;

/// A cursor as a client sees it.
struct CursorSeen {
    int hotX = 0;
    int hotY = 0;
    TVLSize size{};
    Bytes rgba;

    bool operator==(const CursorSeen&) const = default;
};

void PrintTo(const CursorSeen& cursor, std::ostream* out) {
    *out << cursor.size.cx << "x" << cursor.size.cy << " pointing with " << cursor.hotX << "," << cursor.hotY;
}

class CPointerSink : public ISharePointingSink {
public:
    int OnPointingPosChanged(int x, int y) override {
        position = std::to_string(x) + "," + std::to_string(y);
        return 0;
    }
    int OnPointingImgChanged(ISharePointingImg* image) override {
        CursorSeen seen;
        seen.hotX = image->GetHotPointX();
        seen.hotY = image->GetHotPointY();
        IShareFrame* const frame = image->GetImgData();
        frame->GetFrameSize(seen.size);
        seen.rgba.resize(static_cast<std::size_t>(frame->GetFrameDataLen()));
        frame->ReadFrameData(seen.rgba.data(), frame->GetFrameDataLen());
        images.push_back(seen);
        return 0;
    }

    std::string position;
    std::vector<CursorSeen> images;
};

/// Another client, which makes cursors and asks for them.
class CursorMaker {
public:
    explicit CursorMaker(const std::string& display) : m_link(display) {
        std::free(xcb_xfixes_query_version_reply(m_link.Get(), xcb_xfixes_query_version(m_link.Get(), 5, 0),
                                                 nullptr));
    }

    /// One of the shapes that every X server has.
    void ShowShape(std::uint16_t shape) {
        const xcb_font_t font = xcb_generate_id(m_link.Get());
        const std::string name = "cursor";
        xcb_open_font(m_link.Get(), font, static_cast<std::uint16_t>(name.size()), name.data());
        const xcb_cursor_t cursor = xcb_generate_id(m_link.Get());
        const auto mask = static_cast<std::uint16_t>(shape + 1);
        xcb_create_glyph_cursor(m_link.Get(), cursor, font, font, shape, mask, 0, 0, 0, 0xFFFF, 0x8080, 0);
        Show(cursor);
        xcb_close_font(m_link.Get(), font);
    }

    /// A block that points with one of its own pixels.
    void ShowBlock(std::uint16_t side, std::uint16_t hotX, std::uint16_t hotY) {
        const xcb_pixmap_t block = xcb_generate_id(m_link.Get());
        const xcb_gcontext_t context = xcb_generate_id(m_link.Get());
        const std::uint32_t ones = 1;
        const xcb_rectangle_t all{0, 0, side, side};
        xcb_create_pixmap(m_link.Get(), 1, block, m_link.Root(), side, side);
        xcb_create_gc(m_link.Get(), context, block, XCB_GC_FOREGROUND, &ones);
        xcb_poly_fill_rectangle(m_link.Get(), block, context, 1, &all);
        const xcb_cursor_t cursor = xcb_generate_id(m_link.Get());
        xcb_create_cursor(m_link.Get(), cursor, block, block, 0xFFFF, 0x8080, 0, 0, 0, 0, hotX, hotY);
        Show(cursor);
        xcb_free_gc(m_link.Get(), context);
        xcb_free_pixmap(m_link.Get(), block);
    }

    /// What the server says that the cursor is. Its words have alpha, red, green and blue, and no colour may
    /// exceed its alpha.
    std::optional<CursorSeen> Ask() const {
        auto* const reply = xcb_xfixes_get_cursor_image_reply(
            m_link.Get(), xcb_xfixes_get_cursor_image(m_link.Get()), nullptr);
        if (reply == nullptr)
            return std::nullopt;
        CursorSeen seen{reply->xhot, reply->yhot, {reply->width, reply->height}, {}};
        const std::uint32_t* const words = xcb_xfixes_get_cursor_image_cursor_image(reply);
        const int count = xcb_xfixes_get_cursor_image_cursor_image_length(reply);
        for (int i = 0; i < count; ++i) {
            const std::uint32_t alpha = words[i] >> 24;
            for (const int shift : {16, 8, 0})
                seen.rgba.push_back(static_cast<std::uint8_t>(std::min(words[i] >> shift & 0xFF, alpha)));
            seen.rgba.push_back(static_cast<std::uint8_t>(alpha));
        }
        std::free(reply);
        return seen;
    }

private:
    /// Over everything that has none of its own.
    void Show(xcb_cursor_t cursor) {
        xcb_change_window_attributes(m_link.Get(), m_link.Root(), XCB_CW_CURSOR, &cursor);
        xcb_free_cursor(m_link.Get(), cursor);
        m_link.RoundTrip();
    }

    XLink m_link;
};

class X11Pointing : public testing::Test {
protected:
    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin(XServer::Kind kind = XServer::Kind::Xvfb) {
        X11DeskOptions options;
        options.server.kind = kind;
        if (const auto missing = MissingProgram(options.Programs())) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        m_desk = std::make_shared<X11Desk>(options);
        m_served.emplace(m_desk);
        m_desk->Settle();
        return true;
    }

    X11Desk& Desk() { return *m_desk; }

    /// Whether the sink comes to hear of the pointer there, after it was put there.
    testing::AssertionResult HearsOf(CSharePointingMouseMac& mouse, const platform::CGPoint& place,
                                     const std::string& position) {
        Desk().MovePointer(place);
        const bool heard = ComesTrue([&] {
            mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
            return sink.position == position;
        });
        return heard ? testing::AssertionSuccess() : testing::AssertionFailure() << "at " << sink.position;
    }

    const CSettingsScope settings;
    CPointerSink sink;

private:
    std::shared_ptr<X11Desk> m_desk;
    std::optional<CServedDesk> m_served;
};

TEST_F(X11Pointing, TellsEachCursorWithTheHotSpotAndThePixelsThatTheServerSays) {
    if (!Begin())
        return;
    CursorMaker maker(Desk().Rig().Display());
    Desk().MovePointer({100, 50});
    CSharePointingMouseMac mouse(platform::CGMainDisplayID());
    mouse.AddSink(&sink);
    constexpr std::uint16_t ARROW = 68;
    constexpr std::uint16_t TEXT = 152;
    constexpr std::uint16_t HAND = 60;
    const std::vector<std::function<void()>> changes = {
        [&] { maker.ShowShape(ARROW); },     [&] { maker.ShowShape(TEXT); },
        [&] { maker.ShowShape(HAND); },      [&] { maker.ShowBlock(16, 0, 0); },
        [&] { maker.ShowBlock(16, 15, 7); }, [&] { maker.ShowBlock(24, 15, 7); },
        [&] { maker.ShowShape(ARROW); },
    };
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    for (std::size_t i = 0; i < changes.size(); ++i) {
        sink.images.clear();
        changes[i]();
        const std::optional<CursorSeen> said = maker.Ask();
        ASSERT_TRUE(said);
        EXPECT_TRUE(ComesTrue([&] {
            mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
            return !sink.images.empty();
        })) << i;
        Desk().Settle();
        mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
        ASSERT_EQ(sink.images.size(), 1u) << i;
        EXPECT_EQ(sink.images[0], *said) << i;
        EXPECT_TRUE(
            std::any_of(said->rgba.begin(), said->rgba.end(), [](std::uint8_t byte) { return byte != 0; }))
            << i << ": nothing to be seen";
    }
}

TEST_F(X11Pointing, TellsNothingOfAnotherCursorThatLooksTheSame) {
    if (!Begin())
        return;
    CursorMaker maker(Desk().Rig().Display());
    Desk().MovePointer({100, 50});
    maker.ShowBlock(16, 3, 4);
    Desk().Settle();
    CSharePointingMouseMac mouse(platform::CGMainDisplayID());
    mouse.AddSink(&sink);
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    maker.ShowBlock(16, 3, 4);
    Desk().Settle();
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(sink.images.size(), 1u);
    EXPECT_EQ(sink.images[0], maker.Ask());
}

TEST_F(X11Pointing, FollowsAWarpedPointer) {
    if (!Begin())
        return;
    CSharePointingMouseMac mouse(platform::CGMainDisplayID());
    mouse.AddSink(&sink);
    mouse.Start();
    EXPECT_TRUE(HearsOf(mouse, {100, 50}, "100,50"));
    EXPECT_TRUE(HearsOf(mouse, {101, 50}, "101,50"));
    EXPECT_TRUE(HearsOf(mouse, {0, 0}, "0,0"));
    EXPECT_TRUE(HearsOf(mouse, {1279, 719}, "1279,719"));
    AppShareConfig::Instance()->SetCurrentScale(0.5F);
    EXPECT_TRUE(HearsOf(mouse, {301, 200}, "150,100"));
}

TEST_F(X11Pointing, TellsPositionsFromTheTopLeftOfItsDisplayAndNoneElsewhere) {
    if (!Begin(XServer::Kind::Xorg))
        return;
    const std::optional<platform::CGDirectDisplayID> side = Desk().AddDisplay({640, 480});
    ASSERT_TRUE(side);
    ASSERT_TRUE(ComesTrue([&] { return platform::CGDisplayBounds(*side).size.width > 0; }));
    const platform::CGPoint origin = platform::CGDisplayBounds(*side).origin;
    EXPECT_GT(origin.x + origin.y, 0);
    CSharePointingMouseMac mouse(platform::CGMainDisplayID());
    mouse.AddSink(&sink);
    mouse.Start();
    EXPECT_TRUE(HearsOf(mouse, {7, 9}, "7,9"));
    Desk().MovePointer({origin.x + 30, origin.y + 40});
    for (int i = 0; i < 10; ++i)
        mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(sink.position, "7,9");
    mouse.SetBaseDisplayID(*side);
    EXPECT_TRUE(HearsOf(mouse, {origin.x + 31, origin.y + 40}, "31,40"));
}

TEST_F(X11Pointing, IsToldWithThePicturesOfWindows) {
    if (!Begin(XServer::Kind::Xorg))
        return;
    const auto toldWithPicture = [&] {
        platform::WindowPictureRequest request;
        request.rect = {{0, 0}, {4000, 4000}};
        const auto windows = Desk().Server().GetWindows();
        for (const platform::WindowInfo& window : windows->Windows())
            request.windows.push_back(window.id);
        request.deadline = CmSteadyNow() + PATIENCE;
        const auto taken = Desk().Server().TakeWindowPicture(request);
        return taken.picture != nullptr ? taken.picture->pointer : std::nullopt;
    };
    Desk().MovePointer({301, 202});
    EXPECT_EQ(toldWithPicture(), (platform::CGPoint{301, 202}));
    const std::optional<platform::CGDirectDisplayID> side = Desk().AddDisplay({640, 480});
    ASSERT_TRUE(side);
    ASSERT_TRUE(Desk().MakeMain(*side));
    ASSERT_TRUE(ComesTrue([&] { return platform::CGMainDisplayID() == *side; }));
    Desk().MovePointer({40, 30}); // of the root
    platform::CGPoint asked;
    // It waits no longer than a tenth of a second for the answer.
    ASSERT_TRUE(ComesTrue([&] { return Desk().Server().GetPointerPosition(asked); }));
    EXPECT_EQ(asked, (platform::CGPoint{40 - 1280, 30}));
    EXPECT_EQ(toldWithPicture(), asked);
}

} // namespace

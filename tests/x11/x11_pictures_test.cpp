// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_fixture.h"

#include <xcb/composite.h>

#include <cstdlib>

/// Pictures of windows of all sorts, from a real server.

namespace {

using namespace platform;
using Manager = X11DeskOptions::Manager;

class X11Pictures : public X11Test {
protected:
    static X11DeskOptions Openbox() { return {{.kind = XServer::Kind::Xvfb}, Manager::Openbox}; }

    /// What the server itself holds of a window, past everything that is withheld: one pixel of it.
    std::uint32_t StoredPixel(std::uint32_t window) {
        const XLink link(Desk().Rig().Display());
        const xcb_pixmap_t pixmap = xcb_generate_id(link.Get());
        xcb_composite_name_window_pixmap(link.Get(), window, pixmap);
        const auto cookie =
            xcb_get_image(link.Get(), XCB_IMAGE_FORMAT_Z_PIXMAP, pixmap, 5, 5, 1, 1, 0xFFFFFFFFU);
        xcb_get_image_reply_t* const reply = xcb_get_image_reply(link.Get(), cookie, nullptr);
        std::uint32_t pixel = 0;
        if (reply != nullptr)
            std::memcpy(&pixel, xcb_get_image_data(reply), sizeof(pixel));
        std::free(reply);
        return pixel & 0xFFFFFFU;
    }

    /// Takes pictures until the application was told to paint and it shows; none may show what is behind.
    void ExpectNothingOfWhatIsBehind(CGWindowID window) {
        for (int i = 0; i < 50; ++i) {
            const PicturePtr picture = TakeOne(window);
            if (picture != nullptr) {
                ASSERT_EQ(CountPixels(*picture, RED), 0) << "picture " << i;
            }
        }
        ASSERT_TRUE(Application().Tell("paint window"));
        EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
    }
};

} // namespace

// ---- Whole windows

TEST_F(X11Pictures, ShowTheWholeOfAWindowThatIsCovered) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "100 100 300 200 00ff00");
    const CGWindowID cover = Add("cover", "50 50 500 400 ff0000 override");
    EXPECT_NE(TakeWhenShown(cover, RED), nullptr);
    const PicturePtr picture = TakeWhenShown(window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 300);
    EXPECT_EQ(picture->height, 200);
}

TEST_F(X11Pictures, ShowTheWholeOfAWindowThatIsPartlyOffTheScreen) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "-150 -50 300 200 00ff00");
    const PicturePtr picture = TakeWhenShown(window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 300);
    EXPECT_EQ(Listed(window).frame, (CGRect{{-150, -50}, {300, 200}}));
    const CGWindowID outside = Add("outside", "2000 2000 30 20 0000ff");
    EXPECT_NE(TakeWhenShown(outside, BLUE), nullptr);
}

TEST_F(X11Pictures, ShowTheWholeOfAWindowThatIs30000PixelsWide) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "10 10 30000 20 00ff00");
    const PicturePtr picture = TakeWhenShown(window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 30000);
    EXPECT_EQ(picture->height, 20);
}

TEST_F(X11Pictures, ShowAnOverrideRedirectWindowAboveAllNormalOnes) {
    if (!Begin(Openbox()))
        return;
    const CGWindowID window = Add("window", "100 100 50 50 00ff00");
    const CGWindowID menu = Add("menu", "100 100 50 50 0000ff override");
    EXPECT_NE(TakeWhenShown(menu, BLUE), nullptr);
    EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
    EXPECT_EQ(Listed(menu).level, 101);
    EXPECT_EQ(Listed(window).level, 0);
    const auto both = Take({window, menu}).picture;
    ASSERT_NE(both, nullptr);
    ASSERT_EQ(both->layers.size(), 2u);
    EXPECT_EQ(both->layers[1].window, menu) << "the one in front comes last";
}

TEST_F(X11Pictures, ShowTheFrameOfADecoratedWindowUnderTheWindowsOwnName) {
    if (!Begin(Openbox()))
        return;
    const CGWindowID window = Add("window", "100 100 200 150 00ff00 decorated");
    ASSERT_TRUE(ComesTrue([&] { return Listed(window).frame.size.height > 150; })) << "without a title bar";
    const CGRect frame = Listed(window).frame;
    ASSERT_TRUE(ComesTrue([&] {
        const PicturePtr picture = TakeOne(window);
        return picture != nullptr && CountPixels(*picture, GREEN) == 200 * 150;
    }));
    const PicturePtr picture = TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->rect.size, frame.size);
    EXPECT_EQ(Listed(window).owner, Pid()) << "the window manager owns the frame only";
}

TEST_F(X11Pictures, ShowADecoratedWindowThatWasCoveredBeforeAnybodyLooked) {
    if (!Begin(Openbox()))
        return;
    Server().Rest();
    const auto window = Application().Create("window", "100 100 200 150 00ff00 decorated");
    ASSERT_TRUE(window);
    const XLink link(Desk().Rig().Display());
    ASSERT_TRUE(ComesTrue([&] { return !link.Property(*window, "_NET_FRAME_EXTENTS").empty(); }));
    ASSERT_TRUE(Application().Create("cover", "50 50 500 400 0000ff override"));
    EXPECT_TRUE(ComesTrue([&] {
        const PicturePtr picture = TakeOne(*window);
        return picture != nullptr && CountPixels(*picture, GREEN) == 200 * 150;
    })) << "it has been asked to paint, and did";
}

TEST_F(X11Pictures, ShowABorderAsPartOfTheWindow) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "100 100 50 40 00ff00 border=5");
    EXPECT_EQ(Listed(window).frame, (CGRect{{100, 100}, {60, 50}}));
    const PicturePtr picture = TakeWhenShown(window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 60);
    EXPECT_EQ(picture->height, 50);
}

// ---- Parts of windows

TEST_F(X11Pictures, AreTransparentOutsideOfAWindowsShape) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "100 100 80 60 00ff00 shaped");
    ASSERT_TRUE(ComesTrue([&] {
        const PicturePtr picture = TakeOne(window);
        return picture != nullptr && CountPixels(*picture, GREEN) == 80 * 60 * 3 / 4;
    }));
    const PicturePtr picture = TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(ArgbAt(*picture, 10, 50), 0xFF000000U | GREEN);
    EXPECT_EQ(ArgbAt(*picture, 70, 10), 0xFF000000U | GREEN);
    EXPECT_EQ(ArgbAt(*picture, 70, 50), 0U);
}

TEST_F(X11Pictures, KeepTheAlphaOfAWindowThatHasItWhereACompositorShowsIt) {
    if (!Begin({{.kind = XServer::Kind::Xvfb}, Manager::None, true}))
        return;
    const CGWindowID opaque = Add("opaque", "100 100 50 50 00ff00 argb");
    EXPECT_NE(TakeWhenShown(opaque, GREEN), nullptr);
    const CGWindowID half = Add("half", "100 100 50 50 00ff00 argb alpha=128");
    EXPECT_TRUE(ComesTrue([&] {
        const PicturePtr picture = TakeOne(half);
        return picture != nullptr && ArgbAt(*picture, 20, 20) == 0x80008000U;
    }));
}

TEST_F(X11Pictures, ShowAWindowWithAlphaOpaqueWhereNothingBlendsIt) {
    if (!Begin())
        return;
    const CGWindowID half = Add("half", "100 100 50 50 00ff00 argb alpha=128");
    EXPECT_NE(TakeWhenShown(half, 0x008000), nullptr) << "what everybody sees on the screen";
}

TEST_F(X11Pictures, LeaveOutTheShadowThatAClientHasDrawnForItself) {
    if (!Begin(Openbox()))
        return;
    const CGWindowID window = Add("window", "100 100 80 60 00ff00 extents=10");
    ASSERT_TRUE(ComesTrue([&] { return Listed(window).frame == CGRect{{110, 110}, {60, 40}}; }));
    const PicturePtr picture = TakeWhenShown(window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 60);
    EXPECT_EQ(picture->height, 40);
}

TEST_F(X11Pictures, AreNotMadeOfWindowsThatHaveNoPixels) {
    if (!Begin())
        return;
    const CGWindowID seen = Add("window", "100 100 50 50 00ff00");
    const auto invisible = Application().Create("invisible", "100 100 50 50 0 inputonly override");
    ASSERT_TRUE(invisible);
    Desk().Settle();
    EXPECT_NE(TakeWhenShown(seen, GREEN), nullptr);
    EXPECT_FALSE(Server().GetWindows()->Find(*invisible) != nullptr && Listed(*invisible).onScreen);
    const auto both = Take({seen, *invisible}).picture;
    ASSERT_NE(both, nullptr);
    EXPECT_EQ(both->layers.size(), 1u);
}

// ---- What a window hasn't painted

TEST_F(X11Pictures, WithholdWhatLiesBehindAWindowThatHasNotPainted) {
    if (!Begin())
        return;
    Add("behind", "50 50 500 400 ff0000");
    const CGWindowID window = Add("window", "100 100 200 150 00ff00 none idle");
    ASSERT_EQ(StoredPixel(window), RED) << "there is nothing to withhold: the test proves nothing";
    ExpectNothingOfWhatIsBehind(window);
}

TEST_F(X11Pictures, WithholdWhatLiesBehindThePartThatAWindowHasGrownBy) {
    if (!Begin())
        return;
    Add("behind", "50 50 500 400 ff0000");
    const CGWindowID window = Add("window", "100 100 2 2 00ff00 none idle");
    ASSERT_TRUE(Application().Tell("place window 100 100 200 150"));
    ASSERT_TRUE(ComesTrue([&] { return Listed(window).frame.size.width == 200; }));
    ASSERT_EQ(StoredPixel(window), RED) << "there is nothing to withhold: the test proves nothing";
    ExpectNothingOfWhatIsBehind(window);
}

TEST_F(X11Pictures, WithholdWhatCoveredAWindowBeforeAnybodyLooked) {
    if (!Begin())
        return;
    Server().Rest();
    ASSERT_TRUE(Application().Create("window", "100 100 200 150 00ff00 none idle"));
    ASSERT_TRUE(Application().Create("cover", "50 50 500 400 ff0000"));
    const CGWindowID window = Server().GetWindows()->Windows().at(1).id;
    ASSERT_EQ(Listed(window).frame, (CGRect{{100, 100}, {200, 150}}));
    ExpectNothingOfWhatIsBehind(window);
}

// ---- Windows that change meanwhile

TEST_F(X11Pictures, AreOfAMinimisedWindowsLastMomentAndSaySo) {
    if (!Begin(Openbox()))
        return;
    const CGWindowID window = Add("window", "100 100 50 50 00ff00");
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    ASSERT_TRUE(Application().Tell("minimise window"));
    ASSERT_TRUE(ComesTrue([&] { return !Listed(window).onScreen; }));
    const auto minimised = Take({window});
    ASSERT_EQ(minimised.outcome, PictureOutcome::Ok);
    ASSERT_EQ(minimised.picture->layers.size(), 1u) << "it was seen a moment ago";
    EXPECT_TRUE(minimised.picture->layers[0].stale);
    EXPECT_TRUE(Shows(*minimised.picture->layers[0].picture, GREEN));
    ASSERT_TRUE(Application().Tell("restore window"));
    EXPECT_TRUE(ComesTrue([&] {
        const auto picture = Take({window}).picture;
        return picture != nullptr && picture->layers.size() == 1 && !picture->layers[0].stale;
    }));
}

TEST_F(X11Pictures, ComeOrFailLawfullyWhenAWindowChangesBeforeThem) {
    if (!Begin())
        return;
    for (const std::string change : {"destroy w", "unmap w", "place w 1 1 7 900"}) {
        const CGWindowID window = Add("w", "100 100 300 200 00ff00");
        ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
        const auto before = Server().GetWindows();
        ASSERT_NE(before->Find(window), nullptr);
        ASSERT_TRUE(Application().Tell(change));
        const WindowPictureResult result = Take({window});
        EXPECT_TRUE(result.outcome == PictureOutcome::Ok || result.outcome == PictureOutcome::Gone) << change;
        if (result.picture != nullptr) {
            for (const PictureLayer& layer : result.picture->layers)
                EXPECT_TRUE(IsLawful(*layer.picture)) << change;
        }
        Application().Tell("destroy w");
    }
}

// ---- Other depths

TEST_F(X11Pictures, AreConvertedFrom16BitsAPixel) {
    if (!Begin({{.depth = 16}}))
        return;
    EXPECT_NE(TakeWhenShown(Add("green", "10 10 50 50 00ff00"), GREEN), nullptr);
    EXPECT_NE(TakeWhenShown(Add("white", "10 10 50 50 ffffff"), 0xFFFFFF), nullptr);
    EXPECT_NE(TakeWhenShown(Add("black", "10 10 50 50 000000"), 0x000000), nullptr);
}

TEST_F(X11Pictures, AreConvertedFrom30BitsAPixel) {
    if (!Begin({{.depth = 30}}))
        return;
    EXPECT_NE(TakeWhenShown(Add("green", "10 10 50 50 00ff00"), GREEN), nullptr);
    EXPECT_NE(TakeWhenShown(Add("mixed", "10 10 50 50 336699"), 0x336699), nullptr);
}

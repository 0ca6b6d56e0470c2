// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_fixture.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>

/// What pictures of a display tell of the stack of windows.

namespace {

using namespace platform;

class X11Stacks : public X11Test {
protected:
    std::uint64_t Generation() { return Server().GetWindows()->Generation(); }

    bool Open() {
        m_stream = Server()
                       .OpenDisplayStream({.display = Server().GetDisplays()->at(0).id,
                                           .framesPerSecond = 1000,
                                           .withPointer = false})
                       .stream;
        return m_stream != nullptr;
    }

    PicturePtr Next() { return m_stream->TakeNewest(CmSteadyNow() + PATIENCE).picture; }

    /// The first picture for which that is true; null when there is none.
    PicturePtr ReadUntil(const std::function<bool(const Picture&)>& isWanted) {
        PicturePtr picture;
        const bool comes = ComesTrue([&] {
            picture = Next();
            return picture != nullptr && isWanted(*picture);
        });
        return comes ? picture : nullptr;
    }

    PicturePtr ReadUntilItShowsTheStack() {
        return ReadUntil([this](const Picture& picture) {
            return picture.generationBefore == picture.generationAfter &&
                   picture.generationAfter == Generation();
        });
    }

    bool Raise(const std::string& name) {
        const std::uint64_t before = Generation();
        return Application().Tell("raise " + name) && ComesTrue([&] { return Generation() > before; });
    }

    std::unique_ptr<DisplayStream> m_stream;
};

const XServerOptions SMALL{.width = 640, .height = 480};

} // namespace

TEST_F(X11Stacks, AreToldAnewThoughTheScreenStandsStill) {
    if (!Begin({SMALL}))
        return;
    Add("left", "20 20 60 40 00ff00");
    Add("right", "120 20 60 40 0000ff");
    ASSERT_TRUE(Open());
    const PicturePtr before = ReadUntilItShowsTheStack();
    ASSERT_NE(before, nullptr);
    EXPECT_EQ(ArgbAt(*before, 30, 30), 0xFF00FF00);
    EXPECT_EQ(ArgbAt(*before, 130, 30), 0xFF0000FF);
    ASSERT_TRUE(ComesTrue([this] { return Next() == nullptr; }));
    ASSERT_TRUE(Raise("left"));
    const PicturePtr after = ReadUntil([](const Picture&) { return true; });
    ASSERT_NE(after, nullptr);
    EXPECT_TRUE(after->changed.empty());
    EXPECT_EQ(after->pixels, before->pixels);
    EXPECT_EQ(after->generationBefore, Generation());
    EXPECT_EQ(after->generationAfter, Generation());
    EXPECT_EQ(Next(), nullptr);
}

TEST_F(X11Stacks, AreCertainOnceTheCompositorHasFollowed) {
    if (!Begin({.server = SMALL, .picom = true}))
        return;
    Add("left", "20 20 60 40 00ff00");
    Add("right", "120 20 60 40 0000ff");
    ASSERT_TRUE(Open());
    ASSERT_NE(ReadUntilItShowsTheStack(), nullptr);
    ASSERT_TRUE(Raise("left"));
    EXPECT_NE(ReadUntilItShowsTheStack(), nullptr);
    EXPECT_TRUE(ComesTrue([this] { return Next() == nullptr; }));
}

TEST_F(X11Stacks, CannotBeToldWhileAWindowShowsWhatLiesBehindIt) {
    if (!Begin({SMALL}))
        return;
    Add("secret", "20 20 60 40 ff0000");
    ASSERT_TRUE(Open());
    ASSERT_NE(ReadUntilItShowsTheStack(), nullptr);
    ASSERT_NE(Add("window", "20 20 60 40 00ff00 none idle"), 0U);
    const PicturePtr through =
        ReadUntil([this](const Picture& each) { return each.generationAfter == Generation(); });
    ASSERT_NE(through, nullptr);
    EXPECT_EQ(ArgbAt(*through, 30, 30), 0xFFFF0000) << "it has no background and hasn't painted";
    EXPECT_EQ(through->generationBefore, 0U);

    Add("lid", "10 10 80 60 0000ff");
    EXPECT_NE(ReadUntilItShowsTheStack(), nullptr) << "nobody sees it";
    ASSERT_TRUE(Application().Tell("destroy lid"));
    EXPECT_NE(ReadUntil([](const Picture& each) { return each.generationBefore == 0; }), nullptr);

    ASSERT_TRUE(Application().Tell("paint window"));
    const PicturePtr painted = ReadUntilItShowsTheStack();
    ASSERT_NE(painted, nullptr);
    EXPECT_EQ(ArgbAt(*painted, 30, 30), 0xFF00FF00);
}

TEST_F(X11Stacks, CannotBeToldWhileAWindowHasGrownAndNotPaintedYet) {
    if (!Begin({SMALL}))
        return;
    Add("secret", "20 20 200 40 ff0000");
    ASSERT_NE(Add("window", "20 20 60 40 00ff00 none slow=60000"), 0U);
    ASSERT_TRUE(Application().Tell("paint window"));
    ASSERT_TRUE(Open());
    ASSERT_NE(ReadUntilItShowsTheStack(), nullptr);
    ASSERT_TRUE(Application().Tell("place window 20 20 120 40"));
    const PicturePtr through =
        ReadUntil([this](const Picture& each) { return each.generationAfter == Generation(); });
    ASSERT_NE(through, nullptr);
    EXPECT_EQ(ArgbAt(*through, 130, 30), 0xFFFF0000);
    EXPECT_EQ(through->generationBefore, 0U);
    ASSERT_TRUE(Application().Tell("paint window"));
    EXPECT_NE(ReadUntilItShowsTheStack(), nullptr);
}

TEST_F(X11Stacks, CannotBeToldWhileAFrameIsSeenThatHasLostItsClient) {
    if (!Begin({SMALL}))
        return;
    ASSERT_NE(Add("window", "20 20 60 40 00ff00"), 0U);
    const XLink link(Desk().Rig().Display());
    const auto make = [&link](xcb_window_t parent) {
        const xcb_window_t made = xcb_generate_id(link.Get());
        xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, made, parent, 0, 0, 60, 40, 0,
                          XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL,
                          &link.Screen().white_pixel);
        return made;
    };
    const xcb_window_t frame = make(link.Root());
    const xcb_window_t client = make(frame);
    const std::uint32_t state[] = {1, 0};
    xcb_change_property(link.Get(), XCB_PROP_MODE_REPLACE, client, link.Atom("WM_STATE"),
                        link.Atom("WM_STATE"), 32, 2, state);
    xcb_map_window(link.Get(), client);
    xcb_map_window(link.Get(), frame);
    link.RoundTrip();
    const auto isListed = [&](xcb_window_t window) { return Server().GetWindows()->Find(window) != nullptr; };
    ASSERT_TRUE(ComesTrue([&] { return isListed(client); }));
    ASSERT_TRUE(Open());
    ASSERT_NE(ReadUntilItShowsTheStack(), nullptr);

    xcb_destroy_window(link.Get(), client);
    link.RoundTrip();
    ASSERT_TRUE(ComesTrue([&] { return !isListed(client); }));
    ASSERT_FALSE(isListed(frame));
    const PicturePtr untold =
        ReadUntil([this](const Picture& each) { return each.generationAfter == Generation(); });
    ASSERT_NE(untold, nullptr);
    EXPECT_EQ(untold->generationBefore, 0U) << "nobody can keep out what isn't listed";
    EXPECT_TRUE(ComesTrue([this] { return Next() == nullptr; }));

    xcb_destroy_window(link.Get(), frame);
    link.RoundTrip();
    EXPECT_NE(ReadUntilItShowsTheStack(), nullptr);
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"

#include "platform/simulated/scene.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <set>
#include <vector>

using namespace platform;

namespace {

using Rects = std::vector<PixelRect>;

PixelRegion RegionOf(const Rects& rects) {
    PixelRegion region;
    for (const PixelRect& rect : rects)
        region.Add(rect);
    return region;
}

/// The next picture of a window, in which those are different from the one before.
Picture After(const Picture& before, const Rects& changed) {
    Picture picture;
    picture.serial = NextPictureSerial();
    picture.steps = StepsAfter(before, RegionOf(changed));
    return picture;
}

Picture First() {
    Picture picture;
    picture.serial = NextPictureSerial();
    return picture;
}

/// The picture of the only window of a desktop.
PicturePtr PictureOfWindow(SimulatedWindowServer& server, unsigned options = 1) {
    WindowPictureRequest request;
    request.windows = {1};
    request.rect = {{0, 0}, {200, 100}};
    request.options = options;
    request.deadline = CmSteadyNow() + DEFAULT_IMAGE_DEADLINE;
    const WindowPictureResult result = server.TakeWindowPicture(request);
    return result.picture != nullptr && !result.picture->layers.empty() ? result.picture->layers[0].picture
                                                                        : nullptr;
}

SimulatedContent Block(const PixelRect& block) {
    return SimulatedContent::Painted([block](int x, int y) {
        const bool inside = x >= block.left && x < block.right && y >= block.top && y < block.bottom;
        return Opaque(inside ? 0xFF : 0);
    });
}

class PicturesOfASimulatedWindow : public testing::Test {
protected:
    std::shared_ptr<SimulatedWindowServer> server =
        Scene().Display(0, 0, 200, 100).Window(1).At(10, 10, 60, 48).Colour(0).Shadow(4).Serve();
};

} // namespace

TEST(PictureChanges, NumbersAreNeverNothingAndNeverTheSame) {
    std::set<std::uint64_t> seen{0};
    for (int i = 0; i < 1000; ++i)
        EXPECT_TRUE(seen.insert(NextPictureSerial()).second);
}

TEST(PictureChanges, AddUpOverTheStepsFromAnEarlierPicture) {
    const Picture first = First();
    const Picture second = After(first, {{0, 0, 10, 10}});
    const Picture third = After(second, {{20, 0, 30, 10}, {0, 40, 5, 45}});
    EXPECT_EQ(ChangesSince(third, third.serial), PixelRegion());
    EXPECT_EQ(ChangesSince(third, second.serial), RegionOf({{20, 0, 30, 10}, {0, 40, 5, 45}}));
    EXPECT_EQ(ChangesSince(third, first.serial), RegionOf({{0, 0, 10, 10}, {20, 0, 30, 10}, {0, 40, 5, 45}}));
}

TEST(PictureChanges, AreUnknownFromPicturesThatHaveNoPartInThem) {
    const Picture first = First();
    const Picture second = After(first, {});
    const Picture stranger = First();
    EXPECT_EQ(ChangesSince(second, stranger.serial), std::nullopt);
    EXPECT_EQ(ChangesSince(first, second.serial), std::nullopt) << "not backwards";
    EXPECT_EQ(ChangesSince(Picture{}, 0), std::nullopt) << "no number is no name";
    EXPECT_TRUE(StepsAfter(Picture{}, PixelRegion()).empty());
}

TEST(PictureChanges, LeadBackToSoManyPicturesAndNoFurther) {
    std::vector<Picture> pictures{First()};
    for (int i = 0; i < 12; ++i)
        pictures.push_back(After(pictures.back(), {{i, 0, i + 1, 1}}));
    const Picture& last = pictures.back();
    EXPECT_EQ(last.steps.size(), MOST_PICTURE_STEPS);
    const std::size_t oldest = pictures.size() - 1 - MOST_PICTURE_STEPS;
    EXPECT_EQ(ChangesSince(last, pictures[oldest].serial), PixelRegion({static_cast<int>(oldest), 0, 12, 1}));
    EXPECT_EQ(ChangesSince(last, pictures[oldest - 1].serial), std::nullopt);
}

TEST(PictureChanges, OfManyRectanglesAreToldByTheirBox) {
    Rects many;
    for (int i = 0; i <= static_cast<int>(MOST_RECTS_OF_STEP); ++i)
        many.push_back({2 * i, 2 * i, 2 * i + 1, 2 * i + 1});
    const Picture first = First();
    const int end = 2 * static_cast<int>(MOST_RECTS_OF_STEP) + 1;
    EXPECT_EQ(ChangesSince(After(first, many), first.serial), PixelRegion({0, 0, end, end}));
    many.pop_back();
    EXPECT_EQ(ChangesSince(After(first, many), first.serial), RegionOf(many));
}

// ---- The simulated desktop

TEST_F(PicturesOfASimulatedWindow, KeepTheirNumberAsLongAsThePixelsAreTheSame) {
    const PicturePtr first = PictureOfWindow(*server);
    ASSERT_NE(first, nullptr);
    EXPECT_NE(first->serial, 0u);
    EXPECT_TRUE(first->steps.empty());
    server->MoveWindow(1, {30, 20});
    server->SetAlpha(1, 0.5F);
    server->SetContent(1, SimulatedContent::Colour(0)); // painted anew, and alike
    EXPECT_EQ(PictureOfWindow(*server), first);
}

TEST_F(PicturesOfASimulatedWindow, TellWhatWasPaintedSinceTheLastPictureThatAnybodyHas) {
    const PicturePtr first = PictureOfWindow(*server);
    server->SetContent(1, Block({4, 0, 8, 16}));
    const PicturePtr second = PictureOfWindow(*server);
    EXPECT_NE(second->serial, first->serial);
    EXPECT_EQ(ChangesSince(*second, first->serial), PixelRegion({4, 0, 8, 16}));
    server->SetContent(1, Block({40, 32, 44, 48}));
    server->SetContent(1, Block({20, 16, 30, 32})); // nobody has seen the one before
    const PicturePtr third = PictureOfWindow(*server);
    EXPECT_EQ(ChangesSince(*third, second->serial), RegionOf({{4, 0, 8, 16}, {20, 16, 30, 32}}));
    EXPECT_EQ(ChangesSince(*third, first->serial), RegionOf({{4, 0, 8, 16}, {20, 16, 30, 32}}));
}

TEST_F(PicturesOfASimulatedWindow, HaveNoPastAfterAnotherSizeFormatOrScale) {
    PicturePtr before = PictureOfWindow(*server);
    const auto hasPast = [&] {
        const PicturePtr now = PictureOfWindow(*server);
        const bool isKnown = ChangesSince(*now, before->serial).has_value();
        EXPECT_NE(now->serial, before->serial);
        before = now;
        return isKnown;
    };
    server->SetFrame(1, {{10, 10}, {61, 48}});
    EXPECT_FALSE(hasPast());
    server->Change([](SimulatedDesktop& desktop) { desktop.windows[0].format = PixelFormat::RGBX; });
    EXPECT_FALSE(hasPast());
    server->Change([](SimulatedDesktop& desktop) { desktop.windows[0].rowGap = 8; });
    EXPECT_FALSE(hasPast());
    server->ScaleDisplay(1, 2);
    EXPECT_FALSE(hasPast());
    server->SetContent(1, Block({0, 0, 8, 16}));
    EXPECT_TRUE(hasPast());
}

TEST_F(PicturesOfASimulatedWindow, WithAndWithoutShadowAreOthers) {
    const PicturePtr bare = PictureOfWindow(*server, WindowPictureBoundsIgnoreFraming);
    const PicturePtr shadowed = PictureOfWindow(*server, WindowPictureDefault);
    EXPECT_NE(bare->serial, shadowed->serial);
    EXPECT_EQ(ChangesSince(*shadowed, bare->serial), std::nullopt);
}

TEST_F(PicturesOfASimulatedWindow, LeaveAPartOutWhenTheyLie) {
    const PicturePtr first = PictureOfWindow(*server);
    server->Lie(SimulatedLie::ChangesForgotten);
    server->SetContent(1, Block({4, 0, 8, 16}));
    EXPECT_EQ(ChangesSince(*PictureOfWindow(*server), first->serial), PixelRegion());
}

// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_cgs_capturer.h"
#include "src/mac/share_util_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/forwarding_window_server.h"
#include "tests/support/memory_failure.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <functional>
#include <iostream>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>
#include <vector>

// What of a frame is drawn when it is used again.

using namespace platform;

namespace {

constexpr unsigned DISPLAY = 1;
constexpr pid_t EDITOR = 5'000'100;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t WHITE = 0xFFFFFF;
constexpr std::uint32_t YELLOW = 0xFFFF00;
constexpr unsigned char MARK = 7;

/// A picture of one colour with a block of another one in it.
SimulatedContent WithBlock(const PixelRect& block, std::uint32_t rgb, std::uint32_t ground = GREEN) {
    return SimulatedContent::Painted([=](int x, int y) {
        const bool inside = x >= block.left && x < block.right && y >= block.top && y < block.bottom;
        return Opaque(inside ? rgb : ground);
    });
}

Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Window(1)
        .At(0, 0, 200, 120)
        .Colour(BLUE)
        .Format(PixelFormat::BGRX)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .App(EDITOR, "Editor")
        .Window(2)
        .At(50, 40, 80, 40)
        .Colour(GREEN)
        .Pointer(1000, 1000)
        .Cursor(SquareCursor(WHITE));
}

class CompositionChanges : public testing::Test {
protected:
    CompositionChanges() { frame.Get()->AllowNote(); }

    int Capture(TVLSize bitmap = {200, 120}) {
        return capturer.capture(frame.Get(), DISPLAY, bitmap, bitmap);
    }
    /// Captures, and gives the box of what was painted meanwhile: all zeros for nothing. Painting sets a byte
    /// of each pixel that means nothing.
    TVLRect Painted(TVLSize bitmap = {200, 120}) {
        for (std::size_t at = 3; at < Bytes(); at += 4)
            frame.Get()->GetFrameData()[at] = MARK;
        EXPECT_EQ(Capture(bitmap), 0);
        TVLRect box{};
        for (std::size_t at = 3; at < Bytes(); at += 4) {
            if (frame.Get()->GetFrameData()[at] != MARK)
                Include(box, static_cast<int>(at / 4) % bitmap.cx, static_cast<int>(at / 4) / bitmap.cx);
            frame.Get()->GetFrameData()[at] = 255;
        }
        return box;
    }
    std::size_t Bytes() { return static_cast<std::size_t>(CShareFrame::BackedDataLen(*frame.Get())); }
    static void Include(TVLRect& box, int x, int y) {
        if (box == TVLRect{})
            box = {x, y, x + 1, y + 1};
        else
            box = {std::min(box.left, x), std::min(box.top, y), std::max(box.right, x + 1),
                   std::max(box.bottom, y + 1)};
    }
    FramePixel At(int x, int y) { return PixelAt(*frame.Get(), x, y); }
    void ShareEditor() {
        context->AddSharedDisplay(DISPLAY);
        context->AddSharedApp(static_cast<unsigned>(EDITOR));
        context->SetShareType(SHARE_TYPE_APP);
        context->UpdateShareCapturerContext();
    }

    static constexpr TVLRect NOTHING{};
    static constexpr TVLRect ALL{0, 0, 200, 120};

    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    CShareCGSCapturer capturer{context};
    ShareRef<CShareFrame> frame{new CShareFrame};
};

/// So many allocations succeed as long as this lives.
class CFewAllocations {
public:
    explicit CFewAllocations(int count) { allocationsLeft = count; }
    ~CFewAllocations() {
        allocationsLeft = -1;
        isMemoryGone = false;
    }
    CFewAllocations(const CFewAllocations&) = delete;
    CFewAllocations& operator=(const CFewAllocations&) = delete;
};

/// A window server that tells where the pointer is along with its pictures.
class CPointerTeller final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override {
        WindowPictureResult result = CForwardingWindowServer::TakeWindowPicture(request);
        if (result.picture == nullptr)
            return result;
        auto picture = std::make_shared<WindowPicture>(*result.picture);
        picture->pointer = pointer;
        result.picture = std::move(picture);
        return result;
    }

    std::optional<CGPoint> pointer;
};

/// One whose pictures have no numbers.
class CNumberless final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override {
        WindowPictureResult result = CForwardingWindowServer::TakeWindowPicture(request);
        if (result.picture == nullptr)
            return result;
        auto picture = std::make_shared<WindowPicture>(*result.picture);
        for (PictureLayer& layer : picture->layers) {
            auto without = std::make_shared<Picture>(*layer.picture);
            without->serial = 0;
            layer.picture = std::move(without);
        }
        result.picture = std::move(picture);
        return result;
    }
};

} // namespace

TEST_F(CompositionChanges, DrawsAllIntoANewFrameAndNothingIntoOneThatShowsItAlready) {
    EXPECT_EQ(Capture(), 0);
    EXPECT_TRUE(frame.Get()->HasNote());
    EXPECT_EQ(Painted(), NOTHING);
    EXPECT_TRUE(frame.Get()->HasNote());
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
}

TEST_F(CompositionChanges, DrawsWhatAWindowHasPainted) {
    EXPECT_EQ(Capture(), 0);
    desktop->SetContent(2, WithBlock({10, 16, 15, 32}, YELLOW));
    EXPECT_EQ(Painted(), (TVLRect{60, 56, 65, 72}));
    EXPECT_EQ(At(60, 56), Rgb(YELLOW));
    EXPECT_EQ(At(64, 71), Rgb(YELLOW));
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 5 * 16);
    EXPECT_EQ(Painted(), NOTHING);
}

TEST_F(CompositionChanges, DrawsWhatAWindowHasPaintedSinceTheFrameWasUsedLast) {
    const ShareRef<CShareFrame> first = frame;
    EXPECT_EQ(Capture(), 0);
    frame = ShareRef<CShareFrame>(new CShareFrame);
    frame.Get()->AllowNote();
    EXPECT_EQ(Capture(), 0);
    desktop->SetContent(2, WithBlock({0, 0, 4, 16}, YELLOW));
    EXPECT_EQ(Painted(), (TVLRect{50, 40, 54, 56}));
    desktop->SetContent(2, WithBlock({20, 0, 24, 16}, YELLOW));
    frame = first;
    EXPECT_EQ(Painted(), (TVLRect{50, 40, 74, 56})) << "of two changes";
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 4 * 16);
}

TEST_F(CompositionChanges, DrawsAllWhenItIsNotKnownAnyMoreHowAPictureCameAbout) {
    EXPECT_EQ(Capture(), 0);
    const ShareRef<CShareFrame> old = frame;
    frame = ShareRef<CShareFrame>(new CShareFrame);
    for (int i = 0; i < 9; ++i) {
        desktop->SetContent(2, WithBlock({i, 0, i + 1, 16}, YELLOW));
        EXPECT_EQ(Capture(), 0);
    }
    frame = old;
    EXPECT_EQ(Painted(), ALL);
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 16);
}

TEST_F(CompositionChanges, DrawsAllWithoutNumbersOfPictures) {
    const CWindowServerScope numberless(std::make_shared<CNumberless>(CurrentWindowServer()));
    EXPECT_EQ(Capture(), 0);
    EXPECT_FALSE(frame.Get()->HasNote());
    EXPECT_EQ(Painted(), ALL);
}

TEST_F(CompositionChanges, DrawsAllIntoFramesThatKeepNoNote) {
    frame = ShareRef<CShareFrame>(new CShareFrame);
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(Painted(), ALL);
}

TEST_F(CompositionChanges, DrawsAllWhenAnythingButPixelsIsDifferent) {
    const std::vector<std::pair<std::string, std::function<void()>>> changes{
        {"moved",
         [&] {
             desktop->MoveWindow(2, {51, 40});
         }},
        {"resized",
         [&] {
             desktop->SetFrame(2, {{51, 40}, {81, 40}});
         }},
        {"translucent", [&] { desktop->SetAlpha(2, 0.5F); }},
        {"gone", [&] { desktop->SetOnScreen(2, false); }},
        {"back", [&] { desktop->SetOnScreen(2, true); }},
        {"kept out", [&] { context->AddUnSharedWindow(2); }},
        {"let in", [&] { context->RemoveUnSharedWindow(2); }},
        {"of the application", [&] { ShareEditor(); }},
        {"on another background", [&] { settings->m_nAppShareBackgroundColor = 0x123456; }},
    };
    EXPECT_EQ(Capture(), 0);
    for (const auto& [what, change] : changes) {
        change();
        EXPECT_EQ(Painted(), ALL) << what;
        EXPECT_EQ(Painted(), NOTHING) << what;
    }
}

TEST_F(CompositionChanges, DrawsTheBackgroundUnderWhatHasChanged) {
    ShareEditor();
    settings->m_nAppShareBackgroundColor = YELLOW;
    EXPECT_EQ(Capture(), 0);
    desktop->SetContent(2, SimulatedContent::Painted([](int x, int) { return x < 8 ? 0 : Opaque(GREEN); }));
    EXPECT_EQ(Painted(), (TVLRect{50, 40, 58, 80}));
    EXPECT_EQ(At(50, 40), Rgb(YELLOW)) << "transparent now";
    EXPECT_EQ(At(58, 40), Rgb(GREEN));
}

TEST_F(CompositionChanges, DrawsWindowsThatAreScaledInRows) {
    EXPECT_EQ(Capture({100, 60}), 0);
    EXPECT_EQ(Painted({100, 60}), NOTHING);
    desktop->SetContent(2, WithBlock({0, 0, 4, 16}, YELLOW));
    EXPECT_EQ(Painted({100, 60}), (TVLRect{0, 20, 100, 31}));
    EXPECT_EQ(Painted({100, 60}), NOTHING);
}

TEST_F(CompositionChanges, DrawsAllOverWhatOthersHavePainted) {
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.Get(), YELLOW, nullptr), 0);
    EXPECT_EQ(Painted(), ALL);
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 0);
    ShareCGSCapturer alone;
    ASSERT_TRUE(alone.init());
    constexpr unsigned WINDOW = 2;
    for (int i = 0; i < 2; ++i) { // the second one finds its context as it was
        EXPECT_EQ(alone.captureScreenRect(ALL, 1, &WINDOW, frame.Get()), 0u);
        EXPECT_EQ(CountOf(*frame.Get(), BLUE), 0);
        EXPECT_EQ(Painted(), ALL);
        EXPECT_EQ(CountOf(*frame.Get(), BLUE), 200 * 120 - 80 * 40);
    }
}

// ---- The pointer

TEST_F(CompositionChanges, DrawsWhereThePointerIsAndWhereItWas) {
    desktop->SetPointer(CGPoint{10, 10});
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(Painted(), NOTHING);
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Painted(), (TVLRect{10, 10, 24, 14}));
    EXPECT_EQ(At(10, 10), Rgb(BLUE));
    EXPECT_EQ(At(20, 10), Rgb(WHITE));
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 16);
    desktop->SetCursor(SquareCursor(YELLOW));
    EXPECT_EQ(Painted(), (TVLRect{20, 10, 24, 14}));
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 16);
    desktop->SetPointer(CGPoint{1000, 1000});
    EXPECT_EQ(Painted(), (TVLRect{20, 10, 24, 14}));
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 0);
    EXPECT_TRUE(frame.Get()->GetMetaInfo().bPointerCaptured);
}

TEST_F(CompositionChanges, DrawsThePointerAgainWhenThereIsAnotherPictureUnderIt) {
    desktop->SetPointer(CGPoint{60, 50});
    EXPECT_EQ(Capture(), 0);
    desktop->SetContent(2, WithBlock({11, 0, 12, 16}, YELLOW));
    EXPECT_EQ(Painted(), (TVLRect{60, 40, 64, 56})) << "the change and the whole pointer";
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 16);
    EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 16 - 4);
    desktop->SetContent(2, WithBlock({41, 0, 42, 16}, YELLOW));
    EXPECT_EQ(Painted(), (TVLRect{60, 40, 92, 56})) << "where the block was lies under it";
}

TEST_F(CompositionChanges, LeavesThePointerOutAsSoonAsItIsToldTo) {
    desktop->SetPointer(CGPoint{10, 10});
    EXPECT_EQ(Capture(), 0);
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER;
    EXPECT_EQ(Painted(), (TVLRect{10, 10, 14, 14}));
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 0);
    EXPECT_FALSE(frame.Get()->GetMetaInfo().bPointerCaptured);
}

TEST_F(CompositionChanges, TakesThePlaceOfThePointerFromThePictureIfThatTells) {
    desktop->SetPointer(CGPoint{10, 10});
    const auto teller = std::make_shared<CPointerTeller>(CurrentWindowServer());
    const CWindowServerScope scope(teller);
    teller->pointer = CGPoint{30, 20};
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(At(30, 20), Rgb(WHITE));
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::GetPointerPosition), 0u);
    teller->pointer.reset();
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(At(10, 10), Rgb(WHITE));
    EXPECT_EQ(At(30, 20), Rgb(BLUE));
}

// ---- Failures

TEST_F(CompositionChanges, KeepsTheNoteOfAFrameThatItLeavesAlone) {
    EXPECT_EQ(Capture(), 0);
    desktop->FailNext(SimulatedOperation::TakeWindowPicture);
    EXPECT_EQ(Capture(), -1);
    EXPECT_TRUE(frame.Get()->HasNote());
    EXPECT_EQ(Painted(), NOTHING);
}

TEST_F(CompositionChanges, LeavesNoNoteWhereMemoryRunsOut) {
    EXPECT_EQ(Capture(), 0);
    int known = 0;
    int unknown = 0;
    for (int allowed = 0; allowed < 60; ++allowed) {
        desktop->SetContent(2, WithBlock({allowed, 0, allowed + 1, 16}, YELLOW));
        int result = SHARE_CAPTURE_FAILED;
        {
            const CFewAllocations few(allowed);
            try {
                result = Capture();
            } catch (const std::bad_alloc&) {
                result = SHARE_CAPTURE_FAILED;
            }
        }
        if (result != SHARE_CAPTURE_OK)
            continue;
        ++(frame.Get()->HasNote() ? known : unknown);
        EXPECT_EQ(At(50 + allowed, 41), Rgb(YELLOW)) << allowed;
        EXPECT_EQ(CountOf(*frame.Get(), YELLOW), 16) << allowed;
    }
    EXPECT_GT(known, 0);
    std::cout << known << " frames known, " << unknown << " not\n";
}

// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

/// The tables of the shared displays.

namespace {

using platform::CGRect;
using Sizes = std::map<unsigned, TVLSize>;
using DisplayRects = std::map<unsigned, TVLRect>;

constexpr unsigned ONE = 5;
constexpr unsigned OTHER = 6;
constexpr unsigned UNKNOWN = 7;

class SharedDisplays : public testing::Test {
protected:
    void Put(const CGRect& bounds, float scale = 1.0F) {
        desktop->SetDisplays({FakeDisplay(ONE, bounds, scale)});
    }

    /// Of one display of that many points, shared anew.
    TVLSize SizeOf(float width, float height, float scale = 1.0F) {
        Put({{0, 0}, {width, height}}, scale);
        context.RemoveSharedDisplay(ONE);
        context.AddSharedDisplay(ONE);
        return context.m_mapDisplaySizes.at(ONE);
    }
    TVLRect RectOf(const CGRect& bounds) {
        Put(bounds);
        context.RemoveSharedDisplay(ONE);
        context.AddSharedDisplay(ONE);
        return context.m_mapDisplayRects.at(ONE);
    }
    void FixSize(int width, int height) {
        settings->m_bCaptureResampleFixSizeEnable = true;
        settings->m_nResampleScreenCaptureWidth = width;
        settings->m_nResampleScreenCaptureHeight = height;
    }
    float Scale() { return settings->GetCurrentScale(); }
    Rects Region() { return RegionGot(context, &ShareCapturerContext::GetDisplayRegion); }

    CSettingsScope settings;
    CDesktopScope desktop;
    CMacContextProbe context;
};

} // namespace

TEST_F(SharedDisplays, AreCapturedInTheirPixelsWithoutResampling) {
    settings->m_bCaptureResampleEnable = false;
    EXPECT_EQ(SizeOf(3000, 2000, 2.0F), (TVLSize{6000, 4000}));
    EXPECT_EQ(Scale(), 2.0F);
}

TEST_F(SharedDisplays, HavePixelsCutToWholeOnes) {
    settings->m_bCaptureResampleEnable = false;
    EXPECT_EQ(SizeOf(101.9F, 51.9F, 1.5F), (TVLSize{151, 76}));
    EXPECT_EQ(Scale(), 151 / 101.0F) << "of whole points";
}

TEST_F(SharedDisplays, AreMadeToFitTheMaximum) {
    EXPECT_EQ(SizeOf(1440, 900, 2.0F), (TVLSize{2880, 1800}));
    EXPECT_EQ(Scale(), 2.0F);
    EXPECT_EQ(SizeOf(2560, 1440, 2.0F), (TVLSize{2880, 1620}));
    EXPECT_EQ(Scale(), 1.125F);
    context.SetCaptureMaxSize({1280, 720});
    EXPECT_EQ(context.m_mapDisplaySizes.at(ONE), (TVLSize{1280, 720}));
    EXPECT_EQ(Scale(), 0.5F);
}

TEST_F(SharedDisplays, TakeTheFixedWidthWhenThatIsTheTighterOne) {
    FixSize(1000, 1000);
    EXPECT_EQ(SizeOf(1920, 1080, 2.0F), (TVLSize{1000, 562}));
    EXPECT_EQ(Scale(), static_cast<float>(1000 / 1920.0));
}

TEST_F(SharedDisplays, TakeTheFixedHeightOtherwiseAndTheScaleOfTheFixedWidth) {
    FixSize(1000, 1000);
    EXPECT_EQ(SizeOf(1080, 1920, 2.0F), (TVLSize{562, 1000}));
    EXPECT_EQ(Scale(), static_cast<float>(1000 / 1080.0));
    EXPECT_EQ(SizeOf(500, 500), (TVLSize{1000, 1000})) << "of equal ones the height";
}

TEST_F(SharedDisplays, IgnoreTheFixedSizeWithoutResampling) {
    FixSize(1000, 1000);
    settings->m_bCaptureResampleEnable = false;
    EXPECT_EQ(SizeOf(1920, 1080), (TVLSize{1920, 1080}));
}

TEST_F(SharedDisplays, HaveTheSizeAddedToTheOriginBeforeItIsCut) {
    EXPECT_EQ(RectOf({{10.75F, 20.75F}, {100.5F, 50.5F}}), (TVLRect{10, 20, 111, 71}));
    EXPECT_EQ(RectOf({{-10.75F, -0.5F}, {100.5F, 50.75F}}), (TVLRect{-10, 0, 89, 50}));
}

TEST_F(SharedDisplays, TogetherMakeTheRegionAndTheLastOneTheScale) {
    desktop->SetDisplays(
        {FakeDisplay(ONE, {{0, 0}, {100, 50}}, 2.0F), FakeDisplay(OTHER, {{100, 0}, {60, 50}}, 1.5F)});
    context.AddSharedDisplay(OTHER);
    context.AddSharedDisplay(ONE);
    EXPECT_EQ(Region(), (Rects{{0, 0, 160, 50}}));
    EXPECT_EQ(Scale(), 2.0F);
    EXPECT_EQ(context.m_mapDisplaySizes, (Sizes{{ONE, {200, 100}}, {OTHER, {90, 75}}}));
    context.RemoveSharedDisplay(ONE);
    EXPECT_EQ(Region(), (Rects{{100, 0, 160, 50}}));
    EXPECT_EQ(Scale(), 1.5F);
    EXPECT_EQ(context.m_mapDisplaySizes, (Sizes{{OTHER, {90, 75}}}));
    EXPECT_EQ(context.m_mapDisplayRects, (DisplayRects{{OTHER, {100, 0, 160, 50}}}));
}

TEST_F(SharedDisplays, StayInTheTablesWhenTheListIsCleared) {
    SizeOf(100, 50);
    context.ClearSharedDisplay();
    EXPECT_EQ(Region(), (Rects{{0, 0, 100, 50}}));
    EXPECT_EQ(context.InitDisplays(), 0);
    EXPECT_TRUE(Region().empty());
    EXPECT_TRUE(context.m_mapDisplaySizes.empty());
    EXPECT_TRUE(context.m_mapDisplayRects.empty());
}

TEST_F(SharedDisplays, ThatMovedAreFoundAgain) {
    SizeOf(100, 50);
    Put({{-300, 10}, {100, 50}});
    EXPECT_EQ(context.UpdateSharedDisplay(UNKNOWN), 0);
    EXPECT_EQ(Region(), (Rects{{-300, 10, -200, 60}}));
}

TEST_F(SharedDisplays, ThatAreGoneHaveNoAreaAndLeaveTheScaleAlone) {
    SizeOf(100, 50, 2.0F);
    for (const bool isFixed : {false, true}) {
        settings->m_bCaptureResampleFixSizeEnable = isFixed;
        desktop->SetDisplays({});
        EXPECT_EQ(context.InitDisplays(), 0);
        EXPECT_EQ(context.m_mapDisplayRects, (DisplayRects{{ONE, {}}}));
        EXPECT_TRUE(Region().empty());
        EXPECT_EQ(Scale(), 2.0F);
    }
}

TEST_F(SharedDisplays, AreAllGoneWhenTheWindowServerIs) {
    SizeOf(100, 50, 2.0F);
    desktop->SetLife(platform::Life::Lost);
    EXPECT_EQ(context.InitDisplays(), 0);
    EXPECT_EQ(context.m_mapDisplaySizes, (Sizes{{ONE, {0, 0}}}));
    EXPECT_TRUE(Region().empty());
    EXPECT_EQ(Scale(), 2.0F);
}

TEST_F(SharedDisplays, TraceTheRegionAsItGrows) {
    desktop->SetDisplays({FakeDisplay(ONE, {{0, 0}, {100, 50}}), FakeDisplay(OTHER, {{100, 0}, {60, 50}})});
    context.AddSharedDisplay(ONE);
    context.AddSharedDisplay(OTHER);
    const CTraceLog trace;
    context.InitDisplays();
    EXPECT_EQ(trace.Lines(),
              (std::vector<std::string>{
                  Detail("ShareCapturerContextMac::InitDisplays,m_rgnDisplay={ region:{size:1,rects:["
                         "{{left:0,top:0,right:100,bottom:50,width:100,height:50}},\n]}}"),
                  Detail("ShareCapturerContextMac::InitDisplays,m_rgnDisplay={ region:{size:1,rects:["
                         "{{left:0,top:0,right:160,bottom:50,width:160,height:50}},\n]}}")}));
}

TEST_F(SharedDisplays, OfAnEngineThatSharesADisplayAreLookedUp) {
    Put({{0, 0}, {100, 50}});
    const std::shared_ptr<ShareCapturerContext> made = MakeShareCapturerContext();
    made->AddSharedDisplay(ONE);
    EXPECT_EQ(RegionGot(*made, &ShareCapturerContext::GetDisplayRegion), (Rects{{0, 0, 100, 50}}));
    const CEngineProbe<CShareCaptureEngine> engine;
    EXPECT_NE(dynamic_cast<ShareCapturerContextMac*>(engine.m_spShareCapturerContext.get()), nullptr);
}

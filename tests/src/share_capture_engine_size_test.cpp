// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_pass.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

// From the client's limit to the size that the capturer has to produce, and what the client is told.

namespace {

/// A context whose shared windows are what a test says.
class CFixedRegionContext final : public ShareCapturerContext {
public:
    void Share(const TVLRect& box) {
        m_rgnSharedWindow.Empty();
        m_rgnSharedWindow.AddRect(box);
    }
};

/// An application engine whose limit is for the box of the shared windows.
class WindowArea : public testing::Test {
protected:
    void SetUp() override {
        bench.engine->m_spShareCapturerContext = context;
        context->m_bNoWindowBaseArea = false;
        bench.capturer.Change([](CFakeCapturer::Answers& answers) {
            answers.size = {1920, 1200};
            answers.rectCapture = {0, 0, 1920, 1200};
        });
        bench.BeginInline();
    }

    TVLSize Limit() { return bench.engine->_GetCurCaptureMaxSize(); }
    TVLRect LastUpdate() { return bench.sink.Frames().back().update; }

    std::shared_ptr<CFixedRegionContext> context = std::make_shared<CFixedRegionContext>();
    CEngineBench<CShareCaptureAppEngine> bench;
};

std::string Text(TVLSize size) {
    return std::to_string(size.cx) + "x" + std::to_string(size.cy);
}

} // namespace

TEST_F(WindowArea, KeepsTheLimitInsideTheDeadBand) {
    bench.engine->m_sizeCaptureMax = TVLSize{1000, 1000};
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 1050, 900}, {1920, 1200}), 0);
    EXPECT_EQ(Limit(), (TVLSize{2880, 1800}));
    EXPECT_FALSE(bench.trace.Contains("scaleMax="));
}

TEST_F(WindowArea, ScalesTheFrameSoThatTheBoxFitsTheLimit) {
    bench.engine->m_sizeCaptureMax = TVLSize{1000, 1000};
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 1200, 1000}, {1920, 1200}), 0);
    EXPECT_EQ(Limit(), (TVLSize{1600, 1000}));
    EXPECT_TRUE(bench.trace.Contains(Detail(
        "[CShareCaptureEngine::_CaptureProcess]>>,scaleMax=0.833333,scaleX=0.833333,scaleY=1,w=1600,h=1000")));
    EXPECT_TRUE(
        bench.trace.Contains(Info("[CShareCaptureEngine::_UpdateCaptureMaxFrameSize] w=1600,h=1000")));
    EXPECT_TRUE(
        bench.trace.Contains(Info("[CShareCaptureEngine::_CaptureProcess]>>rcUpdate changed w=1200,h=1000")));
}

TEST_F(WindowArea, RefusesAFrameWithoutExtent) {
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 5, 5}, {0, 100}), -1);
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 5, 5}, {100, -1}), -1);
    EXPECT_EQ(bench.engine->m_rcLastUpdate, TVLRect{});
}

TEST_F(WindowArea, LeavesTheLimitAloneUntilTheClientHasSetOne) {
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 300, 300}, {1920, 1200}), 0);
    EXPECT_EQ(Limit(), (TVLSize{2880, 1800}));
}

TEST_F(WindowArea, SkipsTheScaleForAZeroRectangleAndStoresIt) {
    bench.engine->m_sizeCaptureMax = TVLSize{1000, 1000};
    bench.engine->m_rcLastUpdate = TVLRect{1, 1, 5, 5};
    EXPECT_EQ(bench.engine->_CalculateNewCaptureMaxFrameSize({}, {1920, 1200}), 0);
    EXPECT_EQ(Limit(), (TVLSize{2880, 1800}));
    EXPECT_EQ(bench.engine->m_rcLastUpdate, TVLRect{});
    EXPECT_TRUE(
        bench.trace.Contains(Info("[CShareCaptureEngine::_CaptureProcess]>>rcUpdate changed w=0,h=0")));
}

TEST_F(WindowArea, KeepsTheOldPlaceOfABoxThatMovedWithoutChangingItsSize) {
    bench.engine->_CalculateNewCaptureMaxFrameSize({10, 10, 20, 20}, {100, 100});
    bench.engine->_CalculateNewCaptureMaxFrameSize({50, 60, 60, 70}, {100, 100});
    EXPECT_EQ(bench.engine->m_rcLastUpdate, (TVLRect{10, 10, 20, 20}));
    EXPECT_EQ(bench.trace.CountContaining("rcUpdate changed"), 1u);
}

TEST_F(WindowArea, GivesTheSinkTheBoxInFramePixels) {
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.size = {960, 600};
        answers.rectCapture = {100, 50, 2020, 1250};
    });
    context->Share({300, 250, 500, 450});
    bench.Pass();
    EXPECT_EQ(LastUpdate(), (TVLRect{100, 100, 200, 200}));
}

TEST_F(WindowArea, GivesTheZeroRectangleForABoxThatSticksOutByOnePixel) {
    for (const TVLRect& box : {TVLRect{-1, 0, 100, 100}, TVLRect{0, -1, 100, 100}, TVLRect{0, 0, 1921, 100},
                               TVLRect{0, 0, 100, 1201}}) {
        context->Share(box);
        bench.Pass();
        EXPECT_EQ(LastUpdate(), TVLRect{});
    }
    context->Share({0, 0, 1920, 1200});
    bench.Pass();
    EXPECT_EQ(LastUpdate(), (TVLRect{0, 0, 1920, 1200}));
}

TEST_F(WindowArea, GivesTheZeroRectangleWithoutASharedWindow) {
    bench.Pass();
    EXPECT_EQ(LastUpdate(), TVLRect{});
}

TEST_F(WindowArea, GivesTheWholeFrameWhereTheAreaIsNotWanted) {
    context->Share({300, 250, 500, 450});
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.windowAreaSupport = true; });
    bench.Pass();
    EXPECT_EQ(LastUpdate(), (TVLRect{0, 0, 1920, 1200}));
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.windowAreaSupport = false; });
    context->m_bNoWindowBaseArea = true;
    bench.Pass();
    EXPECT_EQ(LastUpdate(), (TVLRect{0, 0, 1920, 1200}));
    EXPECT_EQ(bench.engine->m_rcLastUpdate, TVLRect{});
}

TEST_F(WindowArea, SendsAFrameAgainWithTheLastRectangle) {
    context->Share({300, 250, 500, 450});
    bench.Pass();
    bench.capturer.SetResult(SHARE_CAPTURE_DRAGGING);
    context->Share({0, 0, 10, 10});
    bench.Advance(1001);
    bench.Pass();
    ASSERT_EQ(bench.sink.FrameCount(), 2u);
    EXPECT_EQ(LastUpdate(), (TVLRect{300, 250, 500, 450}));
    context->m_bNoWindowBaseArea = true;
    bench.Advance(1001);
    bench.Pass();
    EXPECT_EQ(LastUpdate(), (TVLRect{0, 0, 1920, 1200}));
}

TEST(DesktopArea, IsAlwaysTheWholeFrame) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    const auto context = std::make_shared<CFixedRegionContext>();
    context->m_bNoWindowBaseArea = false;
    context->Share({1, 1, 2, 2});
    bench.engine->m_spShareCapturerContext = context;
    bench.BeginInline();
    bench.Pass();
    EXPECT_EQ(bench.sink.Frames().back().update, (TVLRect{0, 0, 8, 4}));
}

namespace {

/// Plays the capturer: a picture of a 2880x1800 desktop, as large as the limit allows, with the aspect kept.
class CDesktopPlayer {
public:
    static constexpr TVLSize DESKTOP{2880, 1800};

    void PlayInto(CFakeCapturer& capturer, TVLSize limit) const {
        const float fit = std::min(static_cast<float>(limit.cx) / static_cast<float>(DESKTOP.cx),
                                   static_cast<float>(limit.cy) / static_cast<float>(DESKTOP.cy));
        const float scale = std::min(fit, 1.0F);
        capturer.Change([&](CFakeCapturer::Answers& answers) {
            answers.size = {std::max(1, static_cast<int>(static_cast<float>(DESKTOP.cx) * scale)),
                            std::max(1, static_cast<int>(static_cast<float>(DESKTOP.cy) * scale))};
            answers.rectCapture = {0, 0, DESKTOP.cx, DESKTOP.cy};
        });
    }
};

/// Whether the box is as large as the limit lets it be: within the dead band, or the desktop at its full
/// size.
testing::AssertionResult FitsLimit(const TVLRect& update, TVLSize frame, TVLSize limit) {
    const float scaleX = static_cast<float>(limit.cx) / static_cast<float>(update.right - update.left);
    const float scaleY = static_cast<float>(limit.cy) / static_cast<float>(update.bottom - update.top);
    const float scale = std::min(scaleX, scaleY);
    const bool atFullSize = frame == CDesktopPlayer::DESKTOP && scale >= 1.0F;
    if (std::abs(scale - 1.0F) < 0.09F || atFullSize)
        return testing::AssertionSuccess();
    return testing::AssertionFailure() << "scale " << scale << " in a frame of " << Text(frame);
}

} // namespace

TEST_F(WindowArea, ConvergesWithinTenPassesForEveryPairOfBoxAndLimit) {
    const std::vector<TVLRect> boxes = {{0, 0, 2880, 1800},
                                        {100, 100, 1300, 900},
                                        {500, 0, 1100, 1800},
                                        {0, 900, 2880, 1100},
                                        {1000, 700, 1400, 1000}};
    const std::vector<TVLSize> limits = {{1920, 1080}, {1280, 720}, {640, 480}, {320, 900}};
    for (const TVLRect& box : boxes) {
        for (const TVLSize limit : limits) {
            SCOPED_TRACE(testing::PrintToString(box.right - box.left) + "x" +
                         testing::PrintToString(box.bottom - box.top) + " into " + Text(limit));
            context->Share(box);
            const CDesktopPlayer player;
            bench.engine->SetCaptureMaxFrameSize(static_cast<unsigned>(limit.cx),
                                                 static_cast<unsigned>(limit.cy));
            for (int pass = 0; pass < 10; ++pass) {
                player.PlayInto(bench.capturer, Limit());
                bench.Pass();
            }
            const CRecordingSink::Frame before = bench.sink.Frames().back();
            EXPECT_TRUE(FitsLimit(before.update, before.size, limit));
            player.PlayInto(bench.capturer, Limit());
            bench.Pass();
            EXPECT_EQ(Text(bench.sink.Frames().back().size), Text(before.size)) << "the limit hunts";
        }
    }
}

// The client's limit.

TEST(SetCaptureMaxFrameSize, RefusesAZeroSideAndChangesNothing) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(0, 100), -2);
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(100, 0), -2);
    EXPECT_EQ(TVLSize(bench.engine->m_sizeCaptureMax), TVLSize{});
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST(SetCaptureMaxFrameSize, StoresAndTracesOnce) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
    EXPECT_EQ(bench.engine->_GetCurCaptureMaxSize(), (TVLSize{640, 480}));
    EXPECT_EQ(bench.trace.Lines(),
              (std::vector<std::string>{
                  Info("[CShareCaptureEngine::SetCaptureMaxFrameSize] nWidth=640,nHeight=480"),
                  Info("[CShareCaptureEngine::_UpdateCaptureMaxFrameSize] w=640,h=480")}));
    bench.Forget();
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST(SetCaptureMaxFrameSize, PostsNothingForTheLimitThatIsInForceAlready) {
    CEngineBench<> bench;
    bench.engine->m_sizeCurCaptureMax = TVLSize{640, 480};
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
    EXPECT_EQ(TVLSize(bench.engine->m_sizeCaptureMax), (TVLSize{640, 480}));
    EXPECT_FALSE(bench.trace.Contains("_UpdateCaptureMaxFrameSize"));
}

TEST(SetCaptureMaxFrameSize, IsIgnoredUnderAFixedResamplingSize) {
    AppShareConfig& config = *AppShareConfig::Instance();
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
    config.m_bCaptureResampleFixSizeEnable = true;
    EXPECT_EQ(bench.engine->_GetCurCaptureMaxSize(), (TVLSize{1920, 1080}));
    config.m_nResampleScreenCaptureWidth = 10;
    config.m_nResampleScreenCaptureHeight = 10;
    EXPECT_EQ(bench.engine->_GetCurCaptureMaxSize(), (TVLSize{800, 600}));
    // The context still follows the client, to no effect.
    bench.engine->m_sizeCaptureMax = TVLSize{1000, 1000};
    bench.engine->_CalculateNewCaptureMaxFrameSize({0, 0, 1200, 1000}, {1920, 1200});
    EXPECT_EQ(bench.engine->_GetCurCaptureMaxSize(), (TVLSize{800, 600}));
    config.m_bCaptureResampleFixSizeEnable = false;
    EXPECT_EQ(bench.engine->_GetCurCaptureMaxSize(), (TVLSize{1600, 1000}));
}

// What the client is told.

TEST(ShareDisplaySize, IsToldOnceAndSizesBothFrames) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->OnCapturedDisplaySizedChanged({320, 200});
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), std::vector<std::string>{"size 320x200"});
    EXPECT_TRUE(bench.trace.Contains(Info("[CShareCaptureEngine::_UpdateShareDisplaySize]>>x=320,y=200")));
    for (IShareFrame* frame : {bench.engine->m_pShareFrameA, bench.engine->m_pShareFrameB}) {
        TVLSize size{};
        frame->GetFrameSize(size);
        EXPECT_EQ(size, (TVLSize{320, 200}));
    }
    TVLSize size{};
    bench.engine->GetCaptureSize(size);
    EXPECT_EQ(size, (TVLSize{320, 200}));
    bench.engine->OnCapturedDisplaySizedChanged({320, 200});
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.CountNotices("size 320x200"), 1u);
}

TEST(ShareDisplaySize, ReachesTheFramesBetweenPassesWhenACapturersOwnThreadTellsIt) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourceCount = 1; });
    bench.Start();
    CGate inCapture;
    CGate goOn;
    bench.capturer.SetHook([&](IShareFrame*) {
        inCapture.Open();
        EXPECT_TRUE(goOn.Passes());
    });
    bench.Advance(200);
    ASSERT_TRUE(inCapture.Passes());
    bench.engine->OnCapturedDisplaySizedChanged({320, 200});
    TVLSize during{};
    bench.engine->m_pShareFrameB->GetFrameSize(during);
    EXPECT_EQ(during, TVLSize{});
    bench.capturer.SetHook({});
    goOn.Open();
    Settle(*bench.engine->_GetWorker());
    TVLSize after{};
    bench.engine->m_pShareFrameB->GetFrameSize(after);
    EXPECT_EQ(after, (TVLSize{320, 200}));
}

TEST(SharePosition, IsToldWithWidthAndHeightWhenItChanges) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourcePosition = {5, 6, 70, 80}; });
    bench.engine->OnCapturedDisplaySizedChanged({70, 80});
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.CountNotices("position 5,6 70x80"), 1u);
    EXPECT_TRUE(
        bench.trace.Contains(Info("[CShareCaptureEngine::OnCapturePositionChanged]>>,rect="
                                  "{left:5,top:6,right:75,bottom:86,width:70,height:80}")));
    bench.engine->OnCapturedDisplaySizedChanged({70, 81});
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.CountNotices("position 5,6 70x80"), 1u);
}

TEST(SharePosition, IsNotToldWithoutACapturer) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    bench.BeginInline();
    bench.engine->OnCapturedDisplaySizedChanged({70, 80});
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), std::vector<std::string>{"size 70x80"});
}

TEST(ShareCaptureSize, TellsThePointingObjectTheDisplay) {
    CEngineBench<> bench(true);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.sourceSize = {70, 80};
        answers.display = 9;
    });
    bench.engine->_UpdateShareCaptureSize();
    EXPECT_EQ(bench.pointing->baseDisplay, 9u);
    EXPECT_EQ(TVLSize(bench.engine->m_sizeShareDisplay), (TVLSize{70, 80}));
}

TEST(ShareCaptureSize, DoesNothingWithoutACapturer) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    bench.Forget();
    bench.engine->_UpdateShareCaptureSize();
    EXPECT_TRUE(bench.calls.Calls().empty());
}

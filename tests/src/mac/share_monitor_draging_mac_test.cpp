// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_monitor_draging_mac.h"

#include "src/share_capturer_context.h"
#include "tests/src/share_region_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

/// When windows count as being moved.

namespace {

using Lines = std::vector<std::string>;
using std::chrono::milliseconds;

const std::string STARTED = Info("ShareUtilMacMonitorDraging::IsDraging status changed new=1,old=0");
const std::string ENDED = Info("ShareUtilMacMonitorDraging::IsDraging status changed new=0,old=1");

class CVisibleRegionContext final : public ShareCapturerContext {
public:
    void Show(const Rects& rects) {
        ParamSet found;
        found.rgnVisible.CopyRgn(Region(rects));
        _CommitParamSet(found);
    }
};

class MonitorDraging : public testing::Test {
protected:
    bool Ask() {
        return draging.IsDraging([this] { ++walks; });
    }
    bool AskAfter(int ms) {
        clock->Advance(milliseconds(ms));
        return Ask();
    }
    /// Moves something after the first look.
    void Begin() {
        EXPECT_FALSE(Ask());
        context->Show({{1, 0, 11, 10}});
        EXPECT_TRUE(Ask());
        walks = 0;
    }

    CManualClockScope clock;
    CTraceLog trace{CM_TRACE_INFO};
    const std::shared_ptr<CVisibleRegionContext> context = std::make_shared<CVisibleRegionContext>();
    ShareUtilMacMonitorDraging draging{context};
    int walks = 0;
};

} // namespace

TEST_F(MonitorDraging, IsNotSeenOnAStillScreen) {
    context->Show({{0, 0, 10, 10}});
    for (int i = 1; i <= 5; ++i) {
        EXPECT_FALSE(AskAfter(10));
        EXPECT_EQ(walks, i) << "one walk for each question";
    }
    EXPECT_EQ(trace.Lines(), Lines());
}

TEST_F(MonitorDraging, IsNotSeenAtTheFirstLookWhateverItShows) {
    context->Show({{0, 0, 10, 10}});
    EXPECT_FALSE(Ask());
}

TEST_F(MonitorDraging, IsSeenWhenTheVisibleRegionChanges) {
    EXPECT_FALSE(Ask());
    EXPECT_TRUE(draging.IsDraging([this] {
        context->Show({{0, 0, 10, 10}});
    })) << "what the walk finds counts at once";
    EXPECT_EQ(trace.Lines(), (Lines{STARTED}));
}

TEST_F(MonitorDraging, LastsHalfASecondWithoutAWalk) {
    Begin();
    EXPECT_TRUE(AskAfter(0));
    context->Show({{5, 0, 15, 10}});
    EXPECT_TRUE(AskAfter(499));
    context->Show({{1, 0, 11, 10}});
    EXPECT_TRUE(AskAfter(1));
    EXPECT_EQ(walks, 0);
    EXPECT_EQ(trace.Lines(), (Lines{STARTED}));
    EXPECT_FALSE(AskAfter(1)) << "501 ms later, and all is where it was";
    EXPECT_EQ(walks, 1);
    EXPECT_EQ(trace.Lines(), (Lines{STARTED, ENDED}));
}

TEST_F(MonitorDraging, GoesOnWhenSomethingHasMovedMeanwhile) {
    Begin();
    context->Show({{5, 0, 15, 10}});
    EXPECT_TRUE(AskAfter(501));
    EXPECT_EQ(walks, 1);
    EXPECT_TRUE(AskAfter(500));
    EXPECT_EQ(walks, 1) << "the half second starts again";
    EXPECT_FALSE(AskAfter(1));
    EXPECT_EQ(trace.Lines(), (Lines{STARTED, ENDED}));
}

TEST_F(MonitorDraging, WorksWithoutAWalk) {
    EXPECT_FALSE(draging.IsDraging({}));
    context->Show({{0, 0, 10, 10}});
    EXPECT_TRUE(draging.IsDraging({}));
}

TEST_F(MonitorDraging, IsOverWhenTheWalkThrows) {
    Begin();
    clock->Advance(milliseconds(501));
    EXPECT_THROW(draging.IsDraging([] { throw std::runtime_error("no walk"); }), std::runtime_error);
    EXPECT_FALSE(Ask());
}

TEST_F(MonitorDraging, ComparesRectanglesInTheirOrder) {
    EXPECT_FALSE(draging.IsVisiableRegionChanged());
    context->Show({{0, 0, 10, 10}});
    EXPECT_TRUE(draging.IsVisiableRegionChanged());
    EXPECT_FALSE(draging.IsVisiableRegionChanged());
    context->Show({{0, 0, 5, 10}, {5, 0, 10, 10}});
    EXPECT_FALSE(draging.IsVisiableRegionChanged()) << "the same rectangles, put together otherwise";
    context->Show({{0, 0, 10, 10}, {20, 0, 30, 10}});
    EXPECT_TRUE(draging.IsVisiableRegionChanged());
    context->Show({{0, 0, 10, 10}, {20, 0, 30, 11}});
    EXPECT_TRUE(draging.IsVisiableRegionChanged());
    context->Show({});
    EXPECT_TRUE(draging.IsVisiableRegionChanged());
}

TEST_F(MonitorDraging, IsNeverSeenWithoutAContextAndTheMeasureStays) {
    context->Show({{0, 0, 10, 10}});
    EXPECT_FALSE(draging.IsVisiableRegionChanged());
    draging.SetContext(nullptr);
    EXPECT_FALSE(draging.IsVisiableRegionChanged());
    EXPECT_FALSE(Ask());
    EXPECT_EQ(walks, 1);
    draging.SetContext(context);
    EXPECT_FALSE(draging.IsVisiableRegionChanged());
    context->Show({{1, 0, 11, 10}});
    EXPECT_TRUE(draging.IsVisiableRegionChanged());
}

TEST_F(MonitorDraging, KeepsItsContext) {
    std::weak_ptr<ShareCapturerContext> alive;
    {
        auto given = std::make_shared<CVisibleRegionContext>();
        alive = given;
        draging.SetContext(given);
    }
    EXPECT_FALSE(alive.expired());
    draging.SetContext(context);
    EXPECT_TRUE(alive.expired());
}

// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_dummy_mac.h"

#include "src/share_capturer_context.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

// The back-end that captures nothing, seen as the back-end that a capturer would hold.

namespace {

using Lines = std::vector<std::string>;

class ShareCapturerDummyBackEnd : public testing::Test {
protected:
    CTraceLog trace;
    const std::shared_ptr<ShareCapturerDummy> dummy = std::make_shared<ShareCapturerDummy>();
    const std::shared_ptr<ShareCapturerMac> backEnd = dummy;
};

} // namespace

TEST_F(ShareCapturerDummyBackEnd, DoesNotLookAtTheContextThatItIsGiven) {
    const auto context = std::make_shared<ShareCapturerContext>();
    EXPECT_TRUE(backEnd->init(context));
    EXPECT_TRUE(backEnd->init(nullptr));
    EXPECT_EQ(context.use_count(), 1);
    EXPECT_EQ(trace.Lines(), (Lines{Info("[ShareCapturerDummy::init]"), Info("[ShareCapturerDummy::init]")}));
}

TEST_F(ShareCapturerDummyBackEnd, MakesItsOwnContextWhenItIsGivenNone) {
    EXPECT_TRUE(dummy->init());
    EXPECT_EQ(trace.Lines(), (Lines{Info("[ShareCapturerDummy::init] without context"),
                                    Info("[ShareCapturerDummy::init]")}));
}

TEST_F(ShareCapturerDummyBackEnd, CapturesNothing) {
    const ShareRef<CShareFrame> frame{new CShareFrame};
    frame.Get()->SetFrameSize(4, 4);
    EXPECT_EQ(backEnd->capture(), nullptr);
    EXPECT_EQ(static_cast<int>(backEnd->captureToIShareFrame(frame.Get())), -1);
    EXPECT_EQ(static_cast<int>(backEnd->captureToIShareFrame(nullptr)), -1);
    EXPECT_EQ(frame.Get()->GetTimestamp(), 0u);
    EXPECT_EQ(backEnd->pointerCaptured(), 0);
}

TEST_F(ShareCapturerDummyBackEnd, KeepsTheDisplayThatItIsGiven) {
    EXPECT_EQ(backEnd->getCaptureDisplay(), 0u);
    EXPECT_TRUE(backEnd->setCaptureDisplay(77));
    EXPECT_EQ(backEnd->getCaptureDisplay(), 77u);
    EXPECT_TRUE(backEnd->setCaptureDisplay(SHARE_INVALID_DISPLAY));
    EXPECT_EQ(backEnd->getCaptureDisplay(), SHARE_INVALID_DISPLAY);
}

TEST_F(ShareCapturerDummyBackEnd, AnswersWithFixedValues) {
    EXPECT_EQ(backEnd->getCaptureRect(), platform::CGRect{});
    EXPECT_EQ(backEnd->getSharedAppCount(), 0u);
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{0, 0}));
    EXPECT_EQ(static_cast<int>(backEnd->setCaptureThreadCount(3)), -5);
    EXPECT_FALSE(backEnd->IsWindowAreaBaseContentSupport());
    dummy->initScreenSize();
    dummy->initCapturer();
    dummy->initCapturerByData(nullptr, 0);
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{0, 0}));
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(ShareCapturerDummyBackEnd, DoesNothingWhereItHasNoAnswer) {
    backEnd->setCaptureDisplay(7);
    EXPECT_EQ(backEnd->getCaptureFormat(), 0);
    EXPECT_EQ(backEnd->setFPS(30), 0);
    EXPECT_EQ(backEnd->onDisplayPlugin(7), 0);
    EXPECT_EQ(backEnd->onDisplayPlugout(7), 0);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(7), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(ShareCapturerDummyBackEnd, TracesANewMaximumSizeUnderTheNameOfTheSessionBackEnd) {
    backEnd->setMaxSize({0, 0});
    EXPECT_EQ(trace.Lines(), Lines{}) << "that is the size in force";
    backEnd->setMaxSize({640, 480});
    backEnd->setMaxSize({640, 480});
    backEnd->setMaxSize({640, 400});
    const std::string start = "[ShareCapturerAVFoundation::setMaxSize],m_szMaxCapture:";
    EXPECT_EQ(trace.Lines(), (Lines{Info(start + "x=0,y=0,nMaxSize:x=640,y=480"),
                                    Info(start + "x=640,y=480,nMaxSize:x=640,y=400")}));
}

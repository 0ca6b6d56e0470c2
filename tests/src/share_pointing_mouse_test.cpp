// SPDX-License-Identifier: Apache-2.0
#include "src/share_pointing_mouse.h"

#include "src/app_share_config.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <set>
#include <string>
#include <utility>
#include <vector>

// Cursor images, the list of sinks, and the pointer without a mouse.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned ALL_BITS = 0xFFFFFFFFu;

std::string Text(int x, int y) {
    return std::to_string(x) + "," + std::to_string(y);
}

/// Logs what it is told, and keeps the last position and image.
class CPointingSink : public ISharePointingSink {
public:
    explicit CPointingSink(CCallLog& calls, std::string name = "")
        : m_calls(calls),
          m_name(std::move(name)) {}

    int OnPointingPosChanged(int newX, int newY) override {
        x = newX;
        y = newY;
        m_calls.Add(m_name + "position");
        return -1;
    }
    int OnPointingImgChanged(ISharePointingImg* newImage) override {
        image = newImage;
        m_calls.Add(m_name + "image");
        return -1;
    }

    int x = -1;
    int y = -1;
    ISharePointingImg* image = nullptr;

private:
    CCallLog& m_calls;
    const std::string m_name;
};

class SharePointingMouseDummy : public testing::Test {
protected:
    SharePointingMouseDummy() { SetSize(1024, 768); }
    ~SharePointingMouseDummy() override { SetSize(1024, 768); }

    static void SetSize(int width, int height) {
        AppShareConfig::Instance()->m_nDummyCaptureWidth = width;
        AppShareConfig::Instance()->m_nDummyCaptureHeight = height;
    }
    int Poll(SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_RGBA) { return mouse.CapturePoint(format); }
    void PassSeconds(int seconds) { clock->Advance(std::chrono::seconds(seconds)); }

    CManualClockScope clock;
    CCallLog calls;
    CTraceLog trace;
    CPointingSink sink{calls};
    CSharePointingMouseDummy mouse{ALL_BITS};
};

/// Expects the image of a format to consist of this pixel, over and over.
void ExpectImageOf(SHARE_FRAME_FORMAT format, const std::vector<unsigned char>& pixel) {
    SCOPED_TRACE(static_cast<int>(format));
    CCallLog calls;
    CPointingSink sink(calls);
    CSharePointingMouseDummy mouse(1);
    mouse.AddSink(&sink);
    ASSERT_EQ(mouse.CapturePoint(format), 0);
    ASSERT_NE(sink.image, nullptr);
    IShareFrame* const frame = sink.image->GetImgData();
    TVLSize size{};
    frame->GetFrameSize(size);
    EXPECT_EQ(size, (TVLSize{16, 16}));
    EXPECT_NE(frame->GetTimestamp(), 0u);
    EXPECT_EQ(sink.image->GetHotPointX(), 0);
    EXPECT_EQ(sink.image->GetHotPointY(), 0);
    ASSERT_EQ(frame->GetFrameDataLen(), static_cast<int>(256 * pixel.size()));
    std::vector<unsigned char> expected;
    for (int i = 0; i < 256; ++i)
        expected.insert(expected.end(), pixel.begin(), pixel.end());
    const unsigned char* const data = frame->GetFrameData();
    EXPECT_TRUE(std::equal(expected.begin(), expected.end(), data));
    EXPECT_EQ(frame->GetFrameDataFormat(), pixel.empty() ? SHARE_FRAME_FORMAT_NONE : format);
}

} // namespace

// ---- Cursor images

TEST(CursorImage, HasAFrameOfItsOwnForItsLife) {
    auto* const image = new CCursorImage;
    EXPECT_EQ(image->GetReference(), 0u);
    EXPECT_EQ(image->AddRef(), 1u);
    const ShareRef<IShareFrame> frame(image->GetImgData());
    ASSERT_NE(frame.Get(), nullptr);
    EXPECT_EQ(frame.Get()->GetReference(), 2u);
    EXPECT_EQ(image->GetImgData(), frame.Get());
    EXPECT_EQ(frame.Get()->GetReference(), 2u) << "asking adds no reference";
    EXPECT_EQ(image->Release(), 0u);
    EXPECT_EQ(frame.Get()->GetReference(), 1u);
}

TEST(CursorImage, KeepsItsHotPoint) {
    const ShareRef<CCursorImage> image(new CCursorImage);
    image.Get()->SetHotPointX(-3);
    image.Get()->SetHotPointY(7);
    EXPECT_EQ(image.Get()->GetHotPointX(), -3);
    EXPECT_EQ(image.Get()->GetHotPointY(), 7);
}

TEST(CursorImage, KnowsTheRootInterfaceOnly) {
    const ShareRef<CCursorImage> image(new CCursorImage);
    void* object = nullptr;
    EXPECT_EQ(image.Get()->QueryInterface(QVNIID_IQvnUnknown, &object), 0);
    EXPECT_NE(object, nullptr);
    EXPECT_EQ(image.Get()->Release(), 1u);
    EXPECT_EQ(image.Get()->QueryInterface(qvn::_tagUUID{{1}}, &object), 0x46004005);
    EXPECT_EQ(object, nullptr);
}

// ---- The base

TEST(SharePointingMouse, OffersNeitherStartNorStopNorPolls) {
    CSharePointingMouse mouse(3);
    EXPECT_EQ(mouse.Start(), -3);
    EXPECT_EQ(mouse.Stop(), -3);
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA), -3);
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA, 1.0F), -3);
    EXPECT_EQ(mouse.SetBaseDisplayID(ALL_BITS), 0);
}

TEST(SharePointingMouse, TracesItsSinksAndAnswersZeroToEverything) {
    CCallLog calls;
    CPointingSink sink(calls);
    CSharePointingMouse mouse(3);
    const CTraceLog trace;
    EXPECT_EQ(mouse.RemoveSink(&sink), 0) << "it was never there";
    EXPECT_EQ(mouse.AddSink(&sink), 0);
    EXPECT_EQ(mouse.AddSink(&sink), 0);
    EXPECT_EQ(mouse.AddSink(nullptr), 0);
    EXPECT_EQ(mouse.CleanSink(), 0);
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 4u);
    EXPECT_TRUE(lines[0].starts_with(Debug("CSharePointingMouse::RemoveSink(0x"))) << lines[0];
    EXPECT_TRUE(lines[0].ends_with(")")) << lines[0];
    EXPECT_TRUE(lines[1].starts_with(Debug("CSharePointingMouse::AddSink(0x"))) << lines[1];
    EXPECT_EQ(lines[2], lines[1]);
    EXPECT_EQ(lines[3], Debug("CSharePointingMouse::AddSink(0x0)"));
    EXPECT_TRUE(calls.Calls().empty());
}

// ---- The pointer without a mouse

TEST_F(SharePointingMouseDummy, StartsAndStops) {
    EXPECT_EQ(mouse.Start(), 0);
    EXPECT_EQ(mouse.Stop(), 0);
}

TEST_F(SharePointingMouseDummy, DoesNotOfferThePollOfTheCapturePass) {
    mouse.AddSink(&sink);
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA, 1.0F), -3);
    EXPECT_TRUE(calls.Calls().empty());
}

TEST_F(SharePointingMouseDummy, PaintsAnOpaqueImageInTheFormatOfTheFirstPoll) {
    ExpectImageOf(SHARE_FRAME_FORMAT_RGBA, {0x00, 0x00, 0xFF, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_BGRA, {0x00, 0x00, 0xFF, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_ARGB, {0xFF, 0x00, 0x00, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_ABGR, {0xFF, 0x00, 0x00, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_RGB, {0x00, 0x00, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_BGR, {0x00, 0x00, 0xFF});
    ExpectImageOf(SHARE_FRAME_FORMAT_NONE, {});
    ExpectImageOf(static_cast<SHARE_FRAME_FORMAT>(7), {});
    ExpectImageOf(static_cast<SHARE_FRAME_FORMAT>(-1), {});
}

TEST_F(SharePointingMouseDummy, TellsTheImageAtTheFirstPollOnly) {
    mouse.AddSink(&sink);
    trace.Clear();
    EXPECT_EQ(Poll(), 0);
    EXPECT_EQ(calls.Calls(), (Lines{"image", "position"}));
    EXPECT_EQ(trace.Lines(),
              Lines{Info("CSharePointingMouseDummy::CapturePoint() call sink's OnPointingImgChanged()")});
    ISharePointingImg* const image = sink.image;
    EXPECT_EQ(image->GetReference(), 1u);
    PassSeconds(5);
    EXPECT_EQ(Poll(SHARE_FRAME_FORMAT_BGR), 0);
    EXPECT_EQ(calls.Count("image"), 1u);
    EXPECT_EQ(image->GetImgData()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
}

TEST_F(SharePointingMouseDummy, TracesThatNobodyHearsOfTheImage) {
    EXPECT_EQ(Poll(), 0);
    EXPECT_EQ(trace.Lines(),
              Lines{Info("CSharePointingMouseDummy::CapturePoint() cursor changed but no sink to notify")});
    mouse.AddSink(&sink);
    PassSeconds(1);
    EXPECT_EQ(Poll(), 0);
    EXPECT_EQ(calls.Calls(), Lines{"position"}) << "who comes later isn't told of the image";
}

TEST_F(SharePointingMouseDummy, LetsGoOfItsImageAtItsEnd) {
    ShareRef<ISharePointingImg> image;
    {
        CSharePointingMouseDummy other(1);
        other.AddSink(&sink);
        other.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
        image = ShareRef<ISharePointingImg>(sink.image);
        EXPECT_EQ(image.Get()->GetReference(), 2u);
        calls.Clear();
    }
    EXPECT_EQ(image.Get()->GetReference(), 1u);
    EXPECT_TRUE(calls.Calls().empty());
}

TEST_F(SharePointingMouseDummy, RestsForASecond) {
    mouse.AddSink(&sink);
    Poll();
    const std::string first = Text(sink.x, sink.y);
    clock->Advance(std::chrono::milliseconds(999));
    Poll();
    EXPECT_EQ(calls.Count("position"), 1u);
    clock->Advance(std::chrono::milliseconds(1));
    Poll();
    EXPECT_EQ(calls.Count("position"), 2u);
    EXPECT_NE(Text(sink.x, sink.y), first);
}

TEST_F(SharePointingMouseDummy, IsWhereAnotherOneIsInTheSameSecond) {
    CPointingSink otherSink(calls);
    CSharePointingMouseDummy other(2);
    mouse.AddSink(&sink);
    other.AddSink(&otherSink);
    for (int i = 0; i < 5; ++i) {
        Poll();
        other.CapturePoint(SHARE_FRAME_FORMAT_BGR);
        EXPECT_EQ(Text(sink.x, sink.y), Text(otherSink.x, otherSink.y));
        PassSeconds(1);
    }
}

TEST_F(SharePointingMouseDummy, JumpsAboutInsideTheDummyPicture) {
    SetSize(640, 100);
    mouse.AddSink(&sink);
    std::set<int> columns;
    std::set<int> steps;
    for (int i = 0; i < 200; ++i) {
        const int before = sink.x;
        PassSeconds(1);
        Poll();
        ASSERT_TRUE(sink.x >= 0 && sink.x < 640) << sink.x;
        ASSERT_TRUE(sink.y >= 0 && sink.y < 100) << sink.y;
        columns.insert(sink.x);
        steps.insert(sink.x - before);
    }
    EXPECT_GT(columns.size(), 100u);
    EXPECT_GT(steps.size(), 100u) << "it marches instead of jumping";
}

TEST_F(SharePointingMouseDummy, StaysInTheOnlyPixelOfTheSmallestPicture) {
    SetSize(1, 1);
    mouse.AddSink(&sink);
    Poll();
    EXPECT_EQ(Text(sink.x, sink.y), "0,0");
    for (int i = 0; i < 5; ++i) {
        PassSeconds(1);
        Poll();
    }
    EXPECT_EQ(calls.Count("position"), 1u);
}

TEST_F(SharePointingMouseDummy, FollowsTheSettingsAtOnce) {
    mouse.AddSink(&sink);
    for (int i = 0; i < 4; ++i, PassSeconds(1))
        Poll();
    SetSize(1, 1);
    Poll();
    EXPECT_EQ(Text(sink.x, sink.y), "0,0");
}

TEST_F(SharePointingMouseDummy, LeavesTheRandomNumbersOfItsHostAlone) {
    std::srand(4711);
    const int first = std::rand();
    const int second = std::rand();
    std::srand(4711);
    EXPECT_EQ(std::rand(), first);
    Poll();
    EXPECT_EQ(std::rand(), second);
}

TEST_F(SharePointingMouseDummy, TellsEachSinkOnceInTheOrderOfAdding) {
    CPointingSink second(calls, "second ");
    for (CPointingSink* const one : {&sink, &second, &sink})
        mouse.AddSink(one);
    Poll();
    EXPECT_EQ(calls.Calls(), (Lines{"image", "second image", "position", "second position"}));
    calls.Clear();
    mouse.RemoveSink(&sink);
    PassSeconds(1);
    Poll();
    EXPECT_EQ(calls.Calls(), Lines{"second position"});
    mouse.CleanSink();
    PassSeconds(1);
    EXPECT_EQ(Poll(), 0);
    EXPECT_EQ(calls.Calls(), Lines{"second position"});
}

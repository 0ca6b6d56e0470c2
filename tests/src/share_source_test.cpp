// SPDX-License-Identifier: Apache-2.0
#include "src/share_source.h"

#include "src/share_ref.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

namespace {

constexpr int kHighest = std::numeric_limits<int>::max();
constexpr int kLowest = std::numeric_limits<int>::min();

using Lines = std::vector<std::string>;

/// A source with that rectangle and scale.
ShareRef<IShareSource> SourceAt(const TVLRect& rect, float scale) {
    ShareSourceInfo info;
    info.sourceId = 7;
    info.eType = SHARE_SOURCE_TYPE_MONITOR;
    info.rect = rect;
    info.fScale = scale;
    ShareRef<IShareSource> source(new CShareSource);
    source.Get()->SetInfo(&info);
    return source;
}

TVLRect ScaledRect(const TVLRect& rect, float scale) {
    return SourceAt(rect, scale).Get()->GetSourceRect(true);
}

bool IsZeroFrom(const char* buffer, int begin) {
    return std::all_of(buffer + begin, buffer + SHARE_SOURCE_TEXT_SIZE, [](char byte) { return byte == 0; });
}

// ---- The record

TEST(ShareSourceInfo, StartsEmpty) {
    const ShareSourceInfo info;
    EXPECT_EQ(info.sourceId, 0u);
    EXPECT_EQ(static_cast<int>(info.eType), 0);
    EXPECT_FALSE(info.bShared);
    EXPECT_EQ(info.rect, (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(info.pName, nullptr);
    EXPECT_EQ(info.pDeviceId, nullptr);
    EXPECT_EQ(info.fScale, 1.0F);
}

TEST(ShareSourceInfo, NumbersTypesAndEvents) {
    EXPECT_EQ(SHARE_SOURCE_TYPE_APP, 1);
    EXPECT_EQ(SHARE_SOURCE_TYPE_MONITOR, 2);
    EXPECT_EQ(SHARE_SOURCE_EVENT_ADDED, 0);
    EXPECT_EQ(SHARE_SOURCE_EVENT_REMOVED, 1);
    EXPECT_EQ(SHARE_SOURCE_EVENT_UPDATED, 2);
}

TEST(ShareSourceInfo, KeepsTwoHundredAndFiftyFiveBytesOfALongerName) {
    const std::string text(300, 'n');
    ShareSourceInfo info;
    info.SetSourceName(text.data(), 300);
    ASSERT_NE(info.pName, nullptr);
    EXPECT_EQ(std::string(info.pName), text.substr(0, 255));
    EXPECT_EQ(info.pName[255], 0);
}

TEST(ShareSourceInfo, KeepsATextOfAWholeBufferTerminated) {
    const std::string text(256, 'd');
    ShareSourceInfo info;
    info.SetDeviceId(text.data(), 255);
    EXPECT_EQ(std::strlen(info.pDeviceId), 255u);
    info.SetDeviceId(text.data(), 256);
    EXPECT_EQ(std::strlen(info.pDeviceId), 255u);
}

TEST(ShareSourceInfo, CopiesBytesAndNotAString) {
    ShareSourceInfo info;
    info.SetSourceName("ab\0cd", 5);
    EXPECT_EQ(std::memcmp(info.pName, "ab\0cd", 5), 0);
    EXPECT_TRUE(IsZeroFrom(info.pName, 5));
}

TEST(ShareSourceInfo, LeavesNothingOfALongerNameBehindAShorterOne) {
    ShareSourceInfo info;
    info.SetSourceName("a long name", 11);
    char* const buffer = info.pName;
    info.SetSourceName("ab", 2);
    EXPECT_EQ(info.pName, buffer);
    EXPECT_STREQ(info.pName, "ab");
    EXPECT_TRUE(IsZeroFrom(info.pName, 2));
}

TEST(ShareSourceInfo, LeavesATextAsItIsForNullAndForNoLength) {
    ShareSourceInfo info;
    info.SetSourceName(nullptr, 5);
    info.SetSourceName("name", 0);
    info.SetSourceName("name", -1);
    info.SetDeviceId(nullptr, 5);
    info.SetDeviceId("id", 0);
    EXPECT_EQ(info.pName, nullptr);
    EXPECT_EQ(info.pDeviceId, nullptr);
    info.SetSourceName("name", 4);
    info.SetSourceName(nullptr, 4);
    info.SetSourceName("other", 0);
    EXPECT_STREQ(info.pName, "name");
}

TEST(ShareSourceInfo, CopiesAllOfAnotherRecord) {
    ShareSourceInfo from;
    from.sourceId = 0x100000001;
    from.eType = SHARE_SOURCE_TYPE_APP;
    from.bShared = true;
    from.rect = {1, 2, 3, 4};
    from.fScale = 2.5F;
    from.SetSourceName("name", 4);
    from.SetDeviceId("device", 6);
    ShareSourceInfo info;
    info.SetShareSourceInfo(&from);
    EXPECT_EQ(info.sourceId, 0x100000001u);
    EXPECT_EQ(info.eType, SHARE_SOURCE_TYPE_APP);
    EXPECT_TRUE(info.bShared);
    EXPECT_EQ(info.rect, (TVLRect{1, 2, 3, 4}));
    EXPECT_EQ(info.fScale, 2.5F);
    EXPECT_STREQ(info.pName, "name");
    EXPECT_STREQ(info.pDeviceId, "device");
    EXPECT_NE(info.pName, from.pName);
    EXPECT_NE(info.pDeviceId, from.pDeviceId);
}

TEST(ShareSourceInfo, KeepsATextThatTheOtherRecordDoesNotHave) {
    ShareSourceInfo info;
    info.SetSourceName("name", 4);
    info.SetDeviceId("device", 6);
    const ShareSourceInfo from;
    info.SetShareSourceInfo(&from);
    EXPECT_STREQ(info.pName, "name");
    EXPECT_STREQ(info.pDeviceId, "device");
}

TEST(ShareSourceInfo, IgnoresANullRecordAndStandsACopyOfItself) {
    ShareSourceInfo info;
    info.sourceId = 3;
    info.SetSourceName("name", 4);
    info.SetShareSourceInfo(nullptr);
    info.SetShareSourceInfo(&info);
    EXPECT_EQ(info.sourceId, 3u);
    EXPECT_STREQ(info.pName, "name");
}

// ---- The source

TEST(CShareSource, CountsItsReferences) {
    IShareSource* const source = new CShareSource;
    EXPECT_EQ(source->GetReference(), 0u);
    EXPECT_EQ(source->AddRef(), 1u);
    EXPECT_EQ(source->AddRef(), 2u);
    EXPECT_EQ(source->GetReference(), 2u);
    EXPECT_EQ(source->Release(), 1u);
    EXPECT_EQ(source->Release(), 0u);
}

TEST(CShareSource, EndsWithItsLastReference) {
    struct Ending : CShareSource {
        explicit Ending(bool& ended) : m_ended(ended) {}
        ~Ending() override { m_ended = true; }
        bool& m_ended;
    };
    bool ended = false;
    auto* const source = new Ending(ended);
    source->AddRef();
    source->AddRef();
    source->Release();
    EXPECT_FALSE(ended);
    source->Release();
    EXPECT_TRUE(ended);
}

TEST(CShareSource, KnowsItsRootInterfaceOnly) {
    const auto source = SourceAt({}, 1.0F);
    void* object = nullptr;
    EXPECT_EQ(source.Get()->QueryInterface(QVNIID_IQvnUnknown, &object), 0);
    EXPECT_NE(object, nullptr);
    EXPECT_EQ(source.Get()->GetReference(), 2u);
    source.Get()->Release();
    EXPECT_EQ(source.Get()->QueryInterface(qvn::_tagUUID{}, &object), 0x46004005);
    EXPECT_EQ(object, nullptr);
    EXPECT_EQ(source.Get()->QueryInterface(QVNIID_IQvnUnknown, nullptr), 0x46004006);
    EXPECT_EQ(source.Get()->GetReference(), 1u);
}

TEST(CShareSource, TellsItsIdentityAndTraces) {
    const auto source = SourceAt({}, 1.0F);
    const CTraceLog trace;
    EXPECT_EQ(source.Get()->GetSourceUniqueId(), 7u);
    EXPECT_EQ(source.Get()->GetSourceType(), SHARE_SOURCE_TYPE_MONITOR);
    EXPECT_FALSE(source.Get()->IsShared());
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSource::GetSourceType]>>type=2"),
                                    InfoLine("[CShareSource::IsShared]0")}));
}

TEST(CShareSource, TellsWhetherItsRecordIsShared) {
    ShareSourceInfo info;
    info.bShared = true;
    const ShareRef<IShareSource> source(new CShareSource);
    source.Get()->SetInfo(&info);
    const CTraceLog trace;
    EXPECT_TRUE(source.Get()->IsShared());
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSource::IsShared]1")}));
}

TEST(CShareSource, GivesNoNamesAndNoHandle) {
    ShareSourceInfo info;
    info.sourceId = 1;
    info.SetSourceName("name", 4);
    info.SetDeviceId("device", 6);
    const ShareRef<IShareSource> source(new CShareSource);
    source.Get()->SetInfo(&info);
    char out[8] = "kept";
    EXPECT_EQ(source.Get()->GetName(out, 7), -1);
    EXPECT_EQ(source.Get()->GetDeviceName(out, 7), -1);
    EXPECT_EQ(source.Get()->GetDeviceId(out, 7), -1);
    EXPECT_STREQ(out, "kept");
    EXPECT_EQ(source.Get()->GetSourceHandle(), nullptr);
}

TEST(CShareSource, TakesARecordAndTraces) {
    ShareSourceInfo info;
    info.sourceId = 4294967298;
    const ShareRef<IShareSource> source(new CShareSource);
    const CTraceLog trace;
    source.Get()->SetInfo(&info);
    EXPECT_EQ(source.Get()->GetSourceUniqueId(), 4294967298u);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSource::SetInfo]>>sourceId=4294967298")}));
}

TEST(CShareSource, IgnoresANullRecord) {
    const auto source = SourceAt({1, 2, 3, 4}, 2.0F);
    const CTraceLog trace;
    source.Get()->SetInfo(nullptr);
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_EQ(source.Get()->GetSourceUniqueId(), 7u);
    EXPECT_EQ(source.Get()->GetSourceRect(false), (TVLRect{1, 2, 3, 4}));
}

TEST(CShareSource, GivesTheRectangleThatWasSet) {
    const auto source = SourceAt({1, 2, 3, 4}, 1.0F);
    source.Get()->SetSourceRect({-5, 6, 70, 80});
    const CTraceLog trace;
    EXPECT_EQ(source.Get()->GetSourceRect(false), (TVLRect{-5, 6, 70, 80}));
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSource::GetSourceRect] left = -5 top = 6 right = 70 "
                                              "bottom = 80")}));
}

TEST(CShareSource, TracesTheStoredRectangleWhenItGivesTheScaledOne) {
    const auto source = SourceAt({100, 0, 300, 200}, 2.0F);
    const CTraceLog trace;
    EXPECT_EQ(source.Get()->GetSourceRect(true), (TVLRect{200, 0, 400, 400}));
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSource::GetSourceRect] left = 100 top = 0 right = 300 "
                                              "bottom = 200")}));
}

TEST(CShareSource, GivesTheStoredRectangleAtAScaleThatIsNotAboveOne) {
    constexpr TVLRect rect{10, 20, 30, 40};
    EXPECT_EQ(ScaledRect(rect, 1.0F), rect);
    EXPECT_EQ(ScaledRect(rect, 0.5F), rect);
    EXPECT_EQ(ScaledRect(rect, 0.0F), rect);
    EXPECT_EQ(ScaledRect(rect, -2.0F), rect);
    EXPECT_EQ(ScaledRect(rect, std::numeric_limits<float>::quiet_NaN()), rect);
}

TEST(CShareSource, ScalesARectangleAtTheOriginByThePlainProduct) {
    EXPECT_EQ(ScaledRect({0, 0, 1440, 900}, 2.0F), (TVLRect{0, 0, 2880, 1800}));
    EXPECT_EQ(ScaledRect({0, 0, 1001, 333}, 1.5F), (TVLRect{0, 0, 1501, 499}));
}

TEST(CShareSource, TakesTheScaledSizeAgainstTheScaledCorner) {
    EXPECT_EQ(ScaledRect({100, 50, 300, 200}, 2.0F), (TVLRect{200, 100, 400, 300}));
    // Right of a corner that scales beyond it: the distance is negative and is scaled so.
    EXPECT_EQ(ScaledRect({1440, 0, 2720, 800}, 2.0F), (TVLRect{2880, 0, 2560, 1600}));
}

TEST(CShareSource, CutsScaledEdgesTowardZero) {
    EXPECT_EQ(ScaledRect({-3, -1, 4, 4}, 1.5F), (TVLRect{-4, -1, 8, 6}));
}

TEST(CShareSource, MultipliesInSinglePrecision) {
    // 16777217 is no float: the nearest one is 16777216.
    EXPECT_EQ(ScaledRect({16777217, 0, 16777217, 0}, 1.0000001F).left,
              static_cast<int>(16777216.0F * 1.0000001F));
}

TEST(CShareSource, StandsRectanglesBeyondAllMeasure) {
    EXPECT_EQ(ScaledRect({kHighest, kLowest, 0, 0}, 2.0F).left, kHighest);
    EXPECT_EQ(ScaledRect({kHighest, kLowest, 0, 0}, 2.0F).top, kLowest);
    const TVLRect endless = ScaledRect({1, -1, kLowest, kHighest}, std::numeric_limits<float>::infinity());
    EXPECT_EQ(endless.left, kHighest);
    EXPECT_EQ(endless.top, kLowest);
}

} // namespace

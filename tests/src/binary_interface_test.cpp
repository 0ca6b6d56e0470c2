// SPDX-License-Identifier: Apache-2.0
//
// The order of virtual operations is part of what clients are built against: an operation that changes its
// place breaks every client that was built before.
#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>

namespace {

/// The place of a virtual operation in its class's table. A pointer to a virtual member holds the byte offset
/// of its entry plus one.
template <class Member>
std::size_t Slot(Member member) {
    std::ptrdiff_t words[2] = {0, 0};
    static_assert(sizeof member == sizeof words);
    std::memcpy(words, &member, sizeof words);
    EXPECT_EQ(words[0] % static_cast<std::ptrdiff_t>(sizeof(void*)), 1) << "not a virtual operation";
    return static_cast<std::size_t>(words[0] - 1) / sizeof(void*);
}

/// Expects the operations in slots that follow each other, from `first` on.
template <class... Members>
void ExpectSlotsFrom(std::size_t first, Members... members) {
    std::size_t expected = first;
    const auto check = [&](auto member) {
        EXPECT_EQ(Slot(member), expected);
        ++expected;
    };
    (check(members), ...);
}

constexpr std::size_t BEHIND_DESTRUCTORS = 2; // a complete and a deleting one

} // namespace

TEST(BinaryInterface, OfReferenceCountedObjectsStartsWithTheCount) {
    using qvn::IQvnUnknown;
    ExpectSlotsFrom(BEHIND_DESTRUCTORS, &IQvnUnknown::AddRef, &IQvnUnknown::Release,
                    &IQvnUnknown::QueryInterface, &IQvnUnknown::GetReference);
}

TEST(BinaryInterface, OfFramesKeepsItsOrder) {
    using F = IShareFrame;
    ExpectSlotsFrom(
        6, &F::SetExternalBuf, &F::SetTimestamp, &F::GetTimestamp, &F::GetFrameData, &F::GetFrameLineData,
        &F::GetFrameDataLen, &F::GetFrameLineBytes, &F::SetFrameLineBytes, &F::SetFrameDataFormat,
        &F::GetFrameDataFormat, static_cast<int (F::*)(int&, int&)>(&F::GetFrameSize),
        static_cast<int (F::*)(TVLSize&)>(&F::GetFrameSize),
        static_cast<int (F::*)(int, int)>(&F::SetFrameSize),
        static_cast<int (F::*)(TVLSize)>(&F::SetFrameSize), &F::WriteFrameData, &F::WriteFrameLineData,
        &F::WriteFrameAreaData, &F::ReadFrameData, &F::ReadFrameLineData, &F::ReadFrameAreaData,
        &F::CopyIShareFrame, &F::SwapOrCopy, &F::Reset, &F::SetMetaInfo, &F::GetMetaInfo);
}

TEST(BinaryInterface, OfSourcesKeepsItsOrder) {
    using S = IShareSource;
    ExpectSlotsFrom(6, &S::GetSourceUniqueId, &S::GetSourceType, &S::IsShared, &S::GetSourceRect,
                    &S::SetSourceRect, &S::GetName, &S::GetDeviceName, &S::GetDeviceId, &S::GetSourceHandle,
                    &S::SetInfo);
}

TEST(BinaryInterface, OfEnumeratorsKeepsItsOrder) {
    using E = IShareSourceEnumerator;
    ExpectSlotsFrom(BEHIND_DESTRUCTORS, &IShareSourceSinkMgr::AddSink, &IShareSourceSinkMgr::RemoveSink,
                    &IShareSourceSinkMgr::CleanSink);
    ExpectSlotsFrom(5, &E::Refresh, &E::GetNumber, &E::GetSource, &E::GetSourceBySourceId, &E::SetFilter,
                    &E::GetShareSourceEnumeratorType, &E::RemoveSourceById, &E::OnShareSourceEvent,
                    &E::Cleanup);
    ExpectSlotsFrom(0, &IShareSourceEnumSink::OnShareSourceEvent);
}

TEST(BinaryInterface, OfCapturersKeepsItsOrder) {
    using C = IShareCapturer;
    ExpectSlotsFrom(0, &IShareCapturerSourceMgr::AddCaptureShareSource,
                    &IShareCapturerSourceMgr::RemoveCaptureShareSource,
                    &IShareCapturerSourceMgr::GetCaptureShareSourceCount,
                    &IShareCapturerSourceMgr::GetCaptureShareSource);
    ExpectSlotsFrom(0, &IShareCapturerSinkMgr::AddSink, &IShareCapturerSinkMgr::RemoveSink,
                    &IShareCapturerSinkMgr::CleanSink);
    ExpectSlotsFrom(6, &C::Capture, &C::SetCaptureMaxSize, &C::GetCurrentCaptureDisplayId,
                    &C::GetCurrentCaptureSourceSize, &C::GetCurrentCaptureSourcePosition, &C::SetFilterSelf,
                    &C::AddSharedWindow, &C::RemoveSharedWindow, &C::AddUnSharedWindow,
                    &C::RemoveUnSharedWindow, &C::AddSharedProcess, &C::RemoveSharedProcess,
                    &C::AddUnSharedProcess, &C::RemoveUnSharedProcess, &C::SelectSharedDisplay,
                    &C::IsAppShared, &C::IsWindowShared, &C::PointerCaptured, &C::SetFPS, &C::Reinit,
                    &C::IsWindowAreaBaseContentSupport, &C::SetCaptureThreadCount, &C::GetScaleFactor,
                    &C::Stop, &C::AddSink, &C::RemoveSink, &C::CleanSink, &C::RemoveCaptureShareSourceApp,
                    &C::IsIpcCapturer);
}

TEST(BinaryInterface, OfCapturerSinksKeepsItsOrder) {
    using S = IShareCapturerSink;
    ExpectSlotsFrom(0, &S::OnShareSourceAdded, &S::OnShareSourceRemoved, &S::OnCapturedDisplaySizedChanged,
                    &S::OnCapturedDisplayChanged, &S::OnCapturedNoSharedApp, &S::OnCapturedAppDisplayChanged,
                    &S::OnCapturedWindowChanged, &S::OnCapturedAppsCrossMultiMonitors,
                    &S::OnCaptureStatusChanged, &S::OnCapturePositionChanged, &S::OnCaptureEvent,
                    &S::OnCaptureError, &S::OnCaptureStatistics);
}

TEST(BinaryInterface, OfEnginesKeepsItsOrder) {
    using E = IShareCaptureEngine;
    ExpectSlotsFrom(
        6, &E::Start, &E::Stop, &E::Pause, &E::Resume, &E::SetSink, &E::SetCaptureFps,
        &E::SetCaptureMaxFrameSize, &E::SetFilterSelf, &E::AddSharedWindow, &E::RemoveSharedWindow,
        &E::AddUnSharedWindow, &E::RemoveUnSharedWindow, &E::AddSharedProcess, &E::RemoveSharedProcess,
        &E::AddUnSharedProcess, &E::RemoveUnSharedProcess, &E::SelectSharedDisplay, &E::SetCaptureMode,
        &E::SetAppShareBackgroundColor, &E::GetCaptureEngineType, &E::GetCaptureStatus, &E::GetCaptureSize,
        &E::GetShareCaptureStatistic, &E::IsAppShared, &E::IsWindowShared, &E::SetExternalIShareCapturer,
        &E::EnableExternalISharePointing, &E::SetCaptureThreadCount, &E::Config);
}

TEST(BinaryInterface, OfEngineSinksKeepsItsOrder) {
    using S = IShareCaptureEngineSink;
    ExpectSlotsFrom(0, &S::OnCaptureDisplaySizeChanged, &S::OnCapturedWindowListChanged,
                    &S::OnCaptureStatusChanged, &S::OnCaptureData, &S::OnCaptureError,
                    &S::OnCapturePositionChanged, &S::OnCaptureEvent);
}

TEST(BinaryInterface, OfPointingObjectsKeepsItsOrder) {
    using P = ISharePointing;
    ExpectSlotsFrom(BEHIND_DESTRUCTORS, &P::Start, &P::Stop,
                    static_cast<int (P::*)(SHARE_FRAME_FORMAT)>(&P::CapturePoint),
                    static_cast<int (P::*)(SHARE_FRAME_FORMAT, float)>(&P::CapturePoint), &P::AddSink,
                    &P::RemoveSink, &P::CleanSink, &P::SetBaseDisplayID);
    ExpectSlotsFrom(0, &ISharePointingSink::OnPointingPosChanged, &ISharePointingSink::OnPointingImgChanged);
    ExpectSlotsFrom(6, &ISharePointingImg::SetHotPointX, &ISharePointingImg::SetHotPointY,
                    &ISharePointingImg::GetHotPointX, &ISharePointingImg::GetHotPointY,
                    &ISharePointingImg::GetImgData);
}

TEST(BinaryInterface, OfThumbnailsAndWindowWalksKeepsItsOrder) {
    ExpectSlotsFrom(0, &ThumbnailCallback::onAppThumbnail, &ThumbnailCallback::onWindowThumbnail,
                    &ThumbnailCallback::onThumbnailError);
    ExpectSlotsFrom(0, &ITvlEnumWindowsCallback::OnWindow);
}

TEST(BinaryInterface, OfRecordsKeepsItsFields) {
    EXPECT_EQ(offsetof(SHARE_CAPTURE_STATISTIC, eCaptureMode), 36u);
    EXPECT_EQ(sizeof(SHARE_CAPTURE_STATISTIC), 40u);
    EXPECT_EQ(sizeof(TVLRect), 16u);
    EXPECT_EQ(sizeof(TVLSize), 8u);
    EXPECT_EQ(offsetof(ImageData, data), 16u);
    EXPECT_EQ(offsetof(ShareWindowInfo, ownerPid), 4u);
    EXPECT_EQ(offsetof(ShareWindowInfo, displayId), 8u);
    EXPECT_EQ(offsetof(ShareWindowInfo, onScreen), 12u);
    EXPECT_EQ(offsetof(ShareWindowInfo, rect), 16u);
    EXPECT_EQ(offsetof(ShareWindowInfo, title), 32u);
    EXPECT_EQ(sizeof(ShareWindowInfo), 544u);
    EXPECT_EQ(offsetof(IShareFrame::MetaInfo, bPointerCaptured), 16u);
}

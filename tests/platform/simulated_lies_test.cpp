// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "tests/platform/conformance_checks.h"
#include "tests/platform/notice_log.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

/// Each lie is seen by the checks that honest servers pass, and by none of them before it is told.

namespace {

using namespace platform;

constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;

class SimulatedLies : public testing::Test {
protected:
    testing::AssertionResult PictureIsLawful(std::vector<CGWindowID> windows) {
        WindowPictureRequest request;
        request.windows = std::move(windows);
        request.rect = {{0, 0}, {200, 120}};
        request.deadline = CmSteadyNow() + PATIENCE;
        const auto snapshot = m_server->GetWindows();
        m_taken = m_server->TakeWindowPicture(request).picture;
        if (m_taken == nullptr || m_taken->generation != snapshot->Generation())
            return testing::AssertionFailure() << "no picture of that stack";
        return IsLawful(*m_taken, request, *snapshot);
    }

    PicturePtr Next(DisplayStream& stream) { return stream.TakeNewest(CmSteadyNow() + PATIENCE).picture; }

    std::unique_ptr<DisplayStream> Open() {
        return m_server->OpenDisplayStream({.display = 1, .framesPerSecond = 1000000000}).stream;
    }

    const std::shared_ptr<SimulatedWindowServer> m_server = Scene()
                                                                .Display(0, 0, 200, 120)
                                                                .App(100, "Editor")
                                                                .Window(1)
                                                                .At(10, 10, 80, 60)
                                                                .Colour(GREEN)
                                                                .Window(2)
                                                                .At(40, 30, 80, 60)
                                                                .Colour(0xFF0000)
                                                                .Window(3)
                                                                .At(90, 20, 50, 50)
                                                                .Unshared()
                                                                .Serve();
    std::shared_ptr<const WindowPicture> m_taken;
};

} // namespace

TEST_F(SimulatedLies, AreNotToldByThemselves) {
    ASSERT_TRUE(PictureIsLawful({1, 3}));
    ASSERT_EQ(m_taken->layers.size(), 1u);
    EXPECT_TRUE(Shows(*m_taken->layers[0].picture, GREEN));
}

TEST_F(SimulatedLies, ShowAWindowThatWasNotAskedFor) {
    m_server->Lie(SimulatedLie::OneWindowTooMany);
    EXPECT_FALSE(PictureIsLawful({1}));
    ASSERT_EQ(m_taken->layers.size(), 2u);
    m_server->Lie(SimulatedLie::OneWindowTooMany, false);
    EXPECT_TRUE(PictureIsLawful({1}));
}

TEST_F(SimulatedLies, ShowAWindowThatIsNotShared) {
    m_server->Lie(SimulatedLie::UnsharedShown);
    EXPECT_FALSE(PictureIsLawful({1, 3}));
    EXPECT_TRUE(PictureIsLawful({1, 2}));
}

TEST_F(SimulatedLies, ShowTheStackBeforeTheLastChangeUnderItsNumber) {
    ASSERT_TRUE(m_server->MoveWindow(1, {100, 40}));
    EXPECT_TRUE(PictureIsLawful({1}));
    m_server->Lie(SimulatedLie::StaleStack);
    EXPECT_FALSE(PictureIsLawful({1}));
    ASSERT_TRUE(m_server->RaiseWindow(1));
    EXPECT_FALSE(PictureIsLawful({1, 2}));
}

TEST_F(SimulatedLies, ShowADisplayBeforeTheLastChangeUnderItsNumber) {
    const auto stream = Open();
    m_server->Lie(SimulatedLie::StaleStack);
    ASSERT_TRUE(m_server->MoveWindow(1, {10, 50}));
    const PicturePtr picture = Next(*stream);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->generationBefore, m_server->GetWindows()->Generation());
    EXPECT_EQ(picture->generationAfter, m_server->GetWindows()->Generation());
    EXPECT_EQ(ArgbAtPoint(*picture, {12, 12}), 0xFF000000U | GREEN) << "nothing is there any more";
}

TEST_F(SimulatedLies, ListTheWindowsOfTheMomentBeforeUnderANewNumber) {
    m_server->Lie(SimulatedLie::StaleList);
    ASSERT_TRUE(m_server->MoveWindow(1, {100, 40}));
    EXPECT_FALSE(PictureIsLawful({1}));
    EXPECT_EQ(m_server->GetWindows()->Find(1)->frame.origin, (CGPoint{10, 10}));
}

TEST_F(SimulatedLies, KeepOldPixels) {
    const auto stream = Open();
    ASSERT_NE(Next(*stream), nullptr);
    ASSERT_TRUE(PictureIsLawful({1}));
    m_server->Lie(SimulatedLie::OldPixelsKept);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(BLUE)));
    ASSERT_TRUE(PictureIsLawful({1}));
    EXPECT_TRUE(Shows(*m_taken->layers[0].picture, GREEN));
    EXPECT_EQ(Next(*stream), nullptr);
    m_server->Lie(SimulatedLie::OldPixelsKept, false);
    ASSERT_TRUE(PictureIsLawful({1}));
    EXPECT_TRUE(Shows(*m_taken->layers[0].picture, BLUE));
    EXPECT_NE(Next(*stream), nullptr);
}

TEST_F(SimulatedLies, PlaceAWindowElsewhere) {
    m_server->Lie(SimulatedLie::WrongRectangle);
    EXPECT_FALSE(PictureIsLawful({1}));
}

TEST_F(SimulatedLies, ForgetAPartOfTheChanges) {
    const auto stream = Open();
    StreamCopy copy;
    ASSERT_TRUE(copy.Take(*Next(*stream)));
    m_server->Lie(SimulatedLie::ChangesForgotten);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(BLUE)));
    const PicturePtr picture = Next(*stream);
    ASSERT_NE(picture, nullptr);
    EXPECT_TRUE(IsLawful(*picture));
    EXPECT_FALSE(copy.Take(*picture));
}

TEST_F(SimulatedLies, TellAnEndTwice) {
    const auto log = std::make_shared<CNoticeLog>();
    m_server->SetNoticeReceiver(log);
    ASSERT_TRUE(m_server->StartApplication({200, "Honest", "honest", ApplicationKind::Ordinary, false}));
    ASSERT_TRUE(m_server->EndApplication(200));
    EXPECT_EQ(log->Count(NoticeKind::ApplicationEnded), 1u);
    m_server->Lie(SimulatedLie::EndToldTwice);
    ASSERT_TRUE(m_server->EndApplication(100));
    EXPECT_EQ(log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, 100)), 2u);
}

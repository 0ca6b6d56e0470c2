// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "tests/platform/notice_log.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <future>
#include <memory>
#include <stdexcept>
#include <thread>
#include <vector>

namespace {

using namespace platform;
using namespace std::chrono_literals;

/// An operation, and whether a call of it succeeds on a server where all is well.
struct Operation {
    const char* name;
    SimulatedOperation operation;
    std::function<bool(SimulatedWindowServer&)> succeeds;
};

WindowPictureRequest Request(std::chrono::nanoseconds patience = DEFAULT_IMAGE_DEADLINE) {
    WindowPictureRequest request;
    request.windows = {1};
    request.rect = {{0, 0}, {200, 120}};
    request.deadline = CmSteadyNow() + patience;
    return request;
}

PictureOutcome TakeFromNewStream(SimulatedWindowServer& server) {
    const auto opened = server.OpenDisplayStream({.display = 1});
    if (opened.stream == nullptr)
        return opened.outcome;
    return opened.stream->TakeNewest(CmSteadyNow() + DEFAULT_IMAGE_DEADLINE).outcome;
}

bool HasPointer(SimulatedWindowServer& server) {
    CGPoint position{-1, -1};
    const bool known = server.GetPointerPosition(position);
    EXPECT_EQ(position, known ? (CGPoint{5, 7}) : (CGPoint{-1, -1}));
    return known;
}

/// All that can fail.
const std::vector<Operation>& Operations() {
    using Server = SimulatedWindowServer;
    static const std::vector<Operation> operations = {
        {"GetLife", SimulatedOperation::GetLife,
         [](Server& server) { return server.GetLife().life == Life::Alive; }},
        {"GetCapability", SimulatedOperation::GetCapability,
         [](Server& server) { return server.GetCapability(Capability::Windows) == Availability::Yes; }},
        {"GetPermission", SimulatedOperation::GetPermission,
         [](Server& server) { return server.GetPermission() == Permission::NotNeeded; }},
        {"GetDisplays", SimulatedOperation::GetDisplays,
         [](Server& server) { return !server.GetDisplays()->empty(); }},
        {"GetWindows", SimulatedOperation::GetWindows,
         [](Server& server) { return server.GetWindows()->Find(1) != nullptr; }},
        {"GetApplications", SimulatedOperation::GetApplications,
         [](Server& server) { return !server.GetApplications()->empty(); }},
        {"GetPointerPosition", SimulatedOperation::GetPointerPosition, HasPointer},
        {"GetCursor", SimulatedOperation::GetCursor,
         [](Server& server) { return server.GetCursor() != nullptr; }},
        {"TakeWindowPicture", SimulatedOperation::TakeWindowPicture,
         [](Server& server) { return server.TakeWindowPicture(Request()).picture != nullptr; }},
        {"OpenDisplayStream", SimulatedOperation::OpenDisplayStream,
         [](Server& server) { return server.OpenDisplayStream({.display = 1}).stream != nullptr; }},
        {"TakeNewest", SimulatedOperation::TakeNewest,
         [](Server& server) { return TakeFromNewStream(server) == PictureOutcome::Ok; }},
        {"BringToFront", SimulatedOperation::BringToFront,
         [](Server& server) { return server.BringToFront(100); }},
    };
    return operations;
}

class SimulatedFailures : public testing::Test {
protected:
    /// Until another thread is in its first one.
    void WaitForCall(SimulatedOperation operation) const {
        while (m_server->CallsOf(operation) == 0)
            std::this_thread::yield();
    }

    CManualClockScope m_clock;
    const std::shared_ptr<SimulatedWindowServer> m_server = Scene()
                                                                .Display(0, 0, 200, 120)
                                                                .App(100, "Editor")
                                                                .Window(1)
                                                                .At(10, 10, 80, 60)
                                                                .Pointer(5, 7)
                                                                .Cursor(ArrowCursor())
                                                                .Serve();
    const std::shared_ptr<CNoticeLog> m_log = std::make_shared<CNoticeLog>();
};

} // namespace

TEST_F(SimulatedFailures, ComeAtTheNextCallAlone) {
    for (const Operation& each : Operations()) {
        SCOPED_TRACE(each.name);
        EXPECT_TRUE(each.succeeds(*m_server));
        m_server->FailNext(each.operation);
        EXPECT_FALSE(each.succeeds(*m_server));
        EXPECT_TRUE(each.succeeds(*m_server));
    }
}

TEST_F(SimulatedFailures, ComeAtTheNthCallAlone) {
    for (const Operation& each : Operations()) {
        SCOPED_TRACE(each.name);
        m_server->FailNth(each.operation, 3);
        for (const bool expected : {true, true, false, true})
            EXPECT_EQ(each.succeeds(*m_server), expected);
    }
}

TEST_F(SimulatedFailures, ComeAlwaysUntilTheyAreHealed) {
    for (const Operation& each : Operations()) {
        SCOPED_TRACE(each.name);
        m_server->FailAlways(each.operation);
        for (int i = 0; i < 3; ++i)
            EXPECT_FALSE(each.succeeds(*m_server));
        for (const Operation& other : Operations()) {
            // A stream has to be opened before it can be read.
            const bool leansOnIt = each.operation == SimulatedOperation::OpenDisplayStream &&
                                   other.operation == SimulatedOperation::TakeNewest;
            if (other.operation != each.operation && !leansOnIt) {
                EXPECT_TRUE(other.succeeds(*m_server)) << other.name;
            }
        }
        m_server->Heal(each.operation);
        EXPECT_TRUE(each.succeeds(*m_server));
    }
}

TEST_F(SimulatedFailures, HaveTheOutcomeThatWasChosen) {
    for (const PictureOutcome outcome :
         {PictureOutcome::Lost, PictureOutcome::Nothing, PictureOutcome::Stale, PictureOutcome::Gone,
          PictureOutcome::Timeout, PictureOutcome::Unsupported, PictureOutcome::Refused}) {
        m_server->FailNext(SimulatedOperation::TakeWindowPicture, outcome);
        m_server->FailNext(SimulatedOperation::OpenDisplayStream, outcome);
        m_server->FailNth(SimulatedOperation::TakeNewest, 1, outcome);
        const WindowPictureResult picture = m_server->TakeWindowPicture(Request());
        EXPECT_EQ(picture.outcome, outcome);
        EXPECT_EQ(picture.picture, nullptr);
        EXPECT_EQ(TakeFromNewStream(*m_server), outcome);
        EXPECT_EQ(TakeFromNewStream(*m_server), outcome);
        EXPECT_EQ(TakeFromNewStream(*m_server), PictureOutcome::Ok);
    }
}

TEST_F(SimulatedFailures, AreCountedLikeOtherCalls) {
    for (const Operation& each : Operations()) {
        SCOPED_TRACE(each.name);
        const unsigned before = m_server->CallsOf(each.operation);
        m_server->FailNext(each.operation);
        each.succeeds(*m_server);
        each.succeeds(*m_server);
        EXPECT_EQ(m_server->CallsOf(each.operation), before + 2);
    }
    m_server->SetNoticeReceiver(m_log);
    m_server->AskPermission();
    m_server->Rest();
    EXPECT_EQ(m_server->CallsOf(SimulatedOperation::SetNoticeReceiver), 1u);
    EXPECT_EQ(m_server->CallsOf(SimulatedOperation::AskPermission), 1u);
    EXPECT_EQ(m_server->CallsOf(SimulatedOperation::Rest), 1u);
}

TEST_F(SimulatedFailures, LeaveAStreamThatIsGoneGone) {
    const auto stream = m_server->OpenDisplayStream({.display = 1}).stream;
    ASSERT_TRUE(m_server->RemoveDisplay(1));
    m_server->FailAlways(SimulatedOperation::TakeNewest, PictureOutcome::Timeout);
    EXPECT_EQ(stream->TakeNewest(CmSteadyNow() + 1s).outcome, PictureOutcome::Gone);
}

TEST_F(SimulatedFailures, AskNobodyForThePermission) {
    m_server->SetPermission(Permission::NotAsked);
    m_server->FailNext(SimulatedOperation::AskPermission);
    m_server->AskPermission();
    EXPECT_EQ(m_server->GetPermission(), Permission::NotAsked);
    m_server->AskPermission();
    EXPECT_EQ(m_server->GetPermission(), Permission::Asking);
}

TEST_F(SimulatedFailures, CannotKeepAReceiverFromBeingSet) {
    m_server->FailAlways(SimulatedOperation::SetNoticeReceiver);
    m_server->SetNoticeReceiver(m_log);
    m_server->EndApplication(100);
    EXPECT_EQ(m_log->Count(NoticeKind::ApplicationEnded), 1u);
}

// ---- Actions

TEST_F(SimulatedFailures, LetTheDesktopChangeInTheMiddleOfAWalk) {
    m_server->DoAt(SimulatedOperation::GetWindows, 2, [this] { m_server->CloseWindow(1); });
    EXPECT_NE(m_server->GetWindows()->Find(1), nullptr);
    EXPECT_EQ(m_server->GetWindows()->Find(1), nullptr);
}

TEST_F(SimulatedFailures, PassAnActionThatThrows) {
    const CTraceLog log;
    m_server->DoAt(SimulatedOperation::GetWindows, 1, [] { throw std::runtime_error("no luck"); });
    EXPECT_NE(m_server->GetWindows()->Find(1), nullptr);
    EXPECT_TRUE(log.Contains("no luck"));
}

TEST_F(SimulatedFailures, ComeFromContentsThatThrow) {
    const CTraceLog log;
    m_server->SetNoticeReceiver(m_log);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Painted([](int, int) -> SimulatedArgb {
                                         throw std::runtime_error("no paint");
                                     })));
    const WindowPictureResult picture = m_server->TakeWindowPicture(Request());
    EXPECT_EQ(picture.outcome, PictureOutcome::Failed);
    EXPECT_EQ(picture.picture, nullptr);
    EXPECT_EQ(TakeFromNewStream(*m_server), PictureOutcome::Failed);
    EXPECT_EQ(log.CountContaining("no paint"), 2u);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(0)));
    EXPECT_NE(m_server->TakeWindowPicture(Request()).picture, nullptr);
}

TEST_F(SimulatedFailures, ComeFromWindowsTooLargeToPaint) {
    ASSERT_TRUE(m_server->SetFrame(1, {{0, 0}, {1e9F, 1e9F}}));
    EXPECT_EQ(m_server->TakeWindowPicture(Request()).outcome, PictureOutcome::Failed);
}

// ---- Delays

TEST_F(SimulatedFailures, DelayAnAnswerUntilTheClockHasMoved) {
    m_server->DelayNext(SimulatedOperation::TakeWindowPicture, 300ms);
    const auto asked = CmSteadyNow();
    auto picture =
        std::async(std::launch::async, [&] { return m_server->TakeWindowPicture(Request(10000h)); });
    WaitForCall(SimulatedOperation::TakeWindowPicture);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(0)));
    EXPECT_EQ(picture.wait_for(0s), std::future_status::timeout);
    while (picture.wait_for(0s) != std::future_status::ready)
        m_clock->Advance(100ms);
    const WindowPictureResult result = picture.get();
    ASSERT_EQ(result.outcome, PictureOutcome::Ok);
    EXPECT_GE(result.picture->time, asked + 300ms) << "it shows the moment of the answer";
    EXPECT_EQ(m_server->GetLife().life, Life::Alive);
}

TEST_F(SimulatedFailures, StallAServerThatAnswersTooLateUntilItsAnswer) {
    m_server->SetNoticeReceiver(m_log);
    m_server->DelayNext(SimulatedOperation::TakeWindowPicture, 20000h);
    auto picture = std::async(std::launch::async, [&] { return m_server->TakeWindowPicture(Request()); });
    WaitForCall(SimulatedOperation::TakeWindowPicture);
    m_clock->Advance(DEFAULT_IMAGE_DEADLINE);
    EXPECT_EQ(picture.get().outcome, PictureOutcome::Timeout);
    EXPECT_EQ(m_server->GetLife().life, Life::Stalled);
    EXPECT_EQ(m_server->TakeWindowPicture(Request()).outcome, PictureOutcome::Lost);
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1}).outcome, PictureOutcome::Lost);
    EXPECT_NE(m_server->GetWindows()->Find(1), nullptr);
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 1u);
    m_clock->Advance(20000h);
    EXPECT_TRUE(m_log->WaitFor(NoticeKind::LifeChanged, 2)) << "it finds out by itself";
    EXPECT_EQ(m_server->GetLife().life, Life::Alive);
    EXPECT_NE(m_server->TakeWindowPicture(Request()).picture, nullptr);
}

TEST_F(SimulatedFailures, DelayALookForThePointerForATenthOfASecondAtMost) {
    m_server->DelayNext(SimulatedOperation::GetPointerPosition, 20000h);
    auto known = std::async(std::launch::async, [&] { return HasPointer(*m_server); });
    WaitForCall(SimulatedOperation::GetPointerPosition);
    int steps = 0;
    while (known.wait_for(0s) != std::future_status::ready) {
        m_clock->Advance(10ms);
        ++steps;
    }
    EXPECT_GE(steps, 10);
    EXPECT_FALSE(known.get());
    EXPECT_EQ(m_server->GetLife().life, Life::Stalled);
    m_server->Answer();
    EXPECT_TRUE(HasPointer(*m_server));
}

TEST_F(SimulatedFailures, GiveUpADelayedCallWhenTheServerIsLost) {
    m_server->DelayNext(SimulatedOperation::TakeWindowPicture, 500ms);
    auto picture = std::async(std::launch::async, [&] { return m_server->TakeWindowPicture(Request()); });
    WaitForCall(SimulatedOperation::TakeWindowPicture);
    m_server->Lose();
    ASSERT_EQ(picture.wait_for(PATIENCE), std::future_status::ready);
    EXPECT_EQ(picture.get().outcome, PictureOutcome::Lost);
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_window_server.h"
#include "tests/platform/notice_log.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "tests/x11/x11_rig.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

/// How the window server finds its display, loses it and finds it again, and what it tells of that.

namespace {

using namespace platform;
using namespace std::chrono_literals;

std::ptrdiff_t CountDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

std::chrono::nanoseconds TimeOf(const std::function<void()>& work) {
    const auto begin = std::chrono::steady_clock::now();
    work();
    return std::chrono::steady_clock::now() - begin;
}

std::chrono::microseconds ProcessorTime() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    const auto of = [](const timeval& time) {
        return std::chrono::seconds(time.tv_sec) + std::chrono::microseconds(time.tv_usec);
    };
    return of(usage.ru_utime) + of(usage.ru_stime);
}

WindowPictureRequest Request(std::chrono::nanoseconds patience) {
    WindowPictureRequest request;
    request.rect = {{0, 0}, {4000, 4000}};
    request.windows = {1};
    request.deadline = CmSteadyNow() + patience;
    return request;
}

class X11Life : public testing::Test {
protected:
    void SetUp() override {
        unsetenv("DISPLAY");
        unsetenv("WAYLAND_DISPLAY");
        unsetenv("XDG_SESSION_TYPE");
        if (const auto missing = MissingProgram({"Xvfb"}))
            GTEST_SKIP() << *missing;
    }

    /// A display that the test's servers come up on.
    XServer& Rig() {
        if (!m_rig)
            m_rig.emplace(XServerOptions{.width = 320, .height = 240});
        return *m_rig;
    }

    WindowServer& Server() {
        if (m_server == nullptr)
            m_server = std::make_shared<X11WindowServer>(Rig().Display());
        return *m_server;
    }
    void End() { m_server.reset(); }

    bool Becomes(Life life) {
        return ComesTrue([this, life] { return Server().GetLife().life == life; });
    }

    DisplayStreamResult OpenStream() {
        const auto displays = Server().GetDisplays();
        return Server().OpenDisplayStream(
            {.display = displays->empty() ? 1 : displays->front().id, .framesPerSecond = 1000});
    }

    /// Has the server asked for something that it doesn't know yet.
    PictureOutcome Ask(std::chrono::nanoseconds patience) {
        const DisplayStreamResult opened = OpenStream();
        return opened.stream != nullptr ? opened.stream->TakeNewest(CmSteadyNow() + patience).outcome
                                        : opened.outcome;
    }

    /// Of a display that stands still, behind what is waited for.
    std::vector<DisplayStreamResult> OpenStreamsUntilTheStallIsNoticed() {
        std::thread waits([&] {
            CGPoint position;
            EXPECT_FALSE(Server().GetPointerPosition(position));
        });
        std::vector<DisplayStreamResult> streams;
        for (DisplayStreamResult opened = OpenStream(); opened.stream != nullptr; opened = OpenStream()) {
            streams.push_back(std::move(opened));
            std::this_thread::sleep_for(1ms); // a thousand of them would do no more
        }
        waits.join();
        return streams;
    }

    static PictureOutcome TakeFrom(DisplayStream& stream) {
        return stream.TakeNewest(CmSteadyNow() + PATIENCE).outcome;
    }

    const std::shared_ptr<CNoticeLog> m_log = std::make_shared<CNoticeLog>();

private:
    std::optional<XServer> m_rig;
    std::shared_ptr<X11WindowServer> m_server;
};

TEST_F(X11Life, IsLostAndNotTracedForEachCallWithoutADisplay) {
    const CTraceLog traces(CM_TRACE_INFO);
    X11WindowServer server;
    for (int i = 0; i < 10; ++i) {
        EXPECT_EQ(server.GetLife(), (LifeState{Life::Lost, 0}));
        EXPECT_TRUE(server.GetDisplays()->empty());
        EXPECT_TRUE(server.GetWindows()->Windows().empty());
        EXPECT_TRUE(server.GetApplications()->empty());
        EXPECT_EQ(server.GetCursor(), nullptr);
        for (const Capability capability : {Capability::Windows, Capability::Streams, Capability::Pointer})
            EXPECT_EQ(server.GetCapability(capability), Availability::No);
        EXPECT_EQ(server.GetPermission(), Permission::NotNeeded);
        CGPoint position{7, 7};
        EXPECT_FALSE(server.GetPointerPosition(position));
        EXPECT_EQ(position, (CGPoint{7, 7}));
        EXPECT_EQ(server.TakeWindowPicture(Request(PATIENCE)).outcome, PictureOutcome::Lost);
        EXPECT_EQ(server.OpenDisplayStream({.display = 1}).outcome, PictureOutcome::Lost);
        EXPECT_FALSE(server.BringToFront(getpid()));
    }
    EXPECT_TRUE(traces.Lines().empty());
}

TEST_F(X11Life, BeginsWithTheFirstConnectionAndTellsNothingOfIt) {
    Server().SetNoticeReceiver(m_log);
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Alive, 1}));
    ASSERT_EQ(Server().GetDisplays()->size(), 1u);
    EXPECT_EQ(Server().GetDisplays()->front().bounds, (CGRect{{0, 0}, {320, 240}}));
    EXPECT_GT(Server().GetWindows()->Generation(), 0u);
    EXPECT_TRUE(m_log->Notices().empty());
}

TEST_F(X11Life, BeginsLateWhenTheDisplayComesLate) {
    Rig().Kill();
    Server().SetNoticeReceiver(m_log);
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Lost, 0}));
    Rig().Restart();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(Server().GetLife().epoch, 1u);
    EXPECT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(Server().GetDisplays()->front().id, DisplayAdded)));
}

TEST_F(X11Life, TellsALossAndAReturnInTheirOrder) {
    Server().SetNoticeReceiver(m_log);
    ASSERT_TRUE(Becomes(Life::Alive));
    const CGDirectDisplayID display = Server().GetDisplays()->front().id;
    const std::uint64_t generation = Server().GetWindows()->Generation();
    Rig().Kill();
    ASSERT_TRUE(Becomes(Life::Lost));
    EXPECT_TRUE(Server().GetDisplays()->empty());
    EXPECT_EQ(Server().GetCapability(Capability::Windows), Availability::No);
    EXPECT_GE(Server().GetWindows()->Generation(), generation);
    Rig().Restart();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(Server().GetLife().epoch, 2u);
    EXPECT_EQ(Server().GetDisplays()->front().id, display);
    EXPECT_GT(Server().GetWindows()->Generation(), generation);

    const std::vector<Notice> notices = m_log->Notices();
    ASSERT_EQ(notices.size(), 4u);
    EXPECT_EQ(notices[0].kind, NoticeKind::LifeChanged);
    EXPECT_EQ(notices[1].display, display);
    EXPECT_TRUE((notices[1].flags & DisplayRemoved) != 0);
    EXPECT_EQ(notices[2].kind, NoticeKind::LifeChanged);
    EXPECT_EQ(notices[3].display, display);
    EXPECT_TRUE((notices[3].flags & DisplayAdded) != 0);
}

TEST_F(X11Life, KeepsItsEpochAndItsStreamsOverARest) {
    ASSERT_EQ(Server().GetLife(), (LifeState{Life::Alive, 1}));
    const DisplayStreamResult opened = OpenStream();
    ASSERT_NE(opened.stream, nullptr);
    EXPECT_EQ(TakeFrom(*opened.stream), PictureOutcome::Ok);
    Server().SetNoticeReceiver(m_log);
    for (int i = 0; i < 3; ++i) {
        Server().Rest();
        EXPECT_EQ(Server().GetLife(), (LifeState{Life::Alive, 1}));
        EXPECT_TRUE(ComesTrue([&] { return TakeFrom(*opened.stream) == PictureOutcome::Ok; }));
    }
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 0u);
    EXPECT_EQ(m_log->Count(NoticeKind::DisplayChanged), 0u);
}

TEST_F(X11Life, IsAnotherOneWhenAnotherServerCameDuringARest) {
    Server().SetNoticeReceiver(m_log);
    ASSERT_EQ(Server().GetLife(), (LifeState{Life::Alive, 1}));
    const DisplayStreamResult opened = OpenStream();
    ASSERT_NE(opened.stream, nullptr);
    Server().Rest();
    Rig().Kill();
    Rig().Restart();
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Alive, 2}));
    EXPECT_EQ(TakeFrom(*opened.stream), PictureOutcome::Gone);
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 2u);
}

TEST_F(X11Life, TellsOfALossThatItFindsAfterARest) {
    Server().SetNoticeReceiver(m_log);
    ASSERT_TRUE(Becomes(Life::Alive));
    Server().Rest();
    Rig().Kill();
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Lost, 1}));
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 1u);
    EXPECT_EQ(m_log->Count(NoticeKind::DisplayChanged), 1u);
}

TEST_F(X11Life, LeavesNothingRunningOrOpenAtRest) {
    X11WindowServer warm(Rig().Display());
    warm.GetLife();
    warm.Rest();
    const std::ptrdiff_t descriptors = CountDescriptors();
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(WaitForThreadsOfProcess(threads + 1), threads + 1);
    Server().Rest();
    EXPECT_EQ(CountDescriptors(), descriptors);
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    Server().Rest(); // nothing to do
    ASSERT_TRUE(Becomes(Life::Alive));
    End();
    EXPECT_EQ(CountDescriptors(), descriptors);
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST_F(X11Life, StreamsOutliveTheirEpochAndTheirServerAndSayGone) {
    DisplayStreamResult first = OpenStream();
    ASSERT_NE(first.stream, nullptr);
    Rig().Kill();
    ASSERT_TRUE(Becomes(Life::Lost));
    EXPECT_EQ(TakeFrom(*first.stream), PictureOutcome::Gone);
    Rig().Restart();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(TakeFrom(*first.stream), PictureOutcome::Gone);
    const DisplayStreamResult second = OpenStream();
    ASSERT_NE(second.stream, nullptr);
    EXPECT_NE(second.stream->Id(), first.stream->Id());
    End();
    EXPECT_EQ(TakeFrom(*second.stream), PictureOutcome::Gone);
}

TEST_F(X11Life, StandsStillWithTheDisplayAndGoesOnWithIt) {
    Server().SetNoticeReceiver(m_log);
    ASSERT_TRUE(Becomes(Life::Alive));
    Rig().Stop();
    EXPECT_EQ(Ask(100ms), PictureOutcome::Timeout);
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Stalled, 1}));
    EXPECT_FALSE(Server().GetDisplays()->empty());
    EXPECT_EQ(Server().GetCapability(Capability::Windows), Availability::Yes);
    EXPECT_EQ(OpenStream().outcome, PictureOutcome::Lost);
    EXPECT_LT(TimeOf([&] {
                  EXPECT_EQ(Server().TakeWindowPicture(Request(PATIENCE)).outcome, PictureOutcome::Lost);
              }),
              PATIENCE / 2);
    EXPECT_EQ(Server().TakeWindowPicture(Request(0ms)).outcome, PictureOutcome::Lost);
    Rig().Continue();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(Server().GetLife().epoch, 1u);
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 2u);
    EXPECT_EQ(m_log->Count(NoticeKind::DisplayChanged), 0u);
}

TEST_F(X11Life, AttachesAndDropsStreamsAfterAStallAsAskedForDuringIt) {
    ASSERT_TRUE(Becomes(Life::Alive));
    DisplayStreamResult kept = OpenStream();
    DisplayStreamResult dropped = OpenStream();
    ASSERT_NE(kept.stream, nullptr);
    // On a busy machine the stall may be noticed before there is one.
    std::vector<DisplayStreamResult> late;
    EXPECT_TRUE(ComesTrue([&] {
        Rig().Continue();
        EXPECT_TRUE(Becomes(Life::Alive));
        Rig().Stop();
        late = OpenStreamsUntilTheStallIsNoticed();
        return !late.empty();
    }));
    ASSERT_FALSE(late.empty());
    EXPECT_EQ(Server().GetLife().life, Life::Stalled);
    dropped.stream.reset();
    Rig().Continue();
    ASSERT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(TakeFrom(*kept.stream), PictureOutcome::Ok);
    EXPECT_EQ(TakeFrom(*late.front().stream), PictureOutcome::Ok);
    EXPECT_EQ(TakeFrom(*late.back().stream), PictureOutcome::Ok);
}

TEST_F(X11Life, AsksAStandingDisplayForThePointerNoLongerThanATenthOfASecond) {
    CGPoint position;
    ASSERT_TRUE(ComesTrue([&] { return Server().GetPointerPosition(position); }));
    Rig().Stop();
    const auto took = TimeOf([&] { EXPECT_FALSE(Server().GetPointerPosition(position)); });
    EXPECT_GE(took, 90ms);
    EXPECT_LT(took, 5s);
    Server().Rest();
    // At rest it would have to connect first; it doesn't wait longer for that.
    EXPECT_LT(TimeOf([&] { EXPECT_FALSE(Server().GetPointerPosition(position)); }), DEFAULT_CONNECT_DEADLINE);
}

TEST_F(X11Life, RestsAtOnceWhateverTheDisplayDoes) {
    ASSERT_TRUE(Becomes(Life::Alive));
    Rig().Stop();
    EXPECT_EQ(Ask(50ms), PictureOutcome::Timeout);
    EXPECT_LT(TimeOf([&] { Server().Rest(); }), 1s) << "stalled";
    std::thread looks([&] { Server().GetLife(); });
    EXPECT_TRUE(ComesTrue([] { return CountThreadsOfProcess() >= 3; }));
    EXPECT_LT(TimeOf([&] { Server().Rest(); }), 1s) << "connecting";
    looks.join();
    Rig().Continue();
    ASSERT_TRUE(Becomes(Life::Alive));
    Rig().Kill();
    ASSERT_TRUE(Becomes(Life::Lost));
    EXPECT_LT(TimeOf([&] { Server().Rest(); }), 1s) << "between two tries";
}

TEST_F(X11Life, GivesUpConnectingToADisplayThatStandsStill) {
    Rig().Stop();
    const auto took = TimeOf([&] { EXPECT_EQ(Server().GetLife().life, Life::Lost); });
    EXPECT_GE(took, 1s);
    EXPECT_LT(took, 10s);
    EXPECT_LT(TimeOf([&] { EXPECT_EQ(Server().GetLife().life, Life::Lost); }), 1s) << "known by now";
}

TEST_F(X11Life, FailsOnAClockThatStandsInsteadOfWaitingWithoutEnd) {
    const CManualClockScope clock;
    ASSERT_TRUE(Becomes(Life::Alive));
    Rig().Stop();
    EXPECT_EQ(Ask(1h), PictureOutcome::Timeout);
    Server().Rest();
    EXPECT_EQ(Server().GetLife().life, Life::Lost);
}

TEST_F(X11Life, UsesNoProcessorWhileThereIsNoDisplayOrNothingGoesOn) {
    ASSERT_TRUE(Becomes(Life::Alive));
    const auto idle = [](const char* when) {
        const auto before = ProcessorTime();
        std::this_thread::sleep_for(500ms); // time in which nothing is to happen
        EXPECT_LT(ProcessorTime() - before, 100ms) << when;
    };
    idle("alive");
    Rig().Stop();
    EXPECT_EQ(Ask(50ms), PictureOutcome::Timeout);
    idle("stalled");
    Rig().Kill();
    ASSERT_TRUE(Becomes(Life::Lost));
    idle("lost");
}

TEST_F(X11Life, IsLostWithoutRoomForItsThread) {
    Rig();
    {
        const CNoNewThreadsScope none;
        EXPECT_EQ(Server().GetLife().life, Life::Lost);
        EXPECT_TRUE(Server().GetDisplays()->empty());
        EXPECT_EQ(Server().TakeWindowPicture(Request(PATIENCE)).outcome, PictureOutcome::Lost);
    }
    EXPECT_EQ(Server().GetLife().life, Life::Alive);
}

TEST_F(X11Life, IsForgottenInAForkedProcessWithoutHarmToItsParent) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "nobody frees the locks of a sanitizer's allocator over a fork";
    ASSERT_TRUE(Becomes(Life::Alive));
    DisplayStreamResult opened = OpenStream();
    ASSERT_NE(opened.stream, nullptr);
    const pid_t child = fork();
    if (child == 0) {
        alarm(20);
        bool right = Server().GetLife() == LifeState{Life::Lost, 1} && Server().GetDisplays()->empty();
        right = right && opened.stream->TakeNewest(CmSteadyNow() + 1h).outcome == PictureOutcome::Lost;
        right = right && Server().OpenDisplayStream({.display = 1}).outcome == PictureOutcome::Lost;
        Server().Rest();
        Server().SetNoticeReceiver(m_log);
        opened.stream.reset();
        End();
        _exit(right ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(Server().GetLife(), (LifeState{Life::Alive, 1}));
    EXPECT_EQ(TakeFrom(*opened.stream), PictureOutcome::Ok);
}

// ---- What "auto" means

TEST_F(X11Life, IsNotSeenWithoutADisplayThatAnswers) {
    const CTraceLog traces(CM_TRACE_INFO);
    EXPECT_EQ(MakeX11WindowServerIfSeen(), nullptr);
    setenv("DISPLAY", ":nothing", 1);
    EXPECT_EQ(MakeX11WindowServerIfSeen(), nullptr);
    setenv("DISPLAY", Rig().Display().c_str(), 1);
    Rig().Kill();
    EXPECT_EQ(MakeX11WindowServerIfSeen(), nullptr);
    EXPECT_TRUE(traces.Lines().empty());
}

TEST_F(X11Life, IsSeenWhereADisplayAnswers) {
    setenv("DISPLAY", Rig().Display().c_str(), 1);
    setenv("XDG_SESSION_TYPE", "x11", 1);
    const auto server = MakeX11WindowServerIfSeen();
    ASSERT_NE(server, nullptr);
    EXPECT_STREQ(server->Name(), "x11");
    EXPECT_EQ(server->GetLife().life, Life::Alive);
}

TEST_F(X11Life, IsNotSeenInAWaylandSessionWhichIsTraced) {
    setenv("DISPLAY", Rig().Display().c_str(), 1);
    const CTraceLog traces(CM_TRACE_INFO);
    setenv("XDG_SESSION_TYPE", "wayland", 1);
    EXPECT_EQ(MakeX11WindowServerIfSeen(), nullptr);
    EXPECT_EQ(traces.CountContaining("Wayland session"), 1u);
    unsetenv("XDG_SESSION_TYPE");
    setenv("WAYLAND_DISPLAY", "wayland-0", 1);
    EXPECT_EQ(MakeX11WindowServerIfSeen(), nullptr);
    EXPECT_EQ(traces.CountContaining("Wayland session"), 2u);
    EXPECT_EQ(traces.Lines().size(), 2u);
}

} // namespace

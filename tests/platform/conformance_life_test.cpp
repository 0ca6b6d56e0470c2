// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/conformance_fixture.h"
#include "tests/support/sanitizer.h"
#include "tests/support/test_effort.h"

#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <random>
#include <set>
#include <vector>

/// The contract of life, notices, threads and forks.

namespace {

using namespace platform;

class LifeContract : public WindowServerContract {
protected:
    /// Every operation once, with lawful results.
    static void UseAll(WindowServer& server, CGWindowID window, CGDirectDisplayID display) {
        EXPECT_TRUE(IsLawful(*server.GetDisplays()));
        EXPECT_TRUE(IsLawful(*server.GetWindows()));
        EXPECT_NE(server.GetApplications(), nullptr);
        CGPoint position;
        server.GetPointerPosition(position);
        server.GetCursor();
        server.GetLife();
        server.GetPermission();
        server.GetCapability(Capability::Streams);
        server.AskPermission();
        const WindowPictureRequest request = RequestFor({window});
        const WindowPictureResult result = server.TakeWindowPicture(request);
        EXPECT_EQ(result.picture != nullptr, result.outcome == PictureOutcome::Ok);
        DisplayStreamResult opened = server.OpenDisplayStream({.display = display, .framesPerSecond = 1000});
        if (opened.stream != nullptr) {
            const DisplayPictureResult picture = opened.stream->TakeNewest(SoonEnough());
            EXPECT_EQ(picture.picture != nullptr, picture.outcome == PictureOutcome::Ok);
        }
        server.BringToFront(1);
    }

    static std::set<std::string> Threads() {
        std::set<std::string> ids;
        for (const auto& entry : std::filesystem::directory_iterator("/proc/self/task"))
            ids.insert(entry.path().filename());
        return ids;
    }

    /// The signals that a thread blocks, from its status file.
    static std::uint64_t BlockedBy(const std::string& thread) {
        std::ifstream status("/proc/self/task/" + thread + "/status");
        std::string word;
        while (status >> word) {
            if (word == "SigBlk:" && status >> word)
                return std::stoull(word, nullptr, 16);
        }
        return 0;
    }

    /// Runs `check` in a forked process; its exit code, 0 for true.
    template <class Check>
    static int ExitCodeOfChild(const Check& check) {
        const pid_t child = fork();
        if (child == 0) {
            alarm(static_cast<unsigned>(PATIENCE.count()));
            _exit(check() ? 0 : 1);
        }
        int status = 0;
        if (waitpid(child, &status, 0) != child)
            return -1000;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
    }
};

/// Does a thing over and over on a thread of its own.
class Busy {
public:
    explicit Busy(std::function<void()> thing)
        : m_thread([this, thing = std::move(thing)] {
              do {
                  thing();
                  ++m_rounds;
              } while (!m_stop);
          }) {}
    ~Busy() {
        m_stop = true;
        m_thread.join();
    }

    int Rounds() const { return m_rounds; }

private:
    std::atomic<bool> m_stop{false};
    std::atomic<int> m_rounds{0};
    std::thread m_thread;
};

const CGRect FRAME{{20, 20}, {60, 40}};

} // namespace

FOR_EACH_WINDOW_SERVER(LifeContract);

TEST_P(LifeContract, ShowsNothingWhileItIsLost) {
    if (Server().GetLife().life != Life::Lost)
        NEEDS(m_desk->Lose());
    ASSERT_TRUE(Eventually([&] { return Server().GetLife().life == Life::Lost; }));
    EXPECT_TRUE(IsEmpty(Server()));
    m_desk->Release().reset();
}

TEST_P(LifeContract, TellsOfALossAndOfEveryDisplayThatIsRemovedByIt) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto display = m_desk->AddDisplay({160, 100});
    NEEDS(display);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*display).has_value(); }));
    const CGDirectDisplayID main = MainDisplay();
    const auto kept = Server().GetWindows();
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->Lose());
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(main, DisplayRemoved)));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*display, DisplayRemoved)));
    const std::vector<Notice> told = m_log->Notices();
    // The end of a process that goes with the server may be noticed before.
    const auto first = std::find_if(told.begin(), told.end(), [](const Notice& each) {
        return each.kind != NoticeKind::ApplicationEnded;
    });
    ASSERT_NE(first, told.end());
    EXPECT_EQ(first->kind, NoticeKind::LifeChanged) << "the loss itself comes first";
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *Application())), 0u)
        << "it hasn't ended";
    EXPECT_TRUE(IsEmpty(Server()));
    EXPECT_NE(kept->Find(*window), nullptr) << "a snapshot that was given out has changed";
}

TEST_P(LifeContract, ComesBackInAnotherEpochWithTheSameIds) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto display = m_desk->AddDisplay({160, 100});
    NEEDS(display);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*display).has_value(); }));
    const CGDirectDisplayID main = MainDisplay();
    const LifeState before = Server().GetLife();
    const std::uint64_t generation = Server().GetWindows()->Generation();
    const auto stream = Open(main);
    NEEDS(stream);
    EXPECT_EQ(before.life, Life::Alive);
    NEEDS(m_desk->Lose());
    ASSERT_TRUE(Eventually([&] { return Server().GetLife().life == Life::Lost; }));
    EXPECT_GE(Server().GetWindows()->Generation(), generation) << "it has gone back";
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->FindAgain());
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(main, DisplayAdded)));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*display, DisplayAdded)));
    EXPECT_EQ(m_log->Notices().front().kind, NoticeKind::LifeChanged) << "the return itself comes first";
    EXPECT_EQ(Server().GetLife().life, Life::Alive);
    EXPECT_GT(Server().GetLife().epoch, before.epoch);
    EXPECT_EQ(MainDisplay(), main);
    EXPECT_GT(Server().GetWindows()->Generation(), generation);
    EXPECT_EQ(stream->TakeNewest(SoonEnough()).outcome, PictureOutcome::Gone) << "it is of another epoch";
    if (!m_desk->WindowsOutliveALoss()) {
        EXPECT_EQ(Server().GetWindows()->Find(*window), nullptr) << "the id means another window";
        return;
    }
    ASSERT_TRUE(Eventually([&] { return Server().GetWindows()->Find(*window) != nullptr; }));
    EXPECT_NE(TakeWhenShown(*window, 0x00FF00), nullptr);
}

TEST_P(LifeContract, TellsAfterALossWhichApplicationsHaveEndedMeanwhile) {
    const auto stays = m_desk->StartApplication("Stays");
    const auto ends = m_desk->StartApplication("Ends");
    NEEDS(stays && ends);
    m_desk->Settle();
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->Lose());
    ASSERT_TRUE(m_log->WaitFor(NoticeKind::LifeChanged));
    NEEDS(m_desk->EndApplication(*ends));
    NEEDS(m_desk->FindAgain());
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *ends)));
    m_desk->Settle();
    // The desktop's own programs may end with it and be started again.
    EXPECT_EQ(m_log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *ends)), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *stays)), 0u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationLaunched, *stays)), 0u);
}

TEST_P(LifeContract, GivesTheLastStateAndNoPicturesWhileTheDesktopDoesNotAnswer) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->Stall());
    // What finds out first fails at its deadline, all others at once.
    WindowPictureRequest request = RequestFor({*window});
    request.deadline = CmSteadyNow() + std::chrono::milliseconds(100);
    const PictureOutcome first = Server().TakeWindowPicture(request).outcome;
    EXPECT_TRUE(first == PictureOutcome::Timeout || first == PictureOutcome::Lost);
    EXPECT_EQ(Server().GetLife().life, Life::Stalled);
    EXPECT_EQ(Server().TakeWindowPicture(RequestFor({*window})).outcome, PictureOutcome::Lost);
    EXPECT_EQ(stream->TakeNewest(SoonEnough()).outcome, PictureOutcome::Lost);
    EXPECT_NE(Server().GetWindows()->Find(*window), nullptr);
    EXPECT_FALSE(Server().GetDisplays()->empty());
    NEEDS(m_desk->Answer());
    EXPECT_TRUE(Eventually([&] { return Server().GetLife().life == Life::Alive; }));
    EXPECT_TRUE(m_log->WaitFor(NoticeKind::LifeChanged, 2));
    EXPECT_NE(TakeWhenShown(*window, 0x00FF00), nullptr);
    EXPECT_NE(Next(*stream), nullptr) << "it is still the same epoch";
}

TEST_P(LifeContract, TellsTheOldReceiverNothingMoreAndKeepsIt) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto pid = m_desk->StartApplication("Guest");
    NEEDS(pid);
    m_desk->Settle();
    auto old = std::make_shared<CNoticeLog>();
    Server().SetNoticeReceiver(old);
    Server().SetNoticeReceiver(m_log);
    EXPECT_EQ(old.use_count(), 1);
    NEEDS(m_desk->EndApplication(*pid));
    ASSERT_TRUE(m_log->WaitFor(NoticeKind::ApplicationEnded));
    EXPECT_TRUE(old->Notices().empty());
    m_log->Clear();
    Server().SetNoticeReceiver(nullptr);
    EXPECT_EQ(m_log.use_count(), 1);
    const auto other = m_desk->StartApplication("Other");
    NEEDS(other);
    m_desk->Settle();
    EXPECT_TRUE(m_log->Notices().empty());
}

TEST_P(LifeContract, TellsAReplacedReceiverNothingEvenWhileNoticesCome) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    const int rounds = 200 * TestEffort();
    std::cout << "rounds: " << rounds << ", no seed\n";
    const Busy reading([&] { stream->TakeNewest(SoonEnough()); });
    for (int i = 0; i < rounds; ++i) {
        auto old = std::make_shared<CNoticeLog>();
        Server().SetNoticeReceiver(old);
        m_desk->Recolour(*window, static_cast<std::uint32_t>(i));
        Server().SetNoticeReceiver(i % 2 == 0 ? m_log : nullptr);
        const std::size_t told = old->Notices().size();
        m_desk->Recolour(*window, static_cast<std::uint32_t>(i) | 0x010000);
        ASSERT_EQ(old->Notices().size(), told) << "round " << i;
    }
    Server().SetNoticeReceiver(nullptr);
}

TEST_P(LifeContract, JoinsItsThreadsWhenItRestsAndGoesOnAfterwards) {
    const std::ptrdiff_t before = CountThreadsOfProcess();
    Server().Rest();
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    Server().SetNoticeReceiver(m_log);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    ASSERT_NE(Next(*stream), nullptr);
    Server().Rest();
    EXPECT_TRUE(ThreadsComeDownTo(before));
    m_log->Clear();
    NEEDS(m_desk->Recolour(*window, 0x0000FF));
    EXPECT_TRUE(ReadUntil(*stream, {40, 40}, 0x0000FF));
    Server().Rest();
    Server().Rest();
    EXPECT_TRUE(ThreadsComeDownTo(before));
}

TEST_P(LifeContract, BlocksEverySignalOnItsThreads) {
    CountThreadsOfProcess();
    const std::set<std::string> before = Threads();
    Server().SetNoticeReceiver(m_log);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    ASSERT_NE(Next(*stream), nullptr);
    for (const std::string& thread : Threads()) {
        if (before.count(thread) != 0)
            continue;
        for (const int signal : {SIGINT, SIGTERM, SIGCHLD, SIGPIPE, SIGUSR1, SIGALRM, SIGPROF})
            EXPECT_NE(BlockedBy(thread) >> (signal - 1) & 1, 0u) << signal;
    }
}

TEST_P(LifeContract, IsLostForGoodInAForkedProcess) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "nobody frees the locks of a sanitizer's allocator over a fork";
    const auto window = AddWindow(FRAME, 0x00FF00);
    const CGDirectDisplayID display = MainDisplay();
    Server().SetNoticeReceiver(m_log);
    auto stream = Open(display);
    const int code = ExitCodeOfChild([&] {
        const bool empty = static_cast<bool>(IsEmpty(Server()));
        const bool none = stream == nullptr || stream->TakeNewest(SoonEnough()).outcome != PictureOutcome::Ok;
        Server().Rest();
        Server().SetNoticeReceiver(nullptr);
        stream.reset();
        m_desk->Release().reset();
        return empty && none;
    });
    EXPECT_EQ(code, 0);
    if (window) {
        EXPECT_NE(TakeWhenShown(*window, 0x00FF00), nullptr) << "the parent goes on";
    }
    if (stream != nullptr) {
        EXPECT_NE(Next(*stream), nullptr);
    }
}

TEST_P(LifeContract, HoldsNoLockOverAForkWhateverItsOtherThreadsDo) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "nobody frees the locks of a sanitizer's allocator over a fork";
    const auto window = AddWindow(FRAME, 0x00FF00);
    const CGWindowID id = window.value_or(1);
    const CGDirectDisplayID display = MainDisplay();
    Server().SetNoticeReceiver(m_log);
    const int forks = 10 * TestEffort();
    std::cout << "forks: " << forks << ", no seed\n";
    const Busy one([&] { UseAll(Server(), id, display); });
    const Busy other([&] { m_desk->Recolour(id, 0x0000FF); });
    for (int i = 0; i < forks; ++i) {
        WindowServer& server = Server();
        ASSERT_EQ(ExitCodeOfChild([&] {
                      const auto displays = server.GetDisplays();
                      const auto picture = server.TakeWindowPicture(RequestFor({id}));
                      server.Rest();
                      return server.GetLife().life == Life::Lost && displays->empty() &&
                             picture.outcome != PictureOutcome::Ok;
                  }),
                  0);
    }
}

TEST_P(LifeContract, StandsAnyOperationOnAnyThreadWhateverTheDesktopDoes) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    const CGWindowID id = window.value_or(1);
    const CGDirectDisplayID display = MainDisplay();
    // A desktop that is made of processes takes long to lose and to find.
    const int rounds = (m_desk->WindowsOutliveALoss() ? 300 : 40) * TestEffort();
    const unsigned seed = 20250321;
    std::cout << "rounds: " << rounds << ", seed: " << seed << "\n";
    WindowServer& server = Server();
    const Busy one([&] { UseAll(server, id, display); });
    const Busy other([&] { UseAll(server, id, display); });
    const Busy resting([&] {
        server.Rest();
        server.SetNoticeReceiver(m_log);
    });
    std::mt19937 random(seed);
    for (int i = 0; i < rounds || one.Rounds() < rounds / 10 || other.Rounds() < rounds / 10; ++i) {
        const auto number = static_cast<float>(random() % 50);
        switch (random() % 8) {
            case 0:
                m_desk->SetFrame(id, {{number, number}, {60, 40}});
                break;
            case 1:
                m_desk->Recolour(id, static_cast<std::uint32_t>(number));
                break;
            case 2:
                m_desk->Minimise(id);
                break;
            case 3:
                m_desk->Restore(id);
                break;
            case 4:
                m_desk->MovePointer({number, number});
                break;
            case 5:
                m_desk->ChangeCursor();
                break;
            case 6:
                m_desk->Lose();
                m_desk->FindAgain();
                break;
            default:
                m_desk->Resize(display, {200 + number, 120});
        }
    }
    EXPECT_TRUE(Eventually([&] { return resting.Rounds() > 0; }));
}

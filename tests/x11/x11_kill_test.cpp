// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_client.h"
#include "tests/support/sanitizer.h"
#include "tests/support/settings_scope.h"
#include "tests/support/test_effort.h"
#include "tests/x11/x11_fixture.h"

#include <malloc.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <iostream>
#include <iterator>
#include <thread>

/// X servers that die, come back, and stand still, while somebody captures them.

namespace {

using namespace platform;
using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

std::ptrdiff_t CountDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

std::size_t BytesInUse() {
    const auto heap = mallinfo2();
    return heap.uordblks + heap.hblkhd;
}

std::vector<CGDirectDisplayID> IdsOf(const DisplayList& displays) {
    std::vector<CGDirectDisplayID> ids;
    for (const DisplayInfo& display : displays)
        ids.push_back(display.id);
    return ids;
}

/// How long it takes, as somebody who waits for it would say.
template <class Action>
std::chrono::nanoseconds TimeOf(const Action& action) {
    const auto start = Clock::now();
    action();
    return Clock::now() - start;
}

class X11Kill : public X11Test {
protected:
    /// Captures on a thread of its own whatever there is, as fast as it goes, until it is destroyed.
    class Capturing {
    public:
        explicit Capturing(WindowServer& server) : m_thread([this, &server] { Run(server); }) {}
        ~Capturing() {
            m_end = true;
            m_thread.join();
        }
        int Pictures() const { return m_pictures; }
        int Streamed() const { return m_streamed; }

    private:
        void Run(WindowServer& server) {
            std::unique_ptr<DisplayStream> stream;
            while (!m_end) {
                const auto displays = server.GetDisplays();
                if (stream == nullptr && !displays->empty())
                    stream = server.OpenDisplayStream({displays->front().id, 1000, true}).stream;
                if (stream != nullptr)
                    Read(stream);
                WindowPictureRequest request;
                const auto windows = server.GetWindows();
                for (const WindowInfo& window : windows->Windows())
                    request.windows.push_back(window.id);
                request.rect = {{0, 0}, {4000, 4000}};
                request.deadline = CmSteadyNow() + 1s;
                m_pictures += server.TakeWindowPicture(request).outcome == PictureOutcome::Ok ? 1 : 0;
                server.GetCursor();
                CGPoint position;
                server.GetPointerPosition(position);
            }
        }
        void Read(std::unique_ptr<DisplayStream>& stream) {
            const PictureOutcome outcome = stream->TakeNewest(CmSteadyNow() + 1s).outcome;
            m_streamed += outcome == PictureOutcome::Ok ? 1 : 0;
            if (outcome == PictureOutcome::Gone)
                stream.reset();
        }

        std::atomic<bool> m_end{false};
        std::atomic<int> m_pictures{0};
        std::atomic<int> m_streamed{0};
        std::thread m_thread;
    };

    bool Becomes(Life life) {
        return ComesTrue([this, life] { return Server().GetLife().life == life; });
    }

    /// Loses the server and has it back, and captures on.
    void LoseAndFind(const Capturing& capturing) {
        Desk().Lose();
        ASSERT_TRUE(Becomes(Life::Lost));
        Desk().FindAgain();
        ASSERT_TRUE(Becomes(Life::Alive));
        ASSERT_TRUE(Application().Create("again", "50 50 100 100 00ff00"));
        const int pictures = capturing.Pictures();
        const int streamed = capturing.Streamed();
        EXPECT_TRUE(ComesTrue([&] {
            return capturing.Pictures() > pictures + 1 && capturing.Streamed() > streamed;
        })) << "nothing is captured any more";
    }
};

/// Has a window server be the one in force.
class CInForce {
public:
    explicit CInForce(const std::shared_ptr<WindowServer>& server) : m_former(ReplaceWindowServer(server)) {}
    ~CInForce() { ReplaceWindowServer(m_former); }
    CInForce(const CInForce&) = delete;
    CInForce& operator=(const CInForce&) = delete;

private:
    const std::shared_ptr<WindowServer> m_former;
};

} // namespace

TEST_F(X11Kill, IsSurvivedOverAndOverWithoutAnythingLeftBehind) {
    if (!Begin({{.width = 320, .height = 240}}))
        return;
    const int rounds = TestEffort() > 1 ? 100 : 3;
    const auto displays = IdsOf(*Server().GetDisplays());
    std::ptrdiff_t descriptors = 0;
    std::size_t bytes = 0;
    {
        const Capturing capturing(Server());
        for (int i = 0; i < 2; ++i)
            LoseAndFind(capturing); // what is made only once is made
    }
    Server().Rest();
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    descriptors = CountDescriptors();
    bytes = BytesInUse();
    int pictures = 0;
    {
        const Capturing capturing(Server());
        for (int i = 0; i < rounds && !HasFatalFailure(); ++i) {
            LoseAndFind(capturing);
            EXPECT_EQ(IdsOf(*Server().GetDisplays()), displays) << "round " << i;
        }
        pictures = capturing.Pictures() + capturing.Streamed();
    }
    Server().Rest();
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    EXPECT_EQ(CountDescriptors(), descriptors);
    const auto grown = static_cast<std::ptrdiff_t>(BytesInUse()) - static_cast<std::ptrdiff_t>(bytes);
    if (SCREENSHARE_TEST_SANITIZED == 0) {
        EXPECT_LT(grown, 100000 + 2000 * rounds);
    }
    std::cout << "kills: " << rounds << ", pictures: " << pictures << ", threads: " << threads
              << ", descriptors: " << descriptors << ", bytes more: " << grown << "\n";
}

TEST_F(X11Kill, OfAServerThatStandsStillEndsEverythingAtItsDeadline) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "50 50 100 100 00ff00");
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    const LifeState before = Server().GetLife();
    const auto duration = TestEffort() > 1 ? 5s : 2s;
    Desk().Stall();
    WindowPictureRequest request;
    request.windows = {window};
    request.rect = {{0, 0}, {4000, 4000}};
    request.deadline = CmSteadyNow() + 200ms;
    EXPECT_LT(TimeOf([&] { EXPECT_EQ(Server().TakeWindowPicture(request).picture, nullptr); }), 1s);
    EXPECT_EQ(Server().GetLife().life, Life::Stalled);
    int calls = 0;
    int waited = 0;
    std::chrono::nanoseconds longest{0};
    for (const auto end = Clock::now() + duration; Clock::now() < end; ++calls) {
        const auto took = TimeOf([&] {
            EXPECT_NE(Server().GetWindows()->Find(window), nullptr);
            EXPECT_FALSE(Server().GetDisplays()->empty());
            request.deadline = CmSteadyNow() + 10s;
            EXPECT_EQ(Server().TakeWindowPicture(request).outcome, PictureOutcome::Lost);
        });
        longest = std::max(longest, std::chrono::nanoseconds(took));
        waited += took > 500ms ? 1 : 0;
        std::this_thread::yield();
    }
    // One call may have found the machine busy; who waits does it each second at the latest.
    EXPECT_LE(waited, 1) << "somebody has waited for a server that is known not to answer";
    Desk().Answer();
    EXPECT_TRUE(Becomes(Life::Alive));
    EXPECT_EQ(Server().GetLife().epoch, before.epoch) << "it was never gone";
    EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
    std::cout << "calls meanwhile: " << calls << ", the longest took "
              << std::chrono::duration_cast<std::chrono::microseconds>(longest).count() << " us\n";
}

TEST_F(X11Kill, OfAStoppedServerIsWaitedForByNobodyWhoEnds) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "50 50 100 100 00ff00");
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    Desk().Stall();
    EXPECT_LT(TimeOf([this] { Server().Rest(); }), 3s);
    EXPECT_LT(TimeOf([this] { Desk().Release().reset(); }), 3s);
    EXPECT_LT(WaitForThreadsOfProcess(threads - 1), threads) << "its thread is still there";
    Desk().Answer();
}

TEST_F(X11Kill, OfAServerThatNeverAnswersIsNoReasonToWaitForItsGreeting) {
    if (!Begin())
        return;
    Desk().Stall();
    EXPECT_LT(TimeOf([this] { EXPECT_TRUE(Server().GetDisplays()->empty()); }), 3s);
    EXPECT_LT(TimeOf([this] { Server().Rest(); }), 3s);
    Desk().Answer();
    EXPECT_TRUE(ComesTrue([this] { return !Server().GetDisplays()->empty(); }));
}

TEST_F(X11Kill, LetsAnEngineBeStoppedInTimeAndShareOnAfterwards) {
    if (!Begin())
        return;
    const CSettingsScope settings;
    const CInForce inForce(std::shared_ptr<WindowServer>(&Server(), [](WindowServer*) {}));
    const CGDirectDisplayID display = Server().GetDisplays()->front().id;
    for (const bool stops : {false, true}) {
        CShareClient client;
        client.ShareMonitor(display);
        client.Start();
        ASSERT_TRUE(client.sink.WaitForFrames(1));
        if (stops)
            Desk().Stall();
        else
            Desk().Lose();
        // Passes run into it.
        ASSERT_TRUE(ComesTrue([this] { return Server().GetLife().life != Life::Alive; }));
        EXPECT_LT(TimeOf([&] { EXPECT_EQ(client->Stop(), 0); }), 3s) << (stops ? "stopped" : "killed");
        if (stops)
            Desk().Answer();
        else
            Desk().FindAgain();
        ASSERT_TRUE(Becomes(Life::Alive));
        client.sink.Clear();
        EXPECT_EQ(client->Start(), 0);
        EXPECT_TRUE(client.sink.WaitForFrames(1))
            << "it doesn't share on; it has told " << testing::PrintToString(client.sink.Notices());
    }
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/support/sanitizer.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>
#include <malloc.h>

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <functional>
#include <iostream>
#include <iterator>
#include <vector>

// A share that runs all day.

using namespace platform;

namespace {

using namespace std::chrono_literals;

constexpr int WARM_UP = 500;
constexpr int PASSES = 10'000;
/// What allocators keep aside for threads may still grow a little. Losing the smallest block at every
/// twentieth pass would come to more.
constexpr std::ptrdiff_t TOLERATED = 16 * 1024;

/// Bytes in use, all arenas together.
std::ptrdiff_t MemoryInUse() {
    const struct mallinfo2 info = mallinfo2();
    return static_cast<std::ptrdiff_t>(info.uordblks + info.hblkhd);
}

std::ptrdiff_t CountOpenFiles() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

/// Takes frames and keeps nothing of them.
class CountingSink final : public IShareCaptureEngineSink {
public:
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame*, TVLRect&) override {
        ++frames;
        if (hook)
            hook();
    }
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    int frames = 0; // the worker's; the test looks when that is settled
    std::function<void()> hook;
};

class DesktopShareMemory : public testing::Test {
protected:
    void SetUp() override {
        if (SCREENSHARE_TEST_SANITIZED)
            GTEST_SKIP() << "a sanitizer allocates in our place";
        ConformanceDesk& desk = shareDesk.Desk();
        const pid_t kept = desk.StartApplication("Kept").value_or(0);
        secrets = desk.StartApplication("Secrets").value_or(0);
        desk.AddWindow(kept, {{0, 0}, {90, 70}}, 0x0000FF);
        window = desk.AddWindow(kept, {{20, 20}, {40, 30}}, 0x00FF00).value_or(0);
        secret = desk.AddWindow(secrets, {{30, 30}, {60, 40}}, 0xFF0000).value_or(0);
        EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(secrets)), 0);
        EXPECT_EQ(client->SelectSharedDisplay(CGMainDisplayID()), 0);
        EXPECT_EQ(client->SetCaptureMaxFrameSize(50, 40), 0);
        EXPECT_EQ(client->SetSink(&sink), 0);
        EXPECT_EQ(client->Start(), 0);
    }
    void TearDown() override { EXPECT_EQ(client->SetSink(nullptr), 0); }

    /// How much more memory is in use after so many passes than after the first ones.
    std::ptrdiff_t Growth(const std::function<void(int)>& pass) {
        std::ptrdiff_t before = 0;
        for (int i = 0; i < WARM_UP + PASSES; ++i) {
            if (i == WARM_UP)
                before = MemoryInUse();
            pass(i);
            shareDesk.Run(*client, 200ms);
        }
        const std::ptrdiff_t growth = MemoryInUse() - before;
        std::cout << PASSES << " passes, " << sink.frames << " frames, " << growth << " bytes more\n";
        return growth;
    }

    CSettingsScope settings;
    SimulatedShareDesk shareDesk;
    CountingSink sink;
    CShareClient client;
    pid_t secrets = 0;
    CGWindowID window = 0;
    CGWindowID secret = 0;
};

} // namespace

TEST_F(DesktopShareMemory, DoesNotGrowWhileNothingHappens) {
    EXPECT_LT(Growth([](int) {}), TOLERATED);
    EXPECT_EQ(sink.frames, WARM_UP + PASSES);
}

TEST_F(DesktopShareMemory, DoesNotGrowWhileWindowsAndWhatIsKeptOutChange) {
    ConformanceDesk& desk = shareDesk.Desk();
    const std::ptrdiff_t files = CountOpenFiles();
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    const std::ptrdiff_t growth = Growth([&](int pass) {
        const auto step = static_cast<float>(pass / 10 % 20);
        if (pass % 10 == 0)
            desk.SetFrame(pass % 20 == 0 ? window : secret, {{step, step}, {40, 30}});
        if (pass % 50 == 25)
            client->RemoveUnSharedProcess(static_cast<unsigned>(secrets));
        if (pass % 50 == 45)
            client->AddUnSharedProcess(static_cast<unsigned>(secrets));
        if (pass % 40 == 0)
            desk.MovePointer({step, step});
        if (pass % 100 == 0)
            client->SetCaptureMaxFrameSize(pass % 200 == 0 ? 50 : 60, 40);
    });
    EXPECT_LT(growth, TOLERATED);
    EXPECT_GT(sink.frames, PASSES / 4);
    EXPECT_LT(sink.frames, PASSES) << "no drag in all that";
    EXPECT_EQ(CountOpenFiles(), files);
    EXPECT_EQ(CountThreadsOfProcess(), threads);
}

TEST_F(DesktopShareMemory, IsSeenToGrowWhenEachFrameCostsTheSmallestBlock) {
    std::vector<std::unique_ptr<char>> lost;
    lost.reserve(WARM_UP + PASSES);
    sink.hook = [&] { lost.push_back(std::make_unique<char>()); };
    EXPECT_GT(Growth([](int) {}), TOLERATED);
    EXPECT_EQ(client->Stop(), 0);
}

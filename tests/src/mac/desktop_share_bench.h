// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/scene.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>

/// A share on a simulated desktop that the test changes itself, on a clock that stands still. For what hangs
/// on exact times, or on failures that no other desktop can be made to have. What must not be seen is pure
/// red, and nothing else has any red.
class DesktopShareBench : public testing::Test {
protected:
    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr pid_t DESKTOP = 5'000'001;
    static constexpr pid_t EDITOR = 5'000'100;
    static constexpr pid_t SECRETS = 5'000'200;
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr std::uint32_t TEAL = 0x008080;

    static constexpr platform::CGWindowID WALLPAPER = 2;
    static constexpr platform::CGWindowID EDITOR_WINDOW = 3;
    static constexpr platform::CGWindowID SECRET_WINDOW = 4;
    static constexpr platform::CGWindowID SECRET_OF_EDITOR = 5;

    /// On the side display: a wallpaper, a text, a secret in front of a part of it, and another one of the
    /// editor's own.
    static platform::Scene SecretDesk(platform::PixelFormat wallpaper = platform::PixelFormat::BGRX) {
        return platform::Scene()
            .Display(0, 0, 200, 120)
            .Display(200, 0, 100, 60)
            .App(DESKTOP, "Desktop")
            .Window(1)
            .At(0, 0, 200, 120)
            .Colour(TEAL)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .Window(WALLPAPER)
            .At(200, 0, 100, 60)
            .Colour(BLUE)
            .Format(wallpaper)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .App(EDITOR, "Editor")
            .Window(EDITOR_WINDOW)
            .At(210, 10, 40, 20)
            .Colour(GREEN)
            .Pointer(1000, 1000)
            .App(SECRETS, "Secrets")
            .Window(SECRET_WINDOW)
            .At(230, 20, 30, 20)
            .Colour(RED)
            .App(EDITOR, "Editor")
            .Window(SECRET_OF_EDITOR)
            .At(280, 40, 10, 10)
            .Colour(RED);
    }

    void KeepSecrets() {
        EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(SECRETS)), 0);
        EXPECT_EQ(client->AddUnSharedWindow(SECRET_OF_EDITOR), 0);
    }
    void ShareSideWithoutSecrets() {
        client.ShareMonitor(SIDE);
        KeepSecrets();
        client.Start();
    }
    void SettleWorker() { Settle(*WorkerOf(*client)); }
    void Advance(std::chrono::milliseconds time) {
        clock->Advance(time);
        SettleWorker();
    }
    /// Periods of 200 ms, the rate of an engine that nobody has told another.
    void Tick(int count = 1) {
        for (int i = 0; i < count; ++i)
            Advance(std::chrono::milliseconds(200));
    }
    /// Long enough for windows that moved to be at rest.
    void TickUntilRest() { Tick(5); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{SecretDesk()};
    CShareClient client;
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/x11_window_server.h"
#include "tests/platform/conformance_checks.h"
#include "tests/support/threads.h"
#include "tests/x11/x11_desk.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <pthread.h>

#include <csignal>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// What threads of the library's own are like: a connection that breaks under them doesn't end the process.
class CBrokenPipeBlocked {
public:
    CBrokenPipeBlocked() {
        sigset_t pipe;
        sigemptyset(&pipe);
        sigaddset(&pipe, SIGPIPE);
        pthread_sigmask(SIG_BLOCK, &pipe, &m_former);
    }
    ~CBrokenPipeBlocked() { pthread_sigmask(SIG_SETMASK, &m_former, nullptr); }
    CBrokenPipeBlocked(const CBrokenPipeBlocked&) = delete;
    CBrokenPipeBlocked& operator=(const CBrokenPipeBlocked&) = delete;

private:
    sigset_t m_former{};
};

/// An X server with one application on it, and the window server that is tested.
class X11Test : public testing::Test {
protected:
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr std::uint32_t RED = 0xFF0000; ///< Only what must not be seen is of this colour.

    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin(const X11DeskOptions& options = {}) {
        if (const auto missing = MissingProgram(options.Programs())) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        m_desk.emplace(options);
        m_application = m_desk->StartApplication("Case").value_or(0);
        return true;
    }

    X11Desk& Desk() { return *m_desk; }
    platform::WindowServer& Server() { return m_desk->Server(); }
    X11Client& Application() { return *m_desk->Application(m_application); }
    pid_t Pid() const { return m_application; }

    /// A window of the application's, listed already. See x11_client for the options.
    platform::CGWindowID Add(const std::string& name, const std::string& placeColourAndOptions) {
        const auto id = Application().Create(name, placeColourAndOptions);
        EXPECT_TRUE(id) << name;
        EXPECT_TRUE(ComesTrue([&] { return Server().GetWindows()->Find(id.value_or(0)) != nullptr; }))
            << name << " isn't listed";
        return id.value_or(0);
    }

    platform::WindowInfo Listed(platform::CGWindowID id) {
        const auto windows = Server().GetWindows();
        const platform::WindowInfo* const found = windows->Find(id);
        return found != nullptr ? *found : platform::WindowInfo();
    }

    platform::WindowPictureResult Take(std::vector<platform::CGWindowID> windows) {
        platform::WindowPictureRequest request;
        request.windows = std::move(windows);
        request.rect = {{-40000, -40000}, {80000, 80000}};
        request.deadline = CmSteadyNow() + PATIENCE;
        return Server().TakeWindowPicture(request);
    }

    /// The picture of one window, when there is one.
    platform::PicturePtr TakeOne(platform::CGWindowID window) {
        const auto picture = Take({window}).picture;
        return picture != nullptr && picture->layers.size() == 1 ? picture->layers[0].picture : nullptr;
    }

    /// Its picture once it is of nothing but that colour; null when it never is.
    platform::PicturePtr TakeWhenShown(platform::CGWindowID window, std::uint32_t rgb) {
        platform::PicturePtr picture;
        const bool shown = ComesTrue([&] {
            picture = TakeOne(window);
            return picture != nullptr && Shows(*picture, rgb);
        });
        return shown ? picture : nullptr;
    }

private:
    std::optional<X11Desk> m_desk;
    pid_t m_application = 0;
};

/// How many pixels of a picture have that colour, whatever their alpha.
inline int CountPixels(const platform::Picture& picture, std::uint32_t rgb) {
    int count = 0;
    for (int y = 0; y < picture.height; ++y) {
        for (int x = 0; x < picture.width; ++x)
            count += (ArgbAt(picture, x, y) & 0xFFFFFFU) == rgb ? 1 : 0;
    }
    return count;
}

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "tests/platform/conformance_checks.h"
#include "tests/platform/conformance_desk.h"
#include "tests/platform/notice_log.h"
#include "tests/support/threads.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

/// Leaves a case whose desktop can't do a thing. A function couldn't: it is the case that has to return.
#define NEEDS(thing)                                            \
    if (!(thing)) {                                             \
        if (m_desk->CanDoAll())                                 \
            FAIL() << "this desktop should be able to " #thing; \
        GTEST_SKIP() << "this desktop can't: " #thing;          \
    }

inline void PrintTo(const ConformanceKind& kind, std::ostream* out) {
    *out << kind.name;
}

/// What a window server promises, whichever it is. The contract stands in platform/window_server.h.
class WindowServerContract : public testing::TestWithParam<ConformanceKind> {
protected:
    WindowServerContract() : m_desk(GetParam().make()), m_log(std::make_shared<CNoticeLog>()) {}

    void SetUp() override {
        if (m_desk == nullptr)
            GTEST_SKIP() << "this machine lacks what it takes";
    }

    platform::WindowServer& Server() { return m_desk->Server(); }

    /// Whether it comes to pass, in real time.
    static bool Eventually(const std::function<bool()>& condition) {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (!condition()) {
            if (std::chrono::steady_clock::now() >= deadline)
                return false;
            std::this_thread::yield();
        }
        return true;
    }

    /// An application of the case's own.
    std::optional<pid_t> Application() {
        if (!m_application)
            m_application = m_desk->StartApplication("Case");
        return m_application;
    }

    /// A window that the server lists already.
    std::optional<platform::CGWindowID> AddWindow(const platform::CGRect& frame, std::uint32_t rgb) {
        const std::optional<pid_t> pid = Application();
        if (!pid)
            return std::nullopt;
        const auto id = m_desk->AddWindow(*pid, frame, rgb);
        if (id) {
            EXPECT_TRUE(Eventually([&] { return Server().GetWindows()->Find(*id) != nullptr; }));
        }
        return id;
    }

    /// The window as it is listed now; an empty one when it isn't.
    platform::WindowInfo Listed(platform::CGWindowID id) {
        const auto windows = Server().GetWindows();
        const platform::WindowInfo* const found = windows->Find(id);
        return found != nullptr ? *found : platform::WindowInfo();
    }

    platform::CGDirectDisplayID MainDisplay() {
        const auto displays = Server().GetDisplays();
        return displays->empty() ? 0 : displays->front().id;
    }

    std::optional<platform::DisplayInfo> ListedDisplay(platform::CGDirectDisplayID id) {
        const auto displays = Server().GetDisplays();
        for (const platform::DisplayInfo& display : *displays) {
            if (display.id == id)
                return display;
        }
        return std::nullopt;
    }

    static std::chrono::nanoseconds SoonEnough() { return CmSteadyNow() + PATIENCE; }

    static platform::WindowPictureRequest RequestFor(std::vector<platform::CGWindowID> windows) {
        platform::WindowPictureRequest request;
        request.windows = std::move(windows);
        request.rect = {{-10000, -10000}, {30000, 30000}};
        request.deadline = SoonEnough();
        return request;
    }

    /// Checked. Asks again while the stack doesn't hold still.
    platform::WindowPictureResult Take(const platform::WindowPictureRequest& request) {
        platform::WindowPictureResult result;
        EXPECT_TRUE(Eventually([&] {
            result = Server().TakeWindowPicture(request);
            return result.outcome != platform::PictureOutcome::Stale;
        }));
        EXPECT_EQ(result.picture != nullptr, result.outcome == platform::PictureOutcome::Ok);
        const auto snapshot = Server().GetWindows();
        if (result.picture != nullptr) {
            EXPECT_TRUE(IsLawful(*result.picture, request, *snapshot));
        }
        return result;
    }

    /// The picture of one window that shows nothing but that colour; null when it never comes.
    std::shared_ptr<const platform::WindowPicture> TakeWhenShown(platform::CGWindowID window,
                                                                 std::uint32_t rgb) {
        std::shared_ptr<const platform::WindowPicture> shown;
        EXPECT_TRUE(Eventually([&] {
            shown = Take(RequestFor({window})).picture;
            return shown != nullptr && shown->layers.size() == 1 && Shows(*shown->layers[0].picture, rgb);
        }));
        return shown;
    }

    std::unique_ptr<platform::DisplayStream> Open(platform::CGDirectDisplayID display,
                                                  bool withPointer = false) {
        platform::DisplayStreamRequest request;
        request.display = display;
        request.framesPerSecond = 1000;
        request.withPointer = withPointer;
        platform::DisplayStreamResult result = Server().OpenDisplayStream(request);
        EXPECT_EQ(result.stream != nullptr, result.outcome == platform::PictureOutcome::Ok);
        return std::move(result.stream);
    }

    /// The next picture; null when none comes.
    static platform::PicturePtr Next(platform::DisplayStream& stream) {
        platform::DisplayPictureResult result;
        EXPECT_TRUE(Eventually([&] {
            result = stream.TakeNewest(SoonEnough());
            return result.outcome == platform::PictureOutcome::Ok;
        }));
        if (result.picture != nullptr) {
            EXPECT_TRUE(IsLawful(*result.picture));
        }
        return result.picture;
    }

    /// Reads until a point of the desktop has that colour.
    static bool ReadUntil(platform::DisplayStream& stream, const platform::CGPoint& point,
                          std::uint32_t rgb) {
        return Eventually([&] {
            const platform::DisplayPictureResult result = stream.TakeNewest(SoonEnough());
            return result.picture != nullptr && ArgbAtPoint(*result.picture, point) == (0xFF000000U | rgb);
        });
    }

    /// That nothing is to be had, as long as the server is lost.
    static testing::AssertionResult IsEmpty(platform::WindowServer& server) {
        if (server.GetLife().life != platform::Life::Lost)
            return testing::AssertionFailure() << "it isn't lost";
        if (!server.GetDisplays()->empty() || !server.GetWindows()->Windows().empty() ||
            !server.GetApplications()->empty() || server.GetCursor() != nullptr)
            return testing::AssertionFailure() << "it still shows something";
        platform::CGPoint position{3, 4};
        if (server.GetPointerPosition(position) || position != platform::CGPoint{3, 4})
            return testing::AssertionFailure() << "it still has a pointer";
        const auto picture = server.TakeWindowPicture(RequestFor({1, 2, 3}));
        const auto stream = server.OpenDisplayStream({.display = 1});
        if (picture.outcome == platform::PictureOutcome::Ok || picture.picture != nullptr ||
            stream.outcome == platform::PictureOutcome::Ok || stream.stream != nullptr)
            return testing::AssertionFailure() << "it still gives pictures";
        if (server.BringToFront(1))
            return testing::AssertionFailure() << "it still brings something to the front";
        return testing::AssertionSuccess();
    }

    const std::unique_ptr<ConformanceDesk> m_desk;
    const std::shared_ptr<CNoticeLog> m_log;

private:
    std::optional<pid_t> m_application;
};

/// Each of the files with cases has its own suite of them.
#define FOR_EACH_WINDOW_SERVER(suite)                          \
    INSTANTIATE_TEST_SUITE_P(                                  \
        Servers, suite, testing::ValuesIn(ConformanceKinds()), \
        [](const testing::TestParamInfo<ConformanceKind>& kind) { return std::string(kind.param.name); })

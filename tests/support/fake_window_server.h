// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <sys/types.h>
#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// A window server that has what a test gives it. Whatever is set shows at once and raises no notice: a test
/// that wants one raises it, as it likes.
/// Threads: any.
class CFakeWindowServer : public platform::WindowServer {
public:
    /// How often each operation was called.
    struct Calls {
        std::atomic<int> displays{0};
        std::atomic<int> windows{0};
        std::atomic<int> applications{0};
        std::atomic<int> pointer{0};
        std::atomic<int> cursor{0};
        std::atomic<int> pictures{0};
        std::atomic<int> streams{0};
        std::atomic<int> rests{0};
        std::atomic<int> receivers{0};
        std::atomic<int> bringToFront{0};
    };

    // ---- What a test sets

    void SetDisplays(platform::DisplayList displays) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_displays = std::make_shared<const platform::DisplayList>(std::move(displays));
    }

    /// The front one first.
    void SetWindows(std::vector<platform::WindowInfo> windows) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_windows = std::make_shared<const platform::WindowSnapshot>(++m_generation, std::move(windows));
    }

    void SetApplications(platform::ApplicationList applications) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_applications = std::make_shared<const platform::ApplicationList>(std::move(applications));
    }

    void SetPointer(std::optional<platform::CGPoint> position) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_pointer = position;
    }

    void SetCursor(std::shared_ptr<const platform::CursorImage> cursor) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_cursor = std::move(cursor);
    }

    /// A server that gets lost keeps its lists for its return and shows none of them meanwhile.
    void SetLife(platform::Life life) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_life.life == platform::Life::Lost && life != platform::Life::Lost)
            ++m_life.epoch;
        m_life.life = life;
    }

    void SetCanBringToFront(bool can) { m_canBringToFront = can; }

    /// What pictures show; none are to be had while there is no function. Called with no lock held.
    using TakePicture =
        std::function<platform::WindowPictureResult(const platform::WindowPictureRequest& request)>;
    void SetTakePicture(TakePicture take) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_takePicture = std::move(take);
    }

    // ---- What a test does and sees

    /// Tells the receiver, as real servers do, under a lock.
    void Raise(const platform::Notice& notice) {
        const std::lock_guard<std::mutex> lock(m_receiverMutex);
        if (m_receiver != nullptr)
            m_receiver->OnNotice(notice);
    }

    void RaiseDisplayChanged(platform::CGDirectDisplayID display, unsigned flags) {
        platform::Notice notice;
        notice.kind = platform::NoticeKind::DisplayChanged;
        notice.display = display;
        notice.flags = flags;
        Raise(notice);
    }

    void RaiseApplication(platform::NoticeKind launchedOrEnded, pid_t pid) {
        platform::Notice notice;
        notice.kind = launchedOrEnded;
        notice.pid = pid;
        Raise(notice);
    }

    bool HasReceiver() const {
        const std::lock_guard<std::mutex> lock(m_receiverMutex);
        return m_receiver != nullptr;
    }

    std::vector<pid_t> BroughtToFront() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_broughtToFront;
    }

    mutable Calls calls;

    // ---- WindowServer

    const char* Name() const override { return "fake"; }

    platform::LifeState GetLife() const override {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_life;
    }

    platform::Availability GetCapability(platform::Capability) const override {
        return platform::Availability::Yes;
    }

    platform::Permission GetPermission() const override { return platform::Permission::NotNeeded; }
    void AskPermission() override {}

    void SetNoticeReceiver(std::shared_ptr<platform::NoticeReceiver> receiver) override {
        ++calls.receivers;
        const std::lock_guard<std::mutex> lock(m_receiverMutex);
        m_receiver.swap(receiver);
    }

    std::shared_ptr<const platform::DisplayList> GetDisplays() const override {
        ++calls.displays;
        return Shown(m_displays);
    }

    std::shared_ptr<const platform::WindowSnapshot> GetWindows() const override {
        ++calls.windows;
        return Shown(m_windows);
    }

    std::shared_ptr<const platform::ApplicationList> GetApplications() const override {
        ++calls.applications;
        return Shown(m_applications);
    }

    bool GetPointerPosition(platform::CGPoint& position) const override {
        ++calls.pointer;
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (!m_pointer || m_life.life == platform::Life::Lost)
            return false;
        position = *m_pointer;
        return true;
    }

    std::shared_ptr<const platform::CursorImage> GetCursor() const override {
        ++calls.cursor;
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_life.life == platform::Life::Lost ? nullptr : m_cursor;
    }

    platform::WindowPictureResult TakeWindowPicture(const platform::WindowPictureRequest& request) override {
        ++calls.pictures;
        TakePicture take;
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            if (m_life.life != platform::Life::Alive)
                return {platform::PictureOutcome::Lost, nullptr};
            take = m_takePicture;
        }
        return take ? take(request)
                    : platform::WindowPictureResult{platform::PictureOutcome::Unsupported, nullptr};
    }

    platform::DisplayStreamResult OpenDisplayStream(const platform::DisplayStreamRequest&) override {
        ++calls.streams;
        return {platform::PictureOutcome::Unsupported, nullptr};
    }

    void Rest() override { ++calls.rests; }

    bool BringToFront(pid_t pid) override {
        ++calls.bringToFront;
        if (!m_canBringToFront)
            return false;
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_broughtToFront.push_back(pid);
        return true;
    }

private:
    template <class List>
    std::shared_ptr<const List> Shown(const std::shared_ptr<const List>& list) const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_life.life == platform::Life::Lost ? std::make_shared<const List>() : list;
    }

    mutable std::mutex m_mutex; // guards all but the receiver
    platform::LifeState m_life{platform::Life::Alive, 1};
    std::uint64_t m_generation = 1;
    std::shared_ptr<const platform::DisplayList> m_displays = std::make_shared<const platform::DisplayList>();
    std::shared_ptr<const platform::WindowSnapshot> m_windows =
        std::make_shared<const platform::WindowSnapshot>(1, std::vector<platform::WindowInfo>());
    std::shared_ptr<const platform::ApplicationList> m_applications =
        std::make_shared<const platform::ApplicationList>();
    std::optional<platform::CGPoint> m_pointer;
    std::shared_ptr<const platform::CursorImage> m_cursor;
    TakePicture m_takePicture;
    std::vector<pid_t> m_broughtToFront;
    std::atomic<bool> m_canBringToFront{true};

    mutable std::mutex m_receiverMutex;
    std::shared_ptr<platform::NoticeReceiver> m_receiver; // guarded by m_receiverMutex
};

/// Puts a fake window server in force for the length of a scope.
class CFakeWindowServerScope {
public:
    CFakeWindowServerScope()
        : m_server(std::make_shared<CFakeWindowServer>()),
          m_former(platform::ReplaceWindowServer(m_server)) {}
    ~CFakeWindowServerScope() { platform::ReplaceWindowServer(m_former); }
    CFakeWindowServerScope(const CFakeWindowServerScope&) = delete;
    CFakeWindowServerScope& operator=(const CFakeWindowServerScope&) = delete;

    CFakeWindowServer& operator*() const { return *m_server; }
    CFakeWindowServer* operator->() const { return m_server.get(); }
    const std::shared_ptr<CFakeWindowServer>& Share() const { return m_server; }

private:
    const std::shared_ptr<CFakeWindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
};

// ---- What a test puts on the desktop

inline platform::DisplayInfo FakeDisplay(platform::CGDirectDisplayID id, const platform::CGRect& bounds,
                                         float scale = 1.0F, std::string name = "Display") {
    platform::DisplayInfo display;
    display.id = id;
    display.bounds = bounds;
    display.visibleBounds = bounds;
    display.scale = scale;
    display.productName = std::move(name);
    return display;
}

inline platform::WindowInfo FakeWindow(platform::CGWindowID id, pid_t owner, const platform::CGRect& frame,
                                       int level = 0) {
    platform::WindowInfo window;
    window.id = id;
    window.owner = owner;
    window.level = level;
    window.frame = frame;
    return window;
}

inline platform::ApplicationInfo FakeApplication(pid_t pid, std::string name) {
    platform::ApplicationInfo application;
    application.pid = pid;
    application.name = name;
    application.fileName = std::move(name);
    return application;
}

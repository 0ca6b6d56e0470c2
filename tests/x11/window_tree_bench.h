// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/window_tree.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_handshake.h"
#include "tests/x11/x11_rig.h"
#include "util/cm_clock.h"

#include <sys/types.h>
#include <xcb/shape.h>
#include <xcb/xcb.h>

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

/// A mirror of a server's windows, without the thread and the pictures that go with it elsewhere.

/// Follows what a watcher is told, and whether it makes sense.
class WatcherModel final : public platform::x11::TopLevelWatcher {
public:
    struct Seen {
        bool mapped = false;
        int width = 0;
        int height = 0;
        int renewals = 0;
    };

    void OnAdded(const platform::x11::TopLevel& window) override {
        wrong += seen.count(window.window) != 0 ? 1 : 0;
        seen[window.window] = {window.mapped, window.StorageWidth(), window.StorageHeight(), 0};
    }
    void OnStorageRenewed(const platform::x11::TopLevel& window, unsigned) override {
        Seen* const known = Find(window);
        if (known == nullptr)
            return;
        known->mapped = window.mapped;
        known->width = window.StorageWidth();
        known->height = window.StorageHeight();
        ++known->renewals;
    }
    void OnUnmapped(const platform::x11::TopLevel& window) override {
        if (Seen* const known = Find(window))
            known->mapped = false;
    }
    void OnGone(const platform::x11::TopLevel& window) override {
        if (Find(window) != nullptr)
            seen.erase(window.window);
    }

    std::map<xcb_window_t, Seen> seen;
    int wrong = 0; ///< Calls that make no sense.

private:
    Seen* Find(const platform::x11::TopLevel& window) {
        const auto found = seen.find(window.window);
        wrong += found == seen.end() ? 1 : 0;
        return found != seen.end() ? &found->second : nullptr;
    }
};

class TreeBench {
public:
    explicit TreeBench(const std::string& display, platform::x11::Memory known = {})
        : memory(std::move(known)),
          connection(platform::x11::ConnectToDisplay(display, CmSteadyNow() + std::chrono::seconds(30), -1),
                     -1),
          introduced(Introduce()),
          tree(connection, memory, watcher) {
        tree.Select();
    }

    void Begin() {
        const platform::x11::ServerGrab grab(connection);
        tree.Begin();
    }

    /// Everything that the server has done so far is known after it. False when it never is.
    bool CatchUp() {
        for (int round = 0; round < 100; ++round) {
            connection.RoundTrip();
            bool any = false;
            while (const platform::x11::Event event = connection.NextEvent()) {
                tree.OnEvent(*event);
                any = true;
            }
            tree.Settle();
            if (!any && tree.IsSettled())
                return true;
        }
        return false;
    }

    std::shared_ptr<const platform::WindowSnapshot> Windows() {
        return CatchUp() ? tree.Snapshot() : std::make_shared<const platform::WindowSnapshot>();
    }
    platform::WindowInfo Listed(platform::CGWindowID id) {
        const auto windows = Windows();
        const platform::WindowInfo* const found = windows->Find(id);
        return found != nullptr ? *found : platform::WindowInfo();
    }
    std::vector<platform::CGWindowID> Ids() {
        std::vector<platform::CGWindowID> ids;
        for (const platform::WindowInfo& window : Windows()->Windows())
            ids.push_back(window.id);
        return ids;
    }
    std::uint64_t Generation() {
        CatchUp();
        return tree.Generation();
    }

    platform::x11::Memory memory;
    WatcherModel watcher;
    platform::x11::X11Connection connection;

private:
    bool Introduce() {
        connection.Introduce();
        return true;
    }
    const bool introduced;

public:
    platform::x11::WindowTree tree;
};

/// A client that the server takes for another process than ours: a child of ours connects and hands us its
/// connection.
class ForeignClient {
public:
    explicit ForeignClient(const XServer& server);
    ~ForeignClient();
    ForeignClient(const ForeignClient&) = delete;
    ForeignClient& operator=(const ForeignClient&) = delete;

    xcb_connection_t* Get() const { return m_connection; }
    xcb_window_t Root() const { return m_screen->root; }
    const xcb_screen_t& Screen() const { return *m_screen; }
    pid_t Pid() const { return m_pid; }
    xcb_atom_t Atom(const std::string& name) const;
    void RoundTrip() const;

    struct Look {
        int x = 0;
        int y = 0;
        unsigned width = 100;
        unsigned height = 80;
        unsigned border = 0;
        bool overrideRedirect = false;
        bool inputOnly = false;
    };
    /// `id` 0 for a new one.
    xcb_window_t Create(const Look& look, xcb_window_t id = 0, xcb_window_t parent = 0) const;
    xcb_window_t CreateMapped(const Look& look, xcb_window_t id = 0) const;
    void Words(xcb_window_t window, const std::string& property, const std::string& type,
               const std::vector<std::uint32_t>& words) const;
    void Text(xcb_window_t window, const std::string& property, const std::string& type,
              const std::string& text) const;
    void Place(xcb_window_t window, int x, int y, unsigned width, unsigned height) const;
    void Stack(xcb_window_t window, xcb_stack_mode_t mode, xcb_window_t sibling = 0) const;

private:
    pid_t m_pid = 0;
    xcb_connection_t* m_connection = nullptr;
    const xcb_screen_t* m_screen = nullptr;
};

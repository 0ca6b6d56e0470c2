// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/none/none_window_server.h"
#include "platform/simulated/scene.h"
#include "platform/simulated/simulated_window_server.h"
#include "tests/platform/conformance_desk.h"

#include <algorithm>
#include <map>
#include <memory>
#include <utility>

/// Where there is nothing.
class NoneDesk final : public ConformanceDesk {
public:
    platform::WindowServer& Server() override { return *m_server; }
    std::shared_ptr<platform::WindowServer> Release() override { return std::move(m_server); }

private:
    std::shared_ptr<platform::WindowServer> m_server = std::make_shared<platform::NoneWindowServer>();
};

class SimulatedDesk final : public ConformanceDesk {
public:
    platform::WindowServer& Server() override { return *m_server; }
    std::shared_ptr<platform::WindowServer> Release() override { return std::move(m_server); }
    bool CanDoAll() const override { return true; }

    std::optional<pid_t> StartApplication(const std::string& name) override {
        platform::ApplicationInfo application;
        application.pid = ++m_lastPid;
        application.name = name;
        return m_server->StartApplication(application) ? std::optional(m_lastPid) : std::nullopt;
    }
    bool EndApplication(pid_t pid) override { return m_server->EndApplication(pid); }

    std::optional<platform::CGWindowID> AddWindow(pid_t owner, const platform::CGRect& frame,
                                                  std::uint32_t rgb) override {
        platform::SimulatedWindow window;
        window.info.owner = owner;
        window.info.frame = frame;
        window.content = platform::SimulatedContent::Colour(rgb);
        const platform::CGWindowID id = m_server->AddWindow(std::move(window));
        return id != 0 ? std::optional(id) : std::nullopt;
    }
    bool Close(platform::CGWindowID id) override { return m_server->CloseWindow(id); }
    bool SetFrame(platform::CGWindowID id, const platform::CGRect& frame) override {
        return m_server->SetFrame(id, frame);
    }
    bool Raise(platform::CGWindowID id) override { return m_server->RaiseWindow(id); }
    bool Minimise(platform::CGWindowID id) override { return m_server->SetOnScreen(id, false); }
    bool Restore(platform::CGWindowID id) override { return m_server->SetOnScreen(id, true); }
    bool Recolour(platform::CGWindowID id, std::uint32_t rgb) override {
        return m_server->SetContent(id, platform::SimulatedContent::Colour(rgb));
    }
    bool SetAlpha(platform::CGWindowID id, float alpha) override { return m_server->SetAlpha(id, alpha); }
    bool Float(platform::CGWindowID id) override { return m_server->SetLevel(id, 3); }
    bool SetOwner(platform::CGWindowID id, pid_t owner) override { return m_server->SetOwner(id, owner); }
    bool SetTitle(platform::CGWindowID id, const std::string& title) override {
        return m_server->SetTitle(id, title);
    }
    bool Unshare(platform::CGWindowID id) override {
        return m_server->SetSharing(id, platform::SharingState::None);
    }
    std::optional<platform::CGWindowID> AddUnknownWindow(const platform::CGRect& frame) override {
        platform::SimulatedWindow window;
        window.info.frame = frame;
        window.known = false;
        return m_server->AddWindow(std::move(window));
    }
    bool TellOwner(platform::CGWindowID id, pid_t owner) override {
        return m_server->SetOwner(id, owner) && m_server->SetKnown(id, true);
    }

    std::optional<platform::CGDirectDisplayID> AddDisplay(const platform::CGSize& size) override {
        platform::SimulatedDisplay display;
        display.bounds.size = size;
        const auto displays = m_server->GetDisplays();
        for (const platform::DisplayInfo& each : *displays)
            display.bounds.origin.x =
                std::max(display.bounds.origin.x, each.bounds.origin.x + each.bounds.size.width);
        display.id = m_server->AddDisplay(display);
        m_displays[display.id] = display;
        return display.id;
    }
    bool Unplug(platform::CGDirectDisplayID id) override { return m_server->RemoveDisplay(id); }
    bool PlugInAgain(platform::CGDirectDisplayID id) override {
        return m_server->AddDisplay(m_displays[id]) == id;
    }
    bool Resize(platform::CGDirectDisplayID id, const platform::CGSize& size) override {
        return m_server->ResizeDisplay(id, size);
    }
    bool MakeMain(platform::CGDirectDisplayID id) override { return m_server->SetMainDisplay(id); }
    bool ReserveTop(platform::CGDirectDisplayID id, float points) override {
        return m_server->ReserveEdges(id, {0, points, 0, 0});
    }

    bool MovePointer(const platform::CGPoint& position) override {
        m_server->SetPointer(position);
        return true;
    }
    bool ChangeCursor() override {
        platform::SimulatedCursor cursor = platform::ArrowCursor();
        cursor.representations.resize(1);
        cursor.representations[0].content =
            platform::SimulatedContent::Colour(static_cast<std::uint32_t>(++m_cursors));
        m_server->SetCursor(cursor);
        return true;
    }

    bool Stall() override {
        m_server->Stall();
        return true;
    }
    bool Answer() override {
        m_server->Answer();
        return true;
    }
    bool Lose() override {
        m_server->Lose();
        return true;
    }
    bool FindAgain() override {
        m_server->FindAgain();
        return true;
    }
    bool NeedPermission() override {
        m_server->SetPermission(platform::Permission::NotAsked);
        for (const platform::Capability capability :
             {platform::Capability::WindowImages, platform::Capability::Streams})
            m_server->SetCapability(capability, platform::Availability::AfterPermission);
        return true;
    }
    bool Grant() override {
        m_server->SetPermission(platform::Permission::Granted);
        return true;
    }
    bool Deny() override {
        m_server->SetPermission(platform::Permission::Denied);
        return true;
    }
    bool ListNoWindows() override {
        m_server->SetCapability(platform::Capability::Windows, platform::Availability::No);
        return true;
    }

private:
    std::shared_ptr<platform::SimulatedWindowServer> m_server =
        platform::Scene().Display(0, 0, 200, 120).Pointer(5, 7).Cursor(platform::ArrowCursor()).Serve();
    std::map<platform::CGDirectDisplayID, platform::SimulatedDisplay> m_displays;
    pid_t m_lastPid = 100;
    int m_cursors = 0;
};

template <class Desk>
std::unique_ptr<ConformanceDesk> MakeConformanceDesk() {
    return std::make_unique<Desk>();
}

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capturer_context.h"
#include "tests/src/share_region_tools.h"
#include "tests/support/fake_window_server.h"

#include <sys/types.h>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

/// What tests of the context say often.

using Values = std::vector<unsigned>;

/// A context whose inside tests can reach, with displays that the test makes.
class CContextProbe : public ShareCapturerContext {
public:
    using ShareCapturerContext::__IsWindowShared;
    using ShareCapturerContext::_CommitParamSet;
    using ShareCapturerContext::_IsAppShared;
    using ShareCapturerContext::_IsAppUnShared;
    using ShareCapturerContext::_IsWindowUnShared;
    using ShareCapturerContext::_UpdateAppsDisplay;
    using ShareCapturerContext::AppDisplayRule;
    using ShareCapturerContext::ParamSet;

    using ShareCapturerContext::m_bFilterSelf;
    using ShareCapturerContext::m_displayLock;
    using ShareCapturerContext::m_mapAppDisplayRects;
    using ShareCapturerContext::m_mapDisplayRects;
    using ShareCapturerContext::m_nTopAppWindow;
    using ShareCapturerContext::m_paramLock;
    using ShareCapturerContext::m_paramSet;
    using ShareCapturerContext::m_rgnApplications;
    using ShareCapturerContext::m_rgnDisplay;
    using ShareCapturerContext::m_rgnOverlap;
    using ShareCapturerContext::m_rgnSharedWindow;
    using ShareCapturerContext::m_rgnVisible;
    using ShareCapturerContext::m_vAppDisplays;
    using ShareCapturerContext::m_vCapturedExcludedWindows;
    using ShareCapturerContext::m_vCapturedWindows;
    using ShareCapturerContext::m_vSharedApps;
    using ShareCapturerContext::m_vSharedDisplays;
    using ShareCapturerContext::m_vSharedWindows;
    using ShareCapturerContext::m_vUnSharedApps;
    using ShareCapturerContext::m_vUnSharedWindows;

    int InitDisplays() override {
        if (onInitDisplays)
            onInitDisplays();
        const std::lock_guard<std::recursive_mutex> lock(m_displayLock);
        ++initDisplaysCalls;
        return initDisplaysResult;
    }
    bool IsFilterOutSystemProcess(unsigned pid) const override { return pid == systemProcess; }

    int initDisplaysCalls = 0;
    int initDisplaysResult = 0;
    std::function<void()> onInitDisplays;
    unsigned systemProcess = 0xFFFFFFFFu; // by default none of the tests's
};

template <class Value>
using Getter = int (ShareCapturerContext::*)(Value&) const;

/// What a getter puts in the place of something else.
template <class Value>
Value Got(const ShareCapturerContext& context, Getter<Value> get, Value before = Value()) {
    EXPECT_EQ((context.*get)(before), 0);
    return before;
}

inline Rects RegionGot(const ShareCapturerContext& context, Getter<TVLRegion> get) {
    TVLRegion region = Region({{-9, -9, -1, -1}});
    EXPECT_EQ((context.*get)(region), 0);
    return RectsOf(region);
}

/// Runs something of the test's inside the look-ups of windows and displays.
class CHookedWindowServer : public CFakeWindowServer {
public:
    using Hook = std::function<void()>;

    void SetHook(Hook hook) {
        const std::lock_guard<std::mutex> lock(m_hookMutex);
        m_hook = std::move(hook);
    }

    std::shared_ptr<const platform::DisplayList> GetDisplays() const override {
        RunHook();
        return CFakeWindowServer::GetDisplays();
    }
    std::shared_ptr<const platform::WindowSnapshot> GetWindows() const override {
        RunHook();
        return CFakeWindowServer::GetWindows();
    }

private:
    void RunHook() const {
        Hook hook;
        {
            const std::lock_guard<std::mutex> lock(m_hookMutex);
            hook = m_hook;
        }
        if (hook)
            hook();
    }

    mutable std::mutex m_hookMutex;
    Hook m_hook; // guarded by m_hookMutex
};

/// A desktop for the length of a scope: two displays side by side, and no window.
class CDesktopScope {
public:
    static constexpr unsigned LEFT = 71;
    static constexpr unsigned RIGHT = 72;

    CDesktopScope()
        : m_server(std::make_shared<CHookedWindowServer>()),
          m_former(platform::ReplaceWindowServer(m_server)) {
        m_server->SetDisplays(
            {FakeDisplay(LEFT, {{0, 0}, {200, 120}}), FakeDisplay(RIGHT, {{200, 0}, {200, 120}})});
    }
    ~CDesktopScope() { platform::ReplaceWindowServer(m_former); }
    CDesktopScope(const CDesktopScope&) = delete;
    CDesktopScope& operator=(const CDesktopScope&) = delete;

    CHookedWindowServer* operator->() const { return m_server.get(); }

private:
    const std::shared_ptr<CHookedWindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
};

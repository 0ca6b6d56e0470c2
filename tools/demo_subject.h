// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "tools/capture_output.h"
#include "tools/desktop_lists.h"
#include "tools/share_request.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

/// What `screenshare demo` is asked for.
struct DemoOptions {
    std::string folder = "out/demo";
    bool usesScene = false; ///< The built-in scene, also where there is a desktop.
    std::optional<unsigned> excludedWindow{};
};

/// What the demo shares, and what it keeps out.
struct DemoSubject {
    bool isScene = false;
    ShareRequest request; ///< A completed one.
    std::string place;    ///< Where it captures, and why there: for people.
    std::string shared;   ///< What is shared: "the application \"Editor\"".
    std::string keptOut;  ///< "the window \"Keys\" (id 6) of \"Keys\""; empty when it is nothing.
    std::string note;     ///< What else is to be said of the choice; may be empty.
    std::vector<ListedMonitor> monitors; ///< What the screen is, beside the share.
};

/// Puts the built-in scene into force to the end of the scope.
class SceneInForce {
public:
    SceneInForce();
    ~SceneInForce();
    SceneInForce(const SceneInForce&) = delete;
    SceneInForce& operator=(const SceneInForce&) = delete;

    /// An application with a window of another one in front of it.
    DemoSubject Subject() const;

private:
    unsigned m_shared = 0;
    unsigned m_secret = 0;
    std::shared_ptr<platform::WindowServer> m_former;
};

/// Why the built-in scene has to do, without the last full stop; nothing when the desktop in force can be
/// shared and nobody wants another one.
std::optional<std::string> WhyScene(const DemoOptions& options);

/// The main monitor of the desktop in force without one window: the one asked for, or the frontmost ordinary
/// one on it that isn't of a process that this one was started from, such as its terminal.
WriteResult ChooseOnDesktop(const DemoOptions& options, DemoSubject& subject);

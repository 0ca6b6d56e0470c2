// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/child_process.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

/// What happens on a desktop while it is shared. Painted by a process of its own, so that its CPU time isn't
/// ours, by way of shared memory, so that it costs the server little.
struct Scene {
    std::string name;
    int width = 0; ///< Of what changes; it lies in the middle of a window.
    int height = 0;
    int framesPerSecond = 0;
    int windows = 0;      ///< In place of all that: so many small windows with titles, which stand still.
    bool covered = false; ///< By another window, of the same size and opaque; and kept whole in a storage.
    int windowWidth = 0;  ///< Of the window, in the desktop's top left corner; it fills the desktop for 0.
    int windowHeight = 0;
};

/// static; typing, 300x20 at 10 Hz; video, 1280x720 at 30 Hz; full motion, 1920x1080 at 30 Hz.
const std::vector<Scene>& MovingScenes();
/// That part of a desktop of that size changes at 30 Hz.
Scene SceneOfChange(double part, int desktopWidth, int desktopHeight);
Scene SceneOfWindows(int count);

/// A scene on a display, from when it is painted for the first time to the end of this object. Throws
/// std::runtime_error when it doesn't get there. The program that uses it calls PlaySceneIfAsked first.
class SceneProcess {
public:
    SceneProcess(const std::string& display, const Scene& scene);
    SceneProcess(const SceneProcess&) = delete;
    SceneProcess& operator=(const SceneProcess&) = delete;

    /// False when it has ended, so that nothing has moved any more.
    bool IsPlaying() { return m_process->IsRunning(); }
    /// The window that the scene is painted in; of several windows, the hindmost.
    unsigned Window() const { return m_window; }

private:
    unsigned m_window = 0;
    std::unique_ptr<CChildProcess> m_process;
};

/// For the first line of main: in a process that SceneProcess has started it plays the scene and gives the
/// exit status; elsewhere nothing.
std::optional<int> PlaySceneIfAsked(int argc, const char* const* argv);

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/x11_rig.h"

#include <optional>
#include <string>
#include <vector>

/// The outputs of an Xorg server with the dummy driver, side by side. On other servers nothing can be done.
class X11Outputs {
public:
    explicit X11Outputs(const XServer& server);

    /// Its name; right of all others.
    std::optional<std::string> Add(int width, int height);
    bool SetOn(const std::string& name, bool on);
    bool Resize(const std::string& name, int width, int height);
    bool MakePrimary(const std::string& name);
    /// As it was, on a server that has been started again.
    bool Redo();

    static std::string First() { return "DUMMY0"; }

private:
    struct Output {
        std::string name;
        int width = 0;
        int height = 0;
        bool on = true;
    };

    /// The options that give an output this size, once the server knows the mode.
    bool Know(const Output& output);
    /// All that are on, from left to right.
    bool Arrange();
    Output* Find(const std::string& name);
    bool Xrandr(std::vector<std::string> arguments) const;

    const XServer& m_server;
    std::vector<Output> m_outputs;
    std::string m_primary = First();
};

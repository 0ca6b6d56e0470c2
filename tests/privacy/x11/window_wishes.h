// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/x11_rig.h"

#include <cstdint>
#include <initializer_list>
#include <string>

/// What a panel, a pager or a user's hand asks the window manager to do with somebody's window. Whether and
/// when it does it is its own business.
/// Threads: one.
class WindowWishes {
public:
    explicit WindowWishes(const XLink& link) : m_link(link) {}

    struct Place {
        int x = 0;
        int y = 0;
        int width = 0; ///< 0 to leave the size as it is.
        int height = 0;
    };

    void Put(std::uint32_t window, const Place& place) const;
    void Raise(std::uint32_t window) const;
    void Lower(std::uint32_t window) const;
    void Minimise(std::uint32_t window) const;
    /// Also brings it to the front, and to the workspace that is shown.
    void Restore(std::uint32_t window) const;
    void ToggleMaximised(std::uint32_t window) const;
    void ToggleFullScreen(std::uint32_t window) const;
    void ToggleRolledUp(std::uint32_t window) const;
    void Close(std::uint32_t window) const;
    void ShowWorkspace(std::uint32_t number) const;
    void MovePointer(int x, int y) const;

private:
    void Send(std::uint32_t window, const std::string& message,
              std::initializer_list<std::uint32_t> data) const;
    void ToggleState(std::uint32_t window, const std::string& first, const std::string& second = {}) const;
    void Stack(std::uint32_t window, std::uint32_t mode) const;

    const XLink& m_link;
};

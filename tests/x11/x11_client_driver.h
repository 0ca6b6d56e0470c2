// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/x11_rig.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

/// An application of another process, x11_client, which does what it is told. See there for what can be told.
/// Threads: one at a time.
class X11Client {
public:
    /// Throws when it doesn't start.
    X11Client(const XServer& server, const std::string& name);
    ~X11Client();
    X11Client(const X11Client&) = delete;
    X11Client& operator=(const X11Client&) = delete;

    pid_t Pid() const { return m_process->Pid(); }

    /// Comes back when the server has done it. False when it can't be done, and when nothing has been
    /// answered for 30 s. `answer` is what comes after "ok".
    bool Tell(const std::string& line, std::string* answer = nullptr);
    /// The number of the new window.
    std::optional<std::uint32_t> Create(const std::string& name, const std::string& placeColourAndOptions);
    bool SetProperty(const std::string& window, const std::string& property, const std::string& type,
                     int format, const std::string& bytes);
    bool SetWords(const std::string& window, const std::string& property, const std::string& type,
                  const std::vector<std::uint32_t>& words);

    void End() { m_process->End(); }

private:
    bool ReadLine(std::string& line);

    int m_toIt = -1;
    int m_fromIt = -1;
    std::string m_read;
    std::unique_ptr<CChildProcess> m_process;
};

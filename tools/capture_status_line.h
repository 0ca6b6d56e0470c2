// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdio>
#include <string>

/// What a capture tells on standard error: lines that stay, and on a terminal one line at the bottom that
/// changes. Threads: one at a time. Errors: not looked at; there is nobody to tell them to.
class StatusLine {
public:
    explicit StatusLine(std::FILE* file, bool isTerminal) : m_file(file), m_isTerminal(isTerminal) {}

    /// Nothing where there is no terminal.
    void Show(const std::string& text);
    /// A line that stays, above the one that changes.
    void Tell(const std::string& text);
    /// Takes the changing line away.
    void Clear();

private:
    std::FILE* const m_file;
    const bool m_isTerminal;
    std::string m_shown;
};

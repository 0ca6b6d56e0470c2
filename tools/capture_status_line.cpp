// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_status_line.h"

#include "platform/utf8.h"

namespace {

/// To the line's begin, and what stands there away.
constexpr const char* WIPE = "\r\x1b[K";

} // namespace

void StatusLine::Show(const std::string& text) {
    if (!m_isTerminal || text == m_shown)
        return;
    std::fprintf(m_file, "%s%s", WIPE, text.c_str());
    std::fflush(m_file);
    m_shown = text;
}

void StatusLine::Tell(const std::string& text) {
    const std::string shown = m_shown;
    Clear();
    const std::string readable = platform::WithoutControls(platform::MendedUtf8(text));
    std::fprintf(m_file, "screenshare: %s\n", readable.c_str());
    Show(shown);
}

void StatusLine::Clear() {
    if (m_shown.empty())
        return;
    std::fputs(WIPE, m_file);
    std::fflush(m_file);
    m_shown.clear();
}

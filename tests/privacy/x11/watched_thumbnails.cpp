// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/watched_thumbnails.h"

std::vector<unsigned> WatchedThumbnails::Begin(const Wanted& wanted, SCREEN_CAPTURER_TYPE mode) {
    m_wanted = wanted;
    m_mode = mode;
    std::vector<unsigned> ids;
    for (const auto& [id, whose] : wanted)
        ids.push_back(id);
    m_isUnderWay = !ids.empty();
    return ids;
}

void WatchedThumbnails::AskForWindows(const Wanted& windows, SCREEN_CAPTURER_TYPE mode) {
    const std::vector<unsigned> ids = Begin(windows, mode);
    if (!ids.empty() && EnumWindowThumbnail(ids.data(), static_cast<int>(ids.size()), this) != 0)
        onThumbnailError(0);
}

void WatchedThumbnails::AskForApplications(const Wanted& pids, SCREEN_CAPTURER_TYPE mode) {
    const std::vector<unsigned> ids = Begin(pids, mode);
    if (!ids.empty() && EnumAppThumbnail(ids.data(), static_cast<int>(ids.size()), this) != 0)
        onThumbnailError(0);
}

bool WatchedThumbnails::onThumbnailError(int code) {
    m_journal.Fail("no thumbnails: " + std::to_string(code));
    m_isUnderWay = false;
    return true;
}

bool WatchedThumbnails::Take(SHARE_CAPTURE_ENGINE_TYPE kind, unsigned id, const ImageData& image, bool failed,
                             bool last) {
    const auto wanted = m_wanted.find(id);
    if (wanted == m_wanted.end()) {
        m_journal.Fail("a thumbnail that nobody asked for: " + std::to_string(id));
    } else if (!failed && image.data != nullptr) {
        const MarkerCount seen = CountMarkers(
            MarkerPictureOf(image.data, image.width, image.height, image.lineBytes, image.format));
        if (wanted->second.empty())
            m_journal.TakeThumbnail(kind, m_mode, seen);
        else
            m_journal.TakeSecretThumbnail(wanted->second, seen);
    }
    if (last)
        m_isUnderWay = false;
    return true;
}

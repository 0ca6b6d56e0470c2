// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/x11/privacy_journal.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_thumbnail.h>

#include <atomic>
#include <map>
#include <string>
#include <vector>

/// Thumbnails, each of which is judged: in one of somebody who may be seen there is nobody else. Those of
/// secrets show that these can be seen at all.
/// Threads: one, but for what the library calls.
class WatchedThumbnails final : private ThumbnailCallback {
public:
    explicit WatchedThumbnails(PrivacyJournal& journal) : m_journal(journal) {}
    ~WatchedThumbnails() { CancelThumbnail(this); }
    WatchedThumbnails(const WatchedThumbnails&) = delete;
    WatchedThumbnails& operator=(const WatchedThumbnails&) = delete;

    /// What is asked for, and whose secret it is; empty for nobody's.
    using Wanted = std::map<unsigned, std::string>;

    /// In a turn of that mode. Only when nothing is under way.
    void AskForWindows(const Wanted& windows, SCREEN_CAPTURER_TYPE mode);
    void AskForApplications(const Wanted& pids, SCREEN_CAPTURER_TYPE mode);
    bool IsUnderWay() const { return m_isUnderWay; }

private:
    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override {
        return Take(SHARE_CAPTURE_ENGINE_TYPE_APP, pid, image, failed, last);
    }
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override {
        return Take(SHARE_CAPTURE_ENGINE_TYPE_WINDOW, window, image, failed, last);
    }
    bool onThumbnailError(int code) override;

    std::vector<unsigned> Begin(const Wanted& wanted, SCREEN_CAPTURER_TYPE mode);
    bool Take(SHARE_CAPTURE_ENGINE_TYPE kind, unsigned id, const ImageData& image, bool failed, bool last);

    PrivacyJournal& m_journal;
    // Written only while nothing is under way.
    Wanted m_wanted;
    SCREEN_CAPTURER_TYPE m_mode = SCREEN_CAPTURER_TYPE_DEFAULT;
    std::atomic<bool> m_isUnderWay{false};
};

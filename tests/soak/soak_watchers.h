// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_desk.h"

#include <screenshare/share_engine.h>

#include <atomic>
#include <cstdint>
#include <vector>

/// What a picker does beside the shares: lists that follow the desktop, and thumbnails.

/// A list that is told of changes, and looks at what has changed.
class SoakList final : public IShareSourceEnumSink {
public:
    explicit SoakList(SHARE_SOURCE_ENUMERATOR_TYPE type);
    ~SoakList();
    SoakList(const SoakList&) = delete;
    SoakList& operator=(const SoakList&) = delete;

    /// Reads every entry, and gives how many there were.
    int Read();
    std::vector<unsigned> Ids();
    std::uint64_t Events() const { return m_events; }

    int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) override;

private:
    IShareSourceEnumerator* const m_list;
    std::atomic<std::uint64_t> m_events{0};
};

/// Takes pictures in, one request after another.
class SoakThumbnails final : public ThumbnailCallback {
public:
    SoakThumbnails() = default;
    ~SoakThumbnails() { CancelThumbnail(this); }
    SoakThumbnails(const SoakThumbnails&) = delete;
    SoakThumbnails& operator=(const SoakThumbnails&) = delete;

    /// Each replaces what was asked for before.
    int AskForApplications() { return EnumAppThumbnail(nullptr, 0, this); }
    int AskForWindows(const std::vector<unsigned>& windows);
    std::uint64_t Pictures() const { return m_pictures; }
    std::uint64_t Failures() const { return m_failures; }

    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override;
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override;
    bool onThumbnailError(int code) override;

private:
    std::atomic<std::uint64_t> m_pictures{0};
    std::atomic<std::uint64_t> m_failures{0};
};

/// Walks over all windows and asks for what a picker shows of each; gives how many there were, or a refusal.
int WalkOverWindows();

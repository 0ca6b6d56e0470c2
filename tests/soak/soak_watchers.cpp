// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_watchers.h"

#include <array>

namespace {

/// As a list shows it.
void Look(IShareSource& source) {
    std::array<char, SHARE_SOURCE_TEXT_SIZE + 1> name{};
    source.GetName(name.data(), SHARE_SOURCE_TEXT_SIZE);
    source.GetSourceRect(false);
}

} // namespace

// ---- Lists

SoakList::SoakList(SHARE_SOURCE_ENUMERATOR_TYPE type) : m_list(CreateShareSourceEnumerator(type, true)) {
    m_list->AddSink(this);
    m_list->Refresh();
}

SoakList::~SoakList() {
    DestroyShareSourceEnumerator(m_list);
}

int SoakList::Read() {
    int count = 0;
    if (const int result = m_list->GetNumber(count); result != SHARE_RESULT_OK)
        return result;
    for (int i = 0; i < count; ++i) {
        IShareSource* source = nullptr;
        if (m_list->GetSource(i, &source) != SHARE_RESULT_OK)
            continue; // it has gone meanwhile
        Look(*source);
        source->Release();
    }
    return count;
}

std::vector<unsigned> SoakList::Ids() {
    std::vector<unsigned> ids;
    int count = 0;
    m_list->GetNumber(count);
    for (int i = 0; i < count; ++i) {
        IShareSource* source = nullptr;
        if (m_list->GetSource(i, &source) != SHARE_RESULT_OK)
            continue;
        ids.push_back(static_cast<unsigned>(source->GetSourceUniqueId()));
        source->Release();
    }
    return ids;
}

int SoakList::OnShareSourceEvent(SHARE_SOURCE_EVENT, IShareSource* source) {
    ++m_events;
    if (source != nullptr)
        Look(*source);
    return SHARE_RESULT_OK;
}

// ---- Thumbnails

int SoakThumbnails::AskForWindows(const std::vector<unsigned>& windows) {
    return EnumWindowThumbnail(windows.data(), static_cast<int>(windows.size()), this);
}

bool SoakThumbnails::onAppThumbnail(unsigned, ImageData, bool failed, bool) {
    ++(failed ? m_failures : m_pictures);
    return true;
}

bool SoakThumbnails::onWindowThumbnail(unsigned, ImageData, bool failed, bool) {
    ++(failed ? m_failures : m_pictures);
    return true;
}

bool SoakThumbnails::onThumbnailError(int) {
    ++m_failures;
    return false;
}

// ---- Windows

int WalkOverWindows() {
    struct Walk final : ITvlEnumWindowsCallback {
        int count = 0;

        bool OnWindow(unsigned window) override {
            ShareWindowInfo info{};
            info.structSize = sizeof(info);
            ShareGetWindowInfo(window, &info); // it may have gone meanwhile
            ++count;
            return true;
        }
    } walk;
    const int result = TvlEnumWindows(&walk, SHARE_WINDOW_ENUM_NORMAL);
    return result == SHARE_RESULT_OK ? walk.count : result;
}

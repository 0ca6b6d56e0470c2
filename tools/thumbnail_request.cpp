// SPDX-License-Identifier: Apache-2.0
#include "tools/thumbnail_request.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <exception>

ThumbnailRequest::~ThumbnailRequest() {
    CancelThumbnail(this);
}

bool ThumbnailRequest::Ask(Question question) {
    std::vector<unsigned> ids;
    ids.reserve(m_items.size());
    for (const ThumbnailItem& item : m_items)
        ids.push_back(item.id);
    return question(ids.data(), static_cast<int>(ids.size()), this) == SHARE_RESULT_OK;
}

WriteResult ThumbnailRequest::Close() {
    CancelThumbnail(this);
    return m_failure;
}

bool ThumbnailRequest::onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) {
    return Take(pid, image, failed, last);
}

bool ThumbnailRequest::onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) {
    return Take(window, image, failed, last);
}

bool ThumbnailRequest::onThumbnailError(int) {
    m_failure = WriteFailure{EXIT_CODE_FAILED, "thumbnails cannot be made here"};
    m_ended.Raise();
    return false;
}

/// False ends the request.
bool ThumbnailRequest::Take(unsigned id, const ImageData& image, bool failed, bool last) {
    m_failure = WriteGuarded(id, image, failed);
    if (last || m_failure)
        m_ended.Raise();
    return !m_failure && !m_files.IsStopped();
}

WriteResult ThumbnailRequest::WriteGuarded(unsigned id, const ImageData& image, bool failed) {
    try {
        return Write(id, image, failed);
    } catch (const std::exception& error) {
        return WriteFailure{EXIT_CODE_FAILED, std::string("a thumbnail cannot be written: ") + error.what()};
    }
}

WriteResult ThumbnailRequest::Write(unsigned id, const ImageData& image, bool failed) {
    const auto item = std::find_if(m_items.begin(), m_items.end(),
                                   [id](const ThumbnailItem& each) { return each.id == id; });
    if (item == m_items.end())
        return std::nullopt;
    return failed ? m_files.TellMissing(*item) : m_files.Write(*item, image);
}

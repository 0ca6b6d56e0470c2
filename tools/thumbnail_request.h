// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_signals.h"
#include "tools/thumbnail_files.h"

#include <vector>

/// One request for thumbnails, from the question to its last answer. They become files on the library's
/// thread, so that one is made when the one before is written. Lifetime: the files stay longer.
class ThumbnailRequest : public ThumbnailCallback {
public:
    /// EnumAppThumbnail or EnumWindowThumbnail.
    using Question = int (*)(const unsigned* ids, int count, ThumbnailCallback* callback);

    ThumbnailRequest(std::vector<ThumbnailItem> items, ThumbnailFiles& files)
        : m_items(std::move(items)),
          m_files(files) {}
    ~ThumbnailRequest();
    ThumbnailRequest(const ThumbnailRequest&) = delete;
    ThumbnailRequest& operator=(const ThumbnailRequest&) = delete;

    /// For all of the items. False when nobody will answer. Once.
    bool Ask(Question question);
    /// Raised with the last answer, or when something failed.
    const StopNotice& Ended() const { return m_ended; }
    /// Nothing is written any more; waits for what is being written. Gives what failed.
    WriteResult Close();

    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override;
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override;
    bool onThumbnailError(int code) override;

private:
    bool Take(unsigned id, const ImageData& image, bool failed, bool last);
    WriteResult WriteGuarded(unsigned id, const ImageData& image, bool failed);
    WriteResult Write(unsigned id, const ImageData& image, bool failed);

    const std::vector<ThumbnailItem> m_items;
    ThumbnailFiles& m_files;
    StopFlag m_ended;
    WriteResult m_failure; // of the library's thread, until Close
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "mailbox.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <cstddef>
#include <functional>
#include <set>
#include <stdexcept>
#include <utility>
#include <vector>

// A copy of an ImageData; without pixels where there is nothing to see.
struct Picture {
    int width = 0;
    int height = 0;
    int lineBytes = 0;
    std::vector<unsigned char> rgba;
};

// Gets the thumbnails of what is wanted, be it applications or windows, a few at a time.
//
// A new request would replace the one that runs, so what is wanted meanwhile waits here until the last
// picture of that has come. And since the next few are asked for only then, no more than those lie in the
// mailbox.
class Thumbnails : private ThumbnailCallback {
public:
    // EnumAppThumbnail or EnumWindowThumbnail.
    using Request = int (*)(const unsigned* ids, int count, ThumbnailCallback* callback);
    // Called on the main thread.
    using Came = std::function<void(unsigned id, const Picture& picture)>;

    Thumbnails(Request request, Mailbox& mailbox, Came came)
        : m_request(request),
          m_mailbox(mailbox),
          m_came(std::move(came)) {}
    ~Thumbnails() { CancelThumbnail(this); } // no call comes after it
    Thumbnails(const Thumbnails&) = delete;
    Thumbnails& operator=(const Thumbnails&) = delete;

    void Want(unsigned id) { m_wanted.insert(id); }
    void Forget(unsigned id) { m_wanted.erase(id); }

    void AskForNext() {
        constexpr std::size_t mostAtATime = 4;
        if (m_isAsking || m_wanted.empty())
            return;
        std::vector<unsigned> ids;
        while (!m_wanted.empty() && ids.size() < mostAtATime)
            ids.push_back(m_wanted.extract(m_wanted.begin()).value());
        if (m_request(ids.data(), static_cast<int>(ids.size()), this) != SHARE_RESULT_OK)
            throw std::runtime_error("thumbnails are refused");
        m_isAsking = true;
    }

private:
    // These three on the library's thumbnail thread.
    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) noexcept override {
        return Take(pid, image, failed, last);
    }
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) noexcept override {
        return Take(window, image, failed, last);
    }
    bool onThumbnailError(int) noexcept override {
        m_mailbox.Post([] { throw std::runtime_error("thumbnails cannot be made"); });
        return false;
    }

    // The pixels are the library's and hold for this call only.
    bool Take(unsigned id, const ImageData& image, bool failed, bool last) {
        Picture picture;
        std::size_t size = 0;
        if (!failed)
            size = static_cast<std::size_t>(image.lineBytes) * static_cast<std::size_t>(image.height);
        if (ShowsAnything(image.data, size))
            picture = {image.width, image.height, image.lineBytes, {image.data, image.data + size}};
        m_mailbox.Post([this, id, taken = std::move(picture), last] { Receive(id, taken, last); });
        return true;
    }

    // A window that has painted nothing yet is transparent, and so is one that nobody may see.
    static bool ShowsAnything(const unsigned char* rgba, std::size_t size) {
        return std::any_of(rgba, rgba + size, [](unsigned char byte) { return byte != 0; });
    }

    void Receive(unsigned id, const Picture& picture, bool last) {
        if (last)
            m_isAsking = false;
        m_came(id, picture);
    }

    const Request m_request;
    Mailbox& m_mailbox;
    const Came m_came;
    std::set<unsigned> m_wanted;
    bool m_isAsking = false;
};

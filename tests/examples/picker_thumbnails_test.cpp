// SPDX-License-Identifier: Apache-2.0
#include "examples/picker/mailbox.h"
#include "examples/picker/thumbnails.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <utility>
#include <vector>

/// How the picker example asks for its thumbnails, with a library that does nothing by itself.

namespace {

using Ids = std::vector<unsigned>;

class PickerThumbnails : public testing::Test {
protected:
    PickerThumbnails() {
        s_requests.clear();
        s_result = SHARE_RESULT_OK;
    }

    /// What the library would call back, and what the main thread does then.
    void Answer(unsigned id, bool last, unsigned char pixel = 255) {
        std::vector<unsigned char> pixels(2 * 4, pixel);
        ThumbnailCallback* const callback = s_callback;
        EXPECT_TRUE(
            callback->onAppThumbnail(id, {SHARE_FRAME_FORMAT_RGBA, 2, 1, 8, pixels.data()}, false, last));
        pixels.assign(pixels.size(), 77); // the library's memory is used again
        m_mailbox.OpenOne();
    }

    static int Request(const unsigned* ids, int count, ThumbnailCallback* callback) {
        s_callback = callback;
        s_requests.emplace_back(ids, ids + count);
        return s_result;
    }

    static inline std::vector<Ids> s_requests;
    static inline ThumbnailCallback* s_callback = nullptr;
    static inline int s_result = SHARE_RESULT_OK;

    Mailbox m_mailbox;
    std::vector<std::pair<unsigned, Picture>> m_came;
    Thumbnails m_thumbnails{Request, m_mailbox, [this](unsigned id, const Picture& picture) {
                                m_came.emplace_back(id, picture);
                            }};
};

TEST_F(PickerThumbnails, AreAskedForAnewOnlyWhenTheLastOneHasCome) {
    m_thumbnails.AskForNext();
    EXPECT_TRUE(s_requests.empty()) << "no ids would be all applications";
    for (unsigned id = 1; id <= 6; ++id)
        m_thumbnails.Want(id);
    m_thumbnails.AskForNext();
    m_thumbnails.AskForNext();
    EXPECT_EQ(s_requests, (std::vector<Ids>{{1, 2, 3, 4}}));
    for (unsigned id = 1; id <= 3; ++id)
        Answer(id, false);
    m_thumbnails.AskForNext();
    EXPECT_EQ(s_requests.size(), 1U) << "a new request ends the one that runs";
    Answer(4, true);
    m_thumbnails.Forget(5);
    m_thumbnails.AskForNext();
    EXPECT_EQ(s_requests, (std::vector<Ids>{{1, 2, 3, 4}, {6}}));
}

TEST_F(PickerThumbnails, AreCopiedInsideTheCall) {
    m_thumbnails.Want(9);
    m_thumbnails.AskForNext();
    ASSERT_EQ(s_requests.size(), 1U);
    Answer(9, true);
    ASSERT_EQ(m_came.size(), 1U);
    EXPECT_EQ(m_came[0].first, 9U);
    EXPECT_EQ(m_came[0].second.width, 2);
    EXPECT_EQ(m_came[0].second.height, 1);
    EXPECT_EQ(m_came[0].second.rgba, std::vector<unsigned char>(8, 255));
}

TEST_F(PickerThumbnails, AreNoneWhereNothingIsToBeSeen) {
    m_thumbnails.Want(1);
    m_thumbnails.Want(2);
    m_thumbnails.AskForNext();
    ASSERT_EQ(s_requests.size(), 1U);
    Answer(1, false, 0);
    EXPECT_TRUE(s_callback->onAppThumbnail(2, {}, true, true));
    m_mailbox.OpenOne();
    ASSERT_EQ(m_came.size(), 2U);
    EXPECT_TRUE(m_came[0].second.rgba.empty());
    EXPECT_TRUE(m_came[1].second.rgba.empty());
}

TEST_F(PickerThumbnails, ThatCannotBeMadeAreAnErrorOnTheMainThread) {
    m_thumbnails.Want(1);
    m_thumbnails.AskForNext();
    ASSERT_EQ(s_requests.size(), 1U);
    s_callback->onThumbnailError(-1);
    EXPECT_THROW(m_mailbox.OpenOne(), std::runtime_error);

    s_result = SHARE_RESULT_FAILED;
    Answer(1, true);
    m_thumbnails.Want(1);
    EXPECT_THROW(m_thumbnails.AskForNext(), std::runtime_error);
}

} // namespace

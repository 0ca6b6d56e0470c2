// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_bench.h"
#include "tests/src/thumbnail_tools.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_window_info.h>

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

/// Trace lines go into clients' logs and from there to strangers. They tell numbers and places of windows,
/// and names of applications and monitors; never a title, and no pixel.

namespace {

using namespace platform;

const std::string TITLE = "Notice of termination - Jane Roe";
/// A colour whose bytes are letters, so that it would be seen as text, too.
constexpr std::uint32_t SECRET = 0x71'5A'78;

std::string Hexadecimal(std::uint32_t word, const char* digits) {
    std::string text;
    for (int shift = 28; shift >= 0; shift -= 4)
        text += digits[(word >> static_cast<unsigned>(shift)) & 15U];
    return text;
}

/// How a pixel of the secret could look in a line: as text, as a word in any order of its bytes, byte by
/// byte.
std::vector<std::string> SignsOfTheSecret() {
    std::vector<std::string> signs{"qZx", "xZq"};
    for (const std::uint32_t word : {0xFF'71'5A'78U, 0xFF'78'5A'71U, 0x71'5A'78'FFU, 0x78'5A'71'FFU}) {
        signs.push_back(Hexadecimal(word, "0123456789abcdef"));
        signs.push_back(Hexadecimal(word, "0123456789ABCDEF"));
        signs.push_back(std::to_string(word));
        signs.push_back(std::to_string(static_cast<std::int32_t>(word)));
    }
    for (const std::string between : {" ", ",", ", "}) {
        signs.push_back("113" + between + "90" + between + "120");
        signs.push_back("120" + between + "90" + between + "113");
    }
    return signs;
}

class TraceSecurity : public DesktopShareBench {
protected:
    TraceSecurity() {
        desktop->Show(SecretDesk()
                          .Window(SECRET_BEFORE_ALL)
                          .Of(SECRETS)
                          .At(200, 0, 20, 10)
                          .Colour(SECRET)
                          .Titled(TITLE)
                          .Build());
    }

    /// A change of the back end, or of what is kept out, is seen when its first frame has come.
    bool TickUntil(const std::function<bool()>& condition) {
        constexpr int PLENTY = 60;
        for (int i = 0; i < PLENTY && !condition(); ++i)
            Tick();
        return condition();
    }

    void ExpectNoSign() {
        const std::vector<std::string> signs = SignsOfTheSecret();
        for (const std::string& line : trace.Lines()) {
            EXPECT_EQ(line.find("termination"), std::string::npos) << line;
            EXPECT_EQ(line.find("Jane Roe"), std::string::npos) << line;
            for (const std::string& sign : signs)
                EXPECT_EQ(line.find(sign), std::string::npos) << line;
        }
    }

    static constexpr CGWindowID SECRET_BEFORE_ALL = 77;
    CTraceLog trace{CM_TRACE_DETAIL};
};

} // namespace

TEST_F(TraceSecurity, NoLineOfAShareInAnyModeHoldsATitleOrAPixel) {
    const unsigned performance = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    EXPECT_EQ(ShareConfig(SHARE_CONFIG_FLAG, &performance, sizeof performance), 0);
    client.ShareMonitor(SIDE);
    client.Start();
    for (const SCREEN_CAPTURER_TYPE mode :
         {SCREEN_CAPTURER_TYPE_DEFAULT, SCREEN_CAPTURER_TYPE_AVFOUNDATION, SCREEN_CAPTURER_TYPE_CGS_GCD,
          SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX}) {
        const std::size_t before = client.sink.FrameCount();
        EXPECT_EQ(client->SetCaptureMode(mode), 0);
        EXPECT_TRUE(TickUntil([&] { return client.sink.FrameCount() > before; })) << "mode " << mode;
        EXPECT_EQ(client.Last().Count(SECRET), 20 * 10) << "mode " << mode << " shows it";
    }
    desktop->SetTitle(SECRET_BEFORE_ALL, TITLE + ", changed");
    EXPECT_EQ(client->AddUnSharedWindow(SECRET_BEFORE_ALL), 0);
    EXPECT_TRUE(TickUntil([this] { return client.Last().Count(SECRET) == 0; }));
    EXPECT_GT(trace.CountContaining("DETAIL"), 20u) << "too little was traced to show anything";
    EXPECT_TRUE(trace.Contains(",oneWindow=77,")) << "nothing was traced of the window";
    ExpectNoSign();
}

TEST_F(TraceSecurity, NoLineOfAPickerHoldsATitleOrAPixel) {
    ShareWindowInfo info{};
    info.structSize = sizeof info;
    ASSERT_EQ(ShareGetWindowInfo(SECRET_BEFORE_ALL, &info), 0);
    EXPECT_EQ(info.title, TITLE);
    CThumbnailLog thumbnails;
    const unsigned window = SECRET_BEFORE_ALL;
    EXPECT_EQ(EnumWindowThumbnail(&window, 1, &thumbnails), 0);
    EXPECT_TRUE(thumbnails.lasts.Reaches(1));
    EXPECT_EQ(thumbnails.Calls(), ThumbnailCalls{"window 77 20x10 last"});
    CancelThumbnail(&thumbnails);
    const unsigned owner = static_cast<unsigned>(SECRETS);
    EXPECT_EQ(EnumAppThumbnail(&owner, 1, &thumbnails), 0);
    EXPECT_TRUE(thumbnails.lasts.Reaches(2));
    CancelThumbnail(&thumbnails);
    ExpectNoSign();
}

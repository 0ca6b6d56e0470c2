// SPDX-License-Identifier: Apache-2.0
#include "src/share_image_save.h"
#include "tests/platform/image_files.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/src/mac/desktop_share_picture_scene.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <string>

/// The pictures of the client guide: what a client gets of one desktop. Run with SCREENSHARE_UPDATE_GOLDEN=1
/// it writes them anew; look at each before it is kept.

namespace {

constexpr std::size_t LARGEST_FILE = 60'000;
/// Scaling rounds a little differently with the instructions of different processors.
constexpr int SCALED_TOLERANCE = 4;

bool AsksForNewOnes() {
    const char* const update = std::getenv("SCREENSHARE_UPDATE_GOLDEN");
    return update != nullptr && std::string(update) == "1";
}

class DesktopSharePictures : public testing::Test {
protected:
    void KeepPrivate() {
        EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(PictureScene::CHAT)), 0);
        EXPECT_EQ(client->AddUnSharedWindow(PictureScene::PASSWORDS), 0);
    }
    void Share(unsigned display) {
        client.ShareMonitor(display);
        client.Start();
        clock->Advance(std::chrono::milliseconds(200));
        Settle(*WorkerOf(*client));
        ASSERT_EQ(client.sink.FrameCount(), 1u);
    }
    bool ShowsPrivate() {
        const DeliveredShot shot = client.Last();
        return shot.Count(PictureScene::CHAT_RGB) + shot.Count(PictureScene::PASSWORDS_RGB) > 0;
    }

    void ExpectPicture(const std::string& name, TVLSize size, int tolerance = 0) {
        ASSERT_EQ(client.Last().Size(), size);
        const TemporaryFolder folder;
        const std::string path = SCREENSHARE_PICTURES_DIR "/" + name + ".png";
        const std::string made = AsksForNewOnes() ? path : folder / (name + ".png");
        ASSERT_TRUE(SaveFrameToPNG(client.Last().frame.Get(), made.c_str()));
        const DecodedImage now = DecodePng(ReadWholeFile(made));
        const DecodedImage kept = DecodePng(ReadWholeFile(path));
        ASSERT_EQ((TVLSize{now.width, now.height}), size);
        ASSERT_EQ((TVLSize{kept.width, kept.height}), size) << path;
        int worst = 0;
        for (int y = 0; y < size.cy; ++y) {
            for (int x = 0; x < size.cx; ++x)
                worst = std::max(worst, Distance(now.At(x, y), kept.At(x, y)));
        }
        EXPECT_LE(worst, tolerance) << "the picture is not " << path
                                    << "; SCREENSHARE_UPDATE_GOLDEN=1 writes it anew";
        EXPECT_LT(std::filesystem::file_size(path), LARGEST_FILE);
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{PictureScene::Make()};
    CShareClient client;
};

} // namespace

TEST_F(DesktopSharePictures, ShowADisplayWhole) {
    Share(PictureScene::MAIN);
    EXPECT_TRUE(ShowsPrivate());
    EXPECT_TRUE(client.Last().meta.bPointerCaptured);
    ExpectPicture("desktop_whole", {640, 400});
}

TEST_F(DesktopSharePictures, ShowADisplayWithoutWhatIsKeptOut) {
    KeepPrivate();
    Share(PictureScene::MAIN);
    EXPECT_FALSE(ShowsPrivate());
    ExpectPicture("desktop_kept_out", {640, 400});
}

TEST_F(DesktopSharePictures, ShowTheSecondDisplayWithoutWhatIsKeptOut) {
    KeepPrivate();
    Share(PictureScene::SIDE);
    EXPECT_FALSE(ShowsPrivate());
    ExpectPicture("desktop_second_display", {400, 260});
}

TEST_F(DesktopSharePictures, ShowADisplayScaledToTheLimit) {
    KeepPrivate();
    EXPECT_EQ(client->SetCaptureMaxFrameSize(320, 240), 0);
    Share(PictureScene::MAIN);
    EXPECT_FALSE(ShowsPrivate());
    ExpectPicture("desktop_scaled", {320, 200}, SCALED_TOLERANCE);
}

TEST_F(DesktopSharePictures, ShowADisplayInTheMiddleOfAFrameOfFixedSize) {
    settings->m_bCaptureResampleFixSizeEnable = true;
    settings->m_nResampleScreenCaptureWidth = 800;
    settings->m_nResampleScreenCaptureHeight = 600;
    KeepPrivate();
    Share(PictureScene::MAIN);
    EXPECT_FALSE(ShowsPrivate());
    ExpectPicture("desktop_fixed_size", {800, 600}, SCALED_TOLERANCE);
}

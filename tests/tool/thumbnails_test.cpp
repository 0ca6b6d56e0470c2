// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/image_files.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/tool/output_pipe.h"
#include "tools/thumbnails_command.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

std::string Words(const WriteResult& result) {
    return result ? std::to_string(result->code) + ": " + result->text : "";
}

class Thumbnails : public testing::Test {
protected:
    std::string Run(bool apps, bool windows) { return Words(RunThumbnails({apps, windows, m_folder / "t"})); }
    bool IsThere(const std::string& name) const { return std::filesystem::exists(m_folder / "t/" + name); }

    const TemporaryFolder m_folder;
};

} // namespace

TEST_F(Thumbnails, AreMissingWhereThereIsNoWindow) {
    const CServedScene desktop(Scene()
                                   .Display(0, 0, 200, 120)
                                   .App(1001, "Hidden")
                                   .Window(1)
                                   .OffScreen()
                                   .App(1002, "Editor")
                                   .Window(2)
                                   .At(10, 10, 30, 20)
                                   .Colour(0x102030));
    Lines lines;
    std::string result;
    {
        OutputPipe output;
        result = Run(true, true);
        for (int i = 0; i < 4; ++i)
            lines.push_back(output.ReadLine());
    }
    EXPECT_EQ(result, "");
    ASSERT_TRUE(IsThere("app-1002.png"));
    EXPECT_FALSE(IsThere("app-1001.png"));
    EXPECT_NE(lines[1].find("app     1001  -          no picture"), std::string::npos) << lines[1];
    EXPECT_NE(lines[2].find("app     1002  30x20"), std::string::npos) << lines[2];
    EXPECT_NE(lines[3].find("window  2     30x20"), std::string::npos) << lines[3];
    const DecodedImage image = DecodePng(ReadWholeFile(m_folder / "t/app-1002.png"));
    ASSERT_EQ(image.width, 30);
    ASSERT_EQ(image.height, 20);
    EXPECT_EQ(image.pixels[0], 0x10);
    EXPECT_EQ(image.pixels[1], 0x20);
    EXPECT_EQ(image.pixels[2], 0x30);
}

TEST_F(Thumbnails, AreNotAskedForWhereThereIsNothing) {
    const CServedScene desktop(Scene().Display(0, 0, 200, 120).Window(1));
    EXPECT_EQ(Run(true, false), "1: there is nothing to make thumbnails of");
    EXPECT_FALSE(IsThere("")) << "the folder is made for nothing";
    desktop->Lose();
    EXPECT_EQ(Run(true, true), "1: no window server answers (screenshare doctor tells more)");
}

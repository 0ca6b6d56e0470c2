// SPDX-License-Identifier: Apache-2.0
#include "tests/security/fault_bench.h"
#include "tests/support/no_descriptors.h"
#include "tests/support/sanitizer.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <iterator>
#include <memory>
#include <optional>

// The host has opened all that it may. What needs a descriptor of ours goes without, and comes with the first
// one.

namespace {

namespace fs = std::filesystem;

/// Takes thumbnails and counts those that show something.
class CCountsThumbnails final : public ThumbnailCallback {
public:
    bool onAppThumbnail(unsigned, ImageData image, bool failed, bool last) override {
        return Take(image, failed, last);
    }
    bool onWindowThumbnail(unsigned, ImageData image, bool failed, bool last) override {
        return Take(image, failed, last);
    }
    bool onThumbnailError(int) override {
        lasts.Add();
        return true;
    }

    CTally shown;
    CTally lasts;

private:
    bool Take(const ImageData& image, bool failed, bool last) {
        if (!failed && image.data != nullptr)
            shown.Add();
        if (last)
            lasts.Add();
        return true;
    }
};

std::ptrdiff_t CountFiles(const fs::path& folder) {
    return std::distance(fs::directory_iterator(folder), {});
}

class NoDescriptors : public testing::Test {
protected:
    void SetUp() override {
        if (SCREENSHARE_TEST_SANITIZED != 0)
            GTEST_SKIP() << "a sanitizer needs descriptors of its own";
    }
};

} // namespace

TEST_F(NoDescriptors, AreNeededForAShare) {
    std::optional<CNoDescriptorsScope> none(std::in_place);
    FaultBench bench;
    bench.Start();
    EXPECT_TRUE(bench.ShowsText());
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(bench.client->Stop(), 0);
        bench.Start();
        EXPECT_TRUE(bench.ShowsText());
    }
    none.reset();
    EXPECT_TRUE(bench.ShowsText());
    EXPECT_EQ(bench.RedSoFar(), 0);
}

TEST_F(NoDescriptors, AreNeededForThumbnails) {
    const CServedScene desktop(FaultBench::Desk());
    constexpr unsigned WINDOWS[] = {FaultBench::TEXT, FaultBench::SECRET};
    CCountsThumbnails takes;
    {
        const CNoDescriptorsScope none;
        EXPECT_EQ(EnumWindowThumbnail(WINDOWS, 2, &takes), 0);
        ASSERT_TRUE(takes.lasts.Reaches(1));
    }
    EXPECT_EQ(takes.shown.Count(), 2);
    CancelThumbnail(&takes);
}

TEST_F(NoDescriptors, CostDumpsAndNothingElse) {
    const char* const debugFolder = std::getenv("SCREENSHARE_DEBUG_DIR");
    if (debugFolder == nullptr)
        GTEST_SKIP() << "needs a debug folder of its own";
    const fs::path dumps = fs::path(debugFolder) / "img-dump";
    fs::create_directory(dumps);
    FaultBench bench;
    bench.Start();
    ASSERT_TRUE(bench.ShowsText());
    EXPECT_EQ(EnableScreenShareDump(true), 0);
    {
        const CNoDescriptorsScope none;
        const std::size_t before = bench.client.sink.FrameCount();
        for (int i = 0; i < 25; ++i)
            bench.Tick();
        EXPECT_EQ(bench.client.sink.FrameCount(), before + 25);
        EXPECT_TRUE(bench.ShowsText());
    }
    EXPECT_EQ(CountFiles(dumps), 0);
    for (int i = 0; i < 25; ++i)
        bench.Tick();
    EXPECT_GT(CountFiles(dumps), 0) << "with descriptors they come";
    EXPECT_EQ(EnableScreenShareDump(false), 0);
    EXPECT_TRUE(bench.ShowsText());
}

TEST_F(NoDescriptors, LeaveTheDebugFileUnreadAndTheSettingsAsTheyAre) {
    const CNoDescriptorsScope none;
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    ASSERT_NE(engine, nullptr);
    EXPECT_FALSE(AppShareConfig::Instance()->IsDummyCaptureEnabled());
    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
}

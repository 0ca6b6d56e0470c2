// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_frame.h"
#include "tests/platform/image_files.h"
#include "tests/src/share_frame_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

/// The pictures that a pass saves for a developer. Settings are one a process and files are real, so each of
/// these needs a process and a debug folder of its own.

namespace {

namespace fs = std::filesystem;
using Names = std::vector<std::string>;

constexpr unsigned BOTH = SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER;

class Dump : public testing::Test {
protected:
    void SetUp() override {
        const char* const folder = std::getenv("SCREENSHARE_DEBUG_DIR");
        if (folder == nullptr || !IsOnlyTestOfProcess())
            GTEST_SKIP() << "needs a process and a debug folder of its own: run it through CTest";
        m_debugFolder = folder;
        m_folder = m_debugFolder / "img-dump";
        fs::create_directory(m_folder);
        fs::permissions(m_folder, fs::perms::owner_all); // whatever the umask
    }

    /// An engine that has read these settings, with a capturer whose pictures can be saved.
    CEngineBench<>& MakeEngine(const std::string& settings = "{}") {
        const fs::path file = m_debugFolder / "share_config.json";
        std::ofstream(file) << settings;
        fs::permissions(file, fs::perms::owner_read | fs::perms::owner_write);
        m_bench = std::make_unique<CEngineBench<>>(true);
        m_bench->capturer.Change(
            [](CFakeCapturer::Answers& answers) { answers.format = SHARE_FRAME_FORMAT_RGB; });
        m_bench->BeginInline();
        return *m_bench;
    }

    /// Passes whose pictures are plain grey: 1, 2, 3 …
    void GreyPasses(int count) {
        for (int i = 0; i < count; ++i) {
            m_bench->capturer.SetFill(static_cast<unsigned char>(++m_grey));
            m_bench->Pass();
        }
    }

    Names Files() const {
        Names names;
        for (const fs::directory_entry& entry : fs::directory_iterator(m_folder))
            names.push_back(entry.path().filename());
        std::sort(names.begin(), names.end());
        return names;
    }
    DecodedImage Decode(const std::string& name) const {
        return DecodePng(ReadWholeFile((m_folder / name).string()));
    }

    void ExpectGrey(const std::string& name, int grey) const {
        const DecodedImage picture = Decode(name);
        ASSERT_EQ(picture.width, 8) << name;
        ASSERT_EQ(picture.height, 4) << name;
        for (int y = 0; y < 4; ++y) {
            for (int x = 0; x < 8; ++x)
                EXPECT_EQ(picture.At(x, y), (Colour{grey, grey, grey, 255})) << name;
        }
    }

    /// Twelve passes that try to dump twice, and what they cost.
    void ExpectThatDumpsCostNothing() {
        CEngineBench<>& bench = *m_bench;
        EnableScreenShareDump(true);
        GreyPasses(12);
        EXPECT_EQ(bench.sink.FrameCount(), 12u);
        EXPECT_EQ(bench.Statistic().nTotalFrames, 12);
        EXPECT_FALSE(bench.trace.Contains("ERROR"));
        EXPECT_FALSE(bench.trace.Contains("WARNING"));
        EXPECT_EQ(bench.sink.Notices(), Names{});
    }

    fs::path m_debugFolder;
    fs::path m_folder;
    std::unique_ptr<CEngineBench<>> m_bench;
    int m_grey = 0;
};

/// The pointer's picture in a dump.
class PointerDump : public Dump {
protected:
    ~PointerDump() override {
        if (m_image == nullptr)
            return;
        m_bench.reset(); // lets go of the image first
        m_image->Release();
    }

    void GivePointer(IShareFrame* picture, int hotX, int hotY, int x, int y) {
        m_image = new CFakePointingImg(m_imageCalls, picture, hotX, hotY);
        m_image->AddRef();
        m_bench->pointing->image = m_image;
        m_bench->pointing->x = x;
        m_bench->pointing->y = y;
    }

    static Held<> Arrow() {
        auto arrow = NewFrame(4, 3, SHARE_FRAME_FORMAT_RGBA);
        for (int y = 0; y < 3; ++y) {
            for (int x = 0; x < 4; ++x)
                WritePixel(CGPixelLayout::RGBA, arrow->GetFrameLineData(y) + x * 4, ArrowAt(x, y));
        }
        return arrow;
    }
    static Colour ArrowAt(int x, int y) { return {x * 60, y * 80, 200, 255}; }

private:
    CCallLog m_imageCalls; // the image outlives the bench and its log
    CFakePointingImg* m_image = nullptr;
};

} // namespace

TEST_F(Dump, IsNotWrittenUnlessItIsAskedFor) {
    MakeEngine();
    GreyPasses(11);
    EXPECT_EQ(Files(), Names{});
}

TEST_F(Dump, ShowsEveryTenthDeliveredPicture) {
    MakeEngine();
    EnableScreenShareDump(true);
    GreyPasses(21);
    EXPECT_EQ(Files(), (Names{"0_combined.png", "1_combined.png", "2_combined.png"}));
    ExpectGrey("0_combined.png", 1);
    ExpectGrey("1_combined.png", 11);
    ExpectGrey("2_combined.png", 21);
    EnableScreenShareDump(false);
    GreyPasses(10);
    EXPECT_EQ(Files().size(), 3u);
}

TEST_F(Dump, ComesAsOftenAsTheDebugFileSays) {
    MakeEngine(R"({"dump_raw_data_every_x_frames": 3})");
    EnableScreenShareDump(true);
    GreyPasses(7);
    EXPECT_EQ(Files(), (Names{"0_combined.png", "1_combined.png", "2_combined.png"}));
    ExpectGrey("2_combined.png", 7);
}

TEST_F(Dump, ReplacesTheOldestFileWhenTheRingIsFull) {
    MakeEngine(R"({"dump_raw_data_every_x_frames": 1, "dump_raw_data_ring_size": 2})");
    EnableScreenShareDump(true);
    GreyPasses(5);
    EXPECT_EQ(Files(), (Names{"0_combined.png", "1_combined.png", "2_combined.png"}));
    ExpectGrey("0_combined.png", 4);
    ExpectGrey("1_combined.png", 5);
    ExpectGrey("2_combined.png", 3);
}

TEST_F(Dump, SkipsTheNumberOfAPassThatDeliversNothing) {
    CEngineBench<>& bench = MakeEngine();
    EnableScreenShareDump(true);
    bench.capturer.ScriptResults({-1});
    GreyPasses(2);
    EXPECT_EQ(Files(), Names{"1_combined.png"});
    ExpectGrey("1_combined.png", 2);
}

TEST_F(Dump, ShowsThePictureAsItWasDelivered) {
    CEngineBench<>& bench = MakeEngine();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.format = SHARE_FRAME_FORMAT_ARGB; });
    EnableScreenShareDump(true);
    Bytes delivered;
    bench.sink.SetFrameHook([&](IShareFrame* frame) {
        delivered = FirstBytes(*frame, static_cast<std::size_t>(frame->GetFrameDataLen()));
    });
    bench.capturer.SetFill(77);
    bench.Pass();
    ASSERT_EQ(delivered, Bytes(8 * 4 * 4, 77));
    const DecodedImage picture = Decode("0_combined.png");
    ASSERT_EQ(picture.width, 8);
    // All four bytes are 77: white, premultiplied with that alpha.
    EXPECT_EQ(picture.At(7, 3), (Colour{255, 255, 255, 77}));
}

TEST_F(Dump, IsWrittenByTheWorker) {
    CEngineBench<>& bench = MakeEngine();
    EnableScreenShareDump(true);
    bench.engine->m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STOPPED;
    bench.capturer.SetFill(99);
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(Files(), Names{"0_combined.png"});
    ExpectGrey("0_combined.png", 99);
}

TEST_F(Dump, IsNotMadeOfAFormatThatCannotBeSaved) {
    CEngineBench<>& bench = MakeEngine();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.format = SHARE_FRAME_FORMAT_BGRA; });
    ExpectThatDumpsCostNothing();
    EXPECT_EQ(Files(), Names{});
}

TEST_F(Dump, CostsAPassNothingWithoutItsFolder) {
    MakeEngine();
    fs::remove(m_folder);
    ExpectThatDumpsCostNothing();
    EXPECT_FALSE(fs::exists(m_folder)) << "nobody makes the folder";
}

TEST_F(Dump, CostsAPassNothingWhenItsFolderIsAFile) {
    MakeEngine();
    fs::remove(m_folder);
    std::ofstream(m_folder) << "in the way";
    ExpectThatDumpsCostNothing();
    EXPECT_EQ(fs::file_size(m_folder), 10u);
}

TEST_F(Dump, CostsAPassNothingOnAFullDisk) {
    MakeEngine();
    const auto handler = std::signal(SIGXFSZ, SIG_IGN);
    rlimit before{};
    getrlimit(RLIMIT_FSIZE, &before);
    const rlimit full{16, before.rlim_max};
    setrlimit(RLIMIT_FSIZE, &full);
    ExpectThatDumpsCostNothing();
    setrlimit(RLIMIT_FSIZE, &before);
    std::signal(SIGXFSZ, handler);
    EXPECT_EQ(Files(), Names{});
}

TEST_F(PointerDump, ShowsThePointersPictureUnderItsPlace) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true})");
    const Held<> arrow = Arrow();
    GivePointer(arrow.get(), 3, 5, 100, 50);
    bench.Pass(BOTH);
    ASSERT_EQ(Files(), Names{"0_point_97_45_hot_3_5.png"});
    const DecodedImage picture = Decode("0_point_97_45_hot_3_5.png");
    ASSERT_EQ(picture.width, 4);
    ASSERT_EQ(picture.height, 3);
    for (int y = 0; y < 3; ++y) {
        for (int x = 0; x < 4; ++x)
            EXPECT_EQ(picture.At(x, y), ArrowAt(x, y));
    }
}

TEST_F(PointerDump, StandsBesideThePictureOfTheSameRound) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true, "dump_raw_data_every_x_frames": 2})");
    EnableScreenShareDump(true);
    const Held<> arrow = Arrow();
    GivePointer(arrow.get(), 3, 5, 1, 2);
    for (int i = 0; i < 3; ++i) {
        bench.capturer.SetFill(static_cast<unsigned char>(i));
        bench.Pass(BOTH);
    }
    EXPECT_EQ(Files(), (Names{"0_combined.png", "0_point_-2_-3_hot_3_5.png", "1_combined.png",
                              "1_point_-2_-3_hot_3_5.png"}));
}

TEST_F(PointerDump, IsNotMadeWithoutAPointerInThePass) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true})");
    const Held<> arrow = Arrow();
    GivePointer(arrow.get(), 3, 5, 100, 50);
    bench.Pass(SHARE_CAPTURE_MASK_CONTENT);
    EXPECT_EQ(Files(), Names{});
}

TEST_F(PointerDump, CostsAPassNothingWhenThePointerHasNoPicture) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true})");
    GivePointer(nullptr, 0, 0, 100, 50);
    bench.Pass(BOTH);
    EXPECT_EQ(Files(), Names{});
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_FALSE(bench.trace.Contains("ERROR"));
}

TEST_F(PointerDump, IsNotMadeInAFolderThatOthersMayWrite) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true, "dump_raw_data_every_x_frames": 1})");
    const Held<> arrow = Arrow();
    GivePointer(arrow.get(), 3, 5, 100, 50);
    fs::permissions(m_folder, fs::perms::owner_all | fs::perms::group_all);
    bench.Pass(BOTH);
    EXPECT_EQ(Files(), Names{});
    fs::permissions(m_folder, fs::perms::owner_all);
    bench.Pass(BOTH);
    EXPECT_EQ(Files(), Names{"1_point_97_45_hot_3_5.png"});
}

TEST_F(PointerDump, CostsAPassNothingWithoutItsFolder) {
    CEngineBench<>& bench = MakeEngine(R"({"dump_point_raw_data": true})");
    fs::remove(m_folder);
    const Held<> arrow = Arrow();
    GivePointer(arrow.get(), 3, 5, 100, 50);
    bench.Pass(BOTH);
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_TRUE(bench.sink.Frames()[0].pointerCaptured);
    EXPECT_FALSE(bench.trace.Contains("ERROR"));
}

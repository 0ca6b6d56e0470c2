// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"
#include "tests/support/threads.h"
#include "util/cm_trusted_file.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

// The settings of the process, and the debug file that they come from. The settings are one a process, so
// these tests count on a process of their own each, and on a debug folder of their own.

namespace {

namespace fs = std::filesystem;

class Settings : public testing::Test {
protected:
    void SetUp() override {
        const char* const folder = std::getenv("SCREENSHARE_DEBUG_DIR");
        if (folder == nullptr || !IsOnlyTestOfProcess())
            GTEST_SKIP() << "needs a process and a debug folder of its own: run it through CTest";
        m_folder = folder;
    }

    void WriteFile(const std::string& text) {
        std::ofstream(m_folder / "share_config.json", std::ios::binary) << text;
        fs::permissions(m_folder / "share_config.json", fs::perms::owner_read | fs::perms::owner_write);
    }
    void PassSeconds(int seconds) { m_clock->Advance(std::chrono::seconds(seconds)); }
    AppShareConfig& Config() { return *AppShareConfig::Instance(); }
    std::string DumpName() {
        const std::string prefix = Config().GetCaptureDumpPathNamePrefix();
        return prefix.substr(prefix.rfind('/') + 1);
    }

    fs::path m_folder;
    CManualClockScope m_clock;
};

} // namespace

TEST_F(Settings, HaveTheirDefaultsWithoutAFile) {
    EXPECT_FALSE(Config().IsDummyPointEnabled());
    EXPECT_FALSE(Config().IsDummySourceEnabled());
    EXPECT_FALSE(Config().IsDummyPointSysPosEnabled());
    EXPECT_FALSE(Config().IsDummyCaptureEnabled());
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 1024);
    EXPECT_EQ(Config().GetDummyCaptureHeight(), 768);
    EXPECT_FALSE(Config().IsCaptureDumpPointDataEnabled());
    EXPECT_FALSE(Config().IsCaptureDumpDataEnabled());
    EXPECT_EQ(Config().GetDumpDataRingSize(), 100);
    EXPECT_EQ(Config().GetDumpDataEveryFrames(), 10);
    EXPECT_TRUE(Config().m_bCaptureResampleEnable);
    EXPECT_FALSE(Config().m_bCaptureResampleFixSizeEnable);
    EXPECT_EQ(Config().GetResampleScreenCaptureWidth(), 1920);
    EXPECT_EQ(Config().GetResampleScreenCaptureHeight(), 1080);
    EXPECT_FALSE(Config().IsWin8EnableMag());
    EXPECT_EQ(Config().GetFrameTraceFrequency(), 100);
    EXPECT_EQ(Config().GetScreenCapturerType(), 1);
    EXPECT_EQ(Config().GetCurrentScale(), 1.0F);
    EXPECT_EQ(Config().m_nAppShareBackgroundColor, 0x9e9e);
    EXPECT_EQ(Config().m_nOverlapFillColor, 0x9e9e);
    EXPECT_EQ(Config().m_nMagCapturerMaxExcludeWindowCount, 12);
    EXPECT_TRUE(Config().m_bChangeAeroMode);
    EXPECT_TRUE(Config().m_bAppDisplayByWindow);
    EXPECT_TRUE(Config().m_bEnableMagCatchException);
    EXPECT_EQ(Config().m_nShareConfigFlags, 0u);
}

TEST_F(Settings, ComeFromTheFile) {
    WriteFile(
        R"({"dump_point_raw_data": true, "dump_raw_data_ring_size": 3, "dump_raw_data_every_x_frames": 4,
        "dummy_point": true, "dummy_capture": true, "dummy_capture_width": 320, "dummy_capture_height": 200,
        "dummy_point_sys_pos": true, "dummy_enumerator": true, "capture_resample_enable": false,
        "capture_resample_fixsize_enable": true, "capture_resample_width": 1000, "capture_resample_height": 700,
        "EnableWin8MagCapture": true, "trace_one_by_frames": 7, "screen_capturer_type": 42, "unknown": [1, 2]})");
    Config().InitConfig();
    EXPECT_TRUE(Config().IsCaptureDumpPointDataEnabled());
    EXPECT_EQ(Config().GetDumpDataRingSize(), 3);
    EXPECT_EQ(Config().GetDumpDataEveryFrames(), 4);
    EXPECT_TRUE(Config().IsDummyPointEnabled());
    EXPECT_TRUE(Config().IsDummyCaptureEnabled());
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
    EXPECT_EQ(Config().GetDummyCaptureHeight(), 200);
    EXPECT_TRUE(Config().IsDummyPointSysPosEnabled());
    EXPECT_TRUE(Config().IsDummySourceEnabled());
    EXPECT_FALSE(Config().m_bCaptureResampleEnable);
    EXPECT_TRUE(Config().m_bCaptureResampleFixSizeEnable);
    EXPECT_EQ(Config().GetResampleScreenCaptureWidth(), 1000);
    EXPECT_EQ(Config().GetResampleScreenCaptureHeight(), 700);
    EXPECT_TRUE(Config().IsWin8EnableMag());
    EXPECT_EQ(Config().GetFrameTraceFrequency(), 7);
    EXPECT_EQ(Config().GetScreenCapturerType(), 42);
}

TEST_F(Settings, AreClampedWhenTheyAreRead) {
    WriteFile(R"({"dummy_capture_width": 0, "dummy_capture_height": -5, "dump_raw_data_ring_size": 0,
        "dump_raw_data_every_x_frames": 0, "trace_one_by_frames": -1, "capture_resample_width": 640,
        "capture_resample_height": 480})");
    Config().InitConfig();
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 1);
    EXPECT_EQ(Config().GetDummyCaptureHeight(), 1);
    EXPECT_EQ(Config().GetDumpDataRingSize(), 1);
    EXPECT_EQ(Config().GetDumpDataEveryFrames(), 1);
    EXPECT_EQ(Config().GetFrameTraceFrequency(), 1);
    EXPECT_EQ(Config().GetResampleScreenCaptureWidth(), 800);
    EXPECT_EQ(Config().GetResampleScreenCaptureHeight(), 600);
    EXPECT_EQ(Config().m_nResampleScreenCaptureWidth, 640);
}

TEST_F(Settings, IgnoreAKeyOfTheWrongType) {
    WriteFile(R"({"dummy_point": 1, "dummy_capture": "true", "dummy_capture_width": 320.0,
        "dummy_capture_height": true, "trace_one_by_frames": 3000000000})");
    Config().InitConfig();
    EXPECT_FALSE(Config().IsDummyPointEnabled());
    EXPECT_FALSE(Config().IsDummyCaptureEnabled());
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 1024);
    EXPECT_EQ(Config().GetDummyCaptureHeight(), 768);
    EXPECT_EQ(Config().GetFrameTraceFrequency(), 100);
}

TEST_F(Settings, KeepTheLastValueOfAKeyThatWasTakenOut) {
    WriteFile(R"({"dummy_capture_width": 320})");
    Config().InitConfig();
    WriteFile(R"({"dummy_capture_height": 200})");
    Config().InitConfig();
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
    EXPECT_EQ(Config().GetDummyCaptureHeight(), 200);
}

TEST_F(Settings, LookForAMissingFileElevenSecondsAfterTheFirstRefresh) {
    WriteFile("{\"dummy_capture_width\": 320,}"); // can't be read
    Config().InitConfig();
    PassSeconds(100);
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 1024); // the first refresh
    WriteFile(R"({"dummy_capture_width": 320})");
    PassSeconds(10);
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 1024);
    PassSeconds(1);
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
}

TEST_F(Settings, ReadAGoodFileAgainAfter61Seconds) {
    WriteFile(R"({"dummy_capture_width": 320})");
    Config().InitConfig();
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
    WriteFile(R"({"dummy_capture_width": 640})");
    PassSeconds(60);
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
    PassSeconds(1);
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 640);
}

TEST_F(Settings, OutliveAFileThatBecameUnreadable) {
    WriteFile(R"({"dummy_capture_width": 320})");
    Config().InitConfig();
    for (const char* text : {"", "{", "nonsense", "{\"a\":\"\\u\"}"}) {
        WriteFile(text);
        Config().InitConfig();
        EXPECT_EQ(Config().GetDummyCaptureWidth(), 320) << text;
        int width = 0;
        EXPECT_TRUE(Config().GetConfigInt("dummy_capture_width", width));
    }
    fs::remove(m_folder / "share_config.json");
    EXPECT_FALSE(Config().CheckConfig());
    fs::create_directory(m_folder / "share_config.json");
    EXPECT_FALSE(Config().CheckConfig());
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
}

TEST_F(Settings, OfTheCaptureModeAreOverwrittenByANewEngineUntilTheNextTimedRead) {
    WriteFile(R"({"screen_capturer_type": 8})");
    const CShareCaptureEngine engine;
    EXPECT_EQ(Config().GetScreenCapturerType(), 1);
    (void)Config().GetFrameTraceFrequency();
    PassSeconds(61);
    (void)Config().GetFrameTraceFrequency();
    EXPECT_EQ(Config().GetScreenCapturerType(), 8);
}

TEST_F(Settings, OfATextAreReadUpToItsFirstZeroByte) {
    EXPECT_TRUE(Config().CheckConfig("{\"a\":1}\0garbage"));
    EXPECT_FALSE(Config().CheckConfig(""));
    EXPECT_FALSE(Config().CheckConfig("{\"s\":\"\\u\"}")); // the reader throws there
    EXPECT_TRUE(Config().CheckConfig("[1]"));
    json::Value value;
    EXPECT_FALSE(Config().GetConfigValue("a", value)); // an array holds no keys
}

TEST_F(Settings, GiveADocumentsValuesByTheirExactType) {
    ASSERT_TRUE(Config().CheckConfig(R"({"b":true,"i":5,"d":1.5,"s":"x","o":{},"n":null})"));
    bool flag = false;
    int number = 7;
    double real = 7;
    std::string text = "before";
    json::Value value;
    EXPECT_TRUE(Config().GetConfigBool("b", flag));
    EXPECT_TRUE(flag);
    EXPECT_FALSE(Config().GetConfigBool("i", flag));
    EXPECT_FALSE(Config().GetConfigInt("d", number));
    EXPECT_EQ(number, 7);
    EXPECT_TRUE(Config().GetConfigInt("i", number));
    EXPECT_EQ(number, 5);
    EXPECT_FALSE(Config().GetConfigDouble("i", real));
    EXPECT_EQ(real, 7.0);
    EXPECT_TRUE(Config().GetConfigDouble("d", real));
    EXPECT_FALSE(Config().GetConfigString("o", text));
    EXPECT_EQ(text, "before");
    EXPECT_TRUE(Config().GetConfigString("s", text));
    EXPECT_EQ(text, "x");
    EXPECT_TRUE(Config().GetConfigValue("n", value));
    EXPECT_FALSE(Config().GetConfigValue("absent", value));
    Config().ClearConfig();
    EXPECT_FALSE(Config().GetConfigBool("b", flag));
}

TEST_F(Settings, NumberTheDumpsRoundTheRing) {
    WriteFile(R"({"dump_raw_data_ring_size": 2})");
    Config().InitConfig();
    EXPECT_EQ(Config().GetCaptureDumpPathNamePrefix(), (m_folder / "img-dump" / "0").string());
    for (const char* name : {"1", "2", "0", "1", "2", "0"})
        EXPECT_EQ(DumpName(), name);
}

TEST_F(Settings, TakeANewRingSizeOneCallLater) {
    WriteFile(R"({"dump_raw_data_ring_size": 5})");
    Config().InitConfig();
    for (const char* name : {"0", "1", "2", "3"})
        EXPECT_EQ(DumpName(), name);
    WriteFile(R"({"dump_raw_data_ring_size": 1})");
    PassSeconds(61);
    EXPECT_EQ(DumpName(), "4");
    EXPECT_EQ(DumpName(), "0");
}

TEST_F(Settings, OfTheScaleHaveAFloor) {
    Config().SetCurrentScale(2.0F);
    Config().SetCurrentScale(0);
    Config().SetCurrentScale(-1);
    Config().SetCurrentScale(std::nanf(""));
    EXPECT_EQ(Config().GetCurrentScale(), 2.0F);
    Config().SetCurrentScale(0.05F);
    EXPECT_EQ(Config().m_fCurrentScale, 0.05F);
    EXPECT_EQ(Config().GetCurrentScale(), 0.1F);
}

TEST_F(Settings, TurnACountOfNothingIntoTwelve) {
    Config().SetMagCapturerMaxExcludeWindowCount(3);
    EXPECT_EQ(Config().m_nMagCapturerMaxExcludeWindowCount, 3);
    Config().SetMagCapturerMaxExcludeWindowCount(0);
    EXPECT_EQ(Config().m_nMagCapturerMaxExcludeWindowCount, 12);
}

TEST_F(Settings, OfDummyCaptureFollowTheFlagToo) {
    Config().m_nShareConfigFlags = SHARE_CONFIG_FLAG_DUMMY_CAPTURE;
    EXPECT_TRUE(Config().IsDummyCaptureEnabled());
    Config().m_nShareConfigFlags = 0u;
    EXPECT_FALSE(Config().IsDummyCaptureEnabled());
    Config().SetDummyPointEnabled(true);
    EXPECT_TRUE(Config().IsDummyPointEnabled());
}

TEST_F(Settings, AreReadAndRefreshedByManyThreadsAtOnce) {
    WriteFile(R"({"dummy_capture_width": 320, "dummy_capture": true})");
    std::atomic<bool> stop{false};
    std::vector<std::thread> readers;
    for (int i = 0; i < 3; ++i)
        readers.emplace_back([&] {
            while (!stop) {
                (void)Config().GetDummyCaptureWidth();
                (void)Config().GetCaptureDumpPathNamePrefix();
                bool flag = false;
                (void)Config().GetConfigBool("dummy_capture", flag);
            }
        });
    for (int i = 0; i < 50; ++i) {
        PassSeconds(61);
        Config().UpdateConfig();
    }
    stop = true;
    for (std::thread& reader : readers)
        reader.join();
    EXPECT_EQ(Config().GetDummyCaptureWidth(), 320);
}

// Who may steer the process.

TEST_F(Settings, DoNotComeFromAFileThatOthersMayWrite) {
    WriteFile(R"({"dummy_capture_width": 320})");
    const fs::path file = m_folder / "share_config.json";
    for (const mode_t mode : {0620, 0602, 0666}) {
        ASSERT_EQ(chmod(file.c_str(), mode), 0);
        EXPECT_FALSE(Config().CheckConfig()) << mode;
    }
    ASSERT_EQ(chmod(file.c_str(), 0644), 0);
    EXPECT_TRUE(Config().CheckConfig());
}

TEST_F(Settings, DoNotComeFromAFolderThatOthersMayWrite) {
    WriteFile(R"({"dummy_capture_width": 320})");
    for (const mode_t mode : {0770, 0707, 01777}) {
        ASSERT_EQ(chmod(m_folder.c_str(), mode), 0);
        EXPECT_FALSE(Config().CheckConfig()) << mode;
    }
    ASSERT_EQ(chmod(m_folder.c_str(), 0755), 0);
    EXPECT_TRUE(Config().CheckConfig());
}

TEST_F(Settings, DoNotComeFromSomebodyElsesFile) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can give a file away";
    WriteFile(R"({"dummy_capture_width": 320})");
    ASSERT_EQ(chown((m_folder / "share_config.json").c_str(), 12345, 12345), 0);
    EXPECT_FALSE(Config().CheckConfig());
}

TEST_F(Settings, DoNotComeThroughALinkOrAPipe) {
    WriteFile(R"({"dummy_capture_width": 320})");
    const fs::path file = m_folder / "share_config.json";
    fs::rename(file, m_folder / "real.json");
    fs::create_symlink(m_folder / "real.json", file);
    EXPECT_FALSE(Config().CheckConfig());
    fs::remove(file);
    ASSERT_EQ(mkfifo(file.c_str(), 0600), 0);
    EXPECT_FALSE(Config().CheckConfig());
}

TEST_F(Settings, DoNotComeFromAHugeFile) {
    WriteFile("{\"a\":\"" + std::string((1 << 20) - 8, 'x') + "\"}");
    EXPECT_TRUE(Config().CheckConfig());
    WriteFile("{\"a\":\"" + std::string(1 << 20, 'x') + "\"}");
    EXPECT_FALSE(Config().CheckConfig());
}

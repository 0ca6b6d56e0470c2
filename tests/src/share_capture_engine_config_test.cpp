// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

// The switches of IShareCaptureEngine::Config.

namespace {

using Texts = std::vector<std::string>;

class EngineConfig : public testing::Test {
protected:
    int Set(int selector, void* data, unsigned size) {
        return bench.engine->Config(static_cast<SHARE_CAPTURE_ENGINE_CONFIG>(selector), data, size);
    }
    int SetByte(int selector, unsigned char value) { return Set(selector, &value, 1); }
    int SetWord(int selector, int value) { return Set(selector, &value, 4); }
    AppShareConfig& Settings() { return *AppShareConfig::Instance(); }

    CEngineBench<> bench;
};

const std::string PREFIX = "[CShareCaptureEngine::Config] ";

} // namespace

TEST_F(EngineConfig, RefusesNullZeroSizeAndUnknownSelectors) {
    unsigned value = 1;
    for (int selector = 1; selector <= 9; ++selector) {
        EXPECT_EQ(Set(selector, nullptr, 1), -2);
        EXPECT_EQ(Set(selector, &value, 0), -2);
    }
    for (const int selector : {0, 10, -1}) {
        EXPECT_EQ(Set(selector, &value, 1), -2);
        EXPECT_EQ(Set(selector, &value, 4), -2);
    }
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(EngineConfig, DemandsTheExactSizeOfEachSwitch) {
    unsigned char data[8] = {};
    for (int selector = 1; selector <= 9; ++selector) {
        const unsigned exact = selector == 7 || selector == 9 ? 4 : 1;
        for (unsigned size = 1; size <= 8; ++size) {
            SCOPED_TRACE(testing::Message() << selector << " with " << size);
            EXPECT_EQ(Set(selector, data, size), size == exact ? 0 : -2);
        }
    }
}

TEST_F(EngineConfig, StoresTheSwitchesOfTheEngineAndItsContext) {
    EXPECT_EQ(SetByte(1, 1), 0);
    EXPECT_TRUE(bench.engine->m_bCheckDupFrame);
    EXPECT_EQ(SetByte(2, 1), 0);
    EXPECT_FALSE(bench.engine->m_spShareCapturerContext->m_bNoWindowBaseArea);
    EXPECT_EQ(SetByte(2, 0), 0);
    EXPECT_TRUE(bench.engine->m_spShareCapturerContext->m_bNoWindowBaseArea);
    EXPECT_EQ(SetByte(3, 1), 0);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
    EXPECT_EQ(SetByte(3, 0), 0);
    EXPECT_FALSE(bench.engine->m_bForceFrame);
    EXPECT_EQ(SetByte(4, 1), 0);
    EXPECT_TRUE(bench.engine->m_spShareCapturerContext->m_bExcludeMenuBar);
}

TEST_F(EngineConfig, StoresTheSwitchesOfTheProcess) {
    EXPECT_EQ(SetByte(5, 1), 0);
    EXPECT_TRUE(Settings().m_bDisableSystemAnimation);
    EXPECT_EQ(SetByte(6, 0), 0);
    EXPECT_FALSE(Settings().m_bEnableMagCatchException);
    EXPECT_EQ(SetByte(8, 1), 0);
    EXPECT_TRUE(Settings().m_bEnableIpcScreenCapturer);
}

TEST_F(EngineConfig, TurnsACountOfNothingIntoTwelve) {
    EXPECT_EQ(SetWord(7, 30), 0);
    EXPECT_EQ(Settings().m_nMagCapturerMaxExcludeWindowCount, 30);
    EXPECT_EQ(SetWord(7, 0), 0);
    EXPECT_EQ(Settings().m_nMagCapturerMaxExcludeWindowCount, 12);
    EXPECT_EQ(SetWord(7, -1), 0);
    EXPECT_EQ(Settings().m_nMagCapturerMaxExcludeWindowCount, 12);
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(EngineConfig, RefusesAContentTypeBeyondOneAfterTracingIt) {
    EXPECT_EQ(SetWord(9, 1), 0);
    bench.Forget();
    EXPECT_EQ(SetWord(9, 2), -2);
    EXPECT_EQ(Settings().m_nShareContentType, 1);
    EXPECT_EQ(bench.trace.Lines(), Texts{Info(PREFIX + "SHARE_CONTENT_TYPE=2")});
    EXPECT_EQ(SetWord(9, 0), 0);
    EXPECT_EQ(Settings().m_nShareContentType, 0);
}

TEST_F(EngineConfig, TracesTheByteAsANumber) {
    for (const int selector : {1, 2, 3, 4, 5, 6, 8})
        EXPECT_EQ(SetByte(selector, 1), 0);
    EXPECT_EQ(bench.trace.Lines(),
              (Texts{Info(PREFIX + "SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME=1"),
                     Info(PREFIX + "SHARE_CAPTURE_ENGINE_CONFIG_WINDOW_BASE_AREA=1"),
                     Info(PREFIX + "SHARE_CAPTURE_ENGINE_CONFIG_EXCLUDE_MENUBAR=1"),
                     Info(PREFIX + "DISABLE_SYSTEM_ANIMATION=1"),
                     Info(PREFIX + "SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_MAG_CATCH_EXCEPTION=1"),
                     Info(PREFIX + "ENABLE_IPC_SCREEN_CAPTURER=1")}));
}

TEST_F(EngineConfig, ReadsAnOddByteAsTrue) {
    EXPECT_EQ(SetByte(1, 0xFF), 0);
    EXPECT_TRUE(bench.engine->m_bCheckDupFrame);
    EXPECT_EQ(bench.trace.Lines(), Texts{Info(PREFIX + "SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME=255")});
}

TEST_F(EngineConfig, ReadsDataFromAnyAddress) {
    unsigned char data[5] = {0, 1, 0, 0, 0};
    EXPECT_EQ(Set(9, data + 1, 4), 0);
    EXPECT_EQ(Settings().m_nShareContentType, 1);
}

TEST(EngineInterface, AnswersConfigWithMinusOneByDefault) {
    CEngineBench<> bench;
    unsigned char on = 1;
    EXPECT_EQ(bench.engine->IShareCaptureEngine::Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &on, 1), -1);
    EXPECT_FALSE(bench.engine->m_bForceFrame);
}

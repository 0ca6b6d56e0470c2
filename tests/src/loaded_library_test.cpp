// SPDX-License-Identifier: Apache-2.0
//
// The shared library as a client has it that loads it while it runs, and calls it by symbol.
#include "tests/support/sanitizer.h"
#include "tests/support/threads.h"

#include <screenshare/share_engine.h>

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <fstream>
#include <string>

namespace {

/// Fills a frame of 4 by 2 with another byte each time.
class CTinyCapturer : public CShareCapturerBase {
public:
    int Capture(IShareFrame* frame) override {
        unsigned char pixels[4 * 2 * 4];
        for (unsigned char& byte : pixels)
            byte = m_next;
        ++m_next;
        frame->SetFrameSize(4, 2);
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
        frame->WriteFrameData(pixels, sizeof pixels);
        return SHARE_CAPTURE_OK;
    }

private:
    unsigned char m_next = 1;
};

class CFrameTally : public IShareCaptureEngineSink {
public:
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame*, TVLRect&) override { frames.Add(); }
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    CTally frames;
};

bool IsMapped() {
    std::ifstream maps("/proc/self/maps");
    for (std::string line; std::getline(maps, line);)
        if (line.find("libscreenshare.so") != std::string::npos)
            return true;
    return false;
}

class LoadedLibrary : public testing::Test {
protected:
    void SetUp() override {
        m_library = dlopen(SCREENSHARE_LIBRARY_FILE, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(m_library, nullptr) << dlerror();
    }

    /// A function that the library shows under its plain name.
    template <class Function>
    Function* Find(Function*, const char* name) {
        auto* const found = reinterpret_cast<Function*>(dlsym(m_library, name));
        EXPECT_NE(found, nullptr) << name;
        return found;
    }

    void* m_library = nullptr;
};

} // namespace

TEST_F(LoadedLibrary, CapturesAndIsGoneWhenItIsClosed) {
    const auto init = Find(&ShareEngineInit, "ShareEngineInit");
    const auto uninit = Find(&ShareEngineUninit, "ShareEngineUninit");
    const auto create = Find(&CreateShareCaptureEngine, "CreateShareCaptureEngine");
    const auto destroy = Find(&DestroyShareCaptureEngine, "DestroyShareCaptureEngine");
    const auto threads = CountThreadsOfProcess();
    {
        CTinyCapturer capturer;
        CFrameTally sink;
        EXPECT_EQ(init(), 0);
        IShareCaptureEngine* const engine = create(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
        ASSERT_NE(engine, nullptr);
        EXPECT_EQ(engine->SetExternalIShareCapturer(&capturer), 0);
        EXPECT_EQ(engine->SetSink(&sink), 0);
        engine->SetCaptureFps(100); // gives what the capturer says to it
        EXPECT_EQ(engine->Start(), 0);
        EXPECT_TRUE(sink.frames.Reaches(3));
        EXPECT_EQ(destroy(engine), 0);
        EXPECT_EQ(uninit(), 0);
    }
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    ASSERT_TRUE(IsMapped());
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "what lives as long as the library counts as a leak once it is closed";
    EXPECT_EQ(dlclose(m_library), 0);
    EXPECT_FALSE(IsMapped());
}

TEST_F(LoadedLibrary, IsAnotherOneAfterEachLoading) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "what lives as long as the library counts as a leak once it is closed";
    for (int round = 0; round < 20; ++round) {
        const auto init = Find(&ShareEngineInit, "ShareEngineInit");
        const auto uninit = Find(&ShareEngineUninit, "ShareEngineUninit");
        init();
        uninit();
        ASSERT_EQ(dlclose(m_library), 0);
        ASSERT_FALSE(IsMapped()) << "round " << round;
        m_library = dlopen(SCREENSHARE_LIBRARY_FILE, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(m_library, nullptr);
    }
}

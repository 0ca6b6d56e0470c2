// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_frame.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>

/// Dumps are pictures of somebody's screen, in a folder that may lie where everybody can write: nobody else
/// gets them, and nobody has them written over something. Settings are one a process and files are real, so
/// each of these needs a process and a debug folder of its own.

namespace {

namespace fs = std::filesystem;

const std::string PRECIOUS = "precious";

std::string TextOf(const fs::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

std::ptrdiff_t FilesIn(const fs::path& folder) {
    return std::distance(fs::directory_iterator(folder), fs::directory_iterator());
}

class DumpSecurity : public testing::Test {
protected:
    void SetUp() override {
        const char* const folder = std::getenv("SCREENSHARE_DEBUG_DIR");
        if (folder == nullptr || !IsOnlyTestOfProcess())
            GTEST_SKIP() << "needs a process and a debug folder of its own: run it through CTest";
        m_own = folder;
        m_debugFolder = m_own / "debug";
        m_dumps = m_debugFolder / "img-dump";
        m_elsewhere = m_own / "elsewhere";
        for (const fs::path& each : {m_debugFolder, m_dumps, m_elsewhere}) {
            fs::create_directory(each);
            fs::permissions(each, fs::perms::owner_all);
        }
        m_victim = m_elsewhere / "victim";
        std::ofstream(m_victim) << PRECIOUS;
        UseAsDebugFolder(m_debugFolder);
    }

    /// Counts until the first engine has been made, when the settings ask for it.
    static void UseAsDebugFolder(const std::string& folder) {
        setenv("SCREENSHARE_DEBUG_DIR", folder.c_str(), 1);
    }

    /// Twelve delivered frames, two of which are dumped.
    void Deliver() {
        CEngineBench<> bench(true);
        bench.capturer.Change(
            [](CFakeCapturer::Answers& answers) { answers.format = SHARE_FRAME_FORMAT_RGB; });
        bench.BeginInline();
        EnableScreenShareDump(true);
        bench.Passes(12);
        EnableScreenShareDump(false);
        EXPECT_EQ(bench.sink.FrameCount(), 12u) << "a dump costs a frame";
        EXPECT_FALSE(bench.trace.Contains("ERROR"));
    }

    /// That the same frames are dumped once nothing is wrong any more.
    void ExpectDumps() {
        const std::ptrdiff_t before = FilesIn(m_dumps);
        Deliver();
        EXPECT_EQ(FilesIn(m_dumps), before + 2) << "nothing is dumped anyway, so the case shows nothing";
    }

    void ExpectNothingDumped() {
        Deliver();
        EXPECT_EQ(FilesIn(m_elsewhere), 1) << "only the victim";
        EXPECT_EQ(TextOf(m_victim), PRECIOUS);
    }

    /// `end` goes behind the link's name.
    void ExpectNoLinkFollowedInPlaceOfTheDebugFolder(const std::string& end) {
        fs::create_directory(m_elsewhere / "img-dump");
        fs::permissions(m_elsewhere / "img-dump", fs::perms::owner_all);
        const fs::path link = m_own / "link";
        fs::create_directory_symlink(m_elsewhere, link);
        for (const fs::path& folder : {m_elsewhere, m_debugFolder}) {
            std::ofstream(folder / "share_config.json") << "{}";
            ASSERT_EQ(chmod((folder / "share_config.json").c_str(), 0600), 0);
        }
        UseAsDebugFolder(link.string() + end);
        Deliver();
        EXPECT_EQ(FilesIn(m_elsewhere / "img-dump"), 0);
        EXPECT_FALSE(AppShareConfig::Instance()->CheckConfig()) << "the debug file is read through it";
        fs::remove(link);
        fs::rename(m_debugFolder, link);
        m_dumps = link / "img-dump";
        ExpectDumps();
        EXPECT_TRUE(AppShareConfig::Instance()->CheckConfig());
    }

    fs::path m_own;
    fs::path m_debugFolder;
    fs::path m_dumps;
    fs::path m_elsewhere;
    fs::path m_victim;
};

} // namespace

TEST_F(DumpSecurity, ReplacesALinkUnderItsNameAndNotWhatItPointsTo) {
    fs::create_symlink(m_victim, m_dumps / "0_combined.png");
    fs::create_hard_link(m_victim, m_dumps / "1_combined.png");
    Deliver();
    EXPECT_EQ(TextOf(m_victim), PRECIOUS);
    for (const char* const name : {"0_combined.png", "1_combined.png"}) {
        EXPECT_EQ(fs::symlink_status(m_dumps / name).type(), fs::file_type::regular) << name;
        EXPECT_EQ(TextOf(m_dumps / name).substr(1, 3), "PNG") << name;
    }
}

TEST_F(DumpSecurity, DoesNotFollowALinkInPlaceOfItsFolder) {
    fs::remove(m_dumps);
    fs::create_directory_symlink(m_elsewhere, m_dumps);
    ExpectNothingDumped();
    fs::remove(m_dumps);
    fs::create_directory(m_dumps);
    fs::permissions(m_dumps, fs::perms::owner_all);
    ExpectDumps();
}

TEST_F(DumpSecurity, DoesNotFollowALinkInPlaceOfTheDebugFolder) {
    ExpectNoLinkFollowedInPlaceOfTheDebugFolder("");
}

TEST_F(DumpSecurity, DoesNotFollowALinkThatIsNamedWithASlashBehindIt) {
    ExpectNoLinkFollowedInPlaceOfTheDebugFolder("//");
}

TEST_F(DumpSecurity, DoesNotWriteThroughLinksUnderItsTemporaryNames) {
    constexpr int MANY = 200;
    for (int i = 0; i < MANY; ++i)
        fs::create_symlink(m_victim, m_dumps / (".screenshare-" + std::to_string(getpid()) + "-" +
                                                std::to_string(i) + ".tmp"));
    Deliver();
    EXPECT_EQ(TextOf(m_victim), PRECIOUS);
    EXPECT_EQ(FilesIn(m_dumps), MANY) << "the names are others, so the case shows nothing";
    for (const fs::directory_entry& each : fs::directory_iterator(m_dumps))
        EXPECT_TRUE(each.is_symlink()) << each.path();
}

TEST_F(DumpSecurity, IsNotWrittenWhereOthersMayWrite) {
    for (const fs::path& folder : {m_dumps, m_debugFolder}) {
        for (const mode_t mode : {0770, 0707, 01777}) {
            ASSERT_EQ(chmod(folder.c_str(), mode), 0);
            Deliver();
            EXPECT_EQ(FilesIn(m_dumps), 0) << folder << " with " << std::oct << mode;
        }
        ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
    }
    ExpectDumps();
}

TEST_F(DumpSecurity, IsNotWrittenIntoSomebodyElsesFolder) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can give a folder away";
    for (const fs::path& folder : {m_dumps, m_debugFolder}) {
        ASSERT_EQ(chown(folder.c_str(), 12345, 12345), 0);
        Deliver();
        EXPECT_EQ(FilesIn(m_dumps), 0) << folder;
        ASSERT_EQ(chown(folder.c_str(), 0, 0), 0);
    }
    ExpectDumps();
}

TEST_F(DumpSecurity, CanBeOpenedByTheUserAlone) {
    const mode_t before = umask(0);
    Deliver();
    umask(before);
    struct stat status {};
    ASSERT_EQ(stat((m_dumps / "0_combined.png").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0600U);
}

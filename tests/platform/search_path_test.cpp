// SPDX-License-Identifier: Apache-2.0
#include "platform/search_path.h"
#include "tests/platform/image_files.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

namespace {

using namespace platform;
using Paths = std::vector<std::string>;

/// The documents folder of a home of the test's own.
class DocumentsFolder : public testing::Test {
protected:
    DocumentsFolder() {
        setenv("HOME", m_home.Path().c_str(), 1);
        unsetenv("XDG_CONFIG_HOME");
        std::filesystem::create_directory(m_home / ".config");
    }

    void WriteUserDirs(const std::string& text) {
        const std::string file = m_home / ".config/user-dirs.dirs";
        WriteWholeFile(file, text);
        std::filesystem::permissions(file, static_cast<std::filesystem::perms>(0600));
    }
    static Paths Documents() {
        return NSSearchPathForDirectoriesInDomains(NSDocumentDirectory, NSUserDomainMask);
    }

    TemporaryFolder m_home;
};

} // namespace

TEST_F(DocumentsFolder, IsDocumentsInTheHomeFolderByDefault) {
    EXPECT_EQ(Documents(), Paths{m_home / "Documents"});
}

TEST_F(DocumentsFolder, IsWhatTheDesktopSays) {
    WriteUserDirs("# comment\nXDG_MUSIC_DIR=\"$HOME/M\"\n  XDG_DOCUMENTS_DIR=\"$HOME/Mes \\\"docs\\\"/\"\n");
    EXPECT_EQ(Documents(), Paths{m_home / "Mes \"docs\""});
    WriteUserDirs("XDG_DOCUMENTS_DIR=\"/srv/docs\"");
    EXPECT_EQ(Documents(), Paths{"/srv/docs"});
    WriteUserDirs("XDG_DOCUMENTS_DIR=\"$HOME\"\n");
    EXPECT_EQ(Documents(), Paths{m_home.Path().string()});
    WriteUserDirs(
        "XDG_DOCUMENTS_DIR=\"/first\"\nXDG_DOCUMENTS_DIR=\"/second\"\nXDG_DOCUMENTS_DIR=\"third\"\n");
    EXPECT_EQ(Documents(), Paths{"/second"});
}

TEST_F(DocumentsFolder, IsTheDefaultForLinesThatSayNothing) {
    for (const char* const text :
         {"", "\n\n", "XDG_DOCUMENTS_DIR", "XDG_DOCUMENTS_DIR=/srv", "XDG_DOCUMENTS_DIR=\"\"",
          "XDG_DOCUMENTS_DIR=\"docs\"", "XDG_DOCUMENTS_DIR=\"$HOMEdocs\"", "XDG_DOCUMENTS_DIR=\"\\",
          "#XDG_DOCUMENTS_DIR=\"/srv\"", "   ", "XDG_DOCUMENTS_DIRECTORY=\"/srv\""}) {
        WriteUserDirs(text);
        EXPECT_EQ(Documents(), Paths{m_home / "Documents"}) << text;
    }
}

TEST_F(DocumentsFolder, IsLookedUpWhereTheDesktopKeepsItsSettings) {
    const TemporaryFolder config;
    WriteWholeFile(config / "user-dirs.dirs", "XDG_DOCUMENTS_DIR=\"$HOME/elsewhere\"");
    setenv("XDG_CONFIG_HOME", config.Path().c_str(), 1);
    EXPECT_EQ(Documents(), Paths{m_home / "elsewhere"});
    setenv("XDG_CONFIG_HOME", "relative", 1);
    EXPECT_EQ(Documents(), Paths{m_home / "Documents"});
}

TEST_F(DocumentsFolder, IsThatOfTheAccountWithoutAHomeInTheEnvironment) {
    for (const char* const home : {"", "relative"}) {
        setenv("HOME", home, 1);
        const Paths paths = Documents();
        ASSERT_EQ(paths.size(), 1u);
        EXPECT_EQ(paths[0].front(), '/');
    }
}

TEST_F(DocumentsFolder, IsTheOnlyOneKnown) {
    EXPECT_EQ(NSSearchPathForDirectoriesInDomains(static_cast<NSSearchPathDirectory>(5), NSUserDomainMask),
              Paths{});
    EXPECT_EQ(
        NSSearchPathForDirectoriesInDomains(NSDocumentDirectory, static_cast<NSSearchPathDomainMask>(2)),
        Paths{});
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/desktop_entries.h"
#include "tests/support/test_effort.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <iostream>
#include <random>

namespace platform::x11 {
namespace {

std::string NameIn(const std::string& text) {
    const std::optional<DesktopEntry> entry = ParseDesktopEntry(text);
    return entry ? entry->name : "(none)";
}

TEST(ParseDesktopEntry, TakesTheNameOfNoLanguage) {
    const std::optional<DesktopEntry> entry = ParseDesktopEntry(
        "# comment\n"
        "[Desktop Entry]\r\n"
        "Type=Application\n"
        "Name[de]=Texte\n"
        "Name = Text\\sEditor \n"
        "Name=Other\n"
        "StartupWMClass=Editor\n");
    ASSERT_TRUE(entry);
    EXPECT_EQ(*entry, (DesktopEntry{"Text Editor", "Editor", false}));
}

TEST(ParseDesktopEntry, LooksIntoNoOtherGroup) {
    EXPECT_EQ(NameIn("[Other]\nName=Wrong\nType=Application\n"
                     "[Desktop Entry]\nType=Application\nName=Right\n"
                     "[Desktop Action new]\nName=New\nStartupWMClass=x\n"),
              "Right");
    EXPECT_EQ(NameIn("[Desktop Entry]\nType=Application\n[Desktop Action new]\nName=New\n"), "(none)");
}

TEST(ParseDesktopEntry, RefusesWhatIsNoApplicationOrHasNoName) {
    EXPECT_EQ(NameIn(""), "(none)");
    EXPECT_EQ(NameIn("[Desktop Entry]\nName=Link\nType=Link\n"), "(none)");
    EXPECT_EQ(NameIn("[Desktop Entry]\nName=\nType=Application\n"), "(none)");
    EXPECT_EQ(NameIn("[Desktop Entry]\nName=\\n\\t\nType=Application\n"), "(none)");
    EXPECT_EQ(NameIn("Name=Text\nType=Application\n"), "(none)");
}

TEST(ParseDesktopEntry, MendsNamesThatAreNotText) {
    EXPECT_EQ(NameIn("[Desktop Entry]\nType=Application\nName=a\xFF\x01z\n"), "a\xEF\xBF\xBD z");
}

TEST(ParseDesktopEntry, TakesAnythingAtAll) {
    const unsigned seed = std::random_device()();
    std::mt19937 random(seed);
    const std::vector<std::string> pieces = {"[Desktop Entry]",
                                             "Name=",
                                             "Type=Application",
                                             "\n",
                                             "=",
                                             "\\",
                                             "StartupWMClass=",
                                             "Hidden",
                                             "\r",
                                             "#",
                                             "[",
                                             "x"};
    const int count = 20000 * TestEffort();
    int named = 0;
    for (int i = 0; i < count; ++i) {
        std::string text = random() % 2 == 0 ? "[Desktop Entry]\nType=Application\n" : "";
        for (auto more = random() % 20; more > 0; --more) {
            if (random() % 4 == 0)
                text.push_back(static_cast<char>(random()));
            else
                text += pieces[random() % pieces.size()];
        }
        const std::optional<DesktopEntry> entry = ParseDesktopEntry(text);
        ASSERT_TRUE(!entry || !entry->name.empty()) << "seed " << seed;
        named += entry ? 1 : 0;
    }
    std::cout << count << " texts, " << named << " entries, seed " << seed << "\n";
    EXPECT_GT(named, count / 100);
}

class DesktopEntriesTest : public testing::Test {
protected:
    DesktopEntriesTest() {
        for (const char* name : {"home", "system"})
            std::filesystem::create_directories(m_folder.Path() / name / "applications");
    }

    std::string Place(const std::string& file) const { return m_folder.File(file); }
    void Write(const std::string& file, const std::string& lines) const {
        std::ofstream(Place(file)) << "[Desktop Entry]\nType=Application\n" << lines;
    }
    DesktopEntries Entries() const { return DesktopEntries({Place("home"), Place("system")}); }
    static std::string Name(DesktopEntries& entries, const std::string& windowClass) {
        const std::string* const name = entries.NameOf(windowClass);
        return name != nullptr ? *name : "(none)";
    }

private:
    CScratchFolder m_folder;
};

TEST_F(DesktopEntriesTest, AreFoundByClassBeforeTheirFileName) {
    Write("system/applications/editor.desktop", "Name=By File\n");
    Write("system/applications/org.some.Thing.desktop", "Name=By Class\nStartupWMClass=Editor\n");
    DesktopEntries entries = Entries();
    EXPECT_EQ(Name(entries, "Editor"), "By Class");
    EXPECT_EQ(Name(entries, "EDITOR"), "By File");
    EXPECT_EQ(Name(entries, "Org.Some.Thing"), "By Class");
    EXPECT_EQ(Name(entries, "edit"), "(none)");
    EXPECT_EQ(Name(entries, ""), "(none)");
    EXPECT_EQ(Name(entries, "../applications/editor"), "(none)");
}

TEST_F(DesktopEntriesTest, OfAFolderCountOverThoseBehindIt) {
    Write("home/applications/editor.desktop", "Name=Mine\n");
    Write("system/applications/editor.desktop", "Name=Theirs\nStartupWMClass=Theirs\n");
    Write("home/applications/gone.desktop", "Name=Gone\nHidden=true\n");
    Write("system/applications/gone.desktop", "Name=Still There\n");
    DesktopEntries entries = Entries();
    EXPECT_EQ(Name(entries, "editor"), "Mine");
    EXPECT_EQ(Name(entries, "Theirs"), "(none)");
    EXPECT_EQ(Name(entries, "gone"), "(none)");
}

TEST_F(DesktopEntriesTest, AreReadAgainWhenAFolderChanges) {
    DesktopEntries entries = Entries();
    EXPECT_EQ(Name(entries, "late"), "(none)");
    Write("home/applications/late.desktop", "Name=Late\n");
    EXPECT_EQ(Name(entries, "late"), "Late");
    std::filesystem::remove(Place("home/applications/late.desktop"));
    EXPECT_EQ(Name(entries, "late"), "(none)");
}

TEST_F(DesktopEntriesTest, AreNotWaitedForNorReadWithoutBound) {
    ASSERT_EQ(mkfifo(Place("home/applications/pipe.desktop").c_str(), 0600), 0);
    std::filesystem::create_directory(Place("home/applications/folder.desktop"));
    std::filesystem::create_symlink("/dev/zero", Place("home/applications/endless.desktop"));
    Write("home/applications/large.desktop", "Name=Large\n" + std::string(1 << 20, 'x'));
    Write("home/applications/editor.desktop", "Name=Editor\n");
    DesktopEntries entries = Entries();
    EXPECT_EQ(Name(entries, "editor"), "Editor");
    EXPECT_EQ(Name(entries, "pipe"), "(none)");
    EXPECT_EQ(Name(entries, "folder"), "(none)");
    EXPECT_EQ(Name(entries, "endless"), "(none)");
    EXPECT_EQ(Name(entries, "large"), "(none)");
}

} // namespace
} // namespace platform::x11

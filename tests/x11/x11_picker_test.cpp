// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/image_files.h"
#include "tests/x11/x11_desk.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>

#include <signal.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <iomanip>
#include <iostream>
#include <memory>
#include <optional>
#include <set>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

/// The picker example on a real desktop with a window manager, as its user sees it.

namespace {

constexpr std::uint32_t LEAF = 0x20C040;
constexpr std::uint32_t BRICK = 0xB04020;
constexpr int END_MS = 30000;

class X11Picker : public testing::Test {
protected:
    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin() {
        X11DeskOptions options;
        options.manager = X11DeskOptions::Manager::Openbox;
        std::optional<std::string> missing = MissingProgram(options.Programs());
        if (std::string(SCREENSHARE_PICKER).empty())
            missing = "the examples are not built";
        if (missing) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        m_desk.emplace(options);
        m_desk->Settle();
        return true;
    }

    void StartPicker() {
        CChildProcess::Plan plan;
        plan.command = {SCREENSHARE_PICKER, "--out", Pictures().string()};
        plan.environment = {{"DISPLAY", m_desk->Rig().Display()}, {"SCREENSHARE_PLATFORM", "x11"}};
        plan.log = m_folder.File("output.log");
        m_picker = std::make_unique<CChildProcess>(plan);
        ASSERT_TRUE(Says("; now what changes\n")) << Output();
    }

    X11Desk& Desk() { return *m_desk; }
    CChildProcess& Program() { return *m_picker; }
    std::filesystem::path Pictures() const { return m_folder.Path() / "pictures"; }
    std::string Output() const {
        const Bytes bytes = ReadWholeFile(m_folder.File("output.log"));
        return std::string(bytes.begin(), bytes.end());
    }
    bool HasSaid(const std::string& text) const { return Output().find(text) != std::string::npos; }
    bool Says(const std::string& text) const {
        return ComesTrue([&] { return HasSaid(text); });
    }

    /// Whether it comes to be said. It has to be within a second; how long it takes here says more about the
    /// machine, so that is told and not judged.
    bool IsSaid(const std::string& what, const std::string& text, const std::function<void()>& act) const {
        const auto begin = std::chrono::steady_clock::now();
        act();
        const bool came = Says(text);
        const auto time =
            std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - begin);
        std::cout << what << ": said after " << time.count() << " ms\n";
        return came;
    }

    static std::string Line(char sign, const char* kind, unsigned id) {
        return std::string(1, sign) + ' ' + kind + ' ' + std::to_string(id) + ' ';
    }

    /// Of that size and of nothing but that colour, once it is.
    bool PictureBecomes(const std::string& file, int width, int height, std::uint32_t rgb) const {
        std::string seen = "nothing";
        const bool came = ComesTrue([&] {
            const DecodedImage image = DecodePng(ReadWholeFile(Pictures() / file));
            const std::vector<std::uint32_t> colours = ColoursOf(image);
            std::ostringstream text;
            text << image.width << "x" << image.height << std::hex << std::setfill('0');
            for (const std::uint32_t colour : colours)
                text << " #" << std::setw(8) << colour;
            seen = text.str();
            return image.width == width && image.height == height &&
                   colours == std::vector<std::uint32_t>{rgb << 8 | 0xFF};
        });
        if (!came)
            std::cout << file << " shows " << seen << "\n";
        return came;
    }

    /// 0xRRGGBBAA, each once.
    static std::vector<std::uint32_t> ColoursOf(const DecodedImage& image) {
        std::set<std::uint32_t> colours;
        for (std::size_t i = 0; i + 3 < image.pixels.size(); i += 4) {
            std::uint32_t colour = 0;
            for (std::size_t channel = i; channel < i + 4; ++channel)
                colour = colour << 8 | image.pixels[channel];
            colours.insert(colour);
        }
        return {colours.begin(), colours.end()};
    }

    void ExpectGoodEnd(int signal) {
        Program().Signal(signal);
        ASSERT_TRUE(Program().WaitForEnd(END_MS)) << Output();
        EXPECT_TRUE(Program().HasSucceeded()) << Output();
        EXPECT_FALSE(HasSaid("picker: ")) << Output();
    }

private:
    const CScratchFolder m_folder;
    std::optional<X11Desk> m_desk;
    std::unique_ptr<CChildProcess> m_picker; // ends before its display
};

TEST_F(X11Picker, ListsWhatIsThereAtItsStart) {
    if (!Begin())
        return;
    const pid_t pid = Desk().StartApplication("Writer").value_or(0);
    const auto window = Desk().AddWindow(pid, {{100, 80}, {200, 120}}, LEAF);
    ASSERT_TRUE(window && Desk().SetTitle(*window, "Letter"));
    Desk().Settle();
    StartPicker();
    const std::string number = std::to_string(pid);
    EXPECT_TRUE(HasSaid(" at 0,0, 1280x720\n"));
    EXPECT_TRUE(HasSaid("+ app " + number + " Writer\n"));
    EXPECT_TRUE(HasSaid(Line('+', "window", *window) + "\"Letter\" of " + number + ", 200x120 on monitor "));
    EXPECT_TRUE(PictureBecomes("window-" + std::to_string(*window) + ".png", 200, 120, LEAF));
    EXPECT_TRUE(PictureBecomes("app-" + number + ".png", 200, 120, LEAF));
    ExpectGoodEnd(SIGTERM);
    if (HasFailure())
        std::cout << Output();
}

TEST_F(X11Picker, TellsOfApplicationsThatComeAndGo) {
    if (!Begin())
        return;
    StartPicker();
    pid_t pid = 0;
    EXPECT_TRUE(IsSaid("Writer", " Writer\n", [&] { pid = Desk().StartApplication("Writer").value_or(0); }));
    std::optional<platform::CGWindowID> window;
    EXPECT_TRUE(IsSaid("its window", " of " + std::to_string(pid) + ", 200x120 on monitor ", [&] {
        window = Desk().AddWindow(pid, {{100, 80}, {200, 120}}, LEAF);
    }));
    ASSERT_TRUE(window);
    EXPECT_TRUE(PictureBecomes("window-" + std::to_string(*window) + ".png", 200, 120, LEAF));
    EXPECT_TRUE(PictureBecomes("app-" + std::to_string(pid) + ".png", 200, 120, LEAF));
    EXPECT_TRUE(IsSaid("the window's new title", "~ window " + std::to_string(*window) + " \"Letter\"",
                       [&] { Desk().SetTitle(*window, "Letter"); }));
    EXPECT_TRUE(IsSaid("the end of Writer", "- app " + std::to_string(pid) + " Writer\n",
                       [&] { Desk().EndApplication(pid); }));
    EXPECT_TRUE(Says(Line('-', "window", *window)));
    ExpectGoodEnd(SIGINT);
    if (HasFailure())
        std::cout << Output();
}

TEST_F(X11Picker, KeepsItsPicturesFresh) {
    if (!Begin())
        return;
    const pid_t pid = Desk().StartApplication("Writer").value_or(0);
    const auto window = Desk().AddWindow(pid, {{100, 80}, {200, 120}}, LEAF);
    ASSERT_TRUE(window);
    Desk().Settle();
    StartPicker();
    const std::string file = "window-" + std::to_string(*window) + ".png";
    ASSERT_TRUE(PictureBecomes(file, 200, 120, LEAF)) << Output();
    ASSERT_TRUE(Desk().Recolour(*window, BRICK));
    EXPECT_TRUE(PictureBecomes(file, 200, 120, BRICK)) << Output();
    ExpectGoodEnd(SIGINT);
}

/// A larger window changes what an application looks like in a picker.
TEST_F(X11Picker, FetchesTheApplicationsPictureAnewWithItsNewWindows) {
    if (!Begin())
        return;
    const pid_t pid = Desk().StartApplication("Writer").value_or(0);
    ASSERT_TRUE(Desk().AddWindow(pid, {{100, 80}, {200, 120}}, LEAF));
    Desk().Settle();
    StartPicker();
    const std::string file = "app-" + std::to_string(pid) + ".png";
    ASSERT_TRUE(PictureBecomes(file, 200, 120, LEAF)) << Output();
    ASSERT_TRUE(Desk().AddWindow(pid, {{50, 50}, {400, 300}}, BRICK));
    EXPECT_TRUE(PictureBecomes(file, 400, 300, BRICK)) << Output();
    ExpectGoodEnd(SIGINT);
}

TEST_F(X11Picker, OutlivesTheDisplayAndFindsItAgain) {
    if (!Begin())
        return;
    const pid_t pid = Desk().StartApplication("Writer").value_or(0);
    const auto window = Desk().AddWindow(pid, {{100, 80}, {200, 120}}, LEAF);
    ASSERT_TRUE(window);
    Desk().Settle();
    StartPicker();
    Desk().Lose();
    EXPECT_TRUE(Says(Line('-', "window", *window))) << Output();
    EXPECT_TRUE(HasSaid("- monitor ")) << Output();
    EXPECT_FALSE(HasSaid("- app ")) << "its process is still there\n" << Output();
    Desk().FindAgain();
    const auto again = Desk().AddWindow(pid, {{100, 80}, {300, 90}}, BRICK);
    ASSERT_TRUE(again);
    EXPECT_TRUE(Says(" of " + std::to_string(pid) + ", 300x90 on monitor ")) << Output();
    EXPECT_TRUE(PictureBecomes("window-" + std::to_string(*again) + ".png", 300, 90, BRICK)) << Output();
    ExpectGoodEnd(SIGINT);
}

} // namespace

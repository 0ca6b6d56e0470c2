// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "tests/platform/conformance_checks.h"
#include "tests/platform/conformance_fixture.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>

/// Shares of windows from the client's first call to the pixels in its sink, on a desktop of any kind with a
/// small display beside the main one. What must not be seen is pure red, and nothing else has any red but the
/// popup, which is yellow.
class FollowedShare : public testing::TestWithParam<ShareDeskKind> {
protected:
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr std::uint32_t TEAL = 0x008080;
    static constexpr std::uint32_t YELLOW = 0xFFFF00;
    static constexpr std::uint32_t BACKGROUND = 0x009E9E;
    static constexpr TVLSize SIDE_SIZE{100, 60};
    static constexpr int TEXT_PIXELS = 60 * 40;
    static constexpr int NOTES_PIXELS = 50 * 30;
    static constexpr const char* CROSSES = "event 1 1";
    static constexpr const char* CROSSES_NO_MORE = "event 1 0";
    static constexpr const char* DISPLAY_GONE = "error -203";
    static constexpr const char* NO_APPLICATION = "error -204";

    explicit FollowedShare(SHARE_CAPTURE_ENGINE_TYPE type) : client(type) {}

    static platform::CGRect Rect(float x, float y, float width, float height) {
        return {{x, y}, {width, height}};
    }

    /// A wallpaper on the main display with an editor's text on it, and somebody with secrets.
    void SetUp() override {
        if (m_desk == nullptr)
            GTEST_SKIP() << "this machine lacks what it takes";
        const auto monitor = m_desk->AddDisplay({100, 60});
        NEEDS(monitor);
        side = *monitor;
        m_desk->Settle();
        left = platform::CGDisplayBounds(side).origin.x;
        mainBounds = platform::CGDisplayBounds(platform::CGMainDisplayID());
        const auto painting = m_desk->StartApplication("Desktop");
        const auto editing = m_desk->StartApplication("Editor");
        const auto hiding = m_desk->StartApplication("Secrets");
        NEEDS(painting && editing && hiding);
        desktop = *painting;
        editor = *editing;
        secrets = *hiding;
        const unsigned flags = SHARE_CONFIG_FLAG_NO_POINTER; // it would cover pixels that are counted
        EXPECT_EQ(ShareConfig(SHARE_CONFIG_FLAG, &flags, sizeof(flags)), 0);
        NEEDS(Open(desktop, Rect(0, 0, 200, 120), TEAL));
        const auto opened = Open(editor, TextFrame(), GREEN);
        NEEDS(opened);
        text = *opened;
        m_shareDesk->CloseOwnWindow(editor);
        m_desk->Settle();
    }

    // ---- Windows

    platform::CGRect TextFrame() const { return Rect(20, 20, 60, 40); }
    platform::CGRect TextFrameOnSide() const { return Rect(left + 10, 10, 60, 40); }
    platform::CGRect NotesFrame() const { return Rect(110, 30, 50, 30); }
    platform::CGRect NotesFrameOnSide() const { return Rect(left + 40, 20, 50, 30); }

    /// A window in front of all, painted: from then on the first frame has to show it.
    std::optional<platform::CGWindowID> Open(pid_t owner, const platform::CGRect& frame, std::uint32_t rgb) {
        return Painted(m_desk->AddWindow(owner, frame, rgb), owner, frame, rgb);
    }
    std::optional<platform::CGWindowID> OpenPopup(pid_t owner, const platform::CGRect& frame,
                                                  std::uint32_t rgb) {
        return Painted(m_shareDesk->AddPopup(owner, frame, rgb), owner, frame, rgb);
    }
    /// In front of that window and half of the next one.
    void CoverWithSecret(const platform::CGRect& frame) {
        const auto covering = Open(secrets, frame, RED);
        NEEDS(covering);
        secret = *covering;
    }
    void Move(platform::CGWindowID window, const platform::CGRect& frame) {
        EXPECT_TRUE(m_desk->SetFrame(window, frame));
        m_desk->Settle();
    }

    // ---- What comes

    void Run(std::chrono::milliseconds time) { m_shareDesk->Run(*client, time); }
    template <class Condition>
    [[nodiscard]] bool RunUntil(Condition holds) {
        return m_shareDesk->RunUntil(*client, holds);
    }
    [[nodiscard]] bool RunUntilTold(const std::string& notice) {
        return RunUntil([&] { return Told(notice); });
    }
    /// Until a frame of that size has so many pixels of the colour.
    [[nodiscard]] bool RunUntilShown(TVLSize size, std::uint32_t rgb, int count) {
        return RunUntil([&] { return client.Last().Size() == size && client.Last().Count(rgb) == count; });
    }
    [[nodiscard]] bool Told(const std::string& notice) { return client.sink.CountNotices(notice) > 0; }

    TVLSize MainSize() const {
        return {static_cast<int>(mainBounds.size.width), static_cast<int>(mainBounds.size.height)};
    }
    TVLRect MainRect() const { return {0, 0, MainSize().cx, MainSize().cy}; }
    TVLRect SideRect() const {
        const auto x = static_cast<int>(left);
        return {x, 0, x + SIDE_SIZE.cx, SIDE_SIZE.cy};
    }
    static std::string SizeNotice(TVLSize size) {
        return "size " + std::to_string(size.cx) + "x" + std::to_string(size.cy);
    }
    static std::string PositionNotice(const TVLRect& rect) {
        return "position " + std::to_string(rect.left) + "," + std::to_string(rect.top) + " " +
               std::to_string(rect.right - rect.left) + "x" + std::to_string(rect.bottom - rect.top);
    }

    /// That the last frame shows the main display with so much of the text and the notes, and background.
    void ExpectOnMain(int textPixels, int notesPixels = 0) {
        const DeliveredShot shot = client.Last();
        EXPECT_EQ(shot.Size(), MainSize());
        EXPECT_EQ(shot.meta.rectCapture, MainRect());
        ExpectOnly(shot, textPixels, notesPixels);
    }
    void ExpectOnSide(int textPixels, int notesPixels = 0) {
        const DeliveredShot shot = client.Last();
        EXPECT_EQ(shot.Size(), SIDE_SIZE);
        EXPECT_EQ(shot.meta.rectCapture, SideRect());
        ExpectOnly(shot, textPixels, notesPixels);
    }

    // ---- Courses that a share of any kind takes alike: each begins with the text alone shared and shown

    void FollowTheTextToTheSideAndBack();
    void TellOfNotesOnTheSide(platform::CGWindowID notes);
    void LoseTheSideAndGetItBack();
    void MinimiseAndRestoreTheText();

    CSettingsScope settings;
    const std::unique_ptr<ShareDesk> m_shareDesk = GetParam().make();
    ConformanceDesk* const m_desk = m_shareDesk != nullptr ? &m_shareDesk->Desk() : nullptr;
    CShareClient client;

    platform::CGDirectDisplayID side = 0;
    float left = 0; // of the side display
    platform::CGRect mainBounds;
    pid_t desktop = 0;
    pid_t editor = 0;
    pid_t secrets = 0;
    platform::CGWindowID text = 0;
    platform::CGWindowID secret = 0;

private:
    static void ExpectOnly(const DeliveredShot& shot, int textPixels, int notesPixels) {
        EXPECT_EQ(shot.Count(GREEN), textPixels);
        EXPECT_EQ(shot.Count(BLUE), notesPixels);
        EXPECT_EQ(shot.Count(BACKGROUND), shot.Size().cx * shot.Size().cy - textPixels - notesPixels);
    }

    /// Of the window that the application has there; 0 for none. It is listed by a number of its own where an
    /// application was given one that a window of another had.
    platform::CGWindowID ListedNumber(pid_t owner, const platform::CGRect& frame) {
        const auto snapshot = m_desk->Server().GetWindows();
        for (const platform::WindowInfo& window : snapshot->Windows()) {
            if (window.owner == owner && window.frame == frame)
                return window.id;
        }
        return 0;
    }
    bool IsPainted(platform::CGWindowID window, std::uint32_t rgb) {
        platform::WindowPictureRequest request;
        request.windows = {window};
        request.rect = Rect(-10000, -10000, 30000, 30000);
        request.deadline = CmSteadyNow() + PATIENCE;
        const auto picture = m_desk->Server().TakeWindowPicture(request).picture;
        return picture != nullptr && picture->layers.size() == 1 && Shows(*picture->layers[0].picture, rgb);
    }
    std::optional<platform::CGWindowID> Painted(std::optional<platform::CGWindowID> window, pid_t owner,
                                                const platform::CGRect& frame, std::uint32_t rgb) {
        if (!window)
            return std::nullopt;
        m_desk->Settle();
        EXPECT_TRUE(RunUntil([&] { return IsPainted(ListedNumber(owner, frame), rgb); }));
        return window;
    }
};

inline void FollowedShare::FollowTheTextToTheSideAndBack() {
    client.sink.Clear();
    Move(text, TextFrameOnSide());
    ASSERT_TRUE(RunUntilShown(SIDE_SIZE, GREEN, TEXT_PIXELS));
    ExpectOnSide(TEXT_PIXELS);
    EXPECT_EQ(client.Last().At(10, 10), FramePixel{GREEN});
    EXPECT_TRUE(RunUntilTold(SizeNotice(SIDE_SIZE)));
    EXPECT_TRUE(RunUntilTold(PositionNotice(SideRect())));
    client.sink.Clear();
    Move(text, TextFrame());
    ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
    ExpectOnMain(TEXT_PIXELS);
    EXPECT_EQ(client.Last().At(20, 20), FramePixel{GREEN});
    EXPECT_TRUE(RunUntilTold(SizeNotice(MainSize())));
    EXPECT_TRUE(RunUntilTold(PositionNotice(MainRect())));
    EXPECT_FALSE(Told(CROSSES));
    EXPECT_FALSE(Told(DISPLAY_GONE));
}

/// Of windows on two displays those on the display of the front one are shown.
inline void FollowedShare::TellOfNotesOnTheSide(platform::CGWindowID notes) {
    EXPECT_TRUE(m_desk->Raise(text));
    const auto before = CmSteadyNow();
    Move(notes, NotesFrameOnSide());
    ASSERT_TRUE(RunUntilTold(CROSSES));
    EXPECT_GE(CmSteadyNow() - before, std::chrono::milliseconds(1001));
    EXPECT_EQ(client.sink.CountNotices(CROSSES), 1u);
    ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
    ExpectOnMain(TEXT_PIXELS);
    EXPECT_TRUE(m_desk->Raise(notes));
    m_desk->Settle();
    ASSERT_TRUE(RunUntilShown(SIDE_SIZE, BLUE, NOTES_PIXELS)) << "now these are in front";
    ExpectOnSide(0, NOTES_PIXELS);
    EXPECT_FALSE(Told(CROSSES_NO_MORE));
    Move(notes, NotesFrame());
    ASSERT_TRUE(RunUntilTold(CROSSES_NO_MORE));
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(TEXT_PIXELS, NOTES_PIXELS);
    EXPECT_EQ(client.sink.CountNotices(CROSSES), 1u);
}

inline void FollowedShare::LoseTheSideAndGetItBack() {
    Move(text, TextFrameOnSide());
    ASSERT_TRUE(RunUntilShown(SIDE_SIZE, GREEN, TEXT_PIXELS));
    NEEDS(m_desk->Unplug(side));
    ASSERT_TRUE(RunUntilTold(DISPLAY_GONE));
    Run(std::chrono::seconds(1));
    EXPECT_EQ(client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    NEEDS(m_desk->PlugInAgain(side));
    m_desk->Settle();
    // A window manager may have taken it to the other display meanwhile.
    Move(text, TextFrameOnSide());
    ASSERT_TRUE(RunUntilShown(SIDE_SIZE, GREEN, TEXT_PIXELS));
    ExpectOnSide(TEXT_PIXELS);
    EXPECT_EQ(client.sink.CountNotices(DISPLAY_GONE), 1u);
    EXPECT_EQ(client.Statistic().nFlags, 0u) << "nothing that it would have to fall back from";
}

inline void FollowedShare::MinimiseAndRestoreTheText() {
    NEEDS(m_desk->Minimise(text));
    ASSERT_TRUE(RunUntilShown(MainSize(), BACKGROUND, MainSize().cx * MainSize().cy));
    ExpectOnMain(0);
    NEEDS(m_desk->Restore(text));
    ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
    ExpectOnMain(TEXT_PIXELS);
    EXPECT_FALSE(Told(NO_APPLICATION));
    EXPECT_FALSE(Told(DISPLAY_GONE));
}

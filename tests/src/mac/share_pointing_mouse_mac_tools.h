// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/notices.h"
#include "platform/simulated/simulated_window_server.h"
#include "src/mac/share_pointing_mouse_mac.h"
#include "src/share_ref.h"
#include "tests/support/settings_scope.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>
#include <vector>

// A simulated desktop with a pointer, and who hears of it.

inline constexpr unsigned NO_DISPLAY = 0xFFFFFFFFu;
inline constexpr unsigned MAIN = 1;
inline constexpr unsigned SIDE = 2;

inline platform::SimulatedCursor Cursor(int edge, std::uint32_t rgb, float scale = 1.0F) {
    platform::SimulatedCursor cursor;
    cursor.hotSpot = {3, 5};
    cursor.representations.push_back({edge, edge, scale, platform::SimulatedContent::Colour(rgb)});
    return cursor;
}

inline platform::SimulatedCursor PointingAt(platform::SimulatedCursor cursor, float x, float y) {
    cursor.hotSpot = {x, y};
    return cursor;
}

inline platform::SimulatedDesktop TwoDisplays() {
    platform::SimulatedDesktop desktop;
    platform::SimulatedDisplay main;
    main.id = MAIN;
    main.bounds = {{0, 0}, {1920, 1080}};
    platform::SimulatedDisplay side = main;
    side.id = SIDE;
    side.bounds = {{1920, 0}, {1280, 800}};
    desktop.displays = {main, side};
    desktop.pointer = platform::CGPoint{100, 50};
    desktop.cursor = Cursor(8, 0x102030);
    return desktop;
}

/// What an image was when a sink heard of it.
struct ImageTold {
    int hotX;
    int hotY;
    TVLSize size;
    SHARE_FRAME_FORMAT format;
    bool isStamped;
    std::vector<std::uint8_t> pixels;
};

/// Logs what it is told.
class CPointerSink : public ISharePointingSink {
public:
    int OnPointingPosChanged(int x, int y) override {
        positions.push_back(std::to_string(x) + "," + std::to_string(y));
        return -1;
    }
    int OnPointingImgChanged(ISharePointingImg* image) override {
        if (throws)
            throw std::bad_alloc();
        ImageTold told{};
        told.hotX = image->GetHotPointX();
        told.hotY = image->GetHotPointY();
        IShareFrame* const frame = image->GetImgData();
        frame->GetFrameSize(told.size);
        told.format = frame->GetFrameDataFormat();
        told.isStamped = frame->GetTimestamp() != 0;
        told.pixels.resize(static_cast<std::size_t>(frame->GetFrameDataLen()));
        frame->ReadFrameData(told.pixels.data(), frame->GetFrameDataLen());
        images.push_back(std::move(told));
        last = ShareRef<ISharePointingImg>(image);
        return -1;
    }

    bool throws = false;
    std::vector<std::string> positions;
    std::vector<ImageTold> images;
    ShareRef<ISharePointingImg> last;
};

/// Comes back when the notices of all that was changed before have been delivered.
inline bool NoticesAreDelivered(platform::SimulatedWindowServer& server) {
    static pid_t pid = 5000;
    const auto delivered = std::make_shared<CTally>();
    const platform::NoticeKey key{reinterpret_cast<std::uintptr_t>(delivered.get()), 0};
    const platform::NoticeKinds kinds = platform::NoticeKindBit(platform::NoticeKind::ApplicationLaunched);
    if (!platform::AddNoticeHandler(kinds, key, [delivered](const platform::Notice&) { delivered->Add(); }))
        return false;
    platform::ApplicationInfo fence;
    fence.pid = ++pid;
    fence.name = "Fence";
    server.StartApplication(fence);
    const bool reached = delivered->Reaches(1);
    server.EndApplication(fence.pid);
    platform::RemoveNoticeHandler(kinds, key);
    return reached;
}

/// A main display at 0,0 with the pointer on it, and another one to its right.
class SharePointingMouseMac : public testing::Test {
protected:
    SharePointingMouseMac() : m_former(platform::ReplaceWindowServer(server)) {}
    ~SharePointingMouseMac() override { platform::ReplaceWindowServer(m_former); }

    /// A mouse that has been polled once, with a sink that has forgotten it.
    std::unique_ptr<CSharePointingMouseMac> Polled(unsigned display) {
        auto mouse = std::make_unique<CSharePointingMouseMac>(display);
        mouse->AddSink(&sink);
        EXPECT_EQ(mouse->Start(), 0);
        EXPECT_EQ(mouse->CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
        Forget();
        return mouse;
    }
    void Forget() {
        sink.positions.clear();
        sink.images.clear();
    }
    /// What the sink hears of positions when the pointer is there at the next poll.
    std::vector<std::string> PositionsAt(CSharePointingMouseMac& mouse, float x, float y) {
        server->SetPointer(platform::CGPoint{x, y});
        EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
        return std::exchange(sink.positions, {});
    }
    /// How many images the sink hears of when the cursor is that at the next poll.
    std::size_t ImagesOf(CSharePointingMouseMac& mouse, std::optional<platform::SimulatedCursor> cursor) {
        server->SetCursor(std::move(cursor));
        EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
        return std::exchange(sink.images, {}).size();
    }
    /// The image that a first poll in that format tells.
    ImageTold FirstImage(std::optional<platform::SimulatedCursor> cursor,
                         SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_RGBA) {
        server->SetCursor(std::move(cursor));
        CPointerSink own;
        CSharePointingMouseMac mouse(MAIN);
        mouse.AddSink(&own);
        EXPECT_EQ(mouse.CapturePoint(format), 0);
        EXPECT_EQ(own.images.size(), 1u);
        return own.images.empty() ? ImageTold{} : own.images[0];
    }

    const CSettingsScope settings;
    const std::shared_ptr<platform::SimulatedWindowServer> server =
        std::make_shared<platform::SimulatedWindowServer>(TwoDisplays());
    CPointerSink sink;

private:
    const std::shared_ptr<platform::WindowServer> m_former;
};

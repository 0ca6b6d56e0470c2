// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/pointer_watch.h"
#include "tests/platform/conformance_checks.h"
#include "tests/x11/component_bench.h"

#include <gtest/gtest.h>
#include <xcb/xfixes.h>

#include <iostream>

namespace platform::x11 {
namespace {

class PointerBench : public ComponentBench {
public:
    PointerBench() : ComponentBench(SmallServer(XServerOptions::Kind::Xvfb)), pointer(connection, memory) {
        pointer.Select();
        pointer.Read();
    }

    /// A cursor of 16 x 16: `rows` from the top are opaque and of that colour, the others empty.
    void SetCursor(std::uint16_t red, std::uint16_t green, std::uint16_t rows, std::uint16_t hotX,
                   std::uint16_t hotY) {
        const xcb_pixmap_t shape = xcb_generate_id(link.Get());
        xcb_create_pixmap(link.Get(), 1, shape, link.Root(), 16, 16);
        Fill(shape, 0, {0, 0, 16, 16});
        if (rows > 0)
            Fill(shape, 1, {0, 0, 16, rows});
        const xcb_cursor_t cursor = xcb_generate_id(link.Get());
        xcb_create_cursor(link.Get(), cursor, shape, shape, red, green, 0, 0, 0, 0, hotX, hotY);
        xcb_change_window_attributes(link.Get(), link.Root(), XCB_CW_CURSOR, &cursor);
        xcb_free_cursor(link.Get(), cursor);
        xcb_free_pixmap(link.Get(), shape);
        Settle();
    }

    bool Settle() {
        Drain([this](const xcb_generic_event_t& event) { pointer.OnEvent(event); });
        return pointer.Settle();
    }

    PointerWatch pointer;
};

bool Lacks() {
    const auto missing = MissingProgram(XServer::ProgramsOf(XServerOptions::Kind::Xvfb));
    if (missing)
        std::cout << *missing << "\n";
    return missing.has_value();
}

TEST(PointerWatch, TellsWhereThePointerIsInTheRoot) {
    if (Lacks())
        GTEST_SKIP();
    PointerBench bench;
    bench.MovePointer(17, 205);
    EXPECT_EQ(bench.pointer.Position(), (CGPoint{17, 205}));
    bench.MovePointer(0, 0);
    EXPECT_EQ(bench.pointer.Position(), CGPoint());
}

TEST(PointerWatch, GivesThePixelsAndTheHotSpot) {
    if (Lacks())
        GTEST_SKIP();
    PointerBench bench;
    bench.SetCursor(0xFFFF, 0x8080, 5, 3, 4);
    const std::shared_ptr<const CursorImage> cursor = bench.pointer.Cursor();
    ASSERT_NE(cursor, nullptr);
    const Picture& picture = *cursor->representations.at(0);
    EXPECT_TRUE(IsLawful(picture));
    EXPECT_EQ(picture.format, PixelFormat::BGRA);
    // The server cuts off what is empty.
    EXPECT_EQ(picture.width, 16);
    EXPECT_EQ(ArgbAt(picture, 15, 4), 0xFFFF8000);
    if (picture.height > 5) {
        EXPECT_EQ(ArgbAt(picture, 0, 5), 0U);
    }
    EXPECT_EQ(cursor->hotSpot, (CGPoint{3, 4}));
}

TEST(PointerWatch, GivesTheSameObjectAsLongAsTheImageIsTheSame) {
    if (Lacks())
        GTEST_SKIP();
    PointerBench bench;
    bench.SetCursor(0xFFFF, 0, 16, 0, 0);
    const std::shared_ptr<const CursorImage> red = bench.pointer.Cursor();
    ASSERT_NE(red, nullptr);
    EXPECT_FALSE(bench.Settle());
    bench.pointer.Read();
    EXPECT_EQ(bench.pointer.Cursor(), red);
    bench.SetCursor(0xFFFF, 0, 16, 0, 0);
    EXPECT_EQ(bench.pointer.Cursor(), red) << "another cursor with the same image";

    bench.SetCursor(0xFFFF, 0, 16, 1, 0);
    const std::shared_ptr<const CursorImage> shifted = bench.pointer.Cursor();
    EXPECT_NE(shifted->serial, red->serial);
    bench.SetCursor(0xFFFF, 0xFFFF, 16, 1, 0);
    EXPECT_NE(bench.pointer.Cursor()->serial, shifted->serial);
    EXPECT_NE(bench.pointer.Cursor()->serial, red->serial);
    EXPECT_EQ(ArgbAt(*red->representations[0], 3, 3), 0xFFFF0000);
}

TEST(PointerWatch, GoesOnCountingOnAnotherConnection) {
    if (Lacks())
        GTEST_SKIP();
    PointerBench bench;
    bench.SetCursor(0xFFFF, 0, 16, 0, 0);
    const std::uint64_t before = bench.pointer.Cursor()->serial;
    PointerWatch next(bench.connection, bench.memory);
    EXPECT_EQ(next.Cursor(), nullptr);
    next.Read();
    ASSERT_NE(next.Cursor(), nullptr);
    EXPECT_GT(next.Cursor()->serial, before);
}

TEST(PointerWatch, LeavesOtherEventsAlone) {
    if (Lacks())
        GTEST_SKIP();
    PointerBench bench;
    xcb_generic_event_t event{};
    for (int type = 2; type < 128; ++type) {
        if (type == bench.connection.Has().xfixesEvent + XCB_XFIXES_CURSOR_NOTIFY)
            continue;
        event.response_type = static_cast<std::uint8_t>(type);
        EXPECT_FALSE(bench.pointer.OnEvent(event)) << type;
    }
}

} // namespace
} // namespace platform::x11

// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/shared_pixels.h"

#include "tests/support/no_anonymous_files.h"
#include "tests/support/threads.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace platform::x11;
using namespace std::chrono_literals;

class SharedPixelsTest : public testing::Test {
protected:
    explicit SharedPixelsTest(XServerOptions options = {}) : m_server(std::move(options)) { Connect(); }

    void Connect() {
        m_connection = std::make_unique<X11Connection>(
            ConnectToDisplay(m_server.Display(), CmSteadyNow() + PATIENCE, -1), -1);
        m_connection->SetDeadline(CmSteadyNow() + PATIENCE);
        m_connection->Introduce();
    }

    /// A pixmap of one colour.
    xcb_pixmap_t Pixmap(int width, int height, std::uint32_t pixel) {
        xcb_connection_t* const xcb = m_connection->Get();
        const xcb_pixmap_t pixmap = m_connection->NewId();
        const auto columns = static_cast<std::uint16_t>(width);
        const auto rows = static_cast<std::uint16_t>(height);
        xcb_create_pixmap(xcb, 24, pixmap, m_connection->Root(), columns, rows);
        const xcb_gcontext_t context = m_connection->NewId();
        xcb_create_gc(xcb, context, pixmap, XCB_GC_FOREGROUND, &pixel);
        const xcb_rectangle_t all{0, 0, columns, rows};
        xcb_poly_fill_rectangle(xcb, pixmap, context, 1, &all);
        xcb_free_gc(xcb, context);
        return pixmap;
    }

    static std::uint32_t WordAt(const SharedPixels& pixels, std::size_t offset) {
        std::uint32_t word = 0;
        std::memcpy(&word, pixels.Bytes() + offset, sizeof(word));
        return word & 0xFFFFFF;
    }

    XServer m_server;
    std::unique_ptr<X11Connection> m_connection;
};

class SharedPixelsWithoutExtension : public SharedPixelsTest {
protected:
    SharedPixelsWithoutExtension() : SharedPixelsTest({.arguments = {"-extension", "MIT-SHM"}}) {}
};

/// How this process has mapped the files of that name.
std::vector<std::string> MappingsOf(const std::string& name) {
    std::ifstream maps("/proc/self/maps");
    std::vector<std::string> found;
    for (std::string line; std::getline(maps, line);) {
        if (line.find(name) != std::string::npos)
            found.push_back(line);
    }
    return found;
}

TEST_F(SharedPixelsTest, HaveTheServerWriteRows) {
    SharedPixelsPool pool(*m_connection);
    const auto pixels = pool.Take(100 * 50 * 4);
    ASSERT_NE(pixels, nullptr);
    EXPECT_NE(pixels->Segment(), 0U);
    EXPECT_GE(pixels->Size(), 100U * 50 * 4);
    const xcb_pixmap_t pixmap = Pixmap(100, 50, 0x123456);
    RowsRead read = RowsRead::Ask(*m_connection, pixmap, 0, 10, 100, 20, *pixels, 10 * 400);
    ASSERT_TRUE(read.Finish(*m_connection));
    EXPECT_EQ(WordAt(*pixels, 10 * 400), 0x123456U);
    EXPECT_EQ(WordAt(*pixels, 20 * 400 - 4), 0x123456U);
    EXPECT_EQ(WordAt(*pixels, 10 * 400 - 4), 0U);
    EXPECT_EQ(WordAt(*pixels, 20 * 400), 0U);
}

TEST_F(SharedPixelsTest, SayWhenTheServerRefuses) {
    SharedPixelsPool pool(*m_connection);
    const auto pixels = pool.Take(1000);
    ASSERT_NE(pixels, nullptr);
    RowsRead gone = RowsRead::Ask(*m_connection, 0x7FFFFFF, 0, 0, 10, 10, *pixels, 0);
    EXPECT_FALSE(gone.Finish(*m_connection));
    const xcb_pixmap_t pixmap = Pixmap(10, 10, 1);
    RowsRead outside = RowsRead::Ask(*m_connection, pixmap, 0, 5, 10, 15, *pixels, 0);
    EXPECT_FALSE(outside.Finish(*m_connection));
}

TEST_F(SharedPixelsTest, NeverWriteBehindTheirEnd) {
    SharedPixelsPool pool(*m_connection);
    const auto pixels = pool.Take(1000);
    ASSERT_NE(pixels, nullptr);
    const xcb_pixmap_t pixmap = Pixmap(10, 10, 1);
    RowsRead read = RowsRead::Ask(*m_connection, pixmap, 0, 0, 10, 10, *pixels, pixels->Size() - 399);
    EXPECT_FALSE(read.Finish(*m_connection));
    RowsRead last = RowsRead::Ask(*m_connection, pixmap, 0, 0, 10, 10, *pixels, pixels->Size() - 400);
    EXPECT_TRUE(last.Finish(*m_connection));
}

TEST_F(SharedPixelsTest, HaveNoDescriptorLeftOpen) {
    SharedPixelsPool pool(*m_connection);
    const std::ptrdiff_t before = std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                                                std::filesystem::directory_iterator());
    std::vector<std::shared_ptr<SharedPixels>> many;
    for (int i = 0; i < 20; ++i)
        many.push_back(pool.Take(100000));
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                            std::filesystem::directory_iterator()),
              before);
}

TEST_F(SharedPixelsTest, AreUsedAgain) {
    SharedPixelsPool pool(*m_connection);
    auto pixels = pool.Take(1000000);
    ASSERT_NE(pixels, nullptr);
    const std::uint8_t* const bytes = pixels->Bytes();
    const auto other = pool.Take(1000000);
    EXPECT_NE(other->Bytes(), bytes);
    std::thread([&pixels] { pixels.reset(); }).join();
    EXPECT_EQ(pool.Take(990000)->Bytes(), bytes);
    EXPECT_NE(pool.Take(100)->Bytes(), bytes) << "much too large for it";
}

TEST_F(SharedPixelsTest, AreNotUsedAgainWhileTheServerMayStillWrite) {
    SharedPixelsPool pool(*m_connection);
    auto pixels = pool.Take(1000000);
    ASSERT_NE(pixels, nullptr);
    const std::uint32_t segment = pixels->Segment();
    { // nobody waits for the answer
        const RowsRead read = RowsRead::Ask(*m_connection, Pixmap(100, 100, 1), 0, 0, 100, 100, *pixels, 0);
    }
    pixels.reset();
    EXPECT_NE(pool.Take(1000000)->Segment(), segment);
}

TEST_F(SharedPixelsTest, LetGoOfWhatHasLainIdle) {
    CManualClockScope clock;
    m_connection->SetDeadline(CmSteadyNow() + PATIENCE); // the one before was by the machine's clock
    SharedPixelsPool pool(*m_connection);
    pool.Take(3000000).reset();
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 1U);
    ASSERT_TRUE(pool.OldestIdle());
    EXPECT_EQ(*pool.OldestIdle(), CmSteadyNow());
    pool.Drop(CmSteadyNow() - 1ns);
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 1U);
    pool.Drop(CmSteadyNow());
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 0U);
    EXPECT_FALSE(pool.OldestIdle());
}

TEST_F(SharedPixelsTest, KeepNoMoreThanTheLimitIdle) {
    SharedPixelsPool pool(*m_connection);
    std::vector<std::shared_ptr<SharedPixels>> many;
    for (int i = 0; i < 10; ++i)
        many.push_back(pool.Take(std::size_t{16} << 20U));
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 10U);
    many.clear();
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), SharedPixelsPool::IDLE_LIMIT / (std::size_t{16} << 20U));
}

TEST_F(SharedPixelsTest, OutliveThePoolAndTheConnection) {
    auto pool = std::make_unique<SharedPixelsPool>(*m_connection);
    auto pixels = pool->Take(100 * 50 * 4);
    ASSERT_NE(pixels, nullptr);
    RowsRead read = RowsRead::Ask(*m_connection, Pixmap(100, 50, 0x123456), 0, 0, 100, 50, *pixels, 0);
    ASSERT_TRUE(read.Finish(*m_connection));
    pool.reset();
    m_connection.reset();
    m_server.Kill();
    EXPECT_EQ(WordAt(*pixels, 100 * 50 * 4 - 4), 0x123456U);
    pixels.reset();
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 0U);
}

TEST_F(SharedPixelsTest, RefuseToBeHuge) {
    SharedPixelsPool pool(*m_connection);
    EXPECT_EQ(pool.Take((std::size_t{1} << 30U) + 1), nullptr);
    EXPECT_EQ(pool.Take(~std::size_t{0}), nullptr);
}

TEST_F(SharedPixelsTest, HaveNoNameWhereThereAreNoAnonymousFiles) {
    ForbidAnonymousFiles();
    SharedPixelsPool pool(*m_connection);
    const auto pixels = pool.Take(100 * 50 * 4);
    ASSERT_NE(pixels, nullptr);
    EXPECT_NE(pixels->Segment(), 0U);
    EXPECT_EQ(MappingsOf("memfd:pixels").size(), 0U);
    RowsRead read = RowsRead::Ask(*m_connection, Pixmap(100, 50, 0x123456), 0, 0, 100, 50, *pixels, 0);
    ASSERT_TRUE(read.Finish(*m_connection));
    EXPECT_EQ(WordAt(*pixels, 100 * 50 * 4 - 4), 0x123456U);
}

TEST_F(SharedPixelsWithoutExtension, ComeThroughTheSocket) {
    SharedPixelsPool pool(*m_connection);
    const auto pixels = pool.Take(100 * 50 * 4);
    ASSERT_NE(pixels, nullptr);
    EXPECT_EQ(pixels->Segment(), 0U);
    const xcb_pixmap_t pixmap = Pixmap(100, 50, 0x123456);
    RowsRead read = RowsRead::Ask(*m_connection, pixmap, 0, 10, 100, 20, *pixels, 10 * 400);
    ASSERT_TRUE(read.Finish(*m_connection));
    EXPECT_EQ(WordAt(*pixels, 10 * 400), 0x123456U);
    EXPECT_EQ(WordAt(*pixels, 20 * 400 - 4), 0x123456U);
    EXPECT_EQ(WordAt(*pixels, 20 * 400), 0U);
    RowsRead gone = RowsRead::Ask(*m_connection, 0x7FFFFFF, 0, 0, 10, 10, *pixels, 0);
    EXPECT_FALSE(gone.Finish(*m_connection));
}

} // namespace

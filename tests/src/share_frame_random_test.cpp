// SPDX-License-Identifier: Apache-2.0
// Two frames against a simple model of them, through long random sequences of every operation.
#include "tests/src/share_frame_model.h"
#include "tests/src/share_frame_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <map>
#include <random>
#include <string>

namespace {

// No picture needs more, and what clients attach and hand over is as large as this.
constexpr int LARGEST = 8192;

/// How often something happened that a run must not lack.
using Happened = std::map<std::string, long>;

/// Plays one random sequence on two frames that nobody has touched before.
class CFrameDuel {
public:
    CFrameDuel(IShareFrame& first, IShareFrame& second, std::uint64_t seed, Happened& happened)
        : m_random(seed),
          m_happened(happened),
          m_real{&first, &second} {
        for (ModelArena& arena : m_arenas) {
            arena.real = Pattern(LARGEST, seed);
            arena.model = arena.real;
        }
    }

    /// The first operation after which frames and models disagree, or nothing.
    std::string FirstDisagreement(int steps) {
        for (int step = 0; step < steps; ++step) {
            m_at = Below(2);
            const std::string operation = Step();
            const std::string difference = m_agree ? Difference() : "its answer";
            if (!difference.empty())
                return operation + " at step " + std::to_string(step) + ": " + difference;
        }
        return {};
    }

private:
    using Operation = void (CFrameDuel::*)();

    template <class Array>
    auto& OneOf(Array& choices) {
        return choices[static_cast<std::size_t>(Below(static_cast<int>(choices.size())))];
    }

    std::string Step() {
        static const std::array<std::pair<const char*, Operation>, 19> OPERATIONS = {{
            {"SetFrameSize", &CFrameDuel::SetSize},
            {"SetFrameSize, huge", &CFrameDuel::SetHugeSize},
            {"SetFrameLineBytes", &CFrameDuel::SetLine},
            {"SetFrameDataFormat", &CFrameDuel::SetFormat},
            {"Reset", &CFrameDuel::Reset},
            {"SetTimestamp, SetMetaInfo", &CFrameDuel::SetNotes},
            {"SetExternalBuf", &CFrameDuel::Attach},
            {"SetExternalBuf, null", &CFrameDuel::Detach},
            {"SetExternalBuf, own", &CFrameDuel::AttachOwn},
            {"WriteFrameData", &CFrameDuel::WriteBlock},
            {"ReadFrameData", &CFrameDuel::ReadBlock},
            {"WriteFrameAreaData", &CFrameDuel::WriteArea},
            {"ReadFrameAreaData", &CFrameDuel::ReadArea},
            {"WriteFrameLineData", &CFrameDuel::WriteLine},
            {"ReadFrameLineData", &CFrameDuel::ReadLine},
            {"GetFrameLineData", &CFrameDuel::AskLine},
            {"CopyIShareFrame", &CFrameDuel::Copy},
            {"SwapOrCopy", &CFrameDuel::Swap},
            {"WriteFrameData, full", &CFrameDuel::WriteFull},
        }};
        const auto& [name, operation] = OneOf(OPERATIONS);
        (this->*operation)();
        return name;
    }

    IShareFrame& Real() { return *m_real[static_cast<std::size_t>(m_at)]; }
    CModelFrame& Model() { return m_model[static_cast<std::size_t>(m_at)]; }

    int Below(int limit) { return static_cast<int>(m_random() % static_cast<std::uint64_t>(limit)); }
    int Between(int low, int high) { return low + Below(high - low + 1); }

    void Expect(bool agree) { m_agree = m_agree && agree; }
    void Count(const char* what, bool did = true) { m_happened[what] += did; }

    // A geometry that needs more than LARGEST would leave what a client attached, for which the client
    // answers.
    static bool Fits(const ModelGeometry& geometry) { return geometry.DataLen() <= LARGEST; }

    void Apply(const ModelGeometry& geometry) {
        const int before = Model().Capacity();
        Model().Apply(geometry);
        Count("growth", Model().Capacity() > before);
    }

    void SetSize() {
        const int least = Below(4) == 0 ? -2 : 1;
        SetSizeTo(Between(least, 24), Between(least, 24));
    }
    void SetHugeSize() {
        if (Below(4) != 0)
            return SetSize();
        // What these make of 3 or 4 bytes a pixel wraps: to little, to nothing, to less than nothing.
        constexpr std::array<TVLSize, 5> SIZES = {
            {{1024, 0x100001}, {0x40000001, 16}, {0x20000000, 1}, {0x20000000, 2}, {0x7FFFFFFF, 0x7FFFFFFF}}};
        const TVLSize size = OneOf(SIZES);
        Count("small product of a huge size",
              SetSizeTo(size.cx, size.cy) && Model().Geometry().DataLen() > 0 && Model().Readable() > 0);
    }
    bool SetSizeTo(int width, int height) {
        const ModelGeometry geometry = Model().Geometry().Sized(width, height);
        if (!Fits(geometry))
            return false;
        Apply(geometry);
        Expect((Below(2) == 0 ? Real().SetFrameSize(width, height)
                              : Real().SetFrameSize(TVLSize{width, height})) == 0);
        return true;
    }

    void SetLine() {
        const int width = Model().Geometry().width;
        const int line = width < 30 && Below(2) == 0 ? 3 * width + Below(2) : Between(-1, 110);
        if (!Fits(Model().Geometry().Lined(line)))
            return;
        const int result = Model().SetLine(line);
        Count("explicit line", result == 0);
        Count("line refused", result != 0);
        Expect(Real().SetFrameLineBytes(line) == result);
    }

    void SetFormat() {
        const int format = Between(-1, 7);
        const ModelGeometry geometry = Model().Geometry().Formatted(format);
        if (!Fits(geometry))
            return;
        if (format >= 0 && format <= 6)
            Apply(geometry);
        Expect(Real().SetFrameDataFormat(static_cast<SHARE_FRAME_FORMAT>(format)) ==
               static_cast<SHARE_FRAME_FORMAT>(geometry.format));
    }

    void Reset() {
        ModelGeometry geometry = Model().Geometry();
        geometry.explicitLine = 0;
        if (!Fits(geometry))
            return;
        Model().Reset();
        Real().Reset();
        Count("too little memory after a reset",
              !Model().Attached() && Model().Readable() > 0 && geometry.DataLen() > Model().Capacity());
    }

    void SetNotes() {
        const IShareFrame::MetaInfo meta{{Below(9), Below(9), Below(9), Below(9)}, Below(2) == 0};
        const auto timestamp = static_cast<unsigned>(m_random());
        Model().SetTimestamp(timestamp);
        Model().SetMeta(meta);
        Real().SetTimestamp(timestamp);
        Real().SetMetaInfo(meta);
    }

    void Attach() {
        if (Below(3) != 0)
            return WriteFull();
        ModelArena& arena = OneOf(m_arenas);
        const int len = Below(16) == 0 ? LARGEST : Between(-1, 1000);
        if (len >= 1)
            Model().Attach(&arena, len);
        Count("attached", len >= 1);
        Expect(Real().SetExternalBuf(arena.real.data(), len) == (len >= 1 ? 0 : -1));
    }

    void Detach() {
        const int len = Below(4) == 0 ? Between(-1, 300) : 0;
        int result = 0;
        if (Model().Attached()) {
            Model().Detach();
            Count("detached");
        } else if (len < 1 || Model().Memory() == nullptr) {
            result = -1;
        } else {
            Model().Attach(nullptr, len);
            Count("own memory taken away");
        }
        Expect(Real().SetExternalBuf(nullptr, len) == result);
    }

    void AttachOwn() {
        if (!Model().Attached() && Model().Memory() != nullptr)
            Expect(Real().SetExternalBuf(Real().GetFrameData(), Between(1, 100)) == -1);
    }

    Bytes Fresh() {
        Bytes data(std::size_t{2} * LARGEST);
        std::uint64_t word = m_random();
        for (std::size_t i = 0; i < data.size(); i += sizeof(word)) {
            word = word * 6364136223846793005u + 1442695040888963407u;
            std::memcpy(&data[i], &word, sizeof(word));
        }
        return data;
    }

    void WriteBlock() { WriteBlockOf(Between(-1, std::max(0, Model().Geometry().DataLen()) + 1)); }
    void WriteFull() { WriteBlockOf(std::max(0, Model().Geometry().DataLen())); }
    void WriteBlockOf(int len) {
        const Bytes data = Fresh();
        const int result = Model().Write(data, len);
        Count("block written", result > 0);
        Expect(Real().WriteFrameData(data.data(), len) == result);
    }

    void ReadBlock() {
        const int len = Between(-1, Model().Capacity() + 20);
        Bytes expected = Fresh();
        Bytes data = expected;
        const int result = Model().Read(expected, len);
        Count("block read", result > 0);
        Expect(Real().ReadFrameData(data.data(), len) == result && data == expected);
    }

    TVLRect SomeRect() {
        const ModelGeometry& geometry = Model().Geometry();
        const int left = Below(4) == 0 ? Between(-1, std::min(geometry.width, 24)) : 0;
        const int top = Between(-1, std::min(geometry.height, 24));
        const int right = Below(3) == 0 ? geometry.width : Between(left, std::min(geometry.width, 30) + 1);
        const int bottom = Below(3) == 0 ? geometry.height : Between(top, std::min(geometry.height, 30) + 1);
        return {left, top, right, bottom};
    }

    void WriteArea() { MoveArea(SomeRect(), false, false); }
    void ReadArea() { MoveArea(SomeRect(), true, false); }
    void WriteLine() { MoveArea(SomeLine(), false, true); }
    void ReadLine() { MoveArea(SomeLine(), true, true); }
    TVLRect SomeLine() {
        const int line = Between(-1, std::min(Model().Geometry().height, 24));
        return {0, line, Model().Geometry().width, line + 1};
    }

    void MoveArea(TVLRect rect, bool read, bool line) {
        const int len = Below(2) == 0 ? LARGEST : Between(-1, 500);
        Bytes expected = Fresh();
        Bytes data = expected;
        bool part = false;
        const int result = Model().MoveArea(rect, expected, len, read, part);
        Count(read ? "area read" : "area written", result > 0);
        Count(read ? "area read in part" : "area written in part", part);
        Expect(MoveReal(rect, data, len, read, line) == result && data == expected);
    }
    int MoveReal(TVLRect& rect, Bytes& data, int len, bool read, bool line) {
        if (line)
            return read ? Real().ReadFrameLineData(rect.top, data.data(), len)
                        : Real().WriteFrameLineData(rect.top, data.data(), len);
        return read ? Real().ReadFrameAreaData(rect, data.data(), len)
                    : Real().WriteFrameAreaData(rect, data.data(), len);
    }

    void AskLine() {
        const ModelGeometry& geometry = Model().Geometry();
        const int line = Between(-3, std::min(geometry.height, 30) + 2);
        const std::int64_t offset = std::int64_t{line} * geometry.LineBytes();
        const auto start = reinterpret_cast<std::uintptr_t>(Real().GetFrameData());
        const bool none = start == 0 || (geometry.format != 0 && offset > geometry.DataLen());
        const std::uintptr_t expected = none ? 0 : start + static_cast<std::uintptr_t>(offset);
        Expect(reinterpret_cast<std::uintptr_t>(Real().GetFrameLineData(line)) == expected);
    }

    // A copy sets the size while the target's own line and format still hold.
    bool MayCopy(const CModelFrame& source) {
        const ModelGeometry& from = source.Geometry();
        const ModelGeometry sized = Model().Geometry().Sized(from.width, from.height);
        const ModelGeometry lined = sized.Lined(from.LineBytes());
        return Fits(sized) && Fits(lined) && Fits(lined.Formatted(from.format));
    }

    void Copy() { Take(false); }
    void Swap() { Take(true); }
    void Take(bool swap) {
        const auto from = static_cast<std::size_t>(Below(8) == 0 ? m_at : 1 - m_at);
        CModelFrame& source = m_model[from];
        const bool exchange = swap && !Model().Attached() && !source.Attached();
        if (!exchange && !MayCopy(source))
            return;
        if (exchange)
            Model().Swap(source);
        else
            Model().Copy(source);
        Count(exchange ? "exchange" : "copy");
        Expect((swap ? Real().SwapOrCopy(m_real[from]) : Real().CopyIShareFrame(m_real[from])) == 0);
    }

    std::string Difference() {
        for (m_at = 0; m_at < 2; ++m_at) {
            const ModelGeometry& geometry = Model().Geometry();
            TVLSize size{};
            Real().GetFrameSize(size);
            if (size != TVLSize{geometry.width, geometry.height} ||
                Real().GetFrameDataFormat() != geometry.format ||
                Real().GetFrameLineBytes() != geometry.LineBytes() ||
                Real().GetFrameDataLen() != geometry.DataLen())
                return "the geometry";
            const IShareFrame::MetaInfo meta = Real().GetMetaInfo();
            if (Real().GetTimestamp() != Model().Timestamp() ||
                meta.rectCapture != Model().Meta().rectCapture ||
                meta.bPointerCaptured != Model().Meta().bPointerCaptured)
                return "the timestamp or the meta information";
            if ((Real().GetFrameData() == nullptr) != (Model().Memory() == nullptr))
                return "whether there is memory";
            if (Model().Readable() > 0 &&
                std::memcmp(Real().GetFrameData(), Model().Memory()->data(), Model().Readable()) != 0)
                return "the pixels";
        }
        for (const ModelArena& arena : m_arenas)
            if (arena.real != arena.model)
                return "the client's memory";
        return {};
    }

    std::mt19937_64 m_random;
    Happened& m_happened;
    std::array<ModelArena, 2> m_arenas;
    std::array<IShareFrame*, 2> m_real;
    std::array<CModelFrame, 2> m_model;
    int m_at = 0;
    bool m_agree = true;
};

constexpr std::uint64_t FIRST_SEED = 20240611;
constexpr int STEPS = 150;

/// Where a frame of the given class first disagrees with its model, or nothing.
template <class Frame>
std::string FirstDisagreement(std::uint64_t seed, Happened& happened) {
    const auto frame = NewFrame<Frame>();
    const auto partner = NewFrame<>();
    return CFrameDuel(*frame, *partner, seed, happened).FirstDisagreement(STEPS);
}

TEST(ShareFrameRandom, DoesAsItsModelDoes) {
    const int runs = TestRounds(1000);
    std::printf("%d sequences of %d steps from seed %llu\n", runs, STEPS,
                static_cast<unsigned long long>(FIRST_SEED));
    Happened happened;
    for (int run = 0; run < runs; ++run) {
        const std::uint64_t seed = FIRST_SEED + static_cast<std::uint64_t>(run);
        ASSERT_EQ(FirstDisagreement<CShareFrame>(seed, happened), "") << "seed " << seed;
    }
    for (const char* what : {"growth", "explicit line", "line refused", "small product of a huge size",
                             "too little memory after a reset", "attached", "detached",
                             "own memory taken away", "block written", "block read", "area written",
                             "area read", "area written in part", "area read in part", "copy", "exchange"}) {
        std::printf("  %-32s %ld\n", what, happened[what]);
        EXPECT_GT(happened[what], 0) << "never: " << what;
    }
}

// Frames that a careless change could leave behind. Each must be found out.

class CFrameThatTellsWhatItRead : public CShareFrame {
public:
    int ReadFrameData(unsigned char* data, int len) override {
        return std::min(CShareFrame::ReadFrameData(data, len), GetFrameDataLen());
    }
};

class CFrameThatCutsBlocks : public CShareFrame {
public:
    int WriteFrameData(const unsigned char* data, int len) override {
        return CShareFrame::WriteFrameData(data, std::min(len, GetFrameDataLen()));
    }
};

class CFrameThatCopiesMetaInformation : public CShareFrame {
public:
    int CopyIShareFrame(IShareFrame* source) override {
        SetMetaInfo(source->GetMetaInfo());
        return CShareFrame::CopyIShareFrame(source);
    }
};

class CFrameThatGrowsOnReset : public CShareFrame {
public:
    void Reset() override {
        CShareFrame::Reset();
        SetFrameDataFormat(GetFrameDataFormat());
    }
};

class CFrameThatClipsAreas : public CShareFrame {
public:
    int WriteFrameAreaData(TVLRect& rect, const unsigned char* data, int len) override {
        TVLSize size{};
        GetFrameSize(size);
        TVLRect clipped{rect.left, rect.top, std::min(rect.right, size.cx), std::min(rect.bottom, size.cy)};
        return CShareFrame::WriteFrameAreaData(clipped, data, len);
    }
};

template <class Frame>
class ShareFrameRandomTeeth : public testing::Test {};

using BrokenFrames =
    testing::Types<CFrameThatTellsWhatItRead, CFrameThatCutsBlocks, CFrameThatCopiesMetaInformation,
                   CFrameThatGrowsOnReset, CFrameThatClipsAreas>;
TYPED_TEST_SUITE(ShareFrameRandomTeeth, BrokenFrames);

TYPED_TEST(ShareFrameRandomTeeth, FindOutABrokenFrame) {
    Happened happened;
    std::string difference;
    for (std::uint64_t run = 0; difference.empty() && run < 100; ++run)
        difference = FirstDisagreement<TypeParam>(FIRST_SEED + run, happened);
    EXPECT_NE(difference, "");
    std::printf("%s\n", difference.c_str());
}

} // namespace

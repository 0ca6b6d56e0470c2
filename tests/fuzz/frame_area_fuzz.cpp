// SPDX-License-Identifier: Apache-2.0
#include "tests/fuzz/fuzz_check.h"
#include "tests/fuzz/fuzz_input.h"
#include "tests/src/share_frame_model.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>

/// Frames of any geometry, and rectangles, lines and blocks of any numbers that are moved in and out of them:
/// a frame does what its model does, and touches no byte besides.

namespace {

/// Bytes of the largest picture; what clients attach and hand over is as large.
constexpr int LARGEST = 1024;

class AreaDuel {
public:
    explicit AreaDuel(Input& input) : m_input(input) {
        m_arena.real = Pattern(LARGEST);
        m_arena.model = m_arena.real;
    }

    void Step() {
        switch (m_input.Byte() % 10) {
            case 0:
                return SetSize();
            case 1:
                return SetLine();
            case 2:
                return SetFormat();
            case 3:
                return Reset();
            case 4:
                return m_model.Attached() ? Detach() : Attach();
            case 5:
                return MoveBlock(true);
            case 6:
                return MoveBlock(false);
            case 7:
                return MoveLine(m_input.Byte() % 2 == 0);
            case 8:
                return MoveArea(true);
            default:
                return MoveArea(false);
        }
    }

    void RequireAgreement() {
        const ModelGeometry& geometry = m_model.Geometry();
        Require(m_real->GetFrameLineBytes() == geometry.LineBytes(), "the line is as long as it has to be");
        Require(m_real->GetFrameDataLen() == geometry.DataLen(), "the data is as long as it has to be");
        Require((m_real->GetFrameData() == nullptr) == (m_model.Memory() == nullptr),
                "there is memory or not");
        Require(m_model.Readable() == 0 ||
                    std::memcmp(m_real->GetFrameData(), m_model.Memory()->data(), m_model.Readable()) == 0,
                "the pixels are what they have to be");
        Require(m_arena.real == m_arena.model, "the client's memory is what it has to be");
    }

private:
    /// Mostly small, often about `limit`, and anything at all.
    int Number(int limit) {
        const int choice = m_input.Byte();
        if (choice < 128)
            return choice - 4;
        if (choice < 192)
            return ModelGeometry::Wrapped(std::int64_t{limit} + choice % 5 - 2);
        return static_cast<int>(m_input.Word());
    }

    /// What doesn't fit would leave what a client attached, for which the client answers.
    static bool Fits(const ModelGeometry& geometry) { return geometry.DataLen() <= LARGEST; }

    void SetSize() {
        const int width = Number(m_model.Geometry().width);
        const int height = Number(m_model.Geometry().height);
        const ModelGeometry geometry = m_model.Geometry().Sized(width, height);
        if (!Fits(geometry))
            return;
        m_model.Apply(geometry);
        Require(m_real->SetFrameSize(width, height) == 0, "a size is taken");
    }

    void SetLine() {
        const int line = Number(m_model.Geometry().LineBytes());
        if (Fits(m_model.Geometry().Lined(line)))
            Require(m_real->SetFrameLineBytes(line) == m_model.SetLine(line),
                    "a line length is taken or not");
    }

    void SetFormat() {
        const int format = m_input.Byte() % 9 - 1;
        const ModelGeometry geometry = m_model.Geometry().Formatted(format);
        if (!Fits(geometry))
            return;
        if (geometry.format == format)
            m_model.Apply(geometry);
        Require(m_real->SetFrameDataFormat(static_cast<SHARE_FRAME_FORMAT>(format)) == geometry.format,
                "a format is taken or not");
    }

    void Reset() {
        ModelGeometry geometry = m_model.Geometry();
        geometry.explicitLine = 0;
        if (!Fits(geometry))
            return;
        m_model.Reset();
        m_real->Reset();
    }

    void Attach() {
        const int length = static_cast<int>(m_input.Word() % LARGEST) + 1;
        m_model.Attach(&m_arena, length);
        Require(m_real->SetExternalBuf(m_arena.real.data(), length) == 0, "memory is attached");
    }

    void Detach() {
        m_model.Detach();
        Require(m_real->SetExternalBuf(nullptr, 0) == 0, "memory is detached");
    }

    /// All that a client hands over, or has ready.
    Bytes Handed() { return Pattern(std::size_t{2} * LARGEST, m_input.Byte()); }

    int Length(int limit) { return std::min(Number(limit), 2 * LARGEST); }

    void MoveBlock(bool read) {
        const int length = Length(m_model.Geometry().DataLen());
        Bytes expected = Handed();
        Bytes data = expected;
        const int result = read ? m_model.Read(expected, length) : m_model.Write(expected, length);
        Require((read ? m_real->ReadFrameData(data.data(), length)
                      : m_real->WriteFrameData(data.data(), length)) == result,
                "a block is moved or not");
        Require(data == expected, "a block reads as it has to");
    }

    void MoveLine(bool read) {
        const int line = Number(m_model.Geometry().height);
        const TVLRect rect{0, line, m_model.Geometry().width, ModelGeometry::Wrapped(std::int64_t{line} + 1)};
        const int length = Length(m_model.Geometry().LineBytes());
        Bytes expected = Handed();
        Bytes data = expected;
        bool part = false;
        const int result = m_model.MoveArea(rect, expected, length, read, part);
        Require((read ? m_real->ReadFrameLineData(line, data.data(), length)
                      : m_real->WriteFrameLineData(line, data.data(), length)) == result,
                "a line is moved or not");
        Require(data == expected, "a line reads as it has to");
    }

    void MoveArea(bool read) {
        const ModelGeometry& geometry = m_model.Geometry();
        TVLRect rect{};
        rect.left = Number(geometry.width);
        rect.top = Number(geometry.height);
        rect.right = Number(geometry.width);
        rect.bottom = Number(geometry.height);
        const int length = Length(geometry.DataLen());
        Bytes expected = Handed();
        Bytes data = expected;
        bool part = false;
        const int result = m_model.MoveArea(rect, expected, length, read, part);
        Require((read ? m_real->ReadFrameAreaData(rect, data.data(), length)
                      : m_real->WriteFrameAreaData(rect, data.data(), length)) == result,
                "an area is moved or not");
        Require(data == expected, "an area reads as it has to");
    }

    Input& m_input;
    ModelArena m_arena;
    CModelFrame m_model;
    const Held<> m_real = NewFrame<>(); // let go of before the memory that may be attached
};

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Input input(data, size);
    AreaDuel duel(input);
    while (!input.IsEmpty()) {
        duel.Step();
        duel.RequireAgreement();
    }
    return 0;
}

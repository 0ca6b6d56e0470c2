// SPDX-License-Identifier: Apache-2.0
// What reading the debug file costs: an ordinary one, and the worst texts of 64 KiB that we know. The reader
// walks the text in place, but hands each structure up by copying it, so the cost of a text is what it
// copies. Its own copies can't be counted from here: `allocated` are the bytes that it asked operator new for
// during one reading, nearly all of them to copy values into.
#include "json/json.h"

#include <benchmark/benchmark.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <new>
#include <string>

namespace {

std::atomic<std::size_t> g_allocated{0};

void* Allocate(std::size_t size) {
    g_allocated.fetch_add(size, std::memory_order_relaxed);
    if (void* const memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}

} // namespace

void* operator new(std::size_t size) {
    return Allocate(size);
}
void* operator new[](std::size_t size) {
    return Allocate(size);
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete[](void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t /*size*/) noexcept {
    std::free(memory);
}
void operator delete[](void* memory, std::size_t /*size*/) noexcept {
    std::free(memory);
}

namespace {

constexpr std::size_t WORST_SIZE = 64 * 1024;

void Read(benchmark::State& state, const std::string& text) {
    std::size_t allocated = 0;
    for ([[maybe_unused]] const auto turn : state) {
        const std::size_t before = g_allocated;
        const json::Value value = json::Deserialize(text);
        allocated = g_allocated - before;
        if (value.GetType() == json::NULLVal)
            state.SkipWithError("the text can't be read");
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
    state.counters["text"] = static_cast<double>(text.size());
    state.counters["allocated"] = static_cast<double>(allocated);
    state.counters["allocated/text"] = static_cast<double>(allocated) / static_cast<double>(text.size());
}

std::string Repeated(const std::string& piece, std::size_t count) {
    std::string text;
    for (std::size_t i = 0; i < count; ++i)
        text += piece;
    return text;
}

/// `depth` structures within each other; the innermost is filled with as many pieces as 64 KiB hold.
std::string Nested(std::size_t depth, const std::string& open, const std::string& close,
                   const std::string& piece, const std::string& last) {
    const std::size_t room = WORST_SIZE - depth * (open.size() + close.size()) - last.size();
    return Repeated(open, depth) + Repeated(piece, room / piece.size()) + last + Repeated(close, depth);
}

constexpr std::size_t DEEPEST = json::MAX_DEPTH + 1;

void OrdinaryDebugFile(benchmark::State& state) {
    Read(state, R"({
    "trace_one_by_frames": 10,
    "capture_resample_fixsize_enable": true,
    "capture_resample_width": 1280,
    "capture_resample_height": 720
})");
}
BENCHMARK(OrdinaryDebugFile);

void FlatNumbers64KiB(benchmark::State& state) {
    Read(state, Nested(1, "[", "]", "1,", "1"));
}
BENCHMARK(FlatNumbers64KiB)->Unit(benchmark::kMillisecond);

void DeepStrings64KiB(benchmark::State& state) {
    Read(state, Nested(DEEPEST, "[", "]", "\"0123456789abcdef\",", "1"));
}
BENCHMARK(DeepStrings64KiB)->Unit(benchmark::kMillisecond);

void DeepNumbers64KiB(benchmark::State& state) {
    Read(state, Nested(DEEPEST, "[", "]", "1,", "1"));
}
BENCHMARK(DeepNumbers64KiB)->Unit(benchmark::kMillisecond);

/// Every level hands up all that lies below it, so the most values for their length belong into the deepest
/// place: three characters that make two values, and need no comma.
void Worst64KiB(benchmark::State& state) {
    Read(state, Nested(DEEPEST - 1, "[", "]", "[1]", ""));
}
BENCHMARK(Worst64KiB)->Unit(benchmark::kMillisecond);

} // namespace

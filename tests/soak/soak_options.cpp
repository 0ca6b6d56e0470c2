// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_options.h"

#include "tests/soak/soak_trend.h"

#include <charconv>
#include <functional>
#include <map>
#include <stdexcept>
#include <system_error>

namespace {

using Milliseconds = std::chrono::milliseconds;

constexpr unsigned MOST = 1000000; // keeps milliseconds and pixels far from overflowing

unsigned NumberOf(const std::string& text) {
    unsigned number = 0;
    const char* const end = text.data() + text.size();
    const auto result = std::from_chars(text.data(), end, number);
    if (result.ec != std::errc() || result.ptr != end || number > MOST * 100)
        throw std::invalid_argument("no number: " + text);
    return number;
}

Milliseconds TimeOf(const std::string& text, Milliseconds unit) {
    const unsigned number = NumberOf(text);
    if (number > MOST)
        throw std::invalid_argument("too long: " + text);
    return number * unit;
}

void TakeSize(SoakOptions& options, const std::string& text) {
    constexpr unsigned SMALLEST = 100;
    constexpr unsigned LARGEST = 4096;
    const std::size_t cross = text.find('x');
    if (cross == std::string::npos)
        throw std::invalid_argument("no size: " + text);
    const unsigned width = NumberOf(text.substr(0, cross));
    const unsigned height = NumberOf(text.substr(cross + 1));
    if (width < SMALLEST || height < SMALLEST || width > LARGEST || height > LARGEST)
        throw std::invalid_argument("a monitor is 100 to 4096 pixels wide and high");
    options.width = static_cast<int>(width);
    options.height = static_cast<int>(height);
}

SoakLoss LossOf(const std::string& word) {
    static const std::map<std::string, SoakLoss> LOSSES{{"memory", SoakLoss::Memory},
                                                        {"descriptor", SoakLoss::Descriptor},
                                                        {"thread", SoakLoss::Thread},
                                                        {"resource", SoakLoss::Resource}};
    const auto found = LOSSES.find(word);
    if (found == LOSSES.end())
        throw std::invalid_argument("--lose= takes memory, descriptor, thread or resource");
    return found->second;
}

void Take(SoakOptions& options, const std::string& argument) {
    using Taker = std::function<void(const std::string&)>;
    const std::map<std::string, Taker> takers{
        {"--seconds",
         [&](const std::string& text) { options.duration = TimeOf(text, std::chrono::seconds(1)); }},
        {"--interval", [&](const std::string& text) { options.interval = TimeOf(text, Milliseconds(1)); }},
        {"--warm-up", [&](const std::string& text) { options.warmUp = TimeOf(text, Milliseconds(1)); }},
        {"--size", [&](const std::string& text) { TakeSize(options, text); }},
        {"--fps", [&](const std::string& text) { options.framesPerSecond = NumberOf(text); }},
        {"--seed", [&](const std::string& text) { options.seed = NumberOf(text); }},
        {"--json", [&](const std::string& text) { options.json = text; }},
        {"--lose", [&](const std::string& text) { options.loss = LossOf(text); }}};
    const std::size_t equals = argument.find('=');
    const auto taker = takers.find(argument.substr(0, equals));
    if (equals == std::string::npos || taker == takers.end())
        throw std::invalid_argument("no option of a soak: " + argument);
    taker->second(argument.substr(equals + 1));
}

} // namespace

SoakOptions ReadSoakOptions(int count, const char* const* arguments) {
    constexpr unsigned MOST_FRAMES = 1000;
    SoakOptions options;
    for (int i = 1; i < count; ++i)
        Take(options, arguments[i]);
    if (options.framesPerSecond < 1 || options.framesPerSecond > MOST_FRAMES)
        throw std::invalid_argument("--fps= takes 1 to 1000");
    if (options.interval < Milliseconds(1) || options.Samples() < SOAK_FEWEST_SAMPLES)
        throw std::invalid_argument("too short: it takes " + std::to_string(SOAK_FEWEST_SAMPLES) +
                                    " samples to tell a trend");
    return options;
}

// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_options.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <string_view>
#include <system_error>

namespace {

struct Mode {
    const char* name;
    SCREEN_CAPTURER_TYPE type;
};

constexpr std::array<Mode, 4> MODES{{
    {"default", SCREEN_CAPTURER_TYPE_DEFAULT},
    {"queued", SCREEN_CAPTURER_TYPE_CGS_GCD},
    {"session", SCREEN_CAPTURER_TYPE_AVFOUNDATION},
    {"mix", SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX},
}};

const Mode* FindMode(SCREEN_CAPTURER_TYPE type) {
    const auto* const found =
        std::find_if(MODES.begin(), MODES.end(), [type](const Mode& mode) { return mode.type == type; });
    return found != MODES.end() ? found : nullptr;
}

std::optional<int> ParseSide(std::string_view text) {
    constexpr int LONGEST = 32767;
    int side = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), side);
    if (error != std::errc() || end != text.data() + text.size() || side < 1 || side > LONGEST)
        return std::nullopt;
    return side;
}

} // namespace

std::optional<TVLSize> ParseSize(const std::string& text) {
    const std::size_t cross = text.find('x');
    if (cross == std::string::npos)
        return std::nullopt;
    const std::optional<int> width = ParseSide(std::string_view(text).substr(0, cross));
    const std::optional<int> height = ParseSide(std::string_view(text).substr(cross + 1));
    if (!width || !height)
        return std::nullopt;
    return TVLSize{*width, *height};
}

std::vector<std::string> CaptureModeNames() {
    std::vector<std::string> names;
    names.reserve(MODES.size());
    for (const Mode& mode : MODES)
        names.emplace_back(mode.name);
    return names;
}

std::optional<SCREEN_CAPTURER_TYPE> CaptureModeOf(const std::string& name) {
    for (const Mode& mode : MODES) {
        if (name == mode.name)
            return mode.type;
    }
    return std::nullopt;
}

std::string CaptureModeName(SCREEN_CAPTURER_TYPE mode) {
    const Mode* const found = FindMode(mode);
    return found != nullptr ? found->name : std::to_string(static_cast<int>(mode));
}

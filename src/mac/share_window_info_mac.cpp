// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "platform/utf8.h"
#include "src/mac/share_util_mac.h"
#include "src/share_record_size.h"
#include "util/cm_guarded_call.h"

#include <screenshare/share_window_info.h>

#include <cstddef>
#include <cstring>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

/// What a client's picker asks about a window.

namespace {

/// Of the first version of the record, which every later one begins with.
constexpr std::size_t FIRST_INFO_SIZE = 544;

static_assert(std::is_trivial_v<ShareWindowInfo> && std::is_standard_layout_v<ShareWindowInfo>);
static_assert(offsetof(ShareWindowInfo, title) + SHARE_WINDOW_TITLE_SIZE == FIRST_INFO_SIZE,
              "clients were built with these fields");

std::optional<platform::CGWindowDescription> DescriptionOf(platform::CGWindowID window) {
    std::vector<platform::CGWindowDescription> found =
        platform::CGWindowListCreateDescriptionFromArray({&window, 1});
    if (found.empty())
        return std::nullopt;
    return std::move(found.front());
}

/// The number of bytes, at most `room`, after which no character of the text is torn.
std::size_t WholeCharacters(const std::string& utf8, std::size_t room) {
    const auto isInsideCharacter = [&](std::size_t at) {
        return (static_cast<unsigned char>(utf8[at]) & 0xC0U) == 0x80U;
    };
    if (utf8.size() <= room)
        return utf8.size();
    std::size_t end = room;
    while (end > 0 && isInsideCharacter(end))
        --end;
    return end;
}

void WriteTitle(const std::string& title, ShareWindowInfo& info) {
    // As far as a terminated text goes: a client would see no more of it.
    const std::string text = platform::MendedUtf8(title.c_str());
    std::memcpy(info.title, text.data(), WholeCharacters(text, SHARE_WINDOW_TITLE_SIZE - 1));
}

ShareWindowInfo InfoOf(const platform::CGWindowDescription& window) {
    ShareWindowInfo info{};
    info.ownerPid = window.kCGWindowOwnerPID;
    info.displayId = GetWindowDisplayID(window.kCGWindowNumber);
    info.onScreen = window.kCGWindowIsOnscreen ? 1 : 0;
    info.rect = ShareUtilMac::CGRectToTVLRect(window.kCGWindowBounds);
    WriteTitle(window.kCGWindowName, info);
    return info;
}

} // namespace

int ShareGetWindowInfo(unsigned window, ShareWindowInfo* info) {
    if (info == nullptr || window == SHARE_INVALID_WINDOW || info->structSize < FIRST_INFO_SIZE)
        return SHARE_RESULT_INVALID_PARAM;
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[ShareGetWindowInfo]>>fail>>", [&] {
        const std::optional<platform::CGWindowDescription> description = DescriptionOf(window);
        if (!description)
            return;
        ShareFillRecord(InfoOf(*description), info);
        result = SHARE_RESULT_OK;
    });
    return result;
}

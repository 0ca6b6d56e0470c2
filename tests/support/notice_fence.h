// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/notices.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/threads.h"

#include <memory>

/// Comes back when every notice has been delivered that the server had raised before. False when that takes
/// too long.
[[nodiscard]] inline bool NoticesAreDelivered(CFakeWindowServer& server) {
    const auto delivered = std::make_shared<CTally>();
    const platform::NoticeKey key{reinterpret_cast<std::uintptr_t>(delivered.get()), 0};
    const platform::NoticeKinds kinds = platform::NoticeKindBit(platform::NoticeKind::PermissionChanged);
    if (!platform::AddNoticeHandler(kinds, key, [delivered](const platform::Notice&) { delivered->Add(); }))
        return false;
    platform::Notice fence;
    fence.kind = platform::NoticeKind::PermissionChanged;
    server.Raise(fence);
    const bool reached = delivered->Reaches(1);
    platform::RemoveNoticeHandler(kinds, key);
    return reached;
}

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_region.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

class ShareCapturerContext;

/// Tells whether the user is moving windows right now: whether what is seen of the share keeps changing from
/// one look to the next. A picture taken in mid-move would be torn, and a walk over the windows at every pass
/// would be wasted, so both rest for half a second after each change.
/// Threads: one at a time, that of the captures. Lifetime: belongs to one back-end; keeps the context.
class ShareUtilMacMonitorDraging {
public:
    explicit ShareUtilMacMonitorDraging(const std::shared_ptr<ShareCapturerContext>& context);
    virtual ~ShareUtilMacMonitorDraging();
    ShareUtilMacMonitorDraging(const ShareUtilMacMonitorDraging&) = delete;
    ShareUtilMacMonitorDraging& operator=(const ShareUtilMacMonitorDraging&) = delete;

    /// What was seen of the share of the context before stays the measure for the next look.
    void SetContext(const std::shared_ptr<ShareCapturerContext>& context);

    /// `update` walks the windows; it may be empty. It isn't called while windows have moved less than half a
    /// second ago.
    bool IsDraging(const std::function<void()>& update);

    /// Whether the visible region has other rectangles than at the last call. The first one only looks.
    bool IsVisiableRegionChanged();

private:
    void Remember(const TVLRegion& visible, std::uint64_t publications);

    /// Milliseconds; 0 while nothing moves.
    unsigned long m_tickOnInvisibleRegionChanged = 0;
    std::shared_ptr<ShareCapturerContext> m_shareCapturerContext;
    bool m_bFirstChecking = true;
    /// ShareCapturerContext::Publications when the cache was what is visible; nothing when that isn't known.
    std::optional<std::uint64_t> m_nPublicationsSeen;
    TVLRegion m_rgnVisibleCache;
};

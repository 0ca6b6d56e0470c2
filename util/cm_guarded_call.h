// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_trace.h"

#include <exception>

/// Calls `fn` and lets no exception out: one that comes is traced at ERROR as `message` followed by its own
/// text. True when `fn` came back by itself.
template <class F>
bool CmCallGuarded(const CCmTraceMessage& message, F&& fn) {
    try {
        fn();
        return true;
    } catch (const std::exception& error) {
        CmTraceError(message, error.what());
    } catch (...) {
        CmTraceError(message, "unknown");
    }
    return false;
}

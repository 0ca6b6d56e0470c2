// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capturer_context.h"
#include "src/share_ref.h"
#include "tests/support/capturer_probe.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

/// A capturer with a context.
class ShareCapturer : public testing::Test {
protected:
    /// A source that the test holds as long as it lives.
    IShareSource* Source(unsigned long id, ShareSourceType type = SHARE_SOURCE_TYPE_MONITOR,
                         TVLRect rect = {}) {
        m_sources.emplace_back(new CLoggedSource(calls, id, type, rect));
        return m_sources.back().Get();
    }

    CCallLog calls;
    CTraceLog trace;
    const std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContext>();
    CCapturerSink sink{calls};
    CCapturerProbe capturer{context};

private:
    std::vector<ShareRef<IShareSource>> m_sources;
};

/// The same without a context.
class ShareCapturerAlone : public ShareCapturer {
protected:
    CCapturerProbe capturer{nullptr};
};

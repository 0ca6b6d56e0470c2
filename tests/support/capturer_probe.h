// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capturer.h"
#include "src/share_source.h"
#include "tests/support/call_log.h"

#include <screenshare/share_capture_engine.h>

#include <functional>
#include <string>
#include <utility>
#include <vector>

/// A capturer of the library's own whose inside tests can reach. It captures nothing.
class CCapturerProbe : public CShareCapturer {
public:
    using CShareCapturer::CShareCapturer;

    using CShareCapturer::Cleanup;
    using CShareCapturer::FindShareSource;
    using CShareCapturer::FindSink;
    using CShareCapturer::m_shareCapturerContext;
    using CShareCapturer::m_vecShareSources;
    using CShareCapturer::m_vecSinks;
    using CShareCapturer::NotifyCaptureAppsCrossMultiMonitor;
    using CShareCapturer::NotifyCaptureDisplayChanged;
    using CShareCapturer::NotifyCaptureDisplaySizedChanged;
    using CShareCapturer::NotifyCaptureNoSharedApp;
    using CShareCapturer::NotifyCaptureSharedAppDisplayChange;
    using CShareCapturer::NotifyCaptureShareSourceModified;

    int Capture(IShareFrame*) override { return SHARE_CAPTURE_OK; }
    unsigned GetCurrentCaptureDisplayId() override { return display; }

    unsigned display = SHARE_INVALID_DISPLAY;
};

/// A capturer's sink that logs what it is told, each line with its name in front.
class CCapturerSink : public IShareCapturerSink {
public:
    explicit CCapturerSink(CCallLog& calls, std::string name = "")
        : m_calls(calls),
          m_name(std::move(name)) {}

    /// Run inside every call, after it was logged.
    std::function<void()> hook;

    int OnShareSourceAdded(IShareSource* source) override { return Told("added " + Id(source)); }
    int OnShareSourceRemoved(IShareSource* source) override { return Told("removed " + Id(source)); }
    int OnCapturedDisplaySizedChanged(TVLSize size) override {
        return Told("size " + Numbers({size.cx, size.cy}));
    }
    int OnCapturedDisplayChanged(bool present) override { return Told("display " + Numbers({present})); }
    int OnCapturedNoSharedApp() override { return Told("no shared app"); }
    int OnCapturedAppDisplayChanged(unsigned display, int left, int top, int width, int height) override {
        return Told("app display " + Numbers({static_cast<int>(display), left, top, width, height}));
    }
    int OnCapturedWindowChanged(std::vector<unsigned>&) override { return Told("windows"); }
    int OnCapturedAppsCrossMultiMonitors(bool cross) override { return Told("cross " + Numbers({cross})); }
    int OnCaptureStatusChanged(int) override { return Told("status"); }
    int OnCapturePositionChanged(int, int, int, int) override { return Told("position"); }
    int OnCaptureEvent(int, int, void*) override { return Told("event"); }
    int OnCaptureError(int) override { return Told("error"); }
    int OnCaptureStatistics(SHARE_CAPTURE_STATISTIC&) override { return Told("statistics"); }

private:
    static std::string Id(IShareSource* source) {
        return source != nullptr ? std::to_string(source->GetSourceUniqueId()) : "null";
    }
    static std::string Numbers(const std::vector<int>& numbers) {
        std::string text;
        for (const int number : numbers)
            text += (text.empty() ? "" : ",") + std::to_string(number);
        return text;
    }
    int Told(const std::string& what) {
        m_calls.Add(m_name + what);
        if (hook)
            hook();
        return -1; // nobody looks at it
    }

    CCallLog& m_calls;
    const std::string m_name;
};

/// A source that logs its end as "source ID gone"; what `atEnd` gives is put behind it.
/// Lifetime: by reference count, from 0.
class CLoggedSource : public CShareSource {
public:
    CLoggedSource(CCallLog& calls, unsigned long id, ShareSourceType type = SHARE_SOURCE_TYPE_MONITOR,
                  const TVLRect& rect = {})
        : m_calls(calls) {
        m_info.sourceId = id;
        m_info.eType = type;
        m_info.rect = rect;
    }

    std::function<std::string()> atEnd;

protected:
    ~CLoggedSource() override {
        m_calls.Add("source " + std::to_string(m_info.sourceId) + " gone" + (atEnd ? atEnd() : ""));
    }

private:
    CCallLog& m_calls;
};

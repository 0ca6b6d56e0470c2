// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/thumbnail_capture_engine.h"
#include "src/thumbnail_capturer.h"
#include "tests/support/threads.h"

#include <screenshare/share_thumbnail.h>

#include <atomic>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

/// What tests of thumbnails say often.

using ThumbnailCalls = std::vector<std::string>;

/// Keeps what it is told, as "window 7 10x20", "app 7 failed last" or "error -1".
class CThumbnailLog : public ThumbnailCallback {
public:
    /// Called from inside each call, with their number so far; its result goes back.
    using During = std::function<bool(std::size_t count)>;

    explicit CThumbnailLog(During during = {}) : m_during(std::move(during)) {}
    virtual ~CThumbnailLog() = default;
    CThumbnailLog(const CThumbnailLog&) = delete;
    CThumbnailLog& operator=(const CThumbnailLog&) = delete;

    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override {
        return Take("app " + std::to_string(pid), image, failed, last);
    }
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override {
        return Take("window " + std::to_string(window), image, failed, last);
    }
    bool onThumbnailError(int code) override { return Take("error " + std::to_string(code)); }

    ThumbnailCalls Calls() const {
        const std::lock_guard<std::mutex> lock(m_told->mutex);
        return m_told->calls;
    }

private:
    /// Outlives the object in a call that somebody who waits for it ends, or that ends it itself.
    struct Told {
        std::mutex mutex;
        ThumbnailCalls calls; // guarded by mutex
        CTally all;
        CTally lasts;
    };

    bool Take(const std::string& item, const ImageData& image, bool failed, bool last) {
        std::string call = item;
        const bool isEmpty =
            image.format == 0 && image.width == 0 && image.height == 0 && image.data == nullptr;
        if (failed)
            call += isEmpty ? " failed" : " failed with a picture";
        else if (image.format != SHARE_FRAME_FORMAT_RGBA || image.lineBytes != image.width * 4)
            call += " in another form";
        else
            call += " " + std::to_string(image.width) + "x" + std::to_string(image.height);
        return Take(last ? call + " last" : call, last);
    }

    bool Take(const std::string& call, bool last = false) {
        const std::shared_ptr<Told> told = m_told;
        const During during = m_during;
        std::size_t count = 0;
        {
            const std::lock_guard<std::mutex> lock(told->mutex);
            told->calls.push_back(call);
            count = told->calls.size();
        }
        told->all.Add();
        if (last)
            told->lasts.Add();
        return !during || during(count);
    }

    const During m_during;
    const std::shared_ptr<Told> m_told = std::make_shared<Told>();

public:
    CTally& calls = m_told->all;
    CTally& lasts = m_told->lasts;
};

/// What an engine's capturers do. Set it before the first request.
struct ThumbnailPlan {
    std::function<bool()> init;
    /// False for no picture.
    std::function<bool(unsigned id)> capture;
    CTally made;
    CTally stopped;
    CTally ended;
};

/// Its pictures are as wide as the id of what was asked for; those of windows are 1 high, of applications 2.
class CPlannedCapturer : public CThumbnailCapturer {
public:
    explicit CPlannedCapturer(ThumbnailPlan& plan) : m_plan(plan) { m_plan.made.Add(); }
    ~CPlannedCapturer() override { m_plan.ended.Add(); }

    bool init() override { return !m_plan.init || m_plan.init(); }
    void stop() override { m_plan.stopped.Add(); }
    bool captureAppImage(unsigned pid, ImageData& image) override { return Capture(pid, 2, image); }
    bool captureWindowImage(unsigned window, ImageData& image) override { return Capture(window, 1, image); }

private:
    bool Capture(unsigned id, int height, ImageData& image) {
        const int width = static_cast<int>(id);
        image = {SHARE_FRAME_FORMAT_RGBA, width, height, width * 4, &m_pixel};
        return !m_plan.capture || m_plan.capture(id);
    }

    ThumbnailPlan& m_plan;
    unsigned char m_pixel = 0;
};

/// An engine of its own, with planned captures.
class CPlannedEngine : public CThumbnailCaptureEngine {
public:
    explicit CPlannedEngine(ThumbnailPlan& plan) : m_plan(plan) {}
    ~CPlannedEngine() override { stop(); }

    bool RequestWindows(std::vector<unsigned> windows, ThumbnailCallback& callback) {
        return requestForWindows(windows.data(), static_cast<int>(windows.size()), &callback);
    }
    bool RequestApps(std::vector<unsigned> pids, ThumbnailCallback& callback) {
        return requestForApps(pids.data(), static_cast<int>(pids.size()), &callback);
    }

protected:
    std::unique_ptr<CThumbnailCapturer> NewCapturer() override {
        return std::make_unique<CPlannedCapturer>(m_plan);
    }

private:
    ThumbnailPlan& m_plan;
};

/// Captures of one id wait at it.
class CHeldCapture {
public:
    explicit CHeldCapture(unsigned id) : m_id(id) {}

    bool operator()(unsigned id) {
        if (id != m_id)
            return true;
        m_reached.Add();
        return m_gate.Passes();
    }
    [[nodiscard]] bool IsReached(int times = 1) const { return m_reached.Reaches(times); }
    void Release() { m_gate.Open(); }

private:
    const unsigned m_id;
    CTally m_reached;
    CGate m_gate;
};

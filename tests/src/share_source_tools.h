// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"
#include "util/cm_trace.h"

#include <screenshare/share_source_enumerator.h>

#include <cstddef>
#include <cstdio>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

inline std::string InfoLine(const std::string& text) {
    return "[[ScreenShare],[Core]] INFO: " + text;
}

inline std::string DebugLine(const std::string& text) {
    return "[[ScreenShare],[Core]] DEBUG: " + text;
}

/// As a line shows it.
inline std::string PointerText(const void* pointer) {
    char text[2 * sizeof pointer + 3];
    std::snprintf(text, sizeof text, "0x%zx", reinterpret_cast<std::size_t>(pointer));
    return text;
}

/// Gives up what an enumerator handed out.
class CHeldSource {
public:
    CHeldSource() = default;
    ~CHeldSource() {
        if (m_source != nullptr)
            m_source->Release();
    }
    CHeldSource(const CHeldSource&) = delete;
    CHeldSource& operator=(const CHeldSource&) = delete;

    IShareSource** Out() { return &m_source; }
    IShareSource* Get() const { return m_source; }
    IShareSource* operator->() const { return m_source; }

private:
    IShareSource* m_source = nullptr;
};

/// What a sink was told.
struct SourceEvent {
    SHARE_SOURCE_EVENT event;
    unsigned long id;

    bool operator==(const SourceEvent&) const = default;
};

inline void PrintTo(const SourceEvent& told, std::ostream* out) {
    *out << "event " << static_cast<int>(told.event) << " of " << told.id;
}

/// Notes what it is told. Threads: any.
class CSourceSink : public IShareSourceEnumSink {
public:
    using During = std::function<void(SHARE_SOURCE_EVENT event, IShareSource* source)>;

    /// `during` runs inside each call.
    explicit CSourceSink(During during = nullptr) : m_during(std::move(during)) {}
    virtual ~CSourceSink() = default;

    int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) override {
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_told.push_back({event, source->GetSourceUniqueId()});
        }
        m_count.Add();
        if (m_during)
            m_during(event, source);
        return 0;
    }

    std::vector<SourceEvent> Told() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_told;
    }

    [[nodiscard]] bool WasTold(int count) const { return m_count.Reaches(count); }

private:
    const During m_during;
    mutable std::mutex m_mutex;
    std::vector<SourceEvent> m_told; // guarded by m_mutex
    CTally m_count;
};

/// Holds every thread that traces a line with `text`, there and then, until it is opened. Takes the place of
/// the receiver and the threshold while it lives.
class CTraceStop {
public:
    explicit CTraceStop(std::string text)
        : m_text(std::move(text)),
          m_thresholdBefore(CmGetTraceThreshold()) {
        CmSetTraceReceiver(Receive, this);
        CmSetTraceThreshold(CM_TRACE_DETAIL);
    }
    ~CTraceStop() {
        m_gate.Open();
        CmSetTraceThreshold(m_thresholdBefore);
        CmSetTraceReceiver(nullptr, nullptr);
    }
    CTraceStop(const CTraceStop&) = delete;
    CTraceStop& operator=(const CTraceStop&) = delete;

    /// True as soon as so many threads were held.
    [[nodiscard]] bool Holds(int threads) const { return m_held.Reaches(threads); }
    void Open() { m_gate.Open(); }

private:
    static void Receive(void* context, int, const char*, const char* text, int length) {
        auto* const self = static_cast<CTraceStop*>(context);
        const std::string_view line(text, static_cast<std::size_t>(length));
        if (line.find(self->m_text) == std::string_view::npos)
            return;
        self->m_held.Add();
        static_cast<void>(self->m_gate.Passes());
    }

    const std::string m_text;
    const int m_thresholdBefore;
    CTally m_held;
    CGate m_gate;
};

inline int NumberOf(IShareSourceEnumerator& enumerator) {
    int number = -1;
    return enumerator.GetNumber(number) == 0 ? number : -1;
}

/// The ids of the list, in its order.
inline std::vector<unsigned long> IdsOf(IShareSourceEnumerator& enumerator) {
    std::vector<unsigned long> ids;
    for (int index = 0;; ++index) {
        CHeldSource source;
        if (enumerator.GetSource(index, source.Out()) != 0)
            return ids;
        ids.push_back(source->GetSourceUniqueId());
    }
}

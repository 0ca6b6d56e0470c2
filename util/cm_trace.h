// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_text_formator.h"

#include <atomic>

/// The one door of all tracing.
///
/// A line of level n is built only while get_external_trace_mask() is at least n, so a negative mask silences
/// all.
/// Threads: any. A receiver is called on the thread that traces, perhaps on several at once, with no lock of
///          this file held; lines traced from inside a receiver are dropped. A process forked from any thread
///          at any moment traces on with the receiver that it had.
/// Errors:  nothing throws. A silent line costs one relaxed load; no line allocates.

enum CM_TRACE_LEVEL : int {
    CM_TRACE_ERROR = 0,
    CM_TRACE_WARNING = 1,
    CM_TRACE_INFO = 2,
    CM_TRACE_DEBUG = 3,
    CM_TRACE_DETAIL = 4,
};

/// The tag of every line of the library.
inline constexpr const char* CM_TRACE_TAG = "[ScreenShare],[Core]";

/// The threshold in force: the higher of the client's and the one that SCREENSHARE_TRACE asks for. -1 when
/// silent.
int get_external_trace_mask();

/// Hands one finished line to the receiver, if the client's threshold wants it, and to standard error, if the
/// one of SCREENSHARE_TRACE does. `tag` may be null. `text` has `length` bytes and is terminated.
void util_adapter_trace(int level, const char* tag, const char* text, int length);

using CmTraceReceiver = void (*)(void* context, int level, const char* tag, const char* text, int length);

void CmSetTraceThreshold(int threshold);
int CmGetTraceThreshold();

/// Puts a receiver in force, null for none. Returns when no thread is inside one that was in force before,
/// except when called from inside a receiver: then it doesn't wait. What a receiver throws is dropped.
/// Without memory for one more receiver there is none in force.
void CmSetTraceReceiver(CmTraceReceiver receiver, void* context);

/// Counts a failed check of the thread layer. The caller goes on.
void cm_assertion_report();
unsigned cm_assertion_count();

/// A place in the source. Prints as "[" path ":" line "]", the path being the file's from the project root
/// without its suffix.
struct CCmSourcePlace {
    const char* file;
    int line;
};

/// The message of a line that tells its source place. Converts from the text at the place of the call.
struct CCmTraceMessage {
    CCmTraceMessage(const char* message, const char* file = __builtin_FILE(), int line = __builtin_LINE())
        : text(message),
          place{file, line} {}

    const char* text;
    CCmSourcePlace place;
};

CCmTextFormator& operator<<(CCmTextFormator& out, const CCmSourcePlace& place);

/// A line under construction.
class CCmTraceLine {
public:
    /// Begins with "[" tag "] " and the word of the level.
    CCmTraceLine(int level, const char* tag);
    CCmTraceLine(const CCmTraceLine&) = delete;
    CCmTraceLine& operator=(const CCmTraceLine&) = delete;

    template <class T>
    CCmTraceLine& operator<<(const T& part) {
        m_text << part;
        return *this;
    }

    /// Hands the line on under `tag`, which may be null.
    void Write(const char* tag);

private:
    int m_level;
    char m_buffer[CCmTextFormator::BUFFER_SIZE];
    CCmTextFormator m_text;
};

inline bool CmTraceOn(int level) {
    return get_external_trace_mask() >= level;
}

namespace cm_trace_detail {

template <class... Parts>
void WriteLine(int level, const Parts&... parts) {
    CCmTraceLine line(level, CM_TRACE_TAG);
    ((line << parts), ...);
    line.Write(CM_TRACE_TAG);
}

} // namespace cm_trace_detail

/// Lines of one level. The parts are put together without blanks.
template <class... Parts>
void CmTraceInfo(const char* message, const Parts&... parts) {
    if (CmTraceOn(CM_TRACE_INFO))
        cm_trace_detail::WriteLine(CM_TRACE_INFO, message, parts...);
}

template <class... Parts>
void CmTraceDebug(const char* message, const Parts&... parts) {
    if (CmTraceOn(CM_TRACE_DEBUG))
        cm_trace_detail::WriteLine(CM_TRACE_DEBUG, message, parts...);
}

template <class... Parts>
void CmTraceDetail(const char* message, const Parts&... parts) {
    if (CmTraceOn(CM_TRACE_DETAIL))
        cm_trace_detail::WriteLine(CM_TRACE_DETAIL, message, parts...);
}

/// ERROR and WARNING lines end with the source place.
template <class... Parts>
void CmTraceWarning(const CCmTraceMessage& message, const Parts&... parts) {
    if (CmTraceOn(CM_TRACE_WARNING))
        cm_trace_detail::WriteLine(CM_TRACE_WARNING, message.text, parts..., message.place);
}

template <class... Parts>
void CmTraceError(const CCmTraceMessage& message, const Parts&... parts) {
    if (CmTraceOn(CM_TRACE_ERROR))
        cm_trace_detail::WriteLine(CM_TRACE_ERROR, message.text, parts..., message.place);
}

/// One message site on a hot path: lets its first occurrence through and then each `period`-th one after it
/// (1, 101, 201 … for 100). One object a site, for the life of the process.
class CCmRepeatedTraceSite {
public:
    explicit constexpr CCmRepeatedTraceSite(unsigned period = 100) : m_period(period) {}

    /// Counts an occurrence; true when it is to be written.
    bool Due() { return m_count.fetch_add(1, std::memory_order_relaxed) % m_period == 0; }

private:
    std::atomic<unsigned> m_count{0};
    unsigned m_period;
};

/// The thinned-out form: "[UTIL] " word message parts tag place, under a null tag. Writes only when the site
/// says so.
template <class... Parts>
void CmTraceRepeated(CCmRepeatedTraceSite& site, int level, const CCmTraceMessage& message,
                     const Parts&... parts) {
    if (!site.Due() || !CmTraceOn(level))
        return;
    CCmTraceLine line(level, "UTIL");
    ((line << message.text) << ... << parts) << CM_TRACE_TAG << message.place;
    line.Write(nullptr);
}

/// An error that could fire at every tick. The first one of any kind, as `firstError` tells, is written in
/// full; after that the site's own counter thins it out.
template <class... Parts>
void CmTraceRepeatedError(std::atomic<bool>& firstError, CCmRepeatedTraceSite& site,
                          const CCmTraceMessage& message, const Parts&... parts) {
    if (!firstError.exchange(false, std::memory_order_relaxed)) {
        CmTraceRepeated(site, CM_TRACE_ERROR, message, parts...);
        return;
    }
    CmTraceError(message, parts...);
}

/// A failed check of the thread layer: traced at ERROR and counted; the caller goes on without the thing
/// checked.
void CmReportFailedCheck(const char* expression, const char* file = __builtin_FILE(),
                         int line = __builtin_LINE());

// SPDX-License-Identifier: Apache-2.0
#include <screenshare/share_trace.h>

#include "util/cm_trace.h"

static_assert(int{SHARE_TRACE_LEVEL_ERROR} == int{CM_TRACE_ERROR});
static_assert(int{SHARE_TRACE_LEVEL_WARNING} == int{CM_TRACE_WARNING});
static_assert(int{SHARE_TRACE_LEVEL_INFO} == int{CM_TRACE_INFO});
static_assert(int{SHARE_TRACE_LEVEL_DEBUG} == int{CM_TRACE_DEBUG});
static_assert(int{SHARE_TRACE_LEVEL_DETAIL} == int{CM_TRACE_DETAIL});

void ShareSetTraceThreshold(int threshold) {
    CmSetTraceThreshold(threshold);
}

int ShareGetTraceThreshold() {
    return CmGetTraceThreshold();
}

void ShareSetTraceReceiver(ShareTraceReceiver receiver, void* context) {
    CmSetTraceReceiver(receiver, context);
}

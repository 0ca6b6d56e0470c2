// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/qvn_unknown.h>
#include <screenshare/share_types.h>

/// What a source is.
enum ShareSourceType : int {
    SHARE_SOURCE_TYPE_APP = 1,     ///< A running application; its id is the process id.
    SHARE_SOURCE_TYPE_MONITOR = 2, ///< A monitor; its id is the display id.
};

/// What happened to a source.
enum SHARE_SOURCE_EVENT : int {
    SHARE_SOURCE_EVENT_ADDED = 0,
    SHARE_SOURCE_EVENT_REMOVED = 1,
    SHARE_SOURCE_EVENT_UPDATED = 2,
};

struct ShareSourceInfo;

/// One thing that can be picked for sharing.
///
/// Lifetime: by reference count, see qvn::IQvnUnknown.
/// Threads:  the count is atomic, the rest belongs to one thread at a time.
class IShareSource : public qvn::IQvnUnknown {
public:
    virtual unsigned long GetSourceUniqueId() = 0;
    virtual ShareSourceType GetSourceType() = 0;
    virtual bool IsShared() = 0;
    /// Rectangle in global points; `bScaled` multiplies it by the scale of the source's display.
    virtual TVLRect GetSourceRect(bool bScaled) = 0;
    virtual void SetSourceRect(const TVLRect& rect) = 0;

    /// The name in UTF-8. `out` must hold `length` + 1 bytes: a name of `length` bytes or more is ended
    /// behind them. 0, or -1 when there is none or the arguments are bad.
    virtual int GetName(char* out, int length) {
        (void)out;
        (void)length;
        return SHARE_RESULT_FAILED;
    }
    virtual int GetDeviceName(char* out, int length) = 0;
    virtual int GetDeviceId(char* out, int length) = 0;
    virtual void* GetSourceHandle() = 0;
    /// Copies the record; null is ignored.
    virtual void SetInfo(const ShareSourceInfo* info) = 0;

protected:
    ~IShareSource() override = default;
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/qvn_unknown.h>
#include <screenshare/share_types.h>

#include <cstring>
#include <new>

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

/// Bytes of a text buffer of a source, its terminator included.
constexpr int SHARE_SOURCE_TEXT_SIZE = 256;

/// The record behind a source.
///
/// Each text is a buffer of its own of SHARE_SOURCE_TEXT_SIZE bytes, always terminated, or null.
/// Threads: one at a time.
struct ShareSourceInfo {
    unsigned long sourceId = 0; ///< Process id or display id, by the type.
    ShareSourceType eType = static_cast<ShareSourceType>(0);
    bool bShared = false;
    TVLRect rect = {0, 0, 0, 0}; ///< Global points.
    char* pName = nullptr;
    char* pDeviceId = nullptr;
    float fScale = 1.0F; ///< Backing scale of the source's display.

    ShareSourceInfo() = default;
    ~ShareSourceInfo() {
        delete[] pName;
        delete[] pDeviceId;
    }
    ShareSourceInfo(const ShareSourceInfo&) = delete;
    ShareSourceInfo& operator=(const ShareSourceInfo&) = delete;

    /// Copies everything; a text that is null over there stays as it is here. Null is ignored. The other
    /// record's texts must be whole buffers of SHARE_SOURCE_TEXT_SIZE bytes.
    void SetShareSourceInfo(const ShareSourceInfo* other) {
        if (other == nullptr)
            return;
        sourceId = other->sourceId;
        eType = other->eType;
        bShared = other->bShared;
        fScale = other->fScale;
        rect = other->rect;
        SetSourceName(other->pName, SHARE_SOURCE_TEXT_SIZE);
        SetDeviceId(other->pDeviceId, SHARE_SOURCE_TEXT_SIZE);
    }

    /// Copies `length` bytes, the last byte of the buffer left out: `text` must hold as many. Null and a
    /// length below 1 change nothing.
    void SetSourceName(const char* text, int length) { SetText(pName, text, length); }
    void SetDeviceId(const char* text, int length) { SetText(pDeviceId, text, length); }

private:
    static void SetText(char*& field, const char* text, int length) {
        if (text == nullptr || length < 1)
            return;
        if (field == nullptr)
            field = new (std::nothrow) char[SHARE_SOURCE_TEXT_SIZE];
        if (field == nullptr)
            return;
        const int count = length < SHARE_SOURCE_TEXT_SIZE ? length : SHARE_SOURCE_TEXT_SIZE - 1;
        if (text != field)
            std::memmove(field, text, static_cast<std::size_t>(count));
        std::memset(field + count, 0, static_cast<std::size_t>(SHARE_SOURCE_TEXT_SIZE - count));
    }
};

/// One thing that can be picked for sharing.
///
/// Lifetime: by reference count, see qvn::IQvnUnknown.
/// Threads:  the count is atomic. The Get operations and IsShared may run on several threads at once, SetInfo
///           and SetSourceRect not beside anything else: a source that an enumerator has given out is only
///           read.
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

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/app_kit.h"
#include "src/share_pointing_mouse.h"

#include <memory>
#include <mutex>
#include <optional>

/// The system's cursor as it was in one moment, perhaps none. A value, and no relation of CCursorImage.
class CCursorImageMac {
public:
    /// Of now. The argument means nothing.
    explicit CCursorImageMac(signed char unused);
    CCursorImageMac(const CCursorImageMac& other);
    CCursorImageMac& operator=(const CCursorImageMac&) = delete;

    /// In points from the image's top left, cut; -4 without a cursor.
    int GetHotPointX() const;
    int GetHotPointY() const;

    /// Whether both look the same and point with the same spot. Null is no cursor.
    bool IsSame(const platform::NSCursor* other) const;
    bool IsSame(const CCursorImageMac& other) const;

    /// Null without a cursor.
    const platform::NSCursor* Cursor() const { return m_cursor ? &*m_cursor : nullptr; }

private:
    const std::optional<platform::NSCursor> m_cursor;
};

/// The pointer of the desktop.
///
/// The one-argument CapturePoint tells sinks of another cursor image, with the pixels as the system has them
/// whatever the format, and of the position: of the hot point, in frame pixels from the top left of the base
/// display. Elsewhere than on that display, and until it is known, there is no position to tell.
///
/// Threads: those of ISharePointing; the display's bounds are also followed on the notice thread.
/// Errors:  -1 from a poll in which memory ran out or a sink threw.
class CSharePointingMouseMac : public CSharePointingMouse {
public:
    explicit CSharePointingMouseMac(unsigned baseDisplay);
    /// Waits for a notice that is being heard.
    ~CSharePointingMouseMac() override;

    int Start() override;
    int Stop() override { return SHARE_RESULT_OK; }
    int SetBaseDisplayID(unsigned display) override;
    using ISharePointing::CapturePoint;
    int CapturePoint(SHARE_FRAME_FORMAT format) override;

    void OnDisplayChanged();
    /// What it registers; `userInfo` is the CSharePointingMouseMac.
    static void DisplayReconfigCallBack(unsigned display, unsigned flags, void* userInfo);

private:
    int InitPointingContext();
    void CaptureCursor(SHARE_FRAME_FORMAT format);
    void CapturePosition();
    void TellPositionInFrame(const platform::CGPoint& position, const platform::CGRect& screen);

    std::mutex m_contextMutex;
    std::unique_ptr<CCursorImageMac> m_pLastCursor; // that the sinks have heard of last
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/qvn_unknown.h>
#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

/// A pointer image with its hot point, in pixels from the top left of the image.
/// Lifetime: by reference count, see qvn::IQvnUnknown.
class ISharePointingImg : public qvn::IQvnUnknown {
public:
    virtual void SetHotPointX(int x) = 0;
    virtual void SetHotPointY(int y) = 0;
    virtual int GetHotPointX() = 0;
    virtual int GetHotPointY() = 0;
    /// The picture; it stays owned by the image. May be null.
    virtual IShareFrame* GetImgData() = 0;

protected:
    ~ISharePointingImg() override = default;
};

/// Hears of pointer changes, on the thread that polls CapturePoint. The results are not looked at.
class ISharePointingSink {
public:
    virtual int OnPointingPosChanged(int x, int y) = 0;
    virtual int OnPointingImgChanged(ISharePointingImg* image) = 0;

protected:
    ~ISharePointingSink() = default;
};

/// Tells where the pointer is and what it looks like, when it is asked. It never calls on its own.
///
/// Threads: one thread at a time; sinks are added and removed while nobody polls.
/// Errors:  SHARE_RESULT codes; what a class doesn't offer gives SHARE_RESULT_NOT_AVAILABLE.
class ISharePointing {
public:
    virtual ~ISharePointing() = default;

    virtual int Start() { return SHARE_RESULT_NOT_AVAILABLE; }
    virtual int Stop() { return SHARE_RESULT_NOT_AVAILABLE; }
    /// Tells the sinks what has changed since the last call, images in that format.
    virtual int CapturePoint(SHARE_FRAME_FORMAT format) {
        (void)format;
        return SHARE_RESULT_NOT_AVAILABLE;
    }
    /// The form that the capture pass polls: positions come in pixels of a frame of that scale. The library's
    /// own classes don't offer it; their pointer is drawn where the picture is made.
    virtual int CapturePoint(SHARE_FRAME_FORMAT format, float scale) {
        (void)format;
        (void)scale;
        return SHARE_RESULT_NOT_AVAILABLE;
    }
    virtual int AddSink(ISharePointingSink* sink) = 0;
    virtual int RemoveSink(ISharePointingSink* sink) = 0;
    virtual int CleanSink() = 0;
    /// The display that positions refer to.
    virtual int SetBaseDisplayID(unsigned display) = 0;
};

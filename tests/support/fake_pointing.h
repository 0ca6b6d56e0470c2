// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/call_log.h"
#include "util/qvn_unknown_impl.h"

#include <screenshare/share_pointing.h>

/// A pointer image around a picture of the test's; a null picture is allowed.
/// Lifetime: by reference count; the picture stays the test's.
class CFakePointingImg final : public ISharePointingImg, public qvn::CQvnUnknownImpl {
public:
    CFakePointingImg(CCallLog& calls, IShareFrame* picture, int hotX, int hotY)
        : m_calls(calls),
          m_picture(picture),
          m_hotX(hotX),
          m_hotY(hotY) {}

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** object) override {
        return QueryInterfaceImpl(iid, object);
    }
    unsigned GetReference() override { return GetReferenceImpl(); }

    void SetHotPointX(int x) override { m_hotX = x; }
    void SetHotPointY(int y) override { m_hotY = y; }
    int GetHotPointX() override { return m_hotX; }
    int GetHotPointY() override { return m_hotY; }
    IShareFrame* GetImgData() override {
        m_calls.Add("GetImgData");
        return m_picture;
    }

protected:
    ~CFakePointingImg() override { m_calls.Add("image deleted"); }

private:
    CCallLog& m_calls;
    IShareFrame* m_picture;
    int m_hotX;
    int m_hotY;
};

/// A pointing object that offers the poll of the capture pass.
/// Lifetime: made with new and handed to an engine, which ends it. Threads: one at a time.
class CFakePointing final : public ISharePointing {
public:
    explicit CFakePointing(CCallLog& calls) : m_calls(calls) {}
    ~CFakePointing() override { m_calls.Add("pointing deleted"); }

    int result = SHARE_RESULT_OK; ///< Of the poll; only a good one tells the sink anything.
    int x = 0;
    int y = 0;
    ISharePointingImg* image = nullptr; ///< Not counted here.
    SHARE_FRAME_FORMAT polledFormat = SHARE_FRAME_FORMAT_NONE;
    float polledScale = 0;
    unsigned baseDisplay = 0;

    int Start() override;
    int Stop() override;
    int CapturePoint(SHARE_FRAME_FORMAT format) override;
    int CapturePoint(SHARE_FRAME_FORMAT format, float scale) override;
    int AddSink(ISharePointingSink* sink) override;
    int RemoveSink(ISharePointingSink* sink) override;
    int CleanSink() override;
    int SetBaseDisplayID(unsigned display) override;

private:
    CCallLog& m_calls;
    ISharePointingSink* m_sink = nullptr;
};

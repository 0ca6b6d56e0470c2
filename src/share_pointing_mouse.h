// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"
#include "util/qvn_unknown_impl.h"

#include <screenshare/share_pointing.h>

#include <list>

/// A pointer image with a picture of its own.
/// Lifetime: by reference count, from 0; whoever makes one sets the hot point before handing it on.
class CCursorImage : public ISharePointingImg, public qvn::CQvnUnknownImpl {
public:
    CCursorImage();

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** object) override {
        return QueryInterfaceImpl(iid, object);
    }
    unsigned GetReference() override { return GetReferenceImpl(); }

    void SetHotPointX(int x) override { m_nHotPointX = x; }
    void SetHotPointY(int y) override { m_nHotPointY = y; }
    int GetHotPointX() override { return m_nHotPointX; }
    int GetHotPointY() override { return m_nHotPointY; }
    IShareFrame* GetImgData() override { return m_pImgFrame; }

protected:
    ~CCursorImage() override;

    IShareFrame* m_pImgFrame; // holds one reference
    int m_nHotPointX = 0;
    int m_nHotPointY = 0;
};

/// The sinks of a pointing object and what it told them last; it looks at no pointer itself. Null is taken
/// for no sink. A sink must not take itself off inside a call.
class CSharePointingMouse : public ISharePointing {
public:
    explicit CSharePointingMouse(unsigned baseDisplay);
    ~CSharePointingMouse() override;
    CSharePointingMouse(const CSharePointingMouse&) = delete;
    CSharePointingMouse& operator=(const CSharePointingMouse&) = delete;

    int AddSink(ISharePointingSink* sink) override;
    int RemoveSink(ISharePointingSink* sink) override;
    int CleanSink() override;
    int SetBaseDisplayID(unsigned display) override;

protected:
    void _TellPosition(int x, int y);
    void _TellImage(ISharePointingImg* image);

    ShareRelaxed<unsigned> m_nBaseDisplayID;
    ShareRelaxedCGRect m_rcScreenBounds; // of that display
    std::list<ISharePointingSink*> m_listSink;
    float m_fLastX = -1.0F;
    float m_fLastY = -1.0F;
    ISharePointingImg* m_pCursorImg = nullptr; // holds one reference
};

/// A pointer without a mouse: a square of one colour that is somewhere else in the dummy picture each second.
/// Positions are in pixels of that picture, whatever the display.
class CSharePointingMouseDummy : public CSharePointingMouse {
public:
    using CSharePointingMouse::CSharePointingMouse;
    ~CSharePointingMouseDummy() override;

    int Start() override { return SHARE_RESULT_OK; }
    int Stop() override { return SHARE_RESULT_OK; }
    using ISharePointing::CapturePoint;
    /// The image is made at the first call, in that call's format, and told once.
    int CapturePoint(SHARE_FRAME_FORMAT format) override;

private:
    void _MakeCursorImage(SHARE_FRAME_FORMAT format);
    void _MovePointer();
};

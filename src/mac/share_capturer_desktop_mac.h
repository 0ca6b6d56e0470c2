// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_mac.h"
#include "src/share_capturer.h"

#include <memory>
#include <mutex>

/// Captures a whole monitor, and is what the platform's other capturers start from: it chooses a back-end,
/// hands it everything, and follows the displays.
///
/// Threads:  those of the base. Displays are followed on the notice thread, from the constructor to the
///           destructor; what runs there is not virtual, since a derived part may not be there yet or any
///           more.
/// Lifetime: owns its back-end, which ends after the last notice.
class CShareCapturerDesktopMac : public CShareCapturer {
public:
    /// Makes a context if it is given none.
    explicit CShareCapturerDesktopMac(const std::shared_ptr<ShareCapturerContext>& context);
    ~CShareCapturerDesktopMac() override;

    int AddCaptureShareSource(IShareSource* source) override;
    /// The source stays in the list: the monitor remains what is captured.
    int RemoveCaptureShareSource(IShareSource* source) override;
    int Capture(IShareFrame* frame) override;
    int SetCaptureMaxSize(TVLSize size) override;
    unsigned GetCurrentCaptureDisplayId() override;
    /// Where the captured display is; all zeros without a back-end.
    int GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) override;
    int SelectSharedDisplay(unsigned display) override;
    bool PointerCaptured() override;
    int SetFPS(int fps) override;
    bool Reinit() override;
    bool IsWindowAreaBaseContentSupport() override;
    int SetCaptureThreadCount(unsigned count) override;

    /// Makes the back-end of the capture mode in force, unless there is one. 0, or -1 when there is none: the
    /// next call tries again.
    virtual int InitCapturer();

    /// Always 0.
    int SelectSharedMonitor(unsigned display);
    void OnDisplayPlugin(unsigned display);
    void OnDisplayPlugout(unsigned display);
    void OnScreenResolutionChanged(unsigned display);
    void OnDisplayPosChanged(unsigned display);

protected:
    /// Null until there is one.
    std::shared_ptr<ShareCapturerMac> BackEnd() const;

private:
    void GiveUpBackEnd();

    mutable std::mutex m_mutexBackEnd;
    std::shared_ptr<ShareCapturerMac> m_capturerMac; // guarded by m_mutexBackEnd
};

/// What a desktop capturer registers; `user` is the CShareCapturerDesktopMac.
void CShareCapturerDesktopMac_DisplayReconfigCallBack(unsigned display, unsigned flags, void* user);

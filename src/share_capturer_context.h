// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"
#include "src/share_region.h"

#include <screenshare/share_types.h>

#include <atomic>
#include <cstdint>
#include <map>
#include <mutex>
#include <optional>
#include <vector>

/// What one share has been told to show or keep out, and what the last walk over the windows found.
///
/// Lifetime: shared by the engine, its capturer and its back-end; goes with the last of them.
/// Threads:  any. Lists and published results have m_paramLock, displays have m_displayLock; the two are
/// never
///           held together. A list change made during a walk is seen by the walk or by the next one.
/// Units:    global display coordinates in points.
/// Errors:   0; -2 for an invalid id, which changes nothing and is traced; -1 for a value that is not there.
class ShareCapturerContext {
public:
    ShareCapturerContext();
    virtual ~ShareCapturerContext();
    ShareCapturerContext(const ShareCapturerContext&) = delete;
    ShareCapturerContext& operator=(const ShareCapturerContext&) = delete;

    /// Walks the window list and publishes what it shows. -3 here: there is no list to walk.
    virtual int UpdateShareCapturerContext();
    /// Whether a walk would find now what the last one did; false when that can't be told. On the thread of
    /// the walk.
    virtual bool DoesLastWalkStand() const { return false; }
    virtual bool shouldPauseCapturing();
    /// Makes the tables of the shared displays anew. Called with or without m_displayLock, which is
    /// recursive.
    virtual int InitDisplays();
    /// Has to give the same for a process until _NoteChange.
    virtual bool IsFilterOutSystemProcess(unsigned pid) const;
    /// Whether the window itself is on the shared list. The caller holds m_paramLock.
    virtual bool _IsWindowShared(unsigned window) const;

    // ---- What the client shares and keeps out. Each add takes the value off the opposite list in the same
    // step: nobody sees it in neither, however many threads add it to both lists. A value that is there
    // already stays, and the opposite list is then left alone.

    int AddSharedWindow(unsigned window);
    int RemoveSharedWindow(unsigned window);
    int AddUnSharedWindow(unsigned window);
    int RemoveUnSharedWindow(unsigned window);
    /// Turns the share into an application share, whatever it was.
    int AddSharedApp(unsigned pid);
    int RemoveSharedApp(unsigned pid);
    int AddUnSharedApp(unsigned pid);
    int RemoveUnSharedApp(unsigned pid);

    /// How often something was withdrawn from what may be seen: kept out, or no longer shared. A picture that
    /// was begun at another count may show what must not be seen by now.
    std::uint64_t Withdrawals() const { return m_nWithdrawals.load(); }

    /// How often something was let in: shared, or no longer kept out. A picture of before may show what was
    /// not to be seen then.
    std::uint64_t Admissions() const { return m_nAdmissions.load(); }

    /// Grows with every change of the lists, the share type and the displays. What was found out when it was
    /// something else may be past.
    std::uint64_t Revision() const { return m_nRevision.load(); }

    /// The share goes on after a time in which nobody was to see it.
    void NoteInterruption() { ++m_nInterruptions; }
    /// How often that was. A picture that was begun at another count may be of such a time.
    std::uint64_t Interruptions() const { return m_nInterruptions.load(); }

    /// 0 whatever InitDisplays gave.
    int AddSharedDisplay(unsigned display);
    /// 0 for an absent display, too.
    int RemoveSharedDisplay(unsigned display);
    /// The tables stay as they are until the next change.
    int ClearSharedDisplay();
    /// Makes the tables anew, whichever display changed.
    int UpdateSharedDisplay(unsigned display);

    /// The process itself goes onto the unshared list, or off it, only in a desktop share.
    int SetFilterSelf(bool filter);
    int SetShareType(SHARE_TYPE type);
    SHARE_TYPE GetShareType() const { return m_eShareType; }
    int SetCaptureMaxSize(TVLSize size);
    int GetCaptureMaxSize(TVLSize& size) const;
    /// -2 below 1; the rate then stays.
    int SetCaptureFps(int fps);
    int GetCaptureFps() const { return m_nCaptureFps; }

    int GetSharedWindowCount() const;
    int GetUnSharedWindowCount() const;
    int GetSharedAppCount() const;
    int GetUnSharedAppCount() const;
    int GetSharedMonitorCount() const;
    int GetSharedWindows(std::vector<unsigned>& windows) const;
    int GetUnSharedWindows(std::vector<unsigned>& windows) const;
    int GetSharedProcesses(std::vector<unsigned>& pids) const;
    int GetUnSharedProcesses(std::vector<unsigned>& pids) const;
    int GetSharedMonitors(std::vector<unsigned>& displays) const;

    // ---- Verdicts. A window's own lists outrank those of its application.

    bool IsAppShared(unsigned pid) const;
    bool IsAppUnShared(unsigned pid) const;
    bool IsWindowShared(unsigned window) const;
    /// For a window of a walk or a look that judged it as shared: looks its owner up once more. A verdict
    /// that was made while the window server failed took the window for nobody's, whom nobody keeps out. True
    /// for one whose owner can't be told now or is kept out, unless the window itself is shared.
    bool MayBeKeptOut(unsigned window) const;
    /// Leaves those of `windows` that IsWindowShared and not MayBeKeptOut, in their order. Judges all of them
    /// by the windows of one moment and the lists of another one behind it.
    void KeepShared(std::vector<int>& windows) const;
    /// Whether there may be something that a picture of a whole display must not show.
    bool KeepsOut() const;
    /// Doesn't look at the shared windows: a shared window of an application that isn't shared is both.
    bool IsWindowUnShared(unsigned window) const;

    // ---- What the last walk found.

    /// How often a walk has published something else than what stood. While it is the same, so is all that
    /// the operations below tell of the walk.
    std::uint64_t Publications() const { return m_nPublications.load(); }

    /// The windows in the picture, top of the stack first. Of an application on several displays only those
    /// on its main display, and these are appended; otherwise `windows` is replaced.
    int GetCapturedWindows(std::vector<unsigned>& windows) const;
    /// The windows judged to be kept out, bottom of the stack first.
    int GetCapturedExcludedWindows(std::vector<unsigned>& windows) const;
    /// The displays that the share lies on, main display first.
    int GetAppMonitors(std::vector<unsigned>& displays) const;
    int GetDisplayRects(std::map<unsigned, TVLRect>& rects) const;

    /// What kept windows show and something that isn't kept hides.
    int GetOverlapRegion(TVLRegion& region) const;
    /// What is seen of kept windows.
    int GetVisiableRegion(TVLRegion& region) const;
    /// What the kept windows cover, hidden parts included.
    int GetSharedWindowRegion(TVLRegion& region) const;
    int GetDisplayRegion(TVLRegion& region) const;
    /// The displays less the visible region.
    int GetInvisiableRegion(TVLRegion& region) const;
    /// The displays less the visible and the overlap region.
    int GetBackgroundInvisiableRegion(TVLRegion& region) const;
    /// What a picture of the displays as they are seen shows of windows that are not kept. Only found while
    /// m_bFindsExposed, else empty.
    int GetExposedRegion(TVLRegion& region) const;
    /// The generation of the windows that were walked; 0 when that can't be told, or nothing was walked.
    std::uint64_t WalkedGeneration() const { return m_nWalkedGeneration; }
    /// -1 and all zeros when the region is empty.
    int GetSharedWindowBoxRect(TVLRect& rect) const;
    int GetDisplayBoxRect(TVLRect& rect) const;

    /// The kept windows are not cut out: frames show the whole display.
    ShareRelaxed<bool> m_bNoWindowBaseArea{true};
    ShareRelaxed<bool> m_bExcludeMenuBar{false};
    /// For who starts from such a picture instead of from the kept windows' own ones.
    ShareRelaxed<bool> m_bFindsExposed{false};

protected:
    /// What one walk finds. Its vectors change places with the published ones, so their memory is used again.
    struct ParamSet {
        TVLRegion rgnOverlap;
        TVLRegion rgnVisible;
        TVLRegion rgnSharedWindow;
        TVLRegion rgnApplications;
        TVLRegion rgnExposed;
        std::vector<unsigned> vCapturedWindows;
        std::vector<unsigned> vCapturedExcludedWindows;
        std::vector<unsigned> vAppDisplays;

        void reset();
    };

    /// The verdict on a window. Takes m_paramLock itself, so the caller must not hold it: the owner of a
    /// window that is on neither list is asked for in between, with no lock held, and the lists are then read
    /// again. The verdict is therefore that of one moment.
    bool __IsWindowShared(unsigned window) const;
    /// The same. Clears `isSure` when the question for the owner failed, and it may be another's window.
    bool __IsWindowShared(unsigned window, bool& isSure) const;

    /// What the lists of windows alone say of one; nothing when they leave it to the application. Takes
    /// m_paramLock.
    std::optional<bool> _WindowListsVerdict(unsigned window) const;
    /// The caller holds m_paramLock.
    bool _IsAppShared(unsigned pid) const;
    bool _IsAppUnShared(unsigned pid) const;
    bool _IsWindowUnShared(unsigned window) const;

    /// Which displays count as those of a share of windows.
    struct AppDisplayRule {
        bool areAsSet;      ///< Those that were set, whatever the windows cover.
        bool isByTopWindow; ///< The one of the frontmost window is the main one, else that with the largest
                            ///< box.

        /// As settings and flags have it.
        static AppDisplayRule InForce();
        bool operator==(const AppDisplayRule&) const = default;
    };

    /// What the client has set is another now. Behind the change, under its lock if it has one: who reads the
    /// new revision reads the new values behind it.
    void _NoteChange() { ++m_nRevision; }

    /// Works out which displays the share lies on, the main one first. On the thread of the walk, with no
    /// lock held; with no display at all everything stays as it is. False when a question about them failed
    /// or there was no memory, so that it may be otherwise.
    bool _UpdateAppsDisplay(ParamSet& found, const AppDisplayRule& rule);
    /// The box around what the windows have of a display; all zeros when they have nothing. Clears `isSure`
    /// when there is no memory to find out.
    TVLRect _AppBoxOnDisplay(const TVLRect& display, const TVLRegion& applications, bool& isSure) const;
    /// Publishes a walk. False when there was no memory for all of it.
    bool _CommitParamSet(ParamSet& found);

    ShareRelaxed<bool> m_bFilterSelf{false};
    ShareRelaxedSize m_sizeCaptureMax;
    ShareRelaxed<int> m_nCaptureFps{5};
    mutable std::recursive_mutex m_paramLock;
    mutable std::recursive_mutex m_displayLock;
    std::atomic<std::uint64_t> m_nWithdrawals{0};
    std::atomic<std::uint64_t> m_nAdmissions{0};
    std::atomic<std::uint64_t> m_nInterruptions{0};
    std::atomic<std::uint64_t> m_nRevision{0};
    std::atomic<std::uint64_t> m_nPublications{0};
    std::vector<unsigned> m_vSharedWindows;
    std::vector<unsigned> m_vUnSharedWindows;
    std::vector<unsigned> m_vSharedApps;
    std::vector<unsigned> m_vUnSharedApps;
    std::vector<unsigned> m_vSharedDisplays;
    std::vector<unsigned> m_vAppDisplays;
    /// Every display, covered or not. Belongs to the thread of the walk.
    std::map<unsigned, TVLRect> m_mapAppDisplayRects;
    std::vector<unsigned> m_vCapturedWindows;
    std::vector<unsigned> m_vCapturedExcludedWindows;
    TVLRegion m_rgnOverlap;
    TVLRegion m_rgnVisible;
    TVLRegion m_rgnSharedWindow;
    TVLRegion m_rgnDisplay;
    std::map<unsigned, TVLRect> m_mapDisplayRects;
    std::map<unsigned, TVLSize> m_mapDisplaySizes;
    TVLRegion m_rgnApplications;
    TVLRegion m_rgnExposed;
    ShareRelaxed<std::uint64_t> m_nWalkedGeneration{0};
    ShareRelaxed<SHARE_TYPE> m_eShareType{SHARE_TYPE_DESKTOP};
    /// Belongs to the thread of the walk.
    ParamSet m_paramSet;
    /// Frontmost kept window of the normal level in the walk at hand; 0 when there is none.
    ShareRelaxed<unsigned> m_nTopAppWindow{0};
};

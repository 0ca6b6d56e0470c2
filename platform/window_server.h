// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <sys/types.h>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// The narrow interface between the library and a window server. Whoever brings a new kind of desktop
/// implements WindowServer and nothing else; tests/platform/conformance_test states this contract once and
/// runs it on each.
///
/// What is written here once, and holds for every operation:
///
/// Threads    Any operation may be called from any thread at any time, several at once, in any state of the
///            server. An implementation may own one thread, besides those that a library it needs starts;
///            none of them calls out except into the NoticeReceiver, all are joined with it, and all block
///            every signal.
/// Waiting    Look-ups (displays, snapshot, pointer, cursor, applications, life, capabilities) answer from
///            what the server knows already and never wait for the desktop. Operations that do wait have a
///            deadline and fail when it passes; the server then counts as stalled until it answers again.
///            Nothing holds a lock that a notice needs while it waits. Deadlines are absolute, on
///            CmSteadyNow; one that has passed, such as the default, gives Timeout. Threads wait on a
///            CCmWaitPoint, so that a clock that is moved by hand moves them.
/// Answers    A call on a dead, stalled or unfinished server is normal and gives the failure value. No
///            operation throws, ends the process, raises a signal or spins.
/// Results    What is given out is immutable and shared: it stays as it was while somebody holds it,
///            however the desktop goes on, and outlives the server itself.
/// Units      Points (platform/core_types.h) for places on the desktop, pixels for pictures, the monotonic
///            clock (CmSteadyNow) for times.
/// Forking    Every descriptor is close-on-exec; no lock is held over a fork. In a forked child a server is
///            Lost for good, touches no descriptor and waits for no thread; destroying it there only forgets.
namespace platform {

// ---- What a server can do

enum class Capability {
    Windows,      ///< A list of windows; without it there is one window a display, see WindowSnapshot.
    WindowImages, ///< Pictures of chosen windows.
    Streams,      ///< Streams of a display as seen.
    Pointer,      ///< The pointer's position.
    Cursor,       ///< The pointer's image.
    Applications, ///< Running applications.
    Activation,   ///< Bringing an application to the front.
};

enum class Availability {
    No,
    Yes,
    AfterPermission
};

enum class Permission {
    NotNeeded,
    NotAsked,
    Asking,
    Granted,
    Denied
};

enum class Life {
    Alive,
    /// A deadline has passed and the server has not answered since. Operations that wait fail at once,
    /// look-ups give the last state; the server itself finds out when it answers again.
    Stalled,
    /// The connection is gone, or there never was one. Look-ups give nothing. It may come back.
    Lost,
};

struct LifeState {
    Life life = Life::Lost;
    /// Grows each time the server is found anew; what was opened under an earlier epoch is dead.
    std::uint64_t epoch = 0;

    bool operator==(const LifeState&) const = default;
};

// ---- Displays

struct DisplayInfo {
    /// The same for the same monitor, also after it was unplugged and plugged in again, after displays
    /// changed their order, and after the server was lost and found.
    CGDirectDisplayID id = 0;
    CGRect bounds;
    /// Bounds less the edges that menu bars, panels and docks have reserved.
    CGRect visibleBounds;
    /// Pixels per point.
    float scale = 1.0F;
    /// UTF-8; never empty.
    std::string productName;

    bool operator==(const DisplayInfo&) const = default;
};

/// The main display first, the others in an order that only changes with the layout.
using DisplayList = std::vector<DisplayInfo>;

/// What happened to a display; several may come in one notice. A server tells what has happened and never
/// DisplayBeginConfiguration: the layer above adds the call before. A loss is LifeChanged and then
/// DisplayRemoved for each display, a return LifeChanged and then DisplayAdded. Mirrored displays are one.
enum DisplayChangeFlags : unsigned {
    DisplayBeginConfiguration = 1u << 0,
    DisplayMoved = 1u << 1,
    DisplaySetMain = 1u << 2,
    DisplaySetMode = 1u << 3,
    DisplayAdded = 1u << 4,
    DisplayRemoved = 1u << 5,
    DisplayEnabled = 1u << 8,
    DisplayDisabled = 1u << 9,
    DisplayDesktopShapeChanged = 1u << 12, ///< Its size, or the arrangement, changed.
};

// ---- Windows

enum class SharingState {
    None, ///< Its pixels are never given out.
    ReadOnly,
    ReadWrite,
};

struct WindowInfo {
    CGWindowID id = 0; ///< Never means another window later; when ids run out, the window is not listed.
    pid_t owner = 0;   ///< 0 when it can't be told.
    /// Height in the stack's storeys: 0 for normal windows, negative for the desktop's own, higher ones for
    /// what floats above (dock, menus, panels; the levels of CGWindowLevelForKey).
    int level = 0;
    float alpha = 1.0F; ///< 0 fully transparent to 1 opaque, for the window as a whole.
    CGRect frame;       ///< The visible frame: decorations in, shadows out.
    SharingState sharing = SharingState::ReadOnly;
    bool onScreen = true; ///< Mapped and neither minimised nor on another workspace.
    std::string title;    ///< UTF-8, perhaps empty; text that is no UTF-8 is mended, never passed on.
};

/// All windows of one moment; those that are off the screen stand where the server's stack has them, else at
/// the back. The order of the list, and not the level, tells who covers whom.
///
/// A window enters a snapshot only when its owner, level and sharing state have been found out, or can't be:
/// one whose owner is not known yet would pass for a window of nobody. The generation has grown from its
/// mapping on, and no snapshot of that generation is given out before.
class WindowSnapshot {
public:
    WindowSnapshot() = default;
    /// `frontFirst` holds the windows from the front of the stack to its back.
    WindowSnapshot(std::uint64_t generation, std::vector<WindowInfo> frontFirst);

    /// Grows with every change of stack, frame, mapping, level, owner, sharing state or alpha, so equal
    /// generations mean an equal picture of who covers whom. Never goes back, also not over a loss; those of
    /// two servers can't be compared. Never 0 on a server that is alive.
    std::uint64_t Generation() const { return m_generation; }
    const std::vector<WindowInfo>& Windows() const { return m_windows; }
    /// Null for a window that is not in this snapshot.
    const WindowInfo* Find(CGWindowID id) const;

private:
    std::uint64_t m_generation = 0;
    std::vector<WindowInfo> m_windows;
    std::vector<std::pair<CGWindowID, std::size_t>> m_index; // sorted by id
};

// ---- Pictures

/// Bytes in memory order, byte 0 first; in the last one, the bits of a little-endian 32-bit word, high ones
/// first.
enum class PixelFormat {
    BGRX,
    BGRA, ///< Premultiplied.
    RGBX,
    RGBA, ///< Premultiplied.
    X2R10G10B10,
};

/// Pixels of a picture; right and bottom exclusive.
struct PixelRect {
    int left = 0;
    int top = 0;
    int right = 0;
    int bottom = 0;

    bool operator==(const PixelRect&) const = default;
};

/// What makes a picture of a window different from an earlier one of the same window, size, format and part.
struct PictureStep {
    std::uint64_t serial = 0; ///< Of the earlier one.
    /// From that one to the next newer one of the list; perhaps more and never less.
    std::vector<PixelRect> changed;
};

/// One block of pixels, pinned while held: nobody writes to it any more.
struct Picture {
    int width = 0;
    int height = 0;
    std::size_t stride = 0; ///< Bytes from one row to the next, at least width * 4.
    PixelFormat format = PixelFormat::BGRX;
    const std::uint8_t* pixels =
        nullptr;        ///< First byte of the top row; never null in a picture that is given out.
    CGRect rect;        ///< What the picture shows, in points.
    float scale = 1.0F; ///< Pixels per point.
    std::chrono::nanoseconds time{0}; ///< When the desktop looked like this.
    /// Of a stream: what is different from this reader's picture before, perhaps more and never less; the
    /// whole picture at first, and nothing where only the generations are others. A layer tells nothing here:
    /// its picture is the same object as long as the window's pixels are the same.
    std::vector<PixelRect> changed;
    /// Of a layer: a number that no other picture of this process has, of whatever server; 0 when the server
    /// doesn't number its pictures. It tells pictures apart without keeping them, as their memory is used
    /// again.
    std::uint64_t serial = 0;
    /// Of a layer: how it came out of earlier pictures, the newest first, each step leading up to the one
    /// before it in the list and the first one up to this picture. Ends where nothing is known or kept.
    std::vector<PictureStep> steps;
    /// Of a display: the generation of the oldest stack that the pixels may still show (where a compositor
    /// lags behind the stack, the one in force a settle time ago), and the generation after the fetch. Only
    /// when both are equal does the picture show that snapshot. Before is 0 where the stack can't be told:
    /// something may be seen that no snapshot lists, or of a window behind one that hasn't painted yet. Not
    /// used in a layer.
    std::uint64_t generationBefore = 0;
    std::uint64_t generationAfter = 0;
    std::shared_ptr<const void> memory; ///< Keeps `pixels`.
};

using PicturePtr = std::shared_ptr<const Picture>;

/// One window's part in a window picture.
struct PictureLayer {
    CGWindowID window = 0;
    PicturePtr picture;
    CGRect frame;       ///< Where it lies, in points.
    float alpha = 1.0F; ///< To be multiplied into its pixels.
    /// Not of this moment: the last picture of a window that has none now, as when it is minimised.
    bool stale = false;
};

/// A picture of chosen windows: their own pictures, back to front, all of one moment. What no layer covers is
/// empty.
struct WindowPicture {
    std::vector<PictureLayer> layers;
    std::chrono::nanoseconds time{0};
    std::uint64_t generation = 0; ///< The snapshot whose stack it shows.
    /// Where the pointer was then, in points, if the server has learnt it on the way.
    std::optional<CGPoint> pointer;
    std::uint64_t moment = 0; ///< See WindowServer::GetMoment; 0 when it can't be told.
};

/// A number that no other moment of the process has, of whatever window server.
std::uint64_t NewMoment() noexcept;

enum class PictureOutcome {
    Ok,
    Lost,        ///< The server is lost or stalled. Not traced for each call.
    Nothing,     ///< Nothing new since this reader's last picture.
    Stale,       ///< The stack kept changing under the fetch; no picture. Asking again may help.
    Gone,        ///< None of the windows, or not the display, exists any more.
    Timeout,     ///< The deadline passed.
    Unsupported, ///< This server can't, or not with what has been kept out.
    Refused,     ///< Permission is missing.
    Failed,      ///< Anything else; the server has traced why.
};

struct WindowPictureResult {
    PictureOutcome outcome = PictureOutcome::Failed;
    std::shared_ptr<const WindowPicture> picture; ///< Null unless Ok.
};

struct DisplayPictureResult {
    PictureOutcome outcome = PictureOutcome::Failed;
    PicturePtr picture; ///< Null unless Ok.
};

enum WindowPictureOptions : unsigned {
    WindowPictureDefault = 0,             ///< With what the server draws around the frame, such as shadows.
    WindowPictureBoundsIgnoreFraming = 1, ///< The frames only.
};

/// What TakeWindowPicture is asked for.
struct WindowPictureRequest {
    /// Whether the asker keeps out anything, listed or not. A server without Capability::Windows then answers
    /// Unsupported: the picture of a whole display would show it.
    bool keepsOut = true;
    std::vector<CGWindowID> windows; ///< In any order; unknown ones are left out, doubled ones count once.
    CGRect rect;                     ///< What will be looked at, in points; the server need not fetch more.
    unsigned options = WindowPictureBoundsIgnoreFraming;
    /// Give up at this time. DEFAULT_IMAGE_DEADLINE from now is what callers use.
    std::chrono::nanoseconds deadline{0};
};

/// What OpenDisplayStream is asked for.
struct DisplayStreamRequest {
    CGDirectDisplayID display = 0;
    unsigned framesPerSecond =
        30; ///< At most so many pictures a second; the pictures are as seen, not per change.
    bool withPointer = false; ///< Draw the pointer in.
};

/// A reader of a display as it is seen. Several readers of one display each have their own changes.
/// Threads:  one at a time.
/// Lifetime: destroying it closes it; no StreamPicture notice of it comes after that. It may be kept beyond
///           its epoch and beyond its server, and answers Gone then, as it does once its display was
///           removed.
class DisplayStream {
public:
    virtual ~DisplayStream() = default;

    /// Names the stream in notices; never used twice.
    virtual std::uint64_t Id() const = 0;

    /// The newest picture, with what changed since this reader's last one; Nothing when nothing did. Doesn't
    /// wait for a change.
    ///
    /// A picture that stands still has new generations all the same when the stack has changed, and once more
    /// when nothing older can be seen any longer: then it is given again, with nothing changed in it. Who
    /// asks is told; there are no notices of that.
    virtual DisplayPictureResult TakeNewest(std::chrono::nanoseconds deadline) = 0;
};

struct DisplayStreamResult {
    PictureOutcome outcome = PictureOutcome::Failed;
    std::unique_ptr<DisplayStream> stream; ///< Null unless Ok.
};

// ---- Pointer and cursor

/// The pointer's image, in one or more resolutions of the same thing.
struct CursorImage {
    std::uint64_t serial = 0;                ///< Another one whenever the image is another one.
    CGPoint hotSpot;                         ///< Points from the image's top left.
    std::vector<PicturePtr> representations; ///< BGRA or RGBA; at least one.
};

// ---- Applications

enum class ApplicationKind {
    Ordinary,
    Other, ///< A process that shows windows without being something that people start.
};

struct ApplicationInfo {
    pid_t pid = 0;
    std::string name;     ///< For people, UTF-8; never empty.
    std::string fileName; ///< Of the program, without its folder.
    ApplicationKind kind = ApplicationKind::Ordinary;
    bool backgroundOnly = false;
};

using ApplicationList = std::vector<ApplicationInfo>;

// ---- Notices

enum class NoticeKind {
    DisplayChanged,      ///< `display`, `flags`. The lists already tell the new state.
    ApplicationLaunched, ///< `pid`
    ApplicationEnded,    ///< `pid`; only when the process has ended, and once.
    PermissionChanged,
    LifeChanged,
    StreamPicture, ///< `stream`: there is something new to be seen for that reader. Not repeated until it has
                   ///< taken a picture.
};

struct Notice {
    NoticeKind kind = NoticeKind::LifeChanged;
    CGDirectDisplayID display = 0;
    unsigned flags = 0;
    pid_t pid = 0;
    std::uint64_t stream = 0; ///< DisplayStream::Id
};

/// Takes notices in. It only queues them, so a server may call it under its own locks and from any of its
/// threads, in the order in which things happened. It never throws and never calls a server. The layer above
/// delivers them later, on a thread of its own.
class NoticeReceiver {
public:
    virtual ~NoticeReceiver() = default;
    virtual void OnNotice(const Notice& notice) = 0;
};

// ---- The server

/// How long callers let a server take over a picture.
inline constexpr std::chrono::nanoseconds DEFAULT_IMAGE_DEADLINE = std::chrono::seconds(1);
/// How long a server may take to connect.
inline constexpr std::chrono::nanoseconds DEFAULT_CONNECT_DEADLINE = std::chrono::seconds(2);

class WindowServer {
public:
    virtual ~WindowServer() = default;

    /// "none", "simulated", "x11": the word of SCREENSHARE_PLATFORM.
    virtual const char* Name() const = 0;

    // Life and rights.
    virtual LifeState GetLife() const = 0;
    virtual Availability GetCapability(Capability capability) const = 0;
    virtual Permission GetPermission() const = 0;
    /// Asks the user, where there is somebody to ask, and returns at once; PermissionChanged tells the
    /// answer.
    virtual void AskPermission() = 0;

    /// Where notices go, null for nowhere. After it has returned, the old receiver gets nothing more.
    virtual void SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) = 0;

    // Look-ups: never null, empty when there is nothing or the server is lost.
    virtual std::shared_ptr<const DisplayList> GetDisplays() const = 0;
    virtual std::shared_ptr<const WindowSnapshot> GetWindows() const = 0;
    virtual std::shared_ptr<const ApplicationList> GetApplications() const = 0;

    /// False when the position is not known; `position` then stays as it was.
    /// The one look-up that may ask the desktop, since not every desktop tells of each move; it waits 100 ms
    /// at most.
    virtual bool GetPointerPosition(CGPoint& position) const = 0;
    /// Null when there is no image. The same object as long as the serial is the same.
    virtual std::shared_ptr<const CursorImage> GetCursor() const = 0;

    /// A name for all that the server tells just now: displays, windows, applications, the pointer and its
    /// image, and what windows show. While it is that of a picture, the same request would get an equal
    /// picture again, and every look-up what it got right behind that picture. 0 when only asking tells.
    /// Costs next to nothing and never waits, so that a quiet desktop can be looked at often.
    virtual std::uint64_t GetMoment() const { return 0; }

    // Pictures.
    /// One picture of the listed windows and of nothing else: never a pixel of a window that is not listed,
    /// of one whose sharing state is None, or of what lay behind a window before it had painted itself. What
    /// a window has not painted yet, and what lies outside its shape, is transparent; a window with nothing
    /// to show has no layer. Ok may come without layers.
    ///
    /// A server without Capability::Windows lists one window a display, of no owner and of the desktop's
    /// level, whose picture is the display as seen. Where anything is kept out it answers Unsupported.
    virtual WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) = 0;

    /// Never waits; the stream answers Nothing until there is a picture. A pointer mode that can't be had is
    /// Unsupported.
    virtual DisplayStreamResult OpenDisplayStream(const DisplayStreamRequest& request) = 0;

    /// Ends and joins the server's own threads and closes what they held; the next operation starts them
    /// anew. Not from inside OnNotice.
    virtual void Rest() = 0;

    /// Brings all windows of a process to the front, in their order. False when there is none or it can't be
    /// done.
    virtual bool BringToFront(pid_t pid) = 0;
};

/// The window server in force; never null. Chosen at the first call by the environment variable
/// SCREENSHARE_PLATFORM (auto, x11, simulated, none), where what can't be had means none. A simulated desktop
/// is never chosen by itself.
std::shared_ptr<WindowServer> CurrentWindowServer();

/// Puts another one in force and gives the one that was; null means to choose anew at the next call. Whoever
/// is registered for notices hears those of the new one from now on. For tests and scenes.
std::shared_ptr<WindowServer> ReplaceWindowServer(std::shared_ptr<WindowServer> server);

/// The window server in force, null when none has been chosen yet. Never makes one.
std::shared_ptr<WindowServer> ChosenWindowServer();

} // namespace platform

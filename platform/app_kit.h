// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"
#include "platform/core_types.h"

#include <sys/types.h>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// Screens, the cursor, the workspace's notices, running applications and the process manager, answered from
/// the window server in force.
///
/// Threads: any.
/// Errors:  nothing throws. Without a window server, or with one that is lost, there are no screens, no
///          cursor, no applications and no notices.
namespace platform {

// ---- Screens

/// What a screen tells of its device.
struct NSDeviceDescription {
    CGDirectDisplayID NSScreenNumber = 0;
};

/// A screen as it was when it was asked for.
///
/// Rectangles of a screen are in points with y growing upwards from the bottom of the main display, unlike
/// everything else in the platform.
class NSScreen {
public:
    /// All screens, the main one first.
    static std::vector<NSScreen> screens() noexcept;

    const NSDeviceDescription& deviceDescription() const { return m_description; }
    const CGRect& frame() const { return m_frame; }
    /// The frame less what menu bars, panels and docks have reserved.
    const CGRect& visibleFrame() const { return m_visibleFrame; }
    /// Pixels per point.
    CGFloat backingScaleFactor() const { return m_scale; }

private:
    NSDeviceDescription m_description;
    CGRect m_frame;
    CGRect m_visibleFrame;
    CGFloat m_scale = 1.0F;
};

// ---- Cursor

/// One resolution of an image.
class NSImageRep {
public:
    explicit NSImageRep(CGImageRef image);

    /// Its own pixels.
    const CGSize& size() const { return m_size; }
    /// Never null; RGBA, premultiplied, rows without gaps.
    const CGImageRef& CGImageForProposedRect() const { return m_image; }

private:
    CGImageRef m_image;
    CGSize m_size;
};

/// An image in one or more resolutions. Immutable.
class NSImage {
public:
    /// `representations` has at least one.
    NSImage(CGSize size, std::vector<NSImageRep> representations);

    /// Points.
    const CGSize& size() const { return m_size; }
    const std::vector<NSImageRep>& representations() const { return m_representations; }
    /// The representation that shows the image in its own size or comes nearest to it. Never null.
    const CGImageRef& CGImageForProposedRect() const;

private:
    CGSize m_size;
    std::vector<NSImageRep> m_representations;
};

/// The pointer's image. Immutable; a copy shares it.
class NSCursor {
public:
    /// The cursor now on screen, whichever application set it; nothing when there is none to be had. The
    /// image is the same object as long as the cursor on screen is the same.
    static std::optional<NSCursor> currentSystemCursor() noexcept;

    /// `hotSpot` in points from the image's top left. `image` isn't null.
    NSCursor(std::shared_ptr<const NSImage> image, CGPoint hotSpot)
        : m_image(std::move(image)),
          m_hotSpot(hotSpot) {}

    const std::shared_ptr<const NSImage>& image() const { return m_image; }
    const CGPoint& hotSpot() const { return m_hotSpot; }

private:
    std::shared_ptr<const NSImage> m_image;
    CGPoint m_hotSpot;
};

// ---- Workspace

enum NSNotificationName : int {
    NSWorkspaceDidLaunchApplicationNotification = 1,
    NSWorkspaceDidTerminateApplicationNotification = 2,
};

struct NSUserInfo {
    pid_t NSApplicationProcessIdentifier = 0;
};

struct NSNotification {
    NSNotificationName name{};
    NSUserInfo userInfo;
};

class NSNotificationCenter {
public:
    /// Has `selector` called for each notice of that name that comes after this call, on the notice thread,
    /// with no lock of the platform held. `observer` is only the name under which it is removed again. What
    /// the selector throws is traced and goes no further. Registrations outlive the window server that they
    /// were made under. False without memory; then nothing was registered.
    bool addObserver(const void* observer, std::function<void(const NSNotification&)> selector,
                     NSNotificationName name) noexcept;

    /// Ends all registrations of that observer. After it has returned none of its selectors is called any
    /// more: it waits for a call of one that runs, except from inside that very call.
    void removeObserver(const void* observer) noexcept;
};

class NSWorkspace {
public:
    static NSWorkspace* sharedWorkspace() noexcept;
    NSNotificationCenter* notificationCenter() noexcept { return &m_center; }

private:
    NSNotificationCenter m_center;
};

// ---- Running applications

enum NSApplicationActivationOptions : unsigned {
    NSApplicationActivateAllWindows = 1u << 0,
    NSApplicationActivateIgnoringOtherApps = 1u << 1,
};

class NSRunningApplication {
public:
    /// Nothing for a process that is no running application.
    static std::optional<NSRunningApplication> runningApplicationWithProcessIdentifier(pid_t pid) noexcept;

    pid_t processIdentifier() const { return m_pid; }
    /// For people, UTF-8, never empty.
    const std::string& localizedName() const { return m_name; }
    /// Brings the application's windows to the front, whatever the options. False when it can't be done.
    bool activateWithOptions(unsigned options) const noexcept;

private:
    NSRunningApplication(pid_t pid, std::string name) : m_pid(pid), m_name(std::move(name)) {}

    pid_t m_pid;
    std::string m_name;
};

// ---- Process manager

/// Names a process for the process manager. All zeros is no process.
struct ProcessSerialNumber {
    std::uint32_t highLongOfPSN = 0;
    std::uint32_t lowLongOfPSN = 0;

    bool operator==(const ProcessSerialNumber&) const = default;
};

constexpr OSStatus procNotFound = -600;

/// A type code, such as FourCharCode("APPL").
using OSType = std::uint32_t;

constexpr OSType FourCharCode(const char (&code)[5]) {
    OSType value = 0;
    for (int i = 0; i < 4; ++i)
        value = value << 8 | static_cast<unsigned char>(code[i]);
    return value;
}

/// Bit of ProcessInfoRec::processMode.
constexpr std::uint32_t modeOnlyBackground = 0x400;

struct ProcessInfoRec {
    std::string processName; ///< For people, UTF-8.
    OSType processType = 0;  ///< "APPL" for what people start, "????" for any other process.
    std::uint32_t processMode = 0;
    std::string processAppSpec; ///< The program's file name, without its folder.
};

/// Replaces `process` by the next one; all zeros asks for the first. Each process that is there all the time
/// comes just once, whatever comes and goes meanwhile. procNotFound at the end, where `process` becomes all
/// zeros.
OSStatus GetNextProcess(ProcessSerialNumber* process) noexcept;

/// procNotFound for a process that has ended.
OSStatus GetProcessInformation(const ProcessSerialNumber* process, ProcessInfoRec* information) noexcept;

OSStatus GetProcessPID(const ProcessSerialNumber* process, pid_t* pid) noexcept;

/// procNotFound for a process that is no running application and has no window.
OSStatus GetProcessForPID(pid_t pid, ProcessSerialNumber* process) noexcept;

} // namespace platform

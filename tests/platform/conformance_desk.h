// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <sys/types.h>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// A desktop with its window server, as the conformance cases drive it. Each kind of window server brings
/// one.
///
/// What a desktop can't have done to it gives false or nothing, as the operations here do; the case is then
/// skipped. What an operation has asked for need not have reached the window server when it comes back: cases
/// wait for it.
///
/// Frames and positions are whole points on the main display, which is at least 200 x 120. Windows are
/// opaque, of one colour, and without a shadow.
/// Threads: one at a time, beside any use of the server.
class ConformanceDesk {
public:
    ConformanceDesk() = default;
    virtual ~ConformanceDesk() = default;
    ConformanceDesk(const ConformanceDesk&) = delete;
    ConformanceDesk& operator=(const ConformanceDesk&) = delete;

    /// Never null until Release.
    virtual platform::WindowServer& Server() = 0;
    /// Gives the server away, so that a case can end it.
    virtual std::shared_ptr<platform::WindowServer> Release() = 0;
    /// True when all that follows can be done: then nothing is skipped.
    virtual bool CanDoAll() const { return false; }

    /// Comes back when the server has seen what was done before.
    virtual void Settle() {}

    // ---- Applications

    virtual std::optional<pid_t> StartApplication(const std::string& /*name*/) { return std::nullopt; }
    virtual bool EndApplication(pid_t) { return false; }

    // ---- Windows

    /// In front of all. 0xRRGGBB.
    virtual std::optional<platform::CGWindowID> AddWindow(pid_t, const platform::CGRect& /*frame*/,
                                                          std::uint32_t /*rgb*/) {
        return std::nullopt;
    }
    virtual bool Close(platform::CGWindowID) { return false; }
    virtual bool SetFrame(platform::CGWindowID, const platform::CGRect&) { return false; }
    virtual bool Raise(platform::CGWindowID) { return false; }
    virtual bool Minimise(platform::CGWindowID) { return false; }
    virtual bool Restore(platform::CGWindowID) { return false; }
    virtual bool Recolour(platform::CGWindowID, std::uint32_t /*rgb*/) { return false; }
    virtual bool SetAlpha(platform::CGWindowID, float) { return false; }
    virtual bool Float(platform::CGWindowID) { return false; } ///< Above normal windows, by its level.
    virtual bool SetOwner(platform::CGWindowID, pid_t) { return false; }
    virtual bool SetTitle(platform::CGWindowID, const std::string&) { return false; }
    virtual bool Unshare(platform::CGWindowID) { return false; }
    /// Mapped, and the server can't tell yet whose it is; until the owner is told.
    virtual std::optional<platform::CGWindowID> AddUnknownWindow(const platform::CGRect& /*frame*/) {
        return std::nullopt;
    }
    virtual bool TellOwner(platform::CGWindowID, pid_t) { return false; }

    // ---- Displays

    /// Right of all others, of that size in points.
    virtual std::optional<platform::CGDirectDisplayID> AddDisplay(const platform::CGSize&) {
        return std::nullopt;
    }
    virtual bool Unplug(platform::CGDirectDisplayID) { return false; }
    virtual bool PlugInAgain(platform::CGDirectDisplayID) { return false; }
    virtual bool Resize(platform::CGDirectDisplayID, const platform::CGSize&) { return false; }
    virtual bool MakeMain(platform::CGDirectDisplayID) { return false; }
    virtual bool ReserveTop(platform::CGDirectDisplayID, float /*points*/) { return false; }

    // ---- Pointer

    virtual bool MovePointer(const platform::CGPoint&) { return false; }
    virtual bool ChangeCursor() { return false; }

    // ---- The server itself

    virtual bool Stall() { return false; } ///< The desktop doesn't answer until Answer.
    virtual bool Answer() { return false; }
    virtual bool Lose() { return false; } ///< The connection breaks.
    virtual bool FindAgain() { return false; }
    /// Whether the same windows are there again after FindAgain. Displays and applications always are.
    virtual bool WindowsOutliveALoss() const { return CanDoAll(); }
    virtual bool NeedPermission() { return false; } ///< Not asked for yet.
    virtual bool Grant() { return false; }          ///< Or Deny: what the user answers.
    virtual bool Deny() { return false; }
    virtual bool ListNoWindows() { return false; } ///< A desktop whose windows can't be listed.
};

/// One kind of window server that the contract is checked on.
struct ConformanceKind {
    const char* name; ///< Letters, digits and underscores.
    const char* word; ///< What the server calls itself.
    /// Null where this machine lacks what it takes; the cases are then skipped.
    std::unique_ptr<ConformanceDesk> (*make)();
};

/// Those that are checked. Each program with the cases brings its own.
std::vector<ConformanceKind> ConformanceKinds();

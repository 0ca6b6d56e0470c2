// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace platform {

/// Ways in which a simulated window server can break the contract. A test of the library counts only if it
/// sees each lie that concerns it; a server tells none unless it is told to.
enum class SimulatedLie {
    OneWindowTooMany, ///< A window picture has one more layer, of the front window that wasn't listed.
    UnsharedShown,    ///< Windows with sharing state None have layers.
    StaleStack,       ///< Pictures show the stack before the last change under the generation of now.
    StaleList,        ///< A new snapshot has a new generation and the windows of the one before.
    OldPixelsKept,    ///< A picture that was made once is given out ever after.
    WrongRectangle,   ///< A layer is told to lie 3 points right of and 2 below its place.
    ChangesForgotten, ///< A stream, or a step of a window's picture, leaves out a part of what is different.
    EndToldTwice,     ///< The end of an application is told twice.
};

} // namespace platform

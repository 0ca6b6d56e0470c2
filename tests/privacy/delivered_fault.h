// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ostream>

/// What somebody may get wrong.
enum class DeliveredFault {
    None,
    OneWindowTooMany,   ///< A window of an application that is kept out is listed all the same.
    UnsharedShown,      ///< It gives windows out whose pixels it must keep.
    OldPixelsKept,      ///< It gives old pictures out.
    WrongRectangle,     ///< It gives pictures out that belong somewhere else.
    ExclusionForgotten, ///< Nobody tells the engine what is kept out.
    ExclusionTooLate,   ///< It is told after the next frame.
    NothingShown,       ///< Everything is kept out.
    OneLayerTooMany,    ///< The window server gives a window out that nobody asked for.
    StacksNotTold,      ///< The window server calls all stacks of windows the same.
};

inline constexpr const char* DELIVERED_FAULT_NAMES[] = {"None",
                                                        "OneWindowTooMany",
                                                        "UnsharedShown",
                                                        "OldPixelsKept",
                                                        "WrongRectangle",
                                                        "ExclusionForgotten",
                                                        "ExclusionTooLate",
                                                        "NothingShown",
                                                        "OneLayerTooMany",
                                                        "StacksNotTold"};

inline void PrintTo(DeliveredFault fault, std::ostream* out) {
    *out << DELIVERED_FAULT_NAMES[static_cast<int>(fault)];
}

/// Whether it shows by what is missing.
inline bool HidesWhatIsKept(DeliveredFault fault) {
    return fault == DeliveredFault::OldPixelsKept || fault == DeliveredFault::WrongRectangle ||
           fault == DeliveredFault::NothingShown;
}

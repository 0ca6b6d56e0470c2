// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/doctor_facts.h"

#include <optional>
#include <string>
#include <vector>

/// What the facts mean to somebody who wants to share, and what can be done about it.

/// Both are half sentences, to be read as "because …; mend it by …".
struct Finding {
    std::string because;
    std::string remedy; ///< Empty where nothing can be done.

    bool operator==(const Finding&) const = default;
};

/// Something that sharing may need of a desktop.
struct Ability {
    std::string key;                 ///< For programs.
    std::string name;                ///< For people.
    std::string purpose;             ///< What it is for.
    bool isNeeded = false;           ///< Without it there is no sharing.
    std::optional<Finding> obstacle; ///< Nothing when the desktop has the ability.
};

/// Something that works, but not as it might.
struct Hint {
    std::string what; ///< A sentence without its full stop.
    Finding finding;
};

struct Diagnosis {
    std::string choice; ///< Why this window server is in force, as a sentence.
    std::vector<Ability> abilities;
    std::vector<Hint> hints;

    /// Whether monitors and windows can be shared.
    bool CanShare() const;
};

Diagnosis Diagnose(const DoctorFacts& facts);

/// Why an X display can't be looked at; of one with an obstacle.
Finding X11ObstacleFinding(const platform::X11Report& x11);

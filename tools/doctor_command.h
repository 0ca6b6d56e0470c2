// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/doctor_facts.h"
#include "tools/exit_code.h"

#include <string>

enum class DoctorForm {
    Text,
    Json,
};

struct DoctorAnswer {
    std::string text;
    ExitCode code = EXIT_CODE_FAILED; ///< Done when monitors and windows can be shared.
};

/// `screenshare doctor`: looks at the environment, the window server in force and the X display, and tells
/// what will work. Takes no more than a few seconds, also when a server doesn't answer. With the library in
/// use.
DoctorAnswer RunDoctor(DoctorForm form);

/// What there is just now.
DoctorFacts GatherDoctorFacts();

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/doctor_diagnosis.h"
#include "tools/doctor_facts.h"

#include <string>

/// What was found and what it means, for people.
std::string DoctorText(const DoctorFacts& facts, const Diagnosis& diagnosis);

/// The same for programs: one JSON object.
std::string DoctorJson(const DoctorFacts& facts, const Diagnosis& diagnosis);

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

/// What a client does with one kind of object besides engines, from its making to its end. Leaves nothing.
struct ClientCourse {
    std::string name;
    void (*run)();
};

const std::vector<ClientCourse>& ClientCourses();

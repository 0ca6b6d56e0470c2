// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_engine.h>

#include <string>
#include <vector>

/// An operation of an engine, as a client calls it. None changes what the share of the fault bench shows.
struct EngineOperation {
    std::string name;
    int (*call)(IShareCaptureEngine& engine);
};

/// Every one that an engine has, but for Destroy; those that end or begin a run are among them.
const std::vector<EngineOperation>& EngineOperations();

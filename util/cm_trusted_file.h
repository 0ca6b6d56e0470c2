// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

/// Reads a whole file of a folder that may lie where everybody can write.
///
/// The file steers the process, so it counts only if nobody else can have written it: folder and file belong
/// to the effective user or to root and nobody else may write to either, neither is a link, and the file is a
/// plain one. A file of more than 1 MiB, an empty one, and one that changes while it is read count as absent,
/// too. Never waits: a pipe under that name is not opened for reading.
std::optional<std::string> CmReadTrustedFile(const std::string& folder, const char* name);

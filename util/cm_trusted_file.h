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

/// Whether a folder is one that nobody else can have put links and files into: it belongs to the effective
/// user or to root, nobody else may write to it, and it is no link. It stays one as long as the same goes for
/// the folder that it is in, or that one lets people remove only their own things, as /tmp does.
bool CmIsTrustedFolder(const std::string& folder);

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace platform::x11 {

/// What a desktop entry says of the application that it starts.
struct DesktopEntry {
    std::string name;        ///< For people, UTF-8; of no language in particular. Never empty.
    std::string windowClass; ///< Of its windows, if it tells.
    bool hidden = false;     ///< To be treated as if there were none of that file name.

    bool operator==(const DesktopEntry&) const = default;
};

/// Nothing when it is no entry of an application, or has no name.
std::optional<DesktopEntry> ParseDesktopEntry(std::string_view text);

/// The applications that are installed, as far as they have desktop entries.
/// Threads: one at a time.
/// Errors:  a folder or file that can't be read, or is too large to be honest, counts as absent.
class DesktopEntries {
public:
    /// Each folder counts over those behind it; entries lie in "applications" inside it.
    explicit DesktopEntries(std::vector<std::string> dataDirectories);

    /// Those that XDG_DATA_HOME and XDG_DATA_DIRS name.
    static std::vector<std::string> DefaultDirectories();

    /// What people call the application whose windows have this class; null when no entry tells. Good until
    /// the next call. Reads the entries at the first call, and again when a folder has changed.
    const std::string* NameOf(const std::string& windowClass);

private:
    struct Folder {
        std::string path;
        timespec changed{};
    };
    using Names = std::unordered_map<std::string, std::string>;

    bool HaveChanged();
    void ReadAll();
    void ReadFolder(const std::string& path, std::unordered_set<std::string>& seen);

    std::vector<Folder> m_folders;
    bool m_read = false;
    Names m_byClass;
    Names m_byFileName; // in lower case, without the suffix
};

} // namespace platform::x11

// SPDX-License-Identifier: Apache-2.0
#include "platform/search_path.h"

#include "util/cm_trusted_file.h"

#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <exception>
#include <optional>
#include <string_view>
#include <utility>

namespace platform {

namespace {

constexpr const char* USER_DIRS_FILE = "user-dirs.dirs";

std::string Variable(const char* name) {
    const char* const value = std::getenv(name);
    return value != nullptr ? value : "";
}

bool IsAbsolute(std::string_view path) {
    return !path.empty() && path.front() == '/';
}

std::string HomeOfAccount() {
    std::vector<char> room(4096);
    passwd entry{};
    passwd* found = nullptr;
    if (getpwuid_r(geteuid(), &entry, room.data(), room.size(), &found) != 0 || found == nullptr)
        return {};
    return found->pw_dir != nullptr ? found->pw_dir : "";
}

/// Empty when there is none.
std::string HomeFolder() {
    std::string home = Variable("HOME");
    if (IsAbsolute(home))
        return home;
    const std::string ofAccount = HomeOfAccount();
    return IsAbsolute(ofAccount) ? ofAccount : std::string();
}

std::string ConfigFolder(const std::string& home) {
    const std::string config = Variable("XDG_CONFIG_HOME");
    return IsAbsolute(config) ? config : home + "/.config";
}

/// What stands between the quotes of a line of the kind NAME="value"; a backslash keeps the next character.
/// Nothing for any other line.
std::optional<std::string> QuotedValue(std::string_view line, std::string_view name) {
    line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
    if (line.substr(0, name.size()) != name || line.substr(name.size(), 2) != "=\"")
        return std::nullopt;
    line.remove_prefix(name.size() + 2);
    std::string value;
    for (std::size_t i = 0; i < line.size() && line[i] != '"'; ++i) {
        if (line[i] == '\\' && i + 1 < line.size())
            ++i;
        value += line[i];
    }
    return value;
}

/// The format allows nothing but an absolute path and one that begins with $HOME.
std::optional<std::string> ExpandHome(const std::string& value, const std::string& home) {
    constexpr std::string_view HOME = "$HOME";
    if (value.compare(0, HOME.size(), HOME) == 0 &&
        (value.size() == HOME.size() || value[HOME.size()] == '/'))
        return home + value.substr(HOME.size());
    if (IsAbsolute(value))
        return value;
    return std::nullopt;
}

/// The last good line counts, as when a shell reads the file.
std::optional<std::string> FolderFromFile(const std::string& text, std::string_view name,
                                          const std::string& home) {
    std::optional<std::string> folder;
    std::string_view rest = text;
    while (!rest.empty()) {
        const std::size_t end = std::min(rest.find('\n'), rest.size());
        if (const std::optional<std::string> value = QuotedValue(rest.substr(0, end), name)) {
            if (std::optional<std::string> path = ExpandHome(*value, home))
                folder = std::move(path);
        }
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    return folder;
}

std::string WithoutSlashAtEnd(std::string path) {
    while (path.size() > 1 && path.back() == '/')
        path.pop_back();
    return path;
}

std::vector<std::string> DocumentFolders() {
    const std::string home = WithoutSlashAtEnd(HomeFolder());
    if (home.empty())
        return {};
    std::optional<std::string> folder;
    if (const std::optional<std::string> text = CmReadTrustedFile(ConfigFolder(home), USER_DIRS_FILE))
        folder = FolderFromFile(*text, "XDG_DOCUMENTS_DIR", home);
    return {WithoutSlashAtEnd(folder.value_or(home + "/Documents"))};
}

} // namespace

std::vector<std::string> NSSearchPathForDirectoriesInDomains(NSSearchPathDirectory directory,
                                                             NSSearchPathDomainMask domains) noexcept {
    if (directory != NSDocumentDirectory || domains != NSUserDomainMask)
        return {};
    try {
        return DocumentFolders();
    } catch (const std::exception&) {
        return {};
    }
}

} // namespace platform

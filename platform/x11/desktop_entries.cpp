// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/desktop_entries.h"

#include "platform/utf8.h"
#include "platform/x11/small_file.h"

#include <sys/stat.h>
#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <utility>

namespace platform::x11 {

namespace {

constexpr std::size_t LARGEST_ENTRY = std::size_t{256} << 10U;
constexpr std::size_t MOST_FILES = 8192; // in a folder
constexpr std::string_view SUFFIX = ".desktop";
constexpr std::string_view GROUP = "[Desktop Entry]";

std::string_view Trimmed(std::string_view text) {
    constexpr std::string_view BLANKS = " \t\r";
    const std::size_t first = text.find_first_not_of(BLANKS);
    if (first == std::string_view::npos)
        return {};
    return text.substr(first, text.find_last_not_of(BLANKS) - first + 1);
}

/// Values write blanks and line ends as \s, \n, \t and \r. In a name, they all are blanks.
std::string Unescaped(std::string_view value) {
    std::string text;
    for (std::size_t i = 0; i < value.size(); ++i) {
        if (value[i] != '\\' || i + 1 == value.size()) {
            text.push_back(value[i]);
            continue;
        }
        ++i;
        text.push_back(value[i] == '\\' ? '\\' : ' ');
    }
    return text;
}

std::string LowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(), [](char letter) {
        return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
    });
    return text;
}

/// Takes the first line off.
std::string_view NextLine(std::string_view& text) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    return Trimmed(line);
}

timespec ChangeTimeOf(const std::string& folder) {
    struct stat status {};
    return stat(folder.c_str(), &status) == 0 ? status.st_mtim : timespec{};
}

void AddAbsolute(std::vector<std::string>& directories, std::string_view list) {
    while (!list.empty()) {
        const std::size_t end = std::min(list.find(':'), list.size());
        if (end > 0 && list[0] == '/')
            directories.emplace_back(list.substr(0, end));
        list.remove_prefix(std::min(end + 1, list.size()));
    }
}

std::string Variable(const char* name) {
    const char* const value = std::getenv(name); // NOLINT(concurrency-mt-unsafe)
    return value != nullptr ? value : "";
}

} // namespace

std::optional<DesktopEntry> ParseDesktopEntry(std::string_view text) {
    DesktopEntry entry;
    bool isApplication = false;
    bool inGroup = false;
    while (!text.empty()) {
        const std::string_view line = NextLine(text);
        if (line.starts_with('[')) {
            if (inGroup)
                break; // the groups behind it are of actions
            inGroup = line == GROUP;
        }
        const std::size_t equals = line.find('=');
        if (!inGroup || equals == std::string_view::npos || line.starts_with('#'))
            continue;
        const std::string_view key = Trimmed(line.substr(0, equals));
        const std::string_view value = Trimmed(line.substr(equals + 1));
        if (key == "Name" && entry.name.empty())
            entry.name = Trimmed(WithoutControls(MendedUtf8(Unescaped(value))));
        else if (key == "StartupWMClass")
            entry.windowClass = Unescaped(value);
        else if (key == "Type")
            isApplication = value == "Application";
        else if (key == "Hidden")
            entry.hidden = value == "true";
    }
    if (!isApplication || entry.name.empty())
        return std::nullopt;
    return entry;
}

DesktopEntries::DesktopEntries(std::vector<std::string> dataDirectories) {
    for (std::string& directory : dataDirectories)
        m_folders.push_back({std::move(directory) + "/applications", {}});
}

std::vector<std::string> DesktopEntries::DefaultDirectories() {
    std::vector<std::string> directories;
    AddAbsolute(directories, Variable("XDG_DATA_HOME"));
    if (directories.empty())
        AddAbsolute(directories, Variable("HOME") + "/.local/share");
    const std::string others = Variable("XDG_DATA_DIRS");
    AddAbsolute(directories, others.empty() ? "/usr/local/share:/usr/share" : others);
    return directories;
}

const std::string* DesktopEntries::NameOf(const std::string& windowClass) {
    if (windowClass.empty())
        return nullptr;
    if (HaveChanged())
        ReadAll();
    const auto byClass = m_byClass.find(windowClass);
    if (byClass != m_byClass.end())
        return &byClass->second;
    const auto byFileName = m_byFileName.find(LowerCase(windowClass));
    return byFileName != m_byFileName.end() ? &byFileName->second : nullptr;
}

bool DesktopEntries::HaveChanged() {
    bool changed = !std::exchange(m_read, true);
    for (Folder& folder : m_folders) {
        const timespec now = ChangeTimeOf(folder.path);
        changed = changed || now.tv_sec != folder.changed.tv_sec || now.tv_nsec != folder.changed.tv_nsec;
        folder.changed = now;
    }
    return changed;
}

void DesktopEntries::ReadAll() {
    m_byClass.clear();
    m_byFileName.clear();
    std::unordered_set<std::string> seen;
    for (const Folder& folder : m_folders)
        ReadFolder(folder.path, seen);
}

void DesktopEntries::ReadFolder(const std::string& path, std::unordered_set<std::string>& seen) {
    std::error_code error;
    std::filesystem::directory_iterator file(path, error);
    // In the order of their names, so that it is always the same one of two that claim a class.
    std::vector<std::string> names;
    for (std::size_t i = 0; i < MOST_FILES && !error && file != std::filesystem::directory_iterator();
         ++i, file.increment(error)) {
        std::string name = file->path().filename().string();
        if (name.size() > SUFFIX.size() && name.ends_with(SUFFIX))
            names.push_back(std::move(name));
    }
    std::sort(names.begin(), names.end());
    for (const std::string& name : names) {
        const std::optional<std::string> text = ReadSmallFile(path + '/' + name, LARGEST_ENTRY);
        const std::optional<DesktopEntry> entry = text ? ParseDesktopEntry(*text) : std::nullopt;
        if (!entry || !seen.insert(name).second || entry->hidden)
            continue;
        if (!entry->windowClass.empty())
            m_byClass.try_emplace(entry->windowClass, entry->name);
        m_byFileName.try_emplace(LowerCase(name.substr(0, name.size() - SUFFIX.size())), entry->name);
    }
}

} // namespace platform::x11

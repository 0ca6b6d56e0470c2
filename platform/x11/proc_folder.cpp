// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/proc_folder.h"

#include "platform/x11/small_file.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstddef>
#include <system_error>

namespace platform::x11 {

namespace {

constexpr std::size_t LARGEST_STAT = 4096;
constexpr std::size_t LONGEST_COMMAND = 256;
constexpr std::string_view DELETED = " (deleted)";

/// The word with that number, counted from 0; empty when there are fewer.
std::string_view Word(std::string_view text, int number) {
    for (;; --number) {
        text.remove_prefix(std::min(text.find_first_not_of(' '), text.size()));
        const std::size_t end = std::min(text.find(' '), text.size());
        if (number == 0 || text.empty())
            return text.substr(0, end);
        text.remove_prefix(end);
    }
}

std::optional<std::uint64_t> NumberFrom(std::string_view word) {
    std::uint64_t number = 0;
    const char* const wordEnd = word.data() + word.size();
    const auto [end, error] = std::from_chars(word.data(), wordEnd, number);
    if (error != std::errc() || end != wordEnd || word.empty())
        return std::nullopt;
    return number;
}

} // namespace

/// The second field is the command's name in parentheses, which may have blanks and parentheses in it.
std::optional<std::uint64_t> StartFromStat(std::string_view stat) {
    constexpr int STATE = 0; // of the words behind the name
    constexpr int THREADS = 17;
    constexpr int START = 19;
    const std::size_t nameEnd = stat.rfind(')');
    if (nameEnd == std::string_view::npos)
        return std::nullopt;
    const std::string_view rest = stat.substr(nameEnd + 1);
    const std::string_view state = Word(rest, STATE);
    const bool firstThreadEnded = state.empty() || state == "Z" || state == "X";
    if (firstThreadEnded && NumberFrom(Word(rest, THREADS)).value_or(0) < 2)
        return std::nullopt;
    return NumberFrom(Word(rest, START));
}

/// A host that has used up its descriptors must not take every application for ended.
ProcessLook ProcFolder::LookAt(pid_t pid) const {
    const std::string path = File(pid, "stat");
    errno = 0;
    const std::optional<std::string> stat = ReadSmallFile(path, LARGEST_STAT);
    if (!stat && (errno == EMFILE || errno == ENFILE || errno == ENOMEM))
        return {Presence::Unknown, 0};
    const std::optional<std::uint64_t> start = stat ? StartFromStat(*stat) : std::nullopt;
    return start ? ProcessLook{Presence::There, *start} : ProcessLook{Presence::Gone, 0};
}

Presence ProcFolder::PresenceOf(pid_t pid, std::uint64_t start) const {
    const ProcessLook look = LookAt(pid);
    return look.presence == Presence::There && look.start != start ? Presence::Gone : look.presence;
}

std::string ProcFolder::CommandOf(pid_t pid) const {
    std::string command = ReadSmallFile(File(pid, "comm"), LONGEST_COMMAND).value_or(std::string());
    if (command.ends_with('\n'))
        command.pop_back();
    return command;
}

std::string ProcFolder::ProgramOf(pid_t pid) const {
    std::array<char, PATH_MAX> target{};
    const ssize_t size = readlink(File(pid, "exe").c_str(), target.data(), target.size());
    if (size <= 0)
        return {};
    std::string_view path(target.data(), static_cast<std::size_t>(size));
    if (path.ends_with(DELETED))
        path.remove_suffix(DELETED.size());
    return std::string(path.substr(path.rfind('/') + 1)); // all of it without one
}

std::string ProcFolder::File(pid_t pid, const char* name) const {
    return m_path + '/' + std::to_string(pid) + '/' + name;
}

} // namespace platform::x11

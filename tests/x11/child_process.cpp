// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/child_process.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <sstream>
#include <stdexcept>
#include <utility>

namespace {

constexpr int END_MS = 5000;
constexpr int KILL_MS = 30000;

/// The arrays that exec wants.
class CPointers {
public:
    explicit CPointers(std::vector<std::string> texts) : m_texts(std::move(texts)) {
        for (std::string& text : m_texts)
            m_pointers.push_back(text.data());
        m_pointers.push_back(nullptr);
    }
    char* const* Get() const { return m_pointers.data(); }

private:
    std::vector<std::string> m_texts;
    std::vector<char*> m_pointers;
};

std::vector<std::string> EnvironmentWith(const std::vector<std::pair<std::string, std::string>>& added) {
    std::vector<std::string> all;
    const auto isAdded = [&added](const std::string& entry) {
        for (const auto& each : added) {
            if (entry.compare(0, each.first.size() + 1, each.first + "=") == 0)
                return true;
        }
        return false;
    };
    for (char** each = environ; *each != nullptr; ++each) {
        if (!isAdded(*each))
            all.emplace_back(*each);
    }
    for (const auto& each : added)
        all.push_back(each.first + "=" + each.second);
    return all;
}

/// What the child finds at its standard descriptors, and the one that it inherits.
class Files {
public:
    explicit Files(const CChildProcess::Plan& plan) {
        posix_spawn_file_actions_init(&m_actions);
        Open(STDIN_FILENO, "/dev/null", O_RDWR);
        Open(STDERR_FILENO, plan.log.empty() ? "/dev/null" : plan.log.c_str(), O_WRONLY | O_CREAT | O_APPEND);
        Put(plan.output >= 0 ? plan.output : STDERR_FILENO, STDOUT_FILENO);
        if (plan.input >= 0)
            Put(plan.input, STDIN_FILENO);
        if (plan.keep >= 0)
            Put(plan.keep, plan.keep); // the same number: no longer closed by the program's start
    }
    ~Files() { posix_spawn_file_actions_destroy(&m_actions); }
    Files(const Files&) = delete;
    Files& operator=(const Files&) = delete;

    const posix_spawn_file_actions_t* Get() const { return &m_actions; }

private:
    void Open(int descriptor, const char* path, int flags) {
        posix_spawn_file_actions_addopen(&m_actions, descriptor, path, flags, 0600);
    }
    void Put(int from, int to) { posix_spawn_file_actions_adddup2(&m_actions, from, to); }

    posix_spawn_file_actions_t m_actions{};
};

/// A process group of its own, no signal blocked, and a closed pipe ends it as it ends any program.
class Attributes {
public:
    Attributes() {
        sigset_t none;
        sigset_t pipe;
        sigemptyset(&none);
        sigemptyset(&pipe);
        sigaddset(&pipe, SIGPIPE);
        posix_spawnattr_init(&m_attributes);
        posix_spawnattr_setflags(&m_attributes,
                                 POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
        posix_spawnattr_setsigmask(&m_attributes, &none);
        posix_spawnattr_setsigdefault(&m_attributes, &pipe);
    }
    ~Attributes() { posix_spawnattr_destroy(&m_attributes); }
    Attributes(const Attributes&) = delete;
    Attributes& operator=(const Attributes&) = delete;

    const posix_spawnattr_t* Get() const { return &m_attributes; }

private:
    posix_spawnattr_t m_attributes{};
};

/// Spawned, not forked: between a fork and its exec a sanitizer's run-time may wait for a lock that another
/// thread held at the fork, without end. setpriv becomes the program, under the same number.
pid_t StartChild(const CChildProcess::Plan& plan) {
    const std::string program = FindProgram(plan.command.at(0));
    if (program.empty())
        throw std::runtime_error("no program " + plan.command[0]);
    std::vector<std::string> words{"setpriv", "--pdeathsig", "KILL", program};
    words.insert(words.end(), plan.command.begin() + 1, plan.command.end());
    const CPointers arguments(std::move(words));
    const CPointers environment(EnvironmentWith(plan.environment));
    const Files files(plan);
    const Attributes attributes;
    pid_t pid = -1;
    if (posix_spawnp(&pid, "setpriv", files.Get(), attributes.Get(), arguments.Get(), environment.Get()) != 0)
        throw std::runtime_error("no process for " + plan.command[0]);
    return pid;
}

} // namespace

CScratchFolder::CScratchFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "screenshare-x11-XXXXXX").string();
    if (mkdtemp(name.data()) == nullptr)
        throw std::runtime_error("no folder " + name);
    m_path = name;
}

CScratchFolder::~CScratchFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(m_path, ignored);
}

CChildProcess::CChildProcess(const Plan& plan) : m_pid(StartChild(plan)) {}

CChildProcess::~CChildProcess() {
    Kill();
}

bool CChildProcess::IsRunning() {
    return !WaitForEnd(0);
}

void CChildProcess::Signal(int number) const {
    if (!m_ended)
        kill(m_pid, number);
}

bool CChildProcess::WaitForEnd(int milliseconds) {
    if (m_ended)
        return true;
    const int descriptor = static_cast<int>(syscall(SYS_pidfd_open, m_pid, 0));
    pollfd ended{descriptor, POLLIN, 0};
    int found = 0;
    do
        found = poll(&ended, 1, milliseconds);
    while (found < 0 && errno == EINTR);
    close(descriptor);
    if (found != 1)
        return false;
    // What it has started goes with it, while its number can't be another's yet.
    kill(-m_pid, SIGKILL);
    waitpid(m_pid, &m_status, 0);
    m_ended = true;
    return true;
}

void CChildProcess::End() {
    Signal(SIGTERM);
    if (!WaitForEnd(END_MS))
        Kill();
}

void CChildProcess::Kill() {
    Signal(SIGKILL);
    if (!WaitForEnd(KILL_MS) && !m_ended)
        std::abort(); // a process that outlives SIGKILL: nothing can be trusted
}

std::string FindProgram(const std::string& name) {
    if (name.find('/') != std::string::npos)
        return access(name.c_str(), X_OK) == 0 ? name : std::string();
    const char* const path = std::getenv("PATH");
    std::stringstream folders(path != nullptr ? path : "/usr/bin:/bin");
    for (std::string folder; std::getline(folders, folder, ':');) {
        const std::string full = folder + "/" + name;
        if (access(full.c_str(), X_OK) == 0)
            return full;
    }
    return {};
}

// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_machine.h"

#include <unistd.h>

#include <array>
#include <ctime>
#include <fstream>
#include <iterator>
#include <thread>

namespace {

std::string ContentOf(const char* path) {
    std::ifstream file(path);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// To the nearest one: the kernel keeps some of the memory for itself.
long MemoryGib() {
    constexpr double GIB = 1024.0 * 1024 * 1024;
    const double bytes =
        static_cast<double>(sysconf(_SC_PHYS_PAGES)) * static_cast<double>(sysconf(_SC_PAGESIZE));
    return static_cast<long>(bytes / GIB + 0.5);
}

/// What processors of the usual kind tell their guests.
bool IsVirtual() {
    return ContentOf("/proc/cpuinfo").find(" hypervisor") != std::string::npos;
}

std::string SystemName() {
    const std::string release = ContentOf("/etc/os-release");
    const std::string key = "PRETTY_NAME=\"";
    const std::size_t found = release.find(key);
    if (found == std::string::npos)
        return "Linux";
    const std::size_t begin = found + key.size();
    return release.substr(begin, release.find('"', begin) - begin);
}

} // namespace

std::string MachineKind() {
    return std::to_string(std::thread::hardware_concurrency()) + " cores, " + std::to_string(MemoryGib()) +
           " GiB, " + (IsVirtual() ? "virtual machine, " : "") + SystemName();
}

std::string Today() {
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    localtime_r(&now, &parts);
    std::array<char, 16> text{};
    std::strftime(text.data(), text.size(), "%Y-%m-%d", &parts);
    return text.data();
}

// SPDX-License-Identifier: Apache-2.0
#include "platform/utf8.h"
#include "platform/x11/desktop_entries.h"
#include "platform/x11/proc_folder.h"
#include "tests/fuzz/fuzz_check.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

/// Anything at all as a desktop entry, which whoever packs an application writes, and as what the system
/// tells of a process, in which that process chooses its own name.

namespace {

using namespace platform::x11;

void RequireEntry(std::string_view text) {
    const std::optional<DesktopEntry> entry = ParseDesktopEntry(text);
    if (!entry)
        return;
    const std::string& name = entry->name;
    Require(!name.empty() && name.size() <= 3 * text.size(), "a name has something of the text");
    Require(name.front() != ' ' && name.back() != ' ', "a name is trimmed");
    Require(platform::MendedUtf8(name) == name, "a name is UTF-8");
    Require(platform::WithoutControls(name) == name, "a name has no control characters");
    Require(entry->windowClass.size() <= text.size(), "a class has no more than the text");
}

/// Whatever a process is called, it isn't taken for another that was started at another time.
void RequireStart(std::string_view name) {
    const std::string head = "7 (" + std::string(name) + ") ";
    const std::string rest = "S 1 7 7 0 -1 4194560 1 0 0 0 0 0 0 0 20 0 1 0 98765 0\n";
    Require(StartFromStat(head + rest) == 98765u, "a name doesn't hide when its process was started");
    Require(!StartFromStat(head + "Z" + rest.substr(1)), "a name doesn't bring an ended process back");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    RequireEntry(text);
    RequireEntry("[Desktop Entry]\nType=Application\n" + std::string(text));
    RequireStart(text);
    const std::optional<std::uint64_t> start = StartFromStat(text);
    Require(!start || text.find(std::to_string(*start)) != std::string_view::npos,
            "a start is made of the text");
    return 0;
}

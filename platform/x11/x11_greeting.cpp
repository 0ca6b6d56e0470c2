// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_greeting.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <xcb/xcb.h>

#include <bit>
#include <cstdlib>
#include <cstring>
#include <optional>

namespace platform::x11 {

namespace {

constexpr std::string_view COOKIE_NAME = "MIT-MAGIC-COOKIE-1";
constexpr std::size_t LONGEST_COOKIE = 256;
constexpr std::size_t LARGEST_AUTHORITY_FILE = std::size_t{1} << 20U;

// Families of an authority entry; the file is big-endian whatever the machine.
constexpr unsigned FAMILY_LOCAL = 256;
constexpr unsigned FAMILY_WILD = 65535;

constexpr std::uint8_t WELCOME = 1;
constexpr std::size_t UNIT = 4;

std::size_t Padded(std::size_t size) {
    return (size + UNIT - 1) / UNIT * UNIT;
}

/// Takes parts from the front of bytes that may end anywhere.
class BytesReader {
public:
    explicit BytesReader(std::span<const std::uint8_t> bytes) : m_rest(bytes) {}

    std::optional<std::span<const std::uint8_t>> Take(std::size_t size) {
        if (size > m_rest.size())
            return std::nullopt;
        const std::span<const std::uint8_t> taken = m_rest.first(size);
        m_rest = m_rest.subspan(size);
        return taken;
    }

    template <class Part>
    std::optional<Part> TakePart() {
        const auto bytes = Take(sizeof(Part));
        if (!bytes)
            return std::nullopt;
        Part part;
        std::memcpy(&part, bytes->data(), sizeof part);
        return part;
    }

    std::optional<unsigned> TakeBigEndian() {
        const auto bytes = Take(2);
        if (!bytes)
            return std::nullopt;
        return (unsigned{(*bytes)[0]} << 8U) | (*bytes)[1];
    }

    /// A length, and that many bytes.
    std::optional<std::string_view> TakeText() {
        const std::optional<unsigned> size = TakeBigEndian();
        const auto bytes = size ? Take(*size) : std::nullopt;
        if (!bytes)
            return std::nullopt;
        return std::string_view(reinterpret_cast<const char*>(bytes->data()), bytes->size());
    }

private:
    std::span<const std::uint8_t> m_rest;
};

struct AuthorityEntry {
    unsigned family = 0;
    std::string_view address;
    std::string_view number;
    std::string_view name;
    std::string_view data;

    bool Fits(std::string_view host, std::string_view displayNumber) const {
        return (family == FAMILY_WILD || (family == FAMILY_LOCAL && address == host)) &&
               (number.empty() || number == displayNumber) && name == COOKIE_NAME &&
               data.size() <= LONGEST_COOKIE;
    }
};

std::optional<AuthorityEntry> TakeEntry(BytesReader& reader) {
    const auto family = reader.TakeBigEndian();
    const auto address = reader.TakeText();
    const auto number = reader.TakeText();
    const auto name = reader.TakeText();
    const auto data = reader.TakeText();
    if (!family || !address || !number || !name || !data)
        return std::nullopt;
    return AuthorityEntry{*family, *address, *number, *name, *data};
}

std::string AuthorityFileName() {
    const char* const named = std::getenv("XAUTHORITY");
    if (named != nullptr && *named != '\0')
        return named;
    const char* const home = std::getenv("HOME");
    return home != nullptr ? std::string(home) + "/.Xauthority" : std::string();
}

Bytes ReadPlainFile(const std::string& name) {
    const int file = open(name.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
    if (file < 0)
        return {};
    Bytes bytes;
    struct stat status {};
    if (fstat(file, &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0 &&
        static_cast<std::size_t>(status.st_size) <= LARGEST_AUTHORITY_FILE) {
        bytes.resize(static_cast<std::size_t>(status.st_size));
        const ssize_t got = read(file, bytes.data(), bytes.size());
        bytes.resize(got > 0 ? static_cast<std::size_t>(got) : 0);
    }
    close(file);
    return bytes;
}

void AppendPadded(Bytes& bytes, const void* data, std::size_t size) {
    const auto* const first = static_cast<const std::uint8_t*>(data);
    bytes.insert(bytes.end(), first, first + size);
    bytes.resize(Padded(bytes.size()));
}

bool SkipDepths(BytesReader& reader, unsigned count) {
    for (unsigned depth = 0; depth < count; ++depth) {
        const auto head = reader.TakePart<xcb_depth_t>();
        if (!head || !reader.Take(head->visuals_len * sizeof(xcb_visualtype_t)))
            return false;
    }
    return true;
}

bool SkipScreens(BytesReader& reader, unsigned count) {
    for (unsigned screen = 0; screen < count; ++screen) {
        const auto head = reader.TakePart<xcb_screen_t>();
        if (!head || !SkipDepths(reader, head->allowed_depths_len))
            return false;
    }
    return true;
}

} // namespace

Bytes FindCookie(std::span<const std::uint8_t> authorityFile, std::string_view host,
                 std::string_view displayNumber) {
    BytesReader reader(authorityFile);
    while (const std::optional<AuthorityEntry> entry = TakeEntry(reader)) {
        if (entry->Fits(host, displayNumber))
            return Bytes(entry->data.begin(), entry->data.end());
    }
    return {};
}

std::string HostName() {
    char name[256] = {};
    if (gethostname(name, sizeof name - 1) != 0)
        return {};
    return name;
}

Bytes CookieOf(int displayNumber) {
    return FindCookie(ReadPlainFile(AuthorityFileName()), HostName(), std::to_string(displayNumber));
}

Bytes MakeGreeting(const Bytes& cookie) {
    xcb_setup_request_t request{};
    request.byte_order = std::endian::native == std::endian::little ? 'l' : 'B';
    request.protocol_major_version = X_PROTOCOL;
    request.protocol_minor_version = X_PROTOCOL_REVISION;
    const std::size_t nameSize = cookie.empty() ? 0 : COOKIE_NAME.size();
    request.authorization_protocol_name_len = static_cast<std::uint16_t>(nameSize);
    request.authorization_protocol_data_len = static_cast<std::uint16_t>(cookie.size());
    Bytes greeting;
    AppendPadded(greeting, &request, sizeof request);
    AppendPadded(greeting, COOKIE_NAME.data(), nameSize);
    AppendPadded(greeting, cookie.data(), cookie.size());
    return greeting;
}

std::size_t AnswerLength(std::span<const std::uint8_t, ANSWER_HEAD> head) {
    xcb_setup_failed_t shortest; // every answer begins like it
    static_assert(sizeof shortest == ANSWER_HEAD);
    std::memcpy(&shortest, head.data(), sizeof shortest);
    return ANSWER_HEAD + shortest.length * UNIT;
}

bool IsSoundWelcome(std::span<const std::uint8_t> answer) {
    BytesReader reader(answer);
    const auto setup = reader.TakePart<xcb_setup_t>();
    return setup && setup->status == WELCOME && setup->roots_len > 0 && setup->resource_id_mask != 0 &&
           AnswerLength(answer.first<ANSWER_HEAD>()) == answer.size() &&
           reader.Take(Padded(setup->vendor_len)) &&
           reader.Take(setup->pixmap_formats_len * sizeof(xcb_format_t)) &&
           SkipScreens(reader, setup->roots_len);
}

} // namespace platform::x11

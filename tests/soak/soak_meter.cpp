// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_meter.h"

#include "platform/dispatch.h"

#include <malloc.h>
#include <unistd.h>
#include <xcb/res.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <stdexcept>

namespace {

constexpr double KIB = 1024;

struct FreeReply {
    void operator()(void* reply) const { std::free(reply); }
};
template <class Reply>
using ReplyOf = std::unique_ptr<Reply, FreeReply>;

double EntriesOf(const char* folder) {
    return static_cast<double>(std::distance(std::filesystem::directory_iterator(folder), {}));
}

/// Memory that others may see as well: what pixels come through.
double SharedMappings() {
    std::ifstream file("/proc/self/maps");
    double count = 0;
    for (std::string line; std::getline(file, line);) {
        const std::size_t rights = line.find(' ') + 1;
        count += line.compare(rights + 3, 1, "s") == 0 ? 1 : 0;
    }
    return count;
}

double ResidentKib(const std::string& process) {
    std::ifstream file("/proc/" + process + "/statm");
    double size = 0;
    double resident = 0;
    file >> size >> resident;
    return resident * static_cast<double>(sysconf(_SC_PAGESIZE)) / KIB;
}

double HeapKib() {
    const auto heap = mallinfo2();
    return static_cast<double>(heap.uordblks + heap.hblkhd) / KIB;
}

bool IsOfServer(const std::string& counter) {
    return counter.compare(0, 2, "X ") == 0;
}

} // namespace

// ---- The server

SoakServerMeter::SoakServerMeter(const XServer& server) : m_server(server.Pid()), m_link(server.Display()) {
    const auto asked = xcb_res_query_version(m_link.Get(), 1, 2);
    const ReplyOf<xcb_res_query_version_reply_t> version(
        xcb_res_query_version_reply(m_link.Get(), asked, nullptr));
    if (version == nullptr || (version->server_major == 1 && version->server_minor < 2))
        throw std::runtime_error("the X server doesn't tell which client holds what");
}

std::vector<std::uint32_t> SoakServerMeter::OwnConnections() const {
    const xcb_res_client_id_spec_t everybody{0, XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID};
    const auto asked = xcb_res_query_client_ids(m_link.Get(), 1, &everybody);
    const ReplyOf<xcb_res_query_client_ids_reply_t> reply(
        xcb_res_query_client_ids_reply(m_link.Get(), asked, nullptr));
    if (reply == nullptr)
        throw std::runtime_error("the X server doesn't answer");
    const std::uint32_t ours = xcb_get_setup(m_link.Get())->resource_id_base;
    std::vector<std::uint32_t> connections;
    for (auto each = xcb_res_query_client_ids_ids_iterator(reply.get()); each.rem != 0;
         xcb_res_client_id_value_next(&each)) {
        const bool isOwn = xcb_res_client_id_value_value_length(each.data) > 0 &&
                           *xcb_res_client_id_value_value(each.data) == static_cast<std::uint32_t>(getpid());
        if (isOwn && each.data->spec.client != ours)
            connections.push_back(each.data->spec.client);
    }
    return connections;
}

const std::string& SoakServerMeter::NameOf(xcb_atom_t type) {
    std::string& name = m_names[type];
    if (!name.empty())
        return name;
    const ReplyOf<xcb_get_atom_name_reply_t> reply(
        xcb_get_atom_name_reply(m_link.Get(), xcb_get_atom_name(m_link.Get(), type), nullptr));
    name = "X ";
    if (reply != nullptr)
        name.append(xcb_get_atom_name_name(reply.get()),
                    static_cast<std::size_t>(xcb_get_atom_name_name_length(reply.get())));
    return name;
}

void SoakServerMeter::CountResources(std::uint32_t connection, SoakFigures& figures) {
    const auto asked = xcb_res_query_client_resources(m_link.Get(), connection);
    const ReplyOf<xcb_res_query_client_resources_reply_t> reply(
        xcb_res_query_client_resources_reply(m_link.Get(), asked, nullptr));
    if (reply == nullptr)
        return; // it has gone since it was listed
    for (auto each = xcb_res_query_client_resources_types_iterator(reply.get()); each.rem != 0;
         xcb_res_type_next(&each))
        figures[NameOf(each.data->resource_type)] += each.data->count;
}

double SoakServerMeter::PixmapBytes(std::uint32_t connection) const {
    const auto asked = xcb_res_query_client_pixmap_bytes(m_link.Get(), connection);
    const ReplyOf<xcb_res_query_client_pixmap_bytes_reply_t> reply(
        xcb_res_query_client_pixmap_bytes_reply(m_link.Get(), asked, nullptr));
    return reply != nullptr ? static_cast<double>(reply->bytes) : 0;
}

void SoakServerMeter::Read(SoakFigures& figures) {
    figures["server KiB"] = ResidentKib(std::to_string(m_server));
    figures["X pixmap KiB"] = 0;
    for (const std::uint32_t connection : OwnConnections()) {
        CountResources(connection, figures);
        figures["X pixmap KiB"] += PixmapBytes(connection) / KIB;
    }
}

// ---- All of it

SoakMeter::SoakMeter(const XServer& server, std::size_t samples) : m_room(samples), m_server(server) {}

SoakFigures SoakMeter::Read() {
    SoakFigures figures;
    figures["heap KiB"] = HeapKib();
    figures["resident KiB"] = ResidentKib("self");
    figures["descriptors"] = EntriesOf("/proc/self/fd");
    figures["threads"] = EntriesOf("/proc/self/task");
    figures["shared mappings"] = SharedMappings();
    m_server.Read(figures);
    return figures;
}

const SoakFigures& SoakMeter::Sample() {
    m_last = Read();
    if (m_taken == m_room)
        return m_last;
    for (const auto& [counter, value] : m_last) {
        std::vector<double>& samples = m_samples[counter];
        if (samples.empty())
            samples.resize(m_room); // at once: what watches for growth must not grow
        samples[m_taken] = value;
    }
    ++m_taken;
    return m_last;
}

double SoakMeter::AllowedGrowth(const std::string& counter) {
    static const std::map<std::string, double> ALLOWED{
        {"heap KiB", 4096},      // frames come and go whole, 1200 KiB each: three of them
        {"resident KiB", 16384}, // the allocator gives back late what threads have freed; the heap tells more
        {"server KiB",
         65536}, // with windows that come and go a server grows by itself: 30 MiB in half an hour
        {"X pixmap KiB", 1024}, // the windows that are there at the moment: 500 KiB, at most 700
        {"descriptors", 4},     // a visitor, who holds three
        {"threads", platform::DISPATCH_POOL_THREADS}, // started late, and kept
        {"shared mappings", 8}};                      // one for each window whose pixels are fetched
    constexpr double RESOURCES = 8;                   // most come with windows, of which there are up to ten
    const auto found = ALLOWED.find(counter);
    return found != ALLOWED.end() ? found->second : RESOURCES;
}

std::vector<std::string> LeftOver(const SoakFigures& before, const SoakFigures& after) {
    std::vector<std::string> lines;
    for (const auto& [counter, value] : after) {
        const auto found = before.find(counter);
        const double was = found != before.end() ? found->second : 0;
        const bool isCounted = IsOfServer(counter) || counter == "descriptors" || counter == "threads" ||
                               counter == "shared mappings";
        if (isCounted && value > was)
            lines.push_back(counter + ": " + std::to_string(static_cast<long>(value)) + " and not " +
                            std::to_string(static_cast<long>(was)));
    }
    return lines;
}

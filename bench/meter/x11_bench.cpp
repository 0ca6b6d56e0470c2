// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/x11_bench.h"

#include <cstdio>
#include <exception>
#include <fstream>
#include <iomanip>
#include <optional>
#include <regex>
#include <stdexcept>

namespace {

using Kind = XServerOptions::Kind;

/// What follows `name` in `argument`.
std::optional<std::string> ValueOf(const std::string& argument, const std::string& name) {
    if (argument.compare(0, name.size(), name) != 0)
        return std::nullopt;
    return argument.substr(name.size());
}

std::vector<Kind> ServersOf(const std::string& word) {
    if (word == "xvfb")
        return {Kind::Xvfb};
    if (word == "xorg")
        return {Kind::Xorg};
    if (word == "both")
        return {Kind::Xvfb, Kind::Xorg};
    throw std::invalid_argument("--server= takes xvfb, xorg or both");
}

void Take(BenchOptions& options, const std::string& argument) {
    if (const auto filter = ValueOf(argument, "--benchmark_filter="))
        options.filter = *filter;
    else if (const auto out = ValueOf(argument, "--benchmark_out="))
        options.out = *out;
    else if (const auto seconds = ValueOf(argument, "--seconds="))
        options.seconds = std::stod(*seconds);
    else if (const auto repeats = ValueOf(argument, "--repeats="))
        options.repeats = std::stoi(*repeats);
    else if (const auto server = ValueOf(argument, "--server="))
        options.servers = ServersOf(*server);
    else if (!ValueOf(argument, "--benchmark_"))
        throw std::invalid_argument("no option of this benchmark: " + argument);
}

} // namespace

bool BenchOptions::Wants(const std::string& row) const {
    return std::regex_search(row, std::regex(filter));
}

BenchOptions ReadBenchOptions(int argc, const char* const* argv) {
    BenchOptions options;
    for (int i = 1; i < argc; ++i)
        Take(options, argv[i]);
    if (!(options.seconds > 0) || options.repeats < 1)
        throw std::invalid_argument("a measurement takes some time and is made once at least");
    return options;
}

std::string NameOf(Kind kind) {
    return kind == Kind::Xvfb ? "xvfb" : "xorg";
}

std::unique_ptr<XServer> StartBenchServer(Kind kind) {
    XServerOptions options;
    options.kind = kind;
    options.width = 1920;
    options.height = 1080;
    try {
        if (const auto missing = MissingProgram(XServer::ProgramsOf(kind)))
            throw std::runtime_error(*missing);
        return std::make_unique<XServer>(options);
    } catch (const std::exception& failure) {
        std::printf("skipped on %s: %s\n", NameOf(kind).c_str(), failure.what());
        return nullptr;
    }
}

bool BenchResults::Write(const std::string& file) const {
    std::ofstream stream(file);
    stream << std::setprecision(6) << "{\n  \"benchmarks\": [";
    const char* separator = "\n";
    for (const auto& [row, values] : m_rows) {
        stream << separator << "    {\"name\": \"" << row << '"';
        for (const auto& [name, value] : values)
            stream << ", \"" << name << "\": " << value;
        stream << '}';
        separator = ",\n";
    }
    stream << "\n  ]\n}\n";
    return static_cast<bool>(stream.flush());
}

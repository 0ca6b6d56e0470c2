// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_outputs.h"

namespace {

std::string SizeText(int width, int height) {
    return std::to_string(width) + "x" + std::to_string(height);
}

} // namespace

X11Outputs::X11Outputs(const XServer& server) : m_server(server) {
    const XServerOptions& options = server.Options();
    if (options.kind == XServer::Kind::Xorg)
        m_outputs.push_back({First(), options.width, options.height});
}

std::optional<std::string> X11Outputs::Add(int width, int height) {
    if (m_outputs.empty())
        return std::nullopt;
    m_outputs.push_back({"DUMMY" + std::to_string(m_outputs.size()), width, height});
    const std::string name = m_outputs.back().name;
    return Know(m_outputs.back()) && Arrange() ? std::optional(name) : std::nullopt;
}

bool X11Outputs::SetOn(const std::string& name, bool on) {
    Output* const output = Find(name);
    if (output == nullptr)
        return false;
    output->on = on;
    return Arrange();
}

bool X11Outputs::Resize(const std::string& name, int width, int height) {
    Output* const output = Find(name);
    if (output == nullptr)
        return false;
    output->width = width;
    output->height = height;
    return Know(*output) && Arrange();
}

bool X11Outputs::MakePrimary(const std::string& name) {
    m_primary = name;
    return Find(name) != nullptr && Arrange();
}

bool X11Outputs::Redo() {
    for (const Output& output : m_outputs) {
        if (!Know(output))
            return false;
    }
    return m_outputs.empty() || Arrange();
}

bool X11Outputs::Know(const Output& output) {
    const std::string mode = SizeText(output.width, output.height);
    const int across = output.width + 80;
    const int down = output.height + 30;
    const std::string clock = std::to_string(static_cast<double>(across) * down * 60 / 1e6);
    const auto text = [](int number) { return std::to_string(number); };
    // A mode that is known already is no harm.
    Xrandr({"--newmode", mode, clock, text(output.width), text(output.width + 20), text(output.width + 40),
            text(across), text(output.height), text(output.height + 5), text(output.height + 10),
            text(down)});
    return Xrandr({"--addmode", output.name, mode});
}

bool X11Outputs::Arrange() {
    std::vector<std::string> arguments;
    int x = 0;
    for (const Output& output : m_outputs) {
        arguments.insert(arguments.end(), {"--output", output.name});
        if (!output.on) {
            arguments.emplace_back("--off");
            continue;
        }
        arguments.insert(arguments.end(), {"--mode", SizeText(output.width, output.height), "--pos",
                                           std::to_string(x) + "x0"});
        if (output.name == m_primary)
            arguments.emplace_back("--primary");
        x += output.width;
    }
    return Xrandr(arguments);
}

X11Outputs::Output* X11Outputs::Find(const std::string& name) {
    for (Output& output : m_outputs) {
        if (output.name == name)
            return &output;
    }
    return nullptr;
}

bool X11Outputs::Xrandr(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(), "xrandr");
    return XProgram::Run(m_server, arguments);
}

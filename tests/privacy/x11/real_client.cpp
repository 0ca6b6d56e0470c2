// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/real_client.h"

#include <algorithm>
#include <fstream>
#include <stdexcept>

namespace {

constexpr const char* PYTHON = "/usr/bin/python3"; // the one that Debian's packages bring modules for

/// A window, and now and then a menu that opens over its edge, past the window manager.
constexpr const char* TOOLKIT_PROGRAM = R"(# SPDX-License-Identifier: Apache-2.0
import sys
import gi
gi.require_version("Gtk", "3.0")
from gi.repository import Gdk, GLib, Gtk

colour, width, height = sys.argv[1], int(sys.argv[2]), int(sys.argv[3])
style = Gtk.CssProvider()
style.load_from_data(("window, window * { background: " + colour + "; color: " + colour +
                      "; border: none; box-shadow: none; }").encode())
Gtk.StyleContext.add_provider_for_screen(Gdk.Screen.get_default(), style, 800)
window = Gtk.Window(title="toolkit")
window.set_default_size(width, height)
text = Gtk.Label(label="0")
window.add(text)
window.connect("destroy", Gtk.main_quit)
window.show_all()
menu = Gtk.Window(type=Gtk.WindowType.POPUP)
menu.set_default_size(140, 90)
menu.add(Gtk.Label(label="menu"))
beats = 0

def beat():
    global beats
    beats += 1
    text.set_text(str(beats))
    text.queue_draw()
    if beats % 8 == 0 and window.get_window() and window.is_visible():
        x, y = window.get_position()
        menu.move(x + width - 60, y + 40)
        menu.show_all()
    if beats % 8 == 5:
        menu.hide()
    return True

GLib.timeout_add(170, beat)
Gtk.main()
)";

/// Paints again and again: the shown one in two shades, the secret one in one.
std::string Page(const std::string& first, const std::string& second) {
    return "<!DOCTYPE html><title>browser</title><style>html{height:100%;background:" + first +
           "}</style><script>let beat=0;setInterval(()=>{document.documentElement.style.background="
           "++beat%2?'" +
           second + "':'" + first + "'},400)</script>\n";
}

std::string ColourOf(RealKind kind, bool isSecret) {
    if (isSecret)
        return "#ff00ff";
    switch (kind) {
        case RealKind::Terminal:
            return "#006000";
        case RealKind::Toolkit:
            return "#0000c0";
        default:
            return "#00c060";
    }
}

void Write(const std::string& file, const std::string& text) {
    std::ofstream stream(file);
    stream << text;
    if (!stream.flush())
        throw std::runtime_error("can't write " + file);
}

std::vector<std::string> TerminalCommand(bool isSecret) {
    const std::string colour = ColourOf(RealKind::Terminal, isSecret);
    // The pointer over it is a picture of its own that anybody may see, so it has colours of its own as well.
    return {"xterm",
            "-geometry",
            "46x14",
            "-bg",
            colour,
            "-fg",
            isSecret ? colour : "#00e000",
            "-cr",
            colour,
            "-ms",
            "#00e000",
            "-xrm",
            "XTerm*pointerColorBackground: #000000",
            "-xrm",
            "XTerm*scrollBar: false",
            "-xrm",
            "XTerm*iconHint: none", // there is purple in it
            "-b",
            "0",
            "-bw",
            "0",
            "-e",
            "sh",
            "-c",
            "while :; do date; sleep 0.2; done"};
}

std::vector<std::string> BrowserCommand(const RealClientFiles& files, bool isSecret, int number) {
    const std::string page = files.Folder().File(isSecret ? "secret.html" : "shown.html");
    const std::string home = files.Folder().File("browser" + std::to_string(number));
    return {"chromium",
            "--no-sandbox", // or it won't run as root,
            "--test-type",  // and would complain of that
            "--no-zygote",
            "--user-data-dir=" + home,
            "--app=file://" + page,
            "--window-size=420,300",
            "--no-first-run",
            "--no-default-browser-check",
            "--disable-gpu",
            "--disable-background-networking",
            "--disable-component-update",
            "--disable-sync",
            "--disable-default-apps",
            "--disable-extensions",
            "--disable-dev-shm-usage",
            "--password-store=basic",
            "--force-color-profile=srgb",
            "--force-device-scale-factor=1",
            "--disable-features=Translate,MediaRouter",
            "--noerrdialogs",
            "--disable-session-crashed-bubble"};
}

std::vector<std::string> CommandOf(const RealClientFiles& files, const RealClient::Plan& plan) {
    switch (plan.kind) {
        case RealKind::Terminal:
            return TerminalCommand(plan.isSecret);
        case RealKind::Toolkit:
            return {PYTHON, files.Folder().File("toolkit.py"), ColourOf(plan.kind, plan.isSecret), "320",
                    "240"};
        default:
            return BrowserCommand(files, plan.isSecret, plan.number);
    }
}

} // namespace

const char* NameOf(RealKind kind) {
    switch (kind) {
        case RealKind::Terminal:
            return "xterm";
        case RealKind::Toolkit:
            return "GTK";
        default:
            return "browser";
    }
}

std::string ProgramOf(RealKind kind) {
    switch (kind) {
        case RealKind::Terminal:
            return "xterm";
        case RealKind::Toolkit:
            return PYTHON;
        default:
            return "chromium";
    }
}

std::vector<std::string> PackagesOf(RealKind kind) {
    switch (kind) {
        case RealKind::Terminal:
            return {"xterm", "xfonts-base"};
        case RealKind::Toolkit:
            return {"python3-gi", "gir1.2-gtk-3.0"};
        default:
            return {"chromium"};
    }
}

bool IsInstalled(RealKind kind) {
    if (FindProgram(ProgramOf(kind)).empty())
        return false;
    if (kind != RealKind::Toolkit)
        return true;
    CChildProcess::Plan plan;
    plan.command = {PYTHON, "-c",
                    "import gi; gi.require_version('Gtk', '3.0'); from gi.repository import Gdk"};
    CChildProcess trial(plan);
    constexpr int TRIAL_MS = 30000;
    return trial.WaitForEnd(TRIAL_MS) && trial.HasSucceeded();
}

RealClientFiles::RealClientFiles() {
    Write(m_folder.File("toolkit.py"), TOOLKIT_PROGRAM);
    Write(m_folder.File("shown.html"), Page(ColourOf(RealKind::Browser, false), "#00c860"));
    Write(m_folder.File("secret.html"), Page(ColourOf(RealKind::Browser, true), "#fe00fe"));
}

RealClient::RealClient(const XServer& server, const RealClientFiles& files, const Plan& plan)
    : m_plan(plan),
      m_program(std::make_unique<XProgram>(server, CommandOf(files, plan))) {}

std::string RealClient::Name() const {
    return std::string(IsSecret() ? "secret " : "shown ") + NameOf(Kind()) + " " + std::to_string(Number());
}

std::string RealClient::Title() const {
    switch (Kind()) {
        case RealKind::Terminal:
            return "sh";
        case RealKind::Toolkit:
            return "toolkit";
        default:
            return "browser";
    }
}

void RealClient::Look(const XLink& link, const std::vector<std::uint32_t>& listed) {
    if (m_window != 0) {
        if (std::find(listed.begin(), listed.end(), m_window) == listed.end())
            m_window = 0;
        return;
    }
    if (m_hadWindow)
        return;
    for (const std::uint32_t window : listed) {
        const std::vector<std::uint32_t> pid = link.Property(window, "_NET_WM_PID");
        if (pid.size() == 1 && static_cast<pid_t>(pid[0]) == Pid()) {
            m_window = window;
            m_hadWindow = true;
        }
    }
}

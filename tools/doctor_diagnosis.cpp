// SPDX-License-Identifier: Apache-2.0
#include "tools/doctor_diagnosis.h"

#include <algorithm>
#include <string_view>

namespace {

using platform::Availability;
using platform::Capability;
using platform::Life;
using platform::Permission;
using platform::X11Extension;
using platform::X11Obstacle;

constexpr std::string_view KNOWN_WORDS[] = {"auto", "x11", "simulated", "none"};

/// "SCREENSHARE_PLATFORM", as people set it.
constexpr const char* ASKED_FOR = "SCREENSHARE_PLATFORM (or --platform) ";

std::string WordOf(const DoctorFacts& facts) {
    return facts.environment.platform.empty() ? "auto" : facts.environment.platform;
}

bool IsKnown(const std::string& word) {
    return std::find(std::begin(KNOWN_WORDS), std::end(KNOWN_WORDS), word) != std::end(KNOWN_WORDS);
}

/// How the environment gives a Wayland session away.
std::string WaylandSign(const EnvironmentFacts& environment) {
    return environment.waylandDisplay.empty() ? "XDG_SESSION_TYPE is wayland"
                                              : "WAYLAND_DISPLAY is " + environment.waylandDisplay;
}

// ---- Why there is no desktop

constexpr const char* X11_SESSION = "logging in to an X11 session (many login screens have one \"on Xorg\")";

Finding WaylandFinding(const std::string& sign, const platform::X11Report& x11) {
    Finding finding;
    finding.because = "this is a Wayland session (" + sign +
                      "), which is not captured yet, and an X server inside it shows only the windows of X "
                      "programs, and black for the rest";
    finding.remedy = X11_SESSION;
    if (x11.obstacle == X11Obstacle::None && x11.isWaylandBridge)
        finding.remedy += ", or by setting SCREENSHARE_PLATFORM=x11 to share the windows of X programs only";
    else if (x11.obstacle == X11Obstacle::None)
        finding.remedy += ", or by setting SCREENSHARE_PLATFORM=x11 if display " + x11.display +
                          " is a server of its own, such as Xvfb or Xephyr";
    return finding;
}

Finding RefusalFinding(const platform::X11Report& x11) {
    if (!x11.hasCookie)
        return {"the X server of display " + x11.display +
                    " lets nobody in without a key, and your authority file has none for it",
                "running this as the user who is logged in there, or setting XAUTHORITY to that user's "
                "authority file (xauth list shows the keys)"};
    return {"the X server of display " + x11.display +
                " refuses the key in your authority file, or has no room for another program",
            "setting XAUTHORITY to the file of the session that runs now (xauth list shows the keys), or "
            "closing programs"};
}

Finding NothingChosen(const DoctorFacts& facts) {
    const std::string word = WordOf(facts);
    if (word == "none")
        return {std::string(ASKED_FOR) + "asks for none", "unsetting it, or setting it to auto"};
    if (!IsKnown(word))
        return {std::string(ASKED_FOR) + "is \"" + word + "\", which names no window server",
                "unsetting it, or setting it to auto, x11 or simulated"};
    if (facts.environment.IsWaylandSession())
        return WaylandFinding(WaylandSign(facts.environment), facts.x11);
    if (facts.x11.obstacle != X11Obstacle::None)
        return X11ObstacleFinding(facts.x11);
    if (facts.x11.isWaylandBridge)
        return WaylandFinding("the monitors of display " + facts.x11.display + " are named XWAYLAND",
                              facts.x11);
    return {"display " + facts.x11.display + " didn't answer when the window server was chosen, but does now",
            "running this again"};
}

/// Why nothing at all can be shared just now; nothing when the window server is alive.
std::optional<Finding> WhyDead(const DoctorFacts& facts) {
    if (facts.server.name == "none")
        return NothingChosen(facts);
    if (facts.server.life == Life::Stalled)
        return Finding{"the window server has stopped answering",
                       "waiting until it is less busy, or continuing it if it was stopped"};
    if (facts.server.life == Life::Lost)
        return facts.server.name == "x11" ? X11ObstacleFinding(facts.x11)
                                          : Finding{"the window server is lost", "running this again"};
    return std::nullopt;
}

std::string ChoiceOf(const DoctorFacts& facts) {
    const std::string& name = facts.server.name;
    const std::string word = WordOf(facts);
    if (name == "none")
        return "None is in force because " + NothingChosen(facts).because + ".";
    if (word == name)
        return "Chosen because " + std::string(ASKED_FOR) + "asks for it.";
    if (name == "x11")
        return "Chosen because display " + facts.environment.display +
               " answers and this is no Wayland session.";
    return "Put in force by the program itself.";
}

// ---- What is missing of a desktop that is there

struct Need {
    const char* name;
    const char* option; ///< As in the X server's configuration; null for what every server has by default.
    const X11Extension& found;
    const char* version;
};

Finding LackOf(const Need& need) {
    if (!need.found.present && need.option == nullptr)
        return {"the X server has no " + std::string(need.name) + " extension",
                "installing another X server"};
    if (!need.found.present)
        return {"the X server has no " + std::string(need.name) + " extension",
                "starting the X server with +extension " + std::string(need.option) + ", or with Option \"" +
                    need.option + "\" \"Enable\" in Section \"Extensions\" of xorg.conf"};
    return {"the X server's " + std::string(need.name) + " extension is " + std::to_string(need.found.major) +
                "." + std::to_string(need.found.minor) + ", and " + need.version + " is needed",
            "installing a newer X server"};
}

/// All that is lacking in one finding, so that it can be mended in one go.
std::optional<Finding> LacksOf(const std::vector<Need>& needs) {
    std::optional<Finding> all;
    for (const Need& each : needs) {
        if (each.found.suffices)
            continue;
        const Finding lack = LackOf(each);
        if (!all)
            all.emplace();
        all->because += (all->because.empty() ? "" : ", and ") + lack.because;
        all->remedy += (all->remedy.empty() ? "" : ", and by ") + lack.remedy;
    }
    return all;
}

Need CompositeNeed(const platform::X11Report& x11) {
    return {"Composite", "COMPOSITE", x11.composite, "0.2"};
}
Need DamageNeed(const platform::X11Report& x11) {
    return {"Damage", "DAMAGE", x11.damage, "1.1"};
}
Need XFixesNeed(const platform::X11Report& x11) {
    return {"XFixes", "XFIXES", x11.xfixes, "2.0"};
}

bool IsX11(const DoctorFacts& facts) {
    return facts.server.name == "x11" && facts.x11.obstacle == X11Obstacle::None;
}

std::optional<Finding> X11Lack(const DoctorFacts& facts, Capability capability) {
    if (!IsX11(facts))
        return std::nullopt;
    const platform::X11Report& x11 = facts.x11;
    const bool isPicture = capability == Capability::WindowImages || capability == Capability::Streams;
    if (isPicture && !x11.depthReadable)
        return Finding{
            "the screen's depth is " + std::to_string(x11.depth) + ", or of a kind that can't be read",
            "starting the X server with 24 bits a pixel (15, 16 and 30 will do, too)"};
    if (capability == Capability::WindowImages)
        return LacksOf({CompositeNeed(x11), DamageNeed(x11), XFixesNeed(x11)});
    if (capability == Capability::Streams)
        return LacksOf({DamageNeed(x11)});
    if (capability == Capability::Cursor)
        return LacksOf({XFixesNeed(x11)});
    return std::nullopt;
}

Finding PermissionFinding(Permission permission) {
    if (permission == Permission::Denied)
        return {"the user has denied permission", "allowing it in the desktop's privacy settings"};
    return {"permission has not been given yet", "starting a share and allowing it when the desktop asks"};
}

std::optional<Finding> WhyNot(const DoctorFacts& facts, Capability capability) {
    if (std::optional<Finding> dead = WhyDead(facts))
        return dead;
    if (std::optional<Finding> lack = X11Lack(facts, capability))
        return lack;
    const Availability availability = facts.server.Of(capability);
    if (availability == Availability::Yes)
        return std::nullopt;
    if (availability == Availability::AfterPermission)
        return facts.server.permission == Permission::Granted
                   ? std::nullopt
                   : std::optional<Finding>(PermissionFinding(facts.server.permission));
    return Finding{"this window server doesn't offer it", ""};
}

std::optional<Finding> WhyNoMonitors(const DoctorFacts& facts) {
    if (std::optional<Finding> dead = WhyDead(facts))
        return dead;
    if (facts.server.displays.empty())
        return Finding{"all monitors are switched off", "switching one on (xrandr --auto on X11)"};
    if (IsX11(facts) && facts.x11.isWaylandBridge)
        return Finding{"display " + facts.x11.display +
                           " belongs to a Wayland session (its monitors are named XWAYLAND): it shows the "
                           "windows of X programs, and black for the rest",
                       X11_SESSION};
    return std::nullopt;
}

std::vector<Ability> AbilitiesOf(const DoctorFacts& facts) {
    return {
        {"monitors", "Monitors", "shares of a monitor", true, WhyNoMonitors(facts)},
        {"window_list", "List of windows", "shares of windows and applications; keeping windows out", true,
         WhyNot(facts, Capability::Windows)},
        {"window_pictures", "Pictures of windows", "every share; also what other windows cover", true,
         WhyNot(facts, Capability::WindowImages)},
        {"monitor_streams", "Streams of a monitor", "a monitor captured as it is seen", false,
         WhyNot(facts, Capability::Streams)},
        {"pointer_position", "Position of the pointer", "the pointer in a share", false,
         WhyNot(facts, Capability::Pointer)},
        {"pointer_image", "Image of the pointer", "the pointer in a share", false,
         WhyNot(facts, Capability::Cursor)},
        {"applications", "List of applications", "choosing what to share", false,
         WhyNot(facts, Capability::Applications)},
        {"activation", "Bringing to the front", "showing what is shared", false,
         WhyNot(facts, Capability::Activation)},
    };
}

// ---- What works, but not as it might

void AddX11Hints(const platform::X11Report& x11, std::vector<Hint>& hints) {
    if (x11.overNetwork)
        hints.push_back({"Pictures come slowly",
                         {"display " + x11.display + " is reached over the network, without shared memory",
                          "running the program where the display is"}});
    else if (!x11.shm.suffices)
        hints.push_back({"Pictures come slowly", LackOf({"MIT-SHM", "MIT-SHM", x11.shm, "1.2"})});
    if (!x11.randr.suffices)
        hints.push_back({"All monitors count as one", LackOf({"RandR", "RANDR", x11.randr, "1.5"})});
    if (!x11.shape.suffices)
        hints.push_back(
            {"Windows of any shape count as rectangles", LackOf({"Shape", nullptr, x11.shape, "1.1"})});
    if (!x11.xres.suffices)
        hints.push_back(
            {"A window that doesn't tell its process belongs to no application, so that keeping its "
             "application out doesn't keep it out",
             LackOf({"X-Resource", "X-Resource", x11.xres, "1.2"})});
    if (!x11.xinput.suffices)
        hints.push_back({"The X server is asked for the pointer with every frame, which costs CPU",
                         LackOf({"XInput", nullptr, x11.xinput, "2.2"})});
}

std::vector<Hint> HintsOf(const DoctorFacts& facts) {
    std::vector<Hint> hints;
    if (facts.server.name == "simulated")
        hints.push_back(
            {"What is shared is an invented desktop, and nothing of yours",
             {std::string(ASKED_FOR) + "asks for simulated", "unsetting it, or setting it to auto"}});
    if (facts.server.name == "x11" && facts.environment.IsWaylandSession())
        hints.push_back({"Windows of Wayland programs are not shown",
                         {"this is a Wayland session (" + WaylandSign(facts.environment) +
                              "), and an X server sees X programs only",
                          X11_SESSION}});
    if (IsX11(facts) && facts.server.life == Life::Alive)
        AddX11Hints(facts.x11, hints);
    if (facts.environment.debugFile == DebugFileState::Refused)
        hints.push_back(
            {"The debug file in " + facts.environment.DebugFolderInForce() + " is not read",
             {"others may have written it, or it is empty, larger than 1 MiB, a link, or no plain file",
              "giving folder and file to yourself or root, with chmod go-w on both"}});
    return hints;
}

} // namespace

Finding X11ObstacleFinding(const platform::X11Report& x11) {
    switch (x11.obstacle) {
        case X11Obstacle::NoName:
            return {
                "DISPLAY is not set, so there is no X server to ask",
                "running this inside a graphical session, or setting DISPLAY to that of one, such as :0; on a "
                "machine without a screen, running it under xvfb-run"};
        case X11Obstacle::UnreadableName:
            return {"DISPLAY is " + x11.display + ", which is no name of a display",
                    "setting it to one such as :0"};
        case X11Obstacle::AnotherMachine:
            return {"DISPLAY is " + x11.display +
                        ", on another machine, and only displays of this one are shared",
                    "running this on that machine"};
        case X11Obstacle::NobodyThere:
            return {"no X server answers at display " + x11.display,
                    "setting DISPLAY to the one that runs (ls /tmp/.X11-unix: X0 is :0), or starting one"};
        case X11Obstacle::Refused:
            return RefusalFinding(x11);
        case X11Obstacle::NoSuchScreen:
            return {"the X server of display " + x11.display + " has no screen of that number",
                    "leaving out what follows the point in DISPLAY"};
        case X11Obstacle::NoAnswer:
            return {
                "the X server of display " + x11.display +
                    " takes calls, but doesn't answer within 2 seconds",
                "waiting until it is less busy, or continuing it if it was stopped (its state in ps is T)"};
        case X11Obstacle::Lost:
        case X11Obstacle::None:
            break;
    }
    return {"the X server of display " + x11.display + " went away while it was looked at",
            "running this again"};
}

bool Diagnosis::CanShare() const {
    return std::none_of(abilities.begin(), abilities.end(),
                        [](const Ability& each) { return each.isNeeded && each.obstacle.has_value(); });
}

Diagnosis Diagnose(const DoctorFacts& facts) {
    return {ChoiceOf(facts), AbilitiesOf(facts), HintsOf(facts)};
}

// SPDX-License-Identifier: Apache-2.0
#include "tools/doctor_diagnosis.h"
#include "tools/doctor_report.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

namespace {

using platform::Availability;
using platform::Capability;
using platform::Life;
using platform::Permission;
using platform::X11Extension;
using platform::X11Obstacle;

X11Extension Version(unsigned major, unsigned minor) {
    return {true, major, minor, true};
}

/// An X11 desktop on which all is well.
DoctorFacts GoodFacts() {
    DoctorFacts facts;
    facts.environment.display = ":7";
    facts.server.name = "x11";
    facts.server.life = Life::Alive;
    facts.server.capabilities.fill(Availability::Yes);
    facts.server.displays = {{5, {{0, 0}, {1280, 720}}, {{0, 0}, {1280, 690}}, 1.0F, "Screen of mine"}};
    facts.server.windows = 12;
    facts.server.windowsOnScreen = 9;
    facts.server.applications = 4;
    facts.x11.display = ":7";
    facts.x11.vendor = "A Vendor";
    facts.x11.release = 21;
    facts.x11.width = 1280;
    facts.x11.height = 720;
    facts.x11.depth = 24;
    facts.x11.depthReadable = true;
    facts.x11.composite = Version(0, 4);
    facts.x11.damage = Version(1, 1);
    facts.x11.shm = Version(1, 2);
    facts.x11.randr = Version(1, 6);
    facts.x11.xfixes = Version(6, 0);
    facts.x11.shape = Version(1, 1);
    facts.x11.xres = Version(1, 2);
    facts.x11.xinput = Version(2, 2);
    facts.x11.monitors = {{"DP-1", 0, 0, 1280, 720, true}};
    facts.x11.hasWindowManager = true;
    facts.x11.windowManager = "Manager";
    return facts;
}

/// Nothing in force, by the automatic choice.
DoctorFacts NoneFacts() {
    DoctorFacts facts;
    facts.x11.obstacle = X11Obstacle::NoName;
    return facts;
}

/// The X server of display :7 can't be looked at.
DoctorFacts ObstructedFacts(X11Obstacle obstacle) {
    DoctorFacts facts;
    facts.environment.display = ":7";
    facts.x11.display = ":7";
    facts.x11.obstacle = obstacle;
    return facts;
}

const Ability& AbilityOf(const Diagnosis& diagnosis, const std::string& key) {
    const auto found = std::find_if(diagnosis.abilities.begin(), diagnosis.abilities.end(),
                                    [&key](const Ability& each) { return each.key == key; });
    EXPECT_NE(found, diagnosis.abilities.end()) << key;
    return found != diagnosis.abilities.end() ? *found : diagnosis.abilities.front();
}

Finding ObstacleOf(const DoctorFacts& facts, const std::string& key) {
    return AbilityOf(Diagnose(facts), key).obstacle.value_or(Finding{"nothing", "nothing"});
}

bool Works(const DoctorFacts& facts, const std::string& key) {
    return !AbilityOf(Diagnose(facts), key).obstacle.has_value();
}

bool Has(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

/// Why there is no desktop, and the remedy, are those of every ability.
void ExpectDead(const DoctorFacts& facts, const std::string& because, const std::string& remedy) {
    const Diagnosis diagnosis = Diagnose(facts);
    EXPECT_FALSE(diagnosis.CanShare());
    for (const Ability& each : diagnosis.abilities) {
        ASSERT_TRUE(each.obstacle.has_value()) << each.key;
        EXPECT_TRUE(Has(each.obstacle->because, because)) << each.key << ": " << each.obstacle->because;
        EXPECT_TRUE(Has(each.obstacle->remedy, remedy)) << each.key << ": " << each.obstacle->remedy;
    }
}

void ExpectHint(const DoctorFacts& facts, const std::string& what, const std::string& because,
                const std::string& remedy) {
    const Diagnosis diagnosis = Diagnose(facts);
    EXPECT_TRUE(diagnosis.CanShare());
    ASSERT_EQ(diagnosis.hints.size(), 1U);
    EXPECT_TRUE(Has(diagnosis.hints[0].what, what)) << diagnosis.hints[0].what;
    EXPECT_TRUE(Has(diagnosis.hints[0].finding.because, because)) << diagnosis.hints[0].finding.because;
    EXPECT_TRUE(Has(diagnosis.hints[0].finding.remedy, remedy)) << diagnosis.hints[0].finding.remedy;
}

// ---- A desktop that is there

TEST(Doctor, FindsNothingToMendOnAGoodDesktop) {
    const Diagnosis diagnosis = Diagnose(GoodFacts());
    EXPECT_TRUE(diagnosis.CanShare());
    EXPECT_TRUE(diagnosis.hints.empty());
    EXPECT_EQ(diagnosis.abilities.size(), 8U);
    for (const Ability& each : diagnosis.abilities)
        EXPECT_FALSE(each.obstacle.has_value()) << each.key;
    EXPECT_EQ(diagnosis.choice, "Chosen because display :7 answers and this is no Wayland session.");
}

TEST(Doctor, SaysThatSomebodyAskedForTheWindowServer) {
    DoctorFacts facts = GoodFacts();
    facts.environment.platform = "x11";
    EXPECT_TRUE(Has(Diagnose(facts).choice, "SCREENSHARE_PLATFORM (or --platform) asks for it"));
}

TEST(Doctor, NamesTheExtensionThatPicturesOfWindowsLack) {
    DoctorFacts facts = GoodFacts();
    facts.x11.composite = {};
    EXPECT_FALSE(Diagnose(facts).CanShare());
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").because, "the X server has no Composite extension");
    EXPECT_TRUE(Has(ObstacleOf(facts, "window_pictures").remedy, "+extension COMPOSITE"));
    EXPECT_TRUE(Works(facts, "monitor_streams"));
    EXPECT_TRUE(Works(facts, "pointer_image"));
}

TEST(Doctor, NamesAllExtensionsThatPicturesOfWindowsLack) {
    DoctorFacts facts = GoodFacts();
    facts.x11.damage = {};
    facts.x11.xfixes = {};
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").because,
              "the X server has no Damage extension, and the X server has no XFixes extension");
    EXPECT_EQ(ObstacleOf(facts, "monitor_streams").because, "the X server has no Damage extension");
    EXPECT_EQ(ObstacleOf(facts, "pointer_image").because, "the X server has no XFixes extension");
    EXPECT_TRUE(Works(facts, "pointer_position"));
}

TEST(Doctor, AsksForANewerServerWhereAnExtensionIsTooOld) {
    DoctorFacts facts = GoodFacts();
    facts.x11.composite = {true, 0, 1, false};
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").because,
              "the X server's Composite extension is 0.1, and 0.2 is needed");
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").remedy, "installing a newer X server");
}

TEST(Doctor, CallsADepthThatCannotBeReadByItsNumber) {
    DoctorFacts facts = GoodFacts();
    facts.x11.depth = 8;
    facts.x11.depthReadable = false;
    EXPECT_FALSE(Diagnose(facts).CanShare());
    EXPECT_TRUE(Has(ObstacleOf(facts, "window_pictures").because, "depth is 8"));
    EXPECT_TRUE(Has(ObstacleOf(facts, "monitor_streams").remedy, "24 bits a pixel"));
    EXPECT_TRUE(Works(facts, "window_list"));
}

TEST(Doctor, CannotShareWithoutMonitors) {
    DoctorFacts facts = GoodFacts();
    facts.server.displays.clear();
    EXPECT_FALSE(Diagnose(facts).CanShare());
    EXPECT_EQ(ObstacleOf(facts, "monitors").because, "all monitors are switched off");
    EXPECT_TRUE(Has(ObstacleOf(facts, "monitors").remedy, "xrandr --auto"));
    EXPECT_TRUE(Works(facts, "window_pictures"));
}

TEST(Doctor, CannotShareMonitorsOfAWaylandSessionsXServer) {
    DoctorFacts facts = GoodFacts();
    facts.environment.platform = "x11";
    facts.x11.isWaylandBridge = true;
    EXPECT_FALSE(Diagnose(facts).CanShare());
    EXPECT_TRUE(Has(ObstacleOf(facts, "monitors").because, "XWAYLAND"));
    EXPECT_TRUE(Has(ObstacleOf(facts, "monitors").remedy, "X11 session"));
    EXPECT_TRUE(Works(facts, "window_pictures"));
}

TEST(Doctor, SharesWithoutWhatIsOnlyNice) {
    DoctorFacts facts = GoodFacts();
    for (const Capability capability : {Capability::Streams, Capability::Pointer, Capability::Cursor,
                                        Capability::Applications, Capability::Activation})
        facts.server.capabilities[static_cast<std::size_t>(capability)] = Availability::No;
    EXPECT_TRUE(Diagnose(facts).CanShare());
    for (const char* const key :
         {"monitor_streams", "pointer_position", "pointer_image", "applications", "activation"})
        EXPECT_EQ(ObstacleOf(facts, key), (Finding{"this window server doesn't offer it", ""})) << key;
}

TEST(Doctor, CannotShareWithoutAListOfWindows) {
    DoctorFacts facts = GoodFacts();
    facts.server.capabilities[static_cast<std::size_t>(Capability::Windows)] = Availability::No;
    EXPECT_FALSE(Diagnose(facts).CanShare());
}

TEST(Doctor, TellsPermissionsThatAreMissing) {
    DoctorFacts facts = GoodFacts();
    facts.server.name = "other";
    auto& pictures = facts.server.capabilities[static_cast<std::size_t>(Capability::WindowImages)];
    pictures = Availability::AfterPermission;
    facts.server.permission = Permission::NotAsked;
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").because, "permission has not been given yet");
    facts.server.permission = Permission::Denied;
    EXPECT_EQ(ObstacleOf(facts, "window_pictures").because, "the user has denied permission");
    EXPECT_FALSE(Diagnose(facts).CanShare());
    facts.server.permission = Permission::Granted;
    EXPECT_TRUE(Diagnose(facts).CanShare());
}

// ---- No desktop

TEST(Doctor, SaysThatNoneWasAskedFor) {
    DoctorFacts facts = NoneFacts();
    facts.environment.platform = "none";
    ExpectDead(facts, "asks for none", "unsetting it");
}

TEST(Doctor, QuotesAWordThatNamesNoWindowServer) {
    DoctorFacts facts = NoneFacts();
    facts.environment.platform = "x12";
    ExpectDead(facts, "is \"x12\", which names no window server", "auto, x11 or simulated");
    EXPECT_TRUE(Has(Diagnose(facts).choice, "x12"));
}

TEST(Doctor, SaysThatDisplayIsNotSet) {
    ExpectDead(NoneFacts(), "DISPLAY is not set", "xvfb-run");
}

TEST(Doctor, TellsWhyADisplayCannotBeLookedAt) {
    const struct {
        X11Obstacle obstacle;
        const char* because;
        const char* remedy;
    } cases[] = {
        {X11Obstacle::UnreadableName, "no name of a display", "such as :0"},
        {X11Obstacle::AnotherMachine, "on another machine", "on that machine"},
        {X11Obstacle::NobodyThere, "no X server answers at display :7", "ls /tmp/.X11-unix"},
        {X11Obstacle::NoSuchScreen, "no screen of that number", "the point in DISPLAY"},
        {X11Obstacle::NoAnswer, "doesn't answer within 2 seconds", "continuing it if it was stopped"},
        {X11Obstacle::Lost, "went away", "running this again"},
        {X11Obstacle::None, "didn't answer when the window server was chosen", "running this again"},
    };
    for (const auto& each : cases)
        ExpectDead(ObstructedFacts(each.obstacle), each.because, each.remedy);
}

TEST(Doctor, TellsAMissingKeyFromAWrongOne) {
    DoctorFacts facts = ObstructedFacts(X11Obstacle::Refused);
    ExpectDead(facts, "your authority file has none for it", "setting XAUTHORITY");
    facts.x11.hasCookie = true;
    ExpectDead(facts, "refuses the key in your authority file", "setting XAUTHORITY");
}

TEST(Doctor, TellsTheSameOfADisplayThatWasAskedFor) {
    DoctorFacts facts = ObstructedFacts(X11Obstacle::NobodyThere);
    facts.environment.platform = "x11";
    facts.server.name = "x11";
    ExpectDead(facts, "no X server answers at display :7", "starting one");
    facts.x11 = GoodFacts().x11;
    ExpectDead(facts, "went away", "running this again");
}

TEST(Doctor, TellsAStalledWindowServerByItsName) {
    DoctorFacts facts = GoodFacts();
    facts.server.life = Life::Stalled;
    ExpectDead(facts, "stopped answering", "waiting until it is less busy");
}

// ---- Wayland

TEST(Doctor, KnowsAWaylandSessionByEitherVariable) {
    DoctorFacts facts = NoneFacts();
    facts.environment.waylandDisplay = "wayland-0";
    ExpectDead(facts, "this is a Wayland session (WAYLAND_DISPLAY is wayland-0)",
               "logging in to an X11 session");
    facts.environment.waylandDisplay.clear();
    facts.environment.sessionType = "wayland";
    ExpectDead(facts, "this is a Wayland session (XDG_SESSION_TYPE is wayland)",
               "logging in to an X11 session");
    facts.environment.sessionType = "x11";
    ExpectDead(facts, "DISPLAY is not set", "");
}

TEST(Doctor, OffersTheXServerOfAWaylandSessionOnlyWhereThereIsOne) {
    DoctorFacts facts = NoneFacts();
    facts.environment.waylandDisplay = "wayland-0";
    EXPECT_FALSE(Has(ObstacleOf(facts, "monitors").remedy, "SCREENSHARE_PLATFORM=x11"));
    facts.x11 = GoodFacts().x11;
    ExpectDead(facts, "Wayland session", "SCREENSHARE_PLATFORM=x11 if display :7 is a server of its own");
    facts.x11.isWaylandBridge = true;
    ExpectDead(facts, "Wayland session", "SCREENSHARE_PLATFORM=x11 to share the windows of X programs only");
}

TEST(Doctor, KnowsAWaylandSessionByTheNamesOfMonitors) {
    DoctorFacts facts = NoneFacts();
    facts.x11 = GoodFacts().x11;
    facts.x11.isWaylandBridge = true;
    ExpectDead(facts, "the monitors of display :7 are named XWAYLAND", "X programs only");
}

TEST(Doctor, WarnsOfAnXServerThatIsUsedInAWaylandSession) {
    DoctorFacts facts = GoodFacts();
    facts.environment.platform = "x11";
    facts.environment.sessionType = "wayland";
    ExpectHint(facts, "Windows of Wayland programs are not shown", "XDG_SESSION_TYPE is wayland",
               "X11 session");
}

// ---- Hints

TEST(Doctor, SaysThatASimulatedDesktopIsInvented) {
    DoctorFacts facts = GoodFacts();
    facts.server.name = "simulated";
    facts.environment.platform = "simulated";
    facts.x11 = NoneFacts().x11;
    ExpectHint(facts, "invented desktop", "asks for simulated", "unsetting it");
}

TEST(Doctor, HintsAtWhatEachExtensionIsMissedFor) {
    DoctorFacts facts = GoodFacts();
    facts.x11.shm = {true, 1, 1, false};
    ExpectHint(facts, "Pictures come slowly", "MIT-SHM extension is 1.1, and 1.2 is needed",
               "newer X server");
    facts = GoodFacts();
    facts.x11.randr = {};
    ExpectHint(facts, "All monitors count as one", "no RandR", "+extension RANDR");
    facts = GoodFacts();
    facts.x11.shape = {};
    ExpectHint(facts, "count as rectangles", "no Shape", "installing another X server");
    facts = GoodFacts();
    facts.x11.xres = {};
    ExpectHint(facts, "keeping its application out doesn't keep it out", "no X-Resource",
               "+extension X-Resource");
    facts = GoodFacts();
    facts.x11.xinput = {true, 2, 0, false};
    ExpectHint(facts, "asked for the pointer with every frame", "XInput extension is 2.0, and 2.2 is needed",
               "newer X server");
}

TEST(Doctor, HintsAtANetworkAndNotAtMemoryThatItCannotShare) {
    DoctorFacts facts = GoodFacts();
    facts.x11.overNetwork = true;
    facts.x11.shm = {};
    ExpectHint(facts, "Pictures come slowly", "over the network", "where the display is");
}

TEST(Doctor, TellsThatADebugFileIsRefused) {
    DoctorFacts facts = GoodFacts();
    facts.environment.debugFile = DebugFileState::Refused;
    ExpectHint(facts, "/tmp/screen_share is not read", "others may have written it", "chmod go-w");
    facts.environment.debugFolder = "/folder";
    ExpectHint(facts, "/folder is not read", "others may have written it", "chmod go-w");
}

// ---- Output

TEST(DoctorText, BeginsWithTheWindowServerAndEndsWithTheVerdict) {
    const DoctorFacts facts = GoodFacts();
    const std::string text = DoctorText(facts, Diagnose(facts));
    EXPECT_EQ(
        text.rfind("Window server: X11, display :7 (A Vendor 21)\n  Chosen because display :7 answers", 0),
        0U);
    EXPECT_TRUE(Has(text, "\n\nVerdict: all that sharing monitors and windows needs is there.\n"));
    EXPECT_TRUE(Has(text, "  Monitors        DP-1 1280x720+0+0\n"));
    EXPECT_TRUE(Has(text, "  Window manager  Manager\n"));
    EXPECT_TRUE(Has(text, "  Compositor      none\n"));
    EXPECT_TRUE(Has(text, "Composite 0.4, Damage 1.1, XFixes 6.0, MIT-SHM 1.2,"));
    EXPECT_TRUE(Has(text, "  5        0,0       1280x720  1      Screen of mine\n"));
    EXPECT_TRUE(Has(text, "  Windows: 12 (9 on the screen). Applications: 4.\n"));
    EXPECT_FALSE(Has(text, "Good to know"));
    EXPECT_FALSE(Has(text, "because the"));
}

TEST(DoctorText, NamesWhatHasNoName) {
    DoctorFacts facts = GoodFacts();
    facts.x11.hasCompositor = true;
    facts.x11.xres = {true, 1, 0, false};
    const std::string text = DoctorText(facts, Diagnose(facts));
    EXPECT_TRUE(Has(text, "  Compositor      one without a name\n"));
    EXPECT_TRUE(Has(text, "X-Resource 1.0 (too old), XInput 2.2\n"));
}

TEST(DoctorText, GivesAReasonUnderItsNoAndOnlyOnce) {
    const DoctorFacts facts = ObstructedFacts(X11Obstacle::NobodyThere);
    const std::string text = DoctorText(facts, Diagnose(facts));
    const std::string reason = "\n      because no X server answers at display :7; mend it by setting";
    const std::size_t first = text.find(reason);
    ASSERT_NE(first, std::string::npos) << text;
    EXPECT_EQ(text.find(reason, first + 1), std::string::npos) << text;
    EXPECT_EQ(text.rfind("  Monitors ", first), text.rfind('\n', first - 1) + 1);
    EXPECT_TRUE(Has(text, "no, likewise"));
    EXPECT_TRUE(Has(text, "X display :7, not in use\n  It cannot be looked at: no X server"));
    EXPECT_TRUE(Has(text, "is missing: Monitors, List of windows, Pictures of windows.\n"));
}

TEST(DoctorText, KeepsLinesShortEnoughForATerminal) {
    DoctorFacts facts = ObstructedFacts(X11Obstacle::None);
    facts.environment.waylandDisplay = "wayland-0";
    const std::string text = DoctorText(facts, Diagnose(facts));
    for (std::size_t begin = 0; begin < text.size();) {
        const std::size_t end = text.find('\n', begin);
        EXPECT_LE(end - begin, 100U) << text.substr(begin, end - begin);
        begin = end + 1;
    }
}

TEST(DoctorText, SaysWhatStandsInForAVariable) {
    const DoctorFacts facts = NoneFacts();
    const std::string text = DoctorText(facts, Diagnose(facts));
    EXPECT_TRUE(Has(text, "SCREENSHARE_PLATFORM   not set, which means auto\n"));
    EXPECT_TRUE(Has(text, "SCREENSHARE_DEBUG_DIR  not set, which means /tmp/screen_share\n"));
    EXPECT_FALSE(Has(text, "X display"));
    EXPECT_FALSE(Has(text, "\nDesktop\n"));
}

TEST(DoctorJson, TellsAbilitiesWithTheirRemedies) {
    DoctorFacts facts = GoodFacts();
    facts.x11.xfixes = {};
    facts.x11.windowManager = "\"Quoted\"";
    const std::string text = DoctorJson(facts, Diagnose(facts));
    EXPECT_EQ(text.rfind("{\"can_share\": false, \"window_server\": {\"name\": \"x11\"", 0), 0U);
    EXPECT_TRUE(Has(text, R"("ability": "pointer_image", "works": false, "needed": false)"));
    EXPECT_TRUE(Has(text, R"("because": "the X server has no XFixes extension", "remedy": "starting)"));
    EXPECT_TRUE(Has(text, R"("window_manager": "\"Quoted\"", "compositor": null)"));
    EXPECT_TRUE(
        Has(text, R"({"name": "XFixes", "present": false, "major": 0, "minor": 0, "suffices": false})"));
}

} // namespace

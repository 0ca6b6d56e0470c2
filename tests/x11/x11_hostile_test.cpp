// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/x11/x11_fixture.h"

#include <cstring>
#include <iostream>
#include <random>
#include <set>

/// Applications that say and do what no honest one would. Nothing may end by it, and what is listed stays
/// lawful.

namespace {

using namespace platform;
using namespace std::string_literals;
using Manager = X11DeskOptions::Manager;

class X11Hostile : public X11Test {
protected:
    void ExpectLawful(const std::string& after) {
        Desk().Settle();
        ASSERT_TRUE(ComesTrue([this] { return Server().GetLife().life == Life::Alive; })) << after;
        EXPECT_TRUE(IsLawful(*Server().GetWindows())) << after;
        EXPECT_TRUE(IsLawful(*Server().GetDisplays())) << after;
        const auto windows = Server().GetWindows();
        for (const WindowInfo& window : windows->Windows()) {
            EXPECT_LT(std::abs(window.frame.origin.x), 1e6F) << after;
            EXPECT_GE(window.frame.size.width, 0) << after;
            EXPECT_LT(window.frame.size.width, 1e6F) << after;
        }
    }

    /// That honest windows are listed and shown as ever.
    void ExpectServiceAsUsual() {
        const CGWindowID window = Add("honest", "20 20 60 40 00ff00");
        EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
        EXPECT_TRUE(Application().Tell("destroy honest"));
    }
};

std::string Repeated(const std::string& text, int times) {
    std::string all;
    for (int i = 0; i < times; ++i)
        all += text;
    return all;
}

const std::vector<std::string> PROPERTIES{"_NET_WM_PID",
                                          "_NET_WM_NAME",
                                          "WM_NAME",
                                          "WM_CLASS",
                                          "_NET_WM_STATE",
                                          "_NET_WM_DESKTOP",
                                          "_NET_WM_WINDOW_TYPE",
                                          "_NET_WM_WINDOW_OPACITY",
                                          "_NET_WM_STRUT",
                                          "_NET_FRAME_EXTENTS",
                                          "_NET_WM_STRUT_PARTIAL",
                                          "_GTK_FRAME_EXTENTS",
                                          "WM_CLIENT_MACHINE",
                                          "WM_STATE",
                                          "WM_TRANSIENT_FOR",
                                          "WM_HINTS"};

} // namespace

TEST_F(X11Hostile, PropertiesOfAnyTypeAndLengthEndNothing) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "100 100 50 50 00ff00");
    const std::string huge = Repeated("\xFF\xFE\x00\x80"s, 16000);
    for (const std::string& property : PROPERTIES) {
        for (const int format : {8, 16, 32}) {
            for (const std::string& bytes :
                 {std::string(), "\xFF\xFF\xFF\xFF"s, "\x00\x00\x00\x80"s, Repeated("\xFF\xFF\xFF\x7F"s, 12),
                  Repeated("\x00\x00\x00\x80"s, 12), Repeated("\x01\x00\x00\x00"s, 4), huge}) {
                for (const std::string type : {"CARDINAL", "ATOM", "UTF8_STRING", "WINDOW"})
                    ASSERT_TRUE(Application().SetProperty("window", property, type, format, bytes));
            }
        }
        ExpectLawful(property);
        ASSERT_NE(Server().GetWindows()->Find(window), nullptr) << property;
    }
    EXPECT_NE(TakeOne(window), nullptr);
    ExpectServiceAsUsual();
}

TEST_F(X11Hostile, PropertiesOfAnyTypeOnTheRootEndNothing) {
    if (!Begin())
        return;
    const XLink link(Desk().Rig().Display());
    for (const std::string property :
         {"_NET_CURRENT_DESKTOP", "_NET_CLIENT_LIST", "_NET_CLIENT_LIST_STACKING", "_NET_ACTIVE_WINDOW",
          "_XROOTPMAP_ID", "ESETROOT_PMAP_ID", "_NET_WORKAREA", "_NET_SUPPORTING_WM_CHECK",
          "_NET_NUMBER_OF_DESKTOPS"}) {
        for (const std::string type : {"CARDINAL", "WINDOW", "PIXMAP", "STRING"}) {
            for (const std::uint32_t value : {0U, 1U, 0x80000000U, 0xFFFFFFFFU, link.Root()}) {
                const std::vector<std::uint32_t> values(2000, value);
                xcb_change_property(link.Get(), XCB_PROP_MODE_REPLACE, link.Root(), link.Atom(property),
                                    link.Atom(type), 32, static_cast<std::uint32_t>(values.size()),
                                    values.data());
            }
            link.RoundTrip();
            ExpectLawful(property);
        }
        xcb_delete_property(link.Get(), link.Root(), link.Atom(property));
        link.RoundTrip();
    }
    ExpectServiceAsUsual();
}

TEST_F(X11Hostile, StrutsBeyondTheScreenLeaveDisplaysLawful) {
    if (!Begin({{.width = 640, .height = 480}, Manager::Openbox}))
        return;
    Add("dock", "0 0 640 10 808080 type=DOCK");
    std::mt19937 random(20250611);
    for (int i = 0; i < 50 * TestEffort(); ++i) {
        std::vector<std::uint32_t> words(12);
        for (std::uint32_t& word : words)
            word = random() % 3 == 0 ? static_cast<std::uint32_t>(random())
                                     : static_cast<std::uint32_t>(random() % 1000);
        ASSERT_TRUE(Application().SetWords("dock", "_NET_WM_STRUT_PARTIAL", "CARDINAL", words));
        if (i % 10 == 0)
            ExpectLawful("strut " + std::to_string(i));
    }
    ExpectLawful("struts");
    ExpectServiceAsUsual();
}

TEST_F(X11Hostile, ThousandsOfWindowsThatComeAndGoEndNothing) {
    if (!Begin())
        return;
    const int count = 2000 * TestEffort();
    ASSERT_TRUE(Application().Tell("churn " + std::to_string(std::min(count, 20000))));
    ExpectLawful("churn");
    for (int i = 0; i < 300; ++i)
        ASSERT_TRUE(Application().Create("many" + std::to_string(i), "0 0 20 20 00ff00 override"));
    ExpectLawful("many");
    const auto windows = Server().GetWindows();
    EXPECT_GE(windows->Windows().size(), 300u);
    std::vector<CGWindowID> all;
    for (const WindowInfo& window : windows->Windows())
        all.push_back(window.id);
    EXPECT_TRUE(ComesTrue([&] {
        const WindowPictureResult result = Take(all);
        return result.picture != nullptr && result.picture->layers.size() >= 300;
    })) << "not all have their picture";
    ExpectServiceAsUsual();
    std::cout << "windows: " << count << " one by one, 300 at once; no seed\n";
}

TEST_F(X11Hostile, WindowsOfAnySizeEndNothing) {
    if (!Begin())
        return;
    const std::vector<std::string> places{"-32768 -32768 1 1", "32767 32767 1 1", "0 0 30000 1",
                                          "0 0 1 30000",       "0 0 32767 2",     "-30000 -30000 30000 10",
                                          "100 100 65535 1",   "5 5 4000 4000"};
    for (const std::string& place : places) {
        const auto id = Application().Create("w", place + " 00ff00");
        if (!id)
            continue; // the server has refused it
        ExpectLawful(place);
        const WindowPictureResult result = Take({*id});
        EXPECT_TRUE(result.outcome == PictureOutcome::Ok || result.outcome == PictureOutcome::Failed ||
                    result.outcome == PictureOutcome::Gone)
            << place;
        if (result.picture != nullptr) {
            for (const PictureLayer& layer : result.picture->layers)
                EXPECT_TRUE(IsLawful(*layer.picture)) << place;
        }
        EXPECT_TRUE(Application().Tell("destroy w"));
    }
    ExpectServiceAsUsual();
}

TEST_F(X11Hostile, ANameThatIsUsedAgainIsAnotherWindowHoweverOften) {
    if (!Begin())
        return;
    const CGWindowID first = Add("w", "100 100 50 50 00ff00");
    char name[16];
    std::snprintf(name, sizeof(name), "%x", first);
    std::set<CGWindowID> ids{first};
    for (int i = 0; i < 20; ++i) {
        ASSERT_TRUE(Application().Tell("destroy w"));
        const CGRect frame{{100, 100}, {static_cast<float>(60 + i), 50}};
        ASSERT_TRUE(Application().Create("w", "100 100 " + std::to_string(60 + i) + " 50 00ff00 id=" + name));
        ExpectLawful("use " + std::to_string(i));
        const auto windows = Server().GetWindows();
        for (const WindowInfo& window : windows->Windows()) {
            if (window.frame == frame) {
                EXPECT_TRUE(ids.insert(window.id).second) << "an id means another window now";
            }
        }
        EXPECT_TRUE(Server().GetWindows()->Find(first) == nullptr) << "use " << i;
        EXPECT_NE(Take({first}).outcome, PictureOutcome::Ok) << "the picture of another window";
    }
    EXPECT_EQ(ids.size(), 21u) << "each of them is listed";
    ExpectServiceAsUsual();
}

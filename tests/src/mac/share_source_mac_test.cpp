// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_source_mac.h"

#include "src/share_ref.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

namespace {

using Lines = std::vector<std::string>;

constexpr pid_t kEditor = 100;
constexpr unsigned kDisplay = 5;

ShareRef<IShareSource> SourceOf(ShareSourceType type, unsigned long id, const char* name = nullptr) {
    ShareSourceInfo info;
    info.sourceId = id;
    info.eType = type;
    if (name != nullptr)
        info.SetSourceName(name, static_cast<int>(std::string(name).size()));
    ShareRef<IShareSource> source(new CShareSourceMac);
    source.Get()->SetInfo(&info);
    return source;
}

std::string NameOf(const ShareRef<IShareSource>& source) {
    char name[SHARE_SOURCE_TEXT_SIZE + 1];
    return source.Get()->GetName(name, SHARE_SOURCE_TEXT_SIZE) == 0 ? name : "(none)";
}

class ShareSourceMac : public testing::Test {
protected:
    ShareSourceMac() {
        server->SetApplications({FakeApplication(kEditor, "Editor")});
        server->SetDisplays({FakeDisplay(kDisplay, {{0, 0}, {100, 50}}, 1.0F, "Panel")});
    }

    CFakeWindowServerScope server;
    const ShareRef<IShareSource> editor = SourceOf(SHARE_SOURCE_TYPE_APP, kEditor);
    const ShareRef<IShareSource> panel = SourceOf(SHARE_SOURCE_TYPE_MONITOR, kDisplay);
};

TEST_F(ShareSourceMac, RefusesANameWithoutAPlaceForIt) {
    char out[4] = "abc";
    const CTraceLog trace;
    EXPECT_EQ(editor.Get()->GetName(nullptr, 10), -1);
    EXPECT_EQ(editor.Get()->GetName(out, 0), -1);
    EXPECT_EQ(editor.Get()->GetName(out, -1), -1);
    EXPECT_STREQ(out, "abc");
    const std::string line = DebugLine("[CShareSourceMac::GetName]>> invalid dest");
    EXPECT_EQ(trace.Lines(), (Lines{line, line, line}));
}

TEST_F(ShareSourceMac, HasNoNameForTheIdNought) {
    const auto source = SourceOf(SHARE_SOURCE_TYPE_MONITOR, 0, "given");
    char out[8] = "abc";
    const CTraceLog trace;
    EXPECT_EQ(source.Get()->GetName(out, 7), -1);
    EXPECT_STREQ(out, "abc");
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceMac::GetName]>> invalid source id")}));
}

TEST_F(ShareSourceMac, LooksTheNameOfAnApplicationUpOnce) {
    CTraceLog trace;
    EXPECT_EQ(NameOf(editor), "Editor");
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceUtilMac::GetApplicationName(]>> name=Editor"),
                                    DebugLine("[CShareSourceMac::GetName]>>  name=Editor")}));
    server->SetApplications({FakeApplication(kEditor, "Renamed")});
    trace.Clear();
    EXPECT_EQ(NameOf(editor), "Editor");
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceMac::GetName]>>  name=Editor")}));
}

TEST_F(ShareSourceMac, LooksTheNameOfAMonitorUpOnce) {
    CTraceLog trace;
    EXPECT_EQ(NameOf(panel), "Panel");
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceMac::GetName]>>  name=Panel")}));
    server->SetDisplays({});
    const int calls = server->calls.displays;
    EXPECT_EQ(NameOf(panel), "Panel");
    EXPECT_EQ(server->calls.displays, calls);
}

TEST_F(ShareSourceMac, ServesTheNameThatItWasGivenWithoutALookUp) {
    const auto source = SourceOf(SHARE_SOURCE_TYPE_MONITOR, kDisplay, "given");
    const int calls = server->calls.displays;
    EXPECT_EQ(NameOf(source), "given");
    EXPECT_EQ(server->calls.displays, calls);
}

TEST_F(ShareSourceMac, HasNoNameForAnApplicationThatIsGone) {
    const auto gone = SourceOf(SHARE_SOURCE_TYPE_APP, 999);
    char out[8] = "abc";
    const CTraceLog trace;
    EXPECT_EQ(gone.Get()->GetName(out, 7), -1);
    EXPECT_STREQ(out, "abc");
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceUtilMac::GetApplicationName(]>> fail"),
                                    InfoLine("[CShareSourceMac::GetName]>>  get name fail")}));
}

TEST_F(ShareSourceMac, HasNoNameForAMonitorThatIsGoneOrNameless) {
    const auto gone = SourceOf(SHARE_SOURCE_TYPE_MONITOR, 999);
    const CTraceLog trace;
    EXPECT_EQ(NameOf(gone), "(none)");
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceMac::GetName]>>  get name fail")}));
    server->SetDisplays({FakeDisplay(kDisplay, {}, 1.0F, "")});
    EXPECT_EQ(NameOf(panel), "(none)");
}

TEST_F(ShareSourceMac, HasNoNameForAnyOtherKind) {
    EXPECT_EQ(NameOf(SourceOf(static_cast<ShareSourceType>(3), kEditor)), "(none)");
    EXPECT_EQ(server->calls.applications, 0);
}

TEST_F(ShareSourceMac, LooksAgainAfterALookUpThatFailed) {
    server->SetLife(platform::Life::Lost);
    EXPECT_EQ(NameOf(editor), "(none)");
    EXPECT_EQ(NameOf(panel), "(none)");
    server->SetLife(platform::Life::Alive);
    EXPECT_EQ(NameOf(editor), "Editor");
    EXPECT_EQ(NameOf(panel), "Panel");
}

TEST_F(ShareSourceMac, EndsAShortNameTwiceAndTouchesNothingBehind) {
    char out[16];
    std::fill(std::begin(out), std::end(out), 'x');
    EXPECT_EQ(editor.Get()->GetName(out, 15), 0);
    EXPECT_EQ(std::string(out, 16), std::string("Editor\0\0xxxxxxxx", 16));
}

TEST_F(ShareSourceMac, EndsANameThatFillsTheLengthOneByteBehindIt) {
    char out[8];
    std::fill(std::begin(out), std::end(out), 'x');
    EXPECT_EQ(editor.Get()->GetName(out, 6), 0);
    EXPECT_EQ(std::string(out, 8), std::string("Editor\0x", 8));
}

TEST_F(ShareSourceMac, CutsANameAtTheLength) {
    char out[8];
    std::fill(std::begin(out), std::end(out), 'x');
    EXPECT_EQ(editor.Get()->GetName(out, 3), 0);
    EXPECT_EQ(std::string(out, 8), std::string("Edi\0xxxx", 8));
    EXPECT_EQ(editor.Get()->GetName(out, 1), 0);
    EXPECT_STREQ(out, "E");
}

TEST_F(ShareSourceMac, KeepsTwoHundredAndFiftyFiveBytesOfALongName) {
    const std::string name(300, 'n');
    server->SetApplications({FakeApplication(kEditor, name)});
    server->SetDisplays({FakeDisplay(kDisplay, {}, 1.0F, name)});
    char out[401];
    EXPECT_EQ(editor.Get()->GetName(out, 400), 0);
    EXPECT_EQ(std::string(out), name.substr(0, 255));
    EXPECT_EQ(panel.Get()->GetName(out, 400), 0);
    EXPECT_EQ(std::string(out), name.substr(0, 255));
}

TEST_F(ShareSourceMac, GivesTheEmptyNameOfAnApplicationAsAName) {
    server->SetApplications({FakeApplication(kEditor, "")});
    EXPECT_EQ(NameOf(editor), "");
}

TEST_F(ShareSourceMac, StillGivesNoDeviceNameOrId) {
    char out[8] = "abc";
    EXPECT_EQ(panel.Get()->GetDeviceName(out, 7), -1);
    EXPECT_EQ(panel.Get()->GetDeviceId(out, 7), -1);
    EXPECT_STREQ(out, "abc");
}

TEST_F(ShareSourceMac, GivesOneNameToAllThreadsThatAskFirst) {
    constexpr int threads = 4;
    std::vector<std::string> names(threads);
    {
        // Each has found a name of its own before any of them keeps one.
        CTraceStop found("GetApplicationName(]>> name=");
        std::vector<std::unique_ptr<CCallOnThread>> asking;
        for (int i = 0; i < threads; ++i) {
            server->SetApplications({FakeApplication(kEditor, "Name " + std::to_string(i))});
            std::string& name = names[static_cast<std::size_t>(i)];
            asking.push_back(std::make_unique<CCallOnThread>([this, &name] { name = NameOf(editor); }));
            ASSERT_TRUE(found.Holds(i + 1));
        }
        found.Open();
    }
    EXPECT_EQ(names, std::vector<std::string>(threads, NameOf(editor)));
    EXPECT_EQ(names[0].substr(0, 5), "Name ");
}

// ---- The names of applications

TEST_F(ShareSourceMac, GivesTheNameOfARunningApplication) {
    char out[8];
    std::fill(std::begin(out), std::end(out), 'x');
    const CTraceLog trace;
    EXPECT_TRUE(CShareSourceUtilMac::GetApplicationName(kEditor, out, 4));
    EXPECT_EQ(std::string(out, 8), std::string("Edit\0xxx", 8));
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceUtilMac::GetApplicationName(]>> name=Edit")}));
}

TEST_F(ShareSourceMac, GivesNoNameOfAProcessThatIsNoApplication) {
    char out[8] = "abc";
    const CTraceLog trace;
    EXPECT_FALSE(CShareSourceUtilMac::GetApplicationName(999, out, 7));
    EXPECT_STREQ(out, "abc");
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceUtilMac::GetApplicationName(]>> fail")}));
}

TEST_F(ShareSourceMac, GivesNoNameOfAnApplicationWithoutAPlaceForIt) {
    char out[8] = "abc";
    EXPECT_FALSE(CShareSourceUtilMac::GetApplicationName(kEditor, nullptr, 7));
    EXPECT_FALSE(CShareSourceUtilMac::GetApplicationName(kEditor, out, -1));
    EXPECT_STREQ(out, "abc");
}

} // namespace

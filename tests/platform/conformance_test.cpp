// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/conformance_fixture.h"

#include <algorithm>
#include <iostream>

/// The contract of displays, windows, pointer, cursor and applications. Pictures, streams and life have files
/// of their own.

namespace {

using namespace platform;

class DesktopContract : public WindowServerContract {
protected:
    /// Whether what `change` does makes the generation grow, and no other stack bears the old one. What the
    /// desktop can't have done to it is left out.
    testing::AssertionResult Grows(const char* what, const std::function<bool()>& change) {
        const auto before = Server().GetWindows();
        if (!change()) {
            std::cout << "left out: " << what << "\n";
            return m_desk->CanDoAll() ? testing::AssertionFailure() << "can't " << what
                                      : testing::AssertionSuccess();
        }
        if (!Eventually([&] { return Server().GetWindows()->Generation() > before->Generation(); }))
            return testing::AssertionFailure() << "the generation hasn't grown: " << what;
        m_desk->Settle();
        const auto after = Server().GetWindows();
        if (SameStack(*before, *after))
            return testing::AssertionFailure() << "the same stack as before: " << what;
        return IsLawful(*after);
    }
};

const CGRect FRAME{{20, 20}, {60, 40}};

} // namespace

FOR_EACH_WINDOW_SERVER(DesktopContract);

// ---- Displays

TEST_P(DesktopContract, IsCalledByTheWordThatAsksForIt) {
    EXPECT_EQ(std::string(Server().Name()), GetParam().word);
}

TEST_P(DesktopContract, ListsLawfulDisplays) {
    ASSERT_NE(Server().GetDisplays(), nullptr);
    EXPECT_TRUE(IsLawful(*Server().GetDisplays()));
    if (Server().GetLife().life == Life::Alive) {
        EXPECT_FALSE(Server().GetDisplays()->empty());
    }
}

TEST_P(DesktopContract, TellsOfADisplayThatComes) {
    Server().SetNoticeReceiver(m_log);
    const auto before = Server().GetDisplays();
    const DisplayList asItWas = *before;
    const auto added = m_desk->AddDisplay({160, 100});
    NEEDS(added);
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*added, DisplayAdded)));
    ASSERT_TRUE(ListedDisplay(*added));
    EXPECT_EQ(ListedDisplay(*added)->bounds.size, (CGSize{160, 100}));
    EXPECT_TRUE(IsLawful(*Server().GetDisplays()));
    EXPECT_EQ(before->size(), asItWas.size()) << "a list that was given out has changed";
    EXPECT_EQ(m_log->Count([](const Notice& each) {
        return each.kind == NoticeKind::DisplayChanged && (each.flags & DisplayBeginConfiguration) != 0;
    }),
              0u);
}

TEST_P(DesktopContract, KeepsTheIdOfADisplayThatIsPluggedInAgain) {
    Server().SetNoticeReceiver(m_log);
    const CGDirectDisplayID main = MainDisplay();
    const auto added = m_desk->AddDisplay({160, 100});
    NEEDS(added);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*added).has_value(); }));
    NEEDS(m_desk->Unplug(*added));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*added, DisplayRemoved)));
    EXPECT_FALSE(ListedDisplay(*added));
    EXPECT_EQ(MainDisplay(), main);
    m_log->Clear();
    NEEDS(m_desk->PlugInAgain(*added));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*added, DisplayAdded)));
    EXPECT_TRUE(ListedDisplay(*added));
}

TEST_P(DesktopContract, TellsOfADisplayThatChangesItsSize) {
    const auto added = m_desk->AddDisplay({160, 100});
    NEEDS(added);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*added).has_value(); }));
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->Resize(*added, {180, 110}));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*added, DisplaySetMode | DisplayDesktopShapeChanged)));
    EXPECT_EQ(ListedDisplay(*added)->bounds.size, (CGSize{180, 110}));
}

TEST_P(DesktopContract, MakesAnotherMainDisplayTheOriginAndTellsSo) {
    const CGDirectDisplayID first = MainDisplay();
    const auto second = m_desk->AddDisplay({160, 100});
    NEEDS(second);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*second).has_value(); }));
    const CGPoint place = ListedDisplay(*second)->bounds.origin;
    Server().SetNoticeReceiver(m_log);
    NEEDS(m_desk->MakeMain(*second));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfDisplay(*second, DisplaySetMain)));
    EXPECT_EQ(MainDisplay(), *second);
    EXPECT_TRUE(IsLawful(*Server().GetDisplays()));
    EXPECT_EQ(ListedDisplay(first)->bounds.origin, (CGPoint{-place.x, -place.y}));
}

TEST_P(DesktopContract, TakesReservedEdgesFromWhatIsVisible) {
    m_desk->Settle();
    const CGDirectDisplayID main = MainDisplay();
    const auto before = ListedDisplay(main);
    NEEDS(m_desk->ReserveTop(main, 10));
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(main)->visibleBounds.origin.y == 10; }));
    const DisplayInfo display = *ListedDisplay(main);
    EXPECT_EQ(display.bounds, before->bounds);
    // A desktop may have a panel of its own at another edge.
    EXPECT_EQ(display.visibleBounds.size.height, before->visibleBounds.size.height - 10);
    EXPECT_EQ(display.visibleBounds.size.width, before->visibleBounds.size.width);
}

// ---- Windows

TEST_P(DesktopContract, HasAGenerationAboveZeroWhileItIsAlive) {
    ASSERT_NE(Server().GetWindows(), nullptr);
    EXPECT_TRUE(IsLawful(*Server().GetWindows()));
    if (Server().GetLife().life == Life::Alive) {
        EXPECT_GT(Server().GetWindows()->Generation(), 0u);
    }
}

TEST_P(DesktopContract, ListsAWindowAsItIs) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    ASSERT_TRUE(Eventually([&] { return Listed(*window).frame == FRAME; }));
    const WindowInfo info = Listed(*window);
    EXPECT_EQ(info.owner, *Application());
    EXPECT_EQ(info.level, 0);
    EXPECT_EQ(info.alpha, 1.0F);
    EXPECT_NE(info.sharing, SharingState::None);
    EXPECT_TRUE(info.onScreen);
}

TEST_P(DesktopContract, ListsTheFrontWindowFirst) {
    const auto first = AddWindow(FRAME, 0x00FF00);
    NEEDS(first);
    const auto second = AddWindow(FRAME, 0x0000FF);
    NEEDS(second);
    const auto inFront = [this](CGWindowID one, CGWindowID other) {
        const auto snapshot = Server().GetWindows();
        const WindowInfo* const a = snapshot->Find(one);
        const WindowInfo* const b = snapshot->Find(other);
        return a != nullptr && b != nullptr && a < b;
    };
    EXPECT_TRUE(Eventually([&] { return inFront(*second, *first); }));
    NEEDS(m_desk->Raise(*first));
    EXPECT_TRUE(Eventually([&] { return inFront(*first, *second); }));
    NEEDS(m_desk->Float(*second));
    EXPECT_TRUE(Eventually([&] { return inFront(*second, *first) && Listed(*second).level > 0; }));
    NEEDS(m_desk->Raise(*first));
    m_desk->Settle();
    EXPECT_TRUE(inFront(*second, *first)) << "a normal window has come before one of a higher level";
}

TEST_P(DesktopContract, GrowsItsGenerationWithEachChangeOfTheStack) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const auto other = AddWindow(FRAME, 0x0000FF);
    NEEDS(other);
    const auto pid = m_desk->StartApplication("Other");
    NEEDS(pid);
    m_desk->Settle();
    const auto add = [&] { return m_desk->AddWindow(*pid, FRAME, 0x808080).has_value(); };
    EXPECT_TRUE(Grows("map a new one", add));
    EXPECT_TRUE(Grows("move", [&] { return m_desk->SetFrame(*window, {{30, 20}, {60, 40}}); }));
    EXPECT_TRUE(Grows("resize", [&] { return m_desk->SetFrame(*window, {{30, 20}, {70, 50}}); }));
    EXPECT_TRUE(Grows("raise", [&] { return m_desk->Raise(*window); }));
    EXPECT_TRUE(Grows("minimise", [&] { return m_desk->Minimise(*window); }));
    EXPECT_TRUE(Grows("restore", [&] { return m_desk->Restore(*window); }));
    EXPECT_TRUE(Grows("fade", [&] { return m_desk->SetAlpha(*window, 0.5F); }));
    EXPECT_TRUE(Grows("float", [&] { return m_desk->Float(*window); }));
    EXPECT_TRUE(Grows("give away", [&] { return m_desk->SetOwner(*window, *pid); }));
    EXPECT_TRUE(Grows("unshare", [&] { return m_desk->Unshare(*window); }));
    EXPECT_TRUE(Grows("close", [&] { return m_desk->Close(*window); }));
    EXPECT_TRUE(Grows("end the owner", [&] { return m_desk->EndApplication(*pid); }));
}

TEST_P(DesktopContract, GivesEqualStacksToEqualGenerations) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    m_desk->Settle();
    const auto before = Server().GetWindows();
    NEEDS(m_desk->SetTitle(*window, "Another"));
    ASSERT_TRUE(Eventually([&] { return Listed(*window).title == "Another"; }));
    NEEDS(m_desk->Recolour(*window, 0x0000FF));
    m_desk->Settle();
    const auto after = Server().GetWindows();
    if (before->Generation() == after->Generation()) {
        EXPECT_TRUE(SameStack(*before, *after));
    }
    EXPECT_NE(before->Find(*window)->title, "Another") << "a snapshot that was given out has changed";
}

TEST_P(DesktopContract, NeverGivesAWindowsIdToAnotherOne) {
    const auto first = AddWindow(FRAME, 0x00FF00);
    NEEDS(first);
    const auto kept = Server().GetWindows();
    NEEDS(m_desk->Close(*first));
    ASSERT_TRUE(Eventually([&] { return Server().GetWindows()->Find(*first) == nullptr; }));
    EXPECT_NE(kept->Find(*first), nullptr) << "a snapshot that was given out has changed";
    for (int i = 0; i < 20; ++i) {
        const auto next = AddWindow(FRAME, 0x00FF00);
        NEEDS(next);
        EXPECT_NE(*next, *first);
    }
}

TEST_P(DesktopContract, PassesNoTextOnThatIsNoUtf8) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    const std::string good = "gr\xC3\xBC\xC3\x9F \xE2\x82\xAC \xF0\x9F\x90\x9F";
    NEEDS(m_desk->SetTitle(*window, good));
    EXPECT_TRUE(Eventually([&] { return Listed(*window).title == good; }));
    for (const std::string bad : {"a\xFFz", "a\xC3", "a\xC0\x80z", "a\xED\xA0\x80z", "a\xF5\x80\x80\x80z",
                                  "a\xE0\x80\xAFz", "a\xF4\x90\x80\x80z", "a\x80z"}) {
        NEEDS(m_desk->SetTitle(*window, bad));
        EXPECT_TRUE(Eventually([&] {
            const std::string title = Listed(*window).title;
            return title != good && title.find(bad) == std::string::npos && title.rfind('a', 0) == 0;
        })) << testing::PrintToString(bad);
    }
}

TEST_P(DesktopContract, GivesNoSnapshotBeforeAWindowsOwnerIsKnown) {
    const auto known = AddWindow(FRAME, 0x00FF00);
    NEEDS(known);
    m_desk->Settle();
    const std::uint64_t before = Server().GetWindows()->Generation();
    const auto window = m_desk->AddUnknownWindow(FRAME);
    NEEDS(window);
    m_desk->Settle();
    const auto meanwhile = Server().GetWindows();
    EXPECT_EQ(meanwhile->Generation(), before);
    EXPECT_EQ(meanwhile->Find(*window), nullptr);
    const auto picture = Server().TakeWindowPicture(RequestFor({*known})).picture;
    if (picture != nullptr) {
        EXPECT_GT(picture->generation, before) << "the stack has another window and bears the old number";
    }
    NEEDS(m_desk->TellOwner(*window, *Application()));
    ASSERT_TRUE(Eventually([&] { return Server().GetWindows()->Find(*window) != nullptr; }));
    EXPECT_EQ(Listed(*window).owner, *Application());
    EXPECT_GT(Server().GetWindows()->Generation(), before);
}

// ---- Pointer and cursor

TEST_P(DesktopContract, KnowsWhereThePointerIs) {
    for (const CGPoint place : {CGPoint{11, 13}, CGPoint{60, 70}}) {
        NEEDS(m_desk->MovePointer(place));
        EXPECT_TRUE(Eventually([&] {
            CGPoint position;
            return Server().GetPointerPosition(position) && position == place;
        }));
    }
}

TEST_P(DesktopContract, GivesTheCursorAnotherSerialWithAnotherImage) {
    NEEDS(m_desk->ChangeCursor());
    ASSERT_TRUE(Eventually([&] { return Server().GetCursor() != nullptr; }));
    m_desk->Settle();
    const auto before = Server().GetCursor();
    ASSERT_FALSE(before->representations.empty());
    for (const PicturePtr& picture : before->representations) {
        ASSERT_NE(picture, nullptr);
        EXPECT_TRUE(IsLawful(*picture));
        EXPECT_TRUE(picture->format == PixelFormat::BGRA || picture->format == PixelFormat::RGBA);
    }
    EXPECT_EQ(Server().GetCursor(), before);
    const std::vector<std::uint32_t> pixels = PixelsOf(*before->representations[0]);
    NEEDS(m_desk->ChangeCursor());
    EXPECT_TRUE(Eventually([&] { return Server().GetCursor()->serial != before->serial; }));
    EXPECT_NE(PixelsOf(*Server().GetCursor()->representations[0]), pixels);
    EXPECT_EQ(PixelsOf(*before->representations[0]), pixels) << "an image that was given out has changed";
}

// ---- Applications

TEST_P(DesktopContract, TellsOfAnApplicationThatStartsAndOnceThatItEnded) {
    Server().SetNoticeReceiver(m_log);
    const auto pid = m_desk->StartApplication("Guest");
    NEEDS(pid);
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfApplication(NoticeKind::ApplicationLaunched, *pid)));
    const auto listed = [&] {
        const auto applications = Server().GetApplications();
        return std::any_of(applications->begin(), applications->end(), [&](const ApplicationInfo& each) {
            return each.pid == *pid && !each.name.empty();
        });
    };
    EXPECT_TRUE(listed());
    const auto ended = CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *pid);
    const auto window = m_desk->AddWindow(*pid, FRAME, 0x00FF00);
    NEEDS(window);
    NEEDS(m_desk->Close(*window));
    m_desk->Settle();
    EXPECT_EQ(m_log->Count(ended), 0u) << "it has only closed its last window";
    NEEDS(m_desk->EndApplication(*pid));
    ASSERT_TRUE(m_log->WaitFor(ended));
    EXPECT_TRUE(Eventually([&] { return !listed(); }));
    const auto other = m_desk->StartApplication("Other");
    NEEDS(other);
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfApplication(NoticeKind::ApplicationLaunched, *other)));
    NEEDS(m_desk->EndApplication(*other));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, *other)));
    EXPECT_EQ(m_log->Count(ended), 1u);
}

TEST_P(DesktopContract, BringsAllWindowsOfAnApplicationToTheFrontInTheirOrder) {
    const auto back = AddWindow(FRAME, 0x00FF00);
    NEEDS(back);
    const auto front = AddWindow(FRAME, 0x0000FF);
    NEEDS(front);
    const auto pid = m_desk->StartApplication("Cover");
    NEEDS(pid);
    const auto cover = m_desk->AddWindow(*pid, FRAME, 0x808080);
    NEEDS(cover);
    ASSERT_TRUE(Eventually([&] { return Server().GetWindows()->Find(*cover) != nullptr; }));
    if (Server().GetCapability(Capability::Activation) != Availability::Yes)
        GTEST_SKIP() << "nothing can be brought to the front";
    ASSERT_TRUE(Server().BringToFront(*Application()));
    EXPECT_TRUE(Eventually([&] {
        const auto snapshot = Server().GetWindows();
        return snapshot->Find(*front) < snapshot->Find(*back) &&
               snapshot->Find(*back) < snapshot->Find(*cover);
    }));
    EXPECT_FALSE(Server().BringToFront(*pid + 1000000));
}

// ---- Permission

TEST_P(DesktopContract, GivesPicturesOnlyWithThePermissionThatTheyNeed) {
    const auto window = AddWindow(FRAME, 0x00FF00);
    NEEDS(window);
    NEEDS(m_desk->NeedPermission());
    Server().SetNoticeReceiver(m_log);
    EXPECT_EQ(Server().GetPermission(), Permission::NotAsked);
    EXPECT_EQ(Server().GetCapability(Capability::WindowImages), Availability::AfterPermission);
    EXPECT_EQ(Take(RequestFor({*window})).outcome, PictureOutcome::Refused);
    EXPECT_EQ(Server().OpenDisplayStream({.display = MainDisplay()}).outcome, PictureOutcome::Refused);
    Server().AskPermission();
    EXPECT_TRUE(Eventually([&] { return Server().GetPermission() == Permission::Asking; }));
    m_log->Clear();
    NEEDS(m_desk->Deny());
    EXPECT_TRUE(m_log->WaitFor(NoticeKind::PermissionChanged));
    EXPECT_EQ(Server().GetPermission(), Permission::Denied);
    EXPECT_EQ(Take(RequestFor({*window})).outcome, PictureOutcome::Refused);
    m_log->Clear();
    NEEDS(m_desk->Grant());
    EXPECT_TRUE(m_log->WaitFor(NoticeKind::PermissionChanged));
    EXPECT_EQ(Server().GetPermission(), Permission::Granted);
    EXPECT_EQ(Server().GetCapability(Capability::WindowImages), Availability::Yes);
    EXPECT_EQ(Take(RequestFor({*window})).outcome, PictureOutcome::Ok);
}

TEST_P(DesktopContract, AsksNobodyWhereNoPermissionIsNeeded) {
    if (Server().GetPermission() != Permission::NotNeeded)
        GTEST_SKIP() << "a permission is needed";
    Server().SetNoticeReceiver(m_log);
    Server().AskPermission();
    EXPECT_EQ(Server().GetPermission(), Permission::NotNeeded);
    EXPECT_EQ(m_log->Count(NoticeKind::PermissionChanged), 0u);
}

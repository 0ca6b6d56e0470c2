// SPDX-License-Identifier: Apache-2.0
#include "platform/none/none_window_server.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

namespace {

using namespace platform;

class CountingReceiver : public NoticeReceiver {
public:
    void OnNotice(const Notice&) override { ++notices; }

    int notices = 0;
};

class NoneWindowServers : public testing::Test {
protected:
    NoneWindowServer m_server;
};

} // namespace

TEST_F(NoneWindowServers, AreCalledNone) {
    EXPECT_EQ(std::string(m_server.Name()), "none");
}

TEST_F(NoneWindowServers, AreLostInTheirFirstEpoch) {
    EXPECT_EQ(m_server.GetLife().life, Life::Lost);
    EXPECT_EQ(m_server.GetLife().epoch, 0u);
}

TEST_F(NoneWindowServers, HaveNoCapability) {
    for (const Capability capability :
         {Capability::Windows, Capability::WindowImages, Capability::Streams, Capability::Pointer,
          Capability::Cursor, Capability::Applications, Capability::Activation}) {
        EXPECT_EQ(m_server.GetCapability(capability), Availability::No) << static_cast<int>(capability);
    }
}

TEST_F(NoneWindowServers, NeedNoPermissionAlsoAfterItWasAskedFor) {
    EXPECT_EQ(m_server.GetPermission(), Permission::NotNeeded);
    m_server.AskPermission();
    EXPECT_EQ(m_server.GetPermission(), Permission::NotNeeded);
}

TEST_F(NoneWindowServers, ShowNothing) {
    ASSERT_NE(m_server.GetDisplays(), nullptr);
    EXPECT_TRUE(m_server.GetDisplays()->empty());
    ASSERT_NE(m_server.GetWindows(), nullptr);
    EXPECT_TRUE(m_server.GetWindows()->Windows().empty());
    EXPECT_EQ(m_server.GetWindows()->Generation(), 0u);
    ASSERT_NE(m_server.GetApplications(), nullptr);
    EXPECT_TRUE(m_server.GetApplications()->empty());
}

TEST_F(NoneWindowServers, LeaveThePositionAloneThatTheyDoNotKnow) {
    CGPoint position{3, 4};
    EXPECT_FALSE(m_server.GetPointerPosition(position));
    EXPECT_EQ(position, (CGPoint{3, 4}));
}

TEST_F(NoneWindowServers, HaveNoCursor) {
    EXPECT_EQ(m_server.GetCursor(), nullptr);
}

TEST_F(NoneWindowServers, SupportNoPicture) {
    WindowPictureRequest request;
    request.windows = {1};
    for (const unsigned options : {WindowPictureDefault, WindowPictureBoundsIgnoreFraming}) {
        request.options = options;
        const WindowPictureResult result = m_server.TakeWindowPicture(request);
        EXPECT_EQ(result.outcome, PictureOutcome::Unsupported);
        EXPECT_EQ(result.picture, nullptr);
    }
}

TEST_F(NoneWindowServers, OpenNoStream) {
    for (const CGDirectDisplayID display : {0u, 1u}) {
        const DisplayStreamResult opened = m_server.OpenDisplayStream({.display = display});
        EXPECT_EQ(opened.outcome, PictureOutcome::Unsupported) << display;
        EXPECT_EQ(opened.stream, nullptr) << display;
    }
}

TEST_F(NoneWindowServers, BringNobodyToTheFront) {
    EXPECT_FALSE(m_server.BringToFront(1));
}

TEST_F(NoneWindowServers, NeitherKeepNorCallAReceiver) {
    const auto receiver = std::make_shared<CountingReceiver>();
    m_server.SetNoticeReceiver(receiver);
    EXPECT_EQ(receiver.use_count(), 1);
    m_server.AskPermission();
    m_server.BringToFront(1);
    m_server.SetNoticeReceiver(nullptr);
    EXPECT_EQ(receiver->notices, 0);
}

TEST_F(NoneWindowServers, GiveResultsThatOutliveThem) {
    auto server = std::make_unique<NoneWindowServer>();
    const auto displays = server->GetDisplays();
    const auto windows = server->GetWindows();
    const auto applications = server->GetApplications();
    const std::weak_ptr<const WindowSnapshot> watched = windows;
    server.reset();
    EXPECT_TRUE(displays->empty());
    EXPECT_EQ(windows->Find(1), nullptr);
    EXPECT_TRUE(applications->empty());
    EXPECT_FALSE(watched.expired());
}

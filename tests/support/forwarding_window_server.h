// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <utility>

/// A window server that passes everything on to another one. Tests derive from it to come between a server
/// and those who ask it. Make it with std::make_shared. Threads: any.
class CForwardingWindowServer : public platform::WindowServer,
                                public std::enable_shared_from_this<CForwardingWindowServer> {
public:
    explicit CForwardingWindowServer(std::shared_ptr<platform::WindowServer> server)
        : m_server(std::move(server)) {}

    const char* Name() const override { return m_server->Name(); }
    platform::LifeState GetLife() const override { return m_server->GetLife(); }
    platform::Availability GetCapability(platform::Capability capability) const override {
        return m_server->GetCapability(capability);
    }
    platform::Permission GetPermission() const override { return m_server->GetPermission(); }
    void AskPermission() override { m_server->AskPermission(); }
    void SetNoticeReceiver(std::shared_ptr<platform::NoticeReceiver> receiver) override {
        m_server->SetNoticeReceiver(std::move(receiver));
    }
    std::shared_ptr<const platform::DisplayList> GetDisplays() const override {
        return m_server->GetDisplays();
    }
    std::shared_ptr<const platform::WindowSnapshot> GetWindows() const override {
        return m_server->GetWindows();
    }
    std::shared_ptr<const platform::ApplicationList> GetApplications() const override {
        return m_server->GetApplications();
    }
    bool GetPointerPosition(platform::CGPoint& position) const override {
        return m_server->GetPointerPosition(position);
    }
    std::shared_ptr<const platform::CursorImage> GetCursor() const override { return m_server->GetCursor(); }
    platform::WindowPictureResult TakeWindowPicture(const platform::WindowPictureRequest& request) override {
        return m_server->TakeWindowPicture(request);
    }
    platform::DisplayStreamResult OpenDisplayStream(const platform::DisplayStreamRequest& request) override {
        platform::DisplayStreamResult result = m_server->OpenDisplayStream(request);
        if (result.stream != nullptr)
            result.stream = std::make_unique<Stream>(shared_from_this(), std::move(result.stream));
        return result;
    }
    void Rest() override { m_server->Rest(); }
    bool BringToFront(pid_t pid) override { return m_server->BringToFront(pid); }

protected:
    /// Each picture of a stream that was opened here.
    virtual platform::DisplayPictureResult TakeNewest(platform::DisplayStream& stream,
                                                      std::chrono::nanoseconds deadline) {
        return stream.TakeNewest(deadline);
    }

private:
    class Stream final : public platform::DisplayStream {
    public:
        Stream(std::shared_ptr<CForwardingWindowServer> server,
               std::unique_ptr<platform::DisplayStream> stream)
            : m_server(std::move(server)),
              m_stream(std::move(stream)) {}

        std::uint64_t Id() const override { return m_stream->Id(); }
        platform::DisplayPictureResult TakeNewest(std::chrono::nanoseconds deadline) override {
            return m_server->TakeNewest(*m_stream, deadline);
        }

    private:
        const std::shared_ptr<CForwardingWindowServer> m_server;
        const std::unique_ptr<platform::DisplayStream> m_stream;
    };

    const std::shared_ptr<platform::WindowServer> m_server;
};

/// Whoever compares stacks finds them all equal: every list and every picture of a display has the same
/// generation.
class COneStackWindowServer final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    std::shared_ptr<const platform::WindowSnapshot> GetWindows() const override {
        return std::make_shared<const platform::WindowSnapshot>(
            GENERATION, CForwardingWindowServer::GetWindows()->Windows());
    }

protected:
    platform::DisplayPictureResult TakeNewest(platform::DisplayStream& stream,
                                              std::chrono::nanoseconds deadline) override {
        platform::DisplayPictureResult result = CForwardingWindowServer::TakeNewest(stream, deadline);
        if (result.picture == nullptr)
            return result;
        auto picture = std::make_shared<platform::Picture>(*result.picture);
        picture->generationBefore = GENERATION;
        picture->generationAfter = GENERATION;
        result.picture = std::move(picture);
        return result;
    }

private:
    static constexpr std::uint64_t GENERATION = 1;
};

/// Has a window server be the one in force as long as this lives.
class CWindowServerScope {
public:
    explicit CWindowServerScope(std::shared_ptr<platform::WindowServer> server)
        : m_former(platform::ReplaceWindowServer(std::move(server))) {}
    ~CWindowServerScope() { platform::ReplaceWindowServer(m_former); }
    CWindowServerScope(const CWindowServerScope&) = delete;
    CWindowServerScope& operator=(const CWindowServerScope&) = delete;

private:
    const std::shared_ptr<platform::WindowServer> m_former;
};

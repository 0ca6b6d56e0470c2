// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_core.h"
#include "platform/one_per_process.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace platform {

namespace {

struct Registration {
    const void* observer = nullptr;
    AVCaptureNotificationName name{};
    std::shared_ptr<const CaptureSessionCore> object; // no session of later takes its place
    std::function<void(const AVCaptureNotification&)> selector;

    /// Held while the selector runs, so that a removal waits; from inside the call it doesn't.
    std::recursive_mutex callMutex;
    bool removed = false; // guarded by callMutex
};

using Registrations = std::vector<std::shared_ptr<Registration>>;

struct NotificationHub {
    std::mutex mutex;
    Registrations registrations; // guarded by mutex
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const NotificationHub& g_hub = OnePerProcess<NotificationHub>::Get();

Registrations Find(const CaptureSessionCore* core, AVCaptureNotificationName name) {
    NotificationHub& hub = OnePerProcess<NotificationHub>::Get();
    Registrations found;
    const std::lock_guard<std::mutex> lock(hub.mutex);
    std::copy_if(hub.registrations.begin(), hub.registrations.end(), std::back_inserter(found),
                 [&](const auto& each) { return each->object.get() == core && each->name == name; });
    return found;
}

std::shared_ptr<Registration> TakeOne(const void* observer) {
    NotificationHub& hub = OnePerProcess<NotificationHub>::Get();
    const std::lock_guard<std::mutex> lock(hub.mutex);
    const auto found = std::find_if(hub.registrations.begin(), hub.registrations.end(),
                                    [observer](const auto& each) { return each->observer == observer; });
    if (found == hub.registrations.end())
        return nullptr;
    std::shared_ptr<Registration> taken = std::move(*found);
    hub.registrations.erase(found);
    return taken;
}

void Call(Registration& registration, const AVCaptureNotification& notification) {
    const std::lock_guard<std::recursive_mutex> lock(registration.callMutex);
    if (registration.removed)
        return;
    CmCallGuarded("[AVCaptureNotificationCenter]>>exception from a selector: ",
                  [&] { registration.selector(notification); });
}

} // namespace

AVCaptureNotificationCenter* AVCaptureNotificationCenter::defaultCenter() noexcept {
    static constinit AVCaptureNotificationCenter center;
    return &center;
}

bool AVCaptureNotificationCenter::addObserver(const void* observer,
                                              std::function<void(const AVCaptureNotification&)> selector,
                                              AVCaptureNotificationName name,
                                              const std::shared_ptr<AVCaptureSession>& object) noexcept {
    if (selector == nullptr || object == nullptr)
        return false;
    return CmCallGuarded("[AVCaptureNotificationCenter::addObserver]>>exception: ", [&] {
        auto registration = std::make_shared<Registration>();
        registration->observer = observer;
        registration->name = name;
        registration->object = object->m_core;
        registration->selector = std::move(selector);
        NotificationHub& hub = OnePerProcess<NotificationHub>::Get();
        const std::lock_guard<std::mutex> lock(hub.mutex);
        hub.registrations.push_back(std::move(registration));
    });
}

void AVCaptureNotificationCenter::removeObserver(const void* observer) noexcept {
    while (const std::shared_ptr<Registration> registration = TakeOne(observer)) {
        const std::lock_guard<std::recursive_mutex> lock(registration->callMutex);
        registration->removed = true;
    }
}

void PostCaptureNotification(const CaptureSessionCore* core, const AVCaptureNotification& notification) {
    const InsideSessionScope inside;
    CmCallGuarded("[PostCaptureNotification]>>exception: ", [&] {
        for (const std::shared_ptr<Registration>& registration : Find(core, notification.name))
            Call(*registration, notification);
    });
}

} // namespace platform

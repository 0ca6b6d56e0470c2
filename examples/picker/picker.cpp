// SPDX-License-Identifier: Apache-2.0
#include "picker.h"

#include <png.h>
#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <iterator>
#include <stdexcept>
#include <system_error>
#include <utility>
#include <vector>

namespace {

// At once, so that whoever reads along through a pipe sees it.
void Say(const std::string& line) {
    if (std::puts(line.c_str()) < 0 || std::fflush(stdout) != 0)
        throw std::system_error(errno, std::generic_category(), "cannot write to standard output");
}

// Names and titles come from other programs; they must not steer the terminal.
std::string Printable(std::string text) {
    const auto steers = [](unsigned char byte) { return byte < ' ' || byte == 0x7F; };
    std::replace_if(text.begin(), text.end(), steers, '?');
    return text.empty() ? "(no name)" : text;
}

std::string SizeText(int width, int height) {
    return std::to_string(width) + "x" + std::to_string(height);
}

std::string SizeText(const TVLRect& rect) {
    return SizeText(rect.right - rect.left, rect.bottom - rect.top);
}

// Programs keep windows of a pixel or so for themselves.
bool IsForPeople(const ShareWindowInfo& info) {
    constexpr int smallest = 10; // points
    return info.rect.right - info.rect.left >= smallest && info.rect.bottom - info.rect.top >= smallest;
}

// False when they can't be listed just now.
bool ListWindows(std::map<unsigned, ShareWindowInfo>& windows) {
    struct Walk final : ITvlEnumWindowsCallback {
        bool OnWindow(unsigned window) noexcept override {
            ids.push_back(window);
            return true;
        }
        std::vector<unsigned> ids;
    };
    Walk walk;
    if (TvlEnumWindows(&walk, SHARE_WINDOW_ENUM_NORMAL) != SHARE_RESULT_OK)
        return false;
    for (const unsigned window : walk.ids) {
        ShareWindowInfo info{};
        info.structSize = sizeof info;
        // It may have gone in between.
        if (ShareGetWindowInfo(window, &info) == SHARE_RESULT_OK && IsForPeople(info))
            windows.emplace(window, info);
    }
    return true;
}

// Under another name first: whoever looks into the folder finds whole pictures.
void WritePng(const Picture& picture, const std::string& path) {
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    image.width = static_cast<png_uint_32>(picture.width);
    image.height = static_cast<png_uint_32>(picture.height);
    image.format = PNG_FORMAT_RGBA;
    image.flags = PNG_IMAGE_FLAG_FAST;
    const std::string draft = path + ".part";
    const void* const pixels = picture.rgba.data();
    if (png_image_write_to_file(&image, draft.c_str(), 0, pixels, picture.lineBytes, nullptr) == 0)
        throw std::runtime_error("cannot write " + path + ": " + image.message);
    if (std::rename(draft.c_str(), path.c_str()) != 0)
        throw std::system_error(errno, std::generic_category(), "cannot write " + path);
}

} // namespace

Picker::Picker(std::string folder)
    : m_folder(std::move(folder)),
      m_monitorList(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, m_mailbox,
                    [this](const auto&... change) { ChangeMonitor(change...); }),
      m_appList(SHARE_SOURCE_ENUMERATOR_TYPE_APP, m_mailbox,
                [this](const auto&... change) { ChangeApp(change...); }),
      m_appThumbnails(EnumAppThumbnail, m_mailbox,
                      [this](const auto&... came) { TakePicture(m_apps, came...); }),
      m_windowThumbnails(EnumWindowThumbnail, m_mailbox,
                         [this](const auto&... came) { TakePicture(m_windows, came...); }) {}

void Picker::Run(int endDescriptor, std::chrono::seconds limit) {
    using Clock = std::chrono::steady_clock;
    constexpr std::chrono::milliseconds lookEvery(250);
    const Clock::time_point end = limit.count() > 0 ? Clock::now() + limit : Clock::time_point::max();
    ListAll();
    Clock::time_point nextLook = Clock::now() + lookEvery;
    while (Clock::now() < end) {
        if (Clock::now() >= nextLook) {
            Look();
            nextLook = Clock::now() + lookEvery;
        }
        m_appThumbnails.AskForNext();
        m_windowThumbnails.AskForNext();

        const auto wait =
            std::chrono::ceil<std::chrono::milliseconds>(std::min(nextLook, end) - Clock::now());
        // The last one is only looked at for errors: that its reader has gone.
        pollfd ready[] = {
            {endDescriptor, POLLIN, 0}, {m_mailbox.Descriptor(), POLLIN, 0}, {STDOUT_FILENO, 0, 0}};
        poll(ready, std::size(ready), std::max(0, static_cast<int>(wait.count())));
        if (ready[0].revents != 0)
            return;
        if (ready[2].revents != 0)
            throw std::runtime_error("nobody reads standard output any more");
        m_mailbox.OpenOne(); // one at a time, so that the end waits for one picture at most
    }
}

void Picker::ListAll() {
    for (const SourceRef& monitor : m_monitorList.List())
        ChangeMonitor(SHARE_SOURCE_EVENT_ADDED, monitor, NameOf(*monitor));
    for (const SourceRef& app : m_appList.List())
        ChangeApp(SHARE_SOURCE_EVENT_ADDED, app, NameOf(*app));
    LookAtWindows();
    Say(std::to_string(m_monitors.told.size()) + " monitors, " + std::to_string(m_apps.told.size()) +
        " applications, " + std::to_string(m_windows.told.size()) + " windows; now what changes");
}

// At what nobody tells us of.
void Picker::Look() {
    NameApps();
    LookAtWindows();
    constexpr int looksOfAPicture = 8;
    if (++m_looks % looksOfAPicture == 0)
        WantAllAnew();
}

// Pictures age, and what has just opened may not have painted all of itself when its first one was taken.
void Picker::WantAllAnew() {
    for (const auto& app : m_apps.told)
        m_appThumbnails.Want(app.first);
    for (const auto& window : m_windows.told)
        m_windowThumbnails.Want(window.first);
}

// ---- Sources, which bring events

void Picker::ChangeMonitor(SHARE_SOURCE_EVENT event, const SourceRef& source, const std::string& name) {
    const auto id = static_cast<unsigned>(source->GetSourceUniqueId());
    const TVLRect rect = source->GetSourceRect(false);
    if (event == SHARE_SOURCE_EVENT_REMOVED)
        Remove(m_monitors, id);
    else
        Show(m_monitors, id,
             '"' + Printable(name) + "\" at " + std::to_string(rect.left) + ',' + std::to_string(rect.top) +
                 ", " + SizeText(rect));
}

void Picker::ChangeApp(SHARE_SOURCE_EVENT event, const SourceRef& source, const std::string& name) {
    const auto pid = static_cast<unsigned>(source->GetSourceUniqueId());
    if (event == SHARE_SOURCE_EVENT_REMOVED) {
        m_appThumbnails.Forget(pid);
        m_namelessApps.erase(pid);
        Remove(m_apps, pid);
    } else if (m_apps.told.count(pid) == 0) { // one may be both listed and told of
        if (name.empty())
            m_namelessApps.emplace(pid, source);
        Show(m_apps, pid, Printable(name));
        m_appThumbnails.Want(pid);
    }
}

// Some have a name only a while after their start.
void Picker::NameApps() {
    for (auto each = m_namelessApps.begin(); each != m_namelessApps.end();) {
        const std::string name = NameOf(*each->second);
        Show(m_apps, each->first, Printable(name));
        each = name.empty() ? std::next(each) : m_namelessApps.erase(each);
    }
}

// ---- Windows, which bring none

void Picker::LookAtWindows() {
    std::map<unsigned, ShareWindowInfo> windows;
    if (!ListWindows(windows))
        return;
    for (const auto& former : std::map(m_windows.told)) {
        if (windows.count(former.first) != 0)
            continue;
        m_windowThumbnails.Forget(former.first);
        Remove(m_windows, former.first);
    }
    for (const auto& window : windows)
        ShowWindow(window.first, window.second);
}

void Picker::ShowWindow(unsigned window, const ShareWindowInfo& info) {
    const auto owner = static_cast<unsigned>(info.ownerPid);
    if (m_windows.told.count(window) == 0) {
        m_windowThumbnails.Want(window);
        if (m_apps.told.count(owner) != 0)
            m_appThumbnails.Want(owner); // its picture is that of its largest window
    }
    Show(m_windows, window,
         '"' + Printable(info.title) + "\" of " + std::to_string(owner) + ", " + SizeText(info.rect) +
             " on monitor " + std::to_string(info.displayId));
}

// ---- What the user sees

void Picker::TakePicture(Listing& listing, unsigned id, const Picture& picture) const {
    if (listing.told.count(id) == 0)
        return; // gone since it was asked for
    const std::string number = std::to_string(id);
    std::string text = picture.rgba.empty() ? "none yet" : SizeText(picture.width, picture.height);
    if (!picture.rgba.empty() && !m_folder.empty()) {
        const std::string path = m_folder + '/' + listing.kind + '-' + number + ".png";
        WritePng(picture, path);
        text += ", " + path;
    }
    std::string& told = listing.toldOfPictures[id];
    if (told == text)
        return;
    told = text;
    Say(std::string("thumbnail of ") + listing.kind + ' ' + number + ": " + text);
}

void Picker::Show(Listing& listing, unsigned id, const std::string& description) {
    const auto [entry, isNew] = listing.told.try_emplace(id);
    if (!isNew && entry->second == description)
        return;
    entry->second = description;
    Say(std::string(isNew ? "+ " : "~ ") + listing.kind + ' ' + std::to_string(id) + ' ' + description);
}

void Picker::Remove(Listing& listing, unsigned id) {
    listing.toldOfPictures.erase(id);
    if (const auto gone = listing.told.extract(id))
        Say(std::string("- ") + listing.kind + ' ' + std::to_string(id) + ' ' + gone.mapped());
}

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "mailbox.h"
#include "sources.h"
#include "thumbnails.h"

#include <chrono>
#include <map>
#include <string>

// What a user could share, told line by line. All of it belongs to the main thread.
class Picker {
public:
    // Without a folder no pictures are written.
    explicit Picker(std::string folder);

    // Until that descriptor can be read, or the time is over; no time is no limit.
    void Run(int endDescriptor, std::chrono::seconds limit);

private:
    // Around everything else of the library.
    struct Library {
        Library() { ShareEngineInit(); }
        ~Library() { ShareEngineUninit(); }
    };

    // What the user has been told of one kind of sources, by their ids.
    struct Listing {
        const char* kind;
        std::map<unsigned, std::string> told;
        std::map<unsigned, std::string> toldOfPictures;
    };

    void ListAll();
    void Look();
    void ChangeMonitor(SHARE_SOURCE_EVENT event, const SourceRef& source, const std::string& name);
    void ChangeApp(SHARE_SOURCE_EVENT event, const SourceRef& source, const std::string& name);
    void NameApps();
    void LookAtWindows();
    void ShowWindow(unsigned window, const ShareWindowInfo& info);
    void WantAllAnew();
    void TakePicture(Listing& listing, unsigned id, const Picture& picture) const;
    static void Show(Listing& listing, unsigned id, const std::string& description);
    static void Remove(Listing& listing, unsigned id);

    const Library m_library;
    const std::string m_folder;
    Mailbox m_mailbox;
    Listing m_monitors{"monitor", {}, {}};
    Listing m_apps{"app", {}, {}};
    Listing m_windows{"window", {}, {}};
    std::map<unsigned, SourceRef> m_namelessApps; // of m_apps
    int m_looks = 0;
    // The end goes from below: first there are no pictures any more, then no events, then no library.
    WatchedSources m_monitorList;
    WatchedSources m_appList;
    Thumbnails m_appThumbnails;
    Thumbnails m_windowThumbnails;
};

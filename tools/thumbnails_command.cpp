// SPDX-License-Identifier: Apache-2.0
#include "tools/thumbnails_command.h"

#include "tools/desktop_lists.h"
#include "tools/desktop_state.h"
#include "tools/thumbnail_request.h"

#include <screenshare/share_engine.h>

#include <poll.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

namespace {

using ThumbnailItems = std::vector<ThumbnailItem>;

ThumbnailItems ApplicationItems() {
    ThumbnailItems items;
    for (ListedApplication& application : ListApplications())
        items.push_back({"app", application.pid, std::move(application.name)});
    return items;
}

class PickerWindows : public ITvlEnumWindowsCallback {
public:
    bool OnWindow(unsigned window) override {
        ids.push_back(window);
        return true;
    }

    std::vector<unsigned> ids;
};

/// The windows that a picker offers: those of the desktop itself can't be shared.
ThumbnailItems WindowItems() {
    PickerWindows windows;
    TvlEnumWindows(&windows, SHARE_WINDOW_ENUM_NORMAL);
    const std::vector<platform::CGWindowDescription> known =
        platform::CGWindowListCreateDescriptionFromArray(windows.ids);
    ThumbnailItems items;
    for (const platform::CGWindowDescription& window : known) {
        const bool hasTitle = !window.kCGWindowName.empty();
        items.push_back(
            {"window", window.kCGWindowNumber, hasTitle ? window.kCGWindowName : window.kCGWindowOwnerName});
    }
    return items;
}

std::string SummaryOf(const ThumbnailFiles& files, const std::string& folder) {
    const int count = files.FileCount() + files.MissingCount();
    std::string text = std::to_string(count) + (count == 1 ? " thumbnail" : " thumbnails");
    if (files.MissingCount() > 0)
        text += ", " + std::to_string(files.MissingCount()) + " without a picture,";
    return text + " into " + folder + "\n";
}

WriteResult NotMade(std::string problem) {
    return WriteFailure{EXIT_CODE_FAILED, std::move(problem)};
}

class ThumbnailRun {
public:
    explicit ThumbnailRun(const ThumbnailOptions& options)
        : m_apps(options.apps ? ApplicationItems() : ThumbnailItems()),
          m_windows(options.windows ? WindowItems() : ThumbnailItems()),
          m_folder(options.folder),
          m_files(options.folder, options.tellsJson ? ThumbnailForm::Json : ThumbnailForm::Table, m_signals) {
    }

    WriteResult Run();

private:
    WriteResult RunRequests();
    WriteResult RunRequest(const ThumbnailItems& items, ThumbnailRequest::Question question);
    bool WaitForEnd(const StopNotice& ended) const;

    const StopSignals m_signals;
    const DesktopLook m_look; // before what it found
    const ThumbnailItems m_apps;
    const ThumbnailItems m_windows;
    const std::string m_folder;
    ThumbnailFiles m_files;
};

WriteResult ThumbnailRun::Run() {
    if (m_apps.empty() && m_windows.empty()) {
        std::string problem = m_look.ProblemSince();
        return NotMade(problem.empty() ? "there is nothing to make thumbnails of" : std::move(problem));
    }
    ThumbnailItems all = m_apps;
    all.insert(all.end(), m_windows.begin(), m_windows.end());
    if (WriteResult failure = m_files.Open(all))
        return failure;
    WriteResult failure = RunRequests();
    std::fputs(SummaryOf(m_files, m_folder).c_str(), stderr);
    return failure;
}

WriteResult ThumbnailRun::RunRequests() {
    if (WriteResult failure = RunRequest(m_apps, EnumAppThumbnail))
        return failure;
    if (WriteResult failure = RunRequest(m_windows, EnumWindowThumbnail))
        return failure;
    // What has no picture may only have gone with everything else.
    if (std::string problem = m_look.ProblemSince(); m_files.MissingCount() > 0 && !problem.empty())
        return NotMade(std::move(problem));
    return std::nullopt;
}

WriteResult ThumbnailRun::RunRequest(const ThumbnailItems& items, ThumbnailRequest::Question question) {
    if (items.empty() || m_signals.IsRaised())
        return std::nullopt;
    ThumbnailRequest request(items, m_files);
    if (!request.Ask(question))
        return NotMade("thumbnails cannot be asked for");
    const bool isReaderGone = WaitForEnd(request.Ended());
    WriteResult failure = request.Close();
    if (!failure && isReaderGone)
        return FailureFromErrno("standard output", EPIPE);
    return failure;
}

/// Until a signal or the request says so. True when the reader of standard output has gone.
bool ThumbnailRun::WaitForEnd(const StopNotice& ended) const {
    // A negative descriptor is one that poll passes over.
    std::array<pollfd, 3> descriptors{{{m_signals.Descriptor(), POLLIN, 0},
                                       {ended.Descriptor(), POLLIN, 0},
                                       {m_files.PipeDescriptor(), 0, 0}}};
    while (poll(descriptors.data(), descriptors.size(), -1) < 0 && errno == EINTR) {
    }
    return descriptors[2].revents != 0 && !m_signals.IsRaised();
}

} // namespace

WriteResult RunThumbnails(const ThumbnailOptions& options) {
    if (std::string problem = ProblemBeforeLook(); !problem.empty())
        return NotMade(std::move(problem));
    return ThumbnailRun(options).Run();
}

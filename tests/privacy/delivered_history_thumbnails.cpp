// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/delivered_history.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <utility>

/// The part of a history that is about thumbnails. A picker shows what the share keeps out, too: what counts
/// is that a picture shows the window that it is of, and nothing else.

namespace {

using platform::SimulatedOperation;

constexpr SimulatedOperation THUMBNAIL_OPERATIONS[] = {
    SimulatedOperation::TakeWindowPicture, SimulatedOperation::GetWindows, SimulatedOperation::GetLife};

} // namespace

/// And waits for them. The desktop may change, and calls may fail, until all are there.
void DeliveredHistory::AskForThumbnails() {
    switch (Number(0, 4)) {
        case 0:
            Tell("ask for thumbnails of what changes");
            AskForSome(true, ChangeOrCancelInside());
            break;
        case 1:
            Tell("ask for thumbnails and have them hindered");
            AskForSome(true, {}, [this] { HinderThumbnails(); });
            break;
        case 2:
            Tell("ask for thumbnails and cancel them");
            AskForSome(true, {});
            CancelThumbnails();
            break;
        default:
            Tell("ask for thumbnails");
            AskForSome(false, {});
    }
    TakeThumbnails();
    for (const SimulatedOperation operation : THUMBNAIL_OPERATIONS)
        m_server->Heal(operation);
}

void DeliveredHistory::AskForSome(bool isHindered, ThumbnailJudge::During during,
                                  const std::function<void()>& first) {
    m_thumbnails = std::make_unique<ThumbnailRequest>(isHindered || !AreWindowsAtRest(), std::move(during));
    ThumbnailJudge& judge = m_thumbnails->judge;
    const bool areApplications = Chance(40);
    const std::vector<unsigned> ids = SomeIds(areApplications);
    {
        const auto held = judge.Hold();
        judge.Expect(ThumbnailTruths());
    }
    judge.Ask(ids);
    if (first)
        first();
    const auto enumerate = areApplications ? EnumAppThumbnail : EnumWindowThumbnail;
    EXPECT_EQ(enumerate(ids.data(), static_cast<int>(ids.size()), &judge), 0);
}

/// For a moment the library may still take a window for where it was, and find nothing there.
bool DeliveredHistory::AreWindowsAtRest() const {
    constexpr std::chrono::milliseconds MOMENT{100};
    return CmSteadyNow() - m_windowsChanged >= MOMENT;
}

/// No applications are all of them.
std::vector<unsigned> DeliveredHistory::SomeIds(bool areApplications) {
    std::vector<unsigned> ids;
    if (areApplications && Chance(30))
        return ids;
    for (int i = Number(1, 5); i > 0; --i) {
        const Window* const window = areApplications ? nullptr : SomeWindow();
        if (areApplications)
            ids.push_back(static_cast<unsigned>(m_apps[static_cast<std::size_t>(Number(0, 3))].pid));
        else
            ids.push_back(window != nullptr ? window->id : 1);
    }
    return ids;
}

std::vector<ThumbnailTruth> DeliveredHistory::ThumbnailTruths() const {
    std::vector<ThumbnailTruth> truths;
    const auto snapshot = m_server->GetWindows();
    for (const platform::WindowInfo& info : snapshot->Windows()) {
        const auto window = std::find_if(m_windows.begin(), m_windows.end(),
                                         [&](const Window& each) { return each.id == info.id; });
        if (window == m_windows.end())
            continue;
        const std::set<std::uint32_t> colours =
            info.onScreen ? std::set<std::uint32_t>{PaintOf(*window)} : window->worn;
        for (const std::uint32_t rgb : colours)
            truths.push_back(
                {info.id, info.owner, rgb, info.alpha, !window->isSecretOfServer, info.onScreen});
    }
    return truths;
}

// ---- While they are made

/// The history's own thread waits meanwhile, or changes nothing else.
void DeliveredHistory::ChangeWindowMeanwhile() {
    if (m_thumbnails == nullptr) {
        ChangeWindow();
        return;
    }
    const auto held = m_thumbnails->judge.Hold();
    ChangeWindow();
    m_thumbnails->judge.Expect(ThumbnailTruths());
}

ThumbnailJudge::During DeliveredHistory::ChangeOrCancelInside() {
    const int when = Number(1, 4);
    const int what = Number(0, 3);
    return [this, when, what](int count) {
        if (count != when)
            return true;
        if (what > 1) {
            ChangeWindowMeanwhile();
            return true;
        }
        if (what == 1)
            CancelThumbnails();
        return false;
    };
}

/// In the middle of a picture.
void DeliveredHistory::HinderThumbnails() {
    const auto nth = static_cast<unsigned>(Number(1, 4));
    const int what = Number(0, 2);
    if (what == 0)
        m_server->FailNth(THUMBNAIL_OPERATIONS[Number(0, 2)], nth);
    else if (what == 1)
        m_server->DoAt(SimulatedOperation::TakeWindowPicture, nth, [this] { ChangeWindowMeanwhile(); });
    else
        m_server->DoAt(SimulatedOperation::TakeWindowPicture, nth, [this] { CancelThumbnails(); });
}

void DeliveredHistory::CancelThumbnails() {
    CancelThumbnail(&m_thumbnails->judge);
    m_thumbnails->judge.Forbid();
}

void DeliveredHistory::TakeThumbnails() {
    constexpr unsigned NO_WINDOW = 0xFFFFFFF0U;
    EXPECT_EQ(EnumWindowThumbnail(&NO_WINDOW, 1, &m_thumbnails->fence), 0);
    EXPECT_TRUE(m_thumbnails->fence.IsDone());
    CancelThumbnail(&m_thumbnails->judge);
    CancelThumbnail(&m_thumbnails->fence);
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_counts.thumbnails += m_thumbnails->judge.Findings();
        if (m_counts.firstLeak.empty())
            m_counts.firstLeak = m_thumbnails->judge.FirstLeak();
    }
    m_thumbnails.reset();
}

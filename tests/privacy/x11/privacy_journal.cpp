// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/privacy_journal.h"

#include "src/share_image_save.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

namespace {

constexpr std::size_t ACTIONS_KEPT = 12;
constexpr int MOST_PICTURES = 24;
/// A window of the least size that any of the clients has.
constexpr long MUCH = 1000;

__attribute__((format(printf, 1, 2))) std::string Format(const char* form, ...) {
    std::array<char, 400> text{};
    va_list arguments;
    va_start(arguments, form);
    std::vsnprintf(text.data(), text.size(), form, arguments);
    va_end(arguments);
    return text.data();
}

void Print(const std::string& line) {
    std::fputs((line + "\n").c_str(), stdout);
    std::fflush(stdout);
}

void Add(PrivacyTally& to, const PrivacyTally& from) {
    to.frames += from.frames;
    to.letIn += from.letIn;
    to.letInSeen += from.letInSeen;
    to.alive += from.alive;
    to.terminal += from.terminal;
    to.toolkit += from.toolkit;
    to.browser += from.browser;
    to.menu += from.menu;
    to.onScreen += from.onScreen;
    to.leaks += from.leaks;
    to.forbidden += from.forbidden;
    to.through += from.through;
    to.nearEdges += from.nearEdges;
    to.longestExposure = std::max(to.longestExposure, from.longestExposure);
    to.thumbnails += from.thumbnails;
    to.thumbnailsAlive += from.thumbnailsAlive;
}

void Judge(PrivacyTally& tally, const PrivacyJournal::Delivery& delivery) {
    const MarkerCount& seen = delivery.seen;
    const auto much = [](long pixels) { return pixels > MUCH ? 1 : 0; };
    ++tally.frames;
    tally.alive += much(seen.Shown());
    tally.terminal += much(seen.terminal);
    tally.toolkit += much(seen.toolkit);
    tally.browser += much(seen.browser);
    tally.menu += much(seen.menu);
    tally.onScreen += delivery.hasSecretOnScreen ? 1 : 0;
    const long forbidden = PrivacyJournal::ForbiddenOf(delivery.mode, seen);
    tally.leaks += forbidden > 0 ? 1 : 0;
    tally.forbidden += forbidden;
    tally.through += seen.through;
    tally.nearEdges += seen.magenta + seen.mixed - forbidden;
}

} // namespace

const char* NameOf(SHARE_CAPTURE_ENGINE_TYPE kind) {
    switch (kind) {
        case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
            return "desktop";
        case SHARE_CAPTURE_ENGINE_TYPE_APP:
            return "application";
        default:
            return "window";
    }
}

PrivacyJournal::PrivacyJournal(unsigned seed, std::filesystem::path folder)
    : m_seed(seed),
      m_folder(std::move(folder)) {}

double PrivacyJournal::Second() const {
    return std::chrono::duration<double>(Clock::now() - m_start).count();
}

// ---- What happens on the desktop

void PrivacyJournal::Note(const std::string& action) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_actions.push_back(Format("%.2f %s", Second(), action.c_str()));
    if (m_actions.size() > ACTIONS_KEPT)
        m_actions.pop_front();
}

void PrivacyJournal::SetPart(const std::string& part) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_part = part;
}

void PrivacyJournal::AddSecret(pid_t pid) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_secrets.insert(pid);
}

void PrivacyJournal::AddShown(pid_t pid) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_shown.insert(pid);
}

bool PrivacyJournal::IsShown(pid_t pid) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_shown.count(pid) != 0;
}

bool PrivacyJournal::IsSecret(pid_t pid) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_secrets.count(pid) != 0;
}

// ---- What is delivered

long PrivacyJournal::ForbiddenOf(SCREEN_CAPTURER_TYPE mode, const MarkerCount& seen) {
    const bool isPaintedOver =
        mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION || mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
    return isPaintedOver ? seen.inside : seen.magenta + seen.mixed;
}

void PrivacyJournal::Take(const Delivery& delivery, IShareFrame& frame) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    PrivacyTally& tally = m_tallies[{delivery.mode, delivery.kind}];
    if (!delivery.isJudged) {
        ++tally.letIn;
        tally.letInSeen += delivery.seen.magenta > 0 ? 1 : 0;
        return;
    }
    Judge(tally, delivery);
    KeepExample(delivery, frame);
    if (ForbiddenOf(delivery.mode, delivery.seen) > 0)
        TellLeak(delivery, frame, tally.leaks);
}

void PrivacyJournal::TakeExposure(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode,
                                  std::chrono::milliseconds time) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    std::chrono::milliseconds& longest = m_tallies[{mode, kind}].longestExposure;
    longest = std::max(longest, time);
}

/// One of each kind in each mode, for people to look at.
void PrivacyJournal::KeepExample(const Delivery& delivery, IShareFrame& frame) {
    const MarkerCount& seen = delivery.seen;
    const int shown =
        (seen.terminal > MUCH ? 1 : 0) + (seen.toolkit > MUCH ? 1 : 0) + (seen.browser > MUCH ? 1 : 0);
    if (shown < 2 || !delivery.hasSecretOnScreen || !m_examples.insert({delivery.mode, delivery.kind}).second)
        return;
    const std::string name =
        Format("example-%d-%s.png", static_cast<int>(delivery.mode), NameOf(delivery.kind));
    SaveFrameToPNG(&frame, (m_folder / name).c_str());
}

/// The first ones of each kind in each mode are kept.
void PrivacyJournal::TellLeak(const Delivery& delivery, IShareFrame& frame, long number) {
    constexpr long FIRST = 3;
    if (number > FIRST)
        return;
    Print(
        Format("LEAK: seed %u, second %.2f, %s: %s share in mode %d, "
               "%ld pixels of magenta, %ld of them inside, %ld mixed",
               m_seed, Second(), m_part.c_str(), NameOf(delivery.kind), static_cast<int>(delivery.mode),
               delivery.seen.magenta, delivery.seen.inside, delivery.seen.mixed));
    for (const std::string& action : m_actions)
        Print("    " + action);
    if (m_pictures++ >= MOST_PICTURES)
        return;
    const std::string file = (m_folder / Format("leak-%d-%s-%ld.png", static_cast<int>(delivery.mode),
                                                NameOf(delivery.kind), number))
                                 .string();
    if (SaveFrameToPNG(&frame, file.c_str()))
        Print("    " + file);
}

void PrivacyJournal::TakeThumbnail(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode,
                                   const MarkerCount& seen) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    PrivacyTally& tally = m_tallies[{mode, kind}];
    ++tally.thumbnails;
    tally.thumbnailsAlive += seen.Shown() > MUCH ? 1 : 0;
    const long forbidden = seen.magenta + seen.mixed;
    if (forbidden == 0)
        return;
    tally.forbidden += forbidden;
    ++tally.leaks;
    Print(Format("LEAK: seed %u, second %.2f, %s: thumbnail of %s, %ld of %ld pixels", m_seed, Second(),
                 m_part.c_str(), NameOf(kind), forbidden, seen.all));
    for (const std::string& action : m_actions)
        Print("    " + action);
}

void PrivacyJournal::TakeSecretThumbnail(const std::string& whose, const MarkerCount& seen) {
    if (seen.all == 0)
        return;
    const double part = static_cast<double>(seen.magenta) / static_cast<double>(seen.all);
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_mostOfSecret[whose] = std::max(m_mostOfSecret[whose], part);
}

void PrivacyJournal::CountFallback(SCREEN_CAPTURER_TYPE mode) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    ++m_fallbacks[mode];
}

void PrivacyJournal::Fail(const std::string& what) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_failures.push_back(what);
    Print("FAILED: " + what);
}

// ---- What came of it

PrivacyTally PrivacyJournal::Tally(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto found = m_tallies.find({mode, kind});
    return found != m_tallies.end() ? found->second : PrivacyTally();
}

PrivacyTally PrivacyJournal::Sum() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    PrivacyTally sum;
    for (const auto& [key, tally] : m_tallies)
        Add(sum, tally);
    return sum;
}

double PrivacyJournal::MostOfSecret(const std::string& whose) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto found = m_mostOfSecret.find(whose);
    return found != m_mostOfSecret.end() ? found->second : 0;
}

std::vector<std::string> PrivacyJournal::Failures() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_failures;
}

std::string PrivacyJournal::Progress() const {
    const PrivacyTally sum = Sum();
    const std::lock_guard<std::mutex> lock(m_mutex);
    return Format(
        "%5.0f s, %s: %ld frames, %ld alive, %ld with a secret on the screen, %ld let in, "
        "%ld thumbnails, %ld leaks",
        Second(), m_part.c_str(), sum.frames, sum.alive, sum.onScreen, sum.letIn, sum.thumbnails, sum.leaks);
}

std::string PrivacyJournal::Row(const Key& key, const PrivacyTally& tally) {
    return Format(
        "| %d | %s | %ld | %ld | %ld (%ld, %ld, %ld, %ld) | %ld | %ld (%ld) | %ld | %ld | %ld | %lld |\n",
        static_cast<int>(key.first), NameOf(key.second), tally.frames, tally.thumbnails, tally.alive,
        tally.terminal, tally.toolkit, tally.browser, tally.menu, tally.onScreen, tally.letIn,
        tally.letInSeen, tally.forbidden, tally.through, tally.nearEdges,
        static_cast<long long>(tally.longestExposure.count()));
}

std::string PrivacyJournal::Table() const {
    std::string text =
        "| Mode | Share | Frames | Thumbnails | With life (xterm, GTK, browser, menu) | Secret on the screen "
        "| Let in (seen) | Forbidden pixels | of these in shown windows | Near edges | Longest exposure, ms |\n"
        "|---|---|---|---|---|---|---|---|---|---|---|\n";
    for (const SCREEN_CAPTURER_TYPE mode : PRIVACY_MODES) {
        for (const SHARE_CAPTURE_ENGINE_TYPE kind : PRIVACY_KINDS)
            text += Row({mode, kind}, Tally(kind, mode));
    }
    const std::lock_guard<std::mutex> lock(m_mutex);
    for (const auto& [mode, count] : m_fallbacks)
        text += Format("Mode %d was given up for mode 1, and set anew: %ld times.\n", static_cast<int>(mode),
                       count);
    for (const auto& [whose, part] : m_mostOfSecret)
        text += Format("A thumbnail of the %s is magenta up to %.0f %%.\n", whose.c_str(), part * 100);
    return text;
}

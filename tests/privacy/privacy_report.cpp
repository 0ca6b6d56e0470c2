// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_report.h"

#include <cstddef>
#include <sstream>

namespace {

const char* ModeOf(const DeliveredKind& kind) {
    switch (kind.mode) {
        case SCREEN_CAPTURER_TYPE_AVFOUNDATION:
            return "7, session";
        case SCREEN_CAPTURER_TYPE_CGS_GCD:
            return "8, queued";
        case SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX:
            return "10, mix";
        default:
            return "1, default";
    }
}

const char* ShareOf(const DeliveredKind& kind) {
    if (kind.IsOfDesktop())
        return "desktop";
    return kind.IsOfApplications() ? "applications" : "windows";
}

std::string Line(const std::string& mode, const std::string& share, long histories,
                 const DeliveredCounts& counts) {
    std::ostringstream line;
    line << "| " << mode << " | " << share;
    for (const long number :
         {histories, counts.frames, counts.resent, counts.findings.forbidden, counts.findings.leaks,
          counts.findings.redNearEdges, counts.findings.redThroughKept,
          counts.findings.redElsewhere + counts.strange, counts.ofBefore, counts.ofNoMoment,
          counts.thumbnails.images, counts.thumbnails.foreign, counts.thumbnails.unasked,
          static_cast<long>(counts.longestExposure.count())})
        line << " | " << number;
    line << " |\n";
    return line.str();
}

} // namespace

PrivacyReport::PrivacyReport(const PrivacyOptions& options)
    : m_options(options),
      m_rows(options.kinds.size()) {}

void PrivacyReport::Take(const PrivacyResult& result) {
    Row& row = m_rows[result.kind];
    ++row.histories;
    row.bad += result.outcome != PrivacyOutcome::Clean ? 1 : 0;
    row.counts += result.counts;
}

PrivacyReport::Row PrivacyReport::Sum() const {
    Row sum;
    for (const Row& row : m_rows) {
        sum.histories += row.histories;
        sum.bad += row.bad;
        sum.counts += row.counts;
    }
    return sum;
}

long PrivacyReport::Histories() const {
    return Sum().histories;
}

std::string PrivacyReport::Progress() const {
    const Row sum = Sum();
    return std::to_string(sum.histories) + " histories, " + std::to_string(sum.counts.frames) + " frames, " +
           std::to_string(sum.counts.thumbnails.images) + " thumbnails, " + std::to_string(sum.bad) +
           " histories not clean";
}

std::string PrivacyReport::Table() const {
    std::string table =
        "| Mode | Share | Histories | Frames checked | of these sent again | Forbidden pixels looked at | "
        "Forbidden pixels seen | Red near edges | Red through kept windows | Red or strange elsewhere | Frames "
        "taken before an exclusion | at no known moment | Thumbnails checked | their pixels of something else "
        "| Thumbnails after a cancel | Longest exposure, ms |\n|---|---";
    constexpr int NUMBERS = 14;
    for (int i = 0; i < NUMBERS; ++i)
        table += "|--:";
    table += "|\n";
    for (std::size_t i = 0; i < m_rows.size(); ++i)
        table += Line(ModeOf(m_options.kinds[i]), ShareOf(m_options.kinds[i]), m_rows[i].histories,
                      m_rows[i].counts);
    const Row sum = Sum();
    return table + Line("all", "", sum.histories, sum.counts);
}

std::vector<std::string> PrivacyReport::DeadKinds() const {
    constexpr long ENOUGH = 10;
    std::vector<std::string> dead;
    for (std::size_t i = 0; i < m_rows.size(); ++i) {
        const DeliveredCounts& counts = m_rows[i].counts;
        const bool shows =
            counts.keptShown > 0 && counts.thumbnails.wholeShown > 0 && counts.findings.forbidden > 0;
        if (m_rows[i].histories >= ENOUGH && !shows)
            dead.emplace_back(m_options.kinds[i].name);
    }
    return dead;
}

bool PrivacyReport::IsGood() const {
    return Sum().bad == 0 && DeadKinds().empty();
}

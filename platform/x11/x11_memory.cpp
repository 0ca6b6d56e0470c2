// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_memory.h"

#include <algorithm>
#include <vector>

namespace platform::x11 {

namespace {

constexpr std::uint32_t HIGHEST_USES = 15; // what four bits hold

bool IsName(std::uint32_t name) {
    return name != 0 && (name >> WindowIds::NAME_BITS) == 0;
}

/// The same text gives the same number in every process (FNV-1a).
std::uint32_t NumberOf(const std::string& text) {
    std::uint32_t number = 2166136261U;
    for (const char each : text)
        number = (number ^ static_cast<unsigned char>(each)) * 16777619U;
    return number;
}

} // namespace

std::uint32_t WindowIds::UsesOf(std::uint32_t name) const {
    const auto page = m_uses.find(name / PAGE_NAMES);
    if (page == m_uses.end())
        return 0;
    const std::uint32_t place = name % PAGE_NAMES;
    return (page->second[place / 2] >> (place % 2 * 4)) & HIGHEST_USES;
}

CGWindowID WindowIds::Claim(std::uint32_t name, pid_t owner, bool ours) {
    if (!IsName(name))
        return 0;
    if (const auto claim = m_claims.find(name); claim != m_claims.end()) {
        claim->second.owner = owner;
        return claim->second.id;
    }
    const CGWindowID id = ours ? name : NewIdOf(name);
    m_claims[name] = {id, owner};
    return id;
}

CGWindowID WindowIds::NewIdOf(std::uint32_t name) {
    const std::uint32_t uses = UsesOf(name);
    if (uses > LAST_INCARNATION)
        return SpareId();
    const CGWindowID id = name | (uses << NAME_BITS);
    return id < m_lowestSpare ? id : SpareId();
}

/// The last id of a name that has not come to it; when it does, it takes a spare one itself.
CGWindowID WindowIds::SpareId() {
    constexpr CGWindowID LOWEST = (LAST_INCARNATION << NAME_BITS) + 1;
    while (m_lowestSpare > LOWEST) {
        const std::uint32_t name = NameOf(--m_lowestSpare);
        const std::uint32_t uses = UsesOf(name);
        if (uses < LAST_INCARNATION || (uses == LAST_INCARNATION && !IsClaimed(name)))
            return m_lowestSpare;
    }
    return 0;
}

void WindowIds::Release(std::uint32_t name) {
    if (m_claims.erase(name) == 0)
        return;
    const std::uint32_t uses = std::min(UsesOf(name) + 1, HIGHEST_USES);
    const std::uint32_t place = name % PAGE_NAMES;
    std::uint8_t& pair = m_uses[name / PAGE_NAMES][place / 2];
    const std::uint32_t shift = place % 2 * 4;
    pair = static_cast<std::uint8_t>((pair & ~(HIGHEST_USES << shift)) | (uses << shift));
}

pid_t WindowIds::OwnerOf(std::uint32_t name) const {
    const auto claim = m_claims.find(name);
    return claim != m_claims.end() ? claim->second.owner : 0;
}

void WindowIds::ReleaseIf(const std::function<bool(std::uint32_t name)>& isGone) {
    std::vector<std::uint32_t> gone;
    for (const auto& claim : m_claims) {
        if (isGone(claim.first))
            gone.push_back(claim.first);
    }
    for (const std::uint32_t name : gone)
        Release(name);
}

bool DisplayIds::IsGiven(CGDirectDisplayID id) const {
    return std::any_of(m_ids.begin(), m_ids.end(), [id](const auto& each) { return each.second == id; });
}

CGDirectDisplayID DisplayIds::IdOf(const std::string& connector, const std::string& edid) {
    const std::string key = connector + '\0' + edid;
    if (const auto known = m_ids.find(key); known != m_ids.end())
        return known->second;
    constexpr CGDirectDisplayID BITS = 0x7FFFFFFF;
    CGDirectDisplayID id = NumberOf(key) & BITS;
    while (id == 0 || IsGiven(id))
        id = (id + 1) & BITS;
    m_ids.emplace(key, id);
    return id;
}

} // namespace platform::x11

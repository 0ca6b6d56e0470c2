// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

/// What the pixels of a frame show, noted down by who drew all of them: by it he knows the next time what he
/// has to draw anew, and two frames are known to be equal without a look at their pixels.
/// Threads: one at a time, as the frame that keeps it.
class ShareFrameNote {
public:
    virtual ~ShareFrameNote() = default;

    /// True only if all pixels of the two frames are equal, and so are their sizes and formats.
    virtual bool IsSameAs(const ShareFrameNote& other) const = 0;

    /// Notes of one number are the same. 0 for one that has none.
    std::uint64_t Number() const { return m_nNumber; }
    void SetNumber(std::uint64_t number) { m_nNumber = number; }
    /// One that no note of the process has had.
    static std::uint64_t NewNumber() noexcept;

protected:
    ShareFrameNote() = default;
    ShareFrameNote(const ShareFrameNote&) = default;
    ShareFrameNote& operator=(const ShareFrameNote&) = default;

private:
    std::uint64_t m_nNumber = 0;
};

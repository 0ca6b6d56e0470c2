// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

#include <array>
#include <cstdint>
#include <optional>

class ShareCapturerContext;

/// The last picture of a back-end while nothing has changed of what it was made from: a frame that shows it
/// needs no walk, no question to the window server and no drawing to show it again. On a desktop at rest this
/// is what a capture thirty times a second comes to.
///
/// Threads: one at a time, that of the captures.
class ShareStandingPicture {
public:
    /// What pictures are made from, but for the window server's side of it.
    struct Terms {
        unsigned display = 0;
        std::array<TVLSize, 3> sizes{}; // of the frame, of the picture in it, and the limit
        std::uint64_t revision = 0;     // of the context's lists, and so on: see its accessors
        std::uint64_t publications = 0;
        bool isWindowArea = false;
        bool excludesMenuBars = false;
        bool findsExposed = false;
        // Settings of the process.
        unsigned flags = 0;
        float scale = 0;
        bool isAppDisplayByWindow = false;
        bool isResampled = false;
        bool isSizeFixed = false;
        TVLSize fixedSize{};
        int background = 0;

        bool operator==(const Terms&) const = default;
    };

    /// Nothing while each capture has to be made, for the lines that it traces.
    static std::optional<Terms> TermsOf(const ShareCapturerContext& context);

    /// Whether it is of these terms; that leaves the window server.
    bool IsOf(const Terms& terms) const { return m_nMoment != 0 && terms == m_terms; }
    /// The window server's when it was taken; 0 without a picture.
    std::uint64_t Moment() const { return m_nMoment; }
    /// Whether a frame shows it, or can have it from its partner. If so, that counts as a filling of the
    /// frame.
    bool PutInto(IShareFrame& frame) const;

    /// A picture was made on these terms, all along, and the frame shows it. `moment` is the window server's.
    void Keep(IShareFrame& frame, const Terms& terms, std::uint64_t moment);
    void Forget() { m_nMoment = 0; }

private:
    Terms m_terms;
    std::uint64_t m_nMoment = 0; // 0 for no picture
    std::uint64_t m_nNote = 0;   // the number of its note
    IShareFrame::MetaInfo m_meta{};
};

// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_standing_picture.h"

#include "src/app_share_config.h"
#include "src/share_capturer_context.h"
#include "src/share_frame.h"
#include "util/cm_trace.h"

std::optional<ShareStandingPicture::Terms> ShareStandingPicture::TermsOf(
    const ShareCapturerContext& context) {
    const AppShareConfig& config = *AppShareConfig::Instance();
    constexpr unsigned EACH_TIME = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE | SHARE_CONFIG_FLAG_NO_WINDOW_WALK;
    Terms terms;
    terms.revision = context.Revision(); // first: what is read behind it may be newer
    terms.flags = config.m_nShareConfigFlags;
    if ((terms.flags & EACH_TIME) != 0 || CmTraceOn(CM_TRACE_DEBUG))
        return std::nullopt;
    terms.publications = context.Publications();
    terms.isWindowArea = !context.m_bNoWindowBaseArea;
    terms.excludesMenuBars = context.m_bExcludeMenuBar;
    terms.findsExposed = context.m_bFindsExposed;
    terms.scale = config.m_fCurrentScale;
    terms.isAppDisplayByWindow = config.m_bAppDisplayByWindow;
    terms.isResampled = config.m_bCaptureResampleEnable;
    terms.isSizeFixed = config.m_bCaptureResampleFixSizeEnable;
    terms.fixedSize = {config.m_nResampleScreenCaptureWidth, config.m_nResampleScreenCaptureHeight};
    terms.background = config.m_nAppShareBackgroundColor;
    return terms;
}

bool ShareStandingPicture::PutInto(IShareFrame& frame) const {
    CShareFrame* const own = CShareFrame::OwnOf(&frame);
    if (own == nullptr)
        return false;
    if (own->NoteNumber() == m_nNote)
        own->ConfirmNote();
    else if (!own->ChangeWithPartner(m_nNote))
        return false;
    own->SetMetaInfo(m_meta);
    return true;
}

void ShareStandingPicture::Keep(IShareFrame& frame, const Terms& terms, std::uint64_t moment) {
    const CShareFrame* const own = CShareFrame::OwnOf(&frame);
    m_nNote = own != nullptr ? own->NoteNumber() : 0;
    m_nMoment = m_nNote != 0 ? moment : 0;
    m_terms = terms;
    m_meta = frame.GetMetaInfo();
}

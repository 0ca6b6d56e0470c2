// SPDX-License-Identifier: Apache-2.0
#include "util/qvn_unknown_impl.h"

#include <array>
#include <cstring>

namespace qvn {

namespace {

// The id of the root interface. An id is compared byte by byte, so its sixteen bytes are all that has to be
// known of it here, and this folder stays free of what clients see.
constexpr std::array<unsigned char, 16> ROOT_INTERFACE_ID = {0x00, 0x00, 0x00, 0x00, 0x13, 0x20, 0x14, 0x01,
                                                             0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF};

} // namespace

unsigned CQvnUnknownImpl::AddRefImpl() {
    return m_references.fetch_add(1, std::memory_order_relaxed) + 1;
}

unsigned CQvnUnknownImpl::ReleaseImpl() {
    const unsigned left = m_references.fetch_sub(1, std::memory_order_acq_rel) - 1;
    if (left == 0)
        OnReferenceDestory();
    return left;
}

int CQvnUnknownImpl::QueryInterfaceImpl(const _tagUUID& iid, void** out) {
    if (out == nullptr)
        return QVN_E_POINTER;
    *out = nullptr;
    if (std::memcmp(&iid, ROOT_INTERFACE_ID.data(), ROOT_INTERFACE_ID.size()) != 0)
        return QVN_E_NOINTERFACE;
    AddRefImpl();
    *out = this;
    return 0;
}

void CQvnUnknownImpl::OnReferenceDestory() {
    delete this;
}

} // namespace qvn

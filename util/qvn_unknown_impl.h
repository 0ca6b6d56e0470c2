// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>

namespace qvn {

struct _tagUUID;

/// Answers of QueryInterface.
inline constexpr int QVN_E_NOINTERFACE = 0x46004005;
inline constexpr int QVN_E_POINTER = 0x46004006;

/// The reference count behind the reference-counted public objects. An implementation takes it as its second
/// base and forwards the four operations of its interface to the ...Impl ones here.
///
/// Lifetime: starts with a count of 0; the maker calls AddRef once; the Release that reaches 0 destroys the
///           object through OnReferenceDestory.
/// Threads:  the count is atomic; what the last holder wrote is visible to the destructor.
class CQvnUnknownImpl {
public:
    CQvnUnknownImpl(const CQvnUnknownImpl&) = delete;
    CQvnUnknownImpl& operator=(const CQvnUnknownImpl&) = delete;

protected:
    CQvnUnknownImpl() = default;
    virtual ~CQvnUnknownImpl() = default;

    unsigned AddRefImpl();
    unsigned ReleaseImpl();

    /// Knows the one id of the root interface: stores this part of the object, adds a reference and gives 0.
    int QueryInterfaceImpl(const _tagUUID& iid, void** out);
    unsigned GetReferenceImpl() const { return m_references.load(std::memory_order_relaxed); }

    virtual void OnReferenceDestory();

private:
    std::atomic<unsigned> m_references{0};
};

} // namespace qvn

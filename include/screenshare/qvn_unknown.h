// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace qvn {

/// Names an interface: sixteen bytes, equal when every byte is.
struct _tagUUID {
    unsigned char bytes[16];
};

constexpr bool operator==(const _tagUUID& a, const _tagUUID& b) {
    for (int i = 0; i < 16; ++i) {
        if (a.bytes[i] != b.bytes[i]) {
            return false;
        }
    }
    return true;
}
constexpr bool operator!=(const _tagUUID& a, const _tagUUID& b) {
    return !(a == b);
}

/// The only interface id there is: that of IQvnUnknown.
constexpr _tagUUID QVNIID_IQvnUnknown = {
    {0x00, 0x00, 0x00, 0x00, 0x13, 0x20, 0x14, 0x01, 0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF}};

/// Root of the public objects that live by a reference count: frames, sources and cursor images.
///
/// Lifetime: whoever builds an object finds its count at 0 and calls AddRef once; that reference is his.
///           Whoever keeps an object beyond the call that showed it to him holds a reference of his own:
///           AddRef when he takes it, Release when he is done. A pointer that is only read during a callback
///           needs neither. The Release that brings the count to 0 ends the object. Nobody gives up a
///           reference that he doesn't hold. Objects are never deleted directly, nor put on the stack.
/// Threads:  all four operations may be called from any thread, by a holder. The object ends on the thread of
///           the last Release. What else an object allows is told by its own interface.
/// Errors:   none throws.
class IQvnUnknown {
protected:
    virtual ~IQvnUnknown() = default;

public:
    /// Adds a reference and gives the new count.
    virtual unsigned AddRef() = 0;

    /// Gives up a reference and gives the new count. At 0 the object is gone.
    virtual unsigned Release() = 0;

    /// 0 when `iid` is QVNIID_IQvnUnknown: `*object` is then the counting part of the object, good as its
    /// identity and not to be cast to an interface, and holds a reference that the caller gives up with
    /// Release of this object. 0x46004005 for any other id; `*object` is then null. 0x46004006 when `object`
    /// is null. The count changes only with a 0.
    virtual int QueryInterface(const _tagUUID& iid, void** object) = 0;

    /// The count at this moment, for traces and tests: another thread may change it at once.
    virtual unsigned GetReference() = 0;
};

} // namespace qvn

using qvn::QVNIID_IQvnUnknown;

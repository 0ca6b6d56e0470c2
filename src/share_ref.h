// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>

/// Holds one reference on an object of the qvn::IQvnUnknown family.
template <class Object>
class ShareRef {
public:
    ShareRef() = default;
    explicit ShareRef(Object* object) : m_object(object) {
        if (m_object != nullptr)
            m_object->AddRef();
    }
    ShareRef(const ShareRef& other) : ShareRef(other.m_object) {}
    ShareRef(ShareRef&& other) noexcept : m_object(std::exchange(other.m_object, nullptr)) {}
    ShareRef& operator=(ShareRef other) noexcept {
        std::swap(m_object, other.m_object);
        return *this;
    }
    ~ShareRef() {
        if (m_object != nullptr)
            m_object->Release();
    }

    Object* Get() const { return m_object; }

private:
    Object* m_object = nullptr;
};

// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_source_mac.h"

#include "platform/app_kit.h"
#include "src/mac/monitor_enum_mac.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstring>
#include <new>
#include <string>

namespace {

/// Copies `text` with its terminator, as far as `length` bytes go, and ends it behind the last byte copied.
void CopyName(const char* text, char* out, int length) {
    const std::size_t count = std::min(std::strlen(text) + 1, static_cast<std::size_t>(length));
    std::memcpy(out, text, count);
    out[count] = 0;
}

/// A whole text buffer with the first `length` bytes of `text`; null without memory.
std::unique_ptr<char[]> NewText(const char* text, std::size_t length) {
    constexpr std::size_t MOST = SHARE_SOURCE_TEXT_SIZE - 1;
    std::unique_ptr<char[]> buffer(new (std::nothrow) char[SHARE_SOURCE_TEXT_SIZE]{});
    if (buffer != nullptr)
        std::memcpy(buffer.get(), text, std::min(length, MOST));
    return buffer;
}

} // namespace

int CShareSourceMac::GetName(char* out, int length) {
    if (out == nullptr || length < 1) {
        CmTraceDebug("[CShareSourceMac::GetName]>> invalid dest");
        return SHARE_RESULT_FAILED;
    }
    if (m_info.sourceId == 0) {
        CmTraceInfo("[CShareSourceMac::GetName]>> invalid source id");
        return SHARE_RESULT_FAILED;
    }
    const char* const name = KeptName();
    if (name == nullptr) {
        CmTraceInfo("[CShareSourceMac::GetName]>>  get name fail");
        return SHARE_RESULT_FAILED;
    }
    CopyName(name, out, length);
    CmTraceDebug("[CShareSourceMac::GetName]>>  name=", static_cast<const char*>(out));
    return SHARE_RESULT_OK;
}

const char* CShareSourceMac::KeptName() {
    const std::atomic_ref<char*> kept(m_info.pName);
    if (const char* const name = kept.load(std::memory_order_acquire))
        return name;
    Text found = LookUpName(); // NOLINT(clang-analyzer-cplusplus.NewDeleteLeaks): the record keeps it
    if (found == nullptr)
        return nullptr;
    // Others may have looked it up meanwhile, and may be reading it: the first name stays.
    char* first = nullptr;
    if (!kept.compare_exchange_strong(first, found.get(), std::memory_order_acq_rel))
        return first;
    return found.release();
}

CShareSourceMac::Text CShareSourceMac::LookUpName() const {
    if (m_info.eType == SHARE_SOURCE_TYPE_MONITOR) {
        const std::string name =
            CMonitorEnumMac::screenNameForDisplayID(static_cast<unsigned>(m_info.sourceId));
        return name.empty() ? nullptr : NewText(name.data(), name.size());
    }
    if (m_info.eType != SHARE_SOURCE_TYPE_APP)
        return nullptr;
    char name[SHARE_SOURCE_TEXT_SIZE + 1] = {};
    const auto pid = static_cast<int>(m_info.sourceId);
    const bool found = CShareSourceUtilMac::GetApplicationName(pid, name, SHARE_SOURCE_TEXT_SIZE);
    return found ? NewText(name, SHARE_SOURCE_TEXT_SIZE) : nullptr;
}

bool CShareSourceUtilMac::GetApplicationName(int pid, char* out, int length) {
    const auto application = platform::NSRunningApplication::runningApplicationWithProcessIdentifier(pid);
    if (!application || out == nullptr || length < 0) {
        CmTraceInfo("[CShareSourceUtilMac::GetApplicationName(]>> fail");
        return false;
    }
    CopyName(application->localizedName().c_str(), out, length);
    CmTraceInfo("[CShareSourceUtilMac::GetApplicationName(]>> name=", static_cast<const char*>(out));
    return true;
}

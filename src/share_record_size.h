// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstring>

/// Fills a client's record as far as both sides know its fields.
///
/// The client may have been built with an earlier or a later version of the record: plain data that begins
/// with its size in bytes, `structSize`, and grows at its end only. Nothing behind that size is written, and
/// the size stays as the client has set it.
template <class Record>
void ShareFillRecord(const Record& known, Record* clients) {
    const auto structSize = clients->structSize;
    std::memcpy(clients, &known, std::min<std::size_t>(structSize, sizeof known));
    clients->structSize = structSize;
}

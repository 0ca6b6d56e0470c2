// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_source.h"
#include "src/share_source_enum.h"

/// A source that stands for nothing.
class CShareSourceDummy : public CShareSource {
public:
    ~CShareSourceDummy() override = default;
};

/// Always the same five sources, with the ids 0 to 4 and nothing else in them. For runs without a window
/// server.
class CShareSourceEnumeratorDummy : public CShareSourceEnumerator {
public:
    explicit CShareSourceEnumeratorDummy(ShareSourceType type);
    ~CShareSourceEnumeratorDummy() override = default;

private:
    void init();

    const ShareSourceType m_eSourceType;
};

class CShareSourceEnumeratorDummyApp : public CShareSourceEnumeratorDummy {
public:
    CShareSourceEnumeratorDummyApp() : CShareSourceEnumeratorDummy(SHARE_SOURCE_TYPE_APP) {}
    ~CShareSourceEnumeratorDummyApp() override = default;
};

class CShareSourceEnumeratorDummyDesktop : public CShareSourceEnumeratorDummy {
public:
    CShareSourceEnumeratorDummyDesktop() : CShareSourceEnumeratorDummy(SHARE_SOURCE_TYPE_MONITOR) {}
    ~CShareSourceEnumeratorDummyDesktop() override = default;
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "mailbox.h"

#include <screenshare/share_engine.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

// A source for as long as somebody has one of these.
using SourceRef = std::shared_ptr<IShareSource>;

// Takes over a reference, such as GetSource gives.
inline SourceRef Adopt(IShareSource* source) {
    return SourceRef(source, [](IShareSource* held) { held->Release(); });
}

// Keeps a source that is only shown, as in an event.
inline SourceRef Hold(IShareSource* source) {
    source->AddRef();
    return Adopt(source);
}

// Empty when there is none (yet).
inline std::string NameOf(IShareSource& source) {
    char name[SHARE_SOURCE_TEXT_SIZE + 1] = ""; // one byte more than GetName is told of
    return source.GetName(name, SHARE_SOURCE_TEXT_SIZE) == SHARE_RESULT_OK ? name : "";
}

// An enumerator that watches the desktop, and the sink that hears of its changes.
class WatchedSources : private IShareSourceEnumSink {
public:
    // Called on the main thread.
    using Changed =
        std::function<void(SHARE_SOURCE_EVENT event, const SourceRef& source, const std::string& name)>;

    WatchedSources(SHARE_SOURCE_ENUMERATOR_TYPE type, Mailbox& mailbox, Changed changed)
        : m_mailbox(mailbox),
          m_changed(std::move(changed)),
          m_enumerator(CreateShareSourceEnumerator(type, true)) {
        if (m_enumerator == nullptr)
            throw std::runtime_error("no list of sources");
        // In this order nothing is missed. What starts in between is both listed and told of.
        m_enumerator->AddSink(this);
        m_enumerator->Refresh();
    }
    ~WatchedSources() {
        m_enumerator->RemoveSink(this); // waits for an event that is under way
        DestroyShareSourceEnumerator(m_enumerator);
    }
    WatchedSources(const WatchedSources&) = delete;
    WatchedSources& operator=(const WatchedSources&) = delete;

    // From the end, so that one that goes meanwhile moves none behind our back. New ones come as events.
    std::vector<SourceRef> List() const {
        int number = 0;
        m_enumerator->GetNumber(number);
        std::vector<SourceRef> sources;
        for (int i = number - 1; i >= 0; --i) {
            IShareSource* source = nullptr;
            if (m_enumerator->GetSource(i, &source) == SHARE_RESULT_OK)
                sources.push_back(Adopt(source));
        }
        return {sources.rbegin(), sources.rend()};
    }

private:
    // On a thread of the library. The name is asked for at once: a process that has ended tells it no more.
    int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) noexcept override {
        m_mailbox.Post(
            [this, event, held = Hold(source), name = NameOf(*source)] { m_changed(event, held, name); });
        return SHARE_RESULT_OK;
    }

    Mailbox& m_mailbox;
    const Changed m_changed;
    IShareSourceEnumerator* const m_enumerator;
};

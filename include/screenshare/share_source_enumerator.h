// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_source.h>
#include <screenshare/share_types.h>

/// Hears of changes in an enumerator's list.
///
/// Threads:  called on the thread that saw the change, a notification thread of the library for platform
///           changes. A sink may add and remove sinks inside the call; it must not destroy the enumerator.
///           Adding and removing sinks elsewhere, and destroying the enumerator, wait for a call that runs:
///           do it without a lock that the sink takes.
/// Lifetime: neither owned nor counted; remove it before it is destroyed. The source is valid during the
///           call; AddRef it to keep it.
class IShareSourceEnumSink {
public:
    /// The result is not looked at.
    virtual int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) = 0;

protected:
    ~IShareSourceEnumSink() = default;
};

/// Accepted by IShareSourceEnumerator::SetFilter; no enumeration asks it.
class IShareSourceFilter {
public:
    virtual ~IShareSourceFilter() = default;
};

/// The sinks of an enumerator, called in the order of adding.
class IShareSourceSinkMgr {
public:
    virtual ~IShareSourceSinkMgr() = default;

    /// -1 for null and for a sink that is there already.
    virtual int AddSink(IShareSourceEnumSink* sink) = 0;
    /// -1 for null and for a sink that is not there.
    virtual int RemoveSink(IShareSourceEnumSink* sink) = 0;
    virtual int CleanSink() = 0;
};

/// The sources of one kind.
///
/// Threads: any; indexes hold only until the next change, so accept -1 for one that has vanished.
/// Errors:  0, or -1.
class IShareSourceEnumerator : public IShareSourceSinkMgr {
public:
    /// Makes the list anew; sends no events.
    virtual void Refresh() = 0;
    virtual int GetNumber(int& number) = 0;
    /// Stores a source with a reference for the caller. -1 leaves `*out` as it was.
    virtual int GetSource(int index, IShareSource** out) = 0;
    /// The same by id. `*out` must be null before: of an unknown id, an object that stands there already gets
    /// another reference and the answer is 0.
    virtual int GetSourceBySourceId(unsigned long id, IShareSource** out) = 0;
    /// Accepted and without effect.
    virtual void SetFilter(IShareSourceFilter* filter) = 0;
    /// A SHARE_SOURCE_ENUMERATOR_TYPE, 0 for the dummies.
    virtual int GetShareSourceEnumeratorType() = 0;
    /// Takes a source off the list and hands it out with a reference, unless `out` is null. False for an
    /// unknown id.
    virtual bool RemoveSourceById(unsigned long id, IShareSource** out) = 0;
    /// Calls every sink. -1 for a null source.
    virtual int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) = 0;
    /// Drops all sources and all sinks.
    virtual void Cleanup() = 0;
};

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>

/// Memory that runs out where a test says. A program that has scarce_memory.cpp in it allocates by the
/// operators of that file.

/// Who finds none.
enum class Poor {
    Caller, ///< The thread that makes the scope.
    Others, ///< All threads but that one.
};

/// How often: allocation number N alone, or that one and all that follow.
enum class Lack {
    Once,
    Lasting,
};

/// For the length of a scope only so many allocations succeed. One at a time.
class CScarceMemory {
public:
    CScarceMemory(Poor poor, Lack lack, long allocations);
    ~CScarceMemory() { End(); }
    CScarceMemory(const CScarceMemory&) = delete;
    CScarceMemory& operator=(const CScarceMemory&) = delete;

    /// From here on there is enough. Gives how many were refused; 0 when it has lasted.
    long End();
};

/// The thread finds memory all the same: for what a test does on threads of the library.
class CPlentyScope {
public:
    CPlentyScope();
    ~CPlentyScope();
    CPlentyScope(const CPlentyScope&) = delete;
    CPlentyScope& operator=(const CPlentyScope&) = delete;
};

/// How many allocations they ask for meanwhile.
long CountAllocations(Poor poor, const std::function<void()>& work);

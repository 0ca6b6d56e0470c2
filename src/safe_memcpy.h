// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>

/// A copy that checks its bounds, the handler that hears of its failures, and the fills and moves it rests
/// on.
///
/// Threads: any. The handlers are meant to be set once, at the start.
/// Errors:  only omnal_memcpy_s has any.

// ---- The handler

using safe_lib_constraint_handler = void (*)(const char* message, void* context, int error);

/// The handler in force and the one before it; both are safe_lib_default_constraint_handler at first.
extern std::atomic<safe_lib_constraint_handler> current_constraint_handler;
extern std::atomic<safe_lib_constraint_handler> previous_constraint_handler;

// These do nothing.
void safe_lib_default_constraint_handler(const char* message, void* context, int error);
void safe_lib_ignore_handler(const char* message, void* context, int error);

/// Puts `handler` in force, the default one if it is null; gives the one that was.
safe_lib_constraint_handler safe_lib_set_constraint_handler(safe_lib_constraint_handler handler);

/// Calls the handler in force, if there is one.
void invoke_safe_lib_constraint_handler(const char* message, void* context, int error);

// ---- The copy

/// Copies `smax` bytes into an area of `dmax` bytes; what lies behind them stays. 0, or what is wrong, which
/// the handler hears too:
///   400  a null pointer
///   401  a length of 0
///   403  a negative length, a `dmax` of 256 MiB or more, an `smax` above `dmax`
///   404  the areas overlap, that of `dest` taken in its full length; `dest` may equal `src`
/// Unless `dest` or `dmax` is at fault, a failure clears all of `dest`: no old content passes for a copy.
int omnal_memcpy_s(void* dest, int dmax, const void* src, int smax);

// ---- The primitives. Lengths count elements: bytes, or what the name says. Any address will do.

void mem_prim_set(void* dest, unsigned len, unsigned char value);
void mem_prim_set16(unsigned short* dest, unsigned len, unsigned short value);
void mem_prim_set32(unsigned* dest, unsigned len, unsigned value);

// The areas may overlap.
void mem_prim_move(void* dest, const void* src, unsigned len);
void mem_prim_move8(void* dest, const void* src, unsigned len);
void mem_prim_move16(void* dest, const void* src, unsigned len);
void mem_prim_move32(void* dest, const void* src, unsigned len);

// The base library's semaphores, which every lock of the runtime waits on. Any thread may acquire and release. One
// thread creates and frees a semaphore while no other uses it. A release happens before the return of the acquire that
// takes it.
//
// The system semaphore waits in the system each time. States by operations (c: releases not yet consumed):
//
//                       Release(n)                       Acquire
//   c = 0               c + n, n signals                 waits for a signal, then c - 1
//   c > 0               min(c + n, max), a signal for    takes a signal, then c - 1
//                       each unit added
//
// The counting semaphore asks the system only when a thread must wait. c is negative for threads that wait:
//
//                       Release(n)                       Acquire
//   c > 0               c + n                            c - 1, goes on
//   c = 0               c + n                            c - 1, waits on the system semaphore
//   c < 0               c + n, wakes min(n, -c)          c - 1, waits on the system semaphore
#pragma once

#include "PlatformDependent/Linux/DispatchSemaphore.h"

#include <atomic>
#include <cstdint>

namespace ZarvoClassic {

// The limit of outstanding releases; releases beyond it are dropped.
constexpr int32_t Footing_SystemSemaphore_MaxCount = 0x7FFFFFFF;

struct Footing_SystemSemaphore_Storage {
    dispatch_semaphore_t platformSemaphore;
    std::atomic<int32_t> count; // never below the signals that the platform semaphore holds
};
using Footing_SystemSemaphore_Handle = Footing_SystemSemaphore_Storage*;

// Makes a semaphore with no releases in storage, which must outlive the handle and must not move. Ends the process when
// the platform refuses.
Footing_SystemSemaphore_Handle Footing_SystemSemaphore_CreateInplace(Footing_SystemSemaphore_Storage* storage);

// Waits for one release, without a time limit, and takes it.
void Footing_SystemSemaphore_Acquire(Footing_SystemSemaphore_Handle handle);

void Footing_SystemSemaphore_Release(Footing_SystemSemaphore_Handle handle, uint32_t count);

// Nobody may be waiting.
void Footing_SystemSemaphore_FreeInplace(Footing_SystemSemaphore_Handle handle);

struct Footing_Semaphore {
    Footing_SystemSemaphore_Storage storage;
    Footing_SystemSemaphore_Handle handle;
    std::atomic<int32_t> count;
};

// These do the same for the counting semaphore. Its count, with the waiting threads, must stay within 32 bits.
void Footing_Semaphore_CreateInplace(Footing_Semaphore* semaphore);
void Footing_Semaphore_Acquire(Footing_Semaphore* semaphore);
void Footing_Semaphore_Release(Footing_Semaphore* semaphore, uint32_t count);
void Footing_Semaphore_FreeInplace(Footing_Semaphore* semaphore);

} // namespace ZarvoClassic

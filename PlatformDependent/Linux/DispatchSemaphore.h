// Dispatch semaphores, as other systems name them: counting semaphores on the heap.
//
//   dispatch_semaphore_t semaphore = dispatch_semaphore_create(0);   // null when memory is refused
//   dispatch_semaphore_signal(semaphore);                            // any thread
//   dispatch_semaphore_wait(semaphore, DISPATCH_TIME_FOREVER);       // any thread; 0 once a signal was taken
//   dispatch_release(semaphore);                                     // while no thread waits
//
// A signal happens before the return of the wait that takes it (sem_t synchronises memory), so it can hand data over.
#pragma once

#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <limits.h>
#include <semaphore.h>

struct dispatch_semaphore_s {
    sem_t semaphore;
};
using dispatch_semaphore_t = dispatch_semaphore_s*;

enum dispatch_time_t : uint64_t {
    DISPATCH_TIME_NOW = 0, // do not wait
    DISPATCH_TIME_FOREVER = ~uint64_t{0},
};

inline dispatch_semaphore_t dispatch_semaphore_create(intptr_t value) {
    if (value < 0 || value > SEM_VALUE_MAX) return nullptr;
    auto semaphore = static_cast<dispatch_semaphore_t>(malloc(sizeof(dispatch_semaphore_s)));
    if (semaphore == nullptr) return nullptr;
    if (sem_init(&semaphore->semaphore, 0, static_cast<unsigned>(value)) != 0) {
        free(semaphore);
        return nullptr;
    }
    return semaphore;
}

// 0 when a signal was taken. A POSIX signal that interrupts the wait does not end it.
inline intptr_t dispatch_semaphore_wait(dispatch_semaphore_t semaphore, dispatch_time_t timeout) {
    int result;
    do
        result = timeout == DISPATCH_TIME_NOW ? sem_trywait(&semaphore->semaphore) : sem_wait(&semaphore->semaphore);
    while (result != 0 && errno == EINTR);
    return result;
}

inline void dispatch_semaphore_signal(dispatch_semaphore_t semaphore) { sem_post(&semaphore->semaphore); }

inline void dispatch_release(dispatch_semaphore_t semaphore) {
    sem_destroy(&semaphore->semaphore);
    free(semaphore);
}

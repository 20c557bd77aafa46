#include "Footing/Semaphore.h"

#include "Footing/Process.h"

#include <algorithm>
#include <new>

namespace ZarvoClassic {

Footing_SystemSemaphore_Handle Footing_SystemSemaphore_CreateInplace(Footing_SystemSemaphore_Storage* storage) {
    auto handle = new (storage) Footing_SystemSemaphore_Storage{dispatch_semaphore_create(0), 0};
    if (handle->platformSemaphore == nullptr) C99Api::Footing_Process_Abort(Footing_ErrorCode_OutOfMemory);
    return handle;
}

void Footing_SystemSemaphore_Acquire(Footing_SystemSemaphore_Handle handle) {
    if (dispatch_semaphore_wait(handle->platformSemaphore, DISPATCH_TIME_FOREVER) != 0) return;
    // Counted down after the signal is taken, so that the count is never below the platform semaphore's. Release order
    // is enough: the signal has already made the releaser's writes visible.
    handle->count.fetch_sub(1, std::memory_order_release);
}

void Footing_SystemSemaphore_Release(Footing_SystemSemaphore_Handle handle, uint32_t count) {
    int32_t before = handle->count.load(std::memory_order_relaxed);
    uint64_t after;
    do // in 64 bits, because the sum of two 32-bit counts may overflow
        after = std::min<uint64_t>(uint64_t{static_cast<uint32_t>(before)} + count, Footing_SystemSemaphore_MaxCount);
    while (!handle->count.compare_exchange_weak(before, static_cast<int32_t>(after), std::memory_order_acq_rel,
                                                std::memory_order_relaxed));

    for (int64_t added = static_cast<int64_t>(after) - before; added > 0; --added)
        dispatch_semaphore_signal(handle->platformSemaphore);
}

void Footing_SystemSemaphore_FreeInplace(Footing_SystemSemaphore_Handle handle) {
    dispatch_release(handle->platformSemaphore);
}

void Footing_Semaphore_CreateInplace(Footing_Semaphore* semaphore) {
    semaphore->handle = Footing_SystemSemaphore_CreateInplace(&semaphore->storage);
    semaphore->count.store(0, std::memory_order_relaxed);
}

void Footing_Semaphore_Acquire(Footing_Semaphore* semaphore) {
    // Acquire: without a wait, this read alone orders us after the releaser.
    if (semaphore->count.fetch_sub(1, std::memory_order_acquire) < 1)
        Footing_SystemSemaphore_Acquire(semaphore->handle);
}

void Footing_Semaphore_Release(Footing_Semaphore* semaphore, uint32_t count) {
    // Release: our writes happen before an acquire that does not wait.
    const int32_t before = semaphore->count.fetch_add(static_cast<int32_t>(count), std::memory_order_release);
    if (before >= 0) return;
    const uint32_t waiting = static_cast<uint32_t>(-static_cast<int64_t>(before));
    Footing_SystemSemaphore_Release(semaphore->handle, std::min(waiting, count));
}

void Footing_Semaphore_FreeInplace(Footing_Semaphore* semaphore) {
    Footing_SystemSemaphore_FreeInplace(semaphore->handle);
}

} // namespace ZarvoClassic

// The identity of threads.
#pragma once

#include <cstdint>

namespace ZarvoClassic {

// Never 0, and no other live thread's. The id of a thread that has ended may come again.
uint64_t Footing_Thread_GetCurrentThreadId();

} // namespace ZarvoClassic

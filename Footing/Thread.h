// Thread ids. Any thread.
#pragma once

#include <cstdint>

namespace ZarvoClassic {

// Never 0, and unique among live threads. The id of a thread that has ended may be used again.
uint64_t Footing_Thread_GetCurrentThreadId();

} // namespace ZarvoClassic

#include "Footing/Thread.h"

#include <pthread.h>

namespace ZarvoClassic {

uint64_t Footing_Thread_GetCurrentThreadId() { return static_cast<uint64_t>(pthread_self()); }

} // namespace ZarvoClassic

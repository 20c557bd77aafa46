// The current process.
#pragma once

#include <cstdint>

namespace ZarvoClassic {

enum Footing_ErrorCode : int32_t {
    Footing_ErrorCode_OutOfMemory = 1, // the system refused memory or another resource
    Footing_ErrorCode_Fatal = 2,       // a record with the fatal bit was reported
};

int32_t Footing_Process_GetCurrentProcessId();

// The working directory as an absolute path; null if it has been removed or memory is refused. The caller frees it with
// free().
char* Footing_Process_GetWorkingDirectory();

// Opens /dev/null on each closed descriptor from 0 to 2. Otherwise a file that is opened later could get such a number,
// and printed text would end up in it. Call this first in main, while there is one thread.
void Footing_Process_OpenStandardDescriptors();

} // namespace ZarvoClassic

namespace C99Api {

// Stops the process abnormally (SIGABRT). Any thread.
[[noreturn]] void Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode error);

} // namespace C99Api

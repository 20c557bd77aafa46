// What the base library knows of the process it runs in.
#pragma once

#include <cstdint>

namespace ZarvoClassic {

enum Footing_ErrorCode : int32_t {
    Footing_ErrorCode_OutOfMemory = 1, // the system refused memory or another resource
    Footing_ErrorCode_Fatal = 2,       // a record with the fatal bit was reported
};

int32_t Footing_Process_GetCurrentProcessId();

// The working directory as an absolute path, or null when there is none or memory is refused. The caller frees it with
// free().
char* Footing_Process_GetWorkingDirectory();

// Opens /dev/null on those of the descriptors 0 to 2 that are closed, so that no file that the program opens later gets
// one of them and with it what is printed. To be called first of all, while there is one thread.
void Footing_Process_OpenStandardDescriptors();

} // namespace ZarvoClassic

namespace C99Api {

// Stops the process abnormally (SIGABRT). Any thread.
[[noreturn]] void Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode error);

} // namespace C99Api

// What of the machine's resources a run may use. Any thread.
#pragma once

#include "Library/include/zarvo.h"
#include "Runtime/Core/Types.h"

// How many bytes of memory a run may take: what its options say, or half of what programs can have without anything
// being pushed out.
UInt64 MemoryBudget(const zarvo_run_options& options);

// How many descriptors the process may have open beside those kept for other uses; at least 1.
UInt64 FreeDescriptors(UInt64 kept);

// What of the machine's resources a run may use. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// How many bytes of memory a run may take: what its options say (wanted), or if that is 0, half of what programs can
// have without anything being pushed out.
UInt64 MemoryBudget(UInt64 wanted);

// How many descriptors the process may have open beside those kept for other uses; at least 1.
UInt64 FreeDescriptors(UInt64 kept);

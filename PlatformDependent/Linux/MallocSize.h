// malloc_size, as other systems name it: the usable size of a block of the C heap, 0 for null.
#pragma once

#include <malloc.h>

inline size_t malloc_size(const void* pointer) { return malloc_usable_size(const_cast<void*>(pointer)); }

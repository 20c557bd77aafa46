// The runtime's integer types. They are spelled as the compression libraries' headers spell theirs (64 bits is
// long long), so that both can be included side by side.
#pragma once

#include <cstddef>

using UInt8 = unsigned char;
using UInt16 = unsigned short;
using UInt32 = unsigned int;
using UInt64 = unsigned long long;
using SInt32 = int;
using SInt64 = long long;

static_assert(sizeof(UInt16) == 2 && sizeof(UInt32) == 4 && sizeof(UInt64) == 8 && sizeof(size_t) == 8,
              "the runtime's layouts are those of a 64-bit system");

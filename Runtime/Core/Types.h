// The runtime's integer types. They are the same types as in the compression libraries' headers (64 bits is long long),
// so that both can be included together.
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

#include "Runtime/Utilities/Format.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

core::string Format(const char* format, ...) {
    char buffer[10'240];
    va_list arguments;
    va_start(arguments, format);
    const int wanted = vsnprintf(buffer, sizeof(buffer), format, arguments);
    va_end(arguments);

    if (wanted < 0) return core::string(kMemLabelGeneral);
    const size_t length = std::min(static_cast<size_t>(wanted), sizeof(buffer) - 1);
    return core::string(core::string_ref(buffer, length), kMemLabelGeneral);
}

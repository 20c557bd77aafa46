#include "Runtime/Utilities/Format.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

core::basic_string<char> Format(const char* format, ...) {
    char buffer[10'240];
    va_list arguments;
    va_start(arguments, format);
    const int wanted = vsnprintf(buffer, sizeof(buffer), format, arguments);
    va_end(arguments);

    if (wanted < 0) return core::basic_string<char>(MemLabelId(kMemLabelGeneral));
    const size_t length = std::min(static_cast<size_t>(wanted), sizeof(buffer) - 1);
    return core::basic_string<char>(core::string_ref(buffer, length), kMemLabelGeneral);
}

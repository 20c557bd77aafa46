// System calls that a signal interrupts. Any thread.
#pragma once

#include <cerrno>

// Repeats call until it ends without -1 and EINTR, which is how it says that a signal interrupted it.
template <typename Call>
auto RepeatOnInterrupt(Call call) {
    auto result = call();
    while (result == -1 && errno == EINTR)
        result = call();
    return result;
}

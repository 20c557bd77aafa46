// Integers in big-endian order, as archives store them.
#pragma once

#include <bit>
#include <type_traits>

// Converts between a value and its big-endian form, in either direction.
template <typename T>
constexpr T FromBigEndian(T stored) {
    static_assert(std::is_unsigned_v<T> && (sizeof(T) == 2 || sizeof(T) == 4 || sizeof(T) == 8));
    static_assert(std::endian::native == std::endian::little, "only little-endian machines are served");
    if constexpr (sizeof(T) == 2)
        return __builtin_bswap16(stored);
    else if constexpr (sizeof(T) == 4)
        return __builtin_bswap32(stored);
    else
        return __builtin_bswap64(stored);
}

// Bytes of an archive, written field by field in the open: integers big-endian, strings with their NUL.
#pragma once

#include "Runtime/Core/Types.h"

#include <string>
#include <string_view>

class BigEndianBytes {
public:
    BigEndianBytes& U16(UInt64 value) { return Integer(value, 2); }
    BigEndianBytes& U32(UInt64 value) { return Integer(value, 4); }
    BigEndianBytes& U64(UInt64 value) { return Integer(value, 8); }
    BigEndianBytes& String(std::string_view text) {
        m_Bytes.append(text);
        m_Bytes.push_back('\0');
        return *this;
    }
    BigEndianBytes& Raw(std::string_view bytes) {
        m_Bytes.append(bytes);
        return *this;
    }
    BigEndianBytes& Fill(size_t count, char byte = '\0') {
        m_Bytes.append(count, byte);
        return *this;
    }
    // Fills up to a multiple of size.
    BigEndianBytes& AlignTo(size_t size) { return Fill((size - m_Bytes.size() % size) % size); }

    size_t size() const { return m_Bytes.size(); }
    const std::string& Get() const { return m_Bytes; }

private:
    BigEndianBytes& Integer(UInt64 value, int size) {
        for (int shift = 8 * (size - 1); shift >= 0; shift -= 8)
            m_Bytes.push_back(static_cast<char>(value >> shift & 0xFF));
        return *this;
    }

    std::string m_Bytes;
};

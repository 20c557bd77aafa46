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
    BigEndianBytes& String(std::string_view text) { return Raw(text).Fill(1); }
    BigEndianBytes& Raw(std::string_view bytes) { return m_Bytes += bytes, *this; }
    BigEndianBytes& Fill(size_t count, char byte = '\0') { return m_Bytes.append(count, byte), *this; }

    size_t size() const { return m_Bytes.size(); }
    const std::string& Get() const { return m_Bytes; }

private:
    BigEndianBytes& Integer(UInt64 value, int size) {
        while (size-- > 0)
            Fill(1, static_cast<char>(value >> (8 * size)));
        return *this;
    }

    std::string m_Bytes;
};

// core::string_ref: a view of text that somebody else owns. It is passed by value, does not end in a NUL, and is good
// for as long as the text is; core::string and NUL-terminated text convert to it.
//
//   bool IsHidden(core::string_ref name) { return name.starts_with("."); }
//
// Views share nothing: a thread may use one while its text is not changed.
#pragma once

#include "Runtime/Core/Types.h"

#include <algorithm>
#include <cstring>

enum ComparisonType : SInt32 {
    kCaseSensitive = 0,   // bytes as unsigned values; so is any value but the next
    kCaseInsensitive = 1, // the ASCII letters A to Z count as a to z
};

namespace core {

template <typename T>
class basic_string_ref {
    static_assert(sizeof(T) == 1, "text is bytes");

public:
    static constexpr size_t npos = ~size_t{0}; // "not found", and "to the end"

    constexpr basic_string_ref() = default;
    constexpr basic_string_ref(const T* text, size_t length) : m_Data(text), m_Size(length) {}
    basic_string_ref(const T* nulTerminated) : m_Data(nulTerminated), m_Size(strlen(nulTerminated)) {}
    basic_string_ref(std::nullptr_t) = delete;

    constexpr const T* data() const { return m_Data; } // may be null when empty
    constexpr size_t size() const { return m_Size; }
    constexpr size_t length() const { return m_Size; }
    constexpr bool empty() const { return m_Size == 0; }
    constexpr const T& operator[](size_t index) const { return m_Data[index]; }
    constexpr const T& back() const { return m_Data[m_Size - 1]; }
    constexpr const T* begin() const { return m_Data; }
    constexpr const T* end() const { return m_Data + m_Size; }

    // Negative, 0 or positive as the view orders before, equal to or after the NUL-terminated text: the difference of
    // the first two bytes that differ. A view that holds a NUL where the text ends is after it.
    int compare(const T* nulTerminated, ComparisonType type = kCaseSensitive) const;

    // The order of strings: the first byte that differs decides; a text comes before its continuations.
    int compare(const basic_string_ref& other) const;

    bool starts_with(const basic_string_ref& prefix, ComparisonType type = kCaseSensitive) const;

    // Where the count characters at text occur first at or after pos, in any case; npos when they don't. An empty text
    // is found at pos, wherever that is.
    size_t find_case_insensitive(const T* text, size_t pos, size_t count) const;

    size_t find(T character, size_t pos = 0) const;
    size_t find(const basic_string_ref& text, size_t pos = 0) const;
    size_t rfind(T character) const;

    // Both are cut to what the view has.
    constexpr basic_string_ref substr(size_t pos, size_t count = npos) const {
        pos = std::min(pos, m_Size);
        return {m_Data + pos, std::min(count, m_Size - pos)};
    }

    friend bool operator==(const basic_string_ref& a, const basic_string_ref& b) {
        return a.m_Size == b.m_Size && (a.m_Size == 0 || memcmp(a.m_Data, b.m_Data, a.m_Size) == 0);
    }
    friend bool operator<(const basic_string_ref& a, const basic_string_ref& b) { return a.compare(b) < 0; }

private:
    const T* m_Data = nullptr;
    size_t m_Size = 0;
};

using string_ref = basic_string_ref<char>;

static_assert(sizeof(string_ref) == 16);

extern template class basic_string_ref<char>;

} // namespace core

// Copies what fits of the srcLen characters at src, which may be a part of dst, writes a NUL behind them and returns
// how many were copied. A dstSize of 0 writes nothing at all.
size_t strcpy_truncate(char* dst, const char* src, size_t dstSize, size_t srcLen);

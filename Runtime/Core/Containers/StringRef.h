// core::string_ref: a view of text that it does not own, which must outlive it. It is passed by value and does not end
// in a NUL. core::string and NUL-terminated text convert to it.
//
//   bool IsHidden(core::string_ref name) { return name.starts_with("."); }
//
// Any thread may use a view as long as nobody changes the text.
#pragma once

#include "Runtime/Core/Types.h"

#include <algorithm>
#include <cstring>

enum ComparisonType : SInt32 {
    kCaseSensitive = 0,   // bytes as unsigned values; any other value but 1 means the same
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

    // The first position from pos on where the count characters at text occur in any case, or npos. An empty text is
    // found at pos, even after the view's end.
    size_t find_case_insensitive(const T* text, size_t pos, size_t count) const;

    size_t find(T character, size_t pos = 0) const;
    size_t find(const basic_string_ref& text, size_t pos = 0) const;
    size_t rfind(T character) const;

    // pos and count are limited to the view's size.
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

// Copies as many of the srcLen characters at src as fit before a NUL in dstSize bytes, writes the NUL after them and
// returns how many it has copied. src may be a part of dst. With a dstSize of 0 nothing is written.
size_t strcpy_truncate(char* dst, const char* src, size_t dstSize, size_t srcLen);

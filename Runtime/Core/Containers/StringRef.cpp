#include "Runtime/Core/Containers/StringRef.h"

#include <cctype>
#include <limits>

namespace core {

// tolower takes the values of unsigned char; only the low 8 bits of its result are compared.
template <typename T>
static int FoldedByte(T character, bool foldCase) {
    const auto byte = static_cast<UInt8>(character);
    return foldCase ? static_cast<UInt8>(tolower(byte)) : byte;
}

template <typename T>
static bool EqualsFolded(const T* a, const T* b, size_t count) {
    for (size_t i = 0; i < count; ++i)
        if (FoldedByte(a[i], true) != FoldedByte(b[i], true)) return false;
    return true;
}

template <typename T>
int basic_string_ref<T>::compare(const T* nulTerminated, ComparisonType type) const {
    const bool foldCase = type == kCaseInsensitive;
    for (size_t i = 0; i < m_Size; ++i) {
        const int ours = FoldedByte(m_Data[i], foldCase);
        const int theirs = FoldedByte(nulTerminated[i], foldCase);
        if (ours != theirs) return ours - theirs;
        if (theirs == 0) return 1;
    }
    return -FoldedByte(nulTerminated[m_Size], foldCase);
}

template <typename T>
int basic_string_ref<T>::compare(const basic_string_ref& other) const {
    if (const size_t common = std::min(m_Size, other.m_Size); common != 0)
        if (const int difference = memcmp(m_Data, other.m_Data, common); difference != 0) return difference;

    // Clamped, not cut to 32 bits, so that the shorter comes first whatever the difference is.
    constexpr size_t kMost = std::numeric_limits<int>::max();
    if (m_Size < other.m_Size) return -static_cast<int>(std::min(other.m_Size - m_Size, kMost));
    return static_cast<int>(std::min(m_Size - other.m_Size, kMost));
}

template <typename T>
bool basic_string_ref<T>::starts_with(const basic_string_ref& prefix, ComparisonType type) const {
    if (m_Size < prefix.m_Size) return false;
    if (prefix.empty()) return true;
    if (type == kCaseInsensitive) return EqualsFolded(m_Data, prefix.m_Data, prefix.m_Size);
    return memcmp(m_Data, prefix.m_Data, prefix.m_Size) == 0;
}

template <typename T>
size_t basic_string_ref<T>::find_case_insensitive(const T* text, size_t pos, size_t count) const {
    if (count == 0) return pos;
    if (pos > m_Size || count > m_Size - pos) return npos;
    for (size_t start = pos; start <= m_Size - count; ++start)
        if (EqualsFolded(m_Data + start, text, count)) return start;
    return npos;
}

template <typename T>
size_t basic_string_ref<T>::find(T character, size_t pos) const {
    if (pos >= m_Size) return npos;
    const void* found = memchr(m_Data + pos, static_cast<UInt8>(character), m_Size - pos);
    return found == nullptr ? npos : static_cast<size_t>(static_cast<const T*>(found) - m_Data);
}

template <typename T>
size_t basic_string_ref<T>::find(const basic_string_ref& text, size_t pos) const {
    if (pos > m_Size || text.m_Size > m_Size - pos) return npos;
    const T* found = std::search(m_Data + pos, end(), text.begin(), text.end());
    return found == end() && !text.empty() ? npos : static_cast<size_t>(found - m_Data);
}

template <typename T>
size_t basic_string_ref<T>::rfind(T character) const {
    for (size_t i = m_Size; i != 0; --i)
        if (m_Data[i - 1] == character) return i - 1;
    return npos;
}

template class basic_string_ref<char>;

} // namespace core

size_t strcpy_truncate(char* dst, const char* src, size_t dstSize, size_t srcLen) {
    if (dstSize == 0) return 0;
    const size_t count = std::min(srcLen, dstSize - 1);
    if (count != 0) memmove(dst, src, count);
    dst[count] = '\0';
    return count;
}

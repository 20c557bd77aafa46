#include "Runtime/Core/Containers/StringStorage.h"

#include <algorithm>
#include <functional>

namespace core {

template <typename T>
T* StringStorageDefault<T>::grow(size_t count) {
    if (count <= capacity()) return writable_data();
    if (count == ~size_t{0}) return nullptr; // leaves no room for the NUL

    if (is_heap()) {
        T* buffer = static_cast<T*>(realloc_internal(load<T*>(kPointerOffset), count + 1, kBufferAlignment, m_Label,
                                                     kAllocateOptionNone, __FILE__, __LINE__));
        if (buffer == nullptr) return nullptr;
        store(kPointerOffset, buffer);
        store(kCapacityOffset, count);
        return buffer;
    }

    const T* text = data();
    const size_t textSize = size();
    count = std::max(count, textSize); // borrowed text may be longer than the room asked for
    if (count <= kInlineCapacity) {
        memcpy(m_Area, text, textSize);
        set_inline_size(textSize);
        return m_Area;
    }
    T* buffer =
        static_cast<T*>(malloc_internal(count + 1, kBufferAlignment, m_Label, kAllocateOptionNone, __FILE__, __LINE__));
    if (buffer == nullptr) return nullptr;
    memcpy(buffer, text, textSize);
    buffer[textSize] = T{};
    store_words(buffer, count, textSize);
    set_mode(kModeHeap | (mode() & ~kModeMask));
    return buffer;
}

template <typename T>
void StringStorageDefault<T>::append(const T* text, size_t count) {
    if (count == 0) return;
    const size_t oldSize = size();
    const size_t newSize = oldSize + count;
    T* buffer = writable_data();
    if (newSize > capacity()) {
        const bool isOwnText = is_own_text(text);
        const size_t offset = isOwnText ? static_cast<size_t>(text - data()) : 0;
        buffer = RequireMemory(grow(std::max(newSize, is_inline() ? kFirstSpillCapacity : 2 * capacity())));
        if (isOwnText) text = buffer + offset;
    }
    memmove(buffer + oldSize, text, count);
    set_size_and_terminate(newSize);
}

template <typename T>
void StringStorageDefault<T>::assign(const T* text, size_t count) {
    if (is_external()) {
        set_inline_size(0);
    } else if (is_own_text(text)) {
        memmove(writable_data(), text, count);
        set_size_and_terminate(count);
        return;
    } else {
        set_size_and_terminate(0); // nothing of the old text is copied when the buffer changes
    }
    T* buffer = RequireMemory(grow(count));
    if (count != 0) memcpy(buffer, text, count);
    set_size_and_terminate(count);
}

template <typename T>
void StringStorageDefault<T>::assign(const StringStorageDefault& other) {
    if (this != &other) assign(other.data(), other.size());
}

template <typename T>
void StringStorageDefault<T>::assign(StringStorageDefault&& other) {
    if (this == &other) return;
    if (is_heap()) free_buffer();
    set_inline_size(0);

    if (other.is_inline()) {
        memcpy(m_Area, other.m_Area, sizeof(m_Area));
    } else if (other.is_external() || m_Label == other.m_Label) {
        store_words(other.data(), other.capacity(), other.size());
        set_mode((other.mode() & kModeMask) | kInlineCapacity);
    } else {
        assign(other.data(), other.size());
        other.free_buffer();
    }
    other.set_inline_size(0);
}

template <typename T>
void StringStorageDefault<T>::truncate(size_t count) {
    if (count == size()) return;
    if (is_external())
        assign(data(), count);
    else
        set_size_and_terminate(count);
}

template <typename T>
void StringStorageDefault<T>::borrow(const T* nulTerminated) {
    const size_t textSize = strlen(nulTerminated);
    if (textSize == 0) return;
    store_words(nulTerminated, 0, textSize);
    set_mode(kModeExternal | kInlineCapacity);
}

// std::less, because the text may lie anywhere.
template <typename T>
bool StringStorageDefault<T>::is_own_text(const T* text) const {
    const std::less<const T*> isBefore;
    return !isBefore(text, data()) && isBefore(text, data() + size());
}

template <typename T>
void StringStorageDefault<T>::set_size_and_terminate(size_t size) {
    if (is_inline()) {
        set_inline_size(size);
    } else {
        writable_data()[size] = T{};
        store(kSizeOffset, size);
    }
}

template <typename T>
void StringStorageDefault<T>::store_words(const T* pointer, size_t capacity, size_t size) {
    store(kPointerOffset, pointer);
    store(kCapacityOffset, capacity);
    store(kSizeOffset, size);
}

template class StringStorageDefault<char>;

} // namespace core

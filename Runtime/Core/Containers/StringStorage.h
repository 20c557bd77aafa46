// core::StringStorageDefault: the characters of a core::string, and the engine of everything that changes them.
// Texts of up to 31 characters lie in the object, longer ones in a buffer under the label. Borrowed text is read in
// place until the first operation that writes. Not synchronised: a string belongs to one thread at a time.
//
// The object is a 32-byte area and the label. The area's last byte tells how the rest is read:
//
//   byte 31     mode       bytes 0-30
//   31 - size   inline     the characters. A text of 31 has the mode byte 0, which is its terminating NUL too
//   01xxxxxx    heap       pointer at 0, capacity at 8, size at 16; the buffer is ours: capacity + 1 bytes
//   10xxxxxx    external   the same with capacity 0; the text is borrowed, never written or freed
//   11xxxxxx    never
//
// The x mean nothing: growing leaves them as they were; moving and borrowing set them. Inline and heap text ends in a
// NUL at [size]. Nothing in the area points into the object, so a string may be moved byte by byte. A buffer never
// shrinks; it stays until the string is moved from or to.
#pragma once

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <cstring>

namespace core {

template <typename T>
class StringStorageDefault : private NonCopyable {
    static_assert(sizeof(T) == 1, "text is bytes");

public:
    static constexpr size_t kInlineCapacity = 31;

    // Empty. The label is for life: no assignment changes it.
    explicit StringStorageDefault(MemLabelId label) : m_Area{}, m_Label(label) { set_inline_size(0); }
    ~StringStorageDefault() {
        if (is_heap()) free_buffer();
    }

    const T* data() const { return is_inline() ? m_Area : load<const T*>(kPointerOffset); }
    size_t size() const { return is_inline() ? kInlineCapacity - mode() : load<size_t>(kSizeOffset); }
    size_t capacity() const { return is_inline() ? kInlineCapacity : load<size_t>(kCapacityOffset); }
    MemLabelId get_memory_label() const { return m_Label; }
    bool is_external() const { return (mode() & kModeMask) == kModeExternal; }

    // Makes room for count characters and returns where they are written. Copies borrowed text unless count is 0. Null
    // when memory is refused; nothing has changed then.
    [[nodiscard]] T* grow(size_t count);

    // The text may be a part of the string's own. Here and below the process ends when memory is refused.
    void append(const T* text, size_t count);
    void assign(const T* text, size_t count);

    void assign(const StringStorageDefault& other);

    // Leaves other empty. A buffer changes hands only between equal labels; otherwise its text is copied.
    void assign(StringStorageDefault&& other);

    // Keeps the first count characters, of which there must be that many.
    void truncate(size_t count);

    // Makes an empty inline string read a text in place; the text must outlive it. An empty text is not borrowed.
    void borrow(const T* nulTerminated);

private:
    // Mode byte: bits 6 and 7 are the mode; inline, the whole byte is the capacity that is left.
    static constexpr UInt8 kModeMask = 192, kModeHeap = 64, kModeExternal = 128;
    static constexpr size_t kPointerOffset = 0, kCapacityOffset = 8, kSizeOffset = 16, kModeOffset = 31;
    static constexpr size_t kBufferAlignment = 16;
    static constexpr size_t kFirstSpillCapacity = 2 * kInlineCapacity;

    UInt8 mode() const { return static_cast<UInt8>(m_Area[kModeOffset]); }
    void set_mode(size_t mode) { m_Area[kModeOffset] = static_cast<T>(mode); }
    bool is_inline() const { return mode() < kModeHeap; }
    bool is_heap() const { return (mode() & kModeMask) == kModeHeap; }

    template <typename Word>
    Word load(size_t offset) const {
        Word word;
        memcpy(&word, m_Area + offset, sizeof(word));
        return word;
    }
    template <typename Word>
    void store(size_t offset, Word word) {
        memcpy(m_Area + offset, &word, sizeof(word));
    }

    T* writable_data() { return is_inline() ? m_Area : load<T*>(kPointerOffset); }
    bool is_own_text(const T* text) const;
    void set_inline_size(size_t size) {
        m_Area[size] = T{};
        set_mode(kInlineCapacity - size);
    }
    void set_size_and_terminate(size_t size);
    void store_words(const T* pointer, size_t capacity, size_t size);
    void free_buffer() { free_alloc_internal(load<T*>(kPointerOffset), m_Label, __FILE__, __LINE__); }

    // The layout, checked inside the class because offsetof needs access to the members.
    static void check_layout() {
        static_assert(sizeof(StringStorageDefault) == 40 && offsetof(StringStorageDefault, m_Area) == 0 &&
                      sizeof(m_Area) == 32 && offsetof(StringStorageDefault, m_Label) == 32);
    }

    alignas(void*) T m_Area[kModeOffset + 1];
    MemLabelId m_Label;
};

extern template class StringStorageDefault<char>;

} // namespace core

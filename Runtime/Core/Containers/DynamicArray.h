// dynamic_array: a growable array with a memory label that it keeps for life. It may also wrap memory that it does not
// own: it reads and writes that memory but never frees it, and its first growth copies the elements into its own
// buffer.
//
//   dynamic_array<UInt8> stored(kMemLabelReadBatch);
//   if (!stored.resize_uninitialized(size)) return false;   // the bytes are not cleared first
//   auto window = dynamic_array<UInt8>::wrap(destination, 0, room, kMemLabelFileSystem);
//
// Growth moves elements byte by byte and calls none of their functions, so an element must hold no pointer to itself
// (core::string holds none).
// When memory is refused, try_push_back and what takes a size or a capacity answer false and leave the array as it was.
// Copying, push_back and emplace_back have no answer: they end the process.
// An array belongs to one thread at a time.
#pragma once

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Types.h"
#include "Runtime/Utilities/FixedReports.h"

#include <cstring>
#include <new>
#include <type_traits>
#include <utility>

enum ResizePolicy : SInt32 {
    kResizeDouble = 0, // the capacity doubles when that is more than the request
    kResizeExact = 1,  // the capacity becomes the request
};

namespace dynamic_array_detail {

// An array without its element type, and how it grows. The functions that change the capacity return the buffer. When
// memory is refused, that is the old one, and nothing has changed.
struct dynamic_array_data {
    static constexpr size_t kMaxSize = ~size_t{0} >> 1;
    static constexpr size_t kNotOwned = 1;

    void* data = nullptr;
    MemLabelId label;
    size_t size = 0;
    size_t capacityWord = kNotOwned; // 2 x capacity, + 1 when the buffer is not owned or there is none

    size_t capacity() const { return capacityWord >> 1; }
    bool owns_data() const { return (capacityWord & kNotOwned) == 0; }

    void* resize_buffer(size_t capacity, ResizePolicy policy, size_t elementSize, size_t alignment);
    // Exactly that capacity.
    void* reserve(size_t capacity, size_t elementSize, size_t alignment);
    // Twice the capacity, or 1.
    void* grow(size_t elementSize, size_t alignment);

    // Grows when one more element does not fit.
    void make_room_for_one(size_t elementSize, size_t alignment) {
        Check(size + 1 > size, FixedReports::kArraySizeWraps);
        if (size + 1 > capacity()) grow(elementSize, alignment);
        RequireMemory(size + 1 <= capacity());
    }

    // Frees the buffer, which must be owned; neither the elements nor the fields are touched.
    void free_buffer();
    // The state without a buffer.
    void reset();
};

static_assert(sizeof(dynamic_array_data) == 32 && offsetof(dynamic_array_data, data) == 0 &&
              offsetof(dynamic_array_data, label) == 8 && offsetof(dynamic_array_data, size) == 16 &&
              offsetof(dynamic_array_data, capacityWord) == 24);

// Whether elements have a memory label, which they then take from their array.
template <typename T>
constexpr bool kCarriesLabel =
    std::is_class_v<T> && !std::is_same_v<T, MemLabelId> && std::is_constructible_v<T, MemLabelId>;

} // namespace dynamic_array_detail

// Align is the buffer's alignment; 0 stands for the element type's own.
template <typename T, size_t Align = 0>
class dynamic_array {
public:
    // Without a buffer.
    dynamic_array() : dynamic_array(kMemLabelGeneral) {}
    explicit dynamic_array(MemLabelId label) : m_Array{.label = label} {}

    // Has the source's label, and its size as capacity.
    dynamic_array(const dynamic_array& other) : dynamic_array(other.m_Array.label) {
        if (other.size() == 0) return;
        RequireMemory(resize_buffer_nocheck(other.size(), kResizeExact));
        if constexpr (std::is_trivially_copyable_v<T>) {
            memcpy(m_Array.data, other.m_Array.data, other.size() * sizeof(T));
        } else {
            for (size_t i = 0; i < other.size(); ++i)
                construct(data() + i, other[i]);
        }
        m_Array.size = other.size();
    }
    dynamic_array(dynamic_array&& other) noexcept : dynamic_array(other.m_Array.label) { *this = std::move(other); }
    dynamic_array& operator=(const dynamic_array& other) = delete;

    // Takes over the source's buffer, owned or not, and leaves the source without one. The label stays.
    dynamic_array& operator=(dynamic_array&& other) noexcept;

    ~dynamic_array() {
        release();
        m_Array.data = nullptr;
    }

    // Uses the caller's memory, which must outlive the array.
    static dynamic_array wrap(T* data, size_t size, size_t capacity, MemLabelId label) {
        static_assert(std::is_trivially_copyable_v<T>, "growth copies wrapped elements byte by byte");
        return dynamic_array(data, size, capacity * 2 + Untyped::kNotOwned, label);
    }
    // Takes over a buffer that malloc_internal returned.
    static dynamic_array adopt(T* data, size_t size, size_t capacity, MemLabelId label) {
        return dynamic_array(data, size, capacity * 2, label);
    }

    size_t size() const { return m_Array.size; }
    bool empty() const { return size() == 0; }
    size_t capacity() const { return m_Array.capacity(); }
    bool owns_data() const { return m_Array.owns_data(); } // false for an array without a buffer
    MemLabelId get_memory_label() const { return m_Array.label; }

    // Null when there is no buffer.
    T* data() { return static_cast<T*>(m_Array.data); }
    const T* data() const { return static_cast<const T*>(m_Array.data); }
    T* begin() { return data(); }
    const T* begin() const { return data(); }
    T* end() { return data() + size(); }
    const T* end() const { return data() + size(); }
    T& operator[](size_t index) { return data()[index]; }
    const T& operator[](size_t index) const { return data()[index]; }
    T& back() { return data()[size() - 1]; }
    const T& back() const { return data()[size() - 1]; }

    // By value: the argument may be an element of this array.
    void push_back(T value) { emplace_back(std::move(value)); }

    // Without arguments the element is value-initialised. The arguments must not refer to this array's elements.
    template <typename... Arguments>
    T& emplace_back(Arguments&&... arguments) {
        m_Array.make_room_for_one(sizeof(T), kAlignment);
        T* element = construct(data() + m_Array.size, std::forward<Arguments>(arguments)...);
        ++m_Array.size;
        return *element;
    }

    // As push_back, but false when memory is refused: the array is as it was, and a value that was moved here is gone.
    [[nodiscard]] bool try_push_back(T value) {
        if (size() == capacity() && !grow()) return false;
        emplace_back(std::move(value));
        return true;
    }

    void pop_back() {
        destroy(size() - 1, size());
        --m_Array.size;
    }

    // Added elements are value-initialised. False when memory is refused; nothing has changed then.
    [[nodiscard]] bool resize_initialized(size_t size, ResizePolicy policy = kResizeDouble) {
        const size_t oldSize = m_Array.size;
        if (size > capacity() && !resize_buffer_nocheck(size, policy)) return false;
        m_Array.size = size;
        destroy(size, oldSize);
        for (size_t i = oldSize; i < size; ++i)
            construct(data() + i);
        return true;
    }

    // The same, but added elements hold whatever the memory held.
    [[nodiscard]] bool resize_uninitialized(size_t size, ResizePolicy policy = kResizeDouble) {
        static_assert(std::is_trivially_copyable_v<T> && std::is_trivially_destructible_v<T>);
        if (size > capacity() && !resize_buffer_nocheck(size, policy)) return false;
        m_Array.size = size;
        return true;
    }

    // Changes the capacity, which must not be below the size. Whether there is room for that many elements now.
    [[nodiscard]] bool resize_buffer_nocheck(size_t capacity, ResizePolicy policy) {
        m_Array.resize_buffer(capacity, policy, sizeof(T), kAlignment);
        return capacity <= m_Array.capacity();
    }

    // Makes room for that many elements, and for no more if the buffer has to change. False when memory is refused.
    [[nodiscard]] bool reserve(size_t capacity) {
        if (capacity > m_Array.capacity()) m_Array.reserve(capacity, sizeof(T), kAlignment);
        return capacity <= m_Array.capacity();
    }

    // Doubles the capacity, from 0 to 1. False when memory is refused.
    [[nodiscard]] bool grow() {
        const size_t oldCapacity = capacity();
        m_Array.grow(sizeof(T), kAlignment);
        return capacity() > oldCapacity;
    }

    // Cuts the array to its first size elements, of which there must be that many. Keeps the buffer.
    void truncate(size_t size) {
        destroy(size, m_Array.size);
        m_Array.size = size;
    }
    void clear() { truncate(0); }

private:
    using Untyped = dynamic_array_detail::dynamic_array_data;
    static constexpr size_t kAlignment = Align == 0 ? alignof(T) : Align;

    dynamic_array(T* data, size_t size, size_t capacityWord, MemLabelId label)
        : m_Array{.data = data, .label = label, .size = size, .capacityWord = capacityWord} {}

    // Constructs an element from arguments; its label is
    //
    //   element has no label                                             none
    //   copied or moved from an element                                  the array's; the value is assigned
    //   constructible from the arguments and a label after them          the array's
    //   constructible from the arguments alone                           what its constructor takes from them
    //
    // The elements of a buffer that the array takes over keep their labels.
    template <typename... Arguments>
    T* construct(T* where, Arguments&&... arguments) {
        constexpr bool isFromElement =
            sizeof...(Arguments) == 1 && (std::is_same_v<std::remove_cvref_t<Arguments>, T> && ...);
        void* place = where;
        if constexpr (!dynamic_array_detail::kCarriesLabel<T>) {
            return ::new (place) T(std::forward<Arguments>(arguments)...);
        } else if constexpr (isFromElement) {
            T* element = ::new (place) T(m_Array.label);
            *element = (std::forward<Arguments>(arguments), ...);
            return element;
        } else if constexpr (std::is_constructible_v<T, Arguments..., MemLabelId>) {
            return ::new (place) T(std::forward<Arguments>(arguments)..., m_Array.label);
        } else {
            return ::new (place) T(std::forward<Arguments>(arguments)...);
        }
    }

    // Elements in memory that is not owned are not destroyed.
    void destroy([[maybe_unused]] size_t from, [[maybe_unused]] size_t to) {
        if constexpr (!std::is_trivially_destructible_v<T>) {
            if (!owns_data()) return;
            for (size_t i = from; i < to; ++i)
                data()[i].~T();
        }
    }

    void release() {
        if (m_Array.data == nullptr || !owns_data()) return;
        destroy(0, m_Array.size);
        m_Array.free_buffer();
    }

    Untyped m_Array;
};

template <typename T, size_t Align>
dynamic_array<T, Align>& dynamic_array<T, Align>::operator=(dynamic_array&& other) noexcept {
    if (this == &other) return *this;
    if (!other.owns_data()) {
        release();
        Check(other.size() < Untyped::kMaxSize, FixedReports::kArrayTooLong);
        m_Array.data = other.m_Array.data;
        m_Array.size = other.size();
        m_Array.capacityWord = other.size() * 2 + Untyped::kNotOwned;
    } else if (try_to_transfer_between_label(other.m_Array.data, other.m_Array.label, m_Array.label,
                                             other.capacity() * sizeof(T), 16, kAllocateOptionNone, __FILE__,
                                             __LINE__)) {
        release();
        m_Array.data = other.m_Array.data;
        m_Array.size = other.size();
        m_Array.capacityWord = other.m_Array.capacityWord;
    } else {
        if (owns_data())
            clear();
        else
            m_Array.reset();
        RequireMemory(reserve(other.capacity()));
        if (other.size() != 0) memcpy(m_Array.data, other.m_Array.data, other.size() * sizeof(T));
        m_Array.size = other.size();
        other.m_Array.free_buffer();
    }
    other.m_Array.reset();
    return *this;
}

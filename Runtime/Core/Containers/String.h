// core::string: text that it owns, with a memory label that it keeps for life. Up to 31 characters need no allocation.
//
//   core::string path(kMemLabelGeneral);   // without a label it gets kMemLabelPathString
//   path = folder;
//   path += "/archive.zarvo";
//   core::string name = core::string::wrap("borrowed until it is written to");
//
// Text that is passed in may be a part of the string's own. When memory is refused, grow answers null and leaves the
// string as it was; everything else ends the process. Text whose size comes from a file or a caller is therefore
// written after a grow that has answered. A string belongs to one thread at a time.
#pragma once

#include "Runtime/Core/Containers/StringRef.h"
#include "Runtime/Core/Containers/StringStorage.h"

namespace core {

template <typename T, typename Storage = StringStorageDefault<T>>
class basic_string {
public:
    using ref = basic_string_ref<T>;
    static constexpr size_t npos = ref::npos;

    basic_string() : m_Storage(kMemLabelPathString) {}
    explicit basic_string(MemLabelId label) : m_Storage(label) {}
    explicit basic_string(ref text, MemLabelId label = kMemLabelPathString) : m_Storage(label) { assign(text); }
    basic_string(const T* nulTerminated, MemLabelId label = kMemLabelPathString)
        : basic_string(ref(nulTerminated), label) {}
    basic_string(std::nullptr_t) = delete;

    // A new string has the source's label.
    basic_string(const basic_string& other) : m_Storage(other.get_memory_label()) { m_Storage.assign(other.m_Storage); }
    basic_string(basic_string&& other) noexcept : m_Storage(other.get_memory_label()) {
        m_Storage.assign(std::move(other.m_Storage));
    }

    // Reads the text in place and copies it before the first write. The text must outlive the string.
    static basic_string wrap(const T* nulTerminated, MemLabelId label = kMemLabelPathString) {
        basic_string wrapped(label);
        wrapped.m_Storage.borrow(nulTerminated);
        return wrapped;
    }

    // Assignments copy or move the text; the label stays.
    basic_string& operator=(const basic_string& other) {
        m_Storage.assign(other.m_Storage);
        return *this;
    }
    basic_string& operator=(basic_string&& other) noexcept {
        m_Storage.assign(std::move(other.m_Storage));
        return *this;
    }
    basic_string& operator=(ref text) { return assign(text); }
    basic_string& operator=(const T* nulTerminated) { return assign(ref(nulTerminated)); }
    basic_string& operator=(std::nullptr_t) = delete;
    basic_string& assign(ref text) { return assign(text.data(), text.size()); }
    basic_string& assign(const T* text, size_t count) {
        m_Storage.assign(text, count);
        return *this;
    }

    const T* data() const { return m_Storage.data(); }
    const T* c_str() const { return m_Storage.data(); }
    size_t size() const { return m_Storage.size(); }
    size_t length() const { return size(); }
    bool empty() const { return size() == 0; }
    size_t capacity() const { return m_Storage.capacity(); }
    MemLabelId get_memory_label() const { return m_Storage.get_memory_label(); }
    const T* begin() const { return data(); }
    const T* end() const { return data() + size(); }
    const T& back() const { return data()[size() - 1]; }
    const T& operator[](size_t index) const { return data()[index]; }
    // May be written through: borrowed text is copied first.
    T& operator[](size_t index) { return RequireMemory(grow(size()))[index]; }
    operator ref() const { return ref(data(), size()); }

    // Makes room for count characters, and for no more if the buffer has to change. Returns the writable text. Null
    // when memory is refused; nothing has changed then.
    [[nodiscard]] T* grow(size_t count) { return m_Storage.grow(count); }

    // Appending doubles the capacity when it has to grow.
    basic_string& append(ref text) { return append(text.data(), text.size()); }
    basic_string& append(const T* text, size_t count) {
        m_Storage.append(text, count);
        return *this;
    }
    basic_string& operator+=(ref text) { return append(text); }
    basic_string& operator+=(T character) { return append(&character, 1); }
    void push_back(T character) { append(&character, 1); }

    // Cuts the text to its first count characters, of which there must be that many.
    void truncate(size_t count) { m_Storage.truncate(count); }
    void clear() { truncate(0); }

    // See basic_string_ref.
    int compare(const T* nulTerminated, ComparisonType type = kCaseSensitive) const {
        return ref(*this).compare(nulTerminated, type);
    }
    int compare(ref other) const { return ref(*this).compare(other); }
    bool starts_with(ref prefix, ComparisonType type = kCaseSensitive) const {
        return ref(*this).starts_with(prefix, type);
    }
    size_t find(T character, size_t pos = 0) const { return ref(*this).find(character, pos); }
    size_t find(ref text, size_t pos = 0) const { return ref(*this).find(text, pos); }
    size_t rfind(T character) const { return ref(*this).rfind(character); }
    ref substr(size_t pos, size_t count = npos) const { return ref(*this).substr(pos, count); }

    friend bool operator==(const basic_string& a, const basic_string& b) { return ref(a) == ref(b); }
    friend bool operator==(const basic_string& a, ref b) { return ref(a) == b; }
    friend bool operator==(const basic_string& a, const T* b) { return ref(a) == ref(b); }
    friend bool operator<(const basic_string& a, const basic_string& b) { return a.compare(ref(b)) < 0; }

private:
    Storage m_Storage;
};

// The sum has the left side's label.
template <typename T, typename Storage>
basic_string<T, Storage> operator+(const basic_string<T, Storage>& lhs, const T* rhs) {
    const basic_string_ref<T> right(rhs);
    basic_string<T, Storage> sum(lhs.get_memory_label());
    const size_t total = lhs.size() + right.size();
    if (total >= Storage::kInlineCapacity) RequireMemory(sum.grow(total)); // one allocation
    sum.assign(lhs);
    sum.append(right);
    return sum;
}

using string = basic_string<char>;

static_assert(sizeof(string) == 40);

} // namespace core

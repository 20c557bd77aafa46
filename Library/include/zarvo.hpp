// SPDX-License-Identifier: MIT
// libzarvo for C++20: the operations of zarvo.h, which is the manual, with owning objects and ranges. Header only.
//
//     auto archive = zarvo::archive::open("game.zarvo");
//     if (!archive) return fail(archive.error().text());
//     for (const zarvo::entry entry : archive->entries())
//         if (entry.is_file()) use(entry.path(), entry.size());
//
// The wrapper throws nothing of its own, and can be used without exceptions. An exception that a callback throws (of a
// source, a log or a run) is caught before it reaches the library, and thrown again when the call that ran the callback
// returns; of several, the first. To the library, a source that throws has failed to read. A run whose callback throws
// is stopped. When the source or the log of an archive throws in a run, all runs on that archive are stopped, because
// nothing tells which of them has called it.
//
// Threads: as for the handles of zarvo.h. Views of texts are valid until their archive is destroyed.
#pragma once

#include "zarvo.h"

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <exception>
#include <functional>
#include <iterator>
#include <memory>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace zarvo {

// Of the library, such as "0.2.0".
inline std::string_view version() { return zarvo_version(); }

// Why an operation failed. As a bool: whether it failed.
class [[nodiscard]] error {
public:
    error() = default;
    explicit error(zarvo_error* owned) : m_Error(owned) {}
    error(error&& other) noexcept : m_Error(std::exchange(other.m_Error, nullptr)) {}
    error& operator=(error&& other) noexcept {
        std::swap(m_Error, other.m_Error);
        return *this;
    }
    ~error() { zarvo_error_free(m_Error); }

    explicit operator bool() const { return m_Error != nullptr; }
    zarvo_code code() const { return zarvo_error_code(m_Error); }
    int system_code() const { return zarvo_error_errno(m_Error); } // an errno, or 0
    std::string_view text() const { return zarvo_error_text(m_Error); }

private:
    zarvo_error* m_Error = nullptr;
};

// A value, or the error that came instead. Only a result that is true has a value.
template <typename T>
class [[nodiscard]] result {
public:
    result(T value) : m_Value(std::move(value)) {}
    result(zarvo::error why) : m_Error(std::move(why)) {}

    explicit operator bool() const { return m_Value.has_value(); }
    T& operator*() & { return *m_Value; }
    const T& operator*() const& { return *m_Value; }
    T&& operator*() && { return std::move(*m_Value); }
    T* operator->() { return &*m_Value; }
    const T* operator->() const { return &*m_Value; }
    const zarvo::error& error() const& { return m_Error; }
    zarvo::error error() && { return std::move(m_Error); }

private:
    std::optional<T> m_Value;
    zarvo::error m_Error;
};

namespace detail {

// The exception of a callback, on its way past the library. Programs without exceptions never have one.
inline thread_local std::exception_ptr pending;

// Whether the innermost call of this thread into the library is a plain one, whose callbacks all run on this thread.
// It is false in runs, and on threads of the library.
inline thread_local bool is_in_plain_call = false;

// The first exception that stops a run, from any thread.
class run_exception {
public:
    void keep_current() noexcept {
#if defined(__cpp_exceptions)
        if (!m_IsThere.exchange(true)) m_Exception = std::current_exception();
#endif
    }
    bool is_there() const { return m_IsThere; }

    // After the run, when no thread can keep another.
    void rethrow() {
#if defined(__cpp_exceptions)
        if (m_Exception) std::rethrow_exception(std::exchange(m_Exception, nullptr));
#endif
    }

private:
    std::atomic<bool> m_IsThere = false;
    std::exception_ptr m_Exception;
};

// The runs under way on an archive or a writer. Any thread may use it.
class active_runs {
public:
    void add(run_exception* run) {
        const std::lock_guard lock(m_Mutex);
        m_Runs.push_back(run);
    }
    void remove(run_exception* run) {
        const std::lock_guard lock(m_Mutex);
        std::erase(m_Runs, run);
    }

    // Stops all of them with the exception that is being handled.
    void stop() noexcept {
        const std::lock_guard lock(m_Mutex);
        for (run_exception* const run : m_Runs)
            run->keep_current();
    }

private:
    std::mutex m_Mutex;
    std::vector<run_exception*> m_Runs;
};

// Calls a source or a log, and returns its result, or failed when it throws. In a plain call nothing is called after
// an exception.
template <typename Call, typename Answer>
Answer guard(active_runs& runs, Call&& call, Answer failed) noexcept {
#if defined(__cpp_exceptions)
    if (pending) return failed;
    try {
        return call();
    } catch (...) {
        if (is_in_plain_call)
            pending = std::current_exception();
        else
            runs.stop();
        return failed;
    }
#else
    (void)runs;
    (void)failed;
    return call();
#endif
}

inline void rethrow() {
#if defined(__cpp_exceptions)
    if (pending) std::rethrow_exception(std::exchange(pending, nullptr));
#endif
}

// Makes a call whose last parameter receives the error, and returns that error.
template <typename Call>
error call_library(bool is_plain, Call&& call) {
    const bool was_in_plain_call = std::exchange(is_in_plain_call, is_plain);
    zarvo_error* failure = nullptr;
    (void)call(&failure); // the error says it all
    is_in_plain_call = was_in_plain_call;
    return error(failure);
}

// Makes a plain call. Callers first give the results an owner, then call rethrow.
template <typename Call>
error check(Call&& call) {
    return call_library(true, call);
}

// Makes a plain call that fills a value; call: (value, error) -> code.
template <typename T, typename Call>
result<T> fill(T value, Call&& call) {
    error failure = check([&](zarvo_error** why) { return call(&value, why); });
    rethrow();
    if (failure) return failure;
    return value;
}

} // namespace detail

// Where the bytes of an archive come from when the library does not read them itself. Several threads may call read_at
// at once when several use the archive, or a run uses several.
class source {
public:
    virtual ~source() = default;

    // Reads up to buffer.size() bytes at offset. Returns how many were read (fewer only at the end), or a negative
    // errno.
    virtual int64_t read_at(std::span<std::byte> buffer, uint64_t offset) = 0;

    // The number of bytes, or a negative errno. Called once, when the archive is opened.
    virtual int64_t size() = 0;
};

namespace detail {

// A source as the library knows it, which closes it.
struct called_source {
    std::unique_ptr<source> from;
    std::shared_ptr<active_runs> runs; // that may use it
};

inline zarvo_source callbacks_of(std::unique_ptr<source> from, std::shared_ptr<active_runs> runs) {
    zarvo_source callbacks = ZARVO_SOURCE_INIT;
    callbacks.context = new called_source{std::move(from), std::move(runs)};
    callbacks.read_at = [](void* context, void* buffer, size_t size, uint64_t offset) {
        auto* const called = static_cast<called_source*>(context);
        const auto read = [&] { return called->from->read_at({static_cast<std::byte*>(buffer), size}, offset); };
        return guard(*called->runs, read, int64_t{-EIO});
    };
    callbacks.get_size = [](void* context, uint64_t* size) {
        auto* const called = static_cast<called_source*>(context);
        const int64_t answer = guard(
            *called->runs, [&] { return called->from->size(); }, int64_t{-EIO});
        if (answer < 0) return static_cast<int>(answer);
        *size = static_cast<uint64_t>(answer);
        return 0;
    };
    callbacks.close = [](void* context) { delete static_cast<called_source*>(context); };
    return callbacks;
}

} // namespace detail

// See zarvo_open_options; 0 is the default of each.
struct open_options {
    uint64_t offset = 0;
    uint64_t max_entries = 0;
    uint64_t max_directory_bytes = 0;
    uint64_t max_block_bytes = 0;
    uint64_t cache_bytes = 0;
    std::function<void(std::string_view message)> log = {};
};

// One entry of the directory.
class entry {
public:
    entry(const zarvo_archive* archive, uint64_t index) : m_Index(index) {
        (void)zarvo_get_entry(archive, index, &m_Entry); // the index is the archive's own
    }

    uint64_t index() const { return m_Index; }
    std::string_view path() const { return {m_Entry.path, m_Entry.path_length}; }
    bool is_file() const { return m_Entry.kind == ZARVO_FILE; }
    bool is_folder() const { return m_Entry.kind == ZARVO_FOLDER; }
    uint64_t size() const { return m_Entry.size; }
    uint64_t offset() const { return m_Entry.offset; }
    uint32_t flags() const { return m_Entry.flags; }
    int32_t problem() const { return m_Entry.problem; } // ZARVO_PROBLEM_...

private:
    uint64_t m_Index;
    zarvo_entry m_Entry = ZARVO_ENTRY_INIT;
};

// All entries, in the archive's order.
class entry_range {
public:
    class iterator {
    public:
        using value_type = entry;
        using difference_type = std::ptrdiff_t;
        using iterator_concept = std::random_access_iterator_tag;
        using iterator_category = std::input_iterator_tag; // what it points to is made anew each time

        iterator() = default;
        iterator(const zarvo_archive* archive, uint64_t index) : m_Archive(archive), m_Index(index) {}

        entry operator*() const { return {m_Archive, m_Index}; }
        entry operator[](difference_type count) const { return *(*this + count); }
        iterator& operator++() { return *this += 1; }
        iterator& operator--() { return *this -= 1; }
        iterator operator++(int) { return std::exchange(*this, *this + 1); }
        iterator operator--(int) { return std::exchange(*this, *this - 1); }
        iterator& operator+=(difference_type count) {
            m_Index += static_cast<uint64_t>(count);
            return *this;
        }
        iterator& operator-=(difference_type count) { return *this += -count; }
        friend iterator operator+(iterator from, difference_type count) { return from += count; }
        friend iterator operator+(difference_type count, iterator from) { return from += count; }
        friend iterator operator-(iterator from, difference_type count) { return from -= count; }
        friend difference_type operator-(const iterator& a, const iterator& b) {
            return static_cast<difference_type>(a.m_Index - b.m_Index);
        }
        friend bool operator==(const iterator& a, const iterator& b) { return a.m_Index == b.m_Index; }
        friend auto operator<=>(const iterator& a, const iterator& b) { return a.m_Index <=> b.m_Index; }

    private:
        const zarvo_archive* m_Archive = nullptr;
        uint64_t m_Index = 0;
    };

    explicit entry_range(const zarvo_archive* archive) : m_Archive(archive) {}
    iterator begin() const { return {m_Archive, 0}; }
    iterator end() const { return {m_Archive, size()}; }
    uint64_t size() const { return zarvo_entry_count(m_Archive); }
    bool empty() const { return size() == 0; }
    entry operator[](uint64_t index) const { return {m_Archive, index}; }

private:
    const zarvo_archive* m_Archive;
};

// What a read delivered. With an error, count is the number of bytes before the damage.
struct [[nodiscard]] read_result {
    size_t count = 0;
    zarvo::error error;
};

namespace detail {

// Makes a plain call that reads; call: (count, error) -> code.
template <typename Call>
read_result read_with(Call&& call) {
    read_result read;
    read.error = check([&](zarvo_error** why) { return call(&read.count, why); });
    rethrow();
    return read;
}

} // namespace detail

// A file that is read from its start on. Its archive must outlive it. See zarvo_stream.
class stream {
public:
    explicit stream(zarvo_stream* owned) : m_Stream(owned) {}

    // Into the front of buffer; 0 bytes at the end.
    read_result read(std::span<std::byte> buffer) {
        return detail::read_with([&](size_t* count, zarvo_error** why) {
            return zarvo_stream_read(m_Stream.get(), buffer.data(), buffer.size(), count, why);
        });
    }
    void seek(uint64_t position) { (void)zarvo_stream_seek(m_Stream.get(), position); }

private:
    struct free_stream {
        void operator()(zarvo_stream* stream) const { zarvo_stream_free(stream); }
    };
    std::unique_ptr<zarvo_stream, free_stream> m_Stream;
};

// See zarvo_patterns. When memory is refused, a pattern is not added and nothing matches.
class patterns {
public:
    patterns() {
        zarvo_patterns* made = nullptr;
        (void)zarvo_patterns_new(&made, nullptr);
        m_Patterns.reset(made);
    }

    error add(std::string_view pattern) {
        return detail::check([&](zarvo_error** why) {
            return zarvo_patterns_add(m_Patterns.get(), pattern.data(), pattern.size(), why);
        });
    }
    bool match(std::string_view path) { return zarvo_patterns_match(m_Patterns.get(), path.data(), path.size()) == 1; }
    bool is_used(size_t index) const { return zarvo_patterns_used(m_Patterns.get(), index) == 1; }

    // For the operations of zarvo.h. Stays this object's.
    zarvo_patterns* get() const { return m_Patterns.get(); }

private:
    struct free_patterns {
        void operator()(zarvo_patterns* patterns) const { zarvo_patterns_free(patterns); }
    };
    std::unique_ptr<zarvo_patterns, free_patterns> m_Patterns;
};

// See zarvo_run_options; 0 is the default of each.
struct run_options {
    uint32_t threads = 0;
    uint64_t memory = 0;
    patterns* wanted = nullptr;
    patterns* excluded = nullptr;
    std::function<bool(const zarvo_progress& progress)> progress = {}; // false stops the run
};

// See zarvo_extract_options.
struct extract_options {
    int32_t overwrite = ZARVO_OVERWRITE_ALWAYS;
    bool keep_broken = false;
    bool dry_run = false;
    uint64_t strip = 0;
    uint64_t max_bytes = 0; // 0: no limit
    std::function<void(const zarvo_report& report)> report = {};
};

// See zarvo_test_options.
struct test_options {
    std::function<void(uint64_t block_index, std::string_view text)> block = {};
    std::function<void(uint64_t index, uint64_t readable)> entry = {};
};

// See zarvo_visit_options. bytes is called by many threads at once, for different files.
struct visit_options {
    uint64_t strip = 0;
    std::function<void(uint64_t index, uint64_t offset, std::span<const std::byte> bytes)> bytes = {};
    std::function<void(const zarvo_report& report)> report = {};
};

// What a run has done, even if it failed.
struct [[nodiscard]] run_result {
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    zarvo::error error;
};

// See zarvo_create_options.
struct create_options {
    int32_t layout = ZARVO_LAYOUT_FS;
    int32_t compression = ZARVO_DEFAULT;
    int32_t level = ZARVO_DEFAULT;
    bool is_streamed = false;
    uint64_t block_size = 0;                         // 0: the default
    std::optional<std::string> engine_version = {};  // without NUL
    std::optional<std::string> engine_revision = {}; // as above
    bool force = false;
    bool dry_run = false;
    std::function<void(const zarvo_create_report& report)> report = {};
    std::function<void(std::string_view message)> log = {};
};

namespace detail {

// The callbacks of a run. Once one of them, a source or a log has thrown, on any thread, none is called again, and the
// run stops when it next reports progress.
template <typename Options>
class run_callbacks {
public:
    run_callbacks(active_runs* runs, const run_options& options, const Options& own)
        : m_Runs(runs), m_Options(options), m_Own(own) {}

    // Makes the run; call: (run options, summary, error) -> code.
    template <typename Call>
    run_result make(Call&& call) {
        zarvo_run_options plain = ZARVO_RUN_OPTIONS_INIT;
        plain.threads = m_Options.threads;
        plain.memory = m_Options.memory;
        plain.wanted = m_Options.wanted != nullptr ? m_Options.wanted->get() : nullptr;
        plain.excluded = m_Options.excluded != nullptr ? m_Options.excluded->get() : nullptr;
        plain.progress = [](void* context, const zarvo_progress* progress) {
            auto* const self = static_cast<run_callbacks*>(context);
            const auto tell = [&] { return !self->m_Options.progress || self->m_Options.progress(*progress); };
            return self->guard(tell) ? 0 : 1;
        };
        plain.context = this;
        run_result result;
        if (m_Runs != nullptr) m_Runs->add(&m_Exception);
        result.error = call_library(false, [&](zarvo_error** why) { return call(&plain, &result.summary, why); });
        if (m_Runs != nullptr) m_Runs->remove(&m_Exception);
        m_Exception.rethrow();
        return result;
    }

    // In a callback of the run: calls use with the caller's options.
    template <typename Use>
    static void call(void* context, Use&& use) noexcept {
        auto* const self = static_cast<run_callbacks*>(context);
        (void)self->guard([&] {
            use(self->m_Own);
            return true;
        });
    }

private:
    template <typename Call>
    bool guard(Call&& call) noexcept {
#if defined(__cpp_exceptions)
        if (m_Exception.is_there()) return false;
        try {
            return call();
        } catch (...) {
            m_Exception.keep_current();
            return false;
        }
#else
        return call();
#endif
    }

    active_runs* const m_Runs; // on the same archive or writer; null without one
    const run_options& m_Options;
    const Options& m_Own;
    run_exception m_Exception;
};

} // namespace detail

// An open archive.
class archive {
public:
    static result<archive> open(const char* path, open_options options = {}) {
        return open_with(std::move(options), [&](auto... rest) { return zarvo_open_path(path, rest...); });
    }
    static result<archive> open(const std::string& path, open_options options = {}) {
        return open(path.c_str(), std::move(options));
    }
    static result<archive> open(int descriptor, open_options options = {}) {
        return open_with(std::move(options), [&](auto... rest) { return zarvo_open_descriptor(descriptor, rest...); });
    }
    // data must stay as it is until the archive is destroyed.
    static result<archive> open(std::span<const std::byte> data, open_options options = {}) {
        return open_with(std::move(options),
                         [&](auto... rest) { return zarvo_open_memory(data.data(), data.size(), rest...); });
    }
    static result<archive> open(std::unique_ptr<source> from, open_options options = {}) {
        auto runs = std::make_shared<detail::active_runs>();
        const zarvo_source callbacks = detail::callbacks_of(std::move(from), runs);
        const auto open = [&](auto... rest) { return zarvo_open_source(&callbacks, rest...); };
        return open_with(std::move(options), open, std::move(runs));
    }

    archive(archive&&) noexcept = default;
    archive& operator=(archive&& other) noexcept {
        m_Archive = std::move(other.m_Archive); // closes the old one, which needs its callbacks until then
        m_Callbacks = std::move(other.m_Callbacks);
        return *this;
    }

    // For the operations of zarvo.h. Stays this object's.
    zarvo_archive* get() const { return m_Archive.get(); }

    zarvo_info info() const {
        zarvo_info info = ZARVO_INFO_INIT;
        (void)zarvo_get_info(get(), &info);
        return info;
    }
    entry_range entries() const { return entry_range(get()); }

    // What a path names: see zarvo_find.
    result<uint64_t> find(std::string_view path) const {
        return detail::fill(uint64_t{0}, [&](uint64_t* item, zarvo_error** why) {
            return zarvo_find(get(), path.data(), path.size(), item, why);
        });
    }
    // Entries and implied folders together; 0 when memory is refused.
    uint64_t item_count() const { return zarvo_item_count(get()); }
    result<zarvo_item> item(uint64_t index) const {
        return detail::fill(zarvo_item ZARVO_ITEM_INIT, [&](zarvo_item* item, zarvo_error** why) {
            return zarvo_get_item(get(), index, item, why);
        });
    }
    // In its normal form.
    result<std::string> item_path(uint64_t index) const {
        result<zarvo_item> found = item(index);
        if (!found) return std::move(found).error();
        return detail::fill(std::string(found->path_length, '\0'), [&](std::string* path, zarvo_error** why) {
            return zarvo_get_item_path(get(), index, path->data(), why); // its NUL goes where the string has one
        });
    }

    // A range of an entry, into the front of buffer.
    read_result read(uint64_t index, uint64_t offset, std::span<std::byte> buffer) {
        return detail::read_with([&](size_t* count, zarvo_error** why) {
            return zarvo_read(get(), index, offset, buffer.data(), buffer.size(), count, why);
        });
    }
    result<stream> open_stream(uint64_t index) {
        zarvo_stream* opened = nullptr;
        error failure = detail::check([&](zarvo_error** why) { return zarvo_stream_open(get(), index, &opened, why); });
        stream made(opened);
        detail::rethrow();
        if (failure) return failure;
        return made;
    }
    result<uint64_t> readable(uint64_t index) {
        return detail::fill(uint64_t{0}, [&](uint64_t* readable, zarvo_error** why) {
            return zarvo_get_readable(get(), index, readable, why);
        });
    }

    uint64_t block_count() const { return zarvo_block_count(get()); }
    zarvo_block block(uint64_t index) const {
        zarvo_block block = ZARVO_BLOCK_INIT;
        (void)zarvo_get_block(get(), index, &block);
        return block;
    }
    // buffer has room for the whole block.
    read_result read_block(uint64_t index, std::span<std::byte> buffer) {
        return detail::read_with([&](size_t* count, zarvo_error** why) {
            return zarvo_read_block(get(), index, buffer.data(), count, why);
        });
    }

    // Writes entries below a folder: see zarvo_extract.
    run_result extract(const char* folder, const run_options& options = {}, const extract_options& how = {}) {
        using calls = detail::run_callbacks<extract_options>;
        zarvo_extract_options plain = ZARVO_EXTRACT_OPTIONS_INIT;
        plain.overwrite = how.overwrite;
        plain.keep_broken = how.keep_broken ? 1 : 0;
        plain.dry_run = how.dry_run ? 1 : 0;
        plain.strip = how.strip;
        plain.max_bytes = how.max_bytes;
        if (how.report)
            plain.report = [](void* context, const zarvo_report* report) {
                calls::call(context, [&](const extract_options& own) { own.report(*report); });
            };
        return calls(runs(), options, how).make([&](zarvo_run_options* run, zarvo_summary* summary, zarvo_error** why) {
            return zarvo_extract(get(), folder, run, &plain, summary, why);
        });
    }
    run_result extract(const std::string& folder, const run_options& options = {}, const extract_options& how = {}) {
        return extract(folder.c_str(), options, how);
    }
    // Decodes every block, and tells what can't be read: see zarvo_test.
    run_result test(const run_options& options = {}, const test_options& what = {}) {
        using calls = detail::run_callbacks<test_options>;
        zarvo_test_options plain = ZARVO_TEST_OPTIONS_INIT;
        if (what.block)
            plain.block = [](void* context, uint64_t block_index, const char* text) {
                calls::call(context, [&](const test_options& own) { own.block(block_index, text); });
            };
        if (what.entry)
            plain.entry = [](void* context, uint64_t index, uint64_t readable) {
                calls::call(context, [&](const test_options& own) { own.entry(index, readable); });
            };
        return calls(runs(), options, what)
            .make([&](zarvo_run_options* run, zarvo_summary* summary, zarvo_error** why) {
                return zarvo_test(get(), run, &plain, summary, why);
            });
    }
    // Hands over the bytes of files: see zarvo_visit.
    run_result visit(const run_options& options = {}, const visit_options& what = {}) {
        using calls = detail::run_callbacks<visit_options>;
        zarvo_visit_options plain = ZARVO_VISIT_OPTIONS_INIT;
        plain.strip = what.strip;
        if (what.bytes)
            plain.bytes = [](void* context, uint64_t index, uint64_t offset, const void* bytes, size_t size) {
                calls::call(context, [&](const visit_options& own) {
                    own.bytes(index, offset, {static_cast<const std::byte*>(bytes), size});
                });
            };
        if (what.report)
            plain.report = [](void* context, const zarvo_report* report) {
                calls::call(context, [&](const visit_options& own) { own.report(*report); });
            };
        return calls(runs(), options, what)
            .make([&](zarvo_run_options* run, zarvo_summary* summary, zarvo_error** why) {
                return zarvo_visit(get(), run, &plain, summary, why);
            });
    }

private:
    // What the library's callbacks need, at an address that stays.
    struct callbacks {
        std::function<void(std::string_view message)> log;
        std::shared_ptr<detail::active_runs> runs;
    };
    struct close_archive {
        void operator()(zarvo_archive* archive) const { zarvo_close(archive); }
    };

    // Null for an archive that was moved away.
    detail::active_runs* runs() const { return m_Callbacks ? m_Callbacks->runs.get() : nullptr; }

    archive(std::unique_ptr<callbacks> called, zarvo_archive* owned)
        : m_Callbacks(std::move(called)), m_Archive(owned) {}

    template <typename Open>
    static result<archive>
    open_with(open_options options, Open&& open,
              std::shared_ptr<detail::active_runs> runs = std::make_shared<detail::active_runs>()) {
        std::unique_ptr<callbacks> called(new callbacks{std::move(options.log), std::move(runs)});
        zarvo_open_options plain = ZARVO_OPEN_OPTIONS_INIT;
        plain.offset = options.offset;
        plain.max_entries = options.max_entries;
        plain.max_directory_bytes = options.max_directory_bytes;
        plain.max_block_bytes = options.max_block_bytes;
        plain.cache_bytes = options.cache_bytes;
        if (called->log) {
            plain.log = [](void* context, const char* message) {
                auto* const self = static_cast<callbacks*>(context);
                const auto log = [&] {
                    self->log(message);
                    return true;
                };
                (void)detail::guard(*self->runs, log, false);
            };
            plain.log_context = called.get();
        }
        zarvo_archive* opened = nullptr;
        error failure = detail::check([&](zarvo_error** why) { return open(&plain, &opened, why); });
        archive made(std::move(called), opened);
        detail::rethrow();
        if (failure) return failure;
        return made;
    }

    std::unique_ptr<callbacks> m_Callbacks; // outlives the archive that calls them
    std::unique_ptr<zarvo_archive, close_archive> m_Archive;
};

namespace detail {

// Makes an archive; call: (run options, create options, summary, error) -> code.
template <typename Call>
run_result create_with(active_runs* runs, const run_options& options, const create_options& how, Call&& call) {
    using calls = run_callbacks<create_options>;
    zarvo_create_options plain = ZARVO_CREATE_OPTIONS_INIT;
    plain.layout = how.layout;
    plain.compression = how.compression;
    plain.level = how.level;
    plain.is_streamed = how.is_streamed ? 1 : 0;
    plain.block_size = how.block_size;
    if (how.engine_version) plain.engine_version = how.engine_version->c_str();
    if (how.engine_revision) plain.engine_revision = how.engine_revision->c_str();
    plain.force = how.force ? 1 : 0;
    plain.dry_run = how.dry_run ? 1 : 0;
    if (how.report)
        plain.report = [](void* context, const zarvo_create_report* report) {
            calls::call(context, [&](const create_options& own) { own.report(*report); });
        };
    if (how.log)
        plain.log = [](void* context, const char* message) {
            calls::call(context, [&](const create_options& own) { own.log(message); });
        };
    return calls(runs, options, how).make([&](zarvo_run_options* run, zarvo_summary* summary, zarvo_error** why) {
        return call(run, &plain, summary, why);
    });
}

} // namespace detail

// Makes an archive of what lies below a folder: see zarvo_create.
inline run_result create(const std::string& path, const std::string& folder, const run_options& options = {},
                         const create_options& how = {}) {
    return detail::create_with(nullptr, options, how,
                               [&](auto... rest) { return zarvo_create(path.c_str(), folder.c_str(), rest...); });
}

// Makes archives of entries from memory and callbacks: see zarvo_writer.
class writer {
public:
    // When memory is refused, every other operation fails.
    writer() {
        zarvo_writer* made = nullptr;
        (void)zarvo_writer_new(&made, nullptr);
        m_Writer.reset(made);
    }

    // data must stay as it is until the writer is destroyed.
    error add(std::string_view path, std::span<const std::byte> data) {
        return detail::check([&](zarvo_error** why) {
            return zarvo_writer_add_memory(m_Writer.get(), path.data(), path.size(), data.data(), data.size(), why);
        });
    }
    // Calls the source's size at once, and its read_at in write.
    error add(std::string_view path, std::unique_ptr<source> from) {
        const zarvo_source callbacks = detail::callbacks_of(std::move(from), m_Runs);
        error failure = detail::check([&](zarvo_error** why) {
            return zarvo_writer_add_source(m_Writer.get(), path.data(), path.size(), &callbacks, why);
        });
        detail::rethrow();
        return failure;
    }
    error add_folder(std::string_view path) {
        return detail::check(
            [&](zarvo_error** why) { return zarvo_writer_add_folder(m_Writer.get(), path.data(), path.size(), why); });
    }

    run_result write(const std::string& path, const run_options& options = {}, const create_options& how = {}) {
        return detail::create_with(m_Runs.get(), options, how, [&](auto... rest) {
            return zarvo_writer_write(m_Writer.get(), path.c_str(), rest...);
        });
    }

private:
    struct free_writer {
        void operator()(zarvo_writer* writer) const { zarvo_writer_free(writer); }
    };
    std::shared_ptr<detail::active_runs> m_Runs = std::make_shared<detail::active_runs>();
    std::unique_ptr<zarvo_writer, free_writer> m_Writer;
};

// See zarvo_normalize_path.
inline std::string normalize_path(std::string_view path) {
    std::string normal(path.size() + 1, '\0');
    normal.resize(zarvo_normalize_path(path.data(), path.size(), normal.data()));
    return normal;
}

} // namespace zarvo

// Extraction and tests of a whole archive, and the patterns that choose entries.
#pragma once

#include <Python.h>
#include <zarvo.h>

// A zarvo_patterns, made of a list of texts.
class Patterns {
public:
    Patterns() = default;
    ~Patterns() { zarvo_patterns_free(m_Patterns); }
    Patterns(const Patterns&) = delete;
    Patterns& operator=(const Patterns&) = delete;

    // texts: a list of str, or None for no patterns at all. False with an exception set. Call it once.
    bool Add(PyObject* texts);

    // Null after None.
    zarvo_patterns* Get() const { return m_Patterns; }

    // The numbers of those that have matched nothing, as a list.
    PyObject* MakeUnusedList() const;

private:
    zarvo_patterns* m_Patterns = nullptr;
    size_t m_Count = 0;
};

// For zarvo_run_options.
uint32_t LimitThreads(uint64_t threads);

// Archive.extract(folder, patterns, excluded, threads, memory, overwrite, strip, keep_broken, dry_run, max_bytes,
// progress). Returns the summary, the failures of entries as (number, exception), and the numbers of patterns that
// matched nothing.
PyObject* ExtractArchive(PyObject* self, PyObject* arguments);

// Archive.test(threads, memory, progress). Returns the summary, the damaged entries as (number, readable bytes), and
// the damaged blocks as (number, text).
PyObject* TestArchive(PyObject* self, PyObject* arguments);

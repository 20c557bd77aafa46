#include "Runs.h"

#include "ArchiveObject.h"
#include "Errors.h"
#include "ProgressTeller.h"

#include <algorithm>
#include <new>
#include <utility>
#include <vector>

bool Patterns::Add(PyObject* texts) {
    if (texts == Py_None) return true;
    if (zarvo_patterns_new(&m_Patterns, nullptr) != ZARVO_OK) {
        PyErr_NoMemory();
        return false;
    }
    const Py_ssize_t count = PyList_Size(texts);
    for (Py_ssize_t index = 0; index < count; ++index) {
        const Reference bytes = EncodePath(PyList_GetItem(texts, index));
        if (bytes == nullptr) return false;
        const std::string_view text = GetBytes(bytes);
        if (zarvo_patterns_add(m_Patterns, text.data(), text.size(), nullptr) != ZARVO_OK) {
            PyErr_NoMemory();
            return false;
        }
        ++m_Count;
    }
    return count >= 0;
}

uint32_t LimitThreads(uint64_t threads) { return static_cast<uint32_t>(std::min<uint64_t>(threads, UINT32_MAX)); }

PyObject* Patterns::MakeUnusedList() const {
    Reference unused(PyList_New(0));
    if (unused == nullptr) return nullptr;
    for (size_t index = 0; index < m_Count; ++index)
        if (zarvo_patterns_used(m_Patterns, index) == 0 && !AppendTo(unused, PyLong_FromSize_t(index))) return nullptr;
    return unused.release();
}

namespace {

// A run, as its callbacks see it. They are called without the interpreter's lock.
struct Run {
    Run(PyObject* object, PyObject* progressFunction)
        : self(AsArchive(object)),
          progress(progressFunction),
          exceptionsBefore(self->source == nullptr ? 0 : self->source->ExceptionCount()) {}

    // Whether Python's function for the archive's bytes has failed since the run began: damage that it would explain
    // must not be reported as damage of the archive.
    bool HasSourceFailed() const {
        return self->source != nullptr && self->source->ExceptionCount() != exceptionsBefore;
    }

    ArchiveObject* self;
    ProgressTeller progress;
    int exceptionsBefore;

    struct Failure {
        uint64_t index; // of an entry or a block
        zarvo_code code;
        int systemCode;
        std::string text;
    };
    std::vector<Failure> failures;

    struct Damage {
        uint64_t entry;
        uint64_t readable;
    };
    std::vector<Damage> damages;

    // Callbacks must not throw.
    template <typename Item, typename... Fields>
    void Keep(std::vector<Item>* items, const Fields&... fields) {
        try {
            items->push_back({fields...}); // a text takes memory, too
        } catch (const std::bad_alloc&) {
            isOutOfMemory = true;
        }
    }
    bool isOutOfMemory = false;
};

Run* AsRun(void* context) { return static_cast<Run*>(context); }

// Stops the run for an interrupt of the user, an exception of the progress function, or a failed source.
int TellProgress(void* context, const zarvo_progress* progress) {
    Run* const run = AsRun(context);
    return WithInterpreter([&] { return !run->HasSourceFailed() && run->progress.Tell(*progress) ? 0 : 1; });
}

void TakeReport(void* context, const zarvo_report* report) {
    if (report->code == ZARVO_OK) return;
    Run* const run = AsRun(context);
    run->Keep(&run->failures, report->index, report->code, report->system_code, report->text);
}

void TakeDamagedBlock(void* context, uint64_t block, const char* text) {
    Run* const run = AsRun(context);
    run->Keep(&run->failures, block, ZARVO_ERROR_DAMAGED, 0, text);
}

void TakeDamagedEntry(void* context, uint64_t entry, uint64_t readable) {
    Run* const run = AsRun(context);
    run->Keep(&run->damages, entry, readable);
}

// False with an exception set when the run has ended early.
bool HasEndedWell(Run* run, LibraryCall* call, zarvo_code code, const std::string& subject) {
    if (run->progress.SetException()) {
        return false;
    } else if (run->HasSourceFailed()) {
        RestoreError(Reference(run->self->source->LastException()));
    } else if (code != ZARVO_OK) {
        call->Raise(code, subject);
    } else if (run->isOutOfMemory) {
        PyErr_NoMemory();
    } else {
        return true;
    }
    return false;
}

zarvo_run_options MakeRunOptions(Run* run, uint64_t threads, uint64_t memory) {
    zarvo_run_options options = ZARVO_RUN_OPTIONS_INIT;
    options.threads = LimitThreads(threads);
    options.memory = memory;
    options.progress = TellProgress;
    options.context = run;
    return options;
}

PyObject* MakeSummary(const zarvo_summary& summary) {
    return Py_BuildValue("KKKK", summary.files, summary.folders, summary.kept, summary.bytes);
}

} // namespace

PyObject* ExtractArchive(PyObject* self, PyObject* arguments) {
    PyObject* folder = nullptr;
    PyObject* wanted = nullptr;
    PyObject* excluded = nullptr;
    uint64_t threads = 0, memory = 0;
    PyObject* progress = nullptr;
    zarvo_extract_options how = ZARVO_EXTRACT_OPTIONS_INIT;
    if (!PyArg_ParseTuple(arguments, "O&OOO&O&iO&ppO&O", PyUnicode_FSConverter, &folder, &wanted, &excluded,
                          ConvertCount, &threads, ConvertCount, &memory, &how.overwrite, ConvertCount, &how.strip,
                          &how.keep_broken, &how.dry_run, ConvertCount, &how.max_bytes, &progress))
        return nullptr;
    const Reference folderBytes(folder);
    const char* const folderText = PyBytes_AsString(folder);
    Patterns wantedPatterns, excludedPatterns;
    if (!wantedPatterns.Add(wanted) || !excludedPatterns.Add(excluded)) return nullptr;

    Run run(self, progress);
    how.report = TakeReport;
    zarvo_run_options options = MakeRunOptions(&run, threads, memory);
    options.wanted = wantedPatterns.Get();
    options.excluded = excludedPatterns.Get();
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    LibraryCall call(run.self);
    if (!call.IsAllowed()) return nullptr;
    const zarvo_code code = WithoutInterpreter(
        [&] { return zarvo_extract(run.self->archive, folderText, &options, &how, &summary, call.Error()); });
    const std::string subject = code == ZARVO_ERROR_SYSTEM ? folderText : *run.self->name;
    if (!HasEndedWell(&run, &call, code, subject)) return nullptr;

    const Reference failures(PyList_New(0));
    if (failures == nullptr) return nullptr;
    for (const Run::Failure& failure : run.failures) {
        SetError(failure.code, failure.systemCode, failure.text.c_str(), DescribeEntry(run.self, failure.index));
        if (!AppendTo(failures, Py_BuildValue("KN", failure.index, TakeError()))) return nullptr;
    }
    return Py_BuildValue("NON", MakeSummary(summary), failures.get(), wantedPatterns.MakeUnusedList());
}

PyObject* TestArchive(PyObject* self, PyObject* arguments) {
    uint64_t threads = 0, memory = 0;
    PyObject* progress = nullptr;
    if (!PyArg_ParseTuple(arguments, "O&O&O", ConvertCount, &threads, ConvertCount, &memory, &progress)) return nullptr;
    Run run(self, progress);
    const zarvo_run_options options = MakeRunOptions(&run, threads, memory);
    zarvo_test_options what = ZARVO_TEST_OPTIONS_INIT;
    what.block = TakeDamagedBlock;
    what.entry = TakeDamagedEntry;
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    LibraryCall call(run.self);
    if (!call.IsAllowed()) return nullptr;
    const zarvo_code code =
        WithoutInterpreter([&] { return zarvo_test(run.self->archive, &options, &what, &summary, call.Error()); });
    if (!HasEndedWell(&run, &call, code, *run.self->name)) return nullptr;

    const Reference entries(PyList_New(0)), blocks(PyList_New(0));
    if (entries == nullptr || blocks == nullptr) return nullptr;
    for (const Run::Damage& damage : run.damages)
        if (!AppendTo(entries, Py_BuildValue("KK", damage.entry, damage.readable))) return nullptr;
    for (const Run::Failure& block : run.failures)
        if (!AppendTo(blocks, Py_BuildValue("Ks", block.index, block.text.c_str()))) return nullptr;
    return Py_BuildValue("NOO", MakeSummary(summary), entries.get(), blocks.get());
}

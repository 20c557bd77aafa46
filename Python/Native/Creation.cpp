#include "Creation.h"

#include "Errors.h"
#include "Interpreter.h"
#include "ProgressTeller.h"
#include "Runs.h"

#include <new>
#include <string>
#include <vector>

namespace {

struct Creation {
    ProgressTeller progress;

    struct Report {
        std::string path;
        zarvo_code code;
        int systemCode;
        std::string text;
    };
    std::vector<Report> leftOut, failures;
    bool isOutOfMemory = false;
};

int TellProgress(void* context, const zarvo_progress* progress) {
    return WithInterpreter([&] { return static_cast<Creation*>(context)->progress.Tell(*progress) ? 0 : 1; });
}

// Called without the interpreter's lock; must not throw.
void TakeReport(void* context, const zarvo_create_report* report) {
    Creation* const creation = static_cast<Creation*>(context);
    if (report->outcome == ZARVO_OUTCOME_DONE) return;
    try {
        (report->outcome == ZARVO_OUTCOME_FAILED ? creation->failures : creation->leftOut)
            .push_back({{report->path, report->path_length}, report->code, report->system_code, report->text});
    } catch (const std::bad_alloc&) {
        creation->isOutOfMemory = true;
    }
}

} // namespace

PyObject* CreateArchive(PyObject*, PyObject* arguments) {
    PyObject* path = nullptr;
    PyObject* folder = nullptr;
    PyObject* excluded = nullptr;
    uint64_t threads = 0, memory = 0;
    PyObject* progress = nullptr;
    zarvo_create_options how = ZARVO_CREATE_OPTIONS_INIT;
    if (!PyArg_ParseTuple(arguments, "O&O&OO&O&iiipO&zzppO", PyUnicode_FSConverter, &path, PyUnicode_FSConverter,
                          &folder, &excluded, ConvertCount, &threads, ConvertCount, &memory, &how.layout,
                          &how.compression, &how.level, &how.is_streamed, ConvertCount, &how.block_size,
                          &how.engine_version, &how.engine_revision, &how.force, &how.dry_run, &progress))
        return nullptr;
    const Reference ownedPath(path), ownedFolder(folder);
    const char* const pathText = PyBytes_AsString(path);
    const char* const folderText = PyBytes_AsString(folder);
    Patterns excludedPatterns;
    if (!excludedPatterns.Add(excluded)) return nullptr;

    Creation creation = {ProgressTeller(progress), {}, {}};
    how.report = TakeReport;
    zarvo_run_options options = ZARVO_RUN_OPTIONS_INIT;
    options.threads = LimitThreads(threads);
    options.memory = memory;
    options.excluded = excludedPatterns.Get();
    options.progress = TellProgress;
    options.context = &creation;
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    zarvo_error* error = nullptr;
    const zarvo_code code =
        WithoutInterpreter([&] { return zarvo_create(pathText, folderText, &options, &how, &summary, &error); });
    const std::unique_ptr<zarvo_error, decltype(&zarvo_error_free)> ownedError(error, zarvo_error_free);
    if (creation.progress.SetException()) return nullptr;
    if (creation.isOutOfMemory) return PyErr_NoMemory();
    if (code != ZARVO_OK && creation.failures.empty())
        return SetError(code, zarvo_error_errno(error), zarvo_error_text(error), pathText);

    // What has no path in the archive is the folder itself.
    if (!creation.failures.empty() && creation.failures.front().path.empty()) {
        const Creation::Report& folderReport = creation.failures.front();
        return SetError(folderReport.code, folderReport.systemCode, folderReport.text.c_str(), folderText);
    }

    const Reference leftOut(PyList_New(0)), failures(PyList_New(0));
    if (leftOut == nullptr || failures == nullptr) return nullptr;
    for (const Creation::Report& each : creation.leftOut)
        if (!AppendTo(leftOut, Py_BuildValue("NN", DecodePath(each.path), DecodePath(each.text)))) return nullptr;
    for (const Creation::Report& each : creation.failures) {
        SetError(each.code, each.systemCode, each.text.c_str(), std::string(folderText) + "/" + each.path);
        if (!AppendTo(failures, Py_BuildValue("NN", DecodePath(each.path), TakeError()))) return nullptr;
    }
    return Py_BuildValue("KKKKOO", summary.files, summary.folders, summary.bytes, summary.archive_bytes, leftOut.get(),
                         failures.get());
}

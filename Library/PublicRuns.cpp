// The functions of zarvo.h that work on a whole archive.
#include "Library/Extraction.h"
#include "Library/Handles.h"
#include "Library/Inspection.h"
#include "Library/PublicStructures.h"
#include "Runtime/Allocator/Allocator.h"

// work: (run options, summary to be filled, failure) -> code.
template <typename Work>
static zarvo_code RunOn(zarvo_archive* archive, const zarvo_run_options* options, zarvo_summary* summary,
                        zarvo_error** error, Work&& work) {
    if (!IsLiveHandle(archive)) return RefuseArgument("no open archive", error);
    if (!IsNullOrHasSize(options) || !IsNullOrHasSize(summary)) return RefuseArgument(kNoSize, error);
    const zarvo_run_options given = CopyIn(options);
    const bool arePatternsLive = (given.wanted == nullptr || IsLiveHandle(given.wanted)) &&
                                 (given.excluded == nullptr || IsLiveHandle(given.excluded));
    if (!arePatternsLive) return RefuseArgument("patterns that have been freed", error);
    MessageScope scope(archive->Messages());
    Failure failure;
    zarvo_summary done = ZARVO_SUMMARY_INIT;
    const zarvo_code code = work(given, &done, &failure);
    if (summary != nullptr) CopyOut(done, summary);
    return Deliver(code, failure, error);
}

zarvo_code zarvo_extract(zarvo_archive* archive, const char* folder, const zarvo_run_options* options,
                         const zarvo_extract_options* how, zarvo_summary* summary, zarvo_error** error) {
    if (!IsNullOrHasSize(how)) return RefuseArgument(kNoSize, error);
    const zarvo_extract_options given = CopyIn(how);
    if (folder == nullptr) return RefuseArgument("no folder to extract to", error);
    if (given.overwrite < ZARVO_OVERWRITE_ALWAYS || given.overwrite > ZARVO_OVERWRITE_FAIL)
        return RefuseArgument("no such way to overwrite", error);
    return RunOn(archive, options, summary, error,
                 [&](const zarvo_run_options& run, zarvo_summary* done, Failure* failure) {
                     Extraction extraction(archive, run, given);
                     const zarvo_code code = extraction.Extract(folder, failure);
                     *done = extraction.Summary();
                     return code;
                 });
}

zarvo_code zarvo_test(zarvo_archive* archive, const zarvo_run_options* options, const zarvo_test_options* what,
                      zarvo_summary* summary, zarvo_error** error) {
    if (!IsNullOrHasSize(what)) return RefuseArgument(kNoSize, error);
    const zarvo_test_options given = CopyIn(what);
    return RunOn(archive, options, summary, error,
                 [&](const zarvo_run_options& run, zarvo_summary* done, Failure* failure) {
                     TestRun test(archive, run);
                     return test.Test(given, done, failure);
                 });
}

zarvo_code zarvo_visit(zarvo_archive* archive, const zarvo_run_options* options, const zarvo_visit_options* what,
                       zarvo_summary* summary, zarvo_error** error) {
    if (!IsNullOrHasSize(what)) return RefuseArgument(kNoSize, error);
    const zarvo_visit_options given = CopyIn(what);
    return RunOn(archive, options, summary, error,
                 [&](const zarvo_run_options& run, zarvo_summary* done, Failure* failure) {
                     VisitRun visit(archive, run, given);
                     const zarvo_code code = visit.Visit(failure);
                     *done = visit.Summary();
                     return code;
                 });
}

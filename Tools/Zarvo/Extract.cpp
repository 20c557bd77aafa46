#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <chrono>

namespace {

zarvo::extract_options ReadOptions(const Arguments& arguments) {
    zarvo::extract_options how;
    if (const std::string* const when = arguments.Find(kOverwrite))
        how.overwrite = *when == "never"  ? ZARVO_OVERWRITE_NEVER
                        : *when == "fail" ? ZARVO_OVERWRITE_FAIL
                                          : ZARVO_OVERWRITE_ALWAYS;
    if (const std::string* const count = arguments.Find(kStrip)) how.strip = std::stoul(*count);
    how.keep_broken = arguments.Has(kKeepBroken);
    how.dry_run = arguments.Has(kDryRun);
    return how;
}

} // namespace

int RunExtract(const Run& run) {
    const auto start = std::chrono::steady_clock::now();
    const std::string& path = run.GetOperands()[0];
    std::optional<zarvo::archive> archive = run.OpenArchive(path);
    if (!archive) return kNoArchive;
    const PatternList list = ReadPatterns(run);
    zarvo::patterns wanted, excluded;
    if (!AddPatterns(run, path, list.patterns, wanted) ||
        !AddPatterns(run, path, run.arguments.FindAll(kExclude), excluded))
        return kSomethingWrong;
    const std::string* const given = run.arguments.Find(kOutputFolder);
    const std::string folder = given != nullptr ? *given : path + "_data";

    Progress progress(run.arguments, run.console, true);
    zarvo::run_options options = run.MakeOptions(progress);
    if (!list.isEverything) options.wanted = &wanted;
    options.excluded = &excluded;
    zarvo::extract_options how = ReadOptions(run.arguments);
    const bool isVerbose = run.arguments.Has(kVerbose) || how.dry_run;
    how.report = [&](const zarvo_report& report) {
        const zarvo::entry entry = archive->entries()[report.index];
        const bool isBroken = report.outcome == ZARVO_OUTCOME_BROKEN;
        if (report.outcome == ZARVO_OUTCOME_FAILED || isBroken) run.SayOfEntry(path, entry.path(), report.text);
        if (isVerbose && (report.outcome == ZARVO_OUTCOME_DONE || isBroken)) run.WritePath(entry);
    };
    const zarvo::run_result result = archive->extract(folder, options, how);

    const std::string files = std::to_string(result.summary.files), bytes = std::to_string(result.summary.bytes);
    const std::string failures = std::to_string(result.summary.failures);
    run.done = files + " files, " + bytes + " bytes, " + failures + " failures";
    if (run.output.IsAbandoned()) return kSomethingWrong;
    // What ends a run is memory or the disk. Without memory, nobody knows what patterns would have matched.
    const zarvo_code code = result.error.code();
    if (result.error) run.console.Say(code == ZARVO_ERROR_SYSTEM ? folder : path, result.error.text());
    const bool areUsed = code == ZARVO_ERROR_MEMORY || SayUnused(run, path, list, wanted);
    if (!run.arguments.Has(kQuiet))
        run.console.Say(path,
                        MakeMessage("% files, % bytes, % failures, % seconds",
                                    {files, bytes, failures, FormatSeconds(std::chrono::steady_clock::now() - start)}));
    return result.error || result.summary.failures != 0 || !areUsed || !list.isComplete ? kSomethingWrong : kAllDone;
}

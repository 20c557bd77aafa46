#include "Tools/Zarvo/Json.h"
#include "Tools/Zarvo/Run.h"

namespace {

// Tests one archive. False when something is wrong with it.
bool Test(const Run& run, const std::string& path, zarvo::archive& archive, uint64_t* decoded) {
    const bool isJson = run.arguments.Has(kJson), areSeveral = run.GetOperands().size() > 1;
    const std::string_view end = run.arguments.Has(kNulOutput) ? std::string_view("\0", 1) : "\n";
    Progress progress(run.arguments, run.console, true);
    zarvo::run_options options = run.MakeOptions(progress);
    const uint64_t before = *decoded;
    options.progress = [&, show = std::move(options.progress)](const zarvo_progress& at) {
        *decoded = before + at.bytes;
        return show(at);
    };
    zarvo::test_options what;
    what.block = [&](uint64_t, std::string_view text) { run.console.Say(path, text); };
    what.entry = [&](uint64_t index, uint64_t readable) {
        const zarvo::entry entry = archive.entries()[index];
        run.console.WipeProgress();
        if (isJson) {
            Json object;
            object["archive"] = MakeJsonText(path);
            SetJsonPath(object, entry.path());
            object["size"] = entry.size();
            object["readable"] = readable;
            WriteJson(run.output, object);
            return;
        }
        if (areSeveral) {
            run.output.WriteText(path);
            run.output.Write(": ");
        }
        run.WritePath(entry, end);
    };
    const zarvo::run_result result = archive.test(options, what);
    if (result.error && !run.output.IsAbandoned()) run.console.Say(path, result.error.text());
    return !result.error && result.summary.failures == 0 && result.summary.damaged_blocks == 0;
}

} // namespace

int RunTest(const Run& run) {
    size_t opened = 0, whole = 0;
    uint64_t decoded = 0;
    for (const std::string& path : run.GetOperands()) {
        if (run.output.IsAbandoned()) break;
        std::optional<zarvo::archive> archive = run.OpenArchive(path);
        if (!archive) continue;
        ++opened;
        if (Test(run, path, *archive, &decoded)) ++whole;
    }
    run.done = std::to_string(decoded) + " bytes of data";
    if (opened == 0) return kNoArchive;
    return whole == run.GetOperands().size() ? kAllDone : kSomethingWrong;
}

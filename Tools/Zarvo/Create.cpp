#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <chrono>

namespace {

constexpr unsigned long long kMinBlockSize = 4'096, kMaxBlockSize = 1ull << 30;

int32_t ReadLayout(const std::string& name) {
    return name == "web"       ? ZARVO_LAYOUT_WEB
           : name == "raw"     ? ZARVO_LAYOUT_RAW
           : name == "archive" ? ZARVO_LAYOUT_ARCHIVE
                               : ZARVO_LAYOUT_FS;
}

int32_t ReadCompression(const std::string& name) {
    return name == "none"   ? ZARVO_KIND_NONE
           : name == "lzma" ? ZARVO_KIND_LZMA
           : name == "lz4"  ? ZARVO_KIND_LZ4
                            : ZARVO_KIND_LZ4HC;
}

// Sets how to what the options say. Returns what makes no sense about them, or an empty text.
std::string ReadForm(const Arguments& arguments, zarvo::create_options& how) {
    const std::string* const layout = arguments.Find(kLayout);
    if (layout != nullptr) how.layout = ReadLayout(*layout);
    const bool isWeb = how.layout == ZARVO_LAYOUT_WEB, isRaw = how.layout == ZARVO_LAYOUT_RAW;
    for (const Option* const option : {&kCompression, &kBlockSize, &kStreamed, &kLevel})
        if ((isRaw || (isWeb && option != &kLevel)) && arguments.Has(*option))
            return MakeMessage("the layout % gives no choice of %", {*layout, DescribeOption(*option)});

    how.is_streamed = arguments.Has(kStreamed);
    const std::string* const given = arguments.Find(kCompression);
    const std::string kind = given != nullptr ? *given : isWeb || how.is_streamed ? "lzma" : "lz4hc";
    if (given != nullptr) how.compression = ReadCompression(kind);
    if (how.is_streamed && kind.starts_with("lz4")) return MakeMessage("blocks of % can't be streamed", {kind});
    if (const std::string* const level = arguments.Find(kLevel)) {
        const unsigned long least = kind == "lzma" ? 0 : 1, most = kind == "lzma" ? 9 : 12, wanted = std::stoul(*level);
        if (kind == "none" || kind == "lz4") return MakeMessage("% has no levels", {kind});
        if (wanted < least || wanted > most)
            return MakeMessage("% has the levels % to %", {kind, std::to_string(least), std::to_string(most)});
        how.level = static_cast<int32_t>(wanted);
    }
    if (const std::string* const size = arguments.Find(kBlockSize)) {
        how.block_size = *ParseSize(*size);
        if (how.block_size < kMinBlockSize || how.block_size > kMaxBlockSize)
            return MakeMessage("a block has % to % bytes",
                               {std::to_string(kMinBlockSize), std::to_string(kMaxBlockSize)});
    }
    if (const std::string* const text = arguments.Find(kEngineVersion)) how.engine_version = *text;
    if (const std::string* const text = arguments.Find(kEngineRevision)) how.engine_revision = *text;
    return "";
}

} // namespace

int RunCreate(const Run& run) {
    const auto start = std::chrono::steady_clock::now();
    const std::string &path = run.GetOperands()[0], &folder = run.GetOperands()[1];
    zarvo::create_options how;
    if (const std::string complaint = ReadForm(run.arguments, how); !complaint.empty())
        return RefuseUsage(run.console, kCreate, complaint);
    if (run.RefuseStream(path)) return kNoArchive;
    zarvo::patterns excluded;
    if (!AddPatterns(run, path, run.arguments.FindAll(kExclude), excluded)) return kSomethingWrong;
    how.force = run.arguments.Has(kForce);
    how.dry_run = run.arguments.Has(kDryRunOfCreate);

    uint64_t packed = 0;
    Progress progress(run.arguments, run.console, true);
    zarvo::run_options options = run.MakeOptions(progress);
    options.excluded = &excluded;
    options.progress = [&, show = std::move(options.progress)](const zarvo_progress& at) {
        packed = at.bytes;
        return show(at);
    };
    bool isTold = false, isFolderMissing = false;
    how.report = [&](const zarvo_create_report& report) {
        const std::string_view entry(report.path, report.path_length);
        if (report.outcome == ZARVO_OUTCOME_DONE) {
            if (how.dry_run) run.WritePath(entry, report.kind == ZARVO_FOLDER);
            return;
        }
        run.console.Say(entry.empty() ? folder : folder + (folder.ends_with('/') ? "" : "/") + std::string(entry),
                        report.text);
        if (report.outcome == ZARVO_OUTCOME_FAILED) isTold = true;
        if (entry.empty()) isFolderMissing = true;
    };
    how.log = [&](std::string_view message) { run.console.Say(path, message); };
    const zarvo::run_result result = zarvo::create(path, folder, options, how);

    const bool isMade = !result.error && !how.dry_run;
    run.done = std::to_string(packed) + (isMade ? " bytes; the archive is made" : " bytes; no archive is made");
    if (run.output.IsAbandoned()) return kSomethingWrong;
    if (result.error) {
        if (!isTold) run.console.Say(path, result.error.text());
        return isFolderMissing ? kNoArchive : kSomethingWrong;
    }
    const std::string files = std::to_string(result.summary.files), bytes = std::to_string(result.summary.bytes);
    const std::string leftOut = std::to_string(result.summary.failures);
    const std::string seconds = FormatSeconds(std::chrono::steady_clock::now() - start);
    if (!run.arguments.Has(kQuiet) && !how.dry_run)
        run.console.Say(path,
                        MakeMessage("% files, % bytes, % left out, made % bytes in % seconds",
                                    {files, bytes, leftOut, std::to_string(result.summary.archive_bytes), seconds}));
    return result.summary.failures != 0 ? kSomethingWrong : kAllDone;
}

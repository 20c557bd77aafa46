#include "Tools/Zarvo/Options.h"

#include <algorithm>

const Option kLong = {.letter = 'l', .help = "show kind (f or d), size, offset in the data, and path"};
const Option kNul = {.letter = '0', .help = "end each path with NUL instead of a newline, also in --files-from"};
const Option kNulInput = {.letter = '0', .help = "patterns in --files-from end with NUL instead of a newline"};
const Option kNulOutput = {.letter = '0', .help = "end each path with NUL instead of a newline"};
const Option kJson = {.name = "json", .help = "print JSON Lines, one object per line"};
const Option kFilesFrom = {.name = "files-from",
                           .value = "FILE",
                           .kind = ValueKind::kFile,
                           .help = "take more patterns from FILE, one per line (-: standard input)"};
const Option kOutputFolder = {.letter = 'o',
                              .value = "DIR",
                              .kind = ValueKind::kFile,
                              .help = "write into DIR, made if missing (default: ARCHIVE_data)"};
const Option kExclude = {.letter = 'x', .value = "PATTERN", .help = "leave out what matches; repeatable"};
const Option kOverwrite = {.name = "overwrite",
                           .value = "WHEN",
                           .kind = ValueKind::kChoice,
                           .choices = "always|never|fail",
                           .help = "files that are there: replace (always, the default), keep (never), or fail"};
const Option kStrip = {
    .name = "strip", .value = "N", .kind = ValueKind::kNumber, .help = "leave out the first N components of each path"};
const Option kKeepBroken = {.name = "keep-broken", .help = "of damaged files, write the bytes before the damage"};
const Option kDryRun = {.name = "dry-run", .help = "read everything, print what -v would, and write nothing"};
const Option kVerbose = {.letter = 'v', .help = "print the path of each entry that is put in place"};
const Option kAlgorithm = {.letter = 'a',
                           .value = "NAME",
                           .kind = ValueKind::kChoice,
                           .choices = "sha256|sha1|md5|sha512|blake2b512",
                           .help = "sha256 (the default), sha1, md5, sha512 or blake2b512"};
const Option kLayout = {.name = "layout",
                        .value = "NAME",
                        .kind = ValueKind::kChoice,
                        .choices = "fs|web|raw|archive",
                        .help = "fs (ZarvoFS, the default), web, raw or archive"};
const Option kCompression = {.letter = 'c',
                             .value = "KIND",
                             .kind = ValueKind::kChoice,
                             .choices = "none|lz4|lz4hc|lzma",
                             .help = "none, lz4, lz4hc (the default) or lzma"};
const Option kLevel = {.letter = 'l',
                       .value = "LEVEL",
                       .kind = ValueKind::kNumber,
                       .help = "1 to 12 for lz4hc (default: 9), 0 to 9 for lzma (default: 5)"};
const Option kBlockSize = {.letter = 'b',
                           .value = "SIZE",
                           .kind = ValueKind::kSize,
                           .help = "bytes of a block before it is compressed (K, M, G; default: 128K)"};
const Option kStreamed = {.name = "streamed",
                          .help = "blocks that can only be decoded from their start on (lzma, or none)"};
const Option kEngineVersion = {.name = "engine-version",
                               .value = "TEXT",
                               .help = "the engine's version, as the archive states it (default: 5.x.x)"};
const Option kEngineRevision = {
    .name = "engine-revision", .value = "TEXT", .help = "the engine's revision (default: 7041.3.0b12)"};
const Option kForce = {.name = "force", .help = "replace ARCHIVE if it exists"};
const Option kDryRunOfCreate = {.name = "dry-run",
                                .help = "print what would be put into the archive, and write nothing"};
const Option kForeground = {.letter = 'f', .help = "stay in the foreground; messages go to standard error"};
const Option kMountOptions = {
    .letter = 'o', .value = "OPTIONS", .help = "options of the mount, such as allow_other; repeatable"};
const Option kMemory = {.name = "memory",
                        .value = "SIZE",
                        .kind = ValueKind::kSize,
                        .help = "bytes that blocks may take (K, M, G; default: half of what is free)"};
const Option kQuiet = {.letter = 'q', .help = "show no progress and no summary"};
const Option kThreads = {.letter = 'j',
                         .name = "threads",
                         .value = "N",
                         .kind = ValueKind::kCount,
                         .help = "threads to use (default: as many as the process may)"};
const Option kProgress = {.name = "progress",
                          .value = "WHEN",
                          .kind = ValueKind::kChoice,
                          .choices = "auto|always|never",
                          .help = "show progress on standard error: auto (on a terminal), always, never"};
const Option kHelp = {.letter = 'h', .name = "help", .help = "print this help"};
const Option kVersion = {.name = "version", .help = "print the version"};

namespace {

constexpr const Option* kListOptions[] = {&kLong,  &kNul,     &kJson,     &kFilesFrom, &kMemory,
                                          &kQuiet, &kThreads, &kProgress, &kHelp};
constexpr const Option* kInfoOptions[] = {&kJson, &kMemory, &kQuiet, &kThreads, &kProgress, &kHelp};
constexpr const Option* kCatOptions[] = {&kNulInput, &kFilesFrom, &kMemory, &kQuiet, &kThreads, &kProgress, &kHelp};
constexpr const Option* kExtractOptions[] = {&kOutputFolder, &kExclude,  &kOverwrite, &kStrip,  &kKeepBroken,
                                             &kDryRun,       &kNulInput, &kFilesFrom, &kMemory, &kQuiet,
                                             &kVerbose,      &kThreads,  &kProgress,  &kHelp};
constexpr const Option* kTestOptions[] = {&kNulOutput, &kJson, &kMemory, &kQuiet, &kThreads, &kProgress, &kHelp};
constexpr const Option* kSumOptions[] = {&kAlgorithm, &kNulInput, &kFilesFrom, &kMemory,
                                         &kQuiet,     &kThreads,  &kProgress,  &kHelp};
constexpr const Option* kCreateOptions[] = {&kLayout,        &kCompression,    &kLevel,   &kBlockSize, &kStreamed,
                                            &kEngineVersion, &kEngineRevision, &kExclude, &kForce,     &kDryRunOfCreate,
                                            &kMemory,        &kQuiet,          &kThreads, &kProgress,  &kHelp};
constexpr const Option* kMountSubcommandOptions[] = {&kForeground, &kMountOptions, &kMemory, &kQuiet,
                                                     &kThreads,    &kProgress,     &kHelp};
constexpr const Option* kOptions[] = {&kQuiet, &kThreads, &kProgress, &kHelp, &kVersion};

constexpr std::string_view kAboutPatterns =
    "A PATTERN is a path, or a glob that is matched with whole paths: * and ? and\n"
    "[...] stop at \"/\", ** does not, and \\ takes the next character as it is. A\n"
    "pattern that matches a folder also matches everything below it.\n";
constexpr std::string_view kAboutExtract =
    "Nothing is written outside DIR. A file gets its name when it is whole; a damaged\n"
    "file is an error, and is not written.\n";
constexpr std::string_view kAboutCreate =
    "Entries are sorted by their paths: the same files and options give the same\n"
    "bytes. ARCHIVE gets its name when it is whole. Links, devices, pipes and sockets\n"
    "are left out. A block that does not shrink is stored as it is. The layout web is\n"
    "one lzma stream, and raw is not compressed: neither has folders, or takes -c, -b\n"
    "or --streamed.\n";
constexpr std::string_view kAboutTest =
    "The formats hold no checksums, so damage that still decodes is not found. To find\n"
    "it, keep what 'zarvo sum' prints while the archive is good, and compare later.\n";
constexpr std::string_view kAboutSum = "This checks what was extracted into DIR:\n"
                                       "    zarvo sum ARCHIVE | (cd DIR && sha256sum -c)\n";
constexpr std::string_view kAboutMount =
    "Goes to the background when FOLDER shows the archive. 'fusermount3 -u FOLDER'\n"
    "ends the mount.\n";

} // namespace

const Subcommand kList = {.name = "list",
                          .operands = "ARCHIVE [PATTERN...]",
                          .summary = "print the paths of the entries",
                          .about = {},
                          .options = kListOptions,
                          .minOperands = 1};
const Subcommand kInfo = {.name = "info",
                          .operands = "ARCHIVE...",
                          .summary = "say what archives are",
                          .about = {},
                          .options = kInfoOptions,
                          .minOperands = 1};
const Subcommand kExtract = {.name = "extract",
                             .operands = "ARCHIVE [PATTERN...]",
                             .summary = "write files and folders to disk",
                             .about = kAboutExtract,
                             .options = kExtractOptions,
                             .minOperands = 1};
const Subcommand kCat = {.name = "cat",
                         .operands = "ARCHIVE PATTERN...",
                         .summary = "print the contents of files",
                         .about = {},
                         .options = kCatOptions,
                         .minOperands = 2};
const Subcommand kTest = {.name = "test",
                          .operands = "ARCHIVE...",
                          .summary = "decode everything, and print the paths of damaged files",
                          .about = kAboutTest,
                          .options = kTestOptions,
                          .minOperands = 1};
const Subcommand kSum = {.name = "sum",
                         .operands = "ARCHIVE [PATTERN...]",
                         .summary = "print checksums, as sha256sum would of the extracted files",
                         .about = kAboutSum,
                         .options = kSumOptions,
                         .minOperands = 1};
const Subcommand kCreate = {.name = "create",
                            .operands = "ARCHIVE FOLDER",
                            .summary = "make an archive of what a folder holds",
                            .about = kAboutCreate,
                            .options = kCreateOptions,
                            .minOperands = 2,
                            .maxOperands = 2};
const Subcommand kMount = {.name = "mount",
                           .operands = "ARCHIVE FOLDER",
                           .summary = "show the entries as a read-only file system",
                           .about = kAboutMount,
                           .options = kMountSubcommandOptions,
                           .minOperands = 2,
                           .maxOperands = 2};
const Subcommand kNoSubcommand = {.name = {},
                                  .operands = "SUBCOMMAND [OPTION...] ARCHIVE [ARGUMENT...]",
                                  .summary = "read and make archives of the Zarvo engine's formats",
                                  .about = {},
                                  .options = kOptions,
                                  .minOperands = 0};

std::span<const Subcommand* const> GetSubcommands() {
    static constexpr const Subcommand* kSubcommands[] = {&kList, &kInfo, &kExtract, &kCat,
                                                         &kTest, &kSum,  &kCreate,  &kMount};
    return kSubcommands;
}

std::string DescribeOption(const Option& option) {
    std::string text;
    if (option.letter != 0) text += {'-', option.letter};
    if (option.letter != 0 && !option.name.empty()) text += ", ";
    if (!option.name.empty()) (text += "--") += option.name;
    if (!option.value.empty()) (text += option.letter == 0 ? "=" : " ") += option.value;
    return text;
}

namespace {

// Rows of two columns, a name and what it means.
std::string DescribeRows(const std::vector<std::pair<std::string, std::string_view>>& rows) {
    size_t width = 0;
    for (const auto& [name, meaning] : rows)
        width = std::max(width, name.size());
    std::string text;
    for (const auto& [name, meaning] : rows)
        ((text += "  " + name).append(width + 2 - name.size(), ' ') += meaning) += '\n';
    return text;
}

} // namespace

std::string DescribeSubcommand(const Subcommand& subcommand) {
    const bool isNone = subcommand.name.empty();
    std::string text = "Usage: zarvo ";
    if (!isNone) (text += subcommand.name) += " [OPTION...] ";
    ((text += subcommand.operands) += "\n\n") += subcommand.summary;
    text += ".\n";
    text[text.find("\n\n") + 2] -= 'a' - 'A';
    const bool hasPatterns = subcommand.operands.find("PATTERN") != std::string_view::npos;
    if (!subcommand.about.empty()) (text += '\n') += subcommand.about;
    if (hasPatterns) (text += '\n') += kAboutPatterns;

    std::vector<std::pair<std::string, std::string_view>> rows;
    if (isNone) {
        for (const Subcommand* const each : GetSubcommands())
            rows.emplace_back(each->name, each->summary);
        (text += "\nSubcommands:\n") += DescribeRows(rows);
    }
    rows.clear();
    for (const Option* const option : subcommand.options)
        rows.emplace_back(DescribeOption(*option), option->help);
    (text += "\nOptions, which may stand anywhere before --:\n") += DescribeRows(rows);
    text += isNone ? "\n'zarvo SUBCOMMAND --help' lists the options of a subcommand. 'man zarvo' says more.\n"
                   : "\n'man zarvo' says more.\n";
    return text;
}

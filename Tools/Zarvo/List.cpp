#include "Tools/Zarvo/Json.h"
#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"

#include <algorithm>

namespace {

// The widths of the columns of numbers: those of the largest among all entries, so that they are known before the first
// line.
struct Widths {
    size_t size = 0;
    size_t offset = 0;
};

Widths MeasureColumns(const zarvo::archive& archive) {
    uint64_t size = 0, offset = 0;
    for (const zarvo::entry entry : archive.entries()) {
        size = std::max(size, entry.size());
        offset = std::max(offset, entry.offset());
    }
    return {.size = std::to_string(size).size(), .offset = std::to_string(offset).size()};
}

std::string AlignRight(uint64_t number, size_t width) {
    const std::string digits = std::to_string(number);
    return std::string(width - digits.size(), ' ') + digits;
}

void WriteJsonEntry(OutputBuffer& output, const zarvo::entry& entry) {
    Json object;
    SetJsonPath(object, entry.path());
    object["kind"] = entry.is_folder() ? "folder" : "file";
    object["size"] = entry.size();
    object["offset"] = entry.offset();
    object["flags"] = entry.flags();
    WriteJson(output, object);
}

} // namespace

int RunList(const Run& run) {
    const std::string& path = run.GetOperands()[0];
    std::optional<zarvo::archive> archive = run.OpenArchive(path);
    if (!archive) return kNoArchive;
    const PatternList list = ReadPatterns(run);
    zarvo::patterns patterns;
    if (!AddPatterns(run, path, list.patterns, patterns)) return kSomethingWrong;

    const bool isJson = run.arguments.Has(kJson);
    const std::string_view end = run.arguments.Has(kNul) ? std::string_view("\0", 1) : "\n";
    const bool isLong = run.arguments.Has(kLong) && !isJson;
    const Widths widths = isLong ? MeasureColumns(*archive) : Widths();
    for (const zarvo::entry entry : archive->entries()) {
        if (run.output.IsClosed()) break;
        if (!list.isEverything && !patterns.match(entry.path())) continue;
        if (isJson) {
            WriteJsonEntry(run.output, entry);
            continue;
        }
        if (isLong)
            run.output.Write((entry.is_folder() ? "d " : "f ") + AlignRight(entry.size(), widths.size) + " " +
                             AlignRight(entry.offset(), widths.offset) + " ");
        run.WritePath(entry, end);
    }

    const bool areUsed = SayUnused(run, path, list, patterns);
    return list.isComplete && areUsed ? kAllDone : kSomethingWrong;
}

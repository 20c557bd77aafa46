#include "Tools/Zarvo/Json.h"
#include "Tools/Zarvo/Run.h"

namespace {

std::string_view GetLayoutName(int32_t layout) {
    switch (layout) {
    case ZARVO_LAYOUT_WEB: return "ZarvoWeb";
    case ZARVO_LAYOUT_RAW: return "ZarvoRaw";
    case ZARVO_LAYOUT_ARCHIVE: return "ZarvoArchive";
    default: return "ZarvoFS";
    }
}

// The numbers, in their order.
struct Number {
    uint64_t zarvo_info::*value;
    const char* name; // for people
    const char* unit;
    const char* key;         // in JSON
    bool isOfBlocks = false; // in JSON, in the object "blocks"
};
constexpr Number kNumbers[] = {
    {&zarvo_info::recorded_size, "recorded size", " bytes", "recordedSize"},
    {&zarvo_info::file_size, "file size", " bytes", "fileSize"},
    {&zarvo_info::data_size, "data size", " bytes", "dataSize"},
    {&zarvo_info::stored_size, "stored size", " bytes", "storedSize"},
    {&zarvo_info::block_count, "blocks", "", "count", true},
    {&zarvo_info::largest_block, "largest block", " bytes", "largest", true},
    {&zarvo_info::streamed_blocks, "blocks streamed", "", "streamed", true},
    {&zarvo_info::blocks_none, "blocks stored", "", "none", true},
    {&zarvo_info::blocks_lzma, "blocks LZMA", "", "lzma", true},
    {&zarvo_info::blocks_lz4, "blocks LZ4", "", "lz4", true},
    {&zarvo_info::blocks_lz4hc, "blocks LZ4HC", "", "lz4hc", true},
    {&zarvo_info::blocks_unknown, "blocks unknown", "", "unknown", true},
    {&zarvo_info::entry_count, "entries", "", "entries"},
    {&zarvo_info::file_count, "files", "", "files"},
    {&zarvo_info::folder_count, "folders", "", "folders"},
    {&zarvo_info::file_bytes, "bytes of files", " bytes", "fileBytes"},
};

Json Describe(const std::string& path, const zarvo_info& info) {
    Json object;
    object["archive"] = MakeJsonText(path);
    object["layout"] = GetLayoutName(info.layout);
    object["version"] = info.version;
    object["engineVersion"] = MakeJsonText(info.engine_version);
    object["engineRevision"] = MakeJsonText(info.engine_revision);
    for (const Number& number : kNumbers)
        (number.isOfBlocks ? object["blocks"] : object)[number.key] = info.*number.value;
    return object;
}

// The same, a line each.
void WriteLines(OutputBuffer& output, const std::string& path, const zarvo_info& info) {
    const auto line = [&](std::string_view name, std::string_view value) {
        constexpr size_t kWidth = 18;
        output.Write((std::string(name) + ':').append(kWidth - name.size(), ' '));
        output.WriteText(value);
        output.Write("\n");
    };
    line("archive", path);
    line("layout", GetLayoutName(info.layout));
    line("version", std::to_string(info.version));
    line("engine version", info.engine_version);
    line("engine revision", info.engine_revision);
    for (const Number& number : kNumbers)
        line(number.name, std::to_string(info.*number.value) + number.unit);
}

} // namespace

int RunInfo(const Run& run) {
    size_t opened = 0;
    for (const std::string& path : run.GetOperands()) {
        if (run.output.IsClosed()) break;
        const std::optional<zarvo::archive> archive = run.OpenArchive(path);
        if (!archive) continue;
        ++opened;
        if (run.arguments.Has(kJson)) {
            WriteJson(run.output, Describe(path, archive->info()));
            continue;
        }
        if (opened > 1) run.output.Write("\n");
        WriteLines(run.output, path, archive->info());
    }
    if (opened == 0) return kNoArchive;
    return opened == run.GetOperands().size() ? kAllDone : kSomethingWrong;
}

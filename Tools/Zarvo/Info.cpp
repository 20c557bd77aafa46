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

Json Describe(const std::string& path, const zarvo_info& info) {
    Json object;
    object["archive"] = MakeJsonText(path);
    object["layout"] = GetLayoutName(info.layout);
    object["version"] = info.version;
    object["engineVersion"] = MakeJsonText(info.engine_version);
    object["engineRevision"] = MakeJsonText(info.engine_revision);
    object["recordedSize"] = info.recorded_size;
    object["fileSize"] = info.file_size;
    object["dataSize"] = info.data_size;
    object["storedSize"] = info.stored_size;
    Json& blocks = object["blocks"];
    blocks["count"] = info.block_count;
    blocks["largest"] = info.largest_block;
    blocks["streamed"] = info.streamed_blocks;
    blocks["none"] = info.blocks_none;
    blocks["lzma"] = info.blocks_lzma;
    blocks["lz4"] = info.blocks_lz4;
    blocks["lz4hc"] = info.blocks_lz4hc;
    blocks["unknown"] = info.blocks_unknown;
    object["entries"] = info.entry_count;
    object["files"] = info.file_count;
    object["folders"] = info.folder_count;
    object["fileBytes"] = info.file_bytes;
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
    const auto number = [&](std::string_view name, uint64_t value) { line(name, std::to_string(value)); };
    const auto bytes = [&](std::string_view name, uint64_t value) { line(name, std::to_string(value) + " bytes"); };
    line("archive", path);
    line("layout", GetLayoutName(info.layout));
    number("version", info.version);
    line("engine version", info.engine_version);
    line("engine revision", info.engine_revision);
    bytes("recorded size", info.recorded_size);
    bytes("file size", info.file_size);
    bytes("data size", info.data_size);
    bytes("stored size", info.stored_size);
    number("blocks", info.block_count);
    bytes("largest block", info.largest_block);
    number("blocks streamed", info.streamed_blocks);
    number("blocks stored", info.blocks_none);
    number("blocks LZMA", info.blocks_lzma);
    number("blocks LZ4", info.blocks_lz4);
    number("blocks LZ4HC", info.blocks_lz4hc);
    number("blocks unknown", info.blocks_unknown);
    number("entries", info.entry_count);
    number("files", info.file_count);
    number("folders", info.folder_count);
    bytes("bytes of files", info.file_bytes);
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

#include "Library/Writer/WritePlan.h"

#include "Runtime/Utilities/ZarvoConfig.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include <algorithm>
#include <climits>
#include <lz4hc.h>

namespace {

constexpr const char* kEngineVersion = "5.x.x"; // of every version of the engine

constexpr size_t kMaxEngineText = 65'535;

constexpr UInt64 kMinBlockSize = 4'096;
constexpr UInt64 kMaxBlockSize = UInt64{1} << 30;
constexpr UInt64 kDefaultBlockSize = 131'072;
constexpr UInt64 kRawPieceSize = 1'048'576;
constexpr int kDefaultLzmaLevel = 5;
constexpr int kMaxLzmaLevel = 9;

// A reader opens no more than that by default.
constexpr UInt64 kMaxEntries = UInt64{1} << 26;
constexpr UInt64 kMaxDirectorySize = UInt64{1} << 30;

// Varnex looks for the end of a ZarvoWeb directory in pieces of this size, and only in whole ones.
constexpr UInt64 kWebPieceSize = 65'536;

} // namespace

UInt64 LegacyHeaderSize(const ArchiveForm& form) {
    ByteSink sink;
    PutLegacyHeader(sink, form, {});
    return sink.Size();
}

zarvo_code WritePlan::ReadOptions(const zarvo_create_options& options, Failure* failure) {
    m_Layout = options.layout;
    m_BlockSize = options.block_size != 0 ? options.block_size : kDefaultBlockSize;
    m_IsStreamed = options.is_streamed != 0;
    m_Form.engineVersion = options.engine_version != nullptr ? options.engine_version : kEngineVersion;
    m_Form.engineRevision = options.engine_revision != nullptr ? options.engine_revision : ZarvoConfig::ZarvoVersion;
    switch (m_Layout) {
    case ZARVO_LAYOUT_FS: m_Form.signature = ArchiveStorageHeader::kSignature, m_Form.version = 8; break;
    case ZARVO_LAYOUT_WEB: m_Form.signature = ArchiveStorageHeader::kSignatureWeb, m_Form.version = 3; break;
    case ZARVO_LAYOUT_RAW: m_Form.signature = ArchiveStorageHeader::kSignatureRaw, m_Form.version = 3; break;
    case ZARVO_LAYOUT_ARCHIVE: m_Form.signature = ArchiveStorageHeader::kSignatureArchive, m_Form.version = 5; break;
    default: return failure->SetArgument("no such layout");
    }
    if (m_Form.engineVersion.size() > kMaxEngineText || m_Form.engineRevision.size() > kMaxEngineText)
        return failure->SetArgument("the engine's version or revision is too long");
    if (m_BlockSize < kMinBlockSize || m_BlockSize > kMaxBlockSize)
        return failure->SetArgument("a block has 4096 to 1073741824 bytes");
    const bool hasChoice = options.compression != ZARVO_DEFAULT || options.block_size != 0 || m_IsStreamed;
    if (HasLegacyDirectory() && hasChoice)
        return failure->SetArgument("the layout gives no choice of compression, blocks or streams");
    return ReadCompression(options, failure);
}

zarvo_code WritePlan::ReadCompression(const zarvo_create_options& options, Failure* failure) {
    SInt32 kind = options.compression;
    if (kind == ZARVO_DEFAULT) kind = m_IsStreamed ? ZARVO_KIND_LZMA : ZARVO_KIND_LZ4HC;
    if (m_Layout == ZARVO_LAYOUT_WEB) kind = ZARVO_KIND_LZMA;
    if (m_Layout == ZARVO_LAYOUT_RAW) kind = ZARVO_KIND_NONE;
    if (kind < ZARVO_KIND_NONE || kind > ZARVO_KIND_LZ4HC) return failure->SetArgument("no such compression");
    m_Type = static_cast<CompressionType>(kind);
    if (m_IsStreamed && (m_Type == kCompressionLz4 || m_Type == kCompressionLz4HC))
        return failure->SetArgument("blocks of LZ4 can't be streamed");

    const bool isLzma = m_Type == kCompressionLzma;
    const bool hasLevels = isLzma || m_Type == kCompressionLz4HC;
    const int least = isLzma ? 0 : 1;
    const int most = isLzma ? kMaxLzmaLevel : LZ4HC_CLEVEL_MAX;
    m_Level = isLzma ? kDefaultLzmaLevel : LZ4HC_CLEVEL_DEFAULT;
    if (options.level == ZARVO_DEFAULT) return ZARVO_OK;
    m_Level = options.level;
    if (!hasLevels) return failure->SetArgument("the compression has no levels");
    if (m_Level < least || m_Level > most) return failure->SetArgument("the compression has no such level");
    return ZARVO_OK;
}

// How many bytes of data the layout can hold, whatever is around them.
UInt64 WritePlan::EndOfLayout() const {
    if (!HasLegacyDirectory()) return static_cast<UInt64>(LLONG_MAX) - UINT_MAX; // the archive is a file of this system
    const UInt64 header = LegacyHeaderSize(m_Form);
    const UInt64 end = UINT_MAX - std::min<UInt64>(header, UINT_MAX);
    return m_Layout == ZARVO_LAYOUT_WEB ? end / kWebPieceSize * kWebPieceSize : end;
}

zarvo_code WritePlan::Place(EntryList* list, size_t* failed, Failure* failure) {
    const UInt64 end = EndOfLayout();
    m_DirectorySize = HasLegacyDirectory() ? LegacyDirectorySize(*list) : 0;
    UInt64 position = m_DirectorySize;
    UInt64 directorySize = 24; // as far as the entry at hand
    for (size_t index = 0; index < list->size(); ++index) {
        EntryList::Entry& entry = (*list)[index];
        *failed = index;
        if (index == kMaxEntries)
            return failure->Set(ZARVO_ERROR_LIMIT, "an archive holds %llu entries, and this is one more",
                                static_cast<unsigned long long>(kMaxEntries));
        const UInt64 left = end - std::min(position, end);
        if (entry.size > left)
            return failure->Set(ZARVO_ERROR_LIMIT, "the file has %llu bytes, and the layout has room for %llu more",
                                static_cast<unsigned long long>(entry.size), static_cast<unsigned long long>(left));
        entry.offset = position; // of a folder, nobody reads it
        position += entry.size;
        directorySize += (HasLegacyDirectory() ? 9 : 21) + entry.pathSize;
        const UInt64 bytesOfBlock = HasLegacyDirectory() ? 0 : m_Layout == ZARVO_LAYOUT_ARCHIVE ? 24 : 10;
        const UInt64 blocks = bytesOfBlock * (position / m_BlockSize + 1);
        if (directorySize + blocks > kMaxDirectorySize)
            return failure->Set(ZARVO_ERROR_LIMIT, "up to here, the directory has %llu bytes, and the limit is %llu",
                                static_cast<unsigned long long>(directorySize + blocks),
                                static_cast<unsigned long long>(kMaxDirectorySize));
        if (position / m_BlockSize >= UINT_MAX)
            return failure->Set(ZARVO_ERROR_LIMIT, "up to here, there are %llu blocks, and the limit is %u",
                                static_cast<unsigned long long>(position / m_BlockSize + 1), UINT_MAX);
    }
    m_DataSize = position;
    // The directory is then found by Varnex, too.
    if (m_Layout == ZARVO_LAYOUT_WEB) m_DataSize = std::max(m_DataSize, RoundUp(m_DirectorySize, kWebPieceSize));
    return ZARVO_OK;
}

UInt64 WritePlan::BlockSize() const {
    UInt64 size = m_BlockSize;
    if (m_Layout == ZARVO_LAYOUT_WEB) size = m_DataSize;
    if (m_Layout == ZARVO_LAYOUT_RAW) size = kRawPieceSize;
    return std::clamp<UInt64>(size, 1, std::max<UInt64>(m_DataSize, 1));
}

EncoderSettings WritePlan::BlockEncoding() const {
    return {.type = m_Type, .level = m_Level, .dictionarySize = ChooseLzmaDictionary(m_Level, BlockSize())};
}

// One thread encodes the section while all others wait. From level 5 on, the coders take up to 20 times (LZ4HC) and 50
// times (LZMA) as long for what repeats as much as paths and empty files do, and save about 2 bytes per entry at best.
EncoderSettings WritePlan::SectionEncoding(UInt64 sectionSize) const {
    constexpr int kMaxLevel = 4;
    constexpr UInt64 kMaxDictionary = 1'048'576;
    EncoderSettings settings = BlockEncoding();
    settings.level = std::min(m_Level, kMaxLevel);
    settings.dictionarySize = ChooseLzmaDictionary(settings.level, std::min(sectionSize, kMaxDictionary));
    return settings;
}

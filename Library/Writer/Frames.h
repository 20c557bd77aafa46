// What lies around an archive's data: the fields of each layout, in the order in which they are stored. A sink takes
// them.
//
//   ByteSink head;
//   PutBlockBasedHeader(head, form, sizes);
//   if (!head.IsWhole()) return failure->SetMemory();
//   file.Write(0, head.Bytes(), head.Size(), failure);
//
// Fields that hold the size or the place of a part are given as arguments: whoever writes the archive knows them once
// it has measured that part, or written it. Any thread.
#pragma once

#include "Library/Writer/EntryList.h"
#include "Runtime/Core/NonCopyable.h"

// A field's name, as in the tables of Frames.cpp: "version", or "block[3].compressedSize".
struct FieldName {
    const char* field;
    const char* list = nullptr; // null outside of lists
    size_t index = 0;
};

class FieldSink : private NonCopyable {
public:
    virtual ~FieldSink() = default;

    // Takes the low size bytes of value, most significant first.
    virtual void PutNumber(const FieldName& name, UInt64 value, UInt32 size) = 0;

    // Takes a text and a NUL.
    virtual void PutText(core::string_ref text) = 0;
};

// Keeps the bytes. Once memory is refused, it takes nothing more.
class ByteSink final : public FieldSink {
public:
    void PutNumber(const FieldName& name, UInt64 value, UInt32 size) override;
    void PutText(core::string_ref text) override;
    void PutZeros(size_t count);

    // False if memory was refused.
    [[nodiscard]] bool IsWhole() const { return m_IsWhole; }

    const UInt8* Bytes() const { return m_Bytes.data(); }
    size_t Size() const { return m_Bytes.size(); }

private:
    UInt8* Grow(size_t count);

    dynamic_array<UInt8> m_Bytes{kMemLabelFileSystem};
    bool m_IsWhole = true;
};

// A block of the data, as archives list it.
struct BlockRecord {
    UInt32 size;
    UInt32 storedSize;
    UInt16 flags; // kind, and kStorageBlockStreamed
};
using BlockRecords = dynamic_array<BlockRecord>;

struct ArchiveForm {
    core::string_ref signature;
    UInt32 version; // decides which fields there are
    core::string_ref engineVersion;
    core::string_ref engineRevision;
};

constexpr UInt64 kHeaderAlignment = 16; // block-based headers are padded to it from version 7 on

constexpr UInt64 RoundUp(UInt64 value, UInt64 unit) { return (value + unit - 1) / unit * unit; }

struct BlockBasedSizes {
    UInt64 archive;
    UInt64 compressedSection;
    UInt64 uncompressedSection;
    UInt32 flags; // of the archive
};
// Without padding.
void PutBlockBasedHeader(FieldSink& sink, const ArchiveForm& form, const BlockBasedSizes& sizes);

// The blocks-info section. directory may be null: the section then has none.
void PutSection(FieldSink& sink, const BlockRecords& blocks, const EntryList* directory);

struct LegacySizes {
    UInt64 header; // with all its fields
    UInt64 stored; // of the data
    UInt64 data;   // decoded
};
// Of "ZarvoWeb" and "ZarvoRaw".
void PutLegacyHeader(FieldSink& sink, const ArchiveForm& form, const LegacySizes& sizes);

// The directory that the data of "ZarvoWeb" and "ZarvoRaw" starts with.
void PutLegacyDirectory(FieldSink& sink, const EntryList& entries);
UInt64 LegacyDirectorySize(const EntryList& entries);

// What "ZarvoArchive" begins with. position: of the header.
void PutArchivePrologue(FieldSink& sink, core::string_ref signature, UInt64 position);

// The header of "ZarvoArchive". dataPosition: of the data in the file.
void PutArchiveHeader(FieldSink& sink, const ArchiveForm& form, UInt64 dataPosition, const BlockRecords& blocks,
                      const EntryList& entries);

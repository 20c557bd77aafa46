// What an archive is going to be like: the options with all defaults filled in, and where its entries lie. Whatever the
// layout can't hold is refused here, before anything is written. Any thread, once the entries are placed.
#pragma once

#include "Library/Failure.h"
#include "Library/Writer/Encoders.h"
#include "Library/Writer/Frames.h"

class WritePlan {
public:
    // Checks the options, whose texts must outlive the plan.
    zarvo_code ReadOptions(const zarvo_create_options& options, Failure* failure);

    // Places the entries, which are sorted. If one of them is too much, *failed is its index.
    zarvo_code Place(EntryList* list, size_t* failed, Failure* failure);

    bool HasFolders() const { return !HasLegacyDirectory(); }
    bool HasLegacyDirectory() const { return m_Layout == ZARVO_LAYOUT_WEB || m_Layout == ZARVO_LAYOUT_RAW; }
    SInt32 Layout() const { return m_Layout; }
    const ArchiveForm& Form() const { return m_Form; }

    // Of the data.
    UInt64 DataSize() const { return m_DataSize; }
    UInt64 DirectorySize() const { return m_DirectorySize; } // the legacy directory at its start, or 0

    // How the data is stored: in blocks of this size. A block of ZARVO_LAYOUT_WEB is the whole data, and one of
    // ZARVO_LAYOUT_RAW a piece of the only one.
    UInt64 BlockSize() const;
    UInt64 BlockCount() const { return (m_DataSize + BlockSize() - 1) / BlockSize(); }
    bool IsStreamed() const { return m_IsStreamed; }
    EncoderSettings BlockEncoding() const;
    EncoderSettings SectionEncoding(UInt64 sectionSize) const;

private:
    zarvo_code ReadCompression(const zarvo_create_options& options, Failure* failure);
    UInt64 EndOfLayout() const;

    SInt32 m_Layout = ZARVO_LAYOUT_FS;
    CompressionType m_Type = kCompressionNone;
    int m_Level = 0;
    bool m_IsStreamed = false;
    UInt64 m_BlockSize = 0;
    ArchiveForm m_Form = {};
    UInt64 m_DirectorySize = 0;
    UInt64 m_DataSize = 0;
};

// Of what comes before the data.
UInt64 LegacyHeaderSize(const ArchiveForm& form);

// An open archive: what a zarvo_archive points to. The runtime's reader sets it up over the source (header, blocks,
// directory); afterwards only this library's own code reads.
//
// Any thread, once Open has returned ZARVO_OK.
#pragma once

#include "Library/DataReader.h"
#include "Library/EntryIndex.h"
#include "Library/Messages.h"
#include "Library/SourceFile.h"

struct zarvo_archive : private NonCopyable {
    using Node = ArchiveStorageHeader::Node;

    // options: with all defaults filled in.
    zarvo_archive(Owned<Source> source, const zarvo_open_options& options);

    zarvo_code Open(Failure* failure);

    const EntryIndex::Nodes& Nodes() const { return m_Reader.GetDirectoryInfo().nodes; }
    static bool IsFolder(const Node& node) { return (node.flags & ArchiveStorageHeader::kNodeDirectory) != 0; }
    // The size of a file; 0 for a folder, whatever is stored.
    static UInt64 SizeOf(const Node& node) { return IsFolder(node) ? 0 : node.size; }

    const zarvo_info& Info() const { return m_Info; }
    const BlockDecoder& Blocks() const { return m_Blocks; }
    DataReader& Data() { return *m_Data; }
    MessageLog* Messages() { return &m_Messages; }
    UInt64 MaxBlockBytes() const { return m_Options.max_block_bytes; }

    // Whether this is the file that the archive is read from.
    bool IsFile(dev_t device, ino_t inode) const { return m_Source->IsFile(device, inode); }

    // Builds the index at the first call.
    zarvo_code GetIndex(const EntryIndex** index, Failure* failure);

    // Reads a range of an entry, as zarvo_read does. kept: see DataReader::Read.
    zarvo_code Read(UInt64 entry, UInt64 offset, void* buffer, size_t size, size_t* count, StreamCursor** kept,
                    Failure* failure);

private:
    zarvo_code SetUp(Failure* failure);
    zarvo_code CheckDirectorySize(Failure* failure);
    zarvo_code RefuseDirectory(UInt64 bytes, Failure* failure) const;
    UInt64 DirectoryBytes() const;
    zarvo_code FindDirectory(Failure* failure);
    void DescribeBlocks();
    void DescribeEntries();
    [[nodiscard]] bool MakeEntry(FileSystemEntry* entry);

    const zarvo_open_options m_Options;
    MessageLog m_Messages;
    const Owned<Source> m_Source;
    SourceFile m_File;
    ArchiveStorageReader m_Reader;
    BlockDecoder m_Blocks;
    BlockCache m_Cache;
    Owned<DataReader> m_Data; // once the blocks are known
    zarvo_info m_Info = ZARVO_INFO_INIT;

    Mutex m_IndexLock; // held while the index is built
    EntryIndex m_Index;
    std::atomic<bool> m_HasIndex{false};
};

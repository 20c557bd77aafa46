// The on-disk layouts of archives and the records that their parsers fill. Archives have one of four layouts, which the
// signature at the start tells apart. The parsers turn each into the same records: a Header, a BlocksInfo that cuts the
// data stream into storage blocks, and a DirectoryInfo of nodes that name ranges of that stream.
//
//   ReadHeaderSignature(file, header);                     // position: the archive's start
//   block-based:   ReadHeader, then at GetBlocksInfoOffset: ReadBlocksInfo and ReadDirectoryInfo
//   ZarvoArchive, ZarvoRaw:  ReadAll
//   ZarvoWeb:      ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw; the directory lies inside the compressed data
//   data:          at GetDataOffset
//
// All integers are big-endian, all strings NUL-terminated. The parsers print nothing and keep no state; one thread at a
// time may use an accessor or a record. The parsers refuse counts that the rest of the file can't hold. Sizes and
// positions are stored as read: compare them with something that is not in the file before you use them.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/Types.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

namespace ArchiveStorageHeader {

// What every parser answers.
enum [[nodiscard]] HeaderResult : int{
    kHeaderOk = 0,
    kHeaderShortRead = 1,     // the file could not supply the bytes
    kHeaderNotAnArchive = -1, // unknown signature, wrong layout, version too new, or contradicting sizes
};

extern const char* const kSignature; // "ZarvoFS", the block-based layout
constexpr const char* kSignatureWeb = "ZarvoWeb";
constexpr const char* kSignatureRaw = "ZarvoRaw";
constexpr const char* kSignatureArchive = "ZarvoArchive";

constexpr UInt32 kNewestVersion = 8;       // of the block-based layout
constexpr UInt32 kFirstPaddedVersion = 7;  // headers are a multiple of 16 bytes long from here on
constexpr UInt32 kWebSignatureVersion = 6; // "ZarvoWeb" of this version is a block-based archive
constexpr UInt32 kZarvoArchiveVersion = 5; // the one version of the old archive

// Header::flags. Bits 10-31 are kept as read.
enum ArchiveFlags : UInt32 {
    kArchiveCompressionTypeMask = 0x3F,   // CompressionType of the blocks-info section
    kArchiveDirectoryInBlocksInfo = 0x40, // the directory follows the block list in that section
    kArchiveBlocksInfoAtEnd = 0x80,       // the section is the archive's last bytes, not what follows the header
    kArchiveWebSignatureHeader = 0x100,   // a block-based header under the ZarvoWeb signature
    kArchiveBlocksInfoPadded = 0x200,     // the section is padded to a multiple of 16 bytes before the data
};

struct Header {
    explicit Header(MemLabelId label);

    core::string signature;
    UInt32 version;
    core::string engineVersion;
    core::string engineRevision;
    UInt64 size;                     // of the whole archive, as its writer recorded it; 0 when it recorded none
    UInt32 compressedBlocksInfoSize; // stored; the legacy layouts keep the data offset here
    UInt32 uncompressedBlocksInfoSize;
    UInt32 flags;
};

// StorageBlock::flags. Bits 7-15 are kept as read.
enum StorageBlockFlags : UInt16 {
    kStorageBlockCompressionTypeMask = 0x3F, // CompressionType
    kStorageBlockStreamed = 0x40,            // one continuous stream that may be decompressed progressively
};

// One piece of the data stream. The stored bytes of the blocks start at the data offset and follow in list order.
struct StorageBlock {
    UInt32 uncompressedSize = 0;
    UInt32 compressedSize = 0;
    UInt16 flags = 0;
};

struct BlocksInfo {
    explicit BlocksInfo(MemLabelId label) : storageBlocks(label) {}

    UInt8 hash[16] = {}; // as read; nothing interprets it
    dynamic_array<StorageBlock> storageBlocks;
};

// Node::flags. Other bits are kept as read.
enum NodeFlags : UInt32 {
    kNodeDirectory = 1, // a folder; offset and size are not used
    kNodeAssetData = 4, // set for entries of the legacy directory by their extension; nothing acts on it
};

// One entry of the directory.
struct Node {
    explicit Node(MemLabelId label) : path(label) {}

    UInt64 offset = 0; // of the first byte, in the data stream
    UInt64 size = 0;
    UInt32 flags = 0;
    core::string path; // components separated by '/', as stored: it may be empty, repeated, or hold ".."
};

struct DirectoryInfo {
    explicit DirectoryInfo(MemLabelId label) : nodes(label) {}

    dynamic_array<Node> nodes; // in stored order
};

static_assert(sizeof(StorageBlock) == 12);
static_assert(sizeof(Node) == 64 && offsetof(Node, path) == 24);

// Reads the signature at the current position and leaves the position just past its NUL. The record of a block-based
// archive under the ZarvoWeb signature gets the signature "ZarvoFS". Answers kHeaderOk or kHeaderNotAnArchive.
HeaderResult ReadHeaderSignature(FileAccessor& file, Header& header);

// Reads the rest of a block-based header, from just past the signature to just past its flags.
HeaderResult ReadHeader(FileAccessor& file, Header& header);

// Where the blocks-info section lies, from the archive's start. A value above 2^63 - 1 when the header names no valid
// position.
UInt64 GetBlocksInfoOffset(const Header& header);

// Where the first storage block's bytes lie, from the archive's start.
UInt64 GetDataOffset(const Header& header);

// Reads the block list of the block-based layout. After a short read, the blocks that came whole have their values.
HeaderResult ReadBlocksInfo(FileAccessor& file, const Header& header, BlocksInfo& blocks);

// Reads a directory in the layout of the header's signature; ZarvoArchive is refused (see ReadAll).
HeaderResult ReadDirectoryInfo(FileAccessor& file, const Header& header, DirectoryInfo& directory);

// Reads the rest of a ZarvoWeb or ZarvoRaw header, from just past the signature. Stores the data offset in both
// blocks-info sizes, and makes the whole data one streamed block.
HeaderResult ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(FileAccessor& file, Header& header, BlocksInfo& blocks);

// Reads the directory at the start of a ZarvoWeb or ZarvoRaw data stream.
HeaderResult ReadDirectoryInfo_ZarvoWebAndZarvoRaw(FileAccessor& file, const Header& header, DirectoryInfo& directory);

// Reads header, blocks and directory of a ZarvoArchive or ZarvoRaw archive, from just past the signature. Positions in
// it count from the start of the file, so the archive must begin there.
HeaderResult ReadAll(FileAccessor& file, Header& header, BlocksInfo& blocks, DirectoryInfo& directory);

} // namespace ArchiveStorageHeader

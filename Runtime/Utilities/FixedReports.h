// The failed checks whose text, and in some cases whose place, is fixed: filters of log output match them. They are
// output, as the command's messages are. An expression or a line number in them is not one of this code, and none of
// them changes when the code that reports it does.
//
//   if (!IsReadable()) Report(FixedReports::kMemoryFileRead);
//   Check(size + 1 > size, FixedReports::kArraySizeWraps);   // reported at the caller's place
#pragma once

#include "Runtime/Utilities/LogAssert.h"

// A failed check at a fixed place.
struct FixedReport {
    const char* file;
    int line;
    const char* message;
};

// Any thread.
inline void Report(const FixedReport& report) { AssertImplementation(0, report.file, report.line, -1, report.message); }

namespace FixedReports {

inline constexpr FixedReport kMemoryFileRead = {
    .file = "./Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile",
    .line = 37,
    .message = "Assertion failed on expression: 'IsReadable()'",
};
inline constexpr FixedReport kMemoryFileWrite = {
    .file = "./Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile",
    .line = 64,
    .message = "Assertion failed on expression: 'IsWritable()'",
};
inline constexpr FixedReport kMemoryFileSetLength = {
    .file = "./Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile",
    .line = 109,
    .message = "Assertion failed on expression: 'IsWritable()'",
};
inline constexpr FixedReport kMemoryFileDirtyRead = {
    .file = "./Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData",
    .line = 80,
    .message = "Assertion failed in MultiBlocksMemoryFileData::Read(): Dirty data read \n",
};
inline constexpr FixedReport kCastOfTooLarge = {
    .file = "./Runtime/VirtualFileSystem/VirtualFileSystemTypes",
    .line = 123,
    .message = "Value cannot be stored by type cast target: exceeds maximum representable value. "
               "Result will be truncated.",
};
inline constexpr FixedReport kCastOfNegative = {
    .file = "./Runtime/VirtualFileSystem/VirtualFileSystemTypes",
    .line = 128,
    .message = "Casting a negative value into an unsigned type.",
};

// Texts of checks that report at the caller's place.
inline constexpr char kArraySizeWraps[] = "Assertion failed on expression: 'newSize > m_size'";
inline constexpr char kArrayTooLong[] = "Assertion failed on expression: 'm_size < max_size()'";
inline constexpr char kListingHasNoName[] =
    "Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_NAME'";
inline constexpr char kListingHasNoType[] =
    "Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_OBJTYPE'";
inline constexpr char kListingHasNoTime[] =
    "Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_MODTIME'";
inline constexpr char kListingHasNoFlags[] =
    "Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_FLAGS'";
inline constexpr char kListingHasNoSize[] =
    "Assertion failed on expression: 'entry.returned.fileattr & ATTR_FILE_TOTALSIZE'";
inline constexpr char kSumHasNoCounter[] = "Assertion failed on expression: 'handlerData != NULL'";
inline constexpr char kUnknownCompressionType[] = "Assertion failed on expression: 't < kCompressionCount'";
inline constexpr char kClaimedStreamHasReaders[] =
    "Assertion failed on expression: 'AtomicCompareExchange(&block->bufferReaders, 0, 0)'";
inline constexpr char kChunkHasData[] =
    "Assertion failed on expression: 'cachedBlock->blockOffset == 0 && cachedBlock->buffer.size() == 0'";
inline constexpr char kReadOutsideBlock[] =
    "Assertion failed on expression: 'm_UncompressedBlocksOffsets[blockInd] <= from.Cast<UInt64>() + dstPos && "
    "m_UncompressedBlocksOffsets[blockInd] + uncompressedBlockSize >= from.Cast<UInt64>() + dstPos'";
inline constexpr char kBatchReadTooEarly[] = "Assertion failed on expression: 'position >= m_StartPos'";
inline constexpr char kBatchReadTooFar[] = "Assertion failed on expression: 'position + size <= m_EndPos'";
inline constexpr char kBatchCopyOutsideWindow[] = "Assertion failed on expression: 'curPosition >= m_LoadedWindowStart "
                                                  "&& curPosition + readSize <= m_LoadedWindowEnd'";

} // namespace FixedReports

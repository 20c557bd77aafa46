// The least that extracting an archive can cost: Floor ARCHIVE FOLDER
//
// Reads ARCHIVE.plan (see PackFolder.cpp), so it neither parses nor checks the archive. Decodes the blocks into one
// buffer that stays in the processor's cache. Makes each folder with mkdir, and each file with open, write (one call
// per piece) and close. Stored blocks are copied piece by piece, and LZMA blocks larger than a piece are decoded piece
// by piece; other blocks are decoded in one call. An unexpected result ends it with status 1.
#include "Runtime/Utilities/Compression/Compression.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <lz4.h>
#include <lzma/LzmaDec.h>
#include <memory>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

constexpr UInt64 kPiece = 131'072;
constexpr UInt64 kSlack = 524'288; // written bytes are dropped from the buffer when there are more than this
constexpr UInt64 kLzmaPropertiesSize = 5;

void Require(bool isTrue, const char* what) {
    if (isTrue) return;
    perror(what);
    exit(1);
}

void* AllocateForDecoder(void*, size_t size) { return malloc(size); }
void FreeForDecoder(void*, void* address) { free(address); }

struct Block {
    UInt64 storedSize, size, type, codedOffset;
};

struct Node {
    UInt64 flags, offset, size;
    std::string path;
};

struct Plan {
    UInt64 dataOffset = 0;
    std::vector<Block> blocks = {};
    std::vector<Node> nodes = {};
};

Plan ReadPlan(const char* path) {
    const int file = open(path, O_RDONLY);
    struct stat status;
    Require(file >= 0 && fstat(file, &status) == 0, path);
    std::string text(static_cast<size_t>(status.st_size), '\0');
    Require(read(file, text.data(), text.size()) == status.st_size, path);
    close(file);

    Plan plan;
    char* next = text.data();
    char* const end = next + text.size();
    const auto number = [&] { return strtoull(next, &next, 10); };
    while (next < end) {
        const char kind = *next;
        next = strchr(next, ' ');
        if (kind == 'd') plan.dataOffset = number();
        if (kind == 'b') plan.blocks.push_back(Block{number(), number(), number(), number()});
        if (kind == 'n') plan.nodes.push_back(Node{number(), number(), number(), {}});
        char* const lineEnd = strchr(next, '\n');
        if (kind == 'n') plan.nodes.back().path.assign(next + 1, lineEnd);
        next = lineEnd + 1;
    }
    return plan;
}

// The data stream. Only a part of it, which moves forward, is in memory.
class Stream {
public:
    Stream(const char* archive, const Plan& plan)
        : m_Archive(open(archive, O_RDONLY)), m_Plan(plan), m_Position(plan.dataOffset) {
        Require(m_Archive >= 0, archive);
        UInt64 largestBlock = kPiece, largestStored = kPiece;
        for (const Block& block : plan.blocks) {
            if (IsDecodedInPieces(block)) continue;
            largestBlock = std::max(largestBlock, block.size);
            largestStored = std::max(largestStored, block.storedSize);
        }
        // A vector would clear bytes that are about to be overwritten.
        m_Buffer = std::make_unique_for_overwrite<char[]>(kSlack + kPiece + 2 * largestBlock);
        m_Stored = std::make_unique_for_overwrite<char[]>(largestStored);
        LzmaDec_Construct(&m_Lzma);
    }

    // The bytes [offset, offset + size). size is at most kPiece, and offset never decreases.
    const char* At(UInt64 offset, UInt64 size) {
        while (m_Start + m_Filled < offset + size) {
            const UInt64 unwanted = std::min(m_Filled, offset - m_Start);
            if (unwanted > kSlack) {
                m_Filled -= unwanted;
                memmove(m_Buffer.get(), m_Buffer.get() + unwanted, m_Filled);
                m_Start += unwanted;
            }
            DecodeNext();
        }
        return m_Buffer.get() + (offset - m_Start);
    }

private:
    static bool IsDecodedInPieces(const Block& block) {
        return block.type == kCompressionNone || (block.type == kCompressionLzma && block.size > kPiece);
    }

    void ReadStored(char* to, UInt64 size) {
        Require(pread(m_Archive, to, size, static_cast<off_t>(m_Position)) == static_cast<ssize_t>(size), "pread");
        m_Position += size;
    }

    void DecodeNext() {
        Require(m_NextBlock < m_Plan.blocks.size(), "the blocks end too early");
        const Block& block = m_Plan.blocks[m_NextBlock];
        char* const to = m_Buffer.get() + m_Filled;
        if (!IsDecodedInPieces(block)) {
            ReadStored(m_Stored.get(), block.storedSize);
            DecodeWhole(block, to);
            m_Filled += block.size;
            ++m_NextBlock;
            return;
        }
        const UInt64 size = std::min(kPiece, block.size - m_Taken);
        if (block.type == kCompressionNone)
            ReadStored(to, size);
        else
            DecodePiece(block, to, size);
        m_Filled += size;
        m_Taken += size;
        if (m_Taken < block.size) return;
        m_Position += m_StoredLeft; // skips an end mark
        m_StoredLeft = m_Loaded = m_Consumed = m_Taken = 0;
        ++m_NextBlock;
    }

    void DecodeWhole(const Block& block, char* to) {
        if (block.type != kCompressionLzma) {
            const int size = LZ4_decompress_safe(m_Stored.get(), to, static_cast<int>(block.storedSize),
                                                 static_cast<int>(block.size));
            return Require(size == static_cast<int>(block.size), "LZ4_decompress_safe");
        }
        SizeT size = block.size, storedSize = block.storedSize - block.codedOffset;
        const Byte* const stored = reinterpret_cast<const Byte*>(m_Stored.get());
        ELzmaStatus status;
        const SRes result = LzmaDecode(reinterpret_cast<Byte*>(to), &size, stored + block.codedOffset, &storedSize,
                                       stored, kLzmaPropertiesSize, LZMA_FINISH_ANY, &status, &m_Allocator);
        Require(result == SZ_OK && size == block.size, "LzmaDecode");
    }

    // Decodes the next size bytes of an LZMA block.
    void DecodePiece(const Block& block, char* to, UInt64 size) {
        const Byte* const stored = reinterpret_cast<const Byte*>(m_Stored.get());
        if (m_Taken == 0) {
            ReadStored(m_Stored.get(), block.codedOffset);
            m_StoredLeft = block.storedSize - block.codedOffset;
            Require(LzmaDec_Allocate(&m_Lzma, stored, kLzmaPropertiesSize, &m_Allocator) == SZ_OK, "LzmaDec_Allocate");
            LzmaDec_Init(&m_Lzma);
        }
        while (size != 0) {
            if (m_Consumed == m_Loaded) {
                m_Loaded = std::min(kPiece, m_StoredLeft);
                m_Consumed = 0;
                m_StoredLeft -= m_Loaded;
                ReadStored(m_Stored.get(), m_Loaded);
            }
            SizeT produced = size, consumed = m_Loaded - m_Consumed;
            ELzmaStatus status;
            const SRes result = LzmaDec_DecodeToBuf(&m_Lzma, reinterpret_cast<Byte*>(to), &produced,
                                                    stored + m_Consumed, &consumed, LZMA_FINISH_ANY, &status);
            Require(result == SZ_OK && produced + consumed != 0, "LzmaDec_DecodeToBuf");
            m_Consumed += consumed;
            to += produced;
            size -= produced;
        }
    }

    int m_Archive;
    const Plan& m_Plan;
    UInt64 m_Position;      // of the next stored byte in the archive
    size_t m_NextBlock = 0; // the block that is decoded next
    UInt64 m_Taken = 0;     // bytes of that block that have been decoded, when it is decoded in pieces
    UInt64 m_Start = 0;     // the buffer's first byte in the data stream
    UInt64 m_Filled = 0;    // bytes in the buffer
    std::unique_ptr<char[]> m_Buffer;
    std::unique_ptr<char[]> m_Stored; // the stored bytes of a block, or a piece of them

    ISzAlloc m_Allocator = {AllocateForDecoder, FreeForDecoder};
    CLzmaDec m_Lzma;
    UInt64 m_StoredLeft = 0; // stored bytes of the block after the piece in m_Stored
    UInt64 m_Loaded = 0;     // size of that piece
    UInt64 m_Consumed = 0;   // decoded bytes of that piece
};

// Makes the folder of a file, and those above it, unless the file before it was in the same one.
void MakeParent(std::string_view path, std::string* last) {
    const size_t slash = path.rfind('/');
    if (slash == std::string_view::npos || path.substr(0, slash) == *last) return;
    *last = path.substr(0, slash);
    for (size_t end = last->find('/');; end = last->find('/', end + 1)) {
        Require(mkdir(last->substr(0, end).c_str(), 0777) == 0 || errno == EEXIST, last->c_str());
        if (end == std::string::npos) return;
    }
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 3) return 2;
    const Plan plan = ReadPlan((std::string(arguments[1]) + ".plan").c_str());
    Stream stream(arguments[1], plan);
    Require(mkdir(arguments[2], 0777) == 0 && chdir(arguments[2]) == 0, arguments[2]);
    const bool hasFolders =
        std::any_of(plan.nodes.begin(), plan.nodes.end(), [](const Node& n) { return n.flags & 1; });
    std::string lastParent;
    for (const Node& node : plan.nodes) {
        const char* const path = node.path.c_str();
        if ((node.flags & 1) != 0) {
            Require(mkdir(path, 0777) == 0, path);
            continue;
        }
        if (!hasFolders) MakeParent(node.path, &lastParent);
        const int file = open(path, O_WRONLY | O_CREAT | O_TRUNC, 0666);
        Require(file >= 0, path);
        for (UInt64 written = 0; written < node.size;) {
            const UInt64 size = std::min(kPiece, node.size - written);
            const char* const bytes = stream.At(node.offset + written, size);
            Require(write(file, bytes, size) == static_cast<ssize_t>(size), path);
            written += size;
        }
        Require(close(file) == 0, path);
    }
    return 0;
}

// Memory labels: every allocation names its purpose. All labels share one heap. A string hands its buffer over only to
// a string with the same label, and a container never changes its label.
#pragma once

#include "Runtime/Core/Types.h"

enum MemLabelIdentifier : UInt16 {
    kMemLabelGeneral = 1,     // texts that the runtime builds for itself, scratch buffers
    kMemLabelReadBatch = 6,   // the read-ahead window of an archive read
    kMemLabelTemporary = 16,  // the list made while clean-up runs
    kMemLabelFileSystem = 60, // the file system registry, open files, archive readers, memory files, LZMA streams
    kMemLabelPathString = 73, // every string that was given no label
    kMemLabelFileList = 75,   // folder listings
    kMemLabelRandom = 79,     // the scripting random generator
};

// Passed and stored by value; a MemLabelIdentifier converts to it.
struct MemLabelId {
    constexpr MemLabelId(MemLabelIdentifier value) : identifier(value) {}
    friend constexpr bool operator==(MemLabelId, MemLabelId) = default;

    MemLabelIdentifier identifier;
};
static_assert(sizeof(MemLabelId) == 2);

// Archives that the fuzz targets make to read them.
#pragma once

#include "Fuzz/FuzzSupport.h"
#include "Tests/Support/ArchiveBuilder.h"

constexpr UInt64 kMaxFuzzStream = 1 << 18; // nobody reads on after that

// An archive that the writer makes of the input's bytes, with blocks of the kinds and sizes that are drawn from it.
BuiltArchive BuildArchiveFrom(FuzzInput& input);

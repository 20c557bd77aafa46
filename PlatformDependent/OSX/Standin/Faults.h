// The faults that tests inject into the stand-in: set fields of gStandinFaults, and let a ScopedFaults clear them.
//
//   ScopedFaults faults;
//   gStandinFaults.trashRefuses = true;
//
// Not guarded: set them while one thread uses the stand-in.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

struct StandinFaults {
    // getattrlistbulk
    int recordsBeforeListingError = -1; // one call fails after this many records, over all calls; -1: never
    int listingError = 0;               // with this errno
    int callsTooSmall = 0;              // the first so many calls fail with ERANGE
    std::string entryErrorName = {};    // this entry's record reports an error
    std::string alteredName = {};       // the record of this entry ...
    uint32_t missingCommon = 0;         // ... lacks these attributes
    uint32_t missingFile = 0;           // ... and these
    int32_t movedName = 0;              // ... points this many bytes past its name
    bool cut = false;                   // ... is cut to cutLength bytes
    uint32_t cutLength = 0;

    int chflagsError = 0;         // chflags fails with this errno
    bool trashRefuses = false;    // the workspace moves nothing
    bool emptyBundlePath = false; // the main bundle has no path
};
extern StandinFaults gStandinFaults;

class ScopedFaults {
public:
    ScopedFaults() { gStandinFaults = {}; }
    ~ScopedFaults() { gStandinFaults = {}; }
    ScopedFaults(const ScopedFaults&) = delete;
    ScopedFaults& operator=(const ScopedFaults&) = delete;
};

// How many of this thread's objects are alive.
size_t CountStandinObjects();

// What the stand-in is told to fail, for tests: set the fields of gStandinFaults, and let a ScopedFaults clear them.
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
    int recordsBeforeListingError = -1; // records delivered, over all calls, before one call fails; -1: never
    int listingError = 0;               // with this errno
    int callsTooSmall = 0;              // this many calls answer ERANGE first
    std::string entryErrorName = {};    // this entry's record reports an error
    std::string alteredName = {};       // the record of this entry ...
    uint32_t missingCommon = 0;         // ... lacks these attributes
    uint32_t missingFile = 0;           // ... and these
    int32_t movedName = 0;              // ... has its name so many bytes from where it is
    bool cut = false;                   // ... says that it ends after cutLength bytes, and does
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

// Objects that are alive in this thread.
size_t CountStandinObjects();

// How the library's own functions report what went wrong: a code as the result, and a text in a Failure, which the
// public function owns that the caller called. Needs no memory, so refused memory can be reported, too.
//
//   if (fstat(descriptor, &status) != 0) return failure->SetSystem(errno, "can't be looked at");
//
// One thread at a time.
#pragma once

#include "Library/include/zarvo.h"

struct Failure {
    zarvo_code code = ZARVO_OK;
    int systemCode = 0;
    char text[240] = ""; // cut where it would be longer: texts name blocks and limits, never paths

    // Each stores the text and returns the code. Setting a failure again replaces the text.
    [[gnu::format(printf, 3, 4)]] zarvo_code Set(zarvo_code newCode, const char* format, ...);

    // The text begins with the system's reason: "Permission denied", or "Input/output error: block 3". what may be
    // null.
    zarvo_code SetSystem(int error, const char* what = nullptr);
    zarvo_code SetMemory() { return Set(ZARVO_ERROR_MEMORY, "out of memory"); }
    zarvo_code SetStopped() { return Set(ZARVO_ERROR_STOPPED, "stopped"); }
    zarvo_code SetArgument(const char* what) { return Set(ZARVO_ERROR_ARGUMENT, "%s", what); }
};

// A failure of one of very many things, of which nearly all go well: until there is one, it takes the room of a
// pointer. Where memory is refused, the failure becomes that. One thread at a time.
class RareFailure {
public:
    ~RareFailure();
    RareFailure() = default;
    RareFailure(const RareFailure&) = delete;
    RareFailure& operator=(const RareFailure&) = delete;

    void Set(const Failure& failure);
    const Failure* Get() const { return m_Failure; } // null while there is none

private:
    const Failure* m_Failure = nullptr; // owned, but for that of refused memory
};

// Ends a public call: hands the failure over where the caller wants it (error may be null), and returns code.
zarvo_code Deliver(zarvo_code code, const Failure& failure, zarvo_error** error);

// How the library's own functions say what went wrong: a code as the result, and the words in a Failure that the public
// call at the bottom of the stack owns. Needs no memory, so that refused memory can be told, too.
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

    // Each stores the words and returns the code. A failure that is set twice keeps the last words.
    [[gnu::format(printf, 3, 4)]] zarvo_code Set(zarvo_code newCode, const char* format, ...);

    // The system's reason in front: "Permission denied", or "Input/output error: block 3". what may be null.
    zarvo_code SetSystem(int error, const char* what = nullptr);
    zarvo_code SetMemory() { return Set(ZARVO_ERROR_MEMORY, "out of memory"); }
    zarvo_code SetArgument(const char* what) { return Set(ZARVO_ERROR_ARGUMENT, "%s", what); }
};

// Ends a public call: hands the failure over where the caller wants it (error may be null), and returns code.
zarvo_code Deliver(zarvo_code code, const Failure& failure, zarvo_error** error);

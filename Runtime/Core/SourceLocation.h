// A position in the source: a default argument of SourceLocation::current() is the caller's file and line.
// Not every compiler that builds this has std::source_location.
#pragma once

struct SourceLocation {
    static constexpr SourceLocation current(const char* fileName = __builtin_FILE(),
                                            int lineNumber = __builtin_LINE()) {
        return SourceLocation{fileName, lineNumber};
    }

    const char* file;
    int line;
};
